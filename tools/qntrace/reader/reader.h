// The reading core as the subcommands use it: opens a trace file's bytes and yields decoded records, oldest first.
//
// Every finding, of the header, of the walk or of a record's body, goes to the sink before the record that it concerns
// is delivered. Memory is bounded by the window and the longest record, time by the size of the file. Errors of the
// file system are thrown as io_error; nothing that stands in a file makes anything be thrown.
#pragma once

#include <ctime>
#include <optional>
#include <string>

#include "tools/qntrace/reader/decode.h"
#include "tools/qntrace/reader/finding.h"
#include "tools/qntrace/reader/header.h"
#include "tools/qntrace/reader/source.h"
#include "tools/qntrace/reader/time_base.h"
#include "tools/qntrace/reader/walk.h"

namespace qn::reader
{

struct trace_record {
    raw_record raw;
    record_body body;
    std::string problem;          // why the body is not complete; empty when it is
    std::optional<timespec> time; // absent for a filler, and when no usable time base is in force
};

struct undecoded_record {
    raw_record raw;
    std::optional<timespec> time; // as above
};

class trace_reader
{
public:
    // The source must outlive the reader. Who reads many files at a time gives each a smaller window.
    trace_reader(byte_source &source, finding_sink report, std::size_t window_bytes = window::window_bytes);
    trace_reader(const trace_reader &) = delete;
    trace_reader &operator=(const trace_reader &) = delete;

    // Nothing when the file is not a trace file that can be read; next() then yields nothing either.
    const std::optional<file_header> &header() const { return header_; }

    // Fillers and unfinished records included. What the record refers to is valid until the next call.
    std::optional<trace_record> next();
    // The same without the body, for who only counts: bodies are looked at where they tell the time, or that something
    // is wrong with the record as a whole. Of the bodies that begin with an id, no more than that is read.
    std::optional<undecoded_record> next_undecoded();

    // Bytes of the ring, as far as the header tells its size, that the records so far do not cover because of damage.
    std::uint64_t unreadable_bytes() const;

private:
    decoded_record decode_and_report(const raw_record &raw);
    std::optional<timespec> time_of(const record_header &header) const;

    finding_sink report_;
    window window_;
    std::optional<file_header> header_;
    std::optional<ring_walk> walk_;
    std::optional<current_time_base> time_base_;
};

} // namespace qn::reader
