// What a report shows of the records of many files: gathered in one run over them, in memory that does not grow with
// the traces.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "tools/qntrace/errors/error_groups.h"
#include "tools/qntrace/report/component_rates.h"
#include "tools/qntrace/report/loss_marks.h"
#include "tools/qntrace/report/timeline.h"
#include "tools/qntrace/traces/merged_traces.h"

namespace qn::dump
{

// A program on a node.
struct report_process {
    std::string node;
    std::string program;
};

class report_data
{
public:
    // Of the text that is shown of a record; what is longer is cut, and says so.
    static constexpr std::size_t longest_text = 1000;

    // The sources must outlive it.
    explicit report_data(const std::vector<trace_source> &sources);

    // Every record of a file, for what is missing before it.
    void pass(std::size_t source, const merge_stream &stream);
    // Those that are selected, behind pass().
    void add(std::size_t source, const reader::trace_record &record);
    void finish_file(std::size_t source, const losses &lost);
    void finish() { rates_.finish(); }

    const std::vector<trace_source> &sources() const { return sources_; }
    const std::vector<report_process> &processes() const { return processes_; }
    std::size_t process_of(std::size_t source) const { return process_of_source_[source]; }

    std::uint64_t files() const { return files_; }
    std::uint64_t records() const { return records_; }
    std::uint64_t bytes() const { return bytes_; }
    std::uint64_t without_time() const { return without_time_; }
    std::optional<std::int64_t> first_ns() const { return first_ns_; }
    std::optional<std::int64_t> last_ns() const { return last_ns_; }
    const losses &lost() const { return lost_; }
    const component_rates &rates() const { return rates_; }
    const timeline &threads() const { return timeline_; }
    const loss_marks &marks() const { return marks_; }
    const error_groups &errors() const { return errors_; }

private:
    const std::vector<trace_source> &sources_;
    std::vector<report_process> processes_;
    std::vector<std::size_t> process_of_source_;
    message_catalogues catalogues_;

    std::uint64_t files_ = 0;
    std::uint64_t records_ = 0;
    std::uint64_t bytes_ = 0;
    std::uint64_t without_time_ = 0;
    std::optional<std::int64_t> first_ns_;
    std::optional<std::int64_t> last_ns_;
    losses lost_;
    component_rates rates_;
    timeline timeline_;
    loss_marks marks_;
    error_groups errors_;
};

} // namespace qn::dump
