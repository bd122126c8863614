// Random calls of the record writers, and what each of them has to become when it is read. One call in eight is of any
// of the exported writers, with arguments of its own.
//
// A sequence is determined by its seed: who knows the seed makes the same records again, to compare with what was read,
// without having kept them.
#pragma once

#include <cstdint>
#include <random>
#include <string>
#include <vector>

#include <qn_tr.h>

#include "tools/qntrace/reader/reader.h"

namespace qn::test
{

class random_records
{
public:
    static constexpr std::size_t default_file = 0; // which the writers without a token write to

    explicit random_records(std::uint32_t seed) : random_(seed) {}

    // Chooses the next record.
    void next();
    // Which of `count` trace files it belongs to.
    std::size_t file_of(std::size_t count) const { return file_ % count; }
    // Writes it; the writer's status.
    qn_int32_t write(tr_file_token_t token) const;
    // What differs in the record as it was read; empty when nothing does.
    std::string difference(const reader::trace_record &found) const;

private:
    enum class call { id, strings, formatted, data, values_32, values_64, error, any_writer };

    std::uint32_t below(std::uint32_t bound) { return static_cast<std::uint32_t>(random_() % bound); }
    std::string text(std::uint32_t most);
    qn_int32_t write_error(tr_file_token_t token) const;

    bool same_strings(const reader::record_body &body) const;
    bool same_blocks(const reader::record_body &body) const;
    bool same_bytes(const reader::raw_record &found) const;
    bool same_error(const reader::record_body &body) const;

    std::mt19937 random_;
    call call_ = call::id;
    std::uint32_t file_ = 0;
    std::string component_;
    std::uint32_t id_ = 0;
    std::size_t writer_ = 0;            // of all_writers()
    std::vector<std::string> texts_;    // strings, blocks, inserts
    std::vector<std::uint64_t> values_; // as many as the longest call takes
    std::uint32_t count_ = 0;           // of those that count
    std::uint32_t line_ = 0;            // of an error
};

} // namespace qn::test
