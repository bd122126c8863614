// One word says whose turn it is. Unlike a mutex it is right in every instant that a signal handler may interrupt, and
// in a child, where the forking thread has the same pthread_self().
#include "platform/common/system_log.h"

#include <atomic>
#include <pthread.h>
#include <unistd.h>

#include "platform/common/descriptors.h"

namespace
{
constexpr pthread_t nobody = 0;
constexpr pthread_t nobody_any_more = ~pthread_t{0}; // a thread of the parent has it, and keeps it

std::atomic<pthread_t> writer{nobody};
std::atomic<pthread_t> forker{nobody}; // waits to fork: the next turn is left to it
int forks = 0; // that hold the turn, one within the other in signal handlers; written by who has the turn

bool take_turn(pthread_t &other)
{
    other = nobody;
    return writer.compare_exchange_strong(other, pthread_self(), std::memory_order_acquire, std::memory_order_relaxed);
}

bool have_turn() { return writer.load(std::memory_order_relaxed) == pthread_self(); }

void change(std::atomic<pthread_t> &whose, pthread_t next)
{
    whose.store(next, std::memory_order_release);
    whose.notify_all();
}

// Not for ever: the log may hang, and a program that forks should not hang with it.
void wait_for_turn()
{
    constexpr useconds_t nap = 100;
    constexpr int most_naps = 10000;
    const qn::platform::no_cancel whole;
    pthread_t other = nobody;
    const bool first = forker.compare_exchange_strong(other, pthread_self());
    for (int i = 0; !take_turn(other) && i < most_naps; ++i) usleep(nap);
    if (first) change(forker, nobody);
}

// A thread that is in its turn forks in a signal handler, or in what the application has in the log's place. It stays
// in its turn, in the child too.
void before_fork()
{
    const bool in_its_turn = have_turn() && forks == 0;
    if (in_its_turn) return;
    if (!have_turn()) wait_for_turn();
    if (have_turn()) ++forks;
}

void after_fork()
{
    if (have_turn() && forks > 0 && --forks == 0) change(writer, nobody);
}

void after_fork_in_child()
{
    after_fork();
    change(forker, nobody);
    if (have_turn() || writer.load(std::memory_order_relaxed) == nobody) return;
    forks = 0;
    change(writer, nobody_any_more);
}

[[gnu::constructor]] void prepare_forks() { pthread_atfork(before_fork, after_fork, after_fork_in_child); }
} // namespace

namespace qn::platform
{
system_log_turn::system_log_turn()
{
    while (!mine_) {
        pthread_t other = writer.load(std::memory_order_relaxed);
        if (other == pthread_self() || other == nobody_any_more) return;
        const pthread_t first = forker.load(std::memory_order_relaxed);
        if (first != nobody && first != pthread_self())
            forker.wait(first, std::memory_order_relaxed);
        else if (!(mine_ = take_turn(other)))
            writer.wait(other, std::memory_order_relaxed);
    }
}

system_log_turn::~system_log_turn()
{
    if (mine_) change(writer, nobody);
}
} // namespace qn::platform
