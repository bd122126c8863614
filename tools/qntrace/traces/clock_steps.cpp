#include "tools/qntrace/traces/clock_steps.h"

#include <algorithm>
#include <limits>
#include <tuple>

#include <fmt/format.h>

#include "tools/qntrace/format/durations.h"

namespace qn::dump
{
namespace
{

auto key(const timespec &time) { return std::tuple(time.tv_sec, time.tv_nsec); }

// How much earlier `time` is than `last`; 0 when it is not. Steps of more than 292 years count as those.
std::int64_t step_back(const timespec &last, const timespec &time)
{
    if (!(key(time) < key(last))) return 0;
    __extension__ using int128 = __int128;
    const int128 step = (int128{last.tv_sec} - time.tv_sec) * 1'000'000'000 + (int128{last.tv_nsec} - time.tv_nsec);
    return static_cast<std::int64_t>(std::min(step, int128{std::numeric_limits<std::int64_t>::max()}));
}

} // namespace

void clock_steps::pass(const timespec &time)
{
    if (last_) {
        const std::int64_t step = step_back(*last_, time);
        if (step != 0) ++count_;
        longest_ns_ = std::max(longest_ns_, step);
    }
    last_ = time;
}

std::string clock_steps::text() const
{
    if (count_ == 1) return fmt::format("the clock steps back by {}", duration_text(longest_ns_));
    return fmt::format("the clock steps back {} times, by up to {}", count_, duration_text(longest_ns_));
}

} // namespace qn::dump
