// What a writer does not do: allocate memory, or call the system.
#include <atomic>
#include <cerrno>
#include <cstddef>
#include <cstdlib>
#include <iterator>
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "recording/one_trace.h"
#include "recording/writers.h"
#include "trace/trace.h"

using namespace qn::test;

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
#define QN_TEST_SANITIZED 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
#define QN_TEST_SANITIZED 1
#endif
#endif

#ifndef QN_TEST_SANITIZED
namespace
{
std::atomic<bool> counting{false};
std::atomic<int> allocations{0};
} // namespace

extern "C" {
void *__libc_malloc(size_t size) noexcept;
void *__libc_calloc(size_t count, size_t size) noexcept;
void *__libc_realloc(void *block, size_t size) noexcept;

void *malloc(size_t size) noexcept
{
    if (counting) ++allocations;
    return __libc_malloc(size);
}
void *calloc(size_t count, size_t size) noexcept
{
    if (counting) ++allocations;
    return __libc_calloc(count, size);
}
void *realloc(void *block, size_t size) noexcept
{
    if (counting) ++allocations;
    return __libc_realloc(block, size);
}
}

TEST(EveryWriter, AllocatesNoMemory)
{
    const one_trace trace(4096);
    for (const writer_call &writer : all_writers()) {
        SCOPED_TRACE(writer.name);
        qn_int32_t status = 0;
        counting = true;
        for (int i = 0; i < 200; ++i) status |= writer.write("COMP", nullptr); // round the ring, too
        counting = false;
        EXPECT_EQ(status, 0);
        EXPECT_EQ(allocations, 0);
    }
}

namespace
{
// Has the kernel kill the process for any system call but exit.
bool forbid_system_calls()
{
    sock_filter program[] = {
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, nr)),
        BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, SYS_exit, 0, 1),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_KILL_PROCESS),
    };
    const sock_fprog filter{std::size(program), program};
    return prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0 && prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &filter) == 0;
}
} // namespace

TEST(EveryWriter, MakesNoSystemCall)
{
    const scratch folder;
    for (const writer_call &writer : all_writers()) {
        SCOPED_TRACE(writer.name);
        const std::string file = folder / writer.name;
        const pid_t child = fork();
        if (child == 0) {
            setenv("QN_TR_SIZE", "4096", 1);
            client component("TEST");
            qn_int32_t status = tr_set_filename_1(file.c_str()) | component.register_now();
            status |= writer.write("WARM", nullptr); // what is done once is done
            if (!forbid_system_calls()) _exit(77);
            for (int i = 0; i < 200; ++i) status |= writer.write("COMP", nullptr);
            syscall(SYS_exit, status); // the only way out that is left
        }
        int status = -1;
        ASSERT_EQ(waitpid(child, &status, 0), child);
        if (WIFEXITED(status) && WEXITSTATUS(status) == 77) GTEST_SKIP() << "this kernel filters no system calls";
        ASSERT_EQ(status, 0);
        const auto records = trace_image::of_file(file).records();
        ASSERT_FALSE(records.empty());
        EXPECT_EQ(records.back().component(), "COMP");
    }
}
#else
TEST(EveryWriter, CostsNoMoreThanACopy) { GTEST_SKIP() << "the sanitizers allocate and call the system themselves"; }
#endif
