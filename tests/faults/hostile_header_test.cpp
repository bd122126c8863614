// Another process stores whatever it likes into the trace files of a program that records into them with eight threads.
// Behind each mapping lies memory that nobody may touch, and a wait for a reader takes no time here: what would hang,
// hangs.
#include <atomic>
#include <chrono>
#include <csignal>
#include <filesystem>
#include <thread>

#include <gtest/gtest.h>
#include <unistd.h>

#include "faults/campaign.h"
#include "faults/hostile_process.h"
#include "faults/program.h"
#include "recording/numbered_records.h"
#include "recording/one_trace.h"
#include "recording/ring_layout.h"
#include "recording/writers.h"
#include "trace/trace.h"

extern "C" int usleep(useconds_t) { return 0; }

namespace
{
using namespace qn::test;

constexpr uint32_t writers = 8;
constexpr record_author later_author = {1, 9};
constexpr const char *item = "Hostile words in the shared header";
constexpr unsigned longest_seconds = 300;

class HostileProcess : public testing::TestWithParam<hostility>
{
protected:
    void SetUp() override
    {
        alarm(longest_seconds);
        small_files(folder.folder());
        std::filesystem::create_directory(files().destination);
        setenv("QN_TR_SIZE", "16384", 1);
        ASSERT_EQ(component().register_now(), 0);
        ASSERT_EQ(name_it({}), 0);
        untouched = start_another(folder / "untouched.trc", 4 << 20);
        {
            const qn::tr::global_lock global;
            ASSERT_EQ(addSpoolCfgElement(files().spool.c_str(), "map\\.trc", 4, 1, 60, &anchors.pFirstSpoolSpec,
                                         &anchors.pLastSpoolSpec, 0, program_file_bytes),
                      0);
            paged = start_another(files().mapped, 4 * program_file_bytes);
        }
        ASSERT_NE(paged->nextPage, nullptr);
    }

    std::vector<std::string> pages() const
    {
        std::vector<std::string> names;
        for (int page = 1; page <= 4; ++page) names.push_back(files().mapped + "." + std::to_string(page) + ".sp");
        return names;
    }
    std::vector<std::string> attacked_files() const
    {
        std::vector<std::string> names = pages();
        names.push_back(files().trace);
        return names;
    }

    void record(uint32_t thread, uint32_t records)
    {
        const auto &calls = all_writers();
        for (uint32_t number = 0; number < records; ++number) {
            const writer_call &call = calls[(number + thread) % calls.size()];
            failures += call.write("HOST", number % 2 == 0 ? nullptr : paged) != 0;
            failures += write_numbered({1, thread}, number, number % 2 == 0 ? paged : nullptr) != 0;
            failures += write_numbered({1, thread}, number, untouched) != 0;
        }
    }

    // A file that is put aside is gone for a moment, and the fresh one short.
    void use_everything_else()
    {
        for (int copies = 0; !enough; ++copies) {
            tr_query_handle_t query = nullptr;
            const qn_int32_t opened = tr_open_query_1(files().trace.c_str(), &query);
            failures += opened != 0 && opened != QN_TR_EOPEN && opened != QN_TR_ENOTTRACE;
            pid_t pid = 0;
            qn_char_t *program = nullptr;
            qn_uint32_t platform = 0;
            if (opened == 0) {
                failures += tr_query_pid_1(query, &pid) != 0 || tr_query_prog_1(query, &program) != 0;
                failures += tr_query_platform_1(query, &platform) != 0 || tr_close_query_1(query) != 0;
                free(program);
            }
            failures += tr_flush_1() != 0;
            if (copies < 50) tr_copy_file_1(files().destination.c_str(), files().trace.c_str(), 0);
        }
    }

    void attack_while_recording(uint32_t records)
    {
        const hostile_process attacker(attacked_files(), GetParam());
        std::vector<std::thread> threads;
        for (uint32_t thread = 0; thread < writers; ++thread)
            threads.emplace_back([=, this] { record(thread, records); });
        std::thread other([this] { use_everything_else(); });
        for (std::thread &thread : threads) thread.join();
        enough = true;
        other.join();
    }

    static void write_two_rounds(tr_file_token_t token)
    {
        for (uint32_t number = 0; number < 2000; ++number) EXPECT_EQ(write_numbered(later_author, number, token), 0);
    }

    static bool queue_empties()
    {
        for (int waits = 0; waits < 100 && !queue_is_empty(); ++waits)
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        return queue_is_empty();
    }

    // A page that was queued, and taken over because its file said that it was copied, stays in the queue until it is full
    // once more.
    void write_until_all_is_copied()
    {
        while (!queue_empties()) write_two_rounds(paged);
    }

    // Sound, and without a gap in the numbers of the records behind the attack.
    static void expect_sound(const std::string &file)
    {
        SCOPED_TRACE(file);
        const auto numbers = numbers_in(trace_image::of_file(file).ring())[later_author];
        ASSERT_FALSE(numbers.empty());
        for (size_t i = 1; i < numbers.size(); ++i) ASSERT_EQ(numbers[i], numbers[i - 1] + 1);
    }

    const scratch folder{memory_folder()};
    tr_file_token_t untouched = nullptr;
    tr_file_token_t paged = nullptr;
    std::atomic<bool> enough{false};
    std::atomic<uint64_t> failures{0};
};

TEST_P(HostileProcess, CostsRecordsOfTheFilesThatItWritesAndNothingElse)
{
    const uint32_t records = rounds(1500, 3000);
    const uint32_t attacks = rounds(1, 400);
    standard_error_of([&] {
        for (uint32_t i = 0; i < attacks; ++i) {
            enough = false;
            attack_while_recording(records);
            write_two_rounds(nullptr);
            write_two_rounds(paged);
        }
    });
    EXPECT_EQ(failures, 0U) << "calls of the program";
    expect_sound(files().trace);
    write_until_all_is_copied();
    for (const std::string &page : pages()) expect_sound(page);

    auto numbers = numbers_in(trace_image::of_file(folder / "untouched.trc").ring());
    for (uint32_t thread = 0; thread < writers; ++thread) {
        const auto &found = numbers[{1, thread}];
        ASSERT_FALSE(found.empty());
        EXPECT_EQ(found.back(), records - 1);
        for (size_t i = 1; i < found.size(); ++i) ASSERT_EQ(found[i], (found[i - 1] + 1) % records);
    }
    count(item, "rounds", attacks);
    count(item, "executions", uint64_t{attacks} * writers * records * 3);
}

std::string name_of(const testing::TestParamInfo<hostility> &info)
{
    static constexpr const char *names[] = {"HeaderWords", "HeldRecords", "RecordHeaders", "Everything"};
    return names[static_cast<int>(info.param)];
}

INSTANTIATE_TEST_SUITE_P(Stores, HostileProcess,
                         testing::Values(hostility::header_words, hostility::held_records, hostility::record_headers,
                                         hostility::everything),
                         name_of);
} // namespace
