#include "reader/follow/model_writer.h"

#include <stdexcept>
#include <utility>

#include "tools/qntrace/reader/bytes.h"

namespace qn::test
{
namespace
{

constexpr std::size_t ring_begin = 200;
constexpr std::uint32_t record_header = 28;
constexpr std::uint32_t fixed_part = 36;
constexpr std::uint16_t values_kind = 12;
constexpr std::uint16_t unfinished = 0xFFFF;
constexpr std::size_t oldest_at = 44;

} // namespace

model_writer::model_writer(std::size_t ring_bytes, after_store stored) : file_(ring_begin + ring_bytes), stored_([] {})
{
    file_.add_free(ring_bytes, 0);
    file_.set_oldest(ring_begin);
    stored_ = std::move(stored);
}

void model_writer::store_u16(std::size_t at, std::uint16_t value)
{
    file_.put_u16(at, value);
    stored_();
}

void model_writer::store_u32(std::size_t at, std::uint32_t value)
{
    file_.put_u32(at, value);
    stored_();
}

std::uint32_t model_writer::u32(std::size_t at) const
{
    return reader::byte_view(file_.bytes(), reader::byte_order::little).u32(at);
}

// Takes the space; where the record is.
std::uint32_t model_writer::claim(std::uint32_t length)
{
    const std::size_t end = file_.bytes().size();
    bool wrapped = false;
    std::size_t next = free_;
    std::uint32_t consumed = 0;
    while (consumed < length + record_header) {
        consumed += u32(next);
        next += u32(next);
        if (consumed >= length + record_header || next < end) continue;
        if (std::exchange(wrapped, true)) throw std::logic_error("the record is longer than the ring");
        store_u16(free_ + 4, unfinished);
        store_u32(free_, consumed);
        store_u32(free_ + 8, seq_ += 2);
        store_u32(oldest_at, ring_begin);
        store_u16(free_ + 4, 0);
        free_ = next = ring_begin;
        consumed = 0;
    }
    const std::size_t record = free_;
    store_u16(record + 4, unfinished);
    store_u32(record, consumed);
    store_u32(record + 8, seq_ += 2);
    if (consumed == length + record_header) {
        free_ = record + consumed == end ? ring_begin : record + consumed;
    } else {
        free_ = record + length;
        store_u32(free_, consumed - length);
        store_u16(free_ + 4, 0);
        store_u32(free_ + 8, 4095);
        store_u32(record, length);
    }
    store_u32(oldest_at, static_cast<std::uint32_t>(free_));
    return static_cast<std::uint32_t>(record);
}

void model_writer::begin_and_die(std::uint32_t words) { claim(fixed_part + 4 * words); }

void model_writer::write(std::uint32_t words)
{
    const std::size_t record = claim(fixed_part + 4 * words);
    store_u32(record + 16, seq_);
    store_u32(record + 20, seq_);
    store_u32(record + 24, 0);
    store_u32(record + 12, 0x54534554);
    store_u32(record + 28, seq_);
    store_u32(record + 32, words);
    for (std::uint32_t word = 0; word < words; ++word) store_u32(record + fixed_part + 4 * word, seq_);
    written_.push_back(seq_);
    store_u16(record + 4, values_kind);
}

} // namespace qn::test
