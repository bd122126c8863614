// The sound records of a file, in an order that no writer could object to.
//
// Sequence numbers that do not grow tell that a record is damaged, but not which one: of 10, 12, 78, 16 it is 78, of
// 10, 12, 4, 16 it is 4. So a record is handed out when the next one has come, and is left out when that one follows the
// record before it just as well. The first record has none before it, and gives way.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>

#include "tools/qntrace/reader/reader.h"
#include "tools/qntrace/select/last.h"

namespace qn::dump
{

class sound_records
{
public:
    // Also gets the time base that is in force for the record, possibly by a record that was left out.
    using record_sink = std::function<void(const reader::trace_record &, const cu_timeinfo_t &base)>;

    sound_records(const reader::file_header &header, record_sink sink);

    // Called with every record, fillers too. A filler with a number of its own, which closes off the end of the ring, is
    // handed out like a record: its number would be missing.
    void pass(const reader::trace_record &record);
    void finish();

    // Records with data that were left out.
    std::uint64_t left_out() const { return left_out_; }

private:
    void hold(const reader::trace_record &record);
    void drop_held();
    void hand_out_held();

    record_sink sink_;
    reader::current_time_base base_;
    last_records held_{1};
    cu_timeinfo_t base_of_held_ = {};
    bool held_has_data_ = false;
    std::optional<std::uint32_t> held_seq_; // nothing is held without it
    std::optional<std::uint32_t> last_seq_; // of those handed out
    std::uint64_t left_out_ = 0;
};

} // namespace qn::dump
