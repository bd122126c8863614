// The lines of the configuration file, and what each of them is.
#pragma once

#include <cstdio>
#include <string_view>

#include <qn_tr.h>

#include "trace/files/compiled_pattern.h"

namespace qn::tr
{
// Reads lines of at most 1022 characters; what is left of a longer one is the next line. A line ends at a NUL in it.
class conf_lines
{
public:
    explicit conf_lines(FILE *file) : file_(file) {}
    bool next();                                // false at the end of the file
    const char *text() const;                   // without white space in front, with its line end
    unsigned number() const { return number_; } // the file's line that it is, or belongs to; from 1

private:
    FILE *file_;
    char line_[1023] = "";
    unsigned number_ = 0;
    bool goes_on_ = false; // the next line is the rest of this one
};

enum class conf_line_type { comment, header, pair, other };

// A line with its parts; they point into the line.
struct conf_line {
    conf_line_type type = conf_line_type::other;
    const char *text = "";
    std::string_view name;  // of a header
    std::string_view key;   // of a pair
    std::string_view value; // of a pair
};

// The patterns that tell what a line is.
class conf_patterns
{
public:
    qn_int32_t status() const;                                    // 0, or 42, 43, 44: which did not compile
    qn_int32_t classify(const char *text, conf_line &line) const; // 0, or 14 after recording it

private:
    const compiled_pattern header_{"^(.+):.*$", 0};
    const compiled_pattern pair_{"^[ \t]*([-_a-zA-Z]+)[ \t]*=[ \t]*([-_a-zA-Z0-9/*.]+[$]*)[ \t]*$", 0};
    const compiled_pattern comment_{"^.*#.*", 0};
};
} // namespace qn::tr
