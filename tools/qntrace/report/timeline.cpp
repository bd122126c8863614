#include "tools/qntrace/report/timeline.h"

#include <utility>

namespace qn::dump
{

std::size_t thinned_records::halve()
{
    stride_ *= 2;
    return std::erase_if(kept_, [this](const kept_record &kept) { return kept.ordinal % stride_ != 0; });
}

timeline_row &timeline::row_of(std::size_t process, std::uint32_t thread)
{
    auto known = rows_.find({process, false, thread});
    if (known != rows_.end()) return known->second;
    const bool has_room = rows_.size() < limits_.rows;
    timeline_row &row = has_room ? rows_[{process, false, thread}] : rows_[{process, true, 0}];
    row.process = process;
    row.thread = has_room ? thread : 0;
    row.all_others = !has_room;
    return row;
}

// Rows with less than half of the mean hold at most half of all, so the others give up a quarter at least.
void timeline::thin(bool errors)
{
    std::size_t &kept = errors ? kept_errors_ : kept_usual_;
    const std::size_t few = kept / rows_.size() / 2;
    for (auto &[key, row] : rows_) {
        thinned_records &records = errors ? row.errors : row.usual;
        if (records.kept().size() > few) kept -= records.halve();
    }
}

std::vector<const timeline_row *> timeline::sorted() const
{
    std::vector<const timeline_row *> rows;
    rows.reserve(rows_.size());
    for (const auto &[key, row] : rows_) rows.push_back(&row);
    return rows;
}

std::uint64_t timeline::records() const
{
    std::uint64_t sum = 0;
    for (const auto &[key, row] : rows_) sum += row.records();
    return sum;
}

std::uint64_t timeline::errors_left_out() const
{
    std::uint64_t sum = 0;
    for (const auto &[key, row] : rows_) sum += row.errors.offered() - row.errors.kept().size();
    return sum;
}

} // namespace qn::dump
