// Strings records: up to 32 strings.
#include <array>
#include <cstdarg>
#include <cstring>

#include "trace/recording/string_writer.h"

namespace
{
using namespace qn::tr;

constexpr qn_uint32_t most_strings = 32;

struct strings_writer : record_writer {
    static constexpr auto function = format::kind::strings;
    using record = trace_record_strings_t;

    qn_uint32_t id;
    qn_uint32_t number;
    argument_list arguments;
    qn_uint32_t len_strings = 0;
    std::array<const char *, most_strings> strings;
    std::array<qn_uint32_t, most_strings> sizes;

    strings_writer(qn_uint32_t trace_id, qn_uint32_t count, argument_list args)
        : id(trace_id), number(count), arguments(args)
    {
    }

    // Takes the strings; the first one with which their running total no longer fits ends them. The trace may be
    // resized before the lock is taken: then the allocator has the last word.
    qn_int32_t check(const trace_anchor_t *anchor)
    {
        if (number == 0 || number > most_strings) return QN_TR_ESTRCOUNT;
        const qn_uint32_t longest = load_relaxed(anchor->uMaxSize);
        for (qn_uint32_t i = 0; i < number; ++i) {
            const char *string = va_arg(arguments, const char *);
            const size_t size = bytes_of(string);
            if (size == 0) return QN_TR_ESTRING;
            if (len_strings + size > longest) {
                if (longest == 0) return nothing_to_write; // not active: what is started meanwhile gets no empty record
                number = i;
                break;
            }
            strings[i] = string;
            sizes[i] = static_cast<qn_uint32_t>(size);
            len_strings += sizes[i];
        }
        return 0;
    }

    qn_int32_t size(const trace_anchor_t *, unsigned int &length) const
    {
        length = format::strings_record_bytes(len_strings);
        return 0;
    }

    void fill(trace_record_strings_t *to) const
    {
        to->id = id;
        to->number = number;
        to->len_strings = len_strings;
        unsigned char *place = body_of(to);
        for (qn_uint32_t i = 0; i < number; place += sizes[i++]) std::memcpy(place, strings[i], sizes[i]);
    }
};
} // namespace

// The forms forward to the main writer through the exported names, so that an application that replaces one of those
// changes these too. Nearly always nobody has: then the calls through the table of imported names are left out.
extern "C" {
[[gnu::visibility("hidden"), gnu::alias("tr_record_strings_1")]] qn_int32_t own_strings(const qn_char_t *, qn_uint32_t,
                                                                                        qn_uint32_t, ...);
[[gnu::visibility("hidden"), gnu::alias("tr_record_strings_v_1")]] qn_int32_t
own_strings_v(const qn_char_t *, qn_uint32_t, qn_uint32_t, va_list);
[[gnu::visibility("hidden"), gnu::alias("tr_ms_record_strings_v_1")]] qn_int32_t
own_ms_strings_v(const qn_char_t *, qn_uint32_t, tr_file_token_t, qn_uint32_t, va_list);
}

namespace
{
// Known when the library is loaded: all its names are bound then.
const bool ms_lists_are_own = tr_ms_record_strings_v_1 == own_ms_strings_v;
const bool lists_are_own = ms_lists_are_own && tr_record_strings_v_1 == own_strings_v;
const bool strings_are_own = lists_are_own && tr_record_strings_1 == own_strings;

// What the forwarding comes to while the names are own.
[[gnu::always_inline]] inline qn_int32_t record_strings(const qn_char_t *comp_id, qn_uint32_t trace_id,
                                                        tr_file_token_t token, qn_uint32_t number, va_list args)
{
    return __builtin_expect(number == 1, 1)
               ? write_record_by<string_writer>(comp_id, token, trace_id, va_arg(args, const char *))
               : own_ms_strings_v(comp_id, trace_id, token, number, args);
}
} // namespace

qn_int32_t tr_ms_record_strings_v_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                    qn_uint32_t numStrings, va_list args)
{
    return write_record_by<strings_writer>(pCompId, fileToken, traceId, numStrings, args);
}

qn_int32_t tr_record_strings_v_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t numStrings, va_list args)
{
    return tr_ms_record_strings_v_1(pCompId, traceId, nullptr, numStrings, args);
}

qn_int32_t tr_ms_record_strings_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                  qn_uint32_t numStrings, ...)
{
    va_list args;
    va_start(args, numStrings);
    const qn_int32_t status = __builtin_expect(ms_lists_are_own, 1)
                                  ? record_strings(pCompId, traceId, fileToken, numStrings, args)
                                  : tr_ms_record_strings_v_1(pCompId, traceId, fileToken, numStrings, args);
    va_end(args);
    return status;
}

qn_int32_t tr_record_strings_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t numStrings, ...)
{
    va_list args;
    va_start(args, numStrings);
    const qn_int32_t status = __builtin_expect(lists_are_own, 1)
                                  ? record_strings(pCompId, traceId, nullptr, numStrings, args)
                                  : tr_record_strings_v_1(pCompId, traceId, numStrings, args);
    va_end(args);
    return status;
}

qn_int32_t tr_record_string_1(const qn_char_t *pCompId, const qn_char_t *pString)
{
    if (__builtin_expect(!strings_are_own, 0)) return tr_record_strings_1(pCompId, no_trace_id, 1, pString);
    return write_record_by<string_writer>(pCompId, nullptr, no_trace_id, pString);
}
