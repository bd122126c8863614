// File maps: the language, its application, and tr_set_file_map_1. Global mutex.
//
//   element { ";" element }     element: file [","] [blanks] selection     selection: component ":" category
#include <algorithm>
#include <cstring>

#include "trace/components/patterns.h"
#include "trace/components/specifications.h"
#include "trace/files/library.h"
#include "trace/files/locks.h"
#include "trace/files/trace_file.h"

namespace
{
using namespace qn::tr;

// From behind the ":" to the first blank; what follows that is ignored.
int scan_category_pattern(specification_text &from, size_t end, pattern_text &category)
{
    const size_t start = from.at;
    from.at = std::min(end, from.text.find(' ', start));
    if (from.at == start) return set_error_int(QN_TR_ESPECCAT, 12, static_cast<int>(start));
    category = {start, from.text.substr(start, from.at - start)};
    return 0;
}

// One pair a selection: whatever is behind a comma at its end would never be looked at.
int refuse_continuation(const specification_text &from, size_t end)
{
    if (from.text.find_first_not_of(' ', std::min(end + 1, from.text.size())) == std::string_view::npos) return 0;
    return set_error_int(QN_TR_ESPECSEP, 11, static_cast<int>(end));
}

int append_selection(const char *file_name, std::string_view selection, trace_map_spec_t *&first,
                     trace_map_spec_t *&last)
{
    specification_text from{selection};
    const size_t whole = selection.size();
    if (whole == 0) return set_error_int(QN_TR_ESPECSEP, 11, 0);
    from.skip_blanks(whole);
    if (!from.at_end(whole) && selection[from.at] == ',') {
        ++from.at;
        from.skip_blanks(whole);
    }
    const size_t end = std::min(whole, selection.find(',', from.at));

    pattern_pair pair;
    list_change change(first, last);
    int status = scan_component_pattern(from, end, pair.component);
    if (status == 0) status = scan_category_pattern(from, end, pair.category);
    if (status == 0) status = refuse_continuation(from, end);
    if (status == 0) status = append_pair(first, last, pair);
    if (status != 0) return status;
    std::strncpy(last->fileName, file_name, sizeof last->fileName - 1);
    change.done();
    return 0;
}
} // namespace

const char *parseFileName(const char *source, const char *lastPos, char *fileName, int len)
{
    const char *at = source;
    const auto skip_blanks = [&] {
        while (at < lastPos && *at == ' ') ++at;
    };
    skip_blanks();
    const bool quoted = at < lastPos && *at == '"';
    if (quoted) ++at;
    const char *start = at;
    while (at < lastPos && *at != '"' && (quoted || (*at != ',' && *at != ' '))) ++at;
    const auto length = std::min<size_t>(static_cast<size_t>(at - start), static_cast<size_t>(len) - 1);
    std::memcpy(fileName, start, length);
    fileName[length] = '\0';

    if (at < lastPos && *at == '"') ++at;
    if (at < lastPos && *at == ',') ++at;
    skip_blanks();
    return at;
}

int tr_set_file_map_chain(const char *fileName, const char *selectString, trace_map_spec_t **pFirstMapSpec,
                          trace_map_spec_t **pLastMapSpec)
{
    return append_selection(fileName, selectString, *pFirstMapSpec, *pLastMapSpec);
}

int parse_map_spec(const char *pString, trace_map_spec_t **pFirstMapSpec, trace_map_spec_t **pLastMapSpec)
{
    if (pString[0] == '\0') return QN_TR_EFILENAME; // no message: the value says nothing
    for (const char *at = pString; *at != '\0';) {
        const char *end = strchrnul(at, ';');
        char file_name[trace_file_name_bytes];
        const char *selection = parseFileName(at, end, file_name, sizeof file_name);
        if (selection >= end) return set_error_int(QN_TR_ESPECSEP, 11, static_cast<int>(selection - pString));
        const int status = append_selection(file_name, {selection, static_cast<size_t>(end - selection)},
                                            *pFirstMapSpec, *pLastMapSpec);
        if (status != 0) return status;
        at = *end == ';' ? end + 1 : end;
    }
    return 0;
}

int process_map_spec(trace_anchor_t *pAnchor, trace_map_spec_t *pMapSpec, component_anchor_t *pTgtComp)
{
    pMapSpec->lacks_file = false;
    // By position, where levels go by category_id.
    const bool compiled = for_each_match(pAnchor, pMapSpec, pTgtComp, [=](component_anchor_t *component, int entry) {
        component->pMappedBy[entry] = pMapSpec;
        trace_anchor_t *anchor = findOrCreateAnchorForFile(pMapSpec->fileName, 1);
        if (anchor == nullptr) pMapSpec->lacks_file = true;
        store_relaxed(component->pFileTokens[entry], anchor);
    });
    pMapSpec->matched = compiled && (pMapSpec->matched || pTgtComp == nullptr);
    return 0;
}

namespace
{
// What applying the elements that were matched before comes to: each category has the file of the last of them that
// matched it. Matching all of them again at every call would make a map that is given in many calls a matter of minutes.
void apply_matched_elements()
{
    for (trace_map_spec_t *spec = anchors.pFirstMapSpec; spec != nullptr; spec = spec->pNext) {
        spec->anchor_p = nullptr;
        spec->lacks_file = false;
    }
    for (component_anchor_t *component = anchors.pFirstComp; component != nullptr; component = component->pNext) {
        for (int i = 0; i < component->numberOfCategories; ++i) {
            trace_map_spec_t *spec = component->pMappedBy[i];
            if (spec == nullptr) continue;
            if (spec->anchor_p == nullptr) spec->anchor_p = findOrCreateAnchorForFile(spec->fileName, 1);
            spec->lacks_file = spec->anchor_p == nullptr;
            store_relaxed(component->pFileTokens[i], spec->anchor_p);
        }
    }
}

// All elements, in their order.
void apply_file_map()
{
    apply_matched_elements();
    trace_map_spec_t *spec = anchors.pFirstMapSpec;
    while (spec != nullptr && spec->matched) spec = spec->pNext;
    for (; spec != nullptr; spec = spec->pNext) process_map_spec(&anchors, spec, nullptr);
}
} // namespace

qn_int32_t qn::tr::check_mapped_files()
{
    const trace_map_spec_t *spec = anchors.pFirstMapSpec;
    while (spec != nullptr && !spec->lacks_file) spec = spec->pNext;
    return spec != nullptr ? set_error(QN_TR_ENOMEM, 14) : 0;
}

qn_int32_t tr_set_file_map_1(const char *fileName, const char *selectString)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    if (master_override_off()) return 0;
    if (fileName == nullptr) return set_error(QN_TR_EFILENAME, 17);
    qn_int32_t status = 0;
    {
        const global_lock global;
        if (!global) return set_error_int(QN_TR_ELOCK, 9, global.result());
        status = init_default_anchor();
        if (status != 0) return status;
        status = tr_set_file_map_chain(fileName, selectString != nullptr ? selectString : "", &anchors.pFirstMapSpec,
                                       &anchors.pLastMapSpec);
        if (status != 0) return status;
        apply_file_map();
        status = start_traces_that_are_on();
        if (status == 0) status = check_mapped_files();
    }
    return status != 0 ? status : cu_set_no_error_1();
}
