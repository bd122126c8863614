// Records of data blocks.
#include <array>
#include <cstdarg>
#include <cstring>

#include "trace/recording/record_frame.h"

namespace
{
using namespace qn::tr;

constexpr qn_int32_t most_blocks = 128;
constexpr qn_uint32_t longest_block = 0x100000;

// What is wrong with a block; 0: nothing.
qn_int32_t check_block(const void *block, qn_uint32_t length)
{
    if (block == nullptr) return QN_TR_EBLOCKPTR;
    return length > longest_block ? QN_TR_EBLOCKLEN : 0;
}

// Returns where the next block goes.
unsigned char *put_block(unsigned char *place, const void *block, qn_uint32_t length)
{
    std::memcpy(place, &length, sizeof length);
    std::memcpy(place + sizeof length, block, length);
    return place + format::block_bytes(length);
}

struct data_writer : record_writer {
    static constexpr auto function = format::kind::data_blocks;
    using record = trace_record_data_t;

    qn_uint32_t trace_id;
    qn_int32_t n_blocks; // signed: a count below zero is recorded as it is, with no blocks
    argument_list arguments;
    unsigned int record_bytes = sizeof(record);
    std::array<const void *, most_blocks> blocks;
    std::array<qn_uint32_t, most_blocks> lengths;

    data_writer(qn_uint32_t id, qn_uint32_t count, argument_list args)
        : trace_id(id), n_blocks(static_cast<qn_int32_t>(count)), arguments(args)
    {
    }

    qn_int32_t check(const trace_anchor_t *) const { return n_blocks > most_blocks ? QN_TR_EBLOCKCOUNT : 0; }

    // Takes the blocks; the first one with which the record no longer fits ends them.
    qn_int32_t check_locked(const trace_anchor_t *anchor)
    {
        for (qn_int32_t i = 0; i < n_blocks; ++i) {
            const void *block = va_arg(arguments, const void *);
            const auto length = static_cast<qn_uint32_t>(va_arg(arguments, int));
            const qn_int32_t status = check_block(block, length);
            if (status != 0) return status;
            if (record_bytes + format::block_bytes(length) > anchor->uMaxSize) {
                n_blocks = i;
                break;
            }
            blocks[i] = block;
            lengths[i] = length;
            record_bytes += format::block_bytes(length);
        }
        return 0;
    }

    qn_int32_t size(const trace_anchor_t *, unsigned int &length) const
    {
        length = record_bytes;
        return 0;
    }

    void fill(trace_record_data_t *to) const
    {
        to->trace_id = trace_id;
        to->n_blocks = static_cast<qn_uint32_t>(n_blocks);
        unsigned char *place = body_of(to);
        for (qn_int32_t i = 0; i < n_blocks; ++i) place = put_block(place, blocks[i], lengths[i]);
    }
};

// One block, which is what most data records have: without a list of blocks, they cost a tenth less.
struct block_writer : record_writer {
    static constexpr auto function = format::kind::data_blocks;
    using record = trace_record_data_t;

    qn_uint32_t trace_id;
    const void *block;
    qn_uint32_t block_length;
    qn_uint32_t n_blocks = 1;

    block_writer(qn_uint32_t id, argument_list args)
        : trace_id(id), block(va_arg(args, const void *)), block_length(static_cast<qn_uint32_t>(va_arg(args, int)))
    {
    }

    qn_int32_t check_locked(const trace_anchor_t *) const { return check_block(block, block_length); }

    // A block that is too long is left out.
    qn_int32_t size(const trace_anchor_t *anchor, unsigned int &length)
    {
        length = static_cast<unsigned int>(sizeof(record)) + format::block_bytes(block_length);
        if (length > anchor->uMaxSize) {
            length = sizeof(record);
            n_blocks = 0;
        }
        return 0;
    }

    void fill(trace_record_data_t *to) const
    {
        to->trace_id = trace_id;
        to->n_blocks = n_blocks;
        if (n_blocks != 0) put_block(body_of(to), block, block_length);
    }
};
} // namespace

// As with strings: the exported names are left out while they are the library's own.
extern "C" {
[[gnu::visibility("hidden"), gnu::alias("tr_record_data_v_1")]] qn_int32_t own_data_v(const qn_char_t *, qn_uint32_t,
                                                                                      qn_uint32_t, va_list);
[[gnu::visibility("hidden"), gnu::alias("tr_ms_record_data_v_1")]] qn_int32_t
own_ms_data_v(const qn_char_t *, qn_uint32_t, tr_file_token_t, qn_uint32_t, va_list);
}

namespace
{
const bool ms_data_are_own = tr_ms_record_data_v_1 == own_ms_data_v;
const bool data_are_own = ms_data_are_own && tr_record_data_v_1 == own_data_v;

// What the forwarding comes to while the names are own.
[[gnu::always_inline]] inline qn_int32_t record_data(const qn_char_t *comp_id, qn_uint32_t trace_id,
                                                     tr_file_token_t token, qn_uint32_t count, va_list args)
{
    return __builtin_expect(count == 1, 1) ? write_record_by<block_writer>(comp_id, token, trace_id, args)
                                           : own_ms_data_v(comp_id, trace_id, token, count, args);
}
} // namespace

qn_int32_t tr_ms_record_data_v_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                 qn_uint32_t blkCount, va_list args)
{
    return write_record_by<data_writer>(pCompId, fileToken, traceId, blkCount, args);
}

qn_int32_t tr_record_data_v_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t blkCount, va_list args)
{
    return tr_ms_record_data_v_1(pCompId, traceId, nullptr, blkCount, args);
}

qn_int32_t tr_ms_record_data_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                               qn_uint32_t blkCount, ...)
{
    va_list args;
    va_start(args, blkCount);
    const qn_int32_t status = __builtin_expect(ms_data_are_own, 1)
                                  ? record_data(pCompId, traceId, fileToken, blkCount, args)
                                  : tr_ms_record_data_v_1(pCompId, traceId, fileToken, blkCount, args);
    va_end(args);
    return status;
}

qn_int32_t tr_record_data_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t blkCount, ...)
{
    va_list args;
    va_start(args, blkCount);
    const qn_int32_t status = __builtin_expect(data_are_own, 1) ? record_data(pCompId, traceId, nullptr, blkCount, args)
                                                                : tr_record_data_v_1(pCompId, traceId, blkCount, args);
    va_end(args);
    return status;
}
