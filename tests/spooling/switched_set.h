// A page set of three pages whose pages are switched by hand, while nothing empties the spool queue.
#pragma once

#include <cinttypes>
#include <cstdio>
#include <cstdlib>
#include <regex>
#include <string>

#include "files/page_set.h"
#include "spooling/spool_support.h"

namespace qn::test
{
class SwitchedSet : public PageSet
{
protected:
    static constexpr uint8_t active = 1;
    static constexpr uint8_t full = 2;
    static constexpr uint8_t ready = 4;
    static constexpr uint8_t being_spooled = 8;
    static constexpr size_t reuse_time = 188; // offset in the header
    static constexpr qn_uint32_t page_bytes = 65536;
    static constexpr unsigned int too_long = 60000; // for a record in such a page

    void SetUp() override
    {
        guard_mappings();
        ASSERT_EQ(start_set("t", 3), 0);
    }
    void TearDown() override
    {
        stop(head);
        while (sp_q_element_t *element = spool_dequeue_last_element_inside_spq(&spq)) std::free(element);
    }

    uint8_t state(int number) const { return page(number)->pMap[192]; }
    void put_state(int number, uint8_t value) const { page(number)->pMap[192] = value; }
    // The page's bytes as they are now.
    trace_image image_of(int number) const { return trace_image::of_file(page(number)->fileName); }
    long offset_in(int number, const trace_record_header_t *record) const
    {
        return reinterpret_cast<const unsigned char *>(record) - page(number)->pMap;
    }

    // Leaves the page as full for a record of that length.
    trace_record_header_t *switch_from(int number, unsigned int length = 32)
    {
        const qn::tr::anchor_set_lock set(head);
        return pageFull(page(number), &length);
    }

    // What is logged about the page. What the flags are at that moment is nobody's business.
    std::regex switch_line(const std::string &what, int number) const
    {
        char place[32];
        std::snprintf(place, sizeof place, "0x%" PRIxPTR, reinterpret_cast<uintptr_t>(page(number)));
        return std::regex(literal_pattern(page(number)->fileName) + " " + what + R"( \(flags: \d+, tid: )" +
                          std::to_string(static_cast<qn_uint32_t>(pthread_self())) + ", pNextPage: " + place +
                          R"(\)\n)");
    }
};
} // namespace qn::test
