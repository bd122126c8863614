#include "recording/ring_model.h"

#include <gtest/gtest.h>

namespace
{
constexpr uint32_t ring_start = 200;
constexpr uint32_t header_bytes = 28;
constexpr uint32_t filler_sequence = 4095;
constexpr uint16_t start_kind = 16;
} // namespace

namespace qn::test
{
ring_model::ring_model(uint32_t file_bytes)
    : file_bytes_(file_bytes), longest_((file_bytes - ring_start) / 2 / 4 * 4), free_(ring_start)
{
    records_[ring_start].length = file_bytes - ring_start;
}

void ring_model::forget(ring::iterator gone)
{
    if (gone->second.function == start_kind) overwritten_start_ = gone->second.seen;
    records_.erase(gone);
}

bool ring_model::write(uint16_t function, const std::string &component, const expected_bytes &body)
{
    const auto wanted = static_cast<uint32_t>(header_bytes + body.size());
    if (wanted > longest_) return false;

    uint32_t span = 0;
    uint32_t at = free_;
    while (span < wanted + header_bytes) {
        if (at == file_bytes_) {
            record &filler = records_[free_];
            filler.length = span;
            filler.sequence = last_sequence_ += 2;
            at = free_ = ring_start;
            span = 0;
        }
        const auto consumed = records_.find(at);
        EXPECT_NE(consumed, records_.end()) << "no record begins at " << at;
        if (consumed == records_.end()) return false;
        span += consumed->second.length;
        at += consumed->second.length;
        forget(consumed);
    }

    newest_ = free_;
    record &written = records_[newest_];
    written.function = function;
    written.component = component;
    written.body = body;
    written.sequence = last_sequence_ += 2;
    if (span == wanted + header_bytes) {
        written.length = span;
        free_ += span;
        if (free_ == file_bytes_) free_ = ring_start;
    } else {
        written.length = wanted;
        free_ += wanted;
        record &rest = records_[free_];
        rest.length = span - wanted;
        rest.sequence = filler_sequence;
    }
    return true;
}

void ring_model::stamped(uint64_t from, uint64_t to, uint32_t thread)
{
    records_[newest_].stamped_from = from;
    records_[newest_].stamped_to = to;
    records_[newest_].thread = thread;
}

void ring_model::expect_equal(const trace_image &image)
{
    ASSERT_EQ(image.size(), file_bytes_);
    ASSERT_EQ(image.oldest_offset(), free_);
    const auto ring = image.ring();
    ASSERT_EQ(ring.size(), records_.size());
    auto expected = records_.find(free_);
    for (const record_image &found : ring) {
        ASSERT_EQ(found.offset, expected->first);
        record &record = expected->second;
        ASSERT_EQ(found.length(), record.length) << "at " << found.offset;
        ASSERT_EQ(found.function(), record.function) << "at " << found.offset;
        ASSERT_EQ(found.sequence(), record.sequence) << "at " << found.offset;
        if (record.function != 0) {
            ASSERT_EQ(found.component(), record.component) << "at " << found.offset;
            ASSERT_EQ(found.thread(), record.thread) << "at " << found.offset;
            ASSERT_GE(found.time_stamp(), record.stamped_from) << "at " << found.offset;
            ASSERT_LE(found.time_stamp(), record.stamped_to) << "at " << found.offset;
            ASSERT_TRUE(record.body.match(found.bytes, header_bytes))
                << "at " << found.offset << ", kind " << record.function << "\nexpected " << record.body
                << "\n   found " << hexadecimal(found.bytes.substr(header_bytes));
            if (record.function == start_kind) record.seen = found.bytes;
        }
        if (++expected == records_.end()) expected = records_.begin();
    }
}
} // namespace qn::test
