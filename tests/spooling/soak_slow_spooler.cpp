#include "spooling/soak_slow_spooler.h"

#include <cstring>

#include "trace/trace.h"

namespace
{
std::mutex in_charge_guard; // held while the spool thread is inside hold_up()
qn::test::slow_spooler *in_charge = nullptr;
} // namespace

// Visible, because the linker looks at the shared libraries' calls too.
#pragma GCC visibility push(default)
// The spool thread asks for this variable whenever it looks after its configuration, before and after every copy.
extern "C" {
char *__real_getenv(const char *name);
char *__wrap_getenv(const char *name)
{
    if (std::strcmp(name, "QN_TR_SPOOL") == 0) {
        const std::lock_guard lock(in_charge_guard);
        if (in_charge != nullptr) in_charge->hold_up();
    }
    return __real_getenv(name);
}
}
#pragma GCC visibility pop

namespace qn::test
{
slow_spooler::slow_spooler(uint64_t step, uint64_t written_before)
    : step_(step), written_(written_before), due_(written_before + step)
{
    const std::lock_guard lock(in_charge_guard);
    in_charge = this;
}

slow_spooler::~slow_spooler()
{
    {
        const std::lock_guard lock(guard_);
        ended_ = true;
        copy_is_due_.notify_one();
    }
    const std::lock_guard lock(in_charge_guard);
    in_charge = nullptr;
}

void slow_spooler::hold_up()
{
    std::unique_lock lock(guard_);
    copying_ = false;
    writers_go_on_.notify_all();
    if (ended_) return;
    {
        const qn::tr::mutex_lock queue(spq.mutex);
        if (spq.cnt == 0) return; // it will wait for a page, and come here again before it copies that
    }
    held_up_ = true;
    copy_is_due_.wait(lock, [this] { return ended_ || written_ >= due_; });
    held_up_ = false;
    due_ = written_ + step_ * (1 + copies_++ % 5);
    copying_ = !ended_;
}
} // namespace qn::test
