// The configuration file: its raw form (conf_reader.cpp, raw_config.cpp), and what its sections mean (sections.cpp).
//
// No lock of its own: callers serialise reading, and a finished configuration is only read.
#pragma once

#include <string>
#include <vector>

#include <qn_tr.h>

namespace qn::tr
{
inline constexpr const char *configuration_file_name = "/var/qn/cfg/trace.conf";

// What is wrong with a section: where it was seen first.
struct conf_fault {
    unsigned line;       // of the file, from 1
    std::string section; // its name; empty when the fault was found where a header was expected
    std::string text;    // why, for a person
};

// What a person wants to know of a file beside its configuration.
struct conf_findings {
    std::vector<unsigned> section_lines; // where each section begins, in the order of the chunks that are sections
    std::vector<conf_fault> faults; // in file order, those of sections too that are dropped with the end of the file
};

// Reads a configuration file by name; tr_read_conf_file_1 with the name of the system's. `findings` may be null.
qn_int32_t read_conf_file(const char *file_name, trace_raw_config_t **config, conf_findings *findings);
} // namespace qn::tr

// The first section of that name without an error, or null.
const trace_raw_section_t *tr_find_section_by_name_1(trace_raw_config_t *pTraceRawCfg, const char *sectname);

// What the raw configuration is made with. 0, or 14 after recording error 14.
qn_int32_t addRawElement(trace_raw_config_t *config, qn_int32_t type, void *data);
qn_int32_t addKeyValue(trace_raw_section_t *section, const char *key, const char *value);
qn_int32_t appendRawString(trace_raw_section_t *section, const char *line);

// Prints a raw configuration. For debugging.
void printConf(const trace_raw_config_t *config);

// Does nothing and returns 0.
qn_int32_t tr_parse_section(const trace_chunk_t *chunk, trace_conf_data_t **data, int force);

// Append one element. 0, or 14 when memory runs out (no error is recorded).
qn_int32_t addTraceElement(trace_conf_data_t *data, const char *sect_name, const char *dst, const char *pat,
                           qn_uint32_t iPages, qn_uint32_t iSize, qn_uint32_t iTraceSize, const char *onoff);
qn_int32_t addSpoolElement(trace_conf_data_t *data, const char *sect_name, const char *spdir, const char *spcleanup,
                           qn_uint32_t spinterval, qn_uint32_t spretentiondays, qn_uint32_t spspoolsz,
                           qn_uint32_t spstartupinterval);
qn_int32_t addDefaultElement(trace_conf_data_t *data, const char *sect_name, const char *dst, qn_uint32_t iTraceSize,
                             const char *onoff);

// The value of the section's first pair with exactly that key, or null.
const char *getValueFromKVList(const trace_raw_section_t *section, const char *key);

// Prints an interpreted configuration. For debugging.
void printTraceConfData(const trace_conf_data_t *data);
