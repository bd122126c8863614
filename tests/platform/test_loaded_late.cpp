// The library as a plug-in brings it: by dlopen(), with threads that were there before.
#include <cstdlib>
#include <dlfcn.h>
#include <sys/resource.h>
#include <thread>
#include <unistd.h>

#include <gtest/gtest.h>
#include <qn_cu.h>

#include "instrumented.h"

namespace
{
// From now on there is none to be had, neither from the system nor of what was released before.
void use_up_memory()
{
    const rlimit nothing{.rlim_cur = 1, .rlim_max = 1};
    setrlimit(RLIMIT_AS, &nothing);
    for (size_t size = size_t{1} << 20; size != 0; size /= 2)
        while (true) {
            void *volatile piece = std::malloc(size);
            if (piece == nullptr) break;
        }
}

[[noreturn]] void empty_record_without_memory()
{
    void *const library = dlopen(QN_CU_LIBRARY, RTLD_NOW);
    if (library == nullptr) _exit(2);
    const auto set_no_error = reinterpret_cast<decltype(&cu_set_no_error_1)>(dlsym(library, "cu_set_no_error_1"));
    if (set_no_error == nullptr) _exit(3);
    std::thread([set_no_error] {
        use_up_memory();
        _exit(set_no_error() == 0 ? 0 : 4);
    }).join();
    _exit(5);
}

TEST(LoadedLate, AThreadsFirstUseOfItsErrorRecordNeedsNoMemory)
{
    if (instrumented) GTEST_SKIP() << "a sanitizer ends the program when memory is exhausted";
    EXPECT_EXIT(empty_record_without_memory(), testing::ExitedWithCode(0), "");
}
} // namespace
