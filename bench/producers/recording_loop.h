// The loop that every producer runs, its options and its result.
#pragma once

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include <x86intrin.h>

namespace CLI
{
class App;
}

namespace qn::bench
{
// disabled: a trace point whose category is off; the loop around it alone, for a system without such a thing.
enum class kind { id, values, string, formatted, data, disabled };

inline constexpr std::array<std::string_view, 6> kinds{"id", "values", "string", "formatted", "data", "disabled"};

constexpr std::size_t index_of(kind which) { return static_cast<std::size_t>(which); }

struct options {
    std::string folder; // for the system's files; made by the caller
    kind record = kind::values;
    unsigned threads = 1;
    unsigned idle_threads = 1; // that do nothing: a process with one thread pays less for its locks
    double visit_us = 0;       // one more thread writes a record now and then, after such a pause; not counted. 0: none
    std::uint64_t records = 0; // of each thread; 0: until the time is up
    double seconds = 0.2;
    std::uint64_t warm_up = 100000; // records of each thread before the measured ones
    std::uint64_t burst = 256;      // records between two looks at the time
    double pause_us = 0;            // after each burst; not part of what a record costs
    bool latency = false;           // time every single record
    bool die = false;               // by SIGKILL, at once when all is written
    std::uint64_t ring = 1 << 20;   // bytes
    // of this library alone
    unsigned files = 1;                                       // threads are spread over them
    unsigned anchors = 0, components = 0, specifications = 0; // that are there beside the ones in use
    unsigned pages = 0; // a page set whose pages are copied while records are written
    // of spdlog alone
    std::string sink = "file";
};

void add_common_options(CLI::App &app, options &all);

// What one thread did.
class thread_result
{
public:
    // Latencies up to this many ticks are counted one by one.
    static constexpr std::size_t single_ticks = 1 << 16;

    void add(std::uint64_t ticks)
    {
        if (ticks < single_ticks)
            ++counts_[ticks];
        else
            add_long(ticks);
    }

    std::uint64_t records = 0;
    std::uint64_t ticks = 0; // of the bursts
    const std::array<std::uint32_t, single_ticks> &counts() const { return counts_; }
    const std::array<std::uint64_t, 64> &powers() const { return powers_; }
    std::uint64_t longest() const;

private:
    void add_long(std::uint64_t ticks);

    std::array<std::uint32_t, single_ticks> counts_{};
    std::array<std::uint64_t, 64> powers_{}; // longer ones, by the power of two below them
    std::uint64_t longest_ = 0;              // of those not counted one by one
};

struct thread_order {
    void *system;
    unsigned thread;
    std::uint64_t records; // 0: until `stop`
    std::uint64_t burst;
    double pause_us;
    bool latency;
    const std::atomic<bool> *stop;
};

using recording_loop = void (*)(const thread_order &, thread_result &);

void pause_for(double microseconds);

template <class System, kind K>
void run_loop(const thread_order &order, thread_result &result)
{
    System &system = *static_cast<System *>(order.system);
    const unsigned thread = order.thread;
    std::uint64_t left = order.records;
    while (order.records != 0 ? left > 0 : !order.stop->load(std::memory_order_relaxed)) {
        const std::uint64_t burst = order.records != 0 && left < order.burst ? left : order.burst;
        const std::uint64_t begin = __rdtsc();
        if (order.latency) {
            for (std::uint64_t i = 0; i < burst; ++i) {
                const std::uint64_t before = __rdtsc();
                system.template write<K>(thread);
                result.add(__rdtsc() - before);
            }
        } else {
            for (std::uint64_t i = 0; i < burst; ++i) system.template write<K>(thread);
        }
        result.ticks += __rdtsc() - begin;
        result.records += burst;
        left -= burst;
        if (order.pause_us > 0) pause_for(order.pause_us);
    }
}

// Runs the loop in its threads, after a warm-up; the result as a line of JSON.
std::string measure(const options &all, recording_loop loop, void *system);
} // namespace qn::bench
