// qntrace export --to chrome: JSON whose times are exact, one event for every record.
#include <algorithm>
#include <map>

#include <gtest/gtest.h>

#include "export/samples.h"
#include "reader/every_kind.h"
#include "reader/spool_directory.h"

namespace qn::test
{
namespace
{

using nlohmann::json;

json exported_json(const scratch_folder &folder, const strings &arguments)
{
    exported("chrome", folder.path("out.json"), arguments);
    return json::parse(contents_of(folder.path("out.json")));
}

std::vector<json> events_of(const json &exported, const std::string &phase)
{
    std::vector<json> found;
    for (const auto &event : exported.at("traceEvents"))
        if (event.at("ph") == phase) found.push_back(event);
    return found;
}

// jq keeps the digits of no number: what stands in the text behind a name, up to the next comma.
std::vector<std::int64_t> nanoseconds_in(const std::string &text, const std::string &name)
{
    std::vector<std::int64_t> found;
    for (const auto &line : lines_of(text)) {
        const auto at = line.find("\"" + name + "\":");
        if (line.find("\"ph\":\"X\"") == std::string::npos || at == std::string::npos) continue;
        auto digits = line.substr(at + name.size() + 3);
        digits = digits.substr(0, digits.find(','));
        EXPECT_EQ(digits.find('.') + 4, digits.size()) << line;
        digits.erase(digits.find('.'), 1);
        found.push_back(std::stoll(digits));
    }
    return found;
}

class Chrome : public testing::TestWithParam<sample>
{
};

TEST_P(Chrome, HasEveryRecordAtItsExactTime)
{
    const scratch_folder folder;
    const auto arguments = GetParam().make(folder);
    const auto found = exported_json(folder, arguments);
    const std::int64_t origin = std::stoll(found.at("otherData").at("origin_ns").get<std::string>());
    const auto times = nanoseconds_in(contents_of(folder.path("out.json")), "ts");
    const auto events = events_of(found, "X");
    ASSERT_EQ(times.size(), events.size());
    strings expected;
    strings records;
    for (const auto &line : merged_lines(arguments)) {
        auto object = json::parse(line);
        for (const char *origin : {"path", "cluster", "node", "node_id", "program", "trace"}) object.erase(origin);
        expected.push_back(object.dump());
    }
    for (std::size_t i = 0; i < events.size(); ++i) {
        auto record = events[i].at("args");
        EXPECT_EQ(std::to_string(origin + times[i]), record.at("time_ns"));
        EXPECT_EQ(events[i].at("tid"), record.at("thread"));
        record.erase("path");
        records.push_back(record.dump());
    }
    std::sort(expected.begin(), expected.end());
    std::sort(records.begin(), records.end());
    EXPECT_EQ(records, expected);
}

TEST_P(Chrome, TellsWhatIsMissing)
{
    const scratch_folder folder;
    const auto arguments = GetParam().make(folder);
    counts found = {{"unfinished", 0}, {"missing", 0}, {"overwritten", 0}, {"unspooled_pages", 0}};
    for (const auto &event : events_of(exported_json(folder, arguments), "i")) {
        EXPECT_EQ(event.at("s"), "g");
        EXPECT_EQ(event.at("name"), "lost");
        for (auto &[what, count] : found) count += event.at("args").value(what, 0U);
    }
    EXPECT_EQ(found, losses_by_stats(arguments));
}

INSTANTIATE_TEST_SUITE_P(Samples, Chrome, testing::ValuesIn(samples()), sample_name);

TEST(ChromeExport, NamesAProcessForEveryProgramOfANodeAndATrackForEveryThread)
{
    const scratch_folder folder;
    std::map<std::string, json> names;
    for (const auto &event : events_of(exported_json(folder, samples().at(3).make(folder)), "M"))
        names[event.at("name").get<std::string>() + " " + event.at("pid").dump() + " " + event.at("tid").dump()] =
            event.at("args").at("name");
    EXPECT_EQ(names, (std::map<std::string, json>{{"process_name 1 0", "indexer on host1"},
                                                  {"process_name 2 0", "indexer on host2"},
                                                  {"thread_name 1 32513", "thread 0x00007f01"},
                                                  {"thread_name 2 32513", "thread 0x00007f01"}}));
}

TEST(ChromeExport, LetsARecordLastUntilTheNextOneOfItsThreadAndNoLongerThanAMillisecond)
{
    const scratch_folder folder;
    trace_builder file;
    const auto add = [&](std::uint32_t thread, std::uint64_t microsecond) {
        file.thread = thread;
        file.counter = 1'000'000'000 + microsecond * 1000;
        file.add_id(1);
    };
    add(1, 0);
    add(2, 1);
    add(1, 5);    // 5 us after the first one
    add(1, 2000); // more than a millisecond
    add(2, 2001);
    file.close();
    std::map<std::string, double> lasts;
    for (const auto &event : events_of(exported_json(folder, {folder.file("a.trc", file.bytes())}), "X"))
        lasts[event.at("tid").dump() + " at " + event.at("ts").dump()] = event.at("dur");
    EXPECT_EQ(
        lasts,
        (std::map<std::string, double>{
            {"1 at 0.0", 4.999}, {"1 at 2000.0", 1}, {"1 at 5.0", 1000}, {"2 at 1.0", 1000}, {"2 at 2001.0", 1}}));
}

TEST(ChromeExport, CountsFromTheFirstRecordThatIsExported)
{
    const scratch_folder folder;
    const auto found = exported_json(folder, {"--id", "3", folder.file("a.trc", ids_from(7, {1, 2, 3}).bytes())});
    EXPECT_EQ(found.at("otherData").at("origin_ns"), "1795237920009000000");
    EXPECT_EQ(events_of(found, "X").at(0).at("ts"), 0.0);
}

TEST(ChromeExport, WritesIntoAPipe)
{
    const scratch_folder folder;
    const auto file = folder.file("a.trc", ids_from(7, {1, 2, 3}).bytes());
    const auto piped = shell(std::string(QNTRACE_PROGRAM) + " export --to chrome -o /dev/stdout '" + file + "' | cat");
    EXPECT_EQ(events_of(json::parse(piped), "X").size(), 3U);
}

} // namespace
} // namespace qn::test
