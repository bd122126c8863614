// The table of the tracing library's functions, and the calls through it.
//
// The table is one atomic pointer, which is all that a registration beside calls needs: a call goes through the
// old table or the new one, and both stay in memory.
#include <atomic>

#include <cu_tr_proxy.h>

namespace
{
constinit std::atomic<const tr_proxy_func_table_t *> proxy_table{nullptr};

const tr_proxy_func_table_t *present_table() { return proxy_table.load(std::memory_order_acquire); }
} // namespace

int cu_trp_register(const tr_proxy_func_table_t *table)
{
    proxy_table.store(table, std::memory_order_release);
    return 0;
}

qn_int32_t cu_trp_flush_1(void)
{
    const tr_proxy_func_table_t *lent = present_table();
    return lent != nullptr && lent->p_tr_flush != nullptr ? lent->p_tr_flush() : 0;
}

qn_int32_t cu_trp_printf_1(const qn_char_t *pCompId, qn_uint32_t traceId, const qn_char_t *pFormat, ...)
{
    const tr_proxy_func_table_t *lent = present_table();
    if (lent == nullptr || lent->p_tr_record_vfmt_string == nullptr) return 0;
    va_list arguments;
    va_start(arguments, pFormat);
    const qn_int32_t result = lent->p_tr_record_vfmt_string(pCompId, traceId, pFormat, arguments);
    va_end(arguments);
    return result;
}
