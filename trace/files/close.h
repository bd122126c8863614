// Closing a descriptor where the thread may be cancelled.
#pragma once

#include <pthread.h>
#include <unistd.h>

namespace qn::tr
{
// close() that is no cancellation point. A thread that is cancelled there does not know whether the descriptor is still
// its own: it would leak, or be closed a second time when it is another thread's already. And no destructor may throw,
// which is how cancellation unwinds.
inline void close_for_sure(int fd)
{
    int before = PTHREAD_CANCEL_ENABLE;
    pthread_setcancelstate(PTHREAD_CANCEL_DISABLE, &before);
    close(fd);
    pthread_setcancelstate(before, nullptr);
}
} // namespace qn::tr
