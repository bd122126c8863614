// Failure identifiers. The running number is an atomic, there is nothing else to guard.
//
// Host, time and process make identifiers differ between hosts and processes, the running number within a
// process and a nanosecond. A process id has at most 22 bits, which leaves 10 for the number.
#include "platform/ffdc/failure_id.h"

#include <atomic>
#include <cinttypes>
#include <climits>
#include <cstdio>
#include <ctime>
#include <string_view>
#include <unistd.h>

#include "platform/common/machine_id.h"

namespace qn::ffdc
{
namespace
{
constexpr unsigned number_bits = 10;

constinit std::atomic<uint32_t> running_number{0};

// FNV-1a: any number that differs between host names will do.
uint64_t hash(std::string_view text)
{
    uint64_t value = 0xcbf29ce484222325U;
    for (const char character : text) value = (value ^ static_cast<unsigned char>(character)) * 0x100000001b3U;
    return value;
}

uint64_t host_number()
{
    uint64_t number = 0;
    if (platform::read_machine_id(&number) == 0) return number;
    char text[HOST_NAME_MAX + 1] = {};
    if (gethostname(text, sizeof text - 1) != 0) return 0;
    return hash(text);
}

uint64_t ns_since_epoch()
{
    timespec now{};
    clock_gettime(CLOCK_REALTIME, &now);
    return static_cast<uint64_t>(now.tv_sec) * 1'000'000'000U + static_cast<uint64_t>(now.tv_nsec);
}
} // namespace

void make_failure_id(fc_eid_t &id)
{
    const uint32_t number = running_number.fetch_add(1, std::memory_order_relaxed) & ((1U << number_bits) - 1);
    const uint32_t process = static_cast<uint32_t>(getpid()) << number_bits | number;
    std::snprintf(id, sizeof id, "%016" PRIx64 ".%016" PRIx64 ".%08" PRIx32, host_number(), ns_since_epoch(), process);
}
} // namespace qn::ffdc
