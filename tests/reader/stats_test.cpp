// qntrace stats: what is counted, and how it is shown.
#include <filesystem>
#include <map>
#include <sstream>

#include <gtest/gtest.h>

#include "reader/every_kind.h"
#include "reader/spool_directory.h"
#include "reader/trace_set_files.h"

namespace qn::test
{
namespace
{

using nlohmann::json;

// The objects of one type.
std::vector<json> of_type(const std::vector<json> &objects, const std::string &type)
{
    std::vector<json> found;
    for (const auto &object : objects)
        if (object.at("type") == type) found.push_back(object);
    return found;
}

json total_of(const strings &arguments)
{
    const auto totals = of_type(sound_objects("stats", arguments), "total");
    EXPECT_EQ(totals.size(), 1U);
    return totals.at(0);
}

// Two components, three kinds, two threads; seven records within 7 us, and one second later one more.
trace_builder mixed()
{
    trace_builder file;
    file.counter = 1'000'000'000;
    file.component = "IDX";
    for (int i = 0; i < 4; ++i) file.add_id(17);
    file.add_strings(18, {"ab"});
    file.component = "WALK";
    file.thread = 0x7f02;
    file.add_id(17);
    file.add_id(0xFFFFFFFF); // without an id
    file.counter = 2'000'000'000;
    file.add(13, file.body().u32(19).u32(1).u64(5));
    file.close();
    return file;
}

TEST(Stats, KeepsEveryByteOfComponentsThatAreNoUtf8InJson)
{
    const scratch_folder folder;
    trace_builder file;
    file.component = "I\xe4X";
    file.add_id(1);
    file.close();
    const auto shown = run_qntrace({"stats", "--json", folder.file("a.trc", file.bytes())});
    EXPECT_TRUE(is_ascii(shown.out)) << shown.out;
    const auto objects = rows(shown);
    ASSERT_GE(objects.size(), 2U);
    EXPECT_EQ(objects[1].at("comp"), "I\xc3\xa4X");
    EXPECT_EQ(objects[1].at("encoding"), "latin-1");
}

TEST(Stats, CountsRecordsBytesAndTimes)
{
    const scratch_folder folder;
    const auto total = total_of({folder.file("a.trc", mixed().bytes())});
    EXPECT_EQ(total["files"], 1);
    EXPECT_EQ(total["records"], 8);
    EXPECT_EQ(total["bytes"], 6 * 32 + 44 + 44);
    EXPECT_EQ(total["first"]["time"], "2026-11-21T05:12:01.000000000Z");
    EXPECT_EQ(total["last"]["time"], "2026-11-21T05:12:02.000000000Z");
    EXPECT_EQ(total["records_per_second"], 8.0);
}

TEST(Stats, CountsByComponent)
{
    const scratch_folder folder;
    const auto found = of_type(sound_objects("stats", {folder.file("a.trc", mixed().bytes())}), "component");
    EXPECT_EQ(found,
              (std::vector<json>{{{"type", "component"}, {"comp", "IDX"}, {"records", 5}, {"bytes", 4 * 32 + 44}},
                                 {{"type", "component"}, {"comp", "WALK"}, {"records", 3}, {"bytes", 2 * 32 + 44}}}));
}

TEST(Stats, CountsByKind)
{
    const scratch_folder folder;
    const auto found = of_type(sound_objects("stats", {folder.file("a.trc", mixed().bytes())}), "kind");
    EXPECT_EQ(found, (std::vector<json>{{{"type", "kind"}, {"kind", "id"}, {"records", 6}, {"bytes", 6 * 32}},
                                        {{"type", "kind"}, {"kind", "values64"}, {"records", 1}, {"bytes", 44}},
                                        {{"type", "kind"}, {"kind", "strings"}, {"records", 1}, {"bytes", 44}}}));
}

TEST(Stats, CountsByIdWithinItsComponentWhereThereIsOne)
{
    const scratch_folder folder;
    const auto found = of_type(sound_objects("stats", {folder.file("a.trc", mixed().bytes())}), "id");
    std::map<std::pair<std::string, int>, int> records;
    for (const auto &row : found) records[{row["comp"], row["id"]}] = row["records"];
    EXPECT_EQ(records, (std::map<std::pair<std::string, int>, int>{
                           {{"IDX", 17}, 4}, {{"IDX", 18}, 1}, {{"WALK", 17}, 1}, {{"WALK", 19}, 1}}));
}

TEST(Stats, CountsByThread)
{
    const scratch_folder folder;
    const auto found = of_type(sound_objects("stats", {folder.file("a.trc", mixed().bytes())}), "thread");
    ASSERT_EQ(found.size(), 2U);
    EXPECT_EQ(found[0]["thread"], 0x7f01);
    EXPECT_EQ(found[0]["records"], 5);
    EXPECT_EQ(found[1]["thread"], 0x7f02);
    EXPECT_EQ(found[1]["records"], 3);
}

TEST(Stats, CountsEveryKindAsItIsDumped)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", every_kind().bytes());
    std::map<std::string, int> dumped;
    for (const auto &object : rows(run_qntrace({"dump", "--json", path})))
        if (object.at("type") == "record") ++dumped[object.at("kind")];
    std::map<std::string, int> counted;
    for (const auto &row : of_type(rows(run_qntrace({"stats", "--json", path})), "kind"))
        counted[row.at("kind")] = row.at("records");
    EXPECT_EQ(counted, dumped);
}

TEST(Stats, ABucketBeginsAtAMultipleOfItsLength)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", ids_from(999, {1, 2, 3}).bytes()); // at 0.999, 1.000 and 1.001 s
    const auto found = of_type(sound_objects("stats", {"--bucket", "1s", path}), "bucket");
    ASSERT_EQ(found.size(), 2U);
    EXPECT_EQ(found[0]["time"], "2026-11-21T05:12:00.000000000Z");
    EXPECT_EQ(found[0]["records"], 1);
    EXPECT_EQ(found[1]["time"], "2026-11-21T05:12:01.000000000Z");
    EXPECT_EQ(found[1]["records"], 2);
    EXPECT_EQ(found[1]["bytes"], 64);
    EXPECT_EQ(found[1]["width_ns"], "1000000000");
    EXPECT_EQ(found[1]["records_per_second"], 2.0);
}

TEST(Stats, ABucketBeforeTheEpochBeginsAtAMultipleToo)
{
    const scratch_folder folder;
    auto file = ids_from(0, {1});
    file.put_u64(32, static_cast<std::uint64_t>(-1'500'000'000)); // the counter's 0 is 1.5 s before 1970
    const auto found =
        of_type(sound_objects("stats", {"--bucket", "1s", folder.file("a.trc", file.bytes())}), "bucket");
    ASSERT_EQ(found.size(), 1U);
    EXPECT_EQ(found[0]["time"], "1969-12-31T23:59:58.000000000Z");
}

TEST(Stats, ChoosesBucketsThatAreFewAndHoldEveryRecord)
{
    const scratch_folder folder;
    for (const std::uint64_t span_us : {1U, 900U, 60'000U, 5'000'000U}) {
        trace_builder file(65536);
        for (std::uint64_t i = 0; i < 1000; ++i) {
            file.counter = i * span_us * 1000 / 1000;
            file.add_id(1);
        }
        file.close();
        const auto found = of_type(sound_objects("stats", {folder.file("a.trc", file.bytes())}), "bucket");
        std::uint64_t records = 0;
        for (const auto &bucket : found) records += bucket["records"].get<std::uint64_t>();
        EXPECT_EQ(records, 1000U);
        EXPECT_LE(found.size(), 60U);
        EXPECT_GE(found.size(), span_us < 10 ? 1U : 5U) << span_us;
    }
}

TEST(Stats, OneRecordFarOffLeavesFewBuckets)
{
    const scratch_folder folder;
    auto file = ids_from(1, {1, 2});
    file.put_u64(200 + 32 + 20, 3'000'000'000'000'000'000); // 95 years later
    const auto found = of_type(sound_objects("stats", {folder.file("a.trc", file.bytes())}), "bucket");
    EXPECT_EQ(found.size(), 2U);
}

TEST(Stats, CountsRecordsWithoutATime)
{
    const scratch_folder folder;
    auto file = ids_from(1, {1, 2});
    file.put_u64(24, 0); // no ticks a second
    const auto shown = run_qntrace({"stats", "--json", folder.file("a.trc", file.bytes())});
    EXPECT_EQ(shown.status, 1);
    const auto found = rows(shown);
    EXPECT_EQ(found[0]["records"], 2);
    EXPECT_EQ(found[0]["without_time"], 2);
    EXPECT_FALSE(found[0].contains("first"));
    EXPECT_TRUE(of_type(found, "bucket").empty());
}

TEST(Stats, CountsWhatIsLost)
{
    const scratch_folder folder;
    trace_builder page;
    page.put_u32(188, 1'795'237'900);
    page.component = "____";
    page.seq = 0xFFFFFFFE; // so that the note's is 0
    page.add(2, page.body().text("SPOOL: /tmp/app.trc.1.sp not spooled 1 consecutive time"));
    page.add_id(1);
    page.seq += 6;
    page.add_id(2);
    page.add(65535, page.body().u32(3));
    page.close();
    const auto shown = run_qntrace({"stats", "--json", folder.file("app.trc.1.sp", page.bytes())});
    EXPECT_EQ(shown.status, 1);
    const auto found = rows(shown);
    EXPECT_EQ(found[0]["records"], 3);
    EXPECT_EQ(found[0]["unfinished"], 1);
    EXPECT_EQ(found[0]["missing"], 3);
    EXPECT_EQ(found[0]["unspooled_pages"], 1);
    EXPECT_EQ(found[0]["last_reuse_time"], 1'795'237'900);
    EXPECT_EQ(found[0]["overwritten"], 0);
    std::uint64_t missing_in_buckets = 0;
    for (const auto &bucket : of_type(found, "bucket")) missing_in_buckets += bucket["missing"].get<std::uint64_t>();
    EXPECT_EQ(missing_in_buckets, 3U);
}

TEST(Stats, AFillerWithASequenceNumberOfItsOwnIsNoGap)
{
    const scratch_folder folder;
    trace_builder file;
    file.add_id(1);
    file.add_free(40, 4);
    file.seq = 4;
    file.add_id(2);
    file.close();
    EXPECT_EQ(total_of({folder.file("a.trc", file.bytes())})["missing"], 0);
}

TEST(Stats, SequenceNumbersThatWrapRoundAreNoGap)
{
    const scratch_folder folder;
    trace_builder file;
    file.seq = 0xFFFFFFFA;
    for (int i = 0; i < 5; ++i) file.add_id(1);
    file.close();
    EXPECT_EQ(total_of({folder.file("a.trc", file.bytes())})["missing"], 0);
}

TEST(Stats, TellsHowManyRecordsWereOverwrittenBeforeTheOldest)
{
    const scratch_folder folder;
    trace_builder file;
    file.seq = 20;
    file.add_id(1); // 22: ten came before it
    file.close();
    EXPECT_EQ(total_of({folder.file("a.trc", file.bytes())})["overwritten"], 10);
}

TEST(Stats, ShowsTheTopAndHowManyMoreThereAre)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", ids_from(1, {5, 6, 6, 7, 7, 7, 8}).bytes());
    const auto found = of_type(sound_objects("stats", {"--top", "2", path}), "id");
    ASSERT_EQ(found.size(), 2U);
    EXPECT_EQ(found[0]["id"], 7);
    EXPECT_EQ(found[1]["id"], 6);
    const auto shown = run_qntrace({"stats", "--top", "2", path});
    EXPECT_NE(shown.out.find("\nand 2 more\n"), std::string::npos) << shown.out;
}

TEST(Stats, WithTopZeroShowsEverything)
{
    const scratch_folder folder;
    std::vector<std::uint32_t> many(30);
    for (std::uint32_t i = 0; i < many.size(); ++i) many[i] = i;
    const auto path = folder.file("a.trc", ids_from(1, many).bytes());
    EXPECT_EQ(of_type(sound_objects("stats", {"--top", "0", path}), "id").size(), 30U);
    EXPECT_EQ(of_type(sound_objects("stats", {path}), "id").size(), 10U);
}

TEST(Stats, CountsTheSelectedRecordsOnly)
{
    const scratch_folder folder;
    const auto found =
        sound_objects("stats", {"--comp", "WALK", "--kind", "id", folder.file("a.trc", mixed().bytes())});
    EXPECT_EQ(of_type(found, "total")[0]["records"], 2);
    EXPECT_EQ(of_type(found, "component").size(), 1U);
}

TEST(Stats, ADamagedFileIsCountedAsFarAsItIsSound)
{
    const scratch_folder folder;
    auto file = ids_from(1, {1, 2, 3});
    file.put_u32(200 + 32, 0); // the length of the second record
    const auto path = folder.file("a.trc", file.bytes());
    const auto shown = run_qntrace({"stats", "--json", path});
    EXPECT_EQ(shown.status, 1);
    EXPECT_EQ(rows(shown)[0]["records"], 1);
    EXPECT_NE(shown.err.find(path + ": offset 232: record length 0"), std::string::npos) << shown.err;
}

TEST(Stats, AFileWithoutRecordsHasNoTables)
{
    const scratch_folder folder;
    const auto shown = run_qntrace({"stats", folder.file("a.trc", ids_from(1, {}).bytes())});
    EXPECT_EQ(shown.status, 0);
    EXPECT_EQ(shown.out, "files    1\nrecords  0, 0 bytes\nlost     nothing that the files tell of\n");
}

TEST(Stats, TheLongestBarIsThatOfTheFullestBucketAndGapsAreMarked)
{
    const scratch_folder folder;
    trace_builder file;
    for (const std::uint64_t at : {0U, 1U, 2U, 3U, 1000U, 1001U, 5000U}) {
        file.counter = at * 1'000'000;
        file.add_id(1);
    }
    file.close();
    const auto shown = run_qntrace({"stats", "--utc", "--bucket", "1s", folder.file("a.trc", file.bytes())});
    std::istringstream out(shown.out.substr(shown.out.find("TIME, 1s each")));
    strings bars;
    std::string line;
    std::getline(out, line);
    while (std::getline(out, line)) bars.push_back(line.substr(line.rfind(' ') + 1));
    EXPECT_EQ(bars, (strings{std::string(40, '#'), std::string(20, '#'), "0", std::string(10, '#')})) << shown.out;
}

class BadBucket : public testing::TestWithParam<const char *>
{
};

TEST_P(BadBucket, IsWrongUsage)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", ids_from(1, {1}).bytes());
    const auto shown = run_qntrace({"stats", "--bucket", GetParam(), path});
    EXPECT_EQ(shown.status, 2);
    EXPECT_EQ(shown.out, "");
    EXPECT_EQ(shown.err, "qntrace: --bucket takes a duration, like 1s or 250us\n");
}

INSTANTIATE_TEST_SUITE_P(Texts, BadBucket, testing::Values("1", "0s", "-1s", "s", "1x", "0.1ns"));

TEST(Stats, ABucketThatIsMuchTooShortIsWrongUsage)
{
    const scratch_folder folder;
    trace_builder file(4 << 20);
    for (int i = 0; i < 100'001; ++i) file.add_id(1); // a microsecond apart
    file.close();
    const auto shown = run_qntrace({"stats", "--bucket", "1ns", folder.file("a.trc", file.bytes())});
    EXPECT_EQ(shown.status, 2);
    EXPECT_EQ(shown.out, "");
    EXPECT_NE(shown.err.find("--bucket is so short"), std::string::npos) << shown.err;
}

TEST(Stats, CountsAPageSetAndItsCopiesOnce)
{
    constexpr std::uint64_t count = 20'000;
    const scratch_folder folder;
    {
        const writing_program writes(folder.path("app.trc"), folder.path("spool"), 0, count);
    }
    const auto found = sound_objects("stats", {folder.path("app.trc"), folder.path("spool")});
    EXPECT_EQ(of_type(found, "component")[0],
              (json{{"type", "component"}, {"comp", "WRIT"}, {"records", count}, {"bytes", count * 44}}));
    EXPECT_EQ(of_type(found, "total")[0]["missing"], 0);
}

} // namespace
} // namespace qn::test
