// The frame that every record writer runs in.
//
// A writer states only what is its own, as a class:
//
//   static constexpr format::kind function     what the record is
//   using record                               its fixed part
//   qn_int32_t check(anchor)                   its arguments, before the lock          (optional)
//   qn_int32_t check_locked(anchor)            its arguments, under the lock           (optional)
//   qn_int32_t size(anchor, length)            the record's length; only for a trace that is active
//   void fill(record *)                        the body; the header is done
//
// A status other than 0 ends the call with it, and nothing is written; nothing_to_write ends it with 0.
#pragma once

#include <cstdarg>
#include <type_traits>

#include "trace/files/library.h"
#include "trace/files/locks.h"
#include "trace/files/trace_file.h"
#include "trace/recording/recording.h"
#include "trace/recording/space.h"

namespace qn::tr
{
// A va_list as a function receives it.
using argument_list = std::decay_t<va_list>;

inline constexpr qn_int32_t nothing_to_write = -1;

// What a writer need not state.
struct record_writer {
    static qn_int32_t check(const trace_anchor_t *) { return 0; }
    static qn_int32_t check_locked(const trace_anchor_t *) { return 0; }
};

// A component identifier whose memory page ends before its fourth byte: the next page may not exist.
[[gnu::cold, gnu::noinline]] inline qn_uint32_t component_id_at_page_end(const char *from)
{
    qn_uint32_t bytes = 0;
    for (unsigned i = 0; i < sizeof bytes && from[i] != '\0'; ++i)
        bytes |= static_cast<qn_uint32_t>(static_cast<unsigned char>(from[i])) << (8 * i);
    return bytes;
}

// Copies a component identifier as the one word that the record holds. A shorter identifier contributes the bytes
// behind its end.
__attribute__((no_sanitize("address"))) inline void copy_component_id(char *to, const char *from)
{
    struct [[gnu::packed, gnu::may_alias]] word { qn_uint32_t bytes; };
    constexpr uintptr_t memory_page = 4096;
    const bool readable = reinterpret_cast<uintptr_t>(from) % memory_page <= memory_page - sizeof(word);
    reinterpret_cast<word *>(to)->bytes =
        __builtin_expect(readable, 1) ? reinterpret_cast<const word *>(from)->bytes : component_id_at_page_end(from);
}

template <class Writer>
[[gnu::always_inline]] inline qn_int32_t write_record(const qn_char_t *comp_id, tr_file_token_t token, Writer &writer)
{
    if (master_override_off()) return 0;
    trace_anchor_t *anchor = token != nullptr ? token : &anchors;
    if (comp_id == nullptr || comp_id[0] == '\0') return QN_TR_ECOMPID;
    qn_int32_t status = writer.check(anchor);
    if (status != 0) return status == nothing_to_write ? 0 : status;

    biased_thread *self = this_thread;
    if (interrupts_a_guard(self)) return QN_TR_ELOCK;
    writer_lock set(anchor, self);
    if (__builtin_expect(!set, 0)) return QN_TR_ELOCK;
    status = writer.check_locked(anchor);
    // Not even the fixed part fits: the trace is not active, or its ring is tiny.
    if (status != 0 || __builtin_expect(anchor->uMaxSize < sizeof(typename Writer::record), 0)) return status;
    unsigned int length = 0;
    status = writer.size(anchor, length);
    if (status != 0) return status == nothing_to_write ? 0 : status;

    trace_record_header_t *header = reserve(anchor, length);
    if (__builtin_expect(header == nullptr, 0)) {
        if (!set.take_mutex()) return QN_TR_ELOCK;
        header = reserve_otherwise(anchor, length);
        if (header == nullptr) return 0;
    }
    copy_component_id(header->compId, comp_id);
    writer.fill(reinterpret_cast<typename Writer::record *>(header));
    keep_store_order();
    header->function = static_cast<qn_uint16_t>(Writer::function);
    return 0;
}

// Writes a record by a writer of that class, made of what the call was given. Inlined: it may stand behind the one test
// that leaves the forwarding through exported names out.
template <class Writer, class... Given>
[[gnu::always_inline]] inline qn_int32_t write_record_by(const qn_char_t *comp_id, tr_file_token_t token,
                                                         Given... given)
{
    Writer writer(given...);
    return write_record(comp_id, token, writer);
}

// Where a record's variable part begins.
template <class Record>
inline unsigned char *body_of(Record *record)
{
    return reinterpret_cast<unsigned char *>(record + 1);
}
} // namespace qn::tr
