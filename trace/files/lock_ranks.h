// The order of the library's locks, checked while the program runs: who takes a lock out of order learns it at once, not
// when two threads happen to meet. The program then says which two locks these are and ends. Only builds with
// QN_TR_CHECK_LOCK_ORDER do that; in the others these calls are nothing.
#pragma once

#include <pthread.h>

namespace qn::tr
{
// From first to last, as locks.h explains them; an anchor set lock is a single file's or a page set's. A mutex that has no
// name of its own has the rank that whoever takes it says.
enum class lock_rank { global, file, set, page, queue, leaf };

#ifdef QN_TR_CHECK_LOCK_ORDER

// Ends the program if the calling thread, to wait for that mutex, holds one that comes later or has the same rank. A mutex
// that it holds itself it may always take again.
void expect_in_order(const pthread_mutex_t *mutex, lock_rank rank);

// What the calling thread holds.
void note_taken(const pthread_mutex_t *mutex, lock_rank rank);
void note_released(const pthread_mutex_t *mutex);
void forget_all_taken();

#else

inline void expect_in_order(const pthread_mutex_t *, lock_rank) {}
inline void note_taken(const pthread_mutex_t *, lock_rank) {}
inline void note_released(const pthread_mutex_t *) {}
inline void forget_all_taken() {}

#endif
} // namespace qn::tr
