// The table of first-failure records that the library can file, indexed by the number that log_error() takes.
#pragma once

#include <qn_ffdc.h>

inline constexpr int trace_failures = 1;

extern const fc_err_tbl_t fc_errtbl_trace[trace_failures];
