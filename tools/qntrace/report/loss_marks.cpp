#include "tools/qntrace/report/loss_marks.h"

#include <algorithm>

namespace qn::dump
{

void loss_marks::pass(std::size_t source, const losses &lost, std::optional<std::int64_t> time_ns)
{
    file_state &before = before_[source];
    mark(loss_mark::kind::missing, source, lost.missing - before.lost.missing, time_ns);
    mark(loss_mark::kind::unfinished, source, lost.unfinished - before.lost.unfinished, time_ns);
    mark(loss_mark::kind::unspooled, source, lost.unspooled - before.lost.unspooled, time_ns);
    before.lost = lost;
    if (time_ns) before.last_ns = time_ns;
}

void loss_marks::mark(loss_mark::kind what, std::size_t source, std::uint64_t count,
                      std::optional<std::int64_t> time_ns)
{
    if (count == 0) return;
    const auto last = before_[source].last_ns;
    const auto from = last ? last : time_ns;
    const auto to = time_ns ? time_ns : last;
    if (!from || marks_.size() == most_marks) {
        not_marked_ += count;
        return;
    }
    // A clock may step back.
    marks_.push_back({what, source, count, std::min(*from, *to), std::max(*from, *to)});
}

} // namespace qn::dump
