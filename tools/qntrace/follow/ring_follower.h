// The records of one live ring, in the order in which they are written, each once; docs/format.md, "Following a live
// file", tells why this works.
//
//   begin                  oldest                            end
//   | this lap, written -> | the lap before, being overwritten |
//
// The follower stands behind the last record that it has handed out: in the lap that is being written, at or before the
// oldest record, or in the lap before, at or behind it. Records are copied first; then it is looked how far the writer
// has come, and only what he cannot have touched before the copy was complete is handed out. What he has overwritten
// is told as lost, with the count that the sequence numbers give.
#pragma once

#include <cstdint>
#include <ctime>
#include <optional>
#include <vector>

#include "tools/qntrace/follow/ring_glance.h"
#include "tools/qntrace/reader/reader.h"

namespace qn::dump
{

// Records that were overwritten before they were read.
struct lost_records {
    std::uint64_t count = 0; // sequence numbers, those of fillers at the end of the ring included
    std::uint32_t first_seq = 0;
    std::optional<timespec> before; // times of the records around them
    std::optional<timespec> behind;
};

class ring_listener
{
public:
    virtual ~ring_listener() = default;
    // Records that carry data. Valid during the call.
    virtual void record(const reader::trace_record &record) = 0;
    // Called before the first record behind them.
    virtual void lost(const lost_records &lost) = 0;
    virtual void found(const reader::finding &finding) = 0;
};

class ring_follower
{
public:
    enum class progress {
        some,     // call again at once
        nothing,  // all that is complete has been handed out
        new_life, // the ring was started anew; what was not handed out before is gone
    };

    // Begins with the oldest record. `since_start`: the ring is known to have been empty, so that records are missing
    // when the numbers do not begin at the beginning. The source must outlive it.
    ring_follower(reader::byte_source &source, const reader::file_header &header, bool since_start);

    // Hands out the next records, as many as lie together. Throws io_error.
    progress advance(ring_listener &to);
    // All that was there at the beginning has been handed out, or overwritten.
    bool caught_up() const { return caught_up_; }
    // A page that is not written any more, and has been read to its end.
    bool finished() const { return finished_; }
    // Tells of a record that was not completed and has none behind it.
    void finish(ring_listener &to);

    const reader::file_header &header() const { return header_; }
    // As advance() has seen it last.
    const ring_glance &seen() const { return seen_; }
    std::optional<std::uint32_t> last_seq() const { return last_seq_; }
    // The process that has written the last start record.
    std::optional<std::uint32_t> started_by() const { return started_by_; }

private:
    struct tile {
        std::uint64_t offset = 0;
        reader::record_header header;
    };
    struct touched_part {
        std::uint64_t written = 0; // where the writer has come to
        std::uint64_t end = 0;     // what stands before it in a copy may be torn
    };

    std::optional<std::uint64_t> written_to(const ring_glance &now);
    std::optional<std::uint64_t> written_behind(const ring_glance &unfinished_first);
    bool started_anew(const ring_glance &now, std::uint64_t written) const;
    bool is_in_reach(const ring_glance &now, std::uint64_t written);
    bool ends_before(const reader::record_header &first_of_next_lap);
    void start_over(const ring_glance &now, std::uint64_t written);
    void see(const ring_glance &now, std::uint64_t written);
    progress read_on(std::uint64_t written, ring_listener &to);
    bool copy(std::uint64_t end);
    void copy_newest_again(std::uint64_t end);
    reader::record_header header_in_copy(std::uint64_t offset) const;
    std::optional<tile> tile_at(std::uint64_t offset, std::uint64_t end) const;
    bool is_cut_off(const tile &at) const;
    std::optional<touched_part> look_what_is_touched();
    void take(const tile &at, ring_listener &to);
    bool pass_number(const tile &at, ring_listener &to);
    void hand_out(const tile &at, ring_listener &to);
    void damaged(std::uint64_t offset, std::uint64_t end, ring_listener &to);
    std::uint64_t longest_record() const;

    reader::byte_source &source_;
    reader::file_header header_;
    reader::current_time_base time_base_;
    bool since_start_;

    std::uint64_t at_ = 0;    // behind the last record
    bool lap_before_ = false; // where `at_` is
    bool begun_ = false;
    ring_glance seen_;           // `first` tells the lap that is being written
    bool lap_under_way_ = false; // something of it has been seen written
    bool in_order_ = false;      // what comes is behind what was handed out, whatever its number is
    unsigned starts_over_ = 0;   // since records were handed out
    std::uint64_t target_ = 0;   // where the ring was written to at the beginning
    bool caught_up_ = false;
    bool finished_ = false;

    std::vector<std::byte> copied_; // from copied_from_ on
    std::uint64_t copied_from_ = 0;
    std::size_t usual_copy_bytes_ = 0;
    std::optional<std::uint32_t> last_seq_;
    std::optional<timespec> last_time_;
    std::optional<std::uint32_t> started_by_;
    std::optional<lost_records> lost_; // not told yet
};

} // namespace qn::dump
