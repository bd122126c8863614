// A ring as it should be after any sequence of records: the rules of the ring once more, over a map of records instead
// of bytes, and without a line of the library.
#pragma once

#include <cstdint>
#include <map>
#include <string>

#include "recording/expected_bytes.h"
#include "support/trace_image.h"

namespace qn::test
{
class ring_model
{
public:
    // An empty ring in a file of that size.
    explicit ring_model(uint32_t file_bytes);

    uint32_t longest_record() const { return longest_; }
    uint32_t last_sequence() const { return last_sequence_; }

    // A record with that body was asked for; one that is too long changes nothing. Returns whether it was written.
    bool write(uint16_t function, const std::string &component, const expected_bytes &body);

    // Notes between which two counter values the last record was stamped, and who wrote it.
    void stamped(uint64_t from, uint64_t to, uint32_t thread);

    // The bytes of the start record that was overwritten last; empty: none yet.
    const std::string &overwritten_start() const { return overwritten_start_; }

    // Fails the test unless the file's ring is that, record for record. Keeps the bytes of the start records that it
    // sees.
    void expect_equal(const trace_image &image);

private:
    struct record {
        uint32_t length = 0;
        uint16_t function = 0;
        uint32_t sequence = 0;
        std::string component;
        expected_bytes body;
        uint64_t stamped_from = 0;
        uint64_t stamped_to = 0;
        uint32_t thread = 0;
        std::string seen; // a start record's bytes
    };
    using ring = std::map<uint32_t, record>; // by offset

    void forget(ring::iterator gone);

    uint32_t file_bytes_;
    uint32_t longest_;
    uint32_t last_sequence_ = 0;
    uint32_t free_ = 0; // offset of the oldest record
    uint32_t newest_ = 0;
    ring records_;
    std::string overwritten_start_;
};
} // namespace qn::test
