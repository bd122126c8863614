// Waiting for another process that reads the file. Anchor set lock, held by the caller, so a wait holds up every writer
// of the trace: it is bounded, and what the reader asked for is overridden at its end.
#include <unistd.h>

#include "trace/files/shared_words.h"
#include "trace/files/trace_file.h"
#include "trace/recording/recording.h"

using namespace qn::tr;

void wait_tail(trace_anchor_t *pAnchor, uint32_t seq)
{
    constexpr int most_waits = 400;
    constexpr useconds_t wait_us = 5000;
    trace_file_header_t *header = header_of(pAnchor);
    for (int waits = 0; waits < most_waits; ++waits) {
        usleep(wait_us);
        if (load_relaxed(header->uSeqLock) != seq) return;
    }
    store_relaxed(header->uSeqLock, format::seq_lock_none);
}

int do_coordination(trace_anchor_t *pAnchor)
{
    constexpr int most_waits = 20;
    constexpr useconds_t wait_us = 25000;
    trace_file_header_t *header = header_of(pAnchor);
    if (load_relaxed(header->uTailReq) != 0) {
        store_relaxed(header->uFlags, format::flag_writer_waits);
        for (int waits = 0; waits < most_waits; ++waits) {
            usleep(wait_us);
            if (load_relaxed(header->uTailReq) != 0) continue;
            store_relaxed(header->uFlags, 0);
            return 0;
        }
    }
    // The reader did not answer. uFlags goes on saying that a writer waited.
    store_relaxed(header->uTailReq, 0);
    store_relaxed(header->uSeqLock, format::seq_lock_none);
    return 0;
}
