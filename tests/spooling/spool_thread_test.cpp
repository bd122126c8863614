// The spool thread's own round: how it starts, how long it waits, what it does when it wakes, how it ends.
#include <atomic>
#include <csignal>
#include <cstdlib>
#include <ctime>

#include <sched.h>
#include <sys/mman.h>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

class SpoolThread : public testing::Test
{
protected:
    SpoolThread()
    {
        setenv("QN_TR_SPOOL", "", 1); // there is no configuration file to look for
        pthread_once(&trace_global_data_once, initialize_trace_global_data);
        spool_calls().timed_wait = [this](const timespec &until) {
            deadline = until.tv_sec;
            sigset_t mask;
            pthread_sigmask(SIG_BLOCK, nullptr, &mask);
            for (int number = 1; number < 32; ++number) blocked[number] = sigismember(&mask, number) == 1;
            scheduling = sched_getscheduler(0);
            ++waits;
        };
    }
    // The thread ends before the hooks go.
    ~SpoolThread() override
    {
        end_thread();
        anchors.spool = nullptr;
        spool_calls() = {};
        calls() = {};
    }

    static void start_thread() { pthread_once(&sp_thread_once, mk_sp_thread); }
    static void end_thread() { tr_term(); }
    static bool running() { return qn::tr::load_acquire(is_spool_running) != 0; }
    void wait_for_waits(int count) const
    {
        while (waits < count) sched_yield();
    }
    static void wake_thread()
    {
        const qn::tr::mutex_lock queue(spq.mutex);
        pthread_cond_signal(&spq.cond);
    }

    scratch folder;
    std::atomic<int> waits{0};
    std::atomic<time_t> deadline{0};
    std::atomic<bool> blocked[32] = {};
    std::atomic<int> scheduling{-1};
};

TEST_F(SpoolThread, TellsThatItRuns)
{
    EXPECT_FALSE(running());
    start_thread();
    wait_for_waits(1);
    EXPECT_TRUE(running());
    end_thread();
    EXPECT_FALSE(running());
}

TEST_F(SpoolThread, LeavesAsynchronousSignalsToTheClient)
{
    start_thread();
    wait_for_waits(1);
    for (const int signal : {SIGHUP, SIGINT, SIGTERM, SIGALRM, SIGCHLD, SIGUSR1, SIGUSR2, SIGIO, SIGQUIT})
        EXPECT_TRUE(blocked[signal]) << signal;
    for (const int signal : {SIGSEGV, SIGBUS, SIGFPE, SIGILL}) EXPECT_FALSE(blocked[signal]) << signal;
}

TEST_F(SpoolThread, LeavesTheSignalsOfItsCreatorAsTheyWere)
{
    sigset_t before;
    pthread_sigmask(SIG_BLOCK, nullptr, &before);
    start_thread();
    wait_for_waits(1);
    sigset_t after;
    pthread_sigmask(SIG_BLOCK, nullptr, &after);
    for (int number = 1; number < 32; ++number)
        EXPECT_EQ(sigismember(&after, number), sigismember(&before, number)) << number;
}

TEST_F(SpoolThread, DoesNotTakeTheProcessorFromTheWriterWhoWakesIt)
{
    start_thread();
    wait_for_waits(1);
    EXPECT_EQ(scheduling, SCHED_BATCH);
    EXPECT_EQ(sched_getscheduler(0), SCHED_OTHER);
}

TEST_F(SpoolThread, WaitsForAnHour)
{
    debug_on();
    const time_t before = std::time(nullptr);
    start_thread();
    wait_for_waits(1);
    EXPECT_GE(deadline, before + 3600);
    EXPECT_LE(deadline, std::time(nullptr) + 3600);
    EXPECT_TRUE(system_log_has("Spool thread about to sleep (max=3600)\n"));
}

TEST_F(SpoolThread, DoesNotWaitForWhoeverHasTheGlobalMutexWhenTheDefaultTraceHasPages)
{
    trace_spool_spec_t spec{};
    qn::tr::biased_mutex of_set;
    init_biased_mutex(&of_set.mutex);
    anchors.spool = &spec;
    anchors.pSpoolMutex = &of_set.mutex;
    const qn::tr::global_lock held;
    start_thread();
    wait_for_waits(1);
    end_thread();
    anchors.spool = nullptr;
    anchors.pSpoolMutex = nullptr;
}

#ifndef __SANITIZE_THREAD__ // no lock is biased there
TEST_F(SpoolThread, LeavesTheBiasOfTheDefaultTracesLockAsItIs)
{
    for (int i = 0; i < 300; ++i) EXPECT_TRUE(qn::tr::anchor_set_lock(&anchors));
    ASSERT_NE(anchors.anchorBias.towards, nullptr);
    start_thread();
    wait_for_waits(1);
    wake_thread();
    wait_for_waits(2);
    EXPECT_NE(anchors.anchorBias.towards, nullptr);
}
#endif

TEST_F(SpoolThread, WaitsForTheIntervalOfTheDefaultTrace)
{
    trace_spool_spec_t spec{};
    spec.sync_interval = 60;
    anchors.spool = &spec;
    debug_on();
    const time_t before = std::time(nullptr);
    start_thread();
    wait_for_waits(1);
    EXPECT_GE(deadline, before + 60);
    EXPECT_LE(deadline, std::time(nullptr) + 60);
    EXPECT_TRUE(system_log_has("Spool thread about to sleep (max=60)\n"));
    end_thread();
    anchors.spool = nullptr;
}

TEST_F(SpoolThread, WaitsAgainWhenItIsWokenForNothing)
{
    start_thread();
    wait_for_waits(1);
    wake_thread();
    wait_for_waits(2);
    EXPECT_TRUE(running());
}

TEST_F(SpoolThread, WakesForAFile)
{
    write_file(folder / "f", "x");
    start_thread();
    wait_for_waits(1);
    ASSERT_EQ(tr_copy_file_1("/dev/null", (folder / "f").c_str(), 1), 0);
    wait_for_waits(2);
    EXPECT_FALSE(exists(folder / "f"));
}

// The queue is emptied before the thread waits.
TEST_F(SpoolThread, WorksThroughABacklogWithoutWaiting)
{
    for (int number = 0; number < 20; ++number) {
        const std::string file = folder / std::to_string(number);
        write_file(file, "x");
        spool_enqueue(file.c_str(), "/dev/null", nullptr, &spq, 1);
    }
    start_thread();
    wait_for_waits(1);
    EXPECT_TRUE(entries_of(folder.folder()).empty());
}

TEST_F(SpoolThread, TellsItsSteps)
{
    debug_on();
    start_thread();
    wait_for_waits(1);
    EXPECT_TRUE(system_log_has("Start cp_thread...\n"));
    EXPECT_TRUE(system_log_has("cp_thread locked mutex; cnt: 0\n"));
}

TEST_F(SpoolThread, LeavesWhatIsQueuedWhenTracingStops)
{
    write_file(folder / "f", "x");
    spool_enqueue((folder / "f").c_str(), "/dev/null", nullptr, &spq, 1);
    global_stop_trace();
    EXPECT_EQ(cp_thread(nullptr), nullptr);
    EXPECT_FALSE(running());
    EXPECT_EQ(waits, 0);
    EXPECT_TRUE(exists(folder / "f"));
    EXPECT_EQ(spq.cnt, 1);
    std::free(spool_dequeue_last_element_inside_spq(&spq));
}

TEST_F(SpoolThread, LeavesTheQueueUnlockedWhenItEnds)
{
    start_thread();
    wait_for_waits(1);
    end_thread();
    EXPECT_TRUE(is_free(spq.mutex));
}

// ---- With pages.

class SpoolThreadWithPages : public SpoolThread
{
protected:
    void SetUp() override
    {
        trace = anchor_for(folder / "t");
        ASSERT_EQ(start(trace), 0);
    }
    trace_anchor_t *trace = nullptr;
};

TEST_F(SpoolThreadWithPages, SyncsThemWhenThatIsAskedFor)
{
    std::atomic<int> syncs{0};
    calls().msync = [&](void *map, size_t size, int flags) {
        if (map == trace->pMap && flags == MS_ASYNC) ++syncs;
        return __real_msync(map, size, flags);
    };
    use_msync_enabled_except_flush = 1;
    start_thread();
    wait_for_waits(1);
    wake_thread();
    wait_for_waits(2);
    EXPECT_GE(syncs, 1) << "each time that it wakes";
    end_thread();
    calls() = {};
}

TEST_F(SpoolThreadWithPages, SyncsNothingUnlessThatIsAskedFor)
{
    std::atomic<int> syncs{0};
    calls().msync = [&](void *map, size_t size, int flags) {
        if (flags == MS_ASYNC) ++syncs;
        return __real_msync(map, size, flags);
    };
    start_thread();
    wait_for_waits(1);
    wake_thread();
    wait_for_waits(2);
    EXPECT_EQ(syncs, 0);
    end_thread();
    calls() = {};
}

// ---- And the configuration.

TEST_F(SpoolThread, ReadsTheConfigurationWhenTheClientSaysSo)
{
    unsetenv("QN_TR_SPOOL");
    expect_in_private_var([this] {
        write_conf(section("traces", {"pat = first"}), 1000);
        char name[4096];
        ASSERT_EQ(tr_get_filename_1(name), 0);
        start_thread();
        wait_for_waits(1);
        ASSERT_STREQ(anchors.pFirstSpoolSpec->pattern, "first");

        write_conf(section("traces", {"pat = second"}), 1000);
        const int before = waits;
        tr_configure_1();
        wait_for_waits(before + 1);
        {
            const qn::tr::global_lock global;
            EXPECT_STREQ(anchors.pFirstSpoolSpec->pattern, "second") << "although it is no newer";
        }
        end_thread();
    });
}

TEST_F(SpoolThread, WaitsForTheIntervalThatItHasJustRead)
{
    unsetenv("QN_TR_SPOOL");
    expect_in_private_var([this] {
        pthread_once(&sp_read_cfg, [] {});
        specifications before;
        before.add("default");
        install(before);
        anchors.spool = anchors.pFirstSpoolSpec;
        ASSERT_EQ(anchors.spool->sync_interval, 60U);
        qn::tr::set_file_name(&anchors, "/var/default.trc");
        write_conf(section("traces", {"pat = default"}));
        const time_t earliest = std::time(nullptr) + 3600;
        start_thread();
        wait_for_waits(1);
        EXPECT_GE(deadline, earliest);
        end_thread();
    });
}

TEST_F(SpoolThread, LooksAtTheConfigurationBetweenTheFilesOfABacklog)
{
    unsetenv("QN_TR_SPOOL");
    expect_in_private_var([this] {
        pthread_once(&sp_read_cfg, [] {});
        write_conf(section("traces", {"pat = first"}), 1000);
        const std::string copies = folder.folder();
        const std::string files[] = {folder / "f", folder / "g"};
        for (const std::string &file : files) {
            write_file(file, "x");
            spool_enqueue(file.c_str(), copies.c_str(), nullptr, &spq, 0);
        }
        std::vector<std::string> patterns; // in force while each is copied
        calls().open = [&](const char *name, int flags, mode_t mode) {
            if (name == files[0] || name == files[1]) {
                patterns.emplace_back(anchors.pFirstSpoolSpec != nullptr ? anchors.pFirstSpoolSpec->pattern : "(none)");
                write_conf(section("traces", {"pat = second"}), 2000);
            }
            return __real_open(name, flags, mode);
        };
        start_thread();
        wait_for_waits(1);
        end_thread();
        calls() = {};
        EXPECT_EQ(patterns, (std::vector<std::string>{"first", "second"}));
    });
}
} // namespace
