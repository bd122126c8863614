// What the program of exit paths tells its test, in a file that both map.
#pragma once

#include <atomic>
#include <cstdint>

namespace qn::test
{
// Who writes in that program: as the threads of a record_author.
namespace exit_writer
{
inline constexpr uint32_t workers = 4; // 0 to 3 write as long as the process lives
inline constexpr uint32_t main = 4;
inline constexpr uint32_t static_object = 5;   // its destructor, of an object made before the library was initialised
inline constexpr uint32_t thread_object = 6;   // the destructor of an object of the main thread
inline constexpr uint32_t earlier_handler = 7; // registered before the library's own
inline constexpr uint32_t later_handler = 8;
inline constexpr uint32_t count = 9;
} // namespace exit_writer

inline constexpr uint32_t exit_run = 1;           // of every author
inline constexpr uint32_t records_of_handler = 5; // and of every destructor, and of main

struct exit_story {
    std::atomic<uint32_t> status;                       // or-ed together of all calls
    std::atomic<uint32_t> returned[exit_writer::count]; // calls
    uint32_t returned_before_end[exit_writer::count];   // when the process began to end
};
} // namespace qn::test
