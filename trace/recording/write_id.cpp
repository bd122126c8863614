// Identifier records.
#include "trace/recording/record_frame.h"

namespace
{
using namespace qn::tr;

struct id_writer : record_writer {
    static constexpr auto function = format::kind::identifier;
    using record = trace_record_id_t;

    qn_uint32_t id;

    static qn_int32_t size(const trace_anchor_t *, unsigned int &length)
    {
        length = sizeof(trace_record_id_t);
        return 0;
    }
    void fill(trace_record_id_t *to) const { to->id = id; }
};
} // namespace

// As with values: the exported name is left out while it is the library's own.
extern "C" {
[[gnu::visibility("hidden"), gnu::alias("tr_ms_record_id_1")]] qn_int32_t own_ms_id(const qn_char_t *, qn_uint32_t,
                                                                                    tr_file_token_t);
}

namespace
{
const bool id_is_own = tr_ms_record_id_1 == own_ms_id;
} // namespace

qn_int32_t tr_ms_record_id_1(const qn_char_t *pCompId, qn_uint32_t id, tr_file_token_t fileToken)
{
    id_writer writer{.id = id};
    return write_record(pCompId, fileToken, writer);
}

qn_int32_t tr_record_id_1(const qn_char_t *pCompId, qn_uint32_t id)
{
    if (__builtin_expect(!id_is_own, 0)) return tr_ms_record_id_1(pCompId, id, nullptr);
    id_writer writer{.id = id};
    return write_record(pCompId, nullptr, writer);
}
