#include "tools/qntrace/traces/merged_traces.h"

#include <algorithm>
#include <limits>
#include <tuple>
#include <utility>

#include <fmt/format.h>

#include "tools/qntrace/console/output.h"
#include "tools/qntrace/format/durations.h"
#include "tools/qntrace/format/timestamps.h"

namespace qn::dump
{
namespace
{

constexpr timespec before_all_times = {std::numeric_limits<time_t>::min(), 0};

// All windows together, if all files should overlap.
constexpr std::size_t all_windows_bytes = std::size_t{64} << 20;
constexpr std::size_t smallest_window_bytes = 4096;

std::size_t window_for(std::size_t sources)
{
    return std::clamp(all_windows_bytes / std::max<std::size_t>(sources, 1), smallest_window_bytes,
                      reader::window::window_bytes);
}

auto key(const timespec &time) { return std::tuple(time.tv_sec, time.tv_nsec); }

} // namespace

merge_stream::merge_stream(const trace_source &source, const merge_settings &settings, file_pool &pool,
                           std::size_t window_bytes)
    : source_(source), settings_(settings), offset_ns_(settings.clock_offset(source)), findings_(source.path),
      file_(pool, source.path), trace_(
                                    file_,
                                    [this](const reader::finding &found) {
                                        settings_.before_message();
                                        findings_(found);
                                    },
                                    window_bytes),
      place_(before_all_times)
{
    if (trace_.header()) losses_.emplace(*trace_.header());
}

bool merge_stream::advance()
{
    for (;;) {
        record_ = trace_.next();
        if (!record_) return false;
        losses_->pass(record_->raw);
        if (!reader::carries_data(record_->body)) continue;
        bytes_passed_ += record_->raw.header.length;
        follow_clock();
        return true;
    }
}

void merge_stream::follow_clock()
{
    if (!record_->time) return;
    record_->time = later_by(*record_->time, offset_ns_);
    clock_.pass(*record_->time);
    place_ = *record_->time;
}

void merge_stream::finish() const
{
    findings_.finish();
    const auto name = printable_name(source_.path);
    if (clock_.any()) write_message(fmt::format("{}: {}", name, clock_.text()));
    if (losses_ && losses_->so_far().any())
        write_message(fmt::format("{}: lost: {}", name, losses_text(losses_->so_far(), settings_.utc)));
}

merged_traces::merged_traces(const std::vector<trace_source> &sources, merge_settings settings)
    : sources_(sources), settings_(std::move(settings)), pool_(file_pool::usual_most_open()),
      window_bytes_(window_for(sources.size()))
{
    // A file without a first record is read first of all, for what is to be told of it.
    for (std::size_t i = 0; i < sources.size(); ++i) {
        const bool timed = sources[i].first && sources[i].first->time;
        waiting_.push_back(
            {timed ? later_by(*sources[i].first->time, settings_.clock_offset(sources[i])) : before_all_times, i});
    }
    std::sort(waiting_.begin(), waiting_.end(), [](const waiting_source &left, const waiting_source &right) {
        return std::tuple(key(left.first), left.index) > std::tuple(key(right.first), right.index);
    });
}

bool merged_traces::comes_later::operator()(const turn &left, const turn &right) const
{
    return std::tuple(key(left.time), left.index) > std::tuple(key(right.time), right.index);
}

int merged_traces::run(const record_sink &sink)
{
    while (!waiting_.empty() || !turns_.empty()) {
        if (turns_.empty())
            open_those_due(std::nullopt);
        else
            open_those_due(turns_.front().time);
        if (turns_.empty()) continue;
        std::pop_heap(turns_.begin(), turns_.end(), comes_later());
        const std::size_t index = turns_.back().index;
        turns_.pop_back();
        const merge_stream &stream = *streams_.at(index);
        bytes_done_ += stream.record().raw.header.length;
        sink(index, stream);
        go_on(index);
    }
    return status_;
}

// Opens all files that may hold a record up to `until`; without it the next one.
void merged_traces::open_those_due(std::optional<timespec> until)
{
    while (!waiting_.empty()) {
        const auto next = waiting_.back();
        if (until && key(*until) < key(next.first)) return;
        waiting_.pop_back();
        open(next.index);
        if (!turns_.empty()) until = turns_.front().time;
    }
}

void merged_traces::open(std::size_t index)
{
    try {
        streams_.emplace(index, std::make_unique<merge_stream>(sources_[index], settings_, pool_, window_bytes_));
    } catch (const reader::io_error &error) {
        fail(index, error);
        return;
    }
    go_on(index);
}

void merged_traces::go_on(std::size_t index)
{
    merge_stream &stream = *streams_.at(index);
    try {
        if (stream.advance()) {
            turns_.push_back({stream.place(), index});
            std::push_heap(turns_.begin(), turns_.end(), comes_later());
            return;
        }
    } catch (const reader::io_error &error) {
        fail(index, error);
    }
    close(index);
}

void merged_traces::close(std::size_t index)
{
    settings_.before_message();
    const merge_stream &stream = *streams_.at(index);
    stream.finish();
    if (settings_.after_file && stream.has_header()) settings_.after_file(index, stream.lost());
    status_ = std::max(status_, stream.status());
    // What was no record: the header, and free space. A live file may have passed more than it had.
    bytes_done_ += sources_[index].bytes - std::min(sources_[index].bytes, stream.bytes_passed());
    streams_.erase(index);
}

void merged_traces::fail(std::size_t index, const reader::io_error &error)
{
    settings_.before_message();
    write_message(fmt::format("{}: {}", printable_name(sources_[index].path), error.what()));
    status_ = status_io_error;
}

} // namespace qn::dump
