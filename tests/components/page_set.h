// A page set as spooling makes one, put together by hand: so that what happens to its pages can be tested without the
// configuration that asks for it.
#pragma once

#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "trace/trace.h"

namespace qn::test
{
// The set of `count` pages of the trace `name`, of `page_size` bytes each, not started. It belongs to the library's list
// of traces from here on, and lives as long as the process.
inline trace_anchor_t *make_page_set(const std::string &name, qn_uint32_t count, qn_uint32_t page_size)
{
    const auto page_name = [&](qn_uint32_t number) { return name + "." + std::to_string(number) + ".sp"; };
    trace_anchor_t *head = findOrCreateAnchorForFile(page_name(1).c_str(), 1);
    head->spool = static_cast<trace_spool_spec_t *>(std::calloc(1, sizeof(trace_spool_spec_t)));
    std::strcpy(head->spool->dest, "/dev/null");
    std::strcpy(head->spool->pattern, ".*");
    head->spool->pages = count;
    head->spool->pg_size = page_size;
    head->spool->onoff = 1;
    head->pSpoolMutex = static_cast<pthread_mutex_t *>(std::malloc(sizeof(qn::tr::biased_mutex)));
    init_biased_mutex(head->pSpoolMutex);
    head->uRequestedFileSize = page_size;
    head->bSpoolProcessed = 1;
    head->nextPage = head;
    head->pActivePg = head;
    head->ppActivePg = &head->pActivePg;
    head->p_head_spool_anchor = head;
    trace_anchor_t *last = head;
    for (qn_uint32_t number = 2; number <= count; ++number) {
        trace_anchor_t *page = getSplAnchor(head, page_name(number).c_str());
        page->nextPage = head;
        last->nextPage = page;
        last = page;
    }
    return head;
}

inline std::vector<trace_anchor_t *> pages_of(trace_anchor_t *head)
{
    std::vector<trace_anchor_t *> pages;
    qn::tr::for_each_page(head, [&](trace_anchor_t *page) { pages.push_back(page); });
    return pages;
}

inline std::vector<qn_uint32_t> requested_sizes(trace_anchor_t *head)
{
    std::vector<qn_uint32_t> sizes;
    for (const trace_anchor_t *page : pages_of(head)) sizes.push_back(page->uRequestedFileSize);
    return sizes;
}
} // namespace qn::test
