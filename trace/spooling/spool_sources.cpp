// Where spool specifications come from: QN_TR_SPOOL, or else the configuration file.
//
// Global mutex, held by whoever reads into the default anchor's list; a list of the caller's own needs no lock.
#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <string_view>
#include <strings.h>

#include "trace/files/anchor.h"
#include "trace/files/debug.h"
#include "trace/files/error_report.h"
#include "trace/files/text.h"
#include "trace/spooling/spool.h"
#include "trace/spooling/spool_shape.h"
#include "trace/traceutils/raw_config.h"
#include "trace/traceutils/traceutils.h"

namespace
{
using namespace qn::tr;

constexpr qn_int32_t syntax_error = 39;
constexpr qn_int32_t one_is_on = 40;
constexpr qn_int32_t none_is_on = 41;
constexpr qn_int32_t could_not_append = 47;

// One specification of QN_TR_SPOOL: pattern ":" onoff ":" pages ":" dest [":" tracesize]
struct environment_spec {
    char pattern[sizeof(trace_spool_spec_t::pattern)];
    char dest[sizeof(trace_spool_spec_t::dest)];
    bool on;
    qn_uint32_t pages;
    qn_uint32_t trace_bytes;
};

// Takes the text up to a separator off the front, and the separator; false when there is no separator.
bool take_field(std::string_view &text, std::string_view &field)
{
    const size_t end = text.find(':');
    if (end == std::string_view::npos) return false;
    field = text.substr(0, end);
    text.remove_prefix(end + 1);
    return true;
}

// As atoi() reads it: leading digits, else 0.
qn_uint32_t number(std::string_view text)
{
    char digits[32];
    copy_cut(digits, text);
    return static_cast<qn_uint32_t>(std::strtol(digits, nullptr, 10));
}

// Reads "ON" or "OFF"; false for anything else.
bool read_switch(std::string_view text, bool &on)
{
    on = text.size() == 2 && strncasecmp(text.data(), "ON", 2) == 0;
    return on || (text.size() == 3 && strncasecmp(text.data(), "OFF", 3) == 0);
}

// Takes one specification and its "," off the front; false at a syntax error.
bool take_spec(std::string_view &text, environment_spec &spec)
{
    std::string_view pattern;
    std::string_view onoff;
    std::string_view pages;
    if (!take_field(text, pattern) || pattern.empty() || pattern.size() >= sizeof spec.pattern) return false;
    if (!take_field(text, onoff) || !read_switch(onoff, spec.on)) return false;
    if (!take_field(text, pages) || pages.empty()) return false;

    std::string_view dest = text.substr(0, text.find(','));
    text.remove_prefix(std::min(text.size(), dest.size() + 1));
    std::string_view trace_bytes;
    const size_t colon = dest.find(':');
    if (colon != std::string_view::npos) {
        trace_bytes = dest.substr(colon + 1);
        dest = dest.substr(0, colon);
    }
    if (dest.empty()) return false;
    copy_cut(spec.pattern, pattern);
    copy_cut(spec.dest, dest);
    spec.pages = number(pages);
    spec.trace_bytes = number(trace_bytes);
    return true;
}

// Both results of reading the configuration file, freed with their scope.
struct configuration {
    trace_raw_config_t *raw = nullptr;
    trace_conf_data_t *data = nullptr;
    configuration() = default;
    configuration(const configuration &) = delete;
    configuration &operator=(const configuration &) = delete;
    ~configuration()
    {
        tr_free_trace_raw_config_1(raw);
        tr_free_trace_conf_data_1(data);
    }
};

// The interpreter leaves out what it finds no memory for. A trace would no longer be spooled for that.
bool has_every_section(const configuration &file)
{
    qn_uint32_t sound = 0;
    for (qn_int32_t i = 0; i < file.raw->num_element; ++i) {
        const trace_raw_section_t *section = section_of(file.raw->ppChunkLst[i]);
        if (section != nullptr && section->bErr_flag != 1) ++sound;
    }
    return sound == file.data->num_elements;
}

qn_int32_t append_section(const trace_element_t &section, trace_spool_spec_t **first, trace_spool_spec_t **last)
{
    const spool_shape shape = shape_from_section(section);
    return addSpoolCfgElement(section.dest, section.pattern, shape.pages, spooling_says_on(section.spooling) ? 1 : 0,
                              static_cast<qn_int32_t>(shape.sync_seconds), first, last, 1, shape.page_bytes);
}

qn_int32_t append_configuration_file(trace_spool_spec_t **first, trace_spool_spec_t **last)
{
    configuration file;
    qn_int32_t status = tr_read_conf_file_1(&file.raw);
    if (status == 0) status = tr_parse_all_sections_1(file.raw, &file.data, 1);
    if (status != 0) return status;
    if (!has_every_section(file)) return set_error(QN_TR_ENOMEM, 14);
    for (qn_uint32_t i = 0; i < file.data->num_elements; ++i) {
        const trace_config_element_t *element = file.data->pTraceConfigElement[i];
        if (element->elementType != TRACE_ELEMENT) continue;
        if (append_section(element->element.trace_element, first, last) != 0) return could_not_append;
    }
    return 0;
}
} // namespace

void read_spool_cfg(void)
{
    const char *specifications = std::getenv("QN_TR_SPOOL");
    if (specifications != nullptr && specifications[0] != '\0')
        parse_spool_spec(specifications, &anchors.pFirstSpoolSpec, &anchors.pLastSpoolSpec);
    else
        spool_conf_file(&anchors.pFirstSpoolSpec, &anchors.pLastSpoolSpec);
}

qn_int32_t parse_spool_spec(const char *pString, trace_spool_spec_t **pFirstSpoolSpec,
                            trace_spool_spec_t **pLastSpoolSpec)
{
    qn_int32_t status = none_is_on;
    for (std::string_view text(pString); !text.empty();) {
        environment_spec spec;
        if (!take_spec(text, spec)) return syntax_error;
        const spool_shape shape = shape_from_environment(spec.pages, spec.trace_bytes);
        if (addSpoolCfgElement(spec.dest, spec.pattern, shape.pages, spec.on ? 1 : 0,
                               static_cast<qn_int32_t>(shape.sync_seconds), pFirstSpoolSpec, pLastSpoolSpec, 1,
                               shape.page_bytes) != 0)
            return syntax_error;
        if (spec.on) status = one_is_on;
    }
    return status;
}

qn_int32_t spool_conf_file(trace_spool_spec_t **pFirstSpoolSpec, trace_spool_spec_t **pLastSpoolSpec)
{
    const qn_int32_t status = append_configuration_file(pFirstSpoolSpec, pLastSpoolSpec);
    debug("Leaving spool_conf_file: %d n", status);
    return status;
}
