// Reads a trace in memory to its end, and keeps what came out.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "tools/qntrace/reader/reader.h"

namespace qn::test
{

// A record as far as it outlives the reader.
struct kept_record {
    std::uint64_t offset = 0;
    reader::record_header header;
    std::string kind;
    std::string problem;
    std::optional<std::string> time_ns; // since the epoch, in decimal
};

struct reading {
    std::optional<reader::file_header> header;
    std::vector<kept_record> records; // all of them, fillers too
    std::vector<reader::finding> findings;

    // Sequence numbers of the records that carry data.
    std::vector<std::uint32_t> data_seqs() const;
    // "OFFSET: TEXT" of each finding that is damage, or a record that was not completed.
    std::vector<std::string> damage() const;
    std::vector<std::string> notes() const;
};

reading read_all(reader::byte_source &source);
reading read_all(std::span<const std::byte> bytes);

struct dump_choice {
    bool raw = false;
    bool utf_8 = false;
    bool with_header = false;
};

// The text and the JSON lines of a whole file, in UTC; without the header unless asked for.
std::string text_of(std::span<const std::byte> bytes, const dump_choice &choice = {});
std::string json_of(std::span<const std::byte> bytes, const dump_choice &choice = {});

} // namespace qn::test
