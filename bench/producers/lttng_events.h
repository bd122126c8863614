// The trace points of the LTTng producer. LTTng's macros read this file several times.
#undef LTTNG_UST_TRACEPOINT_PROVIDER
#define LTTNG_UST_TRACEPOINT_PROVIDER qn_bench

#undef LTTNG_UST_TRACEPOINT_INCLUDE
#define LTTNG_UST_TRACEPOINT_INCLUDE "bench/producers/lttng_events.h"

#if !defined(BENCH_PRODUCERS_LTTNG_EVENTS_H) || defined(LTTNG_UST_TRACEPOINT_HEADER_MULTI_READ)
#define BENCH_PRODUCERS_LTTNG_EVENTS_H

#include <stdint.h>

#include <lttng/tracepoint.h>

LTTNG_UST_TRACEPOINT_EVENT(qn_bench, id, LTTNG_UST_TP_ARGS(uint32_t, id),
                           LTTNG_UST_TP_FIELDS(lttng_ust_field_integer(uint32_t, id, id)))

LTTNG_UST_TRACEPOINT_EVENT(qn_bench, values, LTTNG_UST_TP_ARGS(uint32_t, id, uint64_t, first, uint64_t, second),
                           LTTNG_UST_TP_FIELDS(lttng_ust_field_integer(uint32_t, id, id)
                                                   lttng_ust_field_integer(uint64_t, first, first)
                                                       lttng_ust_field_integer(uint64_t, second, second)))

LTTNG_UST_TRACEPOINT_EVENT(qn_bench, string, LTTNG_UST_TP_ARGS(uint32_t, id, const char *, text),
                           LTTNG_UST_TP_FIELDS(lttng_ust_field_integer(uint32_t, id, id)
                                                   lttng_ust_field_string(text, text)))

LTTNG_UST_TRACEPOINT_EVENT(qn_bench, data, LTTNG_UST_TP_ARGS(uint32_t, id, const char *, bytes),
                           LTTNG_UST_TP_FIELDS(lttng_ust_field_integer(uint32_t, id, id)
                                                   lttng_ust_field_array(char, bytes, bytes, 64)))

// Nobody switches it on.
LTTNG_UST_TRACEPOINT_EVENT(qn_bench, off, LTTNG_UST_TP_ARGS(uint32_t, id),
                           LTTNG_UST_TP_FIELDS(lttng_ust_field_integer(uint32_t, id, id)))
#endif

#include <lttng/tracepoint-event.h>
