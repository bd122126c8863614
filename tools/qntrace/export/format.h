// What every format of `qntrace export` is: something that takes records, and what is missing, and makes an output of
// them. All of them write as they go; memory does not grow with the trace.
#pragma once

#include <cstddef>
#include <memory>
#include <string>
#include <vector>

#include "tools/qntrace/export/compression.h"
#include "tools/qntrace/traces/losses.h"
#include "tools/qntrace/traces/merged_traces.h"
#include "tools/qntrace/traces/trace_set.h"

namespace qn::dump
{

// A source is named by its index among those that the format was made for. Whatever cannot be written is thrown as an
// output_error.
class export_format
{
public:
    export_format() = default;
    virtual ~export_format() = default;
    export_format(const export_format &) = delete;
    export_format &operator=(const export_format &) = delete;

    // A record that is to be exported.
    virtual void record(std::size_t source, const merge_stream &stream) = 0;
    // The source has no more records.
    virtual void end_of_source(std::size_t source, const losses &lost) = 0;
    // All sources are at their end.
    virtual void finish() = 0;
};

using source_list = std::vector<trace_source>; // outlives the format

// These take one source after the other, those of a node, program and trace behind each other in the order of time.
std::unique_ptr<export_format> make_jsonl_export(const source_list &sources, const std::string &folder,
                                                 compression packed);
std::unique_ptr<export_format> make_ctf_export(const source_list &sources, const std::string &folder);
// These take the records of all sources in one order by time.
std::unique_ptr<export_format> make_chrome_export(const source_list &sources, const std::string &file);
std::unique_ptr<export_format> make_sqlite_export(const source_list &sources, const std::string &file);

} // namespace qn::dump
