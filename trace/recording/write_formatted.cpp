// Strings records of one formatted text.
#include <cstdarg>

#include "trace/recording/format_text.h"
#include "trace/recording/string_writer.h"

namespace
{
using namespace qn::tr;

// The text is made in the anchor's buffer, under the lock, and is the record's one string.
struct formatted_writer : string_writer {
    const char *format;
    argument_list arguments;

    formatted_writer(qn_uint32_t trace_id, const char *text_format, argument_list args)
        : string_writer(trace_id, nullptr), format(text_format), arguments(args)
    {
    }

    qn_int32_t check(const trace_anchor_t *) const
    {
        return format == nullptr || format[0] == '\0' ? QN_TR_ENOFORMAT : 0;
    }

    qn_int32_t size(trace_anchor_t *anchor, unsigned int &length)
    {
        const made_text text = format_text(anchor->buffer, sizeof anchor->buffer, format, arguments);
        if (text.result < 0) return QN_TR_EFORMAT;
        string = anchor->buffer;
        string_size = static_cast<qn_uint32_t>(text.length) + 1;
        length = format::strings_record_bytes(string_size);
        return length > anchor->uMaxSize ? cut(anchor, length) : 0;
    }

private:
    [[gnu::cold]] qn_int32_t cut(trace_anchor_t *anchor, unsigned int &length)
    {
        length = anchor->uMaxSize;
        string_size = anchor->uMaxSize - static_cast<qn_uint32_t>(sizeof(record));
        if (string_size == 0) return nothing_to_write; // no room for a terminator
        anchor->buffer[string_size - 1] = '\0';
        return 0;
    }
};
} // namespace

// As with strings: the exported names are left out while they are the library's own.
extern "C" {
[[gnu::visibility("hidden"), gnu::alias("tr_record_vfmt_string_1")]] qn_int32_t
own_vfmt_string(const qn_char_t *, qn_uint32_t, const qn_char_t *, va_list);
[[gnu::visibility("hidden"), gnu::alias("tr_ms_record_vfmt_string_1")]] qn_int32_t
own_ms_vfmt_string(const qn_char_t *, qn_uint32_t, tr_file_token_t, const qn_char_t *, va_list);
}

namespace
{
const bool ms_formatted_are_own = tr_ms_record_vfmt_string_1 == own_ms_vfmt_string;
const bool formatted_are_own = ms_formatted_are_own && tr_record_vfmt_string_1 == own_vfmt_string;

[[gnu::always_inline, gnu::format(printf, 3, 0)]] inline qn_int32_t
record_formatted(const qn_char_t *comp_id, qn_uint32_t trace_id, const char *format, va_list args)
{
    return __builtin_expect(formatted_are_own, 1)
               ? write_record_by<formatted_writer>(comp_id, nullptr, trace_id, format, args)
               : tr_record_vfmt_string_1(comp_id, trace_id, format, args);
}
} // namespace

qn_int32_t tr_ms_record_vfmt_string_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                      const qn_char_t *pFormat, va_list args)
{
    return write_record_by<formatted_writer>(pCompId, fileToken, traceId, pFormat, args);
}

qn_int32_t tr_record_vfmt_string_1(const qn_char_t *pCompId, qn_uint32_t traceId, const qn_char_t *pFormat,
                                   va_list args)
{
    return tr_ms_record_vfmt_string_1(pCompId, traceId, nullptr, pFormat, args);
}

qn_int32_t tr_ms_record_fmt_string_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                     const qn_char_t *pFormat, ...)
{
    va_list args;
    va_start(args, pFormat);
    const qn_int32_t status = __builtin_expect(ms_formatted_are_own, 1)
                                  ? write_record_by<formatted_writer>(pCompId, fileToken, traceId, pFormat, args)
                                  : tr_ms_record_vfmt_string_1(pCompId, traceId, fileToken, pFormat, args);
    va_end(args);
    return status;
}

qn_int32_t tr_record_fmt_string_1(const qn_char_t *pCompId, qn_uint32_t traceId, const qn_char_t *pFormat, ...)
{
    va_list args;
    va_start(args, pFormat);
    const qn_int32_t status = record_formatted(pCompId, traceId, pFormat, args);
    va_end(args);
    return status;
}

qn_int32_t tr_record_vprintf_1(const qn_char_t *pCompId, const qn_char_t *pFormat, va_list args)
{
    return tr_record_vfmt_string_1(pCompId, no_trace_id, pFormat, args);
}

qn_int32_t tr_record_printf_1(const qn_char_t *pCompId, const qn_char_t *pFormat, ...)
{
    va_list args;
    va_start(args, pFormat);
    const qn_int32_t status = record_formatted(pCompId, no_trace_id, pFormat, args);
    va_end(args);
    return status;
}
