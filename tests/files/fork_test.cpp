// Forked children: tracing is over in them, and the parent's files are the parent's.
#include <atomic>
#include <csignal>
#include <functional>
#include <thread>

#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "files/support_calls.h"
#include "files/support_files.h"

namespace
{
using namespace qn::test;

class ForkedChild : public testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_EQ(tr_set_filename_1(file.c_str()), 0);
        ASSERT_EQ(program.register_now(), 0);
        ASSERT_EQ(tr_record_id_1("ABCD", 1), 0);
        qn::tr::header_of(&anchors)->uFlags = 0x8000; // a clean stop would take it away
        before = file_bytes(file);
    }
    void TearDown() override
    {
        calls() = {};
        EXPECT_EQ(master_override_off(), 0) << "the parent goes on tracing";
        EXPECT_EQ(this_is_child, 0);
        EXPECT_EQ(tr_set_filename_1(nullptr), 0);
    }

    // The body leaves the parent's file as it is, and so does the end of the child.
    void expect_file_untouched(const std::function<bool()> &body)
    {
        EXPECT_TRUE(in_child(body, true));
        EXPECT_EQ(file_bytes(file), before);
    }

    scratch folder;
    std::string file = folder / "f";
    client program{"ABCD"};
    std::string before;
};

TEST_F(ForkedChild, KnowsThatItIsOne)
{
    EXPECT_TRUE(in_child([] { return this_is_child == 1 && master_override_off() == 1; }));
}

TEST_F(ForkedChild, EndsWithoutTouchingTheFile)
{
    expect_file_untouched([] { return true; });
}

TEST_F(ForkedChild, WritesNoRecord)
{
    expect_file_untouched([] { return tr_record_id_1("ABCD", 2) == 0 && tr_record_id_1(nullptr, 2) == 0; });
}

TEST_F(ForkedChild, DoesNothingInItsTermination)
{
    int syncs = 0;
    calls().msync = [&](void *, size_t, int) { return ++syncs; };
    expect_file_untouched([&] {
        tr_term();
        return syncs == 0 && anchors.pMap != nullptr && master_override_off() != 0;
    });
}

TEST_F(ForkedChild, LetsGoOfTheFileWithoutSyncingIt)
{
    int syncs = 0;
    calls().msync = [&](void *, size_t, int) { return ++syncs; };
    expect_file_untouched([&] { return tr_set_filename_1("") == 0 && anchors.pMap == nullptr && syncs == 0; });
}

TEST_F(ForkedChild, LetsGoOfAllFilesForANullPointer)
{
    expect_file_untouched([] { return tr_set_filename_1(nullptr) == 0 && anchors.pMap == nullptr; });
}

TEST_F(ForkedChild, DoesNotStartTheParentsFileAgain)
{
    expect_file_untouched([&] {
        client late("LATE");
        return tr_set_filename_1("") == 0 && tr_set_filename_1(file.c_str()) == 0 && late.register_now() == 0 &&
               anchors.pMap == nullptr;
    });
}

TEST_F(ForkedChild, UnregistersNothing)
{
    expect_file_untouched([] { return tr_unregister_component_1("ABCD") == 9; });
}

TEST_F(ForkedChild, OfAChildIsOneToo)
{
    expect_file_untouched([] { return in_child([] { return this_is_child == 1 && tr_record_id_1("ABCD", 2) == 0; }); });
}

TEST(ForkHandler, IsRegisteredByTheFirstCallThatInitialises)
{
    EXPECT_TRUE(in_child([] { return this_is_child == 0 && master_override_off() == 0; }));
    char name[4096];
    ASSERT_EQ(tr_get_filename_1(name), 0);
    EXPECT_TRUE(in_child([] { return this_is_child == 1 && master_override_off() == 1; }));
}

TEST(AtforkChild, StopsTracing)
{
    const scratch folder;
    atfork_child();
    EXPECT_EQ(this_is_child, 1);
    EXPECT_EQ(global_switch, 1);
}

// Children are made while other threads hold every lock there is: none of them may hang on one.
class BusyProcess : public testing::Test
{
protected:
    static constexpr int writers = 4;

    void SetUp() override
    {
        ASSERT_EQ(tr_set_filename_1(file.c_str()), 0);
        ASSERT_EQ(program.register_now(), 0);
        other = anchor_for(folder / "other");
        ASSERT_EQ(start(other), 0);
        for (int i = 0; i < writers; ++i)
            threads.emplace_back([this, i] {
                tr_file_token_t token = i % 2 == 0 ? nullptr : other;
                while (!enough.load()) {
                    EXPECT_EQ(tr_ms_record_id_1("ABCD", 1, token), 0);
                    ++written;
                }
            });
        threads.emplace_back([this] {
            while (!enough.load()) EXPECT_EQ(tr_flush_1(), 0);
        });
        while (written.load() < 1000) std::this_thread::yield();
    }
    void TearDown() override
    {
        enough = true;
        for (std::thread &thread : threads) thread.join();
        EXPECT_EQ(tr_set_filename_1(nullptr), 0);
        trace_image::of_file(file).ring();
        trace_image::of_file(folder / "other").ring();
    }

    scratch folder;
    std::string file = folder / "f";
    client program{"ABCD"};
    trace_anchor_t *other = nullptr;
    std::atomic<bool> enough{false};
    std::atomic<int> written{0};
    std::vector<std::thread> threads;
};

TEST_F(BusyProcess, HasChildrenThatCallTheLibraryAndExit)
{
    for (int child = 0; child < 30; ++child)
        ASSERT_TRUE(in_child(
            [this] {
                char name[4096];
                return tr_record_id_1("ABCD", 2) == 0 && tr_ms_record_id_1("ABCD", 2, other) == 0 &&
                       tr_get_filename_1(name) == 0 && tr_set_filename_1(nullptr) == 0;
            },
            true))
            << child;
    const int before = written.load();
    while (written.load() < before + 1000) std::this_thread::yield();
}

TEST_F(BusyProcess, HasChildrenThatTerminateTracing)
{
    for (int child = 0; child < 30; ++child)
        ASSERT_TRUE(in_child([] {
            tr_term();
            tr_term();
            return true;
        })) << child;
}

TEST_F(BusyProcess, HasNoRecordOfAChildInItsFiles)
{
    for (int child = 0; child < 10; ++child)
        ASSERT_TRUE(in_child([this] {
            for (int i = 0; i < 1000; ++i)
                if (tr_record_id_1("KIDS", 2) != 0 || tr_ms_record_id_1("KIDS", 2, other) != 0) return false;
            return true;
        }));
    enough = true;
    for (std::thread &thread : threads) thread.join();
    threads.clear();
    for (const std::string &name : {file, folder / "other"})
        for (const record_image &record : trace_image::of_file(name).records()) ASSERT_NE(record.component(), "KIDS");
}

// The bytes of two levels, each in a memory page of its own that cannot be written to: who stores into one comes by here.
class watched_levels
{
public:
    explicit watched_levels(std::function<void()> body)
    {
        visit = std::move(body);
        void *map = mmap(nullptr, 2 * page_bytes, PROT_READ, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
        pages = map != MAP_FAILED ? static_cast<char *>(map) : nullptr;
        struct sigaction action {
        };
        action.sa_sigaction = &stored_into;
        action.sa_flags = SA_SIGINFO;
        sigaction(SIGSEGV, &action, &before_);
    }
    watched_levels(const watched_levels &) = delete;
    watched_levels &operator=(const watched_levels &) = delete;
    ~watched_levels()
    {
        let_all_in();
        sigaction(SIGSEGV, &before_, nullptr);
    }

    static void let_all_in() { mprotect(pages, 2 * page_bytes, PROT_READ | PROT_WRITE); }
    static tr_detail_level_t *levels() { return reinterpret_cast<tr_detail_level_t *>(pages + page_bytes - 1); }

private:
    static constexpr size_t page_bytes = 4096;

    static void stored_into(int, siginfo_t *info, void *)
    {
        const bool first = static_cast<char *>(info->si_addr) == pages + page_bytes - 1;
        if (!first && static_cast<char *>(info->si_addr) != pages + page_bytes) _exit(1);
        mprotect(pages, 2 * page_bytes, PROT_READ);
        mprotect(first ? pages : pages + page_bytes, page_bytes, PROT_READ | PROT_WRITE);
        visit();
    }

    static inline char *pages = nullptr;
    static inline std::function<void()> visit;
    struct sigaction before_ {
    };
};

TEST_F(ForkedChild, FindsEveryComponentWholeThoughOneIsBeingRegistered)
{
#ifdef __SANITIZE_THREAD__
    GTEST_SKIP() << "the child allocates where ThreadSanitizer sees a signal handler";
#endif
    int forked = 0;
    int failed = 0;
    {
        const watched_levels levels([&forked, &failed] {
            const pid_t child = fork();
            if (child == 0) {
                watched_levels::let_all_in();
                int count = 0;
                tr_mini_component_anchor_t *components = nullptr;
                const int status = tr_set_trace_levels_1("*:*=1") | tr_get_current_trace_levels_1(&count, &components);
                _exit(status == 0 && count == 1 ? 0 : 1);
            }
            int status = -1;
            waitpid(child, &status, 0);
            if (status != 0) ++failed;
            ++forked;
        });
        const tr_category_description_t categories[] = {{0, "First", 1, 1}, {1, "Second", 1, 1}};
        EXPECT_EQ(tr_register_component_1("HALF", watched_levels::levels(), categories, 2), 0);
    }
    EXPECT_EQ(failed, 0) << "children";
    EXPECT_EQ(forked, 4) << "two levels are set to 0, and to what they begin with";
    EXPECT_EQ(tr_unregister_component_1("HALF"), 0);
}
} // namespace
