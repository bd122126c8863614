// The rates at which a kernel can run its clocks. Pure functions, no state.
#include "platform/cu/kernel_rate.h"

#include <bit>
#include <cmath>

namespace qn::cu
{
namespace
{
// The product of multiplier and counter difference has to fit 64 bits for this long.
constexpr uint64_t longest_ms = 600'000;
constexpr uint64_t ns_per_ms = 1'000'000;

constexpr double least_hz = 1e8;
constexpr double most_hz = 1e11;

double distance(double one, double other) { return std::abs(one / other - 1); }
} // namespace

double kernel_tick_rate(uint64_t frequency_khz)
{
    const int multiplier_bits = 32 - static_cast<int>(std::bit_width((longest_ms * frequency_khz) >> 32));
    int shift = 32;
    uint64_t multiplier = 0;
    for (; shift > 0; --shift) {
        multiplier = ((ns_per_ms << shift) + frequency_khz / 2) / frequency_khz;
        if ((multiplier >> multiplier_bits) == 0) break;
    }
    return std::ldexp(1e9, shift) / static_cast<double>(multiplier);
}

std::optional<double> next_kernel_rate(double measured_hz, double tolerance)
{
    if (!(measured_hz >= least_hz && measured_hz <= most_hz)) return std::nullopt;
    // The rounded multiplier may move a rate more than half a kilohertz away from its frequency.
    const auto middle_khz = static_cast<uint64_t>(std::llround(measured_hz / 1000));
    double next = kernel_tick_rate(middle_khz);
    for (const uint64_t khz : {middle_khz - 1, middle_khz + 1}) {
        const double rate = kernel_tick_rate(khz);
        if (distance(measured_hz, rate) < distance(measured_hz, next)) next = rate;
    }
    if (distance(measured_hz, next) > tolerance) return std::nullopt;
    return next;
}
} // namespace qn::cu
