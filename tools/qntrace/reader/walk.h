// The walk round the ring: hands out the raw records, oldest first, and survives whatever it meets.
//
//   begin                 oldest                         end
//   | newer ... newest    | oldest ... older             |
//     second leg ------->   first leg ----------------->
//
// Every step is checked before it is taken: a record lies wholly before `end`, is at least a record header long and
// moves the walk forward by a multiple of 4, so one leg takes at most (end - begin) / 28 steps.
//
// Damage on the first leg ends that leg only: the second one starts at `begin`, where a record always begins, and
// every record on it is newer. When the oldest record itself cannot be found, a survey of the whole ring looks for the
// newest one, behind which the oldest stands; in a ring too damaged for that, the walk goes from `begin` as far as it can.
//
// A live file moves on while it is read. When the walk derails and the header meanwhile names another oldest record,
// the walk starts anew there and skips what it has already handed out; this is done a limited number of times.
#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <string>

#include "tools/qntrace/reader/bytes.h"
#include "tools/qntrace/reader/finding.h"
#include "tools/qntrace/reader/header.h"
#include "tools/qntrace/reader/source.h"

namespace qn::reader
{

struct record_header {
    std::uint32_t length = 0;
    std::uint16_t function = 0;
    std::uint16_t reserved = 0;
    std::uint32_t seq = 0;
    std::array<char, 4> component = {};
    std::uint32_t thread = 0;
    std::uint64_t counter = 0;
};

// Of at least as many bytes as a record header has.
record_header parse_record_header(const byte_view &view);
// Whether the record has a number of its own; a filler has one when it closed off the end of the ring.
bool is_numbered(const record_header &header);
// Sequence numbers wrap round; one is later than another when it is less than half the range ahead.
bool later(std::uint32_t seq, std::uint32_t than);

struct raw_record {
    std::uint64_t offset = 0;
    record_header header;
    byte_view bytes; // the whole record; of one without data, or longer than any can be, its header only
    bool oversized = false;
};

// False for what holds no record: free space, and a record that was not completed.
bool carries_data(const raw_record &record);

// How much of a record is fetched: all of it, or of the kinds that begin with an id no more than that.
enum class extent { whole, id };

class ring_walk
{
public:
    ring_walk(byte_source &source, window &file, const file_header &header, finding_sink report);

    // The next record, fillers and unfinished ones included; its bytes are valid until the next call.
    std::optional<raw_record> next(extent wanted = extent::whole);
    // Bytes that the walk has passed over because of damage.
    std::uint64_t unreadable_bytes() const { return unreadable_bytes_; }

private:
    enum class leg { first, second, done };

    struct tile {
        record_header header;
        std::string problem; // why the walk cannot go on over this record; empty when it can
    };

    tile look_at(std::uint64_t offset);
    std::optional<raw_record> take(std::uint64_t offset, const record_header &header, extent wanted);
    void advance(std::uint64_t offset, std::uint32_t length);
    void derail(std::uint64_t offset, const std::string &problem);
    bool catch_up();
    void start_without_oldest();
    std::optional<std::uint64_t> survey();
    bool already_delivered(const record_header &header);
    bool goes_back(const record_header &header) const;
    void check_order(std::uint64_t offset, const record_header &header);

    byte_source &source_;
    window &file_;
    const file_header &header_;
    finding_sink report_;

    leg leg_ = leg::first;
    std::uint64_t at_ = 0;
    std::uint64_t stop_ = 0;  // the second leg ends here: at the oldest record, or at the end when that is unknown
    std::uint64_t tiles_ = 0; // stepped over since the walk was last started
    std::uint64_t unreadable_bytes_ = 0;
    bool surveyed_ = false;
    std::optional<std::uint64_t> last_damage_; // not told twice when both legs end there

    std::optional<std::uint32_t> last_seq_;
    std::optional<std::uint32_t> delivered_through_; // records up to this one are skipped after a new start
    unsigned catch_ups_left_ = 16;
    unsigned rereads_left_ = 64;
};

} // namespace qn::reader
