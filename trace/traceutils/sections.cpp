// What the sections of a raw configuration mean: a list of trace, spool and default elements. No lock.
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "trace/files/text.h"
#include "trace/traceutils/raw_config.h"
#include "trace/traceutils/traceutils.h"

using namespace qn::tr;

namespace
{
constexpr size_t element_step = 100;

// What a section is given where it says nothing.
constexpr const char *fill_in_dest = "/dev/null";
constexpr const char *fill_in_spooling = "OFF";

// The next element of the list, cleared but for its type and name; null when memory runs out.
trace_config_element_t *new_element(trace_conf_data_t *data, qn_uint32_t type, const char *sect_name)
{
    if (!make_room<element_step>(data->pTraceConfigElement, data->num_elements)) return nullptr;
    auto *element = static_cast<trace_config_element_t *>(std::calloc(1, sizeof(trace_config_element_t)));
    if (element == nullptr) return nullptr;
    element->elementType = type;
    copy_cut(element->sect_name, sect_name);
    data->pTraceConfigElement[data->num_elements++] = element;
    return element;
}

const char *text_of(const trace_raw_section_t *section, const char *key, const char *when_absent)
{
    const char *value = getValueFromKVList(section, key);
    return value != nullptr ? value : when_absent;
}

// Leading digits count, and a minus sign wraps round.
qn_uint32_t number_of(const trace_raw_section_t *section, const char *key, qn_uint32_t when_absent = 0)
{
    const char *value = getValueFromKVList(section, key);
    return value != nullptr ? static_cast<qn_uint32_t>(std::atoi(value)) : when_absent;
}

// An element that cannot be allocated is left out.
void add_section(trace_conf_data_t *data, const trace_raw_section_t *section, qn_uint32_t fill_in_trace_size)
{
    const char *name = section->sect_name;
    switch (type_of_section(name)) {
    case section_type::trace:
        addTraceElement(data, name, text_of(section, "dest", fill_in_dest), text_of(section, "pat", ""),
                        number_of(section, "pages"), number_of(section, "size"),
                        number_of(section, "tracesize", fill_in_trace_size),
                        text_of(section, "spooling", fill_in_spooling));
        break;
    case section_type::spool:
        addSpoolElement(data, name, text_of(section, "spool_dir", ""), text_of(section, "cleanup", ""),
                        number_of(section, "spool_cleanup_interval"), number_of(section, "spool_retention_days"),
                        number_of(section, "spool_directory_max_size"), number_of(section, "spool_startup_interval"));
        break;
    case section_type::standard:
        addDefaultElement(data, name, text_of(section, "dest", fill_in_dest), number_of(section, "tracesize"),
                          text_of(section, "spooling", fill_in_spooling));
        break;
    }
}
} // namespace

qn_int32_t addTraceElement(trace_conf_data_t *data, const char *sect_name, const char *dst, const char *pat,
                           qn_uint32_t iPages, qn_uint32_t iSize, qn_uint32_t iTraceSize, const char *onoff)
{
    trace_config_element_t *element = new_element(data, TRACE_ELEMENT, sect_name);
    if (element == nullptr) return QN_TR_ENOMEM;
    trace_element_t &trace = element->element.trace_element;
    copy_cut(trace.dest, dst);
    copy_cut(trace.pattern, pat);
    copy_cut(trace.spooling, onoff);
    trace.pages = iPages;
    trace.pg_size = iSize;
    trace.trace_size = iTraceSize;
    return 0;
}

qn_int32_t addSpoolElement(trace_conf_data_t *data, const char *sect_name, const char *spdir, const char *spcleanup,
                           qn_uint32_t spinterval, qn_uint32_t spretentiondays, qn_uint32_t spspoolsz,
                           qn_uint32_t spstartupinterval)
{
    trace_config_element_t *element = new_element(data, SPOOL_ELEMENT, sect_name);
    if (element == nullptr) return QN_TR_ENOMEM;
    spool_element_t &spool = element->element.spool_element;
    copy_cut(spool.spool_dir, spdir);
    copy_cut(spool.cleanup, spcleanup);
    spool.cleanup_interval = spinterval;
    spool.retention_days = spretentiondays;
    spool.dir_size = spspoolsz;
    spool.startup_interval = spstartupinterval;
    return 0;
}

qn_int32_t addDefaultElement(trace_conf_data_t *data, const char *sect_name, const char *dst, qn_uint32_t iTraceSize,
                             const char *onoff)
{
    trace_config_element_t *element = new_element(data, DEFAULT_ELEMENT, sect_name);
    if (element == nullptr) return QN_TR_ENOMEM;
    default_element_t &standard = element->element.default_element;
    copy_cut(standard.dest, dst);
    copy_cut(standard.spooling, onoff);
    standard.trace_size = iTraceSize;
    return 0;
}

const char *getValueFromKVList(const trace_raw_section_t *section, const char *key)
{
    for (qn_int32_t i = 0; i < section->num_element; ++i)
        if (std::strcmp(section->kv_list[i].key, key) == 0) return section->kv_list[i].pValue;
    return nullptr;
}

qn_int32_t tr_parse_section(const trace_chunk_t *, trace_conf_data_t **, int) { return 0; }

qn_int32_t tr_parse_all_sections_1(trace_raw_config_t *pTraceRawCfg, trace_conf_data_t **pTraceConfData, int)
{
    // Of the default section only the trace size reaches the trace sections: its destination and its switch do not, so
    // that no trace is spooled that is not said to be.
    const trace_raw_section_t *standard = tr_find_section_by_name_1(pTraceRawCfg, "default");
    const qn_uint32_t trace_size = standard != nullptr ? number_of(standard, "tracesize") : 0;

    auto *data = static_cast<trace_conf_data_t *>(std::calloc(1, sizeof(trace_conf_data_t)));
    if (data == nullptr) return QN_TR_ENOMEM;
    for (qn_int32_t i = 0; i < pTraceRawCfg->num_element; ++i) {
        const trace_raw_section_t *section = section_of(pTraceRawCfg->ppChunkLst[i]);
        if (section != nullptr && section->bErr_flag != 1) add_section(data, section, trace_size);
    }
    *pTraceConfData = data;
    return 0;
}

void tr_free_trace_conf_data_1(trace_conf_data_t *pTraceConfData)
{
    if (pTraceConfData == nullptr) return;
    for (qn_uint32_t i = 0; i < pTraceConfData->num_elements; ++i) std::free(pTraceConfData->pTraceConfigElement[i]);
    std::free(pTraceConfData->pTraceConfigElement);
    std::free(pTraceConfData);
}

void printTraceConfData(const trace_conf_data_t *data)
{
    std::printf("\n\n printTraceConfData -- start Trace Conf Data \n");
    for (qn_uint32_t i = 0; i < data->num_elements; ++i) {
        const trace_config_element_t *element = data->pTraceConfigElement[i];
        std::printf("%s:\n", element->sect_name);
        if (element->elementType == TRACE_ELEMENT) {
            std::printf("pat=%s\n", element->element.trace_element.pattern);
            std::printf("dest=%s\n", element->element.trace_element.dest);
        } else if (element->elementType == SPOOL_ELEMENT) {
            std::printf("spooldir=%s\n", element->element.spool_element.spool_dir);
        }
    }
    std::printf(" printTraceConfData -- end Trace Conf Data \n");
}
