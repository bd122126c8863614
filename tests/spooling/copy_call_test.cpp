// The call that has a file copied: what it queues, and what becomes of that once the spool thread runs.
#include <filesystem>

#include <sched.h>
#include <sys/syslog.h>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

class CopyCall : public testing::Test
{
protected:
    void SetUp() override
    {
        write_file(file, "contents");
        std::filesystem::create_directory(dest);
    }
    void TearDown() override
    {
        while (sp_q_element_t *element = spool_dequeue_last_element_inside_spq(&spq)) std::free(element);
    }
    qn_int32_t copy(int del = 0) const { return tr_copy_file_1(dest.c_str(), file.c_str(), del); }

    scratch folder;
    std::string file = folder / "f";
    std::string dest = folder / "d";
};

TEST_F(CopyCall, QueuesTheFile)
{
    const no_spool_thread none;
    const char *directory = dest.c_str();
    EXPECT_EQ(tr_copy_file_1(directory, file.c_str(), 1), 0);
    ASSERT_EQ(spq.cnt, 1);
    EXPECT_EQ(spq.pFirst->pAnchor, nullptr);
    EXPECT_EQ(spq.pFirst->fileName, file);
    EXPECT_EQ(spq.pFirst->dest, directory) << "the caller's own string";
    EXPECT_EQ(spq.pFirst->del, 1);
}

TEST_F(CopyCall, RefusesNullStringsAndQueuesNothing)
{
    const no_spool_thread none;
    EXPECT_EQ(tr_copy_file_1(nullptr, "x", 0), 1);
    EXPECT_EQ(tr_copy_file_1("/d", nullptr, 0), 1);
    EXPECT_EQ(tr_copy_file_1(nullptr, nullptr, 1), 1);
    EXPECT_EQ(spq.cnt, 0);
    EXPECT_EQ(none.attempts(), 0);
}

TEST_F(CopyCall, StartsTheSpoolThread)
{
    void *(*started)(void *) = nullptr;
    spool_calls().thread_start = [&](void *(*body)(void *)) {
        started = body;
        return EAGAIN;
    };
    EXPECT_EQ(copy(), 0);
    EXPECT_EQ(started, cp_thread);
}

TEST_F(CopyCall, TriesToStartTheSpoolThreadOnce)
{
    const no_spool_thread none;
    debug_on();
    EXPECT_EQ(copy(), 0);
    EXPECT_EQ(copy(), 0);
    EXPECT_EQ(none.attempts(), 1);
    EXPECT_EQ(spq.cnt, 2);
    EXPECT_EQ(is_spool_running, 0);
    EXPECT_TRUE(system_log_has(LOG_WARNING, "ERROR: cannot create spooling thread.\n"));
}

TEST_F(CopyCall, RecordsALackOfMemoryButDoesNotReturnIt)
{
    const no_spool_thread none;
    calls().calloc = [](size_t, size_t) -> void * { return nullptr; };
    calls().malloc = [](size_t) -> void * { return nullptr; };
    EXPECT_EQ(copy(), 0);
    calls() = {};
    EXPECT_EQ(last_error().code, 14);
    EXPECT_EQ(spq.cnt, 0);
}

TEST_F(CopyCall, TellsWhatIsToBeCopied)
{
    const no_spool_thread none;
    debug_on();
    copy();
    tr_copy_file_1(nullptr, "x", 0);
    tr_copy_file_1("/d", nullptr, 0);
    EXPECT_TRUE(system_log_has(LOG_ERR, "tr_copy_file '" + file + "' -> '" + dest + "'\n"));
    EXPECT_TRUE(system_log_has(LOG_ERR, "tr_copy_file 'x' -> '(NULL)'\n"));
    EXPECT_TRUE(system_log_has(LOG_ERR, "tr_copy_file '(NULL)' -> '/d'\n"));
}

TEST_F(CopyCall, IsSilentBelowLevelEight)
{
    const no_spool_thread none;
    global_debug_level = 7;
    copy();
    EXPECT_TRUE(system_log().empty());
}

// ---- With the spool thread. It handles the queue in order: once a later file is gone, an earlier one was dealt with.

class CopyThread : public CopyCall
{
protected:
    void TearDown() override { tr_term(); }
    void wait_until_all_is_handled()
    {
        const std::string last = folder / "last";
        write_file(last, "");
        ASSERT_EQ(tr_copy_file_1("/dev/null", last.c_str(), 1), 0);
        while (exists(last)) sched_yield();
    }
};

TEST_F(CopyThread, CopiesTheFile)
{
    ASSERT_EQ(copy(), 0);
    wait_until_all_is_handled();
    const auto copies = entries_of(dest);
    ASSERT_EQ(copies.size(), 1U);
    EXPECT_EQ(copies[0].rfind("f.20", 0), 0U) << copies[0];
    EXPECT_EQ(file_bytes(dest + "/" + copies[0]), "contents");
    EXPECT_TRUE(exists(file));
}

TEST_F(CopyThread, RemovesTheFileAfterItsCopy)
{
    ASSERT_EQ(copy(1), 0);
    wait_until_all_is_handled();
    EXPECT_EQ(entries_of(dest).size(), 1U);
    EXPECT_FALSE(exists(file));
}

TEST_F(CopyThread, RemovesAFileThatIsNotToBeCopied)
{
    ASSERT_EQ(tr_copy_file_1("/dev/null", file.c_str(), 1), 0);
    wait_until_all_is_handled();
    EXPECT_FALSE(exists(file));
    EXPECT_TRUE(entries_of(dest).empty());
}

TEST_F(CopyThread, TellsThatTheThreadIsThere)
{
    debug_on();
    ASSERT_EQ(copy(), 0);
    wait_until_all_is_handled();
    bool told = false;
    for (const log_line &line : system_log())
        told = told || (line.priority == LOG_WARNING && line.text.rfind("Spooling thread created: (", 0) == 0);
    EXPECT_TRUE(told);
}
} // namespace
