// The raw configuration: building, searching, freeing and printing it. No lock; whoever builds one has it alone.
#include "trace/traceutils/raw_config.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string_view>

#include "trace/files/error_report.h"
#include "trace/files/text.h"
#include "trace/traceutils/traceutils.h"

using namespace qn::tr;

namespace
{
constexpr size_t chunk_step = 100;
constexpr size_t pair_step = 10;

size_t entries(qn_int32_t count) { return static_cast<size_t>(count); }
} // namespace

namespace qn::tr
{
section_type type_of_section(const char *name)
{
    constexpr std::string_view spool_prefix = "spoolarea_";
    if (std::strcmp(name, "default") == 0) return section_type::standard;
    return std::strncmp(name, spool_prefix.data(), spool_prefix.size()) == 0 ? section_type::spool
                                                                             : section_type::trace;
}

const trace_raw_section_t *section_of(const trace_chunk_t *chunk)
{
    return chunk->chunk_type == section_chunk ? static_cast<const trace_raw_section_t *>(chunk->pChunk) : nullptr;
}

qn_int32_t append_raw_text(trace_raw_section_t *section, raw_text_room &room, const char *line)
{
    const size_t bytes = std::strlen(line) + 1;
    if (room.allocated - room.length < bytes) {
        const size_t wanted = std::max(room.length + bytes, 2 * room.allocated);
        void *larger = std::realloc(section->pUntokenized_data, wanted);
        if (larger == nullptr) return set_error(QN_TR_ENOMEM, 14);
        section->pUntokenized_data = static_cast<char *>(larger);
        room.allocated = wanted;
    }
    std::memcpy(section->pUntokenized_data + room.length, line, bytes);
    room.length += bytes - 1;
    return 0;
}

void free_raw_section(trace_raw_section_t *section)
{
    for (qn_int32_t i = 0; i < section->num_element; ++i) std::free(section->kv_list[i].pValue);
    std::free(section->kv_list);
    std::free(section->pUntokenized_data);
    std::free(section);
}
} // namespace qn::tr

qn_int32_t addRawElement(trace_raw_config_t *config, qn_int32_t type, void *data)
{
    auto *chunk = static_cast<trace_chunk_t *>(std::malloc(sizeof(trace_chunk_t)));
    if (chunk == nullptr) return set_error(QN_TR_ENOMEM, 14);
    if (!make_room<chunk_step>(config->ppChunkLst, entries(config->num_element))) {
        std::free(chunk);
        return set_error(QN_TR_ENOMEM, 14);
    }
    chunk->chunk_type = type == comment_chunk ? comment_chunk : section_chunk;
    chunk->pChunk = data;
    config->ppChunkLst[config->num_element++] = chunk;
    return 0;
}

qn_int32_t addKeyValue(trace_raw_section_t *section, const char *key, const char *value)
{
    char *copy = strdup(value);
    if (copy == nullptr) return set_error(QN_TR_ENOMEM, 14);
    if (!make_room<pair_step>(section->kv_list, entries(section->num_element))) {
        std::free(copy);
        return set_error(QN_TR_ENOMEM, 14);
    }
    key_value_t &pair = section->kv_list[section->num_element++];
    copy_cut(pair.key, key);
    pair.pValue = copy;
    return 0;
}

qn_int32_t appendRawString(trace_raw_section_t *section, const char *line)
{
    raw_text_room room;
    if (section->pUntokenized_data != nullptr) {
        room.length = std::strlen(section->pUntokenized_data);
        room.allocated = room.length + 1;
    }
    return append_raw_text(section, room, line);
}

const trace_raw_section_t *tr_find_section_by_name_1(trace_raw_config_t *pTraceRawCfg, const char *sectname)
{
    for (qn_int32_t i = 0; i < pTraceRawCfg->num_element; ++i) {
        const trace_raw_section_t *section = section_of(pTraceRawCfg->ppChunkLst[i]);
        if (section != nullptr && section->bErr_flag == 0 && std::strcmp(section->sect_name, sectname) == 0)
            return section;
    }
    return nullptr;
}

void tr_free_trace_raw_config_1(trace_raw_config_t *pTraceRawCfg)
{
    if (pTraceRawCfg == nullptr) return;
    for (qn_int32_t i = 0; i < pTraceRawCfg->num_element; ++i) {
        trace_chunk_t *chunk = pTraceRawCfg->ppChunkLst[i];
        if (chunk->chunk_type == section_chunk)
            free_raw_section(static_cast<trace_raw_section_t *>(chunk->pChunk));
        else
            std::free(chunk->pChunk);
        std::free(chunk);
    }
    std::free(pTraceRawCfg->ppChunkLst);
    std::free(pTraceRawCfg);
}

void printConf(const trace_raw_config_t *config)
{
    std::printf("\n\n printConf - start \n");
    for (qn_int32_t i = 0; i < config->num_element; ++i) {
        const trace_raw_section_t *section = section_of(config->ppChunkLst[i]);
        if (section == nullptr) {
            std::printf("%s \n", static_cast<const char *>(config->ppChunkLst[i]->pChunk));
        } else if (section->bErr_flag == 0) {
            std::printf("%s:\n", section->sect_name);
            for (qn_int32_t k = 0; k < section->num_element; ++k)
                std::printf("%s=%s\n", section->kv_list[k].key, section->kv_list[k].pValue);
        }
    }
    std::printf("RAW String \n");
    for (qn_int32_t i = 0; i < config->num_element; ++i) {
        const trace_raw_section_t *section = section_of(config->ppChunkLst[i]);
        if (section != nullptr && section->pUntokenized_data != nullptr)
            std::printf("\n%s \n", section->pUntokenized_data);
    }
    std::printf(" printConf - End \n");
}
