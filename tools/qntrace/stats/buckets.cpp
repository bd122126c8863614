#include "tools/qntrace/stats/buckets.h"

#include <algorithm>
#include <array>
#include <limits>
#include <stdexcept>
#include <utility>

namespace qn::dump
{
namespace
{

constexpr std::int64_t second = 1'000'000'000;
constexpr std::int64_t day = 86'400 * second;

// Each is a multiple of the one before, so that buckets can be put together.
constexpr std::array<std::int64_t, 18> widths = {
    1'000,  10'000,      100'000,     1'000'000,    10'000'000,    100'000'000,
    second, 10 * second, 60 * second, 600 * second, 3600 * second, 21'600 * second,
    day,    10 * day,    100 * day,   1'000 * day,  10'000 * day,  100'000 * day,
};

constexpr std::size_t most_while_counting = 4096;
constexpr std::size_t most_of_given_width = 100'000;

// Rounded down, before the epoch too.
std::int64_t floor_of(std::int64_t value, std::int64_t divisor)
{
    return value / divisor - (value % divisor < 0 ? 1 : 0);
}

} // namespace

time_buckets::time_buckets(std::optional<std::int64_t> width)
    : width_is_given_(width.has_value()), width_(width.value_or(widths.front()))
{
}

std::int64_t time_buckets::index_of(std::int64_t time_ns) const { return floor_of(time_ns, width_); }

void time_buckets::choose(std::int64_t time_ns)
{
    const auto count = buckets_.size();
    if (!buckets_.contains(index_of(time_ns)) &&
        count >= (width_is_given_ ? most_of_given_width : most_while_counting)) {
        if (width_is_given_) throw std::invalid_argument("--bucket is so short that it makes too many of them");
        while (buckets_.size() >= most_while_counting && widen()) {
        }
    }
    const std::int64_t index = index_of(time_ns);
    current_ = &buckets_[index];
    current_begin_ = begin_of(index);
}

// The first bucket of all begins where time does.
std::int64_t time_buckets::begin_of(std::int64_t index) const
{
    std::int64_t begin = 0;
    return __builtin_mul_overflow(index, width_, &begin) ? std::numeric_limits<std::int64_t>::min() : begin;
}

bool time_buckets::widen()
{
    const auto next = std::upper_bound(widths.begin(), widths.end(), width_);
    if (next == widths.end()) return false;
    const std::int64_t factor = *next / width_;
    std::map<std::int64_t, time_bucket> wider;
    for (const auto &[index, bucket] : buckets_) {
        time_bucket &sum = wider[floor_of(index, factor)];
        sum.records += bucket.records;
        sum.bytes += bucket.bytes;
        sum.missing += bucket.missing;
    }
    buckets_ = std::move(wider);
    width_ = *next;
    current_ = nullptr;
    return true;
}

void time_buckets::finish(std::int64_t most)
{
    if (width_is_given_ || buckets_.empty()) return;
    while (buckets_.rbegin()->first - buckets_.begin()->first >= most && widen()) {
    }
}

void time_buckets::widen_to(std::int64_t width)
{
    while (width_ < width && widen()) {
    }
}

} // namespace qn::dump
