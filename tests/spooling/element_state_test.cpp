// A queued page in a state that says neither "full" nor "ready": what the spool thread does with it.
//
// A page is queued by the writer that leaves it, in state 2, and the writers of its set enter it again only by taking
// its element out of the queue, unless it is in state 4. State 4 is set by the spool thread, for an element that it has
// taken out, and when a file is started, whose elements were all taken out when it was stopped. So within one process a
// queued page is in state 2, and queued once. But the state lives in the file: another process that starts the same trace
// writes it without knowing this queue (tests/faults/two_processes_test.cpp).
#include <atomic>
#include <cstring>
#include <filesystem>

#include <sched.h>

#include <gtest/gtest.h>

#include "files/page_set.h"
#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

constexpr uint8_t active = 1;
constexpr uint8_t full = 2;
constexpr uint8_t ready = 4;

class QueuedState : public PageSet
{
protected:
    void SetUp() override
    {
        setenv("QN_TR_SPOOL", "", 1); // there is no configuration file to look for
        std::filesystem::create_directory(copies);
        std::strcpy(spool.dest, copies.c_str());
        ASSERT_EQ(start_set("t", 3), 0);
        debug_on();
        spool_calls().log_line = [this](const std::string &text) {
            if (text.rfind("Spool thread about to sleep", 0) == 0) ++waits;
            if (text == "cp_thread checking flags: 1\n") ++looks;
            clear_system_log();
        };
    }
    // The thread ends before the hooks go.
    void TearDown() override
    {
        tr_term();
        spool_calls() = {};
    }

    void set_state(int number, uint8_t state)
    {
        const qn::tr::mutex_lock queue(spq.mutex);
        qn::tr::store_relaxed(page(number)->pMap[192], state);
    }
    uint8_t state(int number) const
    {
        const qn::tr::mutex_lock queue(spq.mutex);
        return qn::tr::load_relaxed(page(number)->pMap[192]);
    }
    void queue_page(int number, uint8_t with_state)
    {
        set_state(number, with_state);
        spool_enqueue(nullptr, nullptr, page(number), &spq, 0);
    }
    static qn_int32_t queued()
    {
        const qn::tr::mutex_lock queue(spq.mutex);
        return spq.cnt;
    }
    static void start_thread() { pthread_once(&sp_thread_once, mk_sp_thread); }
    static void wait_for(const std::function<bool()> &condition)
    {
        while (!condition()) sched_yield();
    }

    std::string copies = folder / "copies";
    std::atomic<int> waits{0};
    std::atomic<int> looks{0};
};

TEST_F(QueuedState, FullIsCopied)
{
    queue_page(2, full);
    start_thread();
    wait_for([] { return queued() == 0; });
    EXPECT_EQ(state(2), ready);
    EXPECT_EQ(entries_of(copies).size(), 1U);
}

TEST_F(QueuedState, ReadyIsDroppedWithoutACopy)
{
    queue_page(2, ready);
    start_thread();
    wait_for([] { return queued() == 0; });
    EXPECT_EQ(state(2), ready);
    EXPECT_TRUE(entries_of(copies).empty());
}

TEST_F(QueuedState, OtherIsLookedAtAgainWithoutWaitingForASignal)
{
    queue_page(2, active);
    queue_page(3, full);
    start_thread();
    wait_for([this] { return looks >= 10; });
    EXPECT_EQ(queued(), 2) << "those behind it stay behind it";
    EXPECT_EQ(state(2), active);
    EXPECT_EQ(state(3), full);
    EXPECT_EQ(waits, 0);
    EXPECT_TRUE(entries_of(copies).empty());

    set_state(2, full);
    wait_for([] { return queued() == 0; });
    EXPECT_EQ(entries_of(copies).size(), 2U);
}
} // namespace
