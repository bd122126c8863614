// Records of 32-bit and 64-bit values.
#include <cstdarg>
#include <cstring>

#include "trace/recording/record_frame.h"

namespace
{
using namespace qn::tr;

// Writes values of type Value straight from the argument list into the file.
template <class Value, format::kind Function>
struct values_writer : record_writer {
    static constexpr auto function = Function;
    using record = trace_record_values_t;

    qn_uint32_t id;
    qn_uint32_t number;
    argument_list values;

    values_writer(qn_uint32_t trace_id, qn_uint32_t count, argument_list arguments)
        : id(trace_id), number(count), values(arguments)
    {
    }

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
        unsigned char *place = body_of(to);
        for (qn_uint32_t i = 0; i < number; ++i, place += sizeof(Value)) {
            const Value value = va_arg(values, Value);
            std::memcpy(place, &value, sizeof value);
        }
    }
};

using values_32_writer = values_writer<qn_int32_t, format::kind::values_32>;
using values_64_writer = values_writer<qn_int64_t, format::kind::values_64>;
} // namespace

qn_int32_t int_record_values_32_v(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                  qn_uint32_t numValues, va_list args)
{
    values_32_writer writer(traceId, numValues, args);
    return write_record(pCompId, fileToken, writer);
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

qn_int32_t tr_record_int32_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_int32_t iValue)
{
    return tr_record_values_32_1(pCompId, traceId, 1, iValue);
}

qn_int32_t tr_record_uint32_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t iValue)
{
    return tr_record_values_32_1(pCompId, traceId, 1, iValue);
}

qn_int32_t tr_record_int32_2_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_int32_t iValue1, qn_int32_t iValue2)
{
    return tr_record_values_32_1(pCompId, traceId, 2, iValue1, iValue2);
}

qn_int32_t tr_record_uint32_2_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t iValue1, qn_uint32_t iValue2)
{
    return tr_record_values_32_1(pCompId, traceId, 2, iValue1, iValue2);
}

qn_int32_t tr_ms_record_values_64_v_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                      qn_uint32_t numValues, va_list args)
{
    values_64_writer writer(traceId, numValues, args);
    return write_record(pCompId, fileToken, writer);
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

qn_int32_t tr_record_int64_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_int64_t iValue)
{
    return tr_record_values_64_1(pCompId, traceId, 1, iValue);
}

qn_int32_t tr_record_uint64_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint64_t iValue)
{
    return tr_record_values_64_1(pCompId, traceId, 1, iValue);
}

qn_int32_t tr_record_int64_2_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_int64_t iValue1, qn_int64_t iValue2)
{
    return tr_record_values_64_1(pCompId, traceId, 2, iValue1, iValue2);
}

qn_int32_t tr_record_uint64_2_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint64_t iValue1, qn_uint64_t iValue2)
{
    return tr_record_values_64_1(pCompId, traceId, 2, iValue1, iValue2);
}
