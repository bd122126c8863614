// What decides where a live ring is read, as it stands at one moment.
#pragma once

#include <cstdint>
#include <optional>

#include "tools/qntrace/reader/header.h"
#include "tools/qntrace/reader/source.h"
#include "tools/qntrace/reader/walk.h"

namespace qn::dump
{

struct ring_glance {
    std::uint64_t oldest = 0;    // where the writer takes the next space
    reader::record_header first; // the record at the start of the ring, where one always begins; it tells the lap
    std::uint32_t file_size = 0; // the header's words
    std::uint32_t pid = 0;
    std::uint8_t page_state = 0;
    cu_timeinfo_t time_info = {};

    // Nobody has written a record since the ring was made, or started anew, which may be going on just now.
    bool is_empty() const;
    // A page that is not written any more.
    bool is_full_page() const;
};

// What is found belongs together, also when the writer is at work: `first` is looked at before and behind the rest, and
// was the same both times. Nothing when the writer comes round each time that it is looked; and when the file is too short
// or when the oldest or the first record make no sense, because a start is writing them, or for damage.
std::optional<ring_glance> look_at_ring(reader::byte_source &source, const reader::file_header &header);

// The record header at `offset`.
std::optional<reader::record_header> record_header_at(reader::byte_source &source, const reader::file_header &header,
                                                      std::uint64_t offset);

// Of what was found at the start of the ring: whether the writer has not come round in between. Of a page, whether it has
// not been started anew. A record may have been completed meanwhile, or its space be taken at this moment: then it has
// its number still, but is unfinished again.
bool same_lap(const reader::record_header &earlier, const reader::record_header &now);

bool is_free(const reader::record_header &header);
bool is_unfinished(const reader::record_header &header);

} // namespace qn::dump
