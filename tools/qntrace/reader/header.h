// The file header: read, checked, and made into bounds that the ring walk may rely on.
//
// The fields are kept as the file has them, so that they can be shown; what the walk uses is `ring`, which lies inside
// the file whatever the header says. A header with a wrong field or two is repaired where the format leaves no doubt
// (and the finding says so); a file that is none of ours is refused.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "tools/qntrace/reader/bytes.h"
#include "tools/qntrace/reader/finding.h"
#include "tools/qntrace/reader/source.h"
#include "trace/files/format.h"

namespace qn::reader
{

// Where records may stand: begin <= oldest, oldest + a record header <= end <= size of the file.
struct ring_bounds {
    std::uint64_t begin = 0;
    std::uint64_t end = 0;
    std::optional<std::uint64_t> oldest; // absent when the header's offset cannot be right
};

// Older formats lack what is optional here.
struct file_header {
    byte_order order = byte_order::little;
    std::uint8_t properties = 0;
    std::uint8_t platform = 0;
    std::uint16_t version = 0;
    std::uint16_t flags = 0;
    std::uint16_t node_number = 0;
    std::uint32_t ring_offset = 0;
    std::uint32_t seq_lock = 0;
    std::uint32_t tail_request = 0;
    std::uint32_t file_size = 0;
    cu_timeinfo_t time_info = {};
    std::uint32_t machine_id = 0;
    std::uint32_t oldest_record_offset = 0;
    std::uint32_t pid = 0;
    std::optional<std::string> program;
    std::optional<std::string> build_name;
    std::optional<std::string> base_program;
    std::optional<std::uint64_t> node_id;
    std::optional<std::uint32_t> page_reuse_time;
    std::optional<std::uint8_t> page_state;
    std::optional<std::int32_t> tz_offset_minutes;

    ring_bounds ring;
};

// Nothing when the file cannot be read as a trace file; the sink has then been told why.
std::optional<file_header> read_header(window &file, const finding_sink &report);

// Of a file that read_header() refuses: whether its first bytes tell that it was to be a trace file all the same, of a
// newer version, or cut, or with a torn header.
bool is_meant_as_header(window &file);

// The offset of the oldest record as the header of a live file has it now, when it is a possible one.
std::optional<std::uint64_t> reread_oldest(byte_source &source, const file_header &header);

} // namespace qn::reader
