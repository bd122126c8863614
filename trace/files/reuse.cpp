// Whether the ring of a mapped file can be continued, and how an empty ring looks.
//
// Nothing in the file is believed: an offset is followed only when a record header fits there inside the ring, and the
// walk ends after as many records as the file can hold. Anchor set lock, held by the caller.
#include <cstring>

#include "trace/files/debug.h"
#include "trace/files/trace_file.h"

namespace
{
using namespace qn::tr;
using format::record_header_bytes;

bool has_another_format(const trace_file_header_t *header)
{
    const bool other_platform = header->uPlatform == 1 || header->uPlatform == 4 || header->uPlatform == 5;
    return other_platform && header->uVersion == 5 && header->uOffset != format::header_bytes;
}

bool belongs_to_another(const trace_anchor_t *anchor, const trace_file_header_t *header, const program_names &names)
{
    const bool little_endian = (header->uProperties & format::properties::little_endian) != 0;
    return little_endian != host_is_little_endian() || (header->uProperties & format::properties::always) == 0 ||
           std::strncmp(header->program, names.program, sizeof header->program) != 0 ||
           header->uVersion > format::format_version || header->uActualFileSize != anchor->uActualFileSize;
}

// Older versions have shorter headers. What this library writes into a continued header must end before its ring: into
// a page's, of whatever version, its state.
qn_uint32_t smallest_ring_offset(const trace_anchor_t *anchor, qn_uint16_t version)
{
    if (version > 4 || anchor->ppActivePg != nullptr) return offsetof(trace_file_header_t, tz_offset);
    if (version > 3) return offsetof(trace_file_header_t, sp_reuse_tm);
    return offsetof(trace_file_header_t, uNode_ID);
}

void refresh_header(trace_anchor_t *anchor, trace_file_header_t *header)
{
    if (header->uVersion > 4) {
        if (!is_spooled_page(anchor)) {
            header->sp_flags = 0;
        } else if ((header->sp_flags & format::page_state::active) != 0) {
            *anchor->ppActivePg = anchor;
            debug("start_trace_page: found active page (%s)\n", anchor->fileName);
        } else {
            header->sp_flags = format::page_state::ready;
        }
    }
    if (header->uVersion > 3) {
        qn_uint64_t node_id = 0;
        header->uNode_ID = cu_get_node_id_1(&node_id) == 0 ? node_id : 0;
    }
    store_relaxed(header->uFlags, 0);
}

// The walk round the ring, from the oldest record until back there.
class ring_walk
{
public:
    explicit ring_walk(trace_anchor_t *anchor)
        : anchor_(anchor), header_(header_of(anchor)), size_(anchor->uActualFileSize), ring_start_(header_->uOffset),
          oldest_(header_->uOldestRecordOffset)
    {
    }

    // Null when the ring is sound, else what is wrong with it.
    const char *find_damage()
    {
        if (ring_start_ < smallest_ring_offset(anchor_, header_->uVersion) || !has_room_for_record(oldest_))
            return "corruption 1";
        qn_uint64_t offset = oldest_;
        for (qn_uint32_t records = 0; records <= size_ / record_header_bytes; ++records) {
            const qn_uint64_t at = offset;
            trace_record_header_t *record = record_at(anchor_, at);
            if (record->length == 0) return "corruption 2";
            if (record->seqNumber % 2 != 0 && record->seqNumber != format::seq_filler) return "corruption 2";
            offset += record->length;
            if (offset > size_) return "corruption 3";
            if (at < oldest_ && oldest_ < offset) {
                if (oldest_ - at < record_header_bytes) return "corruption straddle";
                cut_at_oldest(record, at);
                offset = oldest_;
            } else if (record->seqNumber != format::seq_filler) {
                last_sequence_ = record->seqNumber;
            }
            if (offset == size_) {
                ends_in_record_ = record->function != static_cast<qn_uint16_t>(format::kind::free_space);
                offset = ring_start_;
            }
            if (offset == oldest_) return nullptr;
            if (!has_room_for_record(offset)) return "corruption 3";
        }
        return "corruption 2";
    }

    qn_uint32_t last_sequence() const { return last_sequence_; }
    qn_uint32_t ring_start() const { return ring_start_; }
    qn_uint32_t free_offset() const { return oldest_; }
    // Whether the newest record ends where the file ends.
    bool is_filled_exactly() const { return oldest_ == ring_start_ && ends_in_record_; }

private:
    bool has_room_for_record(qn_uint64_t offset) const
    {
        return offset >= ring_start_ && offset + record_header_bytes <= size_;
    }

    // The record at `at` runs into the oldest one: it becomes a filler up to there, and the oldest begins with it.
    void cut_at_oldest(trace_record_header_t *record, qn_uint64_t at)
    {
        record->function = static_cast<qn_uint16_t>(format::kind::free_space);
        record->length = oldest_ - static_cast<qn_uint32_t>(at);
        record->seqNumber = format::seq_filler;
        oldest_ = static_cast<qn_uint32_t>(at);
        store_relaxed(header_->uOldestRecordOffset, oldest_);
    }

    trace_anchor_t *anchor_;
    trace_file_header_t *header_;
    qn_uint32_t size_;
    qn_uint32_t ring_start_;
    qn_uint32_t oldest_;
    qn_uint32_t last_sequence_ = 0;
    bool ends_in_record_ = false; // the last bytes of the file are not free
};

bool refuse(const trace_anchor_t *anchor, const char *reason)
{
    debug("\ttrace: reInit for %s due to %s\n", anchor->fileName, reason);
    return false;
}
} // namespace

namespace qn::tr
{
bool reuse_ring(trace_anchor_t *anchor, const program_names &names)
{
    trace_file_header_t *header = header_of(anchor);
    if (has_another_format(header)) return refuse(anchor, "format mismatch");
    if (belongs_to_another(anchor, header, names)) return refuse(anchor, "size,version,program name");
    refresh_header(anchor, header);

    ring_walk walk(anchor);
    const char *damage = walk.find_damage();
    if (damage != nullptr) return refuse(anchor, damage);

    anchor->seqNumber = walk.last_sequence();
    anchor->pWrap = anchor->pRing = record_at(anchor, walk.ring_start());
    // A page never wraps: when it is full, its contents stay for the spool thread, and the next record switches pages.
    const bool is_full = never_wraps(anchor) && walk.is_filled_exactly();
    anchor->pNextFree = record_at(anchor, is_full ? anchor->uActualFileSize : walk.free_offset());
    debug("\ttrace: Re-using existing file.\n");
    return true;
}

void init_ring(trace_anchor_t *anchor)
{
    anchor->pWrap = anchor->pRing = record_at(anchor, format::header_bytes);
    anchor->seqNumber = 0;
    anchor->pWrap->length = anchor->uActualFileSize - format::header_bytes;
    anchor->pWrap->function = static_cast<qn_uint16_t>(format::kind::free_space);
    anchor->pWrap->seqNumber = 0;
    anchor->pNextFree = anchor->pWrap;
}
} // namespace qn::tr
