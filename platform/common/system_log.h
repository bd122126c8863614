// The turn to write to the system log, of which each library has one.
//
// The lock around the C library's connection to the log is not made free in a forked child: one that is forked while
// another thread writes a line would wait for good with its first own. So the threads of a library write one after the
// other, and a fork waits for the one that is writing.
#pragma once

namespace qn::platform
{
// The calling thread's turn while it is in scope, to call syslog() and its kin. They are cancellation points; a thread
// that is cancelled there gives its turn back.
//
// There is no turn where it would be waited for in vain, and the line is left out then: in a signal handler that
// interrupted a turn of its own thread; and in a child that was forked although a thread did not come back from the log,
// which a fork waits a second for.
class system_log_turn
{
public:
    system_log_turn();
    system_log_turn(const system_log_turn &) = delete;
    system_log_turn &operator=(const system_log_turn &) = delete;
    ~system_log_turn();

    explicit operator bool() const { return mine_; }

private:
    bool mine_ = false;
};
} // namespace qn::platform
