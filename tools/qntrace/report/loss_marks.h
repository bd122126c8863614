// Where in time records are missing, to be marked on the charts of a report.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <vector>

#include "tools/qntrace/traces/losses.h"

namespace qn::dump
{

struct loss_mark {
    enum class kind { missing, unfinished, unspooled };

    kind what = kind::missing;
    std::size_t source = 0; // index
    std::uint64_t count = 0;
    // What is missing was written between these two: the last record before, and the first one behind.
    std::int64_t from_ns = 0;
    std::int64_t to_ns = 0;
};

class loss_marks
{
public:
    // A file of rubbish may have a loss before every record. What comes when there is no more room is counted.
    static constexpr std::size_t most_marks = 5'000;

    explicit loss_marks(std::size_t sources) : before_(sources) {}

    // A record, with what is missing from its file up to it.
    void pass(std::size_t source, const losses &lost, std::optional<std::int64_t> time_ns);
    // The end of a file.
    void finish(std::size_t source, const losses &lost) { pass(source, lost, std::nullopt); }

    const std::vector<loss_mark> &marks() const { return marks_; }
    // Losses that have no mark, as there was no room or the file has no record with a time.
    std::uint64_t not_marked() const { return not_marked_; }

private:
    struct file_state {
        losses lost;
        std::optional<std::int64_t> last_ns;
    };

    void mark(loss_mark::kind what, std::size_t source, std::uint64_t count, std::optional<std::int64_t> time_ns);

    std::vector<file_state> before_;
    std::vector<loss_mark> marks_;
    std::uint64_t not_marked_ = 0;
};

} // namespace qn::dump
