// Nothing of the program's memory gets into a file but what it recorded: heap, stack and registers of a program are
// filled with a pattern before every call, and then with another one, while its clocks, its counter and its process id
// stand still. The pattern is in none of its files, and the files of both turns are the same to the byte.
#include <algorithm>
#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <functional>
#include <map>
#include <string>
#include <sys/time.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

#include <gtest/gtest.h>

#include "faults/campaign.h"
#include "faults/poisoned_memory.h"
#include "faults/program.h"
#include "recording/counter_stand_ins.h"
#include "recording/writers.h"
#include "support/scratch.h"
#include "trace/trace.h"

namespace
{
std::atomic<qn_uint64_t> ticks{1000};
std::atomic<suseconds_t> microseconds{0}; // that the clock has been asked for
} // namespace

// The program's own counter, clock, process id and command.
extern "C" {
void cu_get_ctr_1(qn_uint64_t *counter)
{
    const qn_uint64_t now = ++ticks;
    std::memcpy(counter, &now, sizeof now);
}

int gettimeofday(timeval *now, void *) noexcept
{
    *now = {1700000000, ++microseconds};
    return 0;
}

pid_t getpid(void) noexcept { return 4711; }

int cu_get_proc_args_1(pid_t, char *buffer, size_t size)
{
    std::snprintf(buffer, size, "/usr/bin/program");
    return 0;
}
}

namespace
{
using namespace qn::test;

constexpr uint32_t most_bytes = 70; // of what is recorded in all lengths
constexpr qn_uint32_t id = 17;

// Every call of the library is made through here.
template <class Call>
void call(Call what)
{
    with_poisoned_stack([&] { what(); });
}

std::string text_of(uint32_t length) { return std::string(length, 's'); }

void write_texts(const char *component)
{
    for (uint32_t length = 0; length <= most_bytes; ++length) {
        const std::string text = text_of(length);
        call([&] { tr_record_string_1(component, text.c_str()); });
        call([&] { tr_record_strings_1(component, id, 3, "a", text.c_str(), "bc"); });
        call([&] { tr_record_fmt_string_1(component, id, "%s", text.c_str()); });
        call([&] { tr_record_printf_1(component, "%*d", static_cast<int>(length), 5); });
    }
    for (const uint32_t length : {1000U, 1023U, 1024U, 3000U, 3960U, 3961U, 9000U}) {
        const std::string text = text_of(length);
        call([&] { tr_record_strings_1(component, id, 2, text.c_str(), "behind"); });
        call([&] { tr_record_fmt_string_1(component, id, "%s", text.c_str()); });
    }
    call([&] { tr_record_strings_1(component, id, 1, static_cast<const char *>(nullptr)); });
}

void write_data(const char *component)
{
    const std::string bytes(10000, 'd');
    for (uint32_t length = 0; length <= most_bytes; ++length) {
        call([&] { tr_record_data_1(component, id, 1, bytes.data(), length); });
        call([&] { tr_record_data_1(component, id, 3, bytes.data(), 1, bytes.data(), length, bytes.data(), 3); });
    }
    call([&] { tr_record_data_1(component, id, 0); });
    call([&] { tr_record_data_1(component, id, 0xFFFFFFFF); });
    call([&] { tr_record_data_1(component, id, 2, bytes.data(), 5, bytes.data(), 10000); });
    call([&] { tr_record_data_1(component, id, 2, bytes.data(), 5, static_cast<const char *>(nullptr), 5); });
}

void write_values(const char *component)
{
    for (qn_uint32_t number = 0; number <= 12; ++number) {
        call([&] { tr_record_values_32_1(component, id, number, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12); });
        call([&] {
            tr_record_values_64_1(component, id, number, 1LL, 2LL, 3LL, 4LL, 5LL, 6LL, 7LL, 8LL, 9LL, 10LL, 11LL, 12LL);
        });
    }
}

// An argument in memory that nobody cleared, as in a client.
cu_error_arg_t argument_of(cu_error_arg_type_t type, const std::string &text)
{
    auto *memory = static_cast<cu_error_arg_t *>(std::malloc(sizeof(cu_error_arg_t)));
    memory->cu_arg_type = type;
    switch (type) {
    case CU_ERROR_ARG_INT: memory->cu_arg_value.cu_int = -5; break;
    case CU_ERROR_ARG_LONG: memory->cu_arg_value.cu_long = 6; break;
    case CU_ERROR_ARG_LONG_LONG: memory->cu_arg_value.cu_long_long = 7; break;
    case CU_ERROR_ARG_DOUBLE: memory->cu_arg_value.cu_double = 0.5; break;
    case CU_ERROR_ARG_CHAR_STR:
        memory->cu_arg_value.cu_char_str = text.empty() ? nullptr : const_cast<char *>(text.c_str());
        break;
    default: memory->cu_arg_value.cu_void_ptr = nullptr; break;
    }
    const cu_error_arg_t argument = *memory;
    std::free(memory);
    return argument;
}

void write_errors(const char *component)
{
    for (uint32_t length = 0; length <= most_bytes; ++length) {
        const std::string text = text_of(length);
        std::vector<cu_error_arg_t> arguments;
        for (const auto type : {CU_ERROR_ARG_INT, CU_ERROR_ARG_LONG, CU_ERROR_ARG_LONG_LONG, CU_ERROR_ARG_DOUBLE,
                                CU_ERROR_ARG_CHAR_STR, CU_ERROR_ARG_VOID_PTR})
            arguments.push_back(argument_of(type, text));
        cu_error_t error = *sample_error();
        error.cu_msg_default = const_cast<char *>(text.c_str());
        error.cu_args = arguments.data();
        error.cu_arg_cnt = static_cast<unsigned>(length % (arguments.size() + 1));
        cu_error_t *given = &error;
        call([&] { tr_record_error_1(component, id, text.c_str(), 5, length % 2 == 0 ? nullptr : "file", &given); });
    }
    call([&] { tr_set_trace_levels_1("no specification"); });
    call([&] { tr_record_error_1(component, id, nullptr, 5, nullptr, nullptr); }); // that of the call before
}

void write_everything()
{
    for (const char *component : {"A", "AB", "ABC", "COMP"}) {
        for (const writer_call &writer : all_writers()) call([&] { writer.write(component, nullptr); });
        write_texts(component);
        write_data(component);
        write_values(component);
        write_errors(component);
    }
    call([] { __time_calibration(&anchors); });
}

void name(const std::string &file)
{
    call([&] { tr_set_filename_1(file.c_str()); });
}

// A file of its own, gone round many times; made larger, damaged, and continued behind headers of several versions.
void record_into_single_file(const std::string &folder)
{
    prepared(folder);
    call([] { component().register_now(); });
    name(files().trace);
    write_everything();
    name("");
    call([] { tr_set_file_size_1(files().trace.c_str(), 5 * program_file_bytes); });
    name(files().trace);
    write_everything();
    call([] { tr_set_file_map_1(files().mapped.c_str(), "COMP:c1"); });
    call([] { tr_ms_record_strings_1("COMP", id, component().tokens[1], 1, "mapped"); });
    anchors.pNextFree->length = 0; // the ring is damaged: the file is put aside, and begun afresh
    write_everything();
    call([] { tr_flush_1(); });
    name("");
    for (const char version : {6, 5, 4, 3}) {
        std::string bytes = file_bytes(files().trace);
        bytes[2] = version;
        write_file(files().trace, bytes);
        call([] { tr_core_event_1(files().trace.c_str(), "it crashed"); });
        name(files().trace);
        call([&] { write_ids(0, 5); });
        name("");
    }
}

// Pages that are copied, and pages that are written anew before they could be.
void record_into_pages(const std::string &folder)
{
    call([&] { with_page_set(folder); });
    name(files().trace);
    for (qn_uint32_t i = 0; i < 30; ++i) {
        call([&] { write_ids(i, 150); });
        wait_for_queue();
    }
    pthread_mutex_lock(&spq.mutex); // no copies
    write_everything();
    pthread_mutex_unlock(&spq.mutex);
    wait_for_queue();
    name("");
}

void copy_files(const std::string &folder)
{
    call([&] { with_file_to_copy(folder); });
    for (int i = 0; i < 3; ++i) {
        call([] { tr_copy_file_1(files().destination.c_str(), files().copied.c_str(), 0); });
        wait_for_queue();
    }
}

using folder_contents = std::map<std::string, std::string>;

folder_contents contents_of(const std::string &folder)
{
    folder_contents contents;
    for (const auto &entry : std::filesystem::recursive_directory_iterator(folder))
        if (entry.is_regular_file()) contents[entry.path()] = file_bytes(entry.path());
    return contents;
}

// What the program leaves in the folder, which is empty again when it is known.
folder_contents left_by(const std::function<void(const std::string &)> &program, const std::string &folder, poison with)
{
    const pid_t child = fork();
    if (child == 0) {
        alarm(most_seconds);
        set_clock(1700000000);
        poison_memory(with);
        // The C library gives the stack of a thread that has ended to the next one, the spool thread.
        std::thread([] { with_poisoned_stack([] {}); }).join();
        setenv("POISON", std::string(poison_pattern()).c_str(), 1);
        program(folder);
        _exit(0);
    }
    int status = 0;
    EXPECT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
    folder_contents contents = contents_of(folder);
    for (const auto &entry : std::filesystem::directory_iterator(folder)) std::filesystem::remove_all(entry.path());
    return contents;
}

struct leaks {
    std::string names; // of the files that were looked at
    std::string bytes; // and what is in them
    std::string pattern_in;
    std::string differs_in;
};

// What one run's file has and the other's has not in the same place. The patterns differ in every byte, so all that is
// left of one stays; three bytes of an address that happen to look like it are the same in both runs.
std::string only_in(std::string bytes, const std::string &other)
{
    for (size_t i = 0; i < std::min(bytes.size(), other.size()); ++i)
        if (bytes[i] == other[i]) bytes[i] = 0;
    return bytes;
}

leaks find_leaks(const std::function<void(const std::string &)> &program)
{
    const scratch folder(memory_folder());
    const folder_contents one = left_by(program, folder.folder(), poison::one);
    const folder_contents other = left_by(program, folder.folder(), poison::other);
    EXPECT_EQ(one.size(), other.size());
    leaks found;
    for (const auto &[file, bytes] : one) {
        found.names += file + "\n";
        found.bytes += bytes;
        const auto its_other = other.find(file);
        const size_t at = find_poison(its_other == other.end() ? bytes : only_in(bytes, its_other->second));
        if (at != std::string::npos) found.pattern_in += file + " at " + std::to_string(at) + "\n";
        if (its_other == other.end()) {
            found.differs_in += file + " is not there\n";
        } else if (its_other->second != bytes) {
            const auto differ =
                std::mismatch(bytes.begin(), bytes.end(), its_other->second.begin(), its_other->second.end());
            found.differs_in += file + " at " + std::to_string(differ.first - bytes.begin()) + "\n";
        }
    }
    return found;
}

// `name` and `text` are of what the program has come to, if it did all that it was to do.
void expect_no_leak(const std::function<void(const std::string &)> &program, const char *name, const char *text)
{
    const leaks found = find_leaks(program);
    EXPECT_NE(found.names.find(name), std::string::npos) << found.names;
    EXPECT_NE(found.bytes.find(text), std::string::npos);
    EXPECT_EQ(found.pattern_in, "");
    EXPECT_EQ(found.differs_in, "");
    count("Stale bytes of heap and stack", "rounds", 1);
    count("Stale bytes of heap and stack", "executions", 2);
}

TEST(StaleBytes, AreInNoTraceFile) { expect_no_leak(record_into_single_file, "/app.trc.save", "it crashed"); }
TEST(StaleBytes, AreInNoPageAndNoCopyOfOne)
{
    expect_no_leak(record_into_pages, "/program/app.trc.4.sp.", " consecutive times");
}
TEST(StaleBytes, AreInNoCopyOfAFile) { expect_no_leak(copy_files, "/to/from.", "xxxx"); }

// What a client itself leaves between the members of its structure.
TEST(PlantedLeak, OfPaddingIsFound)
{
    const leaks found = find_leaks([](const std::string &folder) {
        struct padded {
            char first;
            long second;
        };
        running(folder);
        auto *memory = static_cast<padded *>(std::malloc(sizeof(padded)));
        memory->first = 'f';
        memory->second = 5;
        tr_record_data_1("COMP", id, 1, memory, static_cast<int>(sizeof(padded)));
        unname_it(folder);
    });
    EXPECT_NE(found.pattern_in, "");
    EXPECT_NE(found.differs_in, "");
    count("Planted harm is found", "rounds", 1);
}

TEST(PlantedLeak, OfOneByteIsFound)
{
    const leaks found = find_leaks([](const std::string &folder) {
        running(folder);
        const void *volatile memory = std::malloc(1);
        tr_record_data_1("COMP", id, 1, memory, 1);
        unname_it(folder);
    });
    EXPECT_NE(found.differs_in, "");
    count("Planted harm is found", "rounds", 1);
}
} // namespace
