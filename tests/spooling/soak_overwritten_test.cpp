// A spooler that is too slow: pages are overwritten before they were copied. What is missing afterwards is exactly what
// the notices at the start of the pages, and the time in their headers, say.
#include <algorithm>
#include <ctime>
#include <map>
#include <optional>

#include <gtest/gtest.h>

#include "spooling/soak_slow_spooler.h"
#include "spooling/soak_trace.h"
#include "trace/trace.h"

namespace
{
using namespace qn::test;

constexpr uint32_t writers = 4;
constexpr uint32_t records_each = SOAK_RECORDS / writers;
constexpr uint32_t record_bytes = 40;
constexpr uint32_t roughly_a_page = soak_trace::usual_page_bytes / record_bytes; // records
constexpr uint32_t first_records = roughly_a_page + 100;

// What a life of a page holds of the writers' records: a run of numbers that were counted over all writers.
struct run_of_records {
    uint32_t first = 0;
    uint32_t count = 0;
};

// A life of a page that was found.
struct known_life {
    uint64_t index; // among the lives of all pages, which are taken over in turn
    uint32_t page;  // from 0
    uint32_t overwritten_before;
    uint32_t reuse_time;
    run_of_records records;
};

void write(uint32_t thread, uint32_t number, uint64_t counted)
{
    const std::string component = "SL-" + std::to_string(thread);
    ASSERT_EQ(tr_record_values_32_1(component.c_str(), number, 1, static_cast<qn_uint32_t>(counted)), 0);
}

// Reads lives one after the other, and follows what each writer has counted by itself.
class life_reader
{
public:
    explicit life_reader(uint32_t pages) : pages_(pages) {}

    known_life read(const page_file &file)
    {
        const trace_image image = file.image();
        known_life life{};
        life.page = static_cast<uint32_t>(std::stoul(file.page.substr(sizeof "soak.trc." - 1))) - 1;
        life.overwritten_before = overwritten_before(file, image);
        life.reuse_time = image.u32(offset_of_reuse_time);
        uint64_t &lives_of_page = lives_[life.page];
        lives_of_page += life.overwritten_before;
        life.index = lives_of_page++ * pages_ + life.page;
        life.records = run_in(image);
        return life;
    }

private:
    run_of_records run_in(const trace_image &image)
    {
        run_of_records run;
        for (const record_image &record : image.records()) {
            if (record.component().substr(0, 3) != "SL-") continue;
            EXPECT_EQ(record.function(), 12);
            EXPECT_EQ(record.length(), record_bytes);
            const uint32_t counted = record.u32(36);
            if (run.count == 0) run.first = counted;
            EXPECT_EQ(counted, run.first + run.count) << "in a page there are no gaps";
            ++run.count;
            auto &last = last_of_writer_[record.component()];
            EXPECT_TRUE(!last || *last < record.u32(28)) << "each writer's numbers grow";
            last = record.u32(28);
        }
        return run;
    }

    uint32_t pages_;
    std::map<uint32_t, uint64_t> lives_; // of each page, so far
    std::map<std::string, std::optional<uint32_t>> last_of_writer_;
};

// How many of the records fill a page. Behind the last one there is always room for a record header; before the first
// one stands the notice of a page that was overwritten.
uint32_t capacity(const std::string &page_name, uint32_t overwritten_before)
{
    constexpr uint32_t page_bytes = soak_trace::usual_page_bytes;
    constexpr uint32_t file_header = 200;
    constexpr uint32_t record_header = 28;
    uint32_t notice = 0;
    if (overwritten_before > 0) {
        const std::string text = "SPOOL: " + page_name + " not spooled " + std::to_string(overwritten_before) +
                                 " consecutive time" + (overwritten_before > 1 ? "s" : "");
        notice = (static_cast<uint32_t>(text.size()) + 1 + 35) / 4 * 4;
    }
    return (page_bytes - file_header - notice - record_header) / record_bytes;
}

// The lives of pages that the notices say were overwritten, and how often in a row the page had been before each.
std::map<uint64_t, uint32_t> lives_lost(const std::vector<known_life> &lives, uint32_t pages)
{
    std::map<uint64_t, uint32_t> lost;
    for (const known_life &life : lives)
        for (uint32_t before = 0; before < life.overwritten_before; ++before)
            lost[life.index - uint64_t{life.overwritten_before - before} * pages] = before;
    return lost;
}

// A page is stamped with the time when it is overwritten, and keeps that until it is overwritten again.
void expect_stamps_of_overwriting(const std::vector<known_life> &lives, uint32_t begun, uint32_t ended)
{
    std::map<uint32_t, uint32_t> last_of_page;
    for (const known_life &life : lives) {
        uint32_t &stamped = last_of_page[life.page];
        if (life.overwritten_before == 0) {
            EXPECT_EQ(life.reuse_time, stamped) << "life " << life.index;
        } else {
            EXPECT_GE(life.reuse_time, std::max(begun, stamped)) << "life " << life.index;
            EXPECT_LE(life.reuse_time, ended) << "life " << life.index;
        }
        stamped = life.reuse_time;
    }
}

// Between the lives that were found, as many records are missing as the lost ones held; every life is either found or
// told to be lost. Gives the number of records in all.
uint32_t expect_only_lost_lives_missing(const std::vector<known_life> &lives, std::map<uint64_t, uint32_t> lost,
                                        const std::string &page_name)
{
    uint64_t next_life = 0;
    uint32_t next_record = 0;
    for (const known_life &life : lives) {
        EXPECT_GE(life.index, next_life) << "lives are found in order";
        for (; next_life < life.index; ++next_life) {
            const auto overwritten = lost.extract(next_life);
            if (overwritten.empty()) {
                ADD_FAILURE() << "life " << next_life << " is missing, and no notice tells of it";
                return next_record;
            }
            next_record += capacity(page_name, overwritten.mapped());
        }
        EXPECT_EQ(life.records.first, next_record) << "life " << life.index;
        next_record = life.records.first + life.records.count;
        ++next_life;
        const bool is_special = life.index == 0 || &life == &lives.back(); // a start record; still being written
        EXPECT_TRUE(is_special || life.records.count == capacity(page_name, life.overwritten_before))
            << "life " << life.index << " holds " << life.records.count;
    }
    EXPECT_TRUE(lost.empty()) << "a notice tells of a life that is there, " << lost.begin()->first;
    return next_record;
}

class TooSlowSpooler : public testing::TestWithParam<uint32_t>
{
};

TEST_P(TooSlowSpooler, LosesWhatTheNoticesSayAndNothingElse)
{
    const uint32_t pages = GetParam();
    const auto begun = static_cast<uint32_t>(std::time(nullptr));
    const soak_trace trace(pages);
    for (uint32_t number = 0; number < first_records; ++number) write(writers, number, number);
    wait_for_queue(0); // the life that holds the start record was copied
    {
        slow_spooler slow(roughly_a_page, first_records);
        in_threads(writers, [&](uint32_t thread) {
            for (uint32_t number = 0; number < records_each; ++number)
                slow.record([=](uint64_t counted) { write(thread, number, counted); });
        });
    }
    wait_for_queue(0);
    const auto ended = static_cast<uint32_t>(std::time(nullptr));

    life_reader reader(pages);
    std::vector<known_life> lives;
    for (const page_file &file : trace.pages()) lives.push_back(reader.read(file));
    const auto lost = lives_lost(lives, pages);
    ASSERT_GT(lost.size(), lives.size()) << "most pages are overwritten";
    expect_stamps_of_overwriting(lives, begun, ended);
    EXPECT_EQ(expect_only_lost_lives_missing(lives, lost, trace.file() + ".1.sp"),
              first_records + writers * records_each);
}

INSTANTIATE_TEST_SUITE_P(Pages, TooSlowSpooler, testing::Values(2U, 3U, 5U, 8U));
} // namespace
