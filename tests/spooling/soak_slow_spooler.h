// A spooler that is held up between two copies, so that the writers fill several pages for each one that is copied.
//
// It is held up where it looks after its configuration, without the queue's lock. (A copy that is slow by itself makes
// the writers wait, since they need that lock at the end of a page.) While it copies, the writers are held up: so pages
// are taken over in the order of the ring, and what must be missing can be reckoned.
#pragma once

#include <condition_variable>
#include <cstdint>
#include <mutex>

namespace qn::test
{
class slow_spooler
{
public:
    // A page is copied whenever `step`, twice `step`, ... five times `step` and again `step` records have been written.
    // There is at most one object at a time.
    slow_spooler(uint64_t step, uint64_t written_before);
    slow_spooler(const slow_spooler &) = delete;
    slow_spooler &operator=(const slow_spooler &) = delete;
    ~slow_spooler(); // from here on it copies as fast as it can

    // Makes `write`, with the number of records that were written before.
    template <class Write>
    void record(Write write)
    {
        std::unique_lock lock(guard_);
        writers_go_on_.wait(lock, [this] { return !copying_; });
        write(written_++);
        if (written_ < due_ || !held_up_) return;
        copying_ = true;
        copy_is_due_.notify_one();
    }

    void hold_up(); // in the spool thread

private:
    std::mutex guard_;
    std::condition_variable writers_go_on_;
    std::condition_variable copy_is_due_;
    uint64_t step_;
    uint64_t written_;
    uint64_t due_;
    uint64_t copies_ = 0;
    bool held_up_ = false;
    bool copying_ = false; // or about to
    bool ended_ = false;
};
} // namespace qn::test
