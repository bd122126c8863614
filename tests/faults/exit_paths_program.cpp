// A program that traces until its very end, and ends as it is told:
//
//   exit_paths_program HOW TRACE-FILE STORY-FILE
#include "faults/exit_paths.h"

#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <pthread.h>
#include <string>
#include <string_view>
#include <sys/mman.h>
#include <sys/resource.h>
#include <thread>
#include <unistd.h>

#include <qn_tr.h>

#include "recording/numbered_records.h"

namespace
{
using namespace qn::test;

exit_story *story = nullptr;

void write_next(uint32_t writer)
{
    const uint32_t number = story->returned[writer];
    story->status |= static_cast<uint32_t>(write_numbered({exit_run, writer}, number));
    story->returned[writer] = number + 1;
}

void write_some(uint32_t writer)
{
    for (uint32_t i = 0; i < records_of_handler; ++i) write_next(writer);
}

struct tracing_destructor {
    uint32_t writer;
    explicit tracing_destructor(uint32_t who) : writer(who) {}
    ~tracing_destructor() { write_some(writer); }
};

void trace_while_the_process_lives()
{
    for (uint32_t worker = 0; worker < exit_writer::workers; ++worker)
        std::thread([=] {
            for (;; usleep(200)) write_next(worker);
        }).detach();
    for (uint32_t worker = 0; worker < exit_writer::workers; ++worker)
        while (story->returned[worker] == 0) std::this_thread::yield();
}

void note_the_end()
{
    for (uint32_t writer = 0; writer < exit_writer::count; ++writer)
        story->returned_before_end[writer] = story->returned[writer];
}

[[noreturn]] void wait_for_the_end()
{
    for (;;) pause();
}

int end(std::string_view how)
{
    note_the_end();
    if (how == "exit") std::exit(0);
    if (how == "exit_in_a_thread") {
        std::thread([] { std::exit(0); }).detach();
        wait_for_the_end();
    }
    if (how == "end_of_the_main_thread") {
        std::thread([] {
            usleep(10000); // the main thread ends first
            std::exit(0);
        }).detach();
        pthread_exit(nullptr);
    }
    if (how == "quick_exit") std::quick_exit(0);
    if (how == "_exit") _exit(0);
    if (how == "abort") std::abort();
    if (how == "tr_term") {
        tr_term();
        const uint32_t calls = story->returned[0];
        while (story->returned[0] < calls + 10) std::this_thread::yield();
        tr_term();
    }
    return 0; // "return"
}
} // namespace

int main(int, char **arguments)
{
    alarm(60);
    const rlimit no_core{0, 0};
    setrlimit(RLIMIT_CORE, &no_core);
    const int fd = open(arguments[3], O_RDWR | O_CLOEXEC);
    void *memory = mmap(nullptr, sizeof(exit_story), PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
    close(fd);
    if (memory == MAP_FAILED) return 1;
    story = static_cast<exit_story *>(memory);

    static const tracing_destructor static_object(exit_writer::static_object);
    std::atexit([] { write_some(exit_writer::earlier_handler); });
    static tr_detail_level_t levels[1];
    static const tr_category_description_t categories[1] = {{0, "c0", 1, 1}};
    story->status |= static_cast<uint32_t>(tr_set_filename_1(arguments[2]));
    story->status |= static_cast<uint32_t>(tr_register_component_1("EXIT", levels, categories, 1));
    std::atexit([] { write_some(exit_writer::later_handler); });
    thread_local const tracing_destructor thread_object(exit_writer::thread_object);
    if (thread_object.writer != exit_writer::thread_object) return 1; // made by its first use

    write_some(exit_writer::main);
    trace_while_the_process_lives();
    return end(arguments[1]);
}
