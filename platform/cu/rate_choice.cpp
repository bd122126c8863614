// Which rate the counter runs at: a hint first, the slope second, the line of the process's life later. No state.
//
// Where the kernel keeps time by the counter, its clocks can only run at one of few exact rates, some 4e-7 from each
// other (kernel_rate.h). Processor, hypervisor or kernel often name the frequency, and a hint that agrees with a
// quarter of a millisecond's slope settles which rate it is.
//
// On a crowded machine a slope may be worse than usual and even lie at a neighbouring rate by chance. So a hint stands
// unless two looks after each other find the same other rate, or it lies outside of what was certainly measured.
#include "platform/cu/rate_choice.h"

#include <algorithm>
#include <cmath>

#include "platform/cu/kernel_rate.h"

namespace qn::cu
{
namespace
{
// How near to a smooth slope the rate is.
constexpr double near_brief = 2e-7, near_long = 1.5e-7;
// The same where nothing but the slope tells which rate it is: well under half the way to the next one.
constexpr double at_long = 3e-8, at_longest = 5e-8;
constexpr double near_enough = 5e-6; // for a hint that nothing else speaks against

constexpr double grossly_off = 1e-5;

double distance(double one, double other) { return std::abs(one / other - 1); }

std::optional<double> hint_near(const hint_list &hints, const slope &measured, double tolerance)
{
    for (const auto &khz : hints) {
        if (!khz || *khz == 0) continue;
        const double rate = kernel_tick_rate(*khz);
        if (distance(rate, measured.hz) <= tolerance) return rate;
    }
    return std::nullopt;
}

std::optional<double> kernel_rate_at(const slope &measured, double tolerance)
{
    return measured.smooth ? next_kernel_rate(measured.hz, tolerance) : std::nullopt;
}
} // namespace

std::optional<double> rate_by_hints(const hint_list &hints, const look &measure)
{
    if (std::none_of(hints.begin(), hints.end(), [](const auto &khz) { return khz.has_value(); })) return std::nullopt;
    if (const auto rate = hint_near(hints, measure(brief_look_ns), near_brief)) return rate;
    const slope first = measure(long_look_ns);
    if (const auto rate = hint_near(hints, first, near_long)) return rate;
    const slope second = measure(longest_look_ns);
    if (const auto rate = hint_near(hints, second, near_long)) return rate;
    if (const auto rate = kernel_rate_at(first, at_long); rate && rate == kernel_rate_at(second, at_longest))
        return rate;
    return hint_near(hints, second, std::max(near_enough, second.uncertainty));
}

double rate_by_slope(const look &measure)
{
    if (const auto rate = kernel_rate_at(measure(long_look_ns), at_long)) return *rate;
    const slope longest = measure(longest_look_ns);
    return kernel_rate_at(longest, at_longest).value_or(longest.hz);
}

checked_rate rate_on_line(double hz, const slope &line, const std::function<double()> &choose, const look &measure)
{
    const double margin = line.uncertainty + grossly_off;
    if (distance(line.hz, hz) > margin) {
        hz = choose();
        const slope now = measure(longest_look_ns);
        if (distance(line.hz, now.hz) > margin + now.uncertainty) return {.hz = hz, .line_is_bent = true};
    }
    const double slack = line.hz * line.uncertainty;
    return {.hz = std::clamp(hz, line.hz - slack, line.hz + slack), .line_is_bent = false};
}
} // namespace qn::cu
