// Rings made by hand: what stands in front of the free pointer decides what the allocator does.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "trace/trace.h"

namespace qn::test
{
struct planned_record {
    uint32_t length;
    uint16_t function = 1;
    uint32_t sequence = 0;
};

// Writes the records into the default trace's ring, back to back from offset 200 on, and puts the free pointer on the
// one with the index `oldest`. The last sequence number is `last_sequence`.
void lay_out(const std::vector<planned_record> &records, size_t oldest, uint32_t last_sequence = 1000);

// A record's bytes in the default trace's mapping, for a test to write there.
void poke_u32(size_t at, uint32_t value);
void poke_u64(size_t at, uint64_t value);
void poke_u16(size_t at, uint16_t value);

struct allocated {
    bool given = false;
    uint32_t offset = 0;    // of the record, in the file
    uint32_t length = 0;    // what its header says
    uint32_t asked_for = 0; // what the length argument holds after the call
};

// allocate_space_page() on the default trace, under its lock.
allocated allocate(uint32_t length);

// What was written to standard error while `body` ran.
std::string standard_error_of(const std::function<void()> &body);
} // namespace qn::test
