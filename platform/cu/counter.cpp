// The counter that stamps records: the processor's time-stamp counter, or CLOCK_MONOTONIC.
//
// The time-stamp counter is used when it runs at one rate in every power state (the processor says so), when it
// is the same on every processor (the kernel watches that, and lists "tsc" among its clock sources only while
// it holds; the source in use may be another, such as a hypervisor's clock), and when this process may read it.
// Where any of this cannot be found out the clock serves: slower, but never wrong.
//
// No lock: the choice is one atomic word, constant-initialised, so that a call before the constructors of this
// library finds it undecided and decides. Threads that decide at the same time agree on the first one's choice.
#include "platform/cu/counter.h"

#include <algorithm>
#include <atomic>
#include <cpuid.h>
#include <cstring>
#include <ctime>
#include <string_view>
#include <sys/prctl.h>
#include <x86intrin.h>

#include <qn_cu.h>

#include "platform/common/files.h"

namespace qn::cu
{
namespace
{
constexpr const char *trusted_sources = "/sys/devices/system/clocksource/clocksource0/available_clocksource";
constexpr const char *present_source = "/sys/devices/system/clocksource/clocksource0/current_clocksource";

constinit std::atomic<counter_source> chosen{counter_source::undecided};

bool rate_is_invariant()
{
    constexpr unsigned power_management_leaf = 0x80000007;
    constexpr unsigned invariant_tsc = 1U << 8;
    unsigned eax, ebx, ecx, edx;
    return __get_cpuid(power_management_leaf, &eax, &ebx, &ecx, &edx) != 0 && (edx & invariant_tsc) != 0;
}

bool process_may_read_tsc()
{
    int state = 0;
    return prctl(PR_GET_TSC, &state) == 0 && state == PR_TSC_ENABLE;
}

// True when the file holds the word "tsc" ("tsc-early" is another word).
bool names_tsc(const char *path)
{
    char text[256];
    size_t length = 0;
    if (platform::read_file(path, text, &length) != 0) return false;
    std::string_view words(text, length);
    while (!words.empty()) {
        const size_t end = std::min(words.find_first_of(" \n"), words.size());
        if (words.substr(0, end) == "tsc") return true;
        words.remove_prefix(std::min(end + 1, words.size()));
    }
    return false;
}

uint64_t monotonic_ns()
{
    timespec now{};
    clock_gettime(CLOCK_MONOTONIC, &now);
    return static_cast<uint64_t>(now.tv_sec) * 1'000'000'000U + static_cast<uint64_t>(now.tv_nsec);
}

counter_source decide()
{
    const bool tsc = rate_is_invariant() && process_may_read_tsc() && names_tsc(trusted_sources);
    counter_source first = counter_source::undecided;
    chosen.compare_exchange_strong(first, tsc ? counter_source::time_stamp_counter : counter_source::monotonic_clock);
    return chosen.load(std::memory_order_relaxed);
}

[[gnu::noinline, gnu::cold]] uint64_t read_otherwise()
{
    return source_of_counter() == counter_source::time_stamp_counter ? __rdtsc() : monotonic_ns();
}

// Reading the files takes some 20 microseconds, better spent here than in the first record.
[[gnu::constructor]] void decide_at_load() { decide(); }
} // namespace

counter_source source_of_counter()
{
    const counter_source known = chosen.load(std::memory_order_relaxed);
    return known != counter_source::undecided ? known : decide();
}

bool kernel_keeps_time_by_tsc() { return names_tsc(present_source); }
} // namespace qn::cu

void cu_get_ctr_1(qn_uint64_t *ctr)
{
    using namespace qn::cu;
    const bool tsc = chosen.load(std::memory_order_relaxed) == counter_source::time_stamp_counter;
    const uint64_t now = __builtin_expect(tsc, 1) ? __rdtsc() : read_otherwise();
    std::memcpy(ctr, &now, sizeof now);
}
