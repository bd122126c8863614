// A process that is killed at each system call of what it does with files, just before and just behind it. Another one
// goes on with what it left: in bounded time, with a sound file, and with everything that had been recorded.
#include <algorithm>
#include <filesystem>
#include <set>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "faults/campaign.h"
#include "faults/program.h"
#include "faults/system_calls.h"
#include "support/scratch.h"
#include "support/trace_image.h"
#include "trace/trace.h"

namespace
{
using namespace qn::test;

constexpr qn_uint32_t recorded = 100;      // ids 1 to this one, before the attack
constexpr qn_uint32_t first_later = 10001; // ids of the process that goes on
constexpr qn_uint32_t later = 5;

using ids = std::set<qn_uint32_t>;

ids ids_of(const trace_image &image)
{
    ids found;
    for (const record_image &record : image.records())
        if (record.component() == "COMP") found.insert(record.u32(28));
    return found;
}

// The ids in all trace files of the folder whose name begins so; a file that is not complete has none.
ids ids_in(const std::string &folder, const std::string &begin)
{
    ids found;
    for (const auto &entry : std::filesystem::directory_iterator(folder)) {
        if (!entry.path().filename().string().starts_with(begin) || entry.file_size() < 4096) continue;
        found.merge(ids_of(trace_image::of_file(entry.path().string())));
    }
    return found;
}

bool has_all(const ids &found, qn_uint32_t first, qn_uint32_t count)
{
    for (qn_uint32_t id = first; id < first + count; ++id)
        if (found.count(id) == 0) return false;
    return true;
}

class KilledAtSystemCalls : public testing::Test
{
protected:
    using step = std::function<void(const std::string &)>;

    // Kills the process at every system call of `act`, after `prepare`; then `go_on` runs in another one, and `check` looks
    // at what both left.
    void kill_everywhere(const step &prepare, const step &act, const step &go_on, const step &check)
    {
        uint64_t faults = 0;
        for (uint64_t turn = 0;; ++turn) {
            const uint64_t number = turn / 2 + 1;
            const scratch folder(memory_folder());
            const auto what = turn % 2 == 0 ? intervention::kills_before : intervention::kills_behind;
            SCOPED_TRACE("system call " + std::to_string(number) + (turn % 2 == 0 ? ", before it" : ", behind it"));
            const watched process = watch(
                [&] {
                    alarm(most_seconds);
                    prepare(folder.folder());
                    begin_watching();
                    act(folder.folder());
                    end_watching();
                },
                {what, number, 0});
            if (!process.possible) GTEST_SKIP() << "no process may be traced here";
            if (process.intervened) {
                ASSERT_TRUE(WIFSIGNALED(process.ended_by) && WTERMSIG(process.ended_by) == SIGKILL) << process.ended_by;
            } else {
                ASSERT_EQ(process.ended_by, 0) << "the process ended by itself";
            }
            ASSERT_TRUE(in_process([&] {
                go_on(folder.folder());
                return true;
            })) << "the next process";
            check(folder.folder());
            if (HasFailure()) return;
            if (!process.intervened) break;
            ++faults;
        }
        count("SIGKILL at every system call", "rounds", 1);
        count("SIGKILL at every system call", "faults", faults);
        count("SIGKILL at every system call", "executions", 2 * (faults + 1));
    }

    static void with_records(const std::string &folder)
    {
        running(folder);
        if (write_ids(1, recorded) != 0) _exit(1);
    }
    static void with_records_of_another_process(const std::string &folder)
    {
        if (!in_process([&] {
                with_records(folder);
                return true;
            }))
            _exit(1);
        registered(folder);
    }
    static void go_on_with_trace(const std::string &folder)
    {
        running(folder);
        if (write_ids(first_later, later) != 0) _exit(1);
    }
    static void go_on_with_page_set(const std::string &folder)
    {
        with_page_set(folder);
        if (name_it(folder) != 0 || write_ids(first_later, later) != 0) _exit(1);
        wait_for_queue();
    }
};

TEST_F(KilledAtSystemCalls, AStartLeavesAFileThatIsStarted)
{
    const auto registered_with_large_file = [](const std::string &folder) {
        registered(folder);
        if (tr_set_size_1(large_file_bytes) != 0) _exit(1);
    };
    kill_everywhere(registered_with_large_file, name_it, go_on_with_trace, [](const std::string &folder) {
        EXPECT_TRUE(has_all(ids_of(trace_image::of_file(folder + "/app.trc")), first_later, later));
    });
}

TEST_F(KilledAtSystemCalls, AStartOfAnExistingFileLeavesItsRecords)
{
    kill_everywhere(with_records_of_another_process, name_it, go_on_with_trace, [](const std::string &folder) {
        const ids found = ids_of(trace_image::of_file(folder + "/app.trc"));
        EXPECT_TRUE(has_all(found, 1, recorded));
        EXPECT_TRUE(has_all(found, first_later, later));
    });
}

TEST_F(KilledAtSystemCalls, AnExtensionLeavesAFileThatIsStarted)
{
    kill_everywhere(
        with_records, [](const std::string &) { tr_set_file_size_1("", large_file_bytes); }, go_on_with_trace,
        [](const std::string &folder) {
            EXPECT_TRUE(has_all(ids_of(trace_image::of_file(folder + "/app.trc")), first_later, later));
        });
}

TEST_F(KilledAtSystemCalls, PuttingADamagedFileAsideKeepsItsRecords)
{
    kill_everywhere(
        with_records,
        [](const std::string &) {
            const qn::tr::anchor_set_lock set(&anchors);
            trace_reinit(&anchors);
        },
        go_on_with_trace,
        [](const std::string &folder) {
            const ids found = ids_in(folder, "app.trc");
            EXPECT_TRUE(has_all(found, 1, recorded));
            EXPECT_TRUE(has_all(found, first_later, later));
        });
}

// Three pages of 249 records are filled and copied while they are attacked.
TEST_F(KilledAtSystemCalls, CopyingPagesLeavesTheirRecords)
{
    static constexpr qn_uint32_t in_three_pages = 740;
    static constexpr const char *count_file = "/returned";
    kill_everywhere(
        [](const std::string &folder) {
            with_page_set(folder);
            if (name_it(folder) != 0) _exit(1);
        },
        [](const std::string &folder) {
            if (write_ids(1, in_three_pages) != 0) _exit(1);
            write_file(folder + count_file, "");
            wait_for_queue();
        },
        go_on_with_page_set,
        [](const std::string &folder) {
            const ids found = ids_in(folder, "app.trc");
            EXPECT_TRUE(has_all(found, first_later, later));
            const ids before(found.begin(), found.lower_bound(first_later));
            EXPECT_TRUE(before.empty() || has_all(before, 1, *before.rbegin())) << "a record in the middle is lost";
            if (std::filesystem::exists(folder + count_file)) {
                EXPECT_EQ(before.size(), in_three_pages);
            }
        });
}

TEST_F(KilledAtSystemCalls, CopyingAFileThatIsRemovedThenLeavesItOrItsCopy)
{
    kill_everywhere(
        with_file_to_copy,
        [](const std::string &) {
            tr_copy_file_1(files().destination.c_str(), files().copied.c_str(), 1);
            wait_for_queue();
        },
        [](const std::string &) {},
        [](const std::string &folder) {
            bool whole = std::filesystem::exists(folder + "/from");
            for (const auto &copy : std::filesystem::directory_iterator(folder + "/to"))
                whole |= copy.file_size() == copied_bytes;
            EXPECT_TRUE(whole);
        });
}
} // namespace
