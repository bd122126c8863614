// Every writer, stopped behind each of its instructions: what stands in the files at that moment is read as qntrace
// reads it, and another process goes on with it. Nothing but the record in flight is affected, and what it is to
// overwrite.
#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <map>
#include <memory>
#include <set>
#include <span>
#include <string>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

#include <gtest/gtest-spi.h>
#include <gtest/gtest.h>

#include "faults/campaign.h"
#include "faults/program.h"
#include "reader/reading.h"
#include "recording/one_trace.h"
#include "recording/ring_layout.h"
#include "recording/single_step.h"
#include "recording/writers.h"
#include "support/scratch.h"
#include "trace/trace.h"

namespace
{
using namespace qn::test;

constexpr const char *item = "A writer stopped at every instruction";
constexpr uint32_t file_bytes_wanted = 4096;
constexpr uint32_t bytes_of_restart = 52 + 32 + 2 * 28; // its two records, each with a rest behind it

// The files of a trace at one moment.
using moment = std::vector<std::string>;

// A record that is to be found: its file, its place and everything in it.
struct found_record {
    size_t file;
    uint64_t offset;
    std::string bytes;
    auto operator<=>(const found_record &) const = default;
};
using found_records = std::set<found_record>;

found_records data_in(const moment &files)
{
    found_records found;
    for (size_t i = 0; i < files.size(); ++i)
        for (const record_image &record : trace_image(files[i]).ring())
            if (record.is_data()) found.insert({i, record.offset, record.bytes});
    return found;
}

struct writer_at_work {
    std::string name;
    std::function<void(const std::string &folder)> prepare;
    std::function<qn_int32_t()> call;
    std::vector<std::string> files; // of the trace, in the folder
};

class stopped_writer
{
public:
    explicit stopped_writer(const writer_at_work &writer) : writer_(writer) {}

    // False where no process may be traced.
    bool step_through()
    {
        std::vector<std::unique_ptr<tail_reader>> files;
        const auto look = [&] {
            moment now;
            for (const auto &file : files) now.emplace_back(file->bytes());
            return now;
        };
        const auto has_changed = [&] {
            for (size_t i = 0; i < files.size(); ++i)
                if (files[i]->bytes() != moments_.back()[i]) return true;
            return false;
        };
        const stepped seen = single_step(
            [this] {
                alarm(most_seconds);
                writer_.prepare(folder_.folder());
            },
            writer_.call,
            [&] {
                for (const std::string &name : writer_.files)
                    files.push_back(std::make_unique<tail_reader>(folder_ / name));
                moments_.push_back(look());
            },
            [&] {
                if (has_changed()) moments_.push_back(look());
            });
        EXPECT_TRUE(!seen.possible || seen.ended_by == 0) << seen.ended_by;
        EXPECT_TRUE(!seen.possible || moments_.size() > 3) << "the call was not seen";
        count(item, "rounds", 1);
        count(item, "faults", seen.instructions);
        return seen.possible && !moments_.empty();
    }

    // What the call does not overwrite is there at every moment, whole, and besides that nothing but what is there in
    // the end; the reader finds the same, and no damage.
    void expect_nothing_else_affected() const
    {
        const found_records before = data_in(moments_.front());
        const found_records after = data_in(moments_.back());
        for (const moment &now : moments_) {
            const found_records found = data_in(now);
            for (const found_record &record : to_stay())
                ASSERT_TRUE(found.contains(record)) << "the record at " << record.offset << " is lost";
            for (const found_record &record : found)
                ASSERT_TRUE(before.contains(record) || after.contains(record)) << "half a record at " << record.offset;
            for (size_t i = 0; i < now.size(); ++i) expect_readable(now[i], i, found);
        }
    }

    // Another process starts each of the moments, and writes.
    void expect_all_can_be_continued() const
    {
        const pid_t child = fork();
        if (child == 0) {
            alarm(most_seconds);
            for (const moment &now : moments_) expect_continued(now);
            _exit(testing::Test::HasFailure() ? 1 : 0);
        }
        int status = 0;
        ASSERT_EQ(waitpid(child, &status, 0), child);
        EXPECT_EQ(status, 0);
        count(item, "executions", moments_.size());
    }

private:
    found_records to_stay() const
    {
        found_records stay = data_in(moments_.back());
        const found_records before = data_in(moments_.front());
        std::erase_if(stay, [&](const found_record &record) { return !before.contains(record); });
        return stay;
    }

    static void expect_readable(const std::string &bytes, size_t file, const found_records &found)
    {
        const reading read = read_all(std::as_bytes(std::span(bytes)));
        ASSERT_TRUE(read.header.has_value());
        std::set<uint64_t> places;
        std::set<std::string> in_flight;
        for (const kept_record &record : read.records) {
            if (record.kind == "unfinished")
                in_flight.insert(std::to_string(record.offset));
            else if (record.kind != "free")
                places.insert(record.offset);
        }
        std::set<uint64_t> expected;
        for (const found_record &record : found)
            if (record.file == file) expected.insert(record.offset);
        ASSERT_EQ(places, expected);
        // One who waits for the end of a page or the ring may have a filler in flight as well.
        ASSERT_LE(in_flight.size(), 2U);
        for (const std::string &damage : read.damage())
            ASSERT_TRUE(in_flight.contains(damage.substr(0, damage.find(':')))) << damage;
    }

    void expect_continued(const moment &now) const
    {
        static int turn = 0;
        const std::string folder = folder_ / std::to_string(++turn);
        ASSERT_EQ(mkdir(folder.c_str(), 0700), 0);
        for (size_t i = 0; i < now.size(); ++i) write_file(folder + "/" + writer_.files[i], now[i]);
        static const bool there = start_library(now.size() > 1);
        ASSERT_TRUE(there);
        ASSERT_EQ(tr_set_filename_1((folder + "/app.trc").c_str()), 0);
        ASSERT_EQ(tr_record_id_1("NEXT", 1), 0);

        moment next;
        for (const std::string &file : writer_.files) next.push_back(file_bytes(folder + "/" + file));
        if (now.size() > 1)
            expect_pages_kept(data_in(next));
        else
            expect_kept(data_in(next));
        tr_set_filename_1("");
    }

    bool start_library(bool with_pages) const
    {
        if (with_pages) {
            with_page_set(folder_.folder());
            return true;
        }
        static client component("NEXT");
        setenv("QN_TR_SIZE", std::to_string(file_bytes_wanted).c_str(), 1);
        setenv("QN_TR_SPOOL", "none", 1);
        return component.register_now() == 0;
    }

    static bool has_record_of_next(const found_records &found)
    {
        return std::any_of(found.begin(), found.end(),
                           [](const found_record &record) { return record.bytes.substr(12, 4) == "NEXT"; });
    }

    // The next process goes on in one page; where that is full, in another one, which it writes anew.
    void expect_pages_kept(const found_records &found) const
    {
        EXPECT_TRUE(has_record_of_next(found));
        std::set<size_t> written_anew;
        for (const found_record &record : to_stay())
            if (!found.contains(record)) written_anew.insert(record.file);
        EXPECT_LE(written_anew.size(), 1U);
    }

    // The two records of the next process are there, and overwrote no more than they needed: the oldest ones.
    void expect_kept(const found_records &found) const
    {
        EXPECT_TRUE(has_record_of_next(found));
        std::map<uint32_t, uint32_t> gone; // length by sequence number
        uint32_t last_gone = 0;
        uint32_t first_kept = UINT32_MAX;
        for (const found_record &record : to_stay()) {
            uint32_t length = 0;
            uint32_t sequence = 0;
            std::memcpy(&length, record.bytes.data(), sizeof length);
            std::memcpy(&sequence, record.bytes.data() + 8, sizeof sequence);
            if (found.contains(record)) {
                first_kept = std::min(first_kept, sequence);
            } else {
                gone[sequence] = length;
                last_gone = std::max(last_gone, sequence);
            }
        }
        EXPECT_LT(last_gone, first_kept) << "not the oldest were overwritten";
        uint32_t bytes = 0;
        for (const auto &[sequence, length] : gone) bytes += sequence != last_gone ? length : 0;
        EXPECT_LT(bytes, bytes_of_restart) << "more was overwritten than was needed";
    }

    const writer_at_work &writer_;
    scratch folder_{memory_folder()};
    std::vector<moment> moments_;
};

struct ring {
    const char *name;
    std::vector<uint32_t> lengths; // of its records, which fill 3896 bytes
    size_t oldest;
};

// The call takes over several records and leaves a rest; it goes back to the start of the ring; it ends with the file.
const ring rings[] = {{"Several", {600, 40, 32, 36, 48, 300, 300, 1268, 1272}, 1},
                      {"RoundTheEnd", {100, 100, 500, 1548, 1548, 32, 68}, 5},
                      {"One", {1000, 500, 1196, 1200}, 1}};

void prepare_ring(const ring &of, const std::string &folder)
{
    static client component("TEST");
    setenv("QN_TR_SIZE", std::to_string(file_bytes_wanted).c_str(), 1);
    setenv("QN_TR_SPOOL", "none", 1);
    if ((tr_set_filename_1((folder + "/app.trc").c_str()) | component.register_now()) != 0) std::abort();
    std::vector<planned_record> records;
    const auto number = static_cast<uint32_t>(of.lengths.size());
    for (uint32_t i = 0; i < number; ++i) {
        const auto age = static_cast<uint32_t>((i + number - of.oldest) % number);
        records.push_back({of.lengths[i], 1, 100 + 2 * age});
    }
    lay_out(records, of.oldest, 100 + 2 * (number - 1));
}

void expect_sound(const writer_at_work &writer)
{
    SCOPED_TRACE(writer.name);
    stopped_writer stopped(writer);
    if (!stopped.step_through()) return;
    stopped.expect_nothing_else_affected();
    stopped.expect_all_can_be_continued();
}

// In the test suite every writer meets one of the rings.
TEST(StoppedWriter, OfTheClientAffectsNothingButItsRecord)
{
    for (size_t i = 0; i < all_writers().size(); ++i)
        for (size_t j = 0; j < std::size(rings); ++j) {
            if (rounds(0, 1) == 0 && (i + j) % std::size(rings) != 0) continue;
            const writer_call &writer = all_writers()[i];
            expect_sound({writer.name + std::string(" ") + rings[j].name,
                          [j](const std::string &folder) { prepare_ring(rings[j], folder); },
                          [&writer] { return writer.write("COMP", nullptr); },
                          {"app.trc"}});
        }
}

TEST(StoppedWriter, OfTheLibraryItselfAffectsNothingButItsRecord)
{
    for (const ring &of : rings) {
        const auto prepare = [&](const std::string &folder) { prepare_ring(of, folder); };
        expect_sound({"start", prepare, [] { return int_record_start(&anchors); }, {"app.trc"}});
        expect_sound({"restart",
                      [&](const std::string &folder) {
                          prepare(folder);
                          tr_core_event_1(anchors.fileName, "it crashed");
                      },
                      [] { return int_record_start(&anchors); },
                      {"app.trc"}});
        expect_sound({"calibration", prepare, [] { return __time_calibration(&anchors); }, {"app.trc"}});
    }
}

// Fills pages until the next record does not fit in the page that is written.
void fill_pages(qn_uint32_t pages)
{
    constexpr qn_uint32_t id_bytes = 32;
    const qn_uint32_t room = (program_file_bytes - 200) / id_bytes;
    for (qn_uint32_t page = 0; page < pages; ++page) {
        const trace_anchor_t *active = anchors.pActivePg;
        while (anchors.pActivePg == active) {
            const auto left =
                static_cast<qn_uint32_t>(active->pMapEnd - reinterpret_cast<const unsigned char *>(active->pNextFree));
            if (page + 1 == pages && left < 2 * id_bytes + 28) return;
            if (write_ids(page * room, 1) != 0) std::abort();
        }
    }
}

const std::vector<std::string> pages = {"app.trc.1.sp", "app.trc.2.sp", "app.trc.3.sp", "app.trc.4.sp"};

void prepare_pages(const std::string &folder, qn_uint32_t full)
{
    with_page_set(folder);
    if (name_it(folder) != 0) std::abort();
    pthread_mutex_lock(&spq.mutex); // nothing is copied, and no state changes meanwhile
    fill_pages(full);
}

// A page switch: what the pages hold stays, but for the one that is written anew.
void expect_sound_pages(const std::string &name, qn_uint32_t full)
{
    const writer_at_work writer = {name, [full](const std::string &folder) { prepare_pages(folder, full); },
                                   [] {
                                       const qn_int32_t first = write_ids(1, 1);
                                       return first | write_ids(2, 2);
                                   },
                                   pages};
    expect_sound(writer);
}

TEST(StoppedWriter, WhoGoesToAnotherPageAffectsNothingButThat) { expect_sound_pages("into a fresh page", 1); }
TEST(StoppedWriter, WhoTakesOverAPageThatWasNotCopiedAffectsNothingButThat)
{
    expect_sound_pages("into a page that is full", 4);
}

// A writer that touches a record of somebody else, if only for some instructions.
TEST(PlantedTouch, OfAnotherRecordIsFound)
{
    static const writer_at_work writer = {"planted",
                                          [](const std::string &folder) { prepare_ring(rings[0], folder); },
                                          [] {
                                              volatile unsigned char *other = anchors.pMap + 1000;
                                              for (int i = 0; i < 4; ++i)
                                                  *other = static_cast<unsigned char>(*other + 64);
                                              return 0;
                                          },
                                          {"app.trc"}};
    static stopped_writer stopped(writer);
    if (!stopped.step_through()) return;
    EXPECT_FATAL_FAILURE(stopped.expect_nothing_else_affected(), "is lost");
    count("Planted harm is found", "rounds", 1);
}
} // namespace
