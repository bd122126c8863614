// A pager between long text and a terminal.
//
// It is the command in QNTRACE_PAGER, else that in PAGER, else less(1) when there is one. An empty command, or cat,
// means none. What the user does to leave it ends the reading quietly.
#pragma once

#include <vector>

#include <sys/types.h>

namespace qn::dump
{

inline constexpr const char *no_pager_help = "Do not show the text on a terminal by a pager";

class pager
{
public:
    // Nothing when it is not wanted or standard output is no terminal. Standard error goes to the pager too, if it is
    // one: messages written across its screen could not be read.
    explicit pager(bool wanted);
    // Waits until the user has left the pager.
    ~pager();
    pager(const pager &) = delete;
    pager &operator=(const pager &) = delete;

private:
    struct terminal {
        int descriptor, saved;
    };
    void take_over(int descriptor, int end);

    pid_t process_ = -1;
    std::vector<terminal> terminals_; // what the pager stands in for
};

} // namespace qn::dump
