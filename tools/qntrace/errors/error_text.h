// Error records and their groups as text for people.
#pragma once

#include <string>
#include <vector>

#include "tools/qntrace/errors/error_groups.h"
#include "tools/qntrace/format/escape.h"
#include "tools/qntrace/format/timestamps.h"
#include "tools/qntrace/traces/losses.h"

namespace qn::dump
{

struct error_text_options {
    bool utc = false;
    charset printable = charset::ascii;
    std::size_t columns = 0; // of the terminal; 0: lines are not broken
};

class error_text
{
public:
    // The sources must outlive it.
    error_text(const std::vector<trace_source> &sources, const error_text_options &options)
        : sources_(sources), options_(options), timestamps_(options.utc)
    {
    }

    // All append to `out`: one error record; a group with what its records have in common as its title.
    void event(std::string &out, const error_event &event);
    void group(std::string &out, const error_group &group, error_grouping by);
    // What is missing, as the last line.
    void losses_line(std::string &out, const losses &lost) const;

private:
    void title(std::string &out, std::uint64_t count, std::string_view text) const;
    void field(std::string &out, std::string_view name, std::string_view text) const;
    void details(std::string &out, const error_event &event) const;
    std::string time_text(const std::optional<timespec> &time);
    std::string origin_text(const error_event &event) const;
    std::string escaped(std::string_view text) const;

    const std::vector<trace_source> &sources_;
    error_text_options options_;
    timestamps timestamps_;
};

} // namespace qn::dump
