// The records of a report's timeline: a row for every thread of a process, with as many of its records as a page can
// hold.
//
// Up to a limit all are kept. Then rows are thinned, those with many records first: of a thinned row every second,
// fourth, eighth... record is kept, counted from its first one, so that the same trace always gives the same page and a
// thread that says little is shown whole. Errors are kept beside the others, up to a limit of their own.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <tuple>
#include <vector>

namespace qn::dump
{

struct timeline_record {
    std::int64_t time_ns = 0;
    std::uint32_t component = 0; // index
    std::uint32_t kind = 0;      // index of the alternative of record_body
    std::string text;
};

// Every n-th of the records that it is offered, n a power of two.
class thinned_records
{
public:
    struct kept_record {
        std::uint64_t ordinal;
        timeline_record record;
    };

    // Whether the next record is to be kept; counts it.
    bool next_is_kept() { return offered_++ % stride_ == 0; }
    // What next_is_kept() was true for.
    void keep(timeline_record record) { kept_.push_back({offered_ - 1, std::move(record)}); }
    // Gives how many are dropped.
    std::size_t halve();

    std::uint64_t offered() const { return offered_; }
    const std::vector<kept_record> &kept() const { return kept_; }

private:
    std::uint64_t offered_ = 0;
    std::uint64_t stride_ = 1;
    std::vector<kept_record> kept_;
};

struct timeline_row {
    std::size_t process = 0; // index
    std::uint32_t thread = 0;
    bool all_others = false; // threads that came when there was no more room for a row
    thinned_records usual;
    thinned_records errors;

    std::uint64_t records() const { return usual.offered() + errors.offered(); }
    std::size_t shown() const { return usual.kept().size() + errors.kept().size(); }
};

struct timeline_limits {
    std::size_t records = 200'000;
    std::size_t errors = 50'000;
    std::size_t rows = 1'000;
};

class timeline
{
public:
    explicit timeline(const timeline_limits &limits = {}) : limits_(limits) {}

    // `make` is called for the record when it is kept.
    template <typename Make>
    void add(std::size_t process, std::uint32_t thread, bool is_error, const Make &make)
    {
        timeline_row &row = row_of(process, thread);
        thinned_records &records = is_error ? row.errors : row.usual;
        if (!records.next_is_kept()) return;
        records.keep(make());
        std::size_t &kept = is_error ? kept_errors_ : kept_usual_;
        if (++kept > (is_error ? limits_.errors : limits_.records)) thin(is_error);
    }

    // By process and thread; the row of all others comes last of its process.
    std::vector<const timeline_row *> sorted() const;
    std::uint64_t records() const;
    std::uint64_t shown() const { return kept_usual_ + kept_errors_; }
    // Errors that are left out.
    std::uint64_t errors_left_out() const;

private:
    using key = std::tuple<std::size_t, bool, std::uint32_t>; // process, whether all others, thread

    timeline_row &row_of(std::size_t process, std::uint32_t thread);
    void thin(bool errors);

    timeline_limits limits_;
    std::map<key, timeline_row> rows_;
    std::size_t kept_usual_ = 0;
    std::size_t kept_errors_ = 0;
};

} // namespace qn::dump
