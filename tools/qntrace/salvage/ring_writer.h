// Writes a fresh trace file: the header of another one, mended, and a ring of records one after the other from its
// beginning, closed by a free record. The byte order is that of the other file.
#pragma once

#include <cstdint>
#include <cstdio>
#include <optional>
#include <vector>

#include "tools/qntrace/reader/reader.h"

namespace qn::dump
{

class ring_writer
{
public:
    // `header_bytes` is the header as it stands in the file. The stream is at its beginning; errors of writing stay in it.
    ring_writer(std::FILE *out, std::vector<std::byte> header_bytes, const reader::file_header &header);

    // False when there is no room for it, or none for the time base that it needs: a file may be written to faster than
    // it is read, and a record that set the time base may be lost without a trace.
    bool add(const reader::trace_record &record, const cu_timeinfo_t &base);
    void finish();

private:
    bool agree_on_time(const reader::trace_record &record, const cu_timeinfo_t &base);
    void add_calibration(const reader::trace_record &record, const cu_timeinfo_t &base);
    void append(std::span<const std::byte> record);
    std::uint64_t close_ring(); // the size of the file
    void mend_header(std::uint64_t file_bytes);
    void put(std::span<std::byte> bytes, std::size_t at, std::size_t width, std::uint64_t value) const;
    void write_at(std::uint64_t offset, std::span<const std::byte> bytes);

    std::FILE *out_;
    std::vector<std::byte> header_bytes_;
    reader::file_header header_;
    std::uint64_t at_;      // where the next record goes
    std::uint64_t last_at_; // where the last one stands
    std::uint64_t oldest_ = 0;
    std::optional<std::uint32_t> last_seq_;
    std::optional<cu_timeinfo_t> first_base_; // the header's
    std::optional<cu_timeinfo_t> base_;       // in force behind the last record
};

} // namespace qn::dump
