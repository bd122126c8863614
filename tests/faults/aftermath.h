// A call of the library under attack, in a process of its own: what it returned, whether it did any harm, and whether
// the same call works when the attack is over.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include <qn_tr.h>

#include "support/scratch.h"

namespace qn::test
{
// An exported call, or several that belong together. Each function gets the name of a folder for files.
struct attacked_call {
    const char *name;
    std::function<void(const std::string &)> prepare; // what must be there before; not attacked
    std::function<qn_int32_t(const std::string &)> call;
    std::function<void(const std::string &)> undo; // makes it possible to call again
    std::vector<qn_int32_t> codes;                 // what it may return under the attack, besides 0
    bool records_its_code = true;                  // in the thread's error record
    bool keeps_global_mutex = false;               // when it fails
    uint64_t kept_by_spool_thread = 0;             // allocations: its error record
    bool may_stay_failed = false;                  // until the configuration is read again
    // The name of a file below the folder that is not what it should be when all is over, or nothing.
    std::function<std::string(const std::string &)> half_made = [](const std::string &) { return std::string(); };
};

// What a process told at its end, in memory that it shares with the test.
struct aftermath {
    enum stage_reached { nothing, prepared, attacked, repeated, ended };

    stage_reached stage = nothing;
    int ended_by = 0; // the process's wait status
    qn_int32_t status = 0;
    qn_int32_t recorded = 0;
    char message[256] = "";
    char held_lock[32] = ""; // behind the attacked call
    qn_int32_t status_again = 0;
    uint64_t faults = 0;
    // In the end, when the call was attacked, undone, made again and undone:
    uint64_t allocations = 0;
    uint64_t descriptors = 0;
    uint64_t mappings = 0; // of files in the folder
    char half_made[256] = "";

    std::string how_it_ended() const;
};

// What the attack is, as seen by the process that is attacked.
struct attack {
    std::function<void()> begin;
    std::function<uint64_t()> end; // how many faults there were
    std::function<uint64_t()> allocations = [] { return uint64_t{0}; };
};

// Plays the call in this process, with its files below `folder`, and does not return.
[[noreturn]] void play(const attacked_call &call, const attack &attack, const std::string &folder, aftermath &told);

// Plays it in a forked process, with its files below a folder of its own in `parent`, and waits for its end.
aftermath play_in_child(const attacked_call &call, const attack &attack, const std::string &parent = memory_folder());

// An aftermath in memory that a child shares.
class shared_aftermath
{
public:
    shared_aftermath();
    shared_aftermath(const shared_aftermath &) = delete;
    shared_aftermath &operator=(const shared_aftermath &) = delete;
    ~shared_aftermath();
    aftermath &operator*() const { return *told_; }
    aftermath *operator->() const { return told_; }

private:
    aftermath *told_;
};

// The name of a lock of the library that somebody holds, or nothing.
const char *held_lock();

// Fails the test where the call did harm, `undisturbed` being the aftermath of the same call without an attack.
void expect_no_harm(const attacked_call &call, const aftermath &told, const aftermath &undisturbed);
} // namespace qn::test
