// A trace file as bytes, read by offsets that are written down here and not taken from the library: a layout that moves
// in the library is found by a test that fails.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace qn::test
{
// One record of a ring.
struct record_image {
    uint64_t offset = 0; // in the file
    std::string bytes;   // header and body, `length` of them

    uint8_t u8(size_t at) const;
    uint16_t u16(size_t at) const;
    uint32_t u32(size_t at) const;
    uint64_t u64(size_t at) const;
    std::string text(size_t at) const; // up to its NUL

    uint32_t length() const { return u32(0); }
    uint16_t function() const { return u16(4); }
    uint32_t sequence() const { return u32(8); }
    std::string component() const { return bytes.substr(12, 4); }
    uint32_t thread() const { return u32(16); }
    uint64_t time_stamp() const { return u64(20); }
    bool is_data() const { return function() != 0 && function() != 0xFFFF; }
};

class trace_image
{
public:
    explicit trace_image(std::string bytes) : bytes_(std::move(bytes)) {}
    static trace_image of_file(const std::string &name); // as it is on the disk now

    size_t size() const { return bytes_.size(); }
    const std::string &bytes() const { return bytes_; }
    uint8_t u8(size_t at) const;
    uint16_t u16(size_t at) const;
    uint32_t u32(size_t at) const;
    uint64_t u64(size_t at) const;
    std::string text(size_t at, size_t field_size) const; // a NUL-terminated field

    // Named header words.
    uint32_t ring_offset() const { return u32(8); }
    uint32_t seq_lock() const { return u32(12); }
    uint32_t tail_request() const { return u32(16); }
    uint32_t file_size() const { return u32(20); }
    uint32_t oldest_offset() const { return u32(44); }
    uint32_t pid() const { return u32(48); }

    // Every record from the oldest on, fillers and free space too. Fails the test when the records do not tile the ring
    // exactly.
    std::vector<record_image> ring() const;
    // The same without fillers, free space and what is being written.
    std::vector<record_image> records() const;
    // Those of one kind.
    std::vector<record_image> records_of(uint16_t function) const;

private:
    std::string bytes_;
};
} // namespace qn::test
