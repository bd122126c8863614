// A million random records, written by the library from several threads into several files, and read back.
#include <gtest/gtest.h>

#include <atomic>
#include <cstdlib>
#include <map>
#include <memory>
#include <thread>

#include <pthread.h>

#include "reader/check/random_records.h"
#include "support/last_error.h"
#include "support/scratch.h"
#include "tools/qntrace/check/file_check.h"
#include "trace/trace.h"

namespace qn::test
{
namespace
{

constexpr std::size_t threads = 4;
constexpr std::size_t files = 5;
constexpr std::size_t records_of_a_thread = 250'000;
constexpr qn_uint32_t file_bytes = 40 << 20; // no ring wraps

// The files of the categories c0 to c4 of one component, with their tokens; the first one is the default file too.
class traced_files
{
public:
    traced_files() : component_("RAND", files)
    {
        setenv("QN_TR_SPOOL", "none", 1); // its presence keeps the library from the machine's configuration file
        EXPECT_EQ(tr_set_filename_1(path(random_records::default_file).c_str()), 0);
        for (std::size_t i = 0; i < files; ++i) {
            EXPECT_EQ(tr_set_file_size_1(path(i).c_str(), file_bytes), 0);
            EXPECT_EQ(tr_set_file_map_1(path(i).c_str(), ("RAND:c" + std::to_string(i)).c_str()), 0);
        }
        EXPECT_EQ(component_.register_now(), 0);
    }

    std::string path(std::size_t i) const { return folder_ / ("file" + std::to_string(i) + ".trc"); }
    tr_file_token_t token(std::size_t i) const { return component_.tokens[i]; }

private:
    scratch folder_;
    client component_;
};

// Which seed's records stand under a thread's number, as records have it.
using seeds_of_threads = std::map<std::uint32_t, std::uint32_t>;

seeds_of_threads write_all(const traced_files &traced)
{
    std::vector<std::thread> running;
    std::vector<std::uint32_t> numbers(threads);
    std::atomic<std::size_t> failures = 0;
    std::atomic<std::size_t> started = 0;
    for (std::uint32_t seed = 0; seed < threads; ++seed) {
        running.emplace_back([&, seed] {
            numbers[seed] = static_cast<std::uint32_t>(pthread_self());
            // All live at the same time: no number is given to two of them.
            for (++started; started < threads;) std::this_thread::yield();
            random_records records(seed);
            for (std::size_t i = 0; i < records_of_a_thread; ++i) {
                records.next();
                if (records.write(traced.token(records.file_of(files))) != 0) ++failures;
            }
        });
    }
    for (auto &thread : running) thread.join();
    EXPECT_EQ(failures, 0U);
    seeds_of_threads seeds;
    for (std::uint32_t seed = 0; seed < threads; ++seed) seeds[numbers[seed]] = seed;
    EXPECT_EQ(seeds.size(), threads);
    return seeds;
}

// Compares a file with what its threads should have written to it, and counts the records.
std::size_t compare(const std::string &path, std::size_t file, const seeds_of_threads &seeds)
{
    std::map<std::uint32_t, random_records> expected;
    for (const auto &[thread, seed] : seeds) expected.emplace(thread, seed);
    reader::file_source source(path);
    reader::trace_reader trace(source, [](const reader::finding &found) { ADD_FAILURE() << found.text; });
    std::size_t records = 0;
    std::uint32_t seq = 0;
    while (const auto record = trace.next()) {
        const auto &header = record->raw.header;
        const bool is_own = std::string_view(header.component.data(), header.component.size()) == "____";
        if (!reader::carries_data(record->body) || is_own) continue;
        EXPECT_TRUE(seq == 0 || header.seq == seq + 2) << header.seq << " behind " << seq;
        seq = header.seq;
        const auto own = expected.find(header.thread);
        if (own == expected.end()) {
            ADD_FAILURE() << "no thread is " << header.thread;
            return records;
        }
        do own->second.next();
        while (own->second.file_of(files) != file);
        const auto difference = own->second.difference(*record);
        if (!difference.empty()) {
            ADD_FAILURE() << path << " at " << record->raw.offset << ": " << difference;
            return records;
        }
        ++records;
    }
    return records;
}

TEST(RandomRecords, AMillionOfManyThreadsAreReadAsTheyWereWritten)
{
    const traced_files traced;
    const auto seeds = write_all(traced);
    std::size_t records = 0;
    for (std::size_t i = 0; i < files; ++i) {
        records += compare(traced.path(i), i, seeds);
        reader::file_source source(traced.path(i));
        const auto checked = dump::check_file(source);
        EXPECT_TRUE(checked.sound());
        EXPECT_EQ(checked.unreadable_bytes, 0U);
    }
    EXPECT_EQ(records, threads * records_of_a_thread);
}

} // namespace
} // namespace qn::test
