// The calling thread's error record: what it holds, whose it is, and when it goes.
#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <pthread.h>
#include <string>
#include <sys/mman.h>
#include <sys/resource.h>
#include <thread>
#include <vector>

#include "error_support.h"
#include "instrumented.h"

namespace
{
int id_of_present_error() { return present_error()->cu_error_id; }

TEST(ErrorRecord, IsNoErrorInAThreadThatNeverSetOne)
{
    std::thread([] {
        const owned_error error = present_error();
        EXPECT_EQ(error->cu_error_id, 0);
        EXPECT_EQ(error->cu_msg_default, nullptr);
        EXPECT_EQ(error->cu_arg_cnt, 0U);
        EXPECT_EQ(error->cu_args, nullptr);
    }).join();
}

TEST(ErrorRecord, HoldsEverythingThatWasSet)
{
    EXPECT_EQ(cu_set_error_1(17, "id-1", "app.cat", 2, 9, "file %s, %d", "a.trc", 5), 17);
    const owned_error error = present_error();
    EXPECT_EQ(error->cu_error_id, 17);
    EXPECT_STREQ(error->cu_ffdc_id, "id-1");
    EXPECT_STREQ(error->cu_msg_cat, "app.cat");
    EXPECT_EQ(error->cu_msg_set, 2);
    EXPECT_EQ(error->cu_msg_num, 9);
    EXPECT_STREQ(error->cu_msg_default, "file %s, %d");
    ASSERT_EQ(error->cu_arg_cnt, 2U);
    EXPECT_EQ(error->cu_args[0].cu_arg_type, CU_ERROR_ARG_CHAR_STR);
    EXPECT_STREQ(error->cu_args[0].cu_arg_value.cu_char_str, "a.trc");
    EXPECT_EQ(error->cu_args[1].cu_arg_type, CU_ERROR_ARG_INT);
    EXPECT_EQ(error->cu_args[1].cu_arg_value.cu_int, 5);
}

TEST(ErrorRecord, ReplacesTheEarlierRecordOfTheSameThread)
{
    cu_set_error_1(1, "old", "old.cat", 1, 1, "old %s", "insert");
    cu_set_error_1(2, nullptr, nullptr, 3, 4, "new");
    const owned_error error = present_error();
    EXPECT_EQ(error->cu_error_id, 2);
    EXPECT_EQ(error->cu_ffdc_id, nullptr);
    EXPECT_EQ(error->cu_msg_cat, nullptr);
    EXPECT_STREQ(error->cu_msg_default, "new");
    EXPECT_EQ(error->cu_arg_cnt, 0U);
}

TEST(ErrorRecord, NoErrorEmptiesIt)
{
    cu_set_error_1(1, "id", "cat", 1, 1, "text %d", 1);
    EXPECT_EQ(cu_set_no_error_1(), 0);
    const owned_error error = present_error();
    EXPECT_EQ(error->cu_error_id, 0);
    EXPECT_EQ(error->cu_msg_default, nullptr);
}

TEST(ErrorRecord, BelongsToItsThreadAlone)
{
    cu_set_error_1(5, nullptr, nullptr, 1, 1, "mine");
    std::thread([] {
        EXPECT_EQ(id_of_present_error(), 0);
        cu_set_error_1(6, nullptr, nullptr, 1, 1, "theirs");
    }).join();
    EXPECT_EQ(id_of_present_error(), 5);
}

TEST(ErrorRecord, CopiesItsStringsWhenItIsSet)
{
    std::string insert = "before";
    std::string text = "text %s";
    cu_set_error_1(1, nullptr, nullptr, 1, 1, text.c_str(), insert.c_str());
    insert = "behind";
    text = "TEXT %s";
    EXPECT_EQ(message_of(*present_error()), "text before");
}

TEST(ErrorRecord, ACopyOutlivesTheRecordAndItsThread)
{
    cu_error_t *error = nullptr;
    std::thread([&] {
        cu_set_error_1(8, "id", "cat", 1, 2, "kept %s", "whole");
        EXPECT_EQ(cu_get_error_1(&error), 0);
        cu_set_no_error_1();
    }).join();
    const owned_error owner(error);
    EXPECT_STREQ(error->cu_ffdc_id, "id");
    EXPECT_EQ(message_of(*error), "kept whole");
}

TEST(ErrorRecord, TwoCopiesShareNothing)
{
    cu_set_error_1(1, "id", nullptr, 1, 1, "%s", "text");
    const owned_error one = present_error();
    {
        const owned_error other = present_error();
        EXPECT_NE(one->cu_ffdc_id, other->cu_ffdc_id);
        EXPECT_NE(one->cu_args, other->cu_args);
        std::memset(other->cu_args[0].cu_arg_value.cu_char_str, 'x', 4);
    }
    EXPECT_EQ(message_of(*one), "text");
}

TEST(ErrorRecord, ANullStringInsertStaysNull)
{
    cu_set_error_1(1, nullptr, nullptr, 1, 1, "%s!", static_cast<char *>(nullptr));
    const owned_error error = present_error();
    ASSERT_EQ(error->cu_arg_cnt, 1U);
    EXPECT_EQ(error->cu_args[0].cu_arg_value.cu_char_str, nullptr);
}

TEST(ErrorRecord, ANullDefaultTextHasNoInserts)
{
    EXPECT_EQ(cu_set_error_1(3, nullptr, nullptr, 1, 1, nullptr), 3);
    const owned_error error = present_error();
    EXPECT_EQ(error->cu_error_id, 3);
    EXPECT_EQ(error->cu_msg_default, nullptr);
    EXPECT_EQ(error->cu_arg_cnt, 0U);
}

TEST(ErrorRecord, InsertBytesBeyondTheValueAreZero)
{
    cu_set_error_1(1, nullptr, nullptr, 1, 1, "%d", -1);
    const owned_error error = present_error();
    EXPECT_EQ(error->cu_args[0].cu_arg_value.cu_long_long, 0xffffffffLL);
}

TEST(ErrorRecord, GettingIntoANullPointerIsRefused) { EXPECT_EQ(cu_get_error_1(nullptr), EINVAL); }

TEST(ErrorRecord, ReleasingNullIsHarmless)
{
    cu_set_error_1(4, nullptr, nullptr, 1, 1, "stays");
    cu_rel_error_1(nullptr);
    EXPECT_EQ(id_of_present_error(), 4);
}

TEST(ErrorRecord, KeepsTheIdWhenMemoryIsExhausted)
{
    if (instrumented) GTEST_SKIP() << "the sanitizer ends the program when memory is exhausted";
    // The text takes a quarter of the address space that is allowed then; its copy would take a quarter more.
    constexpr size_t bytes = size_t{1} << 30;
    void *text = mmap(nullptr, bytes, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
    ASSERT_NE(text, MAP_FAILED);
    std::memset(text, 'x', bytes / 16);
    rlimit before{};
    ASSERT_EQ(getrlimit(RLIMIT_AS, &before), 0);
    cu_set_error_1(1, "id", "cat", 1, 1, "small");
    const rlimit little{.rlim_cur = bytes + (bytes >> 5), .rlim_max = before.rlim_max};
    ASSERT_EQ(setrlimit(RLIMIT_AS, &little), 0);
    const int result = cu_set_error_1(9, "id", "cat", 2, 3, static_cast<char *>(text));
    setrlimit(RLIMIT_AS, &before);
    munmap(text, bytes);
    EXPECT_EQ(result, 9);
    const owned_error error = present_error();
    EXPECT_EQ(error->cu_error_id, 9);
    EXPECT_EQ(error->cu_msg_set, 2);
    EXPECT_EQ(error->cu_msg_num, 3);
    EXPECT_EQ(error->cu_msg_default, nullptr);
}

// Destroyed late in the end of a thread, when the record may already have been released once.
struct late_user {
    std::atomic<int> *seen;
    ~late_user()
    {
        cu_set_error_1(21, nullptr, nullptr, 1, 1, "late %s", "use");
        *seen = id_of_present_error();
    }
};

TEST(ErrorRecord, CanBeUsedByDestructorsOfThreadVariables)
{
    std::atomic<int> seen{0};
    std::thread([&] {
        thread_local late_user user{&seen};
        EXPECT_EQ(user.seen, &seen);
        cu_set_error_1(20, nullptr, nullptr, 1, 1, "early");
    }).join();
    EXPECT_EQ(seen, 21);
}

void set_late_error(void *seen)
{
    cu_set_error_1(22, nullptr, nullptr, 1, 1, "later %s", "still");
    *static_cast<std::atomic<int> *>(seen) = id_of_present_error();
}

TEST(ErrorRecord, CanBeUsedByDestructorsOfThreadSpecificKeys)
{
    cu_set_error_1(1, nullptr, nullptr, 1, 1, "so that the library's own key is the older one");
    pthread_key_t key;
    ASSERT_EQ(pthread_key_create(&key, set_late_error), 0);
    std::atomic<int> seen{0};
    std::thread([&] {
        cu_set_error_1(20, nullptr, nullptr, 1, 1, "early");
        pthread_setspecific(key, &seen);
    }).join();
    EXPECT_EQ(seen, 22);
    pthread_key_delete(key);
}

void print_late_error()
{
    cu_set_error_1(23, nullptr, nullptr, 1, 1, "at the %s", "end");
    std::fprintf(stderr, "%s", message_of(*present_error()).c_str());
}

TEST(ErrorRecord, CanBeUsedByExitHandlers)
{
    const auto leave = [] {
        cu_set_error_1(1, nullptr, nullptr, 1, 1, "early");
        std::atexit(print_late_error);
        std::exit(0);
    };
    EXPECT_EXIT(leave(), testing::ExitedWithCode(0), "at the end");
}

void *raise_for_ever(void *started)
{
    for (int i = 1;; ++i) {
        cu_set_error_1(i, "id", "cat", 1, 1, "number %d of %s", i, "many");
        present_error();
        static_cast<std::atomic<bool> *>(started)->store(true);
        pthread_testcancel();
    }
    return nullptr;
}

TEST(ErrorRecord, ACancelledThreadEndsCleanly)
{
    std::atomic<bool> started{false};
    pthread_t thread;
    ASSERT_EQ(pthread_create(&thread, nullptr, raise_for_ever, &started), 0);
    while (!started) std::this_thread::yield();
    pthread_cancel(thread);
    void *result = nullptr;
    ASSERT_EQ(pthread_join(thread, &result), 0);
    EXPECT_EQ(result, PTHREAD_CANCELED);
}

TEST(ErrorRecord, NoneOfItsCallsIsACancellationPoint)
{
    std::thread([] {
        pthread_cancel(pthread_self()); // pending from here on
        EXPECT_EQ(cu_set_error_1(4, nullptr, "no-such.cat", 1, 1, "still %s", "here"), 4);
        EXPECT_EQ(message_of(*present_error()), "still here");
        cu_cluster_info_t info;
        cu_get_cluster_info_1(&info);
        char arguments[16];
        EXPECT_EQ(cu_get_proc_args_1(getpid(), arguments, sizeof arguments), 0);
        pthread_setcancelstate(PTHREAD_CANCEL_DISABLE, nullptr); // let the thread object end in peace
    }).join();
}

TEST(ErrorRecord, ThreadsRaiseErrorsSideBySide)
{
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
        threads.emplace_back([t] {
            for (int i = 0; i < 500; ++i) {
                const int id = t * 1000 + i + 1;
                cu_set_error_1(id, nullptr, nullptr, 1, 1, "%d/%d", t, i);
                const owned_error error = present_error();
                EXPECT_EQ(error->cu_error_id, id);
                EXPECT_EQ(message_of(*error), std::to_string(t) + "/" + std::to_string(i));
            }
        });
    for (std::thread &thread : threads) thread.join();
}
} // namespace
