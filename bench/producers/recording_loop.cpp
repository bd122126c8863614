#include "bench/producers/recording_loop.h"

#include <algorithm>
#include <barrier>
#include <bit>
#include <chrono>
#include <memory>
#include <thread>
#include <vector>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>
#include <sys/resource.h>

namespace qn::bench
{
namespace
{
using clock = std::chrono::steady_clock;

// Of all threads, whatever they belong to.
double cpu_seconds()
{
    rusage used{};
    getrusage(RUSAGE_SELF, &used);
    const auto seconds = [](const timeval &time) {
        return static_cast<double>(time.tv_sec) + 1e-6 * static_cast<double>(time.tv_usec);
    };
    return seconds(used.ru_utime) + seconds(used.ru_stime);
}

// The latency that all but the share `beyond` stay within, in ticks.
double percentile(const std::vector<std::unique_ptr<thread_result>> &results, double beyond)
{
    std::uint64_t all = 0;
    for (const auto &each : results) all += each->records;
    auto left = static_cast<std::uint64_t>(static_cast<double>(all) * beyond);
    for (std::size_t power = 64; power-- > 0;) {
        std::uint64_t here = 0;
        for (const auto &each : results) here += each->powers()[power];
        if (here > left) return static_cast<double>(std::uint64_t{1} << power) * 1.5;
        left -= here;
    }
    for (std::size_t ticks = thread_result::single_ticks; ticks-- > 0;) {
        std::uint64_t here = 0;
        for (const auto &each : results) here += each->counts()[ticks];
        if (here > left) return static_cast<double>(ticks);
        left -= here;
    }
    return 0;
}
} // namespace

void add_common_options(CLI::App &app, options &all)
{
    app.add_option("folder", all.folder, "where the system's files go")->required();
    app.add_option_function<std::string>(
           "--kind",
           [&all](const std::string &name) {
               all.record = static_cast<kind>(std::find(kinds.begin(), kinds.end(), name) - kinds.begin());
           },
           "what is recorded")
        ->check(CLI::IsMember(std::vector<std::string>(kinds.begin(), kinds.end())));
    app.add_option("--threads", all.threads, "that record");
    app.add_option("--idle-threads", all.idle_threads, "that do nothing");
    app.add_option("--visit", all.visit_us,
                   "microseconds between the records of one more thread, which are not counted");
    app.add_option("--records", all.records, "of each thread, instead of --seconds");
    app.add_option("--seconds", all.seconds, "how long records are written");
    app.add_option("--warm-up", all.warm_up, "records of each thread before the measured ones");
    app.add_option("--burst", all.burst, "records between two pauses")->check(CLI::PositiveNumber);
    app.add_option("--pause", all.pause_us, "microseconds between two bursts; not counted");
    app.add_flag("--latency", all.latency, "time every single record");
    app.add_flag("--die", all.die, "end by SIGKILL when all is written");
    app.add_option("--ring", all.ring, "bytes of the ring, for systems that have one");
}

void thread_result::add_long(std::uint64_t ticks)
{
    ++powers_[63U - static_cast<unsigned>(std::countl_zero(ticks | 1))];
    longest_ = std::max(longest_, ticks);
}

std::uint64_t thread_result::longest() const
{
    if (longest_ != 0) return longest_;
    std::size_t ticks = single_ticks - 1;
    while (ticks > 0 && counts_[ticks] == 0) --ticks;
    return ticks;
}

void pause_for(double microseconds)
{
    std::this_thread::sleep_for(std::chrono::duration<double, std::micro>(microseconds));
}

std::string measure(const options &all, recording_loop loop, void *system)
{
    std::vector<std::unique_ptr<thread_result>> results;
    for (unsigned i = 0; i < all.threads; ++i) results.push_back(std::make_unique<thread_result>());

    std::atomic<bool> stop = false, idle = true;
    std::vector<std::thread> idle_threads;
    for (unsigned i = 0; i < all.idle_threads; ++i) idle_threads.emplace_back([&idle] { idle.wait(true); });

    std::atomic<bool> no_more_visits = false;
    thread_result visits;
    std::thread visitor;
    if (all.visit_us > 0)
        visitor = std::thread(loop, thread_order{system, all.threads, 0, 1, all.visit_us, false, &no_more_visits},
                              std::ref(visits));

    double cpu_begin = 0;
    std::uint64_t ticks_begin = 0;
    clock::time_point begin;
    const bool in_this_thread = all.threads == 1 && all.records != 0; // a process of one thread stays one
    std::barrier start(static_cast<std::ptrdiff_t>(in_this_thread ? 1 : all.threads + 1), [&]() noexcept {
        cpu_begin = cpu_seconds();
        ticks_begin = __rdtsc();
        begin = clock::now();
    });
    const auto run = [&](unsigned thread) {
        if (all.warm_up != 0) {
            const auto ignored = std::make_unique<thread_result>();
            loop({system, thread, all.warm_up, all.burst, 0, all.latency, &stop}, *ignored);
        }
        start.arrive_and_wait();
        loop({system, thread, all.records, all.burst, all.pause_us, all.latency, &stop}, *results[thread]);
    };
    if (in_this_thread) {
        run(0);
    } else {
        std::vector<std::thread> threads;
        for (unsigned i = 0; i < all.threads; ++i) threads.emplace_back(run, i);
        start.arrive_and_wait();
        if (all.records == 0) {
            std::this_thread::sleep_for(std::chrono::duration<double>(all.seconds));
            stop = true;
        }
        for (std::thread &each : threads) each.join();
    }
    const double cpu = cpu_seconds() - cpu_begin;
    const double elapsed = std::chrono::duration<double>(clock::now() - begin).count();
    const double ns_per_tick = 1e9 * elapsed / static_cast<double>(__rdtsc() - ticks_begin);
    idle = false;
    idle.notify_all();
    for (std::thread &each : idle_threads) each.join();
    no_more_visits = true;
    if (visitor.joinable()) visitor.join();

    nlohmann::ordered_json result;
    std::uint64_t records = 0, ticks = 0;
    for (const auto &each : results) {
        records += each->records;
        ticks += each->ticks;
        result["records_of_threads"].push_back(each->records);
    }
    result["records"] = records;
    result["ns"] = ns_per_tick * static_cast<double>(ticks) / static_cast<double>(records);
    result["cpu_ns"] = 1e9 * cpu / static_cast<double>(records);
    if (all.latency) {
        std::uint64_t longest = 0;
        for (const auto &each : results) longest = std::max(longest, each->longest());
        for (const auto &[name, beyond] : {std::pair{"p50", 0.5}, {"p99", 0.01}, {"p99.9", 0.001}, {"p99.99", 0.0001}})
            result[name] = ns_per_tick * percentile(results, beyond);
        result["longest"] = ns_per_tick * static_cast<double>(longest);
    }
    return result.dump();
}
} // namespace qn::bench
