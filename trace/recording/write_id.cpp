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

qn_int32_t tr_ms_record_id_1(const qn_char_t *pCompId, qn_uint32_t id, tr_file_token_t fileToken)
{
    id_writer writer{.id = id};
    return write_record(pCompId, fileToken, writer);
}

qn_int32_t tr_record_id_1(const qn_char_t *pCompId, qn_uint32_t id) { return tr_ms_record_id_1(pCompId, id, nullptr); }
