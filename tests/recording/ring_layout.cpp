#include "recording/ring_layout.h"

#include <cstring>

#include <gtest/gtest.h>

namespace
{
template <class Number>
void poke(size_t at, Number value)
{
    std::memcpy(anchors.pMap + at, &value, sizeof value);
}
} // namespace

namespace qn::test
{
void lay_out(const std::vector<planned_record> &records, size_t oldest, uint32_t last_sequence)
{
    size_t at = 200;
    for (size_t i = 0; i < records.size(); ++i) {
        if (i == oldest) {
            anchors.pNextFree = reinterpret_cast<trace_record_header_t *>(anchors.pMap + at);
            poke_u32(44, static_cast<uint32_t>(at));
        }
        std::memset(anchors.pMap + at, 0xAB, 28);
        poke_u32(at, records[i].length);
        poke_u16(at + 4, records[i].function);
        poke_u32(at + 8, records[i].sequence);
        at += records[i].length;
    }
    EXPECT_EQ(at, anchors.uActualFileSize) << "the planned records do not fill the file";
    anchors.seqNumber = last_sequence;
}

void poke_u32(size_t at, uint32_t value) { poke(at, value); }
void poke_u64(size_t at, uint64_t value) { poke(at, value); }
void poke_u16(size_t at, uint16_t value) { poke(at, value); }

allocated allocate(uint32_t length)
{
    allocated result;
    unsigned int asked_for = length;
    EXPECT_EQ(lock_anchor_set(&anchors), 0);
    const trace_record_header_t *record = allocate_space_page(&anchors, &asked_for);
    result.asked_for = asked_for;
    if (record != nullptr) {
        result.given = true;
        result.offset = static_cast<uint32_t>(reinterpret_cast<const unsigned char *>(record) - anchors.pMap);
        result.length = record->length;
    }
    unlock_anchor_set(&anchors);
    return result;
}

std::string standard_error_of(const std::function<void()> &body)
{
    testing::internal::CaptureStderr();
    body();
    return testing::internal::GetCapturedStderr();
}
} // namespace qn::test
