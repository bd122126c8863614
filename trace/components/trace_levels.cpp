// Trace level specifications: the language, its application, and tr_set_trace_levels_1. Global mutex.
//
//   element { "," element }     element: [blanks] component ":" category [ "=" [blanks] level [blanks] ]
#include <algorithm>
#include <cstdlib>

#include "trace/components/patterns.h"
#include "trace/components/specifications.h"
#include "trace/files/library.h"
#include "trace/files/locks.h"
#include "trace/files/trace_file.h"

namespace
{
using namespace qn::tr;

constexpr qn_int32_t default_level = -1;

// Up to the "=" or the element's end, without the blanks before that; those in front belong to the pattern.
int scan_category_pattern(specification_text &from, size_t end, pattern_text &category)
{
    const size_t start = from.at;
    const std::string_view element = from.text.substr(0, end); // else a long text is searched to its end for each
    from.at = std::min(end, element.find('=', start));
    size_t length = from.at - start;
    while (length > 0 && from.text[start + length - 1] == ' ') --length;
    if (length == 0) return set_error_int(QN_TR_ESPECCAT, 12, static_cast<int>(from.at));
    category = {start, from.text.substr(start, length)};
    return 0;
}

// Behind the "=". The text goes on behind the element, or ends with a NUL, so strtoul stops in time.
int scan_level(specification_text &from, size_t end, qn_int32_t &level)
{
    from.skip_blanks(end);
    const char *start = from.text.data() + from.at;
    char *behind = nullptr;
    level = static_cast<qn_int32_t>(std::strtoul(start, &behind, 0));
    from.at += static_cast<size_t>(behind - start);
    from.skip_blanks(end);
    if (behind == start || !from.at_end(end)) return set_error_int(QN_TR_ESPECLEVEL, 13, static_cast<int>(from.at));
    return 0;
}

int parse_element(specification_text &from, size_t end, trace_level_spec_t *&first, trace_level_spec_t *&last)
{
    from.skip_blanks(end);
    if (from.at_end(end)) return set_error_int(QN_TR_ESPECCOMP, 10, static_cast<int>(from.at));

    pattern_pair pair;
    qn_int32_t level = default_level;
    int status = scan_component_pattern(from, end, pair.component);
    if (status == 0) status = scan_category_pattern(from, end, pair.category);
    if (status == 0 && !from.at_end(end)) {
        ++from.at;
        status = scan_level(from, end, level);
    }
    if (status == 0) status = append_pair(first, last, pair);
    if (status == 0) last->detailLevel = level;
    return status;
}

void set_level(const trace_level_spec_t *spec, component_anchor_t *component, int entry)
{
    const tr_category_description_t &category = component->categories[entry];
    const qn_uint32_t level = spec->detailLevel == default_level ? category.default_level_of_detail
                                                                 : std::max(static_cast<qn_uint32_t>(spec->detailLevel),
                                                                            category.minimum_level_of_detail);
    // Of a level above 255 the low eight bits count.
    store_relaxed(component->pDetailLevels[category.category_id], static_cast<tr_detail_level_t>(level));
}

// Chains a list of new specifications behind the anchor's.
void keep(trace_level_spec_t *first, trace_level_spec_t *last)
{
    if (anchors.pLastTraceSpec != nullptr)
        anchors.pLastTraceSpec->pNext = first;
    else
        anchors.pFirstTraceSpec = first;
    first->pPrev = anchors.pLastTraceSpec;
    anchors.pLastTraceSpec = last;
}
} // namespace

void cancel_parse_trace_spec(void *pArg)
{
    auto *before = static_cast<cancel_parse_trace_spec_data_t *>(pArg);
    roll_back(*before->ppFirst, *before->ppLast, before->pLast);
}

int parse_trace_spec(const char *pString, trace_level_spec_t **pFirstTraceSpec, trace_level_spec_t **pLastTraceSpec)
{
    specification_text from{pString};
    list_change change(*pFirstTraceSpec, *pLastTraceSpec);
    while (!from.at_end(from.text.size())) {
        const size_t end = std::min(from.text.size(), from.text.find(',', from.at));
        const int status = parse_element(from, end, *pFirstTraceSpec, *pLastTraceSpec);
        if (status != 0) return status;
        from.at = end + 1;
    }
    change.done();
    return 0;
}

int process_trace_spec(trace_anchor_t *pAnchor, trace_level_spec_t *pTraceSpec, component_anchor_t *pTgtComp)
{
    for_each_match(pAnchor, pTraceSpec, pTgtComp,
                   [=](component_anchor_t *component, int entry) { set_level(pTraceSpec, component, entry); });
    return 0;
}

qn_int32_t tr_set_trace_levels_1(const qn_char_t *pLevelString)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    qn_int32_t status = 0;
    {
        const global_lock global;
        if (!global) return set_error_int(QN_TR_ELOCK, 9, global.result());
        status = init_default_anchor();
        if (status != 0) return status;

        trace_level_spec_t *first = nullptr;
        trace_level_spec_t *last = nullptr;
        list_change change(first, last);
        status = parse_trace_spec(pLevelString, &first, &last);
        if (status != 0) return status;
        for (trace_level_spec_t *spec = first; spec != nullptr; spec = spec->pNext)
            process_trace_spec(&anchors, spec, nullptr);
        if (first != nullptr) keep(first, last);
        change.done();
        status = start_traces_that_are_on();
    }
    return status != 0 ? status : cu_set_no_error_1();
}
