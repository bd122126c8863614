// A writer of one ring that does its stores one by one, in the order that docs/format.md documents, so that a test can
// look at the file between any two of them.
#pragma once

#include <cstdint>
#include <functional>
#include <vector>

#include "reader/trace_builder.h"

namespace qn::test
{

class model_writer
{
public:
    // Called after every store.
    using after_store = std::function<void()>;

    model_writer(std::size_t ring_bytes, after_store stored);

    // A record of 32-bit values that repeats its number in every field and in `words` values, so that a torn one is
    // noticed.
    void write(std::uint32_t words);
    // The stores of a record but for the last one, as of a writer that dies.
    void begin_and_die(std::uint32_t words);
    // The newest number, which may be a filler's.
    std::uint32_t last_seq() const { return seq_; }
    // The numbers of the records that were completed.
    const std::vector<std::uint32_t> &written() const { return written_; }

    std::span<const std::byte> bytes() const { return file_.bytes(); }

private:
    void store_u16(std::size_t at, std::uint16_t value);
    void store_u32(std::size_t at, std::uint32_t value);
    std::uint32_t u32(std::size_t at) const;
    std::uint32_t claim(std::uint32_t length);

    trace_builder file_;
    after_store stored_;
    std::size_t free_ = 200; // where the next record goes
    std::uint32_t seq_ = 0;
    std::vector<std::uint32_t> written_;
};

} // namespace qn::test
