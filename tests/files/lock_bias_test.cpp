// Locks that are biased towards a thread: who gets a bias, what it lets him do, and how it ends.
#include <atomic>
#include <cerrno>
#include <chrono>
#include <functional>
#include <thread>
#include <vector>

#include <linux/membarrier.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "support/last_error.h"
#include "support/scratch.h"
#include "support/trace_image.h"
#include "trace/trace.h"

namespace
{
bool barrier_is_there = true;
}

// As the linker names what the library calls, and the real one.
extern "C" long __real_syscall(long number, ...);
extern "C" long __wrap_syscall(long number, long a, long b, long c, long d, long e, long f)
{
    if (number != SYS_membarrier || barrier_is_there) return __real_syscall(number, a, b, c, d, e, f);
    errno = ENOSYS;
    return -1;
}

namespace
{
using namespace qn::test;
using namespace qn::tr;

constexpr uint32_t usual_records = 300; // in a row, for a bias that was never revoked
constexpr auto id_record = static_cast<uint16_t>(format::kind::identifier);

void in_thread(const std::function<void()> &body) { std::thread(body).join(); }

// A thread that stays until the test is over: its thread pointer is no other's meanwhile.
class staying_thread
{
public:
    explicit staying_thread(const std::function<void()> &body)
        : thread_([this, body] {
              body();
              done_ = true;
              done_.notify_all();
              stays_.wait(true);
          })
    {
        done_.wait(false);
    }
    ~staying_thread()
    {
        stays_ = false;
        stays_.notify_all();
        thread_.join();
    }

private:
    std::atomic<bool> done_{false}, stays_{true};
    std::thread thread_;
};

// Takes the lock in a thread of its own, which may have to wait for it.
template <class Lock>
class waiting_thread
{
public:
    explicit waiting_thread(trace_anchor_t *anchor)
        : thread_([this, anchor] {
              const Lock lock(anchor);
              has_it_ = true;
          })
    {
        std::this_thread::sleep_for(std::chrono::milliseconds(20)); // it would have the lock by now
    }
    bool has_lock() const { return has_it_; }
    void join() { thread_.join(); }

private:
    std::atomic<bool> has_it_{false};
    std::thread thread_;
};

bool is_free(pthread_mutex_t &mutex)
{
    bool taken = false;
    in_thread([&] {
        taken = pthread_mutex_trylock(&mutex) == 0;
        if (taken) pthread_mutex_unlock(&mutex);
    });
    return taken;
}

class LockBias : public testing::Test
{
protected:
    void SetUp() override
    {
#ifdef __SANITIZE_THREAD__
        GTEST_SKIP() << "no lock is biased there";
#endif
    }

    void trace()
    {
        ASSERT_EQ(tr_set_filename_1(file_.c_str()), 0);
        ASSERT_EQ(program_.register_now(), 0);
    }
    void trace_with_bias()
    {
        trace();
        write(usual_records);
        ASSERT_TRUE(is_biased());
        ASSERT_TRUE(is_free(anchors.anchorMutex));
    }

    void write(uint32_t count)
    {
        for (uint32_t i = 0; i < count; ++i) ASSERT_EQ(tr_record_id_1("ABCD", written_++), 0);
    }
    // Every record, in the order of writing, each once.
    void expect_all_written() const
    {
        uint32_t next = 0;
        for (const record_image &record : trace_image::of_file(file_).ring()) {
            if (record.function() != id_record) continue;
            ASSERT_EQ(record.u32(28), next++);
        }
        EXPECT_EQ(next, written_);
    }

    static bool is_biased() { return anchors.anchorBias.towards != nullptr; }

    const scratch folder_;
    const std::string file_ = folder_ / "f";
    client program_{"ABCD"};
    uint32_t written_ = 0;
};

TEST_F(LockBias, IsGivenToAThreadThatWritesManyRecordsInARow)
{
    trace();
    write(100);
    EXPECT_FALSE(is_biased());
    write(usual_records);
    EXPECT_TRUE(is_biased());
    EXPECT_EQ(anchors.anchorBias.towards->thread, own_thread_pointer());
}

TEST_F(LockBias, IsNotGivenToThreadsThatTakeTurns)
{
    trace();
    for (uint32_t i = 0; i < usual_records; ++i) {
        in_thread([this] { write(1); });
        write(1);
    }
    EXPECT_FALSE(is_biased());
    expect_all_written();
}

TEST_F(LockBias, LetsItsThreadWriteWithoutTheMutex)
{
    trace_with_bias();
    in_thread([this] {
        ASSERT_EQ(pthread_mutex_lock(&anchors.anchorMutex), 0); // not as the library does it
    });
    write(10);
    expect_all_written();
    anchors.anchorMutex = PTHREAD_RECURSIVE_MUTEX_INITIALIZER_NP;
}

TEST_F(LockBias, IsRevokedByAnotherWriter)
{
    trace_with_bias();
    in_thread([this] { write(10); });
    EXPECT_FALSE(is_biased());
    write(10);
    expect_all_written();
}

TEST_F(LockBias, IsRevokedByWhoeverTakesTheSetLock)
{
    trace_with_bias();
    in_thread([] { EXPECT_TRUE(anchor_set_lock(&anchors)); });
    EXPECT_FALSE(is_biased());
}

TEST_F(LockBias, OfTheDefaultFileIsRevokedByWhoeverTakesTheGlobalMutex)
{
    trace_with_bias();
    in_thread([] { EXPECT_TRUE(global_lock()); });
    EXPECT_FALSE(is_biased());
}

TEST_F(LockBias, OfTheDefaultFileIsRevokedByWhoeverTriesTheGlobalMutex)
{
    trace_with_bias();
    in_thread([] { EXPECT_TRUE(mutex_try_lock(anchors.anchorMutex, lock_rank::global)); });
    EXPECT_FALSE(is_biased());
}

TEST_F(LockBias, IsKeptByItsThreadWhenThatOneTakesTheLock)
{
    trace_with_bias();
    EXPECT_TRUE(anchor_set_lock(&anchors));
    EXPECT_TRUE(global_lock());
    EXPECT_TRUE(is_biased());
}

TEST_F(LockBias, KeepsOthersOutWhileItsThreadIsInside)
{
    trace_with_bias();
    std::optional<waiting_thread<anchor_set_lock>> other;
    {
        const writer_lock inside(&anchors);
        other.emplace(&anchors);
        EXPECT_FALSE(other->has_lock());
    }
    other->join();
    EXPECT_TRUE(other->has_lock());
}

TEST_F(LockBias, KeepsOtherWritersOutWhileItsThreadIsInside)
{
    trace_with_bias();
    std::optional<waiting_thread<writer_lock>> other, third;
    {
        const writer_lock inside(&anchors);
        other.emplace(&anchors);
        third.emplace(&anchors); // finds the bias revoked
        EXPECT_FALSE(other->has_lock());
        EXPECT_FALSE(third->has_lock());
    }
    other->join();
    third->join();
}

TEST_F(LockBias, MakesATryFailWhileItsThreadIsInside)
{
    trace_with_bias();
    const writer_lock inside(&anchors);
    in_thread([] { EXPECT_FALSE(mutex_try_lock(anchors.anchorMutex, lock_rank::global)); });
    EXPECT_TRUE(is_free(anchors.anchorMutex));
}

TEST_F(LockBias, LeavesNoGapWhenItsThreadTakesTheMutexToo)
{
    trace_with_bias();
    std::optional<waiting_thread<anchor_set_lock>> other;
    {
        writer_lock inside(&anchors);
        other.emplace(&anchors);
        ASSERT_TRUE(inside.take_mutex());
        EXPECT_FALSE(other->has_lock());
        EXPECT_FALSE(is_free(anchors.anchorMutex));
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
        EXPECT_FALSE(other->has_lock());
    }
    other->join();
    EXPECT_TRUE(is_free(anchors.anchorMutex));
}

TEST_F(LockBias, RefusesTheRecordsOfASignalHandlerWhileItsThreadIsInside)
{
    trace_with_bias();
    {
        const writer_lock inside(&anchors);
        EXPECT_EQ(tr_record_id_1("ABCD", 0), QN_TR_ELOCK); // as a handler on this thread would
    }
    write(1);
    expect_all_written();
}

TEST_F(LockBias, RefusesTheRecordsOfASignalHandlerWhenItsThreadTookTheMutexToo)
{
    trace_with_bias();
    {
        writer_lock inside(&anchors);
        ASSERT_TRUE(inside.take_mutex());
        EXPECT_EQ(tr_record_id_1("ABCD", 0), QN_TR_ELOCK);
    }
    write(1);
    EXPECT_TRUE(is_biased());
    expect_all_written();
}

TEST_F(LockBias, IsNotUsedWhileItsThreadIsInAGuard)
{
    trace();
    while (!is_biased()) write(1);
    {
        const global_lock guard;
        const writer_lock inside(&anchors);
        EXPECT_FALSE(is_free(anchors.anchorMutex));
    }
    {
        const global_lock guard;
        EXPECT_TRUE(writer_lock(&anchors));
        EXPECT_EQ(tr_record_id_1("ABCD", 0), QN_TR_ELOCK) << "the guard is forgotten";
    }
    write(1);
    expect_all_written();
}

TEST_F(LockBias, OfOneFileLetsOthersHaveAnotherFile)
{
    trace_with_bias();
    const std::string other_file = folder_ / "g";
    trace_anchor_t *other = findOrCreateAnchorForFile(other_file.c_str(), 1);
    ASSERT_NE(other, nullptr);
    const writer_lock inside(&anchors);
    in_thread([&] { EXPECT_TRUE(anchor_set_lock(other)); });
}

TEST_F(LockBias, TakesTwiceAsManyRecordsAfterEachRevocation)
{
    trace_with_bias();
    for (uint32_t records = 2 * usual_records; records < 10000; records *= 2) {
        in_thread([] { EXPECT_TRUE(anchor_set_lock(&anchors)); });
        for (uint32_t i = 0; i < records / 2; ++i) ASSERT_EQ(tr_record_id_1("ABCD", i), 0);
        EXPECT_FALSE(is_biased()) << records;
        for (uint32_t i = 0; i < records / 2; ++i) ASSERT_EQ(tr_record_id_1("ABCD", i), 0);
        EXPECT_TRUE(is_biased()) << records;
    }
}

TEST_F(LockBias, IsKeptWhenTheRingGoesRound)
{
    setenv("QN_TR_SIZE", "4096", 1);
    trace_with_bias();
    const uint32_t last = tr_record_id_1("ABCD", 4711);
    EXPECT_EQ(last, 0U);
    write(usual_records);
    EXPECT_TRUE(is_biased());
    const auto ring = trace_image::of_file(file_).ring();
    ASSERT_FALSE(ring.empty());
    EXPECT_EQ(ring.back().u32(28), written_ - 1);
}

TEST_F(LockBias, OfAPageSetIsThatOfItsSharedMutexAndIsKeptWhenAPageIsFull)
{
    setenv("QN_TR_SIZE", "16384", 1);
    setenv("QN_TR_SPOOL", (file_ + ":ON:4:" + (folder_ / "spool")).c_str(), 1);
    trace();
    write(usual_records);
    ASSERT_NE(anchors.pSpoolMutex, nullptr);
    const lock_bias &bias = bias_of(anchors.pSpoolMutex);
    EXPECT_FALSE(is_biased());
    ASSERT_NE(bias.towards, nullptr);
    const trace_anchor_t *page = anchors.pActivePg;
    while (anchors.pActivePg == page) write(1);
    EXPECT_NE(bias.towards, nullptr);
}

TEST_F(LockBias, IsGoneWhenTheFileHasBecomeAPageSet)
{
    const std::string of_pages = folder_ / "pages";
    setenv("QN_TR_SPOOL", (of_pages + ":ON:4:" + (folder_ / "spool")).c_str(), 1);
    trace_with_bias();
    in_thread([&] { ASSERT_EQ(tr_set_filename_1(of_pages.c_str()), 0); });
    ASSERT_NE(anchors.pSpoolMutex, nullptr);
    EXPECT_FALSE(is_biased());
    std::optional<waiting_thread<writer_lock>> writer;
    {
        const anchor_set_lock set(&anchors);
        writer.emplace(&anchors);
        EXPECT_FALSE(writer->has_lock());
    }
    writer->join();
}

TEST_F(LockBias, IsForgottenInAForkedChild)
{
    trace();
    std::atomic<int> step{0};
    std::thread biased([&] {
        write(usual_records);
        ASSERT_TRUE(is_biased());
        const writer_lock inside(&anchors);
        step = 1;
        step.notify_all();
        step.wait(1);
    });
    step.wait(0);
    const pid_t child = fork();
    if (child == 0) {
        alarm(20);
        _exit(anchor_set_lock(&anchors) && !is_biased() ? 0 : 1);
    }
    step = 2;
    step.notify_all();
    biased.join();
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
}

TEST_F(LockBias, NeedsTheBarrierOfTheSystem)
{
    barrier_is_there = false;
    allow_bias(); // as at the start of a program
    trace();
    write(usual_records * 3);
    EXPECT_FALSE(is_biased());
    in_thread([this] { write(10); });
    expect_all_written();
}

TEST_F(LockBias, IsRevokedAndNeverGivenAgainWhenTheBarrierIsForbiddenMeanwhile)
{
    trace_with_bias();
    barrier_is_there = false;
    in_thread([this] { write(10); });
    EXPECT_FALSE(is_biased());
    write(10 * usual_records);
    EXPECT_FALSE(is_biased());
}

TEST_F(LockBias, IsRevokedByAWriterWithoutChangingErrno)
{
    trace_with_bias();
    barrier_is_there = false;
    in_thread([this] {
        errno = ENXIO;
        write(1);
        EXPECT_EQ(errno, ENXIO);
    });
}

TEST_F(LockBias, IsGivenToAsManyThreadsAsThereAreMarks)
{
    setenv("QN_TR_SIZE", "4000000", 1);
    trace();
    std::vector<std::unique_ptr<staying_thread>> threads;
    for (uint32_t i = 0; i < 70; ++i) {
        threads.push_back(std::make_unique<staying_thread>([this] { write(usual_records); }));
        EXPECT_EQ(is_biased(), i < 64) << i;
        const anchor_set_lock set(&anchors);
        anchors.anchorBias.enough = 0; // as if it had never been revoked
    }
    expect_all_written();
}
} // namespace
