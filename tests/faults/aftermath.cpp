#include "faults/aftermath.h"

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <dirent.h>
#include <fstream>
#include <new>
#include <sys/mman.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

#include <gtest/gtest.h>

#include "faults/program.h"
#include "support/last_error.h"
#include "support/scratch.h"
#include "trace/trace.h"

namespace
{
using namespace qn::test;

bool is_free(pthread_mutex_t &mutex)
{
    bool free = false;
    std::thread([&] {
        free = pthread_mutex_trylock(&mutex) == 0;
        if (free) pthread_mutex_unlock(&mutex);
    }).join();
    return free;
}

// The spool thread holds the queue mutex while it works; that passes.
bool gets_free(pthread_mutex_t &mutex)
{
    for (int tries = 0; tries < 1000; ++tries) {
        if (is_free(mutex)) return true;
        usleep(1000);
    }
    return false;
}

uint64_t open_descriptors()
{
    uint64_t count = 0;
    DIR *directory = opendir("/proc/self/fd");
    while (directory != nullptr && readdir(directory) != nullptr) ++count;
    closedir(directory);
    return count;
}

uint64_t mappings_of(const std::string &folder)
{
    std::ifstream maps("/proc/self/maps");
    uint64_t count = 0;
    for (std::string line; std::getline(maps, line);) count += line.find(folder) != std::string::npos;
    return count;
}

void tell_error(aftermath &told)
{
    const error_seen seen = last_error();
    told.recorded = seen.code;
    std::strncpy(told.message, seen.text.c_str(), sizeof told.message - 1);
}
} // namespace

namespace qn::test
{
const char *held_lock()
{
    if (!is_free(anchor_list_mutex)) return "anchor list";
    if (!is_free(component_list_mutex)) return "component list";
    if (!is_free(configuration_file_last_modified_mutex)) return "configuration time";
    if (!is_free(cluster_info_mutex)) return "cluster info";
    if (!gets_free(spq.mutex)) return "spool queue";
    for (trace_anchor_t *anchor = &anchors; anchor != nullptr; anchor = anchor->next) {
        if (!gets_free(anchor->anchorMutex)) return anchor == &anchors ? "global" : "trace file";
        if (anchor->pSpoolMutex != nullptr && !gets_free(*anchor->pSpoolMutex)) return "page set";
    }
    return "";
}

std::string aftermath::how_it_ended() const
{
    static constexpr const char *stages[] = {"while it prepared", "in the attacked call", "in the call made again",
                                             "at its end", "in the end"};
    std::string text = WIFSIGNALED(ended_by) ? std::string("killed by ") + strsignal(WTERMSIG(ended_by))
                                             : "exit status " + std::to_string(WEXITSTATUS(ended_by));
    return text + " " + stages[stage];
}

void play(const attacked_call &call, const attack &attack, const std::string &folder, aftermath &told)
{
    alarm(most_seconds);
    const uint64_t allocations_of_test = attack.allocations();
    call.prepare(folder);
    leave_marker();
    last_error(); // the first message of a process loads what the C library needs for it
    told.stage = aftermath::prepared;
    attack.begin();
    told.status = call.call(folder);
    told.faults = attack.end();

    tell_error(told);
    if (call.keeps_global_mutex && told.status != 0) unlockGlobalMutex();
    std::strncpy(told.held_lock, held_lock(), sizeof told.held_lock - 1);
    told.stage = aftermath::attacked;
    call.undo(folder);

    told.status_again = call.call(folder);
    told.stage = aftermath::repeated;
    call.undo(folder);
    told.allocations = attack.allocations() - allocations_of_test;
    told.descriptors = open_descriptors();
    told.mappings = mappings_of(folder);
    std::strncpy(told.half_made, call.half_made(folder).c_str(), sizeof told.half_made - 1);
    told.stage = aftermath::ended;
    _exit(0);
}

aftermath play_in_child(const attacked_call &call, const attack &attack, const std::string &parent)
{
    const scratch folder(parent);
    const shared_aftermath told;
    const pid_t child = fork();
    if (child == 0) play(call, attack, folder.folder(), *told);
    waitpid(child, &told->ended_by, 0);
    return *told;
}

shared_aftermath::shared_aftermath()
{
    void *memory = mmap(nullptr, sizeof(aftermath), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    if (memory == MAP_FAILED) std::abort();
    told_ = new (memory) aftermath;
}
shared_aftermath::~shared_aftermath() { munmap(told_, sizeof *told_); }

void expect_no_harm(const attacked_call &call, const aftermath &told, const aftermath &undisturbed)
{
    ASSERT_EQ(told.stage, aftermath::ended) << told.how_it_ended();
    ASSERT_EQ(told.ended_by, 0) << told.how_it_ended();
    const bool known = told.status == undisturbed.status ||
                       std::find(call.codes.begin(), call.codes.end(), told.status) != call.codes.end();
    EXPECT_TRUE(known) << "returned " << told.status << ": " << told.message;
    EXPECT_TRUE(!call.records_its_code || told.recorded == told.status || told.status == -1)
        << "returned " << told.status << ", recorded " << told.recorded << ": " << told.message;
    EXPECT_STREQ(told.held_lock, "") << "is held behind the call";
    EXPECT_TRUE(told.status_again == undisturbed.status_again ||
                (call.may_stay_failed && told.status_again == told.status))
        << "the same call again returned " << told.status_again;
    EXPECT_STREQ(told.half_made, "") << "is not whole";
    EXPECT_LE(told.allocations, undisturbed.allocations + call.kept_by_spool_thread) << "memory is lost";
    EXPECT_LE(told.descriptors, undisturbed.descriptors) << "descriptors are left open";
    EXPECT_LE(told.mappings, undisturbed.mappings) << "files are left mapped";
}
} // namespace qn::test
