// A producer is a program that records as fast as it can into one system: the floor, this library, or another tracer.
// All producers share this loop and its options; a system states only how it is opened and how it records.
//
//   class some_system
//   {
//   public:
//       static void add_options(CLI::App &app, options &all);   // what only this system has
//       explicit some_system(const options &all);               // opens it; exits with a message when that fails
//       template <kind K> void write(unsigned thread);          // one record
//   };
//   int main(int argc, char **argv) { return qn::bench::produce<some_system>(argc, argv); }
//
// Each system has a process of its own: an allocator, threads and locks that belong to it alone, a CPU time that the
// kernel sums, and a death that it can be asked to survive. The result is one line of JSON.
#pragma once

#include <array>
#include <csignal>
#include <cstddef>
#include <cstdint>
#include <string>

#include <CLI/CLI.hpp>

#include "bench/producers/recording_loop.h"

namespace qn::bench
{
// What the records of the kinds hold, in every system the same.
inline constexpr unsigned record_id = 7;
inline constexpr std::uint64_t first_value = 0x0123456789abcdef, second_value = 42;
inline constexpr const char *string_of_32 = "0123456789abcdef0123456789abcdef";
inline constexpr const char *format = "%d of %d";
inline constexpr int first_number = 12, second_number = 345;
inline constexpr std::array<char, 64> block{'b', 'l', 'o', 'c', 'k'};

template <class System>
int produce(int argc, char **argv)
{
    options all;
    CLI::App app("Records as fast as it can, and tells what a record cost.");
    add_common_options(app, all);
    System::add_options(app, all);
    CLI11_PARSE(app, argc, argv);

    System system(all);
    // The kinds are template arguments, so that a record is written by the call that a client would make.
    static constexpr auto loops = [] {
        std::array<recording_loop, kinds.size()> loops{};
        loops[index_of(kind::id)] = &run_loop<System, kind::id>;
        loops[index_of(kind::values)] = &run_loop<System, kind::values>;
        loops[index_of(kind::string)] = &run_loop<System, kind::string>;
        loops[index_of(kind::formatted)] = &run_loop<System, kind::formatted>;
        loops[index_of(kind::data)] = &run_loop<System, kind::data>;
        loops[index_of(kind::disabled)] = &run_loop<System, kind::disabled>;
        return loops;
    }();
    const std::string result = measure(all, loops[index_of(all.record)], &system);
    std::printf("%s\n", result.c_str());
    std::fflush(stdout);
    if (all.die) std::raise(SIGKILL);
    return 0;
}
} // namespace qn::bench
