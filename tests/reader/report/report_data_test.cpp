// qntrace report: what the page says about the traces.
#include <numeric>

#include <gtest/gtest.h>

#include "reader/errors/error_records.h"
#include "reader/every_kind.h"
#include "reader/report/report_page.h"
#include "reader/spool_directory.h"

namespace qn::test
{
namespace
{

using nlohmann::json;

// Two components and two threads: three records at 1.000000 s, 1.000001 s and 1.000002 s, one at 2 s.
trace_builder two_threads()
{
    trace_builder file;
    file.counter = 1'000'000'000;
    file.component = "AB";
    file.add_id(1);
    file.component = "CD";
    file.thread = 0x7f02;
    file.add_id(2);
    file.add_id(3);
    file.counter = 2'000'000'000;
    file.component = "AB";
    file.thread = 0x7f01;
    file.add_id(4);
    file.close();
    return file;
}

TEST(ReportData, SumsUpTheTraces)
{
    const auto summary = page_of(two_threads()).data().at("summary");
    EXPECT_EQ(summary.at("files"), 1);
    EXPECT_EQ(summary.at("records"), 4);
    EXPECT_EQ(summary.at("bytes"), 4 * 32);
    EXPECT_EQ(summary.at("errors"), 0);
    EXPECT_EQ(summary.at("nodes"), json({"000000000000abcd"}));
    EXPECT_EQ(summary.at("programs"), json({"app"}));
    EXPECT_EQ(summary.at("first").at("text"), "2026-11-21T05:12:01.000000000Z");
    EXPECT_EQ(summary.at("last").at("at"), 1.0);
    EXPECT_EQ(summary.at("lost"), "");
}

TEST(ReportData, HasARowForEachThread)
{
    const auto data = page_of(two_threads()).data();
    EXPECT_EQ(data.at("base"), "1795237921");
    const auto rows = data.at("rows");
    ASSERT_EQ(rows.size(), 2U);
    EXPECT_EQ(rows[0].at("thread"), 0x7f01);
    EXPECT_EQ(rows[0].at("records"), 2);
    EXPECT_EQ(rows[0].at("s"), json({0, 1}));
    EXPECT_EQ(rows[0].at("ns"), json({0, 0}));
    EXPECT_EQ(rows[0].at("text"), json({"id=1", "id=4"}));
    EXPECT_EQ(rows[1].at("thread"), 0x7f02);
    EXPECT_EQ(rows[1].at("ns"), json({1000, 2000}));
    EXPECT_EQ(data.at("components").at(rows[1].at("comp").at(0).get<std::size_t>()).at("name"), "CD");
    EXPECT_EQ(data.at("kinds").at(rows[0].at("kind").at(0).get<std::size_t>()), "id");
}

TEST(ReportData, CountsByComponentAndTime)
{
    const auto data = page_of(two_threads()).data();
    const auto rates = data.at("rates");
    EXPECT_EQ(rates.at("width_text"), "10ms");
    for (std::size_t i = 0; i < 2; ++i) {
        const auto counts = rates.at("counts").at(i).get<std::vector<int>>();
        ASSERT_EQ(counts.size(), 101U);
        const bool is_ab = data.at("components").at(i).at("name") == "AB";
        EXPECT_EQ(counts.front(), is_ab ? 1 : 2);
        EXPECT_EQ(counts.back(), is_ab ? 1 : 0);
    }
}

TEST(ReportData, KeepsTheOrderOfTimeWhereAClockStepsBack)
{
    trace_builder file;
    file.counter = 2'000'000'000;
    file.add_id(2);
    file.counter = 1'000'000'000;
    file.add_id(1);
    file.close();
    const auto row = page_of(file).data().at("rows").at(0);
    EXPECT_EQ(row.at("text"), json({"id=1", "id=2"}));
    EXPECT_EQ(row.at("s"), json({0, 1}));
}

TEST(ReportData, ShowsTimesBeforeTheEpoch)
{
    auto file = two_threads();
    file.put_u64(32, static_cast<std::uint64_t>(-1'500'000'000)); // the first record is 0.5 s before 1970
    const auto data = page_of(file).data();
    EXPECT_EQ(data.at("base"), "-1");
    EXPECT_EQ(data.at("rows").at(0).at("s"), json({0, 1}));
    EXPECT_EQ(data.at("rows").at(0).at("ns"), json({500'000'000, 500'000'000}));
    EXPECT_EQ(data.at("summary").at("first").at("at"), 0.5);
}

TEST(ReportData, MarksWhatIsMissing)
{
    trace_builder file;
    file.counter = 1'000'000'000;
    file.seq = static_cast<std::uint32_t>(-2);
    file.add(2, file.body().text("SPOOL: app.1.sp not spooled 3 consecutive times"));
    file.add_id(1);
    file.seq += 2 * 5;
    file.counter = 2'000'000'000;
    file.add_id(2);
    file.add(0xFFFF, file.body().u32(1));
    file.close();
    const auto data = page_of(file).data();
    const auto mark = [](const char *what, int count, double from, double to) {
        return json{{"what", what}, {"count", count}, {"process", 0}, {"trace", "a.trc"}, {"from", from}, {"to", to}};
    };
    EXPECT_EQ(data.at("marks"),
              (json{mark("unspooled", 3, 0, 0), mark("missing", 5, 0.000001, 1), mark("unfinished", 1, 1, 1)}));
    EXPECT_EQ(data.at("summary").at("losses").at("missing"), 5);
}

TEST(ReportData, HoldsTheErrorsAsTheCommandErrorsGroupsThem)
{
    const scratch_folder folder;
    trace_builder file(16384);
    for (int i = 0; i < 5; ++i) {
        error_record error;
        error.default_message = i % 2 == 0 ? "Other %1$d" : "Some \"%2$s\"";
        error.code = i;
        add_error(file, error);
    }
    file.close();
    const auto path = folder.file("a.trc", file.bytes());
    auto groups = make_page({path}).data().at("errors").at("rows");
    for (auto &group : groups) group.erase("at");
    auto wanted = rows(run_qntrace({"errors", "--json", "--utc", path}));
    ASSERT_EQ(wanted.size(), 3U);
    wanted.pop_back(); // the total
    EXPECT_EQ(groups, json(wanted));
}

TEST(ReportData, IsOfTheRecordsThatAreSelected)
{
    const auto data = page_of(two_threads(), {"--comp", "AB", "--id", "1"}).data();
    EXPECT_EQ(data.at("summary").at("records"), 1);
    EXPECT_EQ(data.at("summary").at("selection"), "--comp AB --id 1");
    EXPECT_EQ(data.at("rows").size(), 1U);
}

TEST(ReportData, HasTheTimesOfANodesClockPutRight)
{
    const auto data = page_of(two_threads(), {"--offset", "000000000000abcd=-1s"}).data();
    EXPECT_EQ(data.at("summary").at("first").at("text"), "2026-11-21T05:12:00.000000000Z");
    EXPECT_EQ(data.at("base"), "1795237920");
}

TEST(ReportData, IsEmptyForATraceWithoutRecords)
{
    trace_builder file;
    file.close();
    const auto page = page_of(file);
    EXPECT_EQ(page.made.status, 0);
    const auto data = page.data();
    EXPECT_EQ(data.at("rates"), nullptr);
    EXPECT_EQ(data.at("rows"), json::array());
    EXPECT_EQ(data.at("summary").count("first"), 0U);
}

TEST(ReportData, CountsRecordsWithoutATime)
{
    auto file = two_threads();
    file.put_u64(24, 0); // no ticks in a second: no usable time base
    const auto data = page_of(file).data();
    EXPECT_EQ(data.at("summary").at("records"), 4);
    EXPECT_EQ(data.at("summary").at("without_time"), 4);
    EXPECT_EQ(data.at("rows"), json::array());
    EXPECT_NE(data.at("notes").dump().find("4 records have no known time"), std::string::npos);
}

TEST(ReportData, SaysHowMuchOfALongBodyIsLeftOut)
{
    trace_builder file(16384);
    file.add_strings(1, {std::string(5000, 'a')});
    file.close();
    const auto text = page_of(file).data().at("rows").at(0).at("text").at(0).get<std::string>();
    EXPECT_TRUE(text.ends_with("aaa... [4007 bytes more]")) << text.substr(text.size() - 50);
}

TEST(ReportData, ThinsTheTimelineOfALongTraceAndSaysSo)
{
    constexpr int records = 210'000;
    trace_builder file(std::size_t{records} * 32 + 4096);
    for (int i = 0; i < records; ++i) file.add_id(1);
    add_error(file, {});
    file.close();
    const auto page = page_of(file);
    const auto data = page.data();
    const auto row = data.at("rows").at(0);
    EXPECT_EQ(row.at("records"), records + 1);
    EXPECT_EQ(row.at("text").size(), records / 2 + 1);
    EXPECT_EQ(row.at("errors"), 1);
    const std::string note = "The timeline shows 105001 of 210001 records, every error among them. "
                             "Rates and counts are exact.";
    EXPECT_EQ(data.at("notes"), json({note}));
    EXPECT_EQ(page.made.err, "qntrace: " + note + "\n");
    const auto counts = data.at("rates").at("counts").at(0).get<std::vector<int>>();
    EXPECT_EQ(std::accumulate(counts.begin(), counts.end(), 0), records + 1);
}

// The zone of the page for a trace whose records lie `days` apart, the first one on 2026-11-21.
json zone_of(const std::string &tz, std::uint64_t days)
{
    trace_builder file;
    file.add_id(1);
    file.counter = days * 86'400 * trace_builder::ticks_per_second;
    file.add_id(2);
    file.close();
    const scratch_folder folder;
    const auto path = folder.path("page.html");
    surroundings around;
    around.environment = {"LC_ALL=C", "TZ=" + tz};
    EXPECT_EQ(run_qntrace({"report", "-o", path, folder.file("a.trc", file.bytes())}, around).status, 0);
    return report_page{{}, contents_of(path)}.data().at("zone");
}

TEST(ReportData, IsInTheLocalZone)
{
    EXPECT_EQ(zone_of("XYZ-5:30", 1), (json{{"utc", false}, {"offset_minutes", 330}}));
    EXPECT_EQ(zone_of("CET-1CEST,M3.5.0,M10.5.0/3", 30), (json{{"utc", false}, {"offset_minutes", 60}}));
}

TEST(ReportData, IsInUtcWhereTheLocalZoneChangesItsOffset)
{
    const json utc = {{"utc", true}, {"offset_minutes", 0}};
    EXPECT_EQ(zone_of("CET-1CEST,M3.5.0,M10.5.0/3", 200), utc); // into the summer
    EXPECT_EQ(zone_of("CET-1CEST,M3.5.0,M10.5.0/3", 365), utc); // and out of it again
}

} // namespace
} // namespace qn::test
