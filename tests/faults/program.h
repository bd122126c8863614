// The program that is attacked: one component, small files below one folder, and what it does with them.
#pragma once

#include <functional>
#include <string>

#include "support/last_error.h"

namespace qn::test
{
inline constexpr qn_uint32_t program_file_bytes = 8192;
inline constexpr qn_uint32_t large_file_bytes = 6 * 65536; // comes about in several writes
inline constexpr size_t copied_bytes = 300000;

// The names that the calls are made with. They are there before the attack: it is not on the test.
struct program_files {
    std::string trace;
    std::string mapped;      // a second trace file
    std::string copied;      // for tr_copy_file_1
    std::string destination; // of that
    std::string spool;
};
const program_files &files();

// Sets the names, and that nothing comes from the environment or the configuration file of the machine.
void small_files(const std::string &folder);

client &component();

// Each includes what the one before does, and ends the process when that fails.
void prepared(const std::string &folder);
void registered(const std::string &folder);
void running(const std::string &folder); // its trace is started

// Registered, with a page set of four pages to come that are copied.
void with_page_set(const std::string &folder);

// Registered, with a file to copy and a directory for the copy. The spool thread is there before the attack on what it
// does: one that cannot be created is never tried again.
void with_file_to_copy(const std::string &folder);

qn_int32_t name_it(const std::string &);
void unname_it(const std::string &);

// Records of 32 bytes with the ids first, first + 1, ...; the statuses or-ed together.
qn_int32_t write_ids(qn_uint32_t first, qn_uint32_t count);

bool queue_is_empty();

// Until everything is copied.
void wait_for_queue();

inline constexpr unsigned most_seconds = 60; // a process that takes longer hangs

// Runs the body in a process of its own; true when it ended by itself, in time, and had returned true.
bool in_process(const std::function<bool()> &body);
} // namespace qn::test
