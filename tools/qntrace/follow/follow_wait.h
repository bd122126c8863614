// Waiting for a live trace to go on.
//
// Stores into a mapping wake nobody, so the trace is looked at again and again: after a millisecond when something has
// just come, and less and less often while nothing does.
#pragma once

#include <chrono>

#include <csignal>

namespace qn::dump
{

class follow_wait
{
public:
    using duration = std::chrono::nanoseconds;

    // SIGINT and SIGTERM end the following from now on.
    explicit follow_wait(duration longest);
    ~follow_wait();
    follow_wait(const follow_wait &) = delete;
    follow_wait &operator=(const follow_wait &) = delete;

    // False when it is time to end: a signal came, or nobody reads standard output any more.
    bool wait();
    // The same without waiting.
    bool may_go_on();
    // Something has come.
    void reset() { next_ = shortest(); }

private:
    duration shortest() const;
    bool look(duration time);

    duration longest_;
    duration next_;
    sigset_t mask_before_;
};

} // namespace qn::dump
