#include "tools/qntrace/check/file_check.h"

#include <algorithm>
#include <utility>

#include <fmt/format.h>

#include "tools/qntrace/check/header_rules.h"
#include "tools/qntrace/check/record_rules.h"
#include "tools/qntrace/traces/clock_steps.h"
#include "trace/files/format.h"

namespace qn::dump
{
namespace
{

using severity = reader::finding::severity;

class checker
{
public:
    explicit checker(reader::byte_source &source)
        : report_([this](const reader::finding &found) { take(found); }), trace_(source, report_)
    {
        if (!trace_.header()) return;
        std::vector<std::byte> bytes(qn::tr::format::header_bytes);
        bytes.resize(source.read_at(0, bytes));
        check_header(reader::byte_view(bytes, trace_.header()->order), *trace_.header(), report_);
    }

    file_check run()
    {
        const auto &header = trace_.header();
        if (!header) return std::move(result_);
        result_.readable = true;
        loss_counter lost(*header);
        while (const auto record = trace_.next()) check_record(*record, lost.pass(record->raw));
        result_.lost = lost.so_far();
        result_.ring_bytes = std::max<std::uint64_t>(header->file_size, header->ring.end) - header->ring.begin;
        result_.unreadable_bytes = trace_.unreadable_bytes();
        if (clock_.any()) report_({severity::note, std::nullopt, clock_.text()});
        return std::move(result_);
    }

private:
    void check_record(const reader::trace_record &record, std::uint64_t missing)
    {
        const auto &raw = record.raw;
        if (missing != 0)
            report_({severity::loss, raw.offset,
                     fmt::format("{} missing before the sequence number {}",
                                 missing == 1 ? "1 record is" : fmt::format("{} records are", missing), raw.header.seq),
                     raw.header.seq});
        check_body(record);
        if (raw.header.seq % 2 == 0) behind_ = raw.header.seq;
    }

    void check_body(const reader::trace_record &record)
    {
        if (!reader::carries_data(record.body)) return;
        if (!is_sound(record)) {
            const auto seq = record.raw.header.seq;
            const auto wrong = record.problem.empty() ? what_is_wrong(record) : std::string();
            if (!wrong.empty())
                report_({severity::damage, record.raw.offset, fmt::format("{} (sequence number {})", wrong, seq), seq});
            return;
        }
        ++result_.records;
        if (!record.time) return;
        clock_.pass(*record.time);
        if (!result_.first_time) result_.first_time = record.time;
        result_.last_time = record.time;
    }

    void take(const reader::finding &found)
    {
        if (found.level == severity::damage) ++result_.damages;
        if (result_.findings.size() < file_check::most_findings)
            result_.findings.push_back({found, behind_});
        else
            ++result_.more_findings;
    }

    file_check result_;
    std::optional<std::uint32_t> behind_;
    clock_steps clock_;
    reader::finding_sink report_;
    reader::trace_reader trace_;
};

} // namespace

file_check check_file(reader::byte_source &source) { return checker(source).run(); }

} // namespace qn::dump
