// Records that tell who wrote them and as which of his records, and whose every byte follows from that: what is lost,
// torn or out of order is seen.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include <qn_tr.h>

#include "support/trace_image.h"

namespace qn::test
{
// A writer: `run` tells processes apart (below 676), `thread` the threads of one (below 10).
struct record_author {
    uint32_t run;
    uint32_t thread;
    auto operator<=>(const record_author &) const = default;
};

// Writes one record of a kind that depends on the number. Returns the writer's status.
qn_int32_t write_numbered(const record_author &author, uint32_t number, tr_file_token_t token = nullptr);

// Who wrote the record; nothing for a record of the library itself.
std::optional<record_author> author_of(const record_image &record);

// The numbers of every author's records, in ring order. Fails the test for a record that is not byte for byte what its
// author writes under that number.
std::map<record_author, std::vector<uint32_t>> numbers_in(const std::vector<record_image> &ring);
} // namespace qn::test
