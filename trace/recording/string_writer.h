// Strings records of one string, which is what most of them have: without a list of strings, they cost a tenth less.
#pragma once

#include <cstring>

#include "trace/recording/record_frame.h"

namespace qn::tr
{
// The trace id of the forms that are not given one.
inline constexpr qn_uint32_t no_trace_id = 0xFFFFFFFF;

// A string's bytes with its terminator; 0 for one that is null or empty, which no record may have.
inline size_t bytes_of(const char *string)
{
    return string != nullptr && string[0] != '\0' ? std::strlen(string) + 1 : 0;
}

struct string_writer : record_writer {
    static constexpr auto function = format::kind::strings;
    using record = trace_record_strings_t;

    qn_uint32_t id;
    const char *string;
    qn_uint32_t number = 1;
    qn_uint32_t string_size = 0; // with its terminator

    string_writer(qn_uint32_t trace_id, const char *only) : id(trace_id), string(only) {}

    // A string that is too long is left out. The trace may be resized before the lock is taken: then the allocator has
    // the last word.
    qn_int32_t check(const trace_anchor_t *anchor)
    {
        const size_t size = bytes_of(string);
        if (size == 0) return QN_TR_ESTRING;
        const qn_uint32_t longest = load_relaxed(anchor->uMaxSize);
        if (__builtin_expect(size > longest, 0)) {
            if (longest == 0) return nothing_to_write; // not active: what is started meanwhile gets no empty record
            number = 0;
            return 0;
        }
        string_size = static_cast<qn_uint32_t>(size);
        return 0;
    }

    qn_int32_t size(const trace_anchor_t *, unsigned int &length) const
    {
        length = format::strings_record_bytes(string_size);
        return 0;
    }

    void fill(trace_record_strings_t *to) const
    {
        to->id = id;
        to->number = number;
        to->len_strings = string_size;
        std::memcpy(body_of(to), string, string_size);
    }
};
} // namespace qn::tr
