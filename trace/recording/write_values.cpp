// Records of 32-bit and 64-bit values.
#include <array>
#include <cstdarg>
#include <cstring>

#include "trace/recording/record_frame.h"

namespace
{
using namespace qn::tr;

// Where a writer takes its values from: an argument list, or an array.
template <class Value>
struct listed_values {
    argument_list values;
    void copy_to(unsigned char *place, qn_uint32_t number)
    {
        for (qn_uint32_t i = 0; i < number; ++i, place += sizeof(Value)) {
            const Value value = va_arg(values, Value);
            std::memcpy(place, &value, sizeof value);
        }
    }
};

// All of them nearly always; fewer when the ring is tiny.
template <class Value, size_t Count>
struct given_values {
    std::array<Value, Count> values;
    void copy_to(unsigned char *place, qn_uint32_t number)
    {
        if (__builtin_expect(number == Count, 1))
            std::memcpy(place, values.data(), Count * sizeof(Value));
        else
            std::memcpy(place, values.data(), number * sizeof(Value));
    }
};

// Writes values straight from their source into the file.
template <class Value, format::kind Function, class Source>
struct values_writer : record_writer {
    static constexpr auto function = Function;
    using record = trace_record_values_t;

    qn_uint32_t id;
    qn_uint32_t number;
    Source source;

    values_writer(qn_uint32_t trace_id, qn_uint32_t count, Source from) : id(trace_id), number(count), source(from) {}

    // What does not fit is cut off.
    qn_int32_t size(const trace_anchor_t *anchor, unsigned int &length)
    {
        const qn_uint64_t wanted = sizeof(record) + qn_uint64_t{number} * sizeof(Value);
        length = static_cast<unsigned int>(wanted);
        if (wanted > anchor->uMaxSize) {
            length = anchor->uMaxSize;
            number = static_cast<qn_uint32_t>((anchor->uMaxSize - sizeof(record)) / sizeof(Value));
        }
        return 0;
    }

    void fill(trace_record_values_t *to)
    {
        to->id = id;
        to->number = number;
        source.copy_to(body_of(to), number);
    }
};

template <class Value, format::kind Function>
qn_int32_t write_listed(const qn_char_t *comp_id, qn_uint32_t trace_id, tr_file_token_t token, qn_uint32_t number,
                        va_list args)
{
    values_writer<Value, Function, listed_values<Value>> writer(trace_id, number, {args});
    return write_record(comp_id, token, writer);
}

// One or two values for the default trace file.
template <class Value, format::kind Function, class... Given>
qn_int32_t write_given(const qn_char_t *comp_id, qn_uint32_t trace_id, Given... given)
{
    using source = given_values<Value, sizeof...(given)>;
    values_writer<Value, Function, source> writer(trace_id, sizeof...(given), source{{static_cast<Value>(given)...}});
    return write_record(comp_id, nullptr, writer);
}

constexpr auto kind_32 = format::kind::values_32;
constexpr auto kind_64 = format::kind::values_64;
} // namespace

qn_int32_t int_record_values_32_v(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                  qn_uint32_t numValues, va_list args)
{
    return write_listed<qn_int32_t, kind_32>(pCompId, traceId, fileToken, numValues, args);
}

qn_int32_t tr_ms_record_values_32_v_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                      qn_uint32_t numValues, va_list args)
{
    return int_record_values_32_v(pCompId, traceId, fileToken, numValues, args);
}

qn_int32_t tr_record_values_32_v_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t numValues, va_list args)
{
    return tr_ms_record_values_32_v_1(pCompId, traceId, nullptr, numValues, args);
}

qn_int32_t tr_ms_record_values_32_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                    qn_uint32_t numValues, ...)
{
    va_list args;
    va_start(args, numValues);
    const qn_int32_t status = tr_ms_record_values_32_v_1(pCompId, traceId, fileToken, numValues, args);
    va_end(args);
    return status;
}

qn_int32_t tr_record_values_32_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t numValues, ...)
{
    va_list args;
    va_start(args, numValues);
    const qn_int32_t status = tr_record_values_32_v_1(pCompId, traceId, numValues, args);
    va_end(args);
    return status;
}

qn_int32_t tr_ms_record_values_64_v_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                      qn_uint32_t numValues, va_list args)
{
    return write_listed<qn_int64_t, kind_64>(pCompId, traceId, fileToken, numValues, args);
}

qn_int32_t tr_record_values_64_v_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t numValues, va_list args)
{
    return tr_ms_record_values_64_v_1(pCompId, traceId, nullptr, numValues, args);
}

qn_int32_t tr_ms_record_values_64_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                    qn_uint32_t numValues, ...)
{
    va_list args;
    va_start(args, numValues);
    const qn_int32_t status = tr_ms_record_values_64_v_1(pCompId, traceId, fileToken, numValues, args);
    va_end(args);
    return status;
}

qn_int32_t tr_record_values_64_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t numValues, ...)
{
    va_list args;
    va_start(args, numValues);
    const qn_int32_t status = tr_record_values_64_v_1(pCompId, traceId, numValues, args);
    va_end(args);
    return status;
}

// The forms for one or two values forward to the ones above through their exported names, so that an application that
// replaces one of those changes these too. Nearly always nobody has: then the forwarding, a call through the table of
// imported names and an argument list at a time, costs as much as the record, and is left out.
extern "C" {
[[gnu::visibility("hidden"), gnu::alias("tr_record_values_32_1")]] qn_int32_t
own_values_32(const qn_char_t *, qn_uint32_t, qn_uint32_t, ...);
[[gnu::visibility("hidden"), gnu::alias("tr_record_values_32_v_1")]] qn_int32_t
own_values_32_v(const qn_char_t *, qn_uint32_t, qn_uint32_t, va_list);
[[gnu::visibility("hidden"), gnu::alias("tr_ms_record_values_32_v_1")]] qn_int32_t
own_ms_values_32_v(const qn_char_t *, qn_uint32_t, tr_file_token_t, qn_uint32_t, va_list);
[[gnu::visibility("hidden"), gnu::alias("tr_record_values_64_1")]] qn_int32_t
own_values_64(const qn_char_t *, qn_uint32_t, qn_uint32_t, ...);
[[gnu::visibility("hidden"), gnu::alias("tr_record_values_64_v_1")]] qn_int32_t
own_values_64_v(const qn_char_t *, qn_uint32_t, qn_uint32_t, va_list);
[[gnu::visibility("hidden"), gnu::alias("tr_ms_record_values_64_v_1")]] qn_int32_t
own_ms_values_64_v(const qn_char_t *, qn_uint32_t, tr_file_token_t, qn_uint32_t, va_list);
}

namespace
{
// Known when the library is loaded: all its names are bound then.
const bool values_32_are_own = tr_record_values_32_1 == own_values_32 && tr_record_values_32_v_1 == own_values_32_v &&
                               tr_ms_record_values_32_v_1 == own_ms_values_32_v;
const bool values_64_are_own = tr_record_values_64_1 == own_values_64 && tr_record_values_64_v_1 == own_values_64_v &&
                               tr_ms_record_values_64_v_1 == own_ms_values_64_v;

template <class... Given>
qn_int32_t record_32(const qn_char_t *comp_id, qn_uint32_t trace_id, Given... given)
{
    if (__builtin_expect(values_32_are_own, 1)) return write_given<qn_int32_t, kind_32>(comp_id, trace_id, given...);
    return tr_record_values_32_1(comp_id, trace_id, sizeof...(given), given...);
}

template <class... Given>
qn_int32_t record_64(const qn_char_t *comp_id, qn_uint32_t trace_id, Given... given)
{
    if (__builtin_expect(values_64_are_own, 1)) return write_given<qn_int64_t, kind_64>(comp_id, trace_id, given...);
    return tr_record_values_64_1(comp_id, trace_id, sizeof...(given), given...);
}
} // namespace

qn_int32_t tr_record_int32_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_int32_t iValue)
{
    return record_32(pCompId, traceId, iValue);
}

qn_int32_t tr_record_int32_2_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_int32_t iValue1, qn_int32_t iValue2)
{
    return record_32(pCompId, traceId, iValue1, iValue2);
}

qn_int32_t tr_record_uint32_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t iValue)
{
    return record_32(pCompId, traceId, iValue);
}

qn_int32_t tr_record_uint32_2_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t iValue1, qn_uint32_t iValue2)
{
    return record_32(pCompId, traceId, iValue1, iValue2);
}

qn_int32_t tr_record_int64_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_int64_t iValue)
{
    return record_64(pCompId, traceId, iValue);
}

qn_int32_t tr_record_int64_2_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_int64_t iValue1, qn_int64_t iValue2)
{
    return record_64(pCompId, traceId, iValue1, iValue2);
}

qn_int32_t tr_record_uint64_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint64_t iValue)
{
    return record_64(pCompId, traceId, iValue);
}

qn_int32_t tr_record_uint64_2_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint64_t iValue1, qn_uint64_t iValue2)
{
    return record_64(pCompId, traceId, iValue1, iValue2);
}
