/*
 * cu_tr_proxy.h - tracing for libraries that the tracing library itself depends on.
 *
 * libqn_cu cannot link against the tracing library, which links against it. So the tracing library hands over a
 * table of its functions when it starts, and whoever includes this header traces through the table, or not at
 * all while there is none. The functions live in libqn_cu. Valid C11 and C++.
 */
#ifndef CU_TR_PROXY_H
#define CU_TR_PROXY_H

#include <qn.h>
#include <stdarg.h>

QN_BEGIN_DECLS

/* What the tracing library lends. Either pointer may be null: that call then does nothing. */
typedef struct tr_proxy_func_table {
    qn_int32_t (*p_tr_flush)(void);
    qn_int32_t (*p_tr_record_vfmt_string)(const qn_char_t *pCompId, qn_uint32_t traceId, const qn_char_t *pFormat,
                                          va_list arguments);
} tr_proxy_func_table_t;

/*
 * Makes table the one that is called from now on; null takes the present one away. The table is not copied: it
 * and the code that it points to must stay until the process ends, because another thread may just be calling
 * through it. Any thread may call this at any time, beside the functions below. Returns 0.
 */
QN_EXPORT int cu_trp_register(const tr_proxy_func_table_t *table);

/*
 * Flushes the traces through the registered table. Returns what the tracing library returns, 0 without a table.
 */
QN_EXPORT qn_int32_t cu_trp_flush_1(void);

/*
 * Writes a formatted trace record through the registered table.
 *
 *   pCompId  component identifier, up to four significant characters
 *   traceId  what the record is about, numbered by the component
 *   pFormat  printf format; its inserts follow
 *
 * Returns what the tracing library returns, 0 without a table; the inserts are then not looked at.
 */
QN_EXPORT qn_int32_t cu_trp_printf_1(const qn_char_t *pCompId, qn_uint32_t traceId, const qn_char_t *pFormat, ...)
    QN_PRINTF_LIKE(3, 4);

QN_END_DECLS

#endif /* CU_TR_PROXY_H */
