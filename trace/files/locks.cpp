// The mutexes themselves, and the calls on them that are used by name.
#include "trace/files/locks.h"

pthread_mutex_t anchor_list_mutex;
pthread_mutex_t component_list_mutex = PTHREAD_RECURSIVE_MUTEX_INITIALIZER_NP;
pthread_mutex_t configuration_file_last_modified_mutex = PTHREAD_RECURSIVE_MUTEX_INITIALIZER_NP;
pthread_mutex_t cluster_info_mutex = PTHREAD_RECURSIVE_MUTEX_INITIALIZER_NP;

void init_recursive_mutex(pthread_mutex_t *mutex)
{
    pthread_mutexattr_t attributes;
    pthread_mutexattr_init(&attributes);
    pthread_mutexattr_settype(&attributes, PTHREAD_MUTEX_RECURSIVE);
    pthread_mutex_init(mutex, &attributes);
    pthread_mutexattr_destroy(&attributes);
}

void init_biased_mutex(pthread_mutex_t *mutex)
{
    init_recursive_mutex(mutex);
    qn::tr::bias_of(mutex) = {};
}

int lockGlobalMutex(void) { return qn::tr::lock_mutex(&anchors.anchorMutex, qn::tr::lock_rank::global); }

int unlockGlobalMutex(void) { return qn::tr::unlock_mutex(&anchors.anchorMutex); }

void mutex_cleanup(void *mutex) { qn::tr::unlock_mutex(static_cast<pthread_mutex_t *>(mutex)); }

int lock_anchor_set(trace_anchor_t *anchor)
{
    int result = 0;
    qn::tr::take_anchor_set(anchor, result);
    return result;
}

int unlock_anchor_set(trace_anchor_t *anchor) { return qn::tr::unlock_mutex(qn::tr::anchor_set_mutex(anchor)); }

void cleanup_anchor_set(void *anchor) { unlock_anchor_set(static_cast<trace_anchor_t *>(anchor)); }

namespace qn::tr
{
int lock_busy_mutex(pthread_mutex_t *mutex, int result_of_try)
{
    if (result_of_try != EBUSY) return result_of_try;
    // Less, and fewer records are written in all; more, and some wait longer than if all had slept at once.
    constexpr int pauses_before_tries[] = {24, 48, 48};
    for (const int pauses : pauses_before_tries) {
        for (int i = 0; i < pauses; ++i) __builtin_ia32_pause();
        const int result = pthread_mutex_trylock(mutex);
        if (result != EBUSY) return result;
    }
    return pthread_mutex_lock(mutex);
}

pthread_mutex_t *take_anchor_set(trace_anchor_t *anchor, int &result)
{
    for (;;) {
        pthread_mutex_t *taken = take_if_right(anchor, anchor_set_mutex(anchor), result);
        if (taken != nullptr || result != 0) return taken;
    }
}

void reset_locks_in_child()
{
    forget_all_taken();
    forget_biased_threads();
    initialize_trace_global_data();
    init_biased_mutex(&anchors.anchorMutex);
    init_recursive_mutex(&component_list_mutex);
    init_recursive_mutex(&cluster_info_mutex);
    pthread_cond_init(&spq.cond, nullptr);
    // The queue may be between two stores of a thread that does not exist here. Nor does the one that copies.
    spq.pFirst = spq.pLast = nullptr;
    spq.cnt = 0;
    for (trace_anchor_t *anchor = &anchors; anchor != nullptr; anchor = anchor->next) {
        if (anchor->pSpoolMutex != nullptr) init_biased_mutex(anchor->pSpoolMutex);
        for_each_page(anchor, [](trace_anchor_t *page) {
            if (page != &anchors) init_biased_mutex(&page->anchorMutex);
        });
    }
}
} // namespace qn::tr
