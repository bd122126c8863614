// The spool thread: copies what is queued, syncs pages, and looks after the configuration in between.
//
// It holds the queue mutex all the time, except while it waits and while it works under the locks that come before that
// one: the global mutex and set locks, for the configuration and for syncing.
//
// It has descriptors of its own. A program that makes itself a daemon closes all of them, at a time of its own
// choosing, and opens its files under the same numbers: with shared ones, the rest of a copy would be written into
// such a file.
#include <csignal>
#include <cstdlib>
#include <ctime>
#include <fcntl.h>
#include <pthread.h>
#include <sched.h>
#include <sys/mman.h>
#include <unistd.h>

#include "platform/common/descriptors.h"
#include "trace/files/deadline.h"
#include "trace/files/debug.h"
#include "trace/files/library.h"
#include "trace/files/locks.h"
#include "trace/files/trace_file.h"
#include "trace/recording/recording.h"
#include "trace/spooling/spool_list.h"
#include "trace/spooling/spool_shape.h"

qn_int32_t is_spool_running = 0;
pthread_once_t sp_thread_once = PTHREAD_ONCE_INIT;

namespace
{
using namespace qn::tr;

// Lets go of a mutex for its scope.
class unlocked
{
public:
    explicit unlocked(pthread_mutex_t &mutex) : mutex_(mutex) { unlock_mutex(&mutex_); }
    unlocked(const unlocked &) = delete;
    unlocked &operator=(const unlocked &) = delete;
    ~unlocked() { lock_mutex(&mutex_); }

private:
    pthread_mutex_t &mutex_;
};

// All signals blocked in this thread, for its scope; a thread that it creates inherits that.
class signals_blocked
{
public:
    signals_blocked()
    {
        sigset_t all;
        sigfillset(&all);
        pthread_sigmask(SIG_SETMASK, &all, &before_);
    }
    signals_blocked(const signals_blocked &) = delete;
    signals_blocked &operator=(const signals_blocked &) = delete;
    ~signals_blocked() { pthread_sigmask(SIG_SETMASK, &before_, nullptr); }

private:
    sigset_t before_;
};

// What tells cp_thread that it is the spool thread's body, and that the thread may have descriptors of its own. The
// connection to the system log has a number that the C library remembers for all threads: who asked for lines there,
// for servicing the library, has one table for all of them. A sanitizer follows descriptors by their numbers.
constexpr bool is_sanitized =
#if defined(__SANITIZE_THREAD__) || defined(__SANITIZE_ADDRESS__)
    true;
#else
    false;
#endif
char own_descriptors;
void *argument_for_thread()
{
    return is_sanitized || std::getenv("QN_TR_DEBUG_LEVEL") != nullptr ? nullptr : &own_descriptors;
}

// Leaves the process's table of descriptors for an empty one, in which nothing of the program's stays open either. The
// standard numbers lead nowhere. A kernel that cannot do it leaves the thread with the process's table.
void leave_descriptors_to_program()
{
    if (close_range(0, ~0U, CLOSE_RANGE_UNSHARE) != 0) return;
    int number = 0;
    do number = open("/dev/null", O_RDWR | O_CLOEXEC);
    while (number != -1 && number < qn::platform::standard_error);
}

// The writer that fills a page wakes this thread, and goes on recording: it is not to be taken off its processor for the
// time of a copy. Threads that work in batches wait for their turn.
void let_writers_go_first()
{
    const sched_param ordinary{};
    if (sched_getscheduler(0) == SCHED_OTHER) sched_setscheduler(0, SCHED_BATCH, &ordinary);
}

// The default trace's interval, whatever the other traces have. Its set lock is taken as a plain mutex, which leaves a bias
// as it is: a record that is written meanwhile changes no specification, and this comes once for each page.
qn_uint32_t seconds_to_wait()
{
    for (;;) {
        pthread_mutex_t *mutex = anchor_set_mutex(&anchors);
        const mutex_lock set(*mutex);
        if (mutex != anchor_set_mutex(&anchors)) continue; // a page set by now, or a single file
        return anchors.spool != nullptr ? anchors.spool->sync_interval : default_sync_seconds;
    }
}

// Waits for something to do. Tests once more, under the mutex that whoever signals holds, that there is nothing yet.
void wait_for_work(qn_uint32_t seconds)
{
    if (spq.cnt != 0 || configuration_is_forced() || master_override_off()) return;
    timespec deadline{};
    cu_get_current_time_1(&deadline);
    deadline.tv_sec += seconds;
    debug("Spool thread about to sleep (max=%d)\n", static_cast<int>(seconds));
    pthread_cond_timedwait(&spq.cond, &spq.mutex, &deadline);
}

// Looks at the oldest page; false when its element is left where it is: another process has put the page into a state
// that is neither full nor reusable.
bool handle_page(trace_anchor_t *page)
{
    if (page->pMap == nullptr) {
        std::free(spool_dequeue_last_element_inside_spq(&spq));
        return true;
    }
    qn_uint8_t &in_file = header_of(page)->sp_flags;
    const qn_uint8_t state = load_relaxed(in_file);
    debug("cp_thread checking flags: %d\n", state);
    if (state == format::page_state::full) {
        store_relaxed(in_file, format::page_state::being_spooled);
        spool_dequeue_last_and_spool_inside_spq(&spq);
        return true;
    }
    if (state != format::page_state::ready) return false;
    std::free(spool_dequeue_last_element_inside_spq(&spq));
    return true;
}

// Lets others get on: mostly a writer who is taking the page over and needs the queue, or the process that has the page
// in its hands. By a clock that nobody sets.
void wait_a_moment()
{
    const timespec deadline = monotonic_deadline(1000000);
    pthread_cond_clockwait(&spq.cond, &spq.mutex, CLOCK_MONOTONIC, &deadline);
}

void handle_oldest()
{
    if (spq.cnt <= 0 || spq.pLast == nullptr || master_override_off()) return;
    trace_anchor_t *page = spq.pLast->pAnchor;
    if (page == nullptr) return spool_dequeue_last_and_spool_inside_spq(&spq);

    // A page's lock comes before the queue's: it may be tried here, never waited for. The page is there as long as its
    // element is.
    bool handled = false;
    {
        const mutex_try_lock page_lock(page->anchorMutex);
        handled = page_lock && handle_page(page);
    }
    if (!handled) wait_a_moment();
}

void work_until_stopped()
{
    const mutex_lock queue(spq.mutex);
    while (!master_override_off()) {
        debug("cp_thread locked mutex; cnt: %d\n", spq.cnt);
        if (spq.cnt == 0) {
            qn_uint32_t seconds = 0;
            {
                const unlocked others_first(spq.mutex);
                configure_if_necessary();
                seconds = seconds_to_wait();
            }
            wait_for_work(seconds);
        }
        {
            const unlocked others_first(spq.mutex);
            configure_if_necessary();
            if (!master_override_off() && use_msync_enabled_except_flush != 0) msync_trace_pages(1, MS_ASYNC, 1);
        }
        handle_oldest();
    }
}
} // namespace

void mk_sp_thread(void)
{
    const qn::platform::no_cancel whole; // it would be done once more, and make a second thread
    pthread_t thread = 0;
    const signals_blocked until_it_blocks_them_itself;
    if (pthread_create(&thread, nullptr, cp_thread, argument_for_thread()) != 0) {
        debug("ERROR: cannot create spooling thread.\n");
        return;
    }
    debug("Spooling thread created: (%llu)\n", static_cast<unsigned long long>(thread));
    pthread_detach(thread);
}

void *cp_thread(void *argument)
{
    if (argument == &own_descriptors) leave_descriptors_to_program();
    let_writers_go_first();
    store_release(is_spool_running, 1);
    debug("Start cp_thread...\n");
    cu_block_thread_allsig_except_syncsig_1();
    work_until_stopped();
    store_release(is_spool_running, 0);
    return nullptr;
}

qn_int32_t tr_copy_file_1(const char *dest, const char *file_name, int del)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    debug_error("tr_copy_file '%s' -> '%s'\n", file_name != nullptr ? file_name : "(NULL)",
                dest != nullptr ? dest : "(NULL)");
    if (dest == nullptr || file_name == nullptr) return 1;
    pthread_once(&sp_thread_once, mk_sp_thread);
    spool_enqueue(file_name, dest, nullptr, &spq, del);
    return 0;
}

namespace qn::tr
{
void forget_spool_thread()
{
    spq.pFirst = spq.pLast = nullptr;
    spq.cnt = 0;
    store_release(is_spool_running, 0);
    sp_thread_once = PTHREAD_ONCE_INIT;
}
} // namespace qn::tr
