// Everything internal that goes by a fixed name, for the library's own tests and for whoever looks for it.
#pragma once

#include "trace/components/component.h"
#include "trace/components/specifications.h"
#include "trace/files/anchor.h"
#include "trace/files/debug.h"
#include "trace/files/error_report.h"
#include "trace/files/format.h"
#include "trace/files/library.h"
#include "trace/files/locks.h"
#include "trace/files/trace_file.h"
#include "trace/query/query.h"
#include "trace/recording/recording.h"
#include "trace/spooling/spool.h"
#include "trace/trace_etbl.h"
#include "trace/traceutils/traceutils.h"
#include "trace/trapi_set.h"
