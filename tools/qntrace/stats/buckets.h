// How many records fall into each stretch of time.
//
// Stretches begin at whole multiples of their width since the epoch. Without a given width the first is narrow, and
// neighbours are put together whenever there are too many: so one pass suffices for a trace of unknown length.
#pragma once

#include <cstdint>
#include <map>
#include <optional>

namespace qn::dump
{

struct time_bucket {
    std::uint64_t records = 0;
    std::uint64_t bytes = 0;
    std::uint64_t missing = 0; // right before records of this bucket
};

class time_buckets
{
public:
    // The width in nanoseconds, above 0.
    explicit time_buckets(std::optional<std::int64_t> width);

    // Throws std::invalid_argument when the given width makes too many buckets.
    void add(std::int64_t time_ns, std::uint64_t bytes, std::uint64_t missing)
    {
        if (current_ == nullptr || time_ns < current_begin_ || time_ns - current_begin_ >= width_) choose(time_ns);
        ++current_->records;
        current_->bytes += bytes;
        current_->missing += missing;
    }

    // Without a given width: makes the buckets so wide that from the first to the last there are at most so many.
    void finish(std::int64_t most);
    // Without a given width: makes the buckets as wide as those of another one that counted these records and more.
    void widen_to(std::int64_t width);

    std::int64_t width() const { return width_; }
    // By their index, which counts widths since the epoch; none is empty.
    const std::map<std::int64_t, time_bucket> &all() const { return buckets_; }
    // In nanoseconds since the epoch.
    std::int64_t begin_of(std::int64_t index) const;

private:
    void choose(std::int64_t time_ns);
    bool widen(); // false when there is nothing wider
    std::int64_t index_of(std::int64_t time_ns) const;

    bool width_is_given_;
    std::int64_t width_;
    std::map<std::int64_t, time_bucket> buckets_;
    time_bucket *current_ = nullptr; // that of the last record, where the next one mostly belongs too
    std::int64_t current_begin_ = 0;
};

} // namespace qn::dump
