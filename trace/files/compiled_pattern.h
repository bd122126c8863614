// A compiled regular expression, as every pattern of the library is meant: extended, without regard to case, "." and
// "[^...]" not matching a line feed. One that would take too much to compile is treated as if memory had run out.
#pragma once

#include <cstddef>
#include <regex.h>
#include <span>

#include "trace/files/pattern_cost.h"

namespace qn::tr
{
// Freed with its scope.
class compiled_pattern
{
public:
    explicit compiled_pattern(const char *pattern, int flags = REG_NOSUB)
        : result_(is_affordable(pattern) ? regcomp(&regex_, pattern, REG_EXTENDED | REG_ICASE | REG_NEWLINE | flags)
                                         : REG_ESPACE)
    {
    }
    compiled_pattern(const compiled_pattern &) = delete;
    compiled_pattern &operator=(const compiled_pattern &) = delete;
    ~compiled_pattern()
    {
        if (result_ == 0) regfree(&regex_);
    }
    explicit operator bool() const { return result_ == 0; }

    // What regexec() returns; with the places of the whole match and its groups, when compiled with flags 0.
    int compare(const char *text, std::span<regmatch_t> places = {}) const
    {
        return regexec(&regex_, text, places.size(), places.data(), 0);
    }
    bool matches(const char *text, std::span<regmatch_t> places = {}) const { return compare(text, places) == 0; }

private:
    regex_t regex_{};
    int result_;
};
} // namespace qn::tr
