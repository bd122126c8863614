// The records of many files in one order by time.
//
// Every file is a stream in the order of its ring, which is kept also where its clock steps back; the streams are
// interleaved by the times of their next records, equal ones in the order of the files. A file is opened when the merge
// has come to its first record, which was looked at before, and closed behind its last one. So as many files are in
// work as overlap in time, and one whose time has not come costs no more than its name.
#pragma once

#include <cstddef>
#include <ctime>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/reader/reader.h"
#include "tools/qntrace/traces/clock_steps.h"
#include "tools/qntrace/traces/file_pool.h"
#include "tools/qntrace/traces/losses.h"
#include "tools/qntrace/traces/trace_set.h"

namespace qn::dump
{

struct merge_settings {
    // How much is added to the times of a source's records, in nanoseconds.
    std::function<std::int64_t(const trace_source &)> clock_offset;
    // Called before anything is written to standard error.
    std::function<void()> before_message;
    // Called behind the last record of each trace file with what is missing from it; may be empty.
    std::function<void(std::size_t source, const losses &)> after_file = {};
    bool utc = false; // times in messages
};

// One file, from its opening to its last record.
class merge_stream
{
public:
    // Throws io_error.
    merge_stream(const trace_source &source, const merge_settings &settings, file_pool &pool, std::size_t window_bytes);

    // Reads the next record that carries data. False at the end. Throws io_error.
    bool advance();
    const reader::trace_record &record() const { return *record_; }
    const reader::file_header &header() const { return *trace_.header(); }
    bool has_header() const { return trace_.header().has_value(); }
    // What is missing up to the record.
    const losses &lost() const { return losses_->so_far(); }
    // Where the record belongs: its time, or that of the record before when it has none.
    const timespec &place() const { return place_; }
    // Of the records so far.
    std::uint64_t bytes_passed() const { return bytes_passed_; }

    // Tells on standard error what is missing and how far the clock stepped back.
    void finish() const;
    int status() const { return findings_.status(); }

private:
    void follow_clock();

    const trace_source &source_;
    const merge_settings &settings_;
    std::int64_t offset_ns_;
    finding_printer findings_;
    pooled_file file_;
    reader::trace_reader trace_;
    std::optional<loss_counter> losses_;
    std::optional<reader::trace_record> record_;
    timespec place_;
    std::uint64_t bytes_passed_ = 0;
    clock_steps clock_;
};

class merged_traces
{
public:
    using record_sink = std::function<void(std::size_t source, const merge_stream &)>;

    // The sources must outlive it.
    merged_traces(const std::vector<trace_source> &sources, merge_settings settings);

    // Hands out every record that carries data, with the index of its source. What cannot be read is told and passed
    // over. Returns the exit status.
    int run(const record_sink &sink);
    // Of all files, for who shows how far it has come.
    std::uint64_t bytes_done() const { return bytes_done_; }

private:
    struct waiting_source {
        timespec first;
        std::size_t index;
    };
    // Time, then the place among the sources.
    struct turn {
        timespec time;
        std::size_t index;
    };
    struct comes_later {
        bool operator()(const turn &left, const turn &right) const;
    };

    void open_those_due(std::optional<timespec> until);
    void open(std::size_t index);
    void go_on(std::size_t index); // to the stream's next record, or to its end
    void close(std::size_t index);
    void fail(std::size_t index, const reader::io_error &error);

    const std::vector<trace_source> &sources_;
    merge_settings settings_;
    file_pool pool_;
    std::size_t window_bytes_;
    std::vector<waiting_source> waiting_; // the one that is due next comes last
    std::map<std::size_t, std::unique_ptr<merge_stream>> streams_;
    std::vector<turn> turns_; // a heap; of every open stream one
    std::uint64_t bytes_done_ = 0;
    int status_ = 0;
};

} // namespace qn::dump
