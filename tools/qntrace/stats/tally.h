// Counts of records, by everything that a record's header tells and by its id.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "tools/qntrace/reader/reader.h"
#include "tools/qntrace/stats/buckets.h"
#include "tools/qntrace/traces/losses.h"

namespace qn::dump
{

struct amount {
    std::uint64_t records = 0;
    std::uint64_t bytes = 0;

    void add(std::uint64_t more_bytes)
    {
        ++records;
        bytes += more_bytes;
    }
};

// Amounts by a key. Damaged files may have a new one in every record: those that come when there is no more room are
// counted together.
class amount_table
{
public:
    struct row {
        std::uint64_t key;
        amount counted;
    };

    amount_table() = default;
    amount_table(const amount_table &) = delete;
    amount_table &operator=(const amount_table &) = delete;

    void add(std::uint64_t key, std::uint64_t bytes)
    {
        // Mostly a record has its component, kind and thread in common with the one before.
        if (last_ == nullptr || last_key_ != key) find(key);
        last_->add(bytes);
    }

    // Those with the most records first; all of them for `most` 0.
    std::vector<row> largest(std::size_t most) const;
    // What is not in largest(most).
    std::size_t keys_left_out(std::size_t most) const;
    const amount &without_a_row() const { return others_; }

private:
    void find(std::uint64_t key);

    std::unordered_map<std::uint64_t, amount> rows_;
    amount others_;
    amount *last_ = nullptr;
    std::uint64_t last_key_ = 0;
};

struct stats_tally {
    explicit stats_tally(std::optional<std::int64_t> bucket_width) : buckets(bucket_width) {}

    // A record that carries data, and how many are missing before it.
    void add(const reader::raw_record &record, const std::optional<timespec> &time, std::uint64_t missing);

    std::uint64_t files = 0;
    amount all;
    std::uint64_t without_time = 0;
    losses lost;
    amount_table components; // keys are made below
    amount_table kinds;
    amount_table ids;
    amount_table threads;
    time_buckets buckets;
    std::optional<std::int64_t> first_ns;
    std::optional<std::int64_t> last_ns;
};

// The keys taken apart. A component is its text up to the NUL.
std::string_view component_of_key(const std::uint64_t &key);
std::string_view kind_of_key(std::uint64_t key);
std::uint32_t id_of_key(std::uint64_t key);
std::uint64_t component_key_of_id_key(std::uint64_t key);

} // namespace qn::dump
