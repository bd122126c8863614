// What is missing from a trace, as far as its files tell: records that were not completed, gaps in the sequence numbers
// of a ring, and pages that were overwritten before they were copied.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "tools/qntrace/reader/reader.h"

namespace qn::dump
{

struct losses {
    std::uint64_t unfinished = 0;
    std::uint64_t missing = 0;         // between two records of a ring: damage, or overwritten while it was read
    std::uint64_t overwritten = 0;     // before the oldest record, fillers at the end of the file included
    std::uint64_t unspooled = 0;       // pages, by the notices at the start of their next contents
    std::uint32_t last_reuse_time = 0; // seconds since the epoch; 0: no page was taken over unspooled

    bool any() const { return unfinished != 0 || missing != 0 || unspooled != 0; }
    void add(const losses &other);
};

// What any() asks for, in words.
std::string losses_text(const losses &lost, bool utc);

// Follows the records of one file, fillers and unfinished ones included.
class loss_counter
{
public:
    explicit loss_counter(const reader::file_header &header);

    // How many records are missing right before this one.
    std::uint64_t pass(const reader::raw_record &record);
    const losses &so_far() const { return losses_; }

private:
    losses losses_;
    std::optional<std::uint32_t> last_seq_;
};

// How many times in a row its page was overwritten, by the text of a page note; 0 when it does not say.
std::uint32_t times_not_spooled(std::string_view text);

} // namespace qn::dump
