// Binding traces to spool specifications.
//
// No source of specifications is read yet, so none governs a trace, and every trace is a single file.
#include "trace/spooling/spool.h"

#include "trace/recording/recording.h"

qn_int32_t is_spool_running = 0;

void read_spool_cfg(void) {}

configuration_action_t determine_configuration_action_from_the_configuration_file(void) { return TAKE_NO_ACTION; }

trace_spool_spec_t *process_spool_spec(trace_anchor_t *, trace_spool_spec_t *) { return nullptr; }

// A page set's writer comes here at the end of a page. There is no way on to the next one yet: the record is dropped.
trace_record_header_t *pageFull(trace_anchor_t *, unsigned int *) { return nullptr; }
