#include "recording/sleeps.h"

#include <mutex>
#include <unistd.h>

namespace
{
std::mutex guard;
std::vector<unsigned> asked_for;
std::function<void(int)> watcher;
} // namespace

extern "C" int usleep(useconds_t microseconds)
{
    std::function<void(int)> action;
    int count = 0;
    {
        const std::lock_guard lock(guard);
        asked_for.push_back(microseconds);
        count = static_cast<int>(asked_for.size());
        action = watcher;
    }
    if (action) action(count);
    return 0;
}

namespace qn::test
{
void on_sleep(std::function<void(int)> action)
{
    const std::lock_guard lock(guard);
    watcher = std::move(action);
}

std::vector<unsigned> sleeps()
{
    const std::lock_guard lock(guard);
    return asked_for;
}
} // namespace qn::test
