// A page set of four pages that gets another specification while nothing empties the spool queue.
#pragma once

#include <cstdlib>
#include <cstring>
#include <fstream>
#include <string>
#include <vector>

#include "files/page_set.h"
#include "spooling/spool_support.h"

namespace qn::test
{
class ChangingRing : public PageSet
{
protected:
    static constexpr uint8_t active = 1;
    static constexpr uint8_t full = 2;
    static constexpr uint8_t ready = 4;
    static constexpr uint8_t being_spooled = 8;

    void SetUp() override
    {
        std::strcpy(spool.dest, "/dev/null");
        guard_mappings();
        ASSERT_EQ(start_set("t", 4, 262144), 0);
        after.onoff = 1;
        std::strcpy(after.dest, "/dev/null");
    }
    void TearDown() override
    {
        stop(head);
        for (trace_anchor_t *page = head->p_obsolete_pages; page != nullptr; page = page->next) stop(page);
        while (sp_q_element_t *element = spool_dequeue_last_element_inside_spq(&spq)) std::free(element);
    }

    // The set is governed by `after` from here on, with that many pages.
    void change_to(qn_uint32_t pages) { change(spool, after, pages); }
    // And back by the one before.
    void change_back_to(qn_uint32_t pages) { change(after, spool, pages); }
    trace_anchor_t *add(qn_uint32_t pages)
    {
        after.pages = pages;
        const qn::tr::anchor_set_lock set(head);
        return add_new_pages(head, &spool, &after, page(4));
    }
    // Binds the trace again, to what it is bound to.
    void process()
    {
        const qn::tr::global_lock global;
        const qn::tr::anchor_set_lock set(head);
        head->bSpoolProcessed = 0;
        process_spool_spec(head, nullptr);
    }
    void enqueue(int number) const
    {
        page(number)->pMap[192] = full;
        spool_enqueue(nullptr, nullptr, page(number), &spq, 0);
    }

    // The file names of the ring, and of the obsolete pages, without the folder.
    std::vector<std::string> ring() const
    {
        std::vector<std::string> names;
        qn::tr::for_each_page(head, [&](const trace_anchor_t *page) { names.push_back(base_name(page)); });
        return names;
    }
    std::vector<std::string> obsolete() const
    {
        std::vector<std::string> names;
        const trace_anchor_t *last = nullptr;
        for (const trace_anchor_t *page = head->p_obsolete_pages; page != nullptr; page = page->next) {
            names.push_back(base_name(page));
            last = page;
        }
        EXPECT_EQ(head->p_obsolete_pages_tail, last);
        return names;
    }
    int mappings(const std::string &name) const
    {
        std::ifstream maps("/proc/self/maps");
        int count = 0;
        for (std::string line; std::getline(maps, line);) count += line.ends_with(folder / name) ? 1 : 0;
        return count;
    }
    bool is_mapped(const std::string &name) const { return mappings(name) > 0; }

    trace_spool_spec_t after{};

private:
    std::string base_name(const trace_anchor_t *page) const
    {
        return std::string(page->fileName).substr(folder.folder().size() + 1);
    }
    void change(trace_spool_spec_t &from, trace_spool_spec_t &to, qn_uint32_t pages)
    {
        to.pages = pages;
        const qn::tr::anchor_set_lock set(head);
        head->spool = &to;
        reconfigure_pages(head, &from, &to);
    }
};
} // namespace qn::test
