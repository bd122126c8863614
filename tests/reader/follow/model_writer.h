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

    // An identifier record that repeats its number `words` times behind its header, so that a torn one is noticed; every
    // word but the first is written over with it.
    void write(std::uint32_t words);
    // The stores of a record but for the last one, as of a writer that dies.
    void begin_and_die(std::uint32_t words);
    // How many records were completed, and what the next one's number is.
    std::uint32_t last_seq() const { return seq_; }
    const std::vector<std::uint32_t> &written() const { return written_; }

    std::span<const std::byte> bytes() const { return file_.bytes(); }
    static constexpr std::uint16_t values_kind = 12;

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
