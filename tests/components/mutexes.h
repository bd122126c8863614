// Mutexes as a test needs them: one that cannot be locked, one that another thread holds, one that ought to be free; and
// a thread that is cancelled inside a call.
#pragma once

#include <cerrno>
#include <climits>
#include <ctime>
#include <functional>
#include <future>
#include <thread>

#include <pthread.h>

namespace qn::test
{
// Makes a recursive mutex refuse the calling thread: its recursion count is used up.
class exhausted_mutex
{
public:
    static constexpr int lock_result = EAGAIN;

    explicit exhausted_mutex(pthread_mutex_t &mutex) : mutex_(mutex)
    {
        pthread_mutex_lock(&mutex_);
        count_ = mutex_.__data.__count;
        mutex_.__data.__count = UINT_MAX;
    }
    exhausted_mutex(const exhausted_mutex &) = delete;
    exhausted_mutex &operator=(const exhausted_mutex &) = delete;
    ~exhausted_mutex()
    {
        mutex_.__data.__count = count_;
        pthread_mutex_unlock(&mutex_);
    }

private:
    pthread_mutex_t &mutex_;
    unsigned count_;
};

// Whether another thread gets the mutex within a moment.
inline bool free_for_others(pthread_mutex_t &mutex)
{
    bool taken = false;
    std::thread([&] {
        timespec until{};
        clock_gettime(CLOCK_REALTIME, &until);
        until.tv_nsec += 50'000'000;
        until.tv_sec += until.tv_nsec / 1'000'000'000;
        until.tv_nsec %= 1'000'000'000;
        taken = pthread_mutex_timedlock(&mutex, &until) == 0;
        if (taken) pthread_mutex_unlock(&mutex);
    }).join();
    return taken;
}

// Runs body in a thread whose cancellation is pending, so that it ends at its first cancellation point; true when it
// did not come to its end.
inline bool is_cancelled_in(std::function<void()> body)
{
    struct run {
        std::function<void()> body;
        bool ended = false;
    } run{std::move(body)};
    pthread_t thread{};
    pthread_create(
        &thread, nullptr,
        [](void *arg) -> void * {
            auto *mine = static_cast<struct run *>(arg);
            pthread_cancel(pthread_self());
            mine->body();
            mine->ended = true;
            return nullptr;
        },
        &run);
    void *result = nullptr;
    pthread_join(thread, &result);
    return result == PTHREAD_CANCELED && !run.ended;
}
} // namespace qn::test
