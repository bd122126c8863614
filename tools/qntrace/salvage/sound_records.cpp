#include "tools/qntrace/salvage/sound_records.h"

#include <utility>

#include "tools/qntrace/check/record_rules.h"
#include "trace/files/format.h"

namespace qn::dump
{
namespace
{

bool follows(std::uint32_t seq, std::uint32_t before) { return static_cast<std::int32_t>(seq - before) > 0; }

bool is_numbered_filler(const reader::trace_record &record)
{
    const std::uint32_t seq = record.raw.header.seq;
    return std::holds_alternative<reader::free_body>(record.body) && seq != 0 && seq % 2 == 0;
}

} // namespace

sound_records::sound_records(const reader::file_header &header, record_sink sink)
    : sink_(std::move(sink)), base_(header.time_info)
{
}

void sound_records::pass(const reader::trace_record &record)
{
    base_.pass(record.body);
    const bool has_data = reader::carries_data(record.body);
    if (!is_sound(record) && !is_numbered_filler(record)) {
        if (has_data) ++left_out_;
        return;
    }
    const std::uint32_t seq = record.raw.header.seq;
    if (held_seq_ && !follows(seq, *held_seq_)) {
        if (last_seq_ && !follows(seq, *last_seq_)) {
            if (has_data) ++left_out_;
            return;
        }
        drop_held();
    }
    hand_out_held();
    hold(record);
}

void sound_records::finish() { hand_out_held(); }

void sound_records::hold(const reader::trace_record &record)
{
    held_.keep(record);
    held_seq_ = record.raw.header.seq;
    held_has_data_ = reader::carries_data(record.body);
    base_of_held_ = base_.info();
}

void sound_records::drop_held()
{
    if (held_has_data_) ++left_out_;
    held_seq_.reset();
}

void sound_records::hand_out_held()
{
    if (!held_seq_) return;
    held_.for_each([this](const reader::trace_record &record) { sink_(record, base_of_held_); });
    last_seq_ = std::exchange(held_seq_, std::nullopt);
}

} // namespace qn::dump
