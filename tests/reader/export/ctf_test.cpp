// qntrace export --to ctf: babeltrace2 reads every record, with its exact time, and how many are missing.
#include <algorithm>
#include <filesystem>
#include <regex>

#include <gtest/gtest.h>

#include "export/samples.h"
#include "reader/spool_directory.h"

namespace qn::test
{
namespace
{

// Time, sequence number, thread, component, kind, id.
using event = std::tuple<std::string, std::string, std::uint64_t, std::string, std::string, std::string>;

// In the order in which babeltrace2 prints them, that is by time.
std::vector<event> events_in(const std::string &ctf)
{
    static const std::regex line(R"re(\[0*(\d+)\] .*?([a-z0-9]+): \{ file = .*\}, )re"
                                 R"re(\{ seq = (\d+), thread = 0x([0-9A-F]+), comp = "(.*?)" \}, )re"
                                 R"re((?:\{ problem = .* \}, )?\{ (?:id = (\d+))?.*)re");
    std::vector<event> events;
    for (const auto &text : lines_of(shell("babeltrace2 --clock-cycles --no-delta '" + ctf + "' 2>/dev/null"))) {
        std::smatch parts;
        if (!std::regex_match(text, parts, line)) {
            ADD_FAILURE() << text;
            continue;
        }
        events.emplace_back(parts[1], parts[3], std::stoull(parts[4], nullptr, 16), parts[5], parts[2], parts[6]);
    }
    return events;
}

std::vector<event> events_merged(const strings &arguments)
{
    std::vector<event> events;
    for (const auto &line : merged_lines(arguments)) {
        const auto object = nlohmann::json::parse(line);
        // As babeltrace2 prints a text of one that was escaped.
        std::string component;
        for (const char c : object.at("comp").get<std::string>()) {
            if (c == '\\')
                component += "\\\\\\\\";
            else if (c == '"')
                component += "\\\"";
            else if (c < ' ' || c == '\x7f')
                component += c == '\x01' ? "\\\\x01" : "\\\\x7f";
            else
                component += c;
        }
        events.emplace_back(object.at("time_ns"), std::to_string(object.at("seq").get<std::uint32_t>()),
                            object.at("thread"), component, object.at("kind"),
                            object.contains("id") ? std::to_string(object["id"].get<std::uint32_t>()) : "");
    }
    return events;
}

std::vector<event> sorted(std::vector<event> events)
{
    std::sort(events.begin(), events.end());
    return events;
}

// As babeltrace2 tells it on standard error.
std::uint64_t discarded_in(const std::string &ctf)
{
    const auto said = shell("babeltrace2 '" + ctf + "' 2>&1 >/dev/null");
    EXPECT_EQ(said.find("may have"), std::string::npos) << said;
    static const std::regex number(R"(discarded (\d+) event)");
    std::uint64_t all = 0;
    for (std::sregex_iterator found(said.begin(), said.end(), number), end; found != end; ++found)
        all += std::stoull((*found)[1]);
    return all;
}

class Ctf : public testing::TestWithParam<sample>
{
};

TEST_P(Ctf, BabeltracePrintsEveryRecord)
{
    const scratch_folder folder;
    const auto arguments = GetParam().make(folder);
    exported("ctf", folder.path("out"), arguments);
    const auto found = events_in(folder.path("out"));
    EXPECT_EQ(sorted(found), sorted(events_merged(arguments)));
    EXPECT_TRUE(std::is_sorted(found.begin(), found.end(), [](const event &left, const event &right) {
        return std::get<0>(left) < std::get<0>(right);
    }));
}

TEST_P(Ctf, BabeltraceCountsWhatIsMissing)
{
    const scratch_folder folder;
    const auto arguments = GetParam().make(folder);
    exported("ctf", folder.path("out"), arguments);
    std::uint64_t missing = 0;
    for (const auto &[what, count] : losses_by_stats(arguments)) missing += count;
    EXPECT_EQ(discarded_in(folder.path("out")), missing);
}

TEST_P(Ctf, BabeltraceReadsItsOwnCopyAlike)
{
    const scratch_folder folder;
    const auto arguments = GetParam().make(folder);
    exported("ctf", folder.path("out"), arguments);
    shell("babeltrace2 '" + folder.path("out") + "' -o ctf -w '" + folder.path("copy") + "' 2>/dev/null");
    const auto copied = events_in(folder.path("copy"));
    EXPECT_FALSE(copied.empty());
    EXPECT_EQ(sorted(copied), sorted(events_in(folder.path("out"))));
    EXPECT_EQ(discarded_in(folder.path("copy")), discarded_in(folder.path("out")));
}

INSTANTIATE_TEST_SUITE_P(Samples, Ctf, testing::ValuesIn(samples()), sample_name);

// The fields of the records of one file, without times.
strings fields_of(const std::string &ctf)
{
    strings fields;
    for (const auto &line : lines_of(shell("babeltrace2 --no-delta '" + ctf + "' 2>/dev/null"))) {
        const auto kind = std::regex_replace(line, std::regex(R"(^\[[^\]]*\] \S+ (\w+): .*)"), "$1");
        fields.push_back(kind + ": " + std::regex_replace(line, std::regex(R"re(^.*?comp = ".*?" \}, )re"), ""));
    }
    return fields;
}

TEST(CtfExport, HasAllFieldsOfEveryKind)
{
    const scratch_folder folder;
    const auto arguments = samples().front().make(folder);
    exported("ctf", folder.path("out"), arguments);
    const auto found = fields_of(folder.path("out"));
    for (
        const auto &expected : strings{
            R"(note: { text = "SPOOL: app.1.sp not spooled 2 consecutive times" })",
            R"(start: { pid = 4711, ticks_per_second = 1000000000, epoch_ns = 1795237920000000000 })",
            R"(id: { id = 17 })", R"(id: { id = 4294967295 })",
            R"(data: { id = 21, count = 3, n_blocks = 3, lengths = [ [0] = 5, [1] = 0, [2] = 20 ], n_bytes = 25, )"
            R"(bytes = [ [0] = 0x68, [1] = 0x65, [2] = 0x6C, [3] = 0x6C, [4] = 0x6F, [5] = 0x30, [6] = 0x31, )"
            R"([7] = 0x32, [8] = 0x33, [9] = 0x34, [10] = 0x35, [11] = 0x36, [12] = 0x37, [13] = 0x38, [14] = 0x39, )"
            R"([15] = 0x61, [16] = 0x62, [17] = 0x63, [18] = 0x64, [19] = 0x65, [20] = 0x66, [21] = 0xFF, )"
            R"([22] = 0x0, [23] = 0xA, [24] = 0x1B ] })",
            R"(values32: { id = 22, number = 4, values = [ )"
            R"([0] = 3, [1] = 16, [2] = 4294967295, [3] = 305419896 ] })",
            R"(values64: { id = 23, number = 3, values = [ )"
            R"([0] = 7, [1] = 18446744073709481616, [2] = 9223372036854775808 ] })",
            R"(error: { id = 31, error_id = 18, line = 120, function = "open_it", file = "app.c", ffdc_id = "FF1", )"
            R"(catalogue = "app.cat", message_set = 1, message_number = 17, )"
            R"(default_message = "Error %1$d opening \"%5$s\": %2$ld %3$lld %4$g", )"
            R"(message = "Error -13 opening \"/tmp/\\x1b[1m\": -5 1099511627776 0.5", n_arguments = 6, arguments = [ )"
            R"([0] = { type = ( "int_value" : container = 0 ), bits = 0xFFFFFFFFFFFFFFF3, value = "-13" }, )"
            R"([1] = { type = ( "long_value" : container = 1 ), bits = 0xFFFFFFFFFFFFFFFB, value = "-5" }, )"
            R"([2] = { type = ( "long_long_value" : container = 2 ), bits = 0x10000000000, value = "1099511627776" }, )"
            R"([3] = { type = ( "double_value" : container = 3 ), bits = 0x3FE0000000000000, value = "0.5" }, )"
            R"([4] = { type = ( "text_value" : container = 5 ), bits = 0xEF, value = "/tmp/\\x1b[1m" }, )"
            R"([5] = { type = ( "pointer" : container = 6 ), bits = 0x7FFF1000, value = "0x7fff1000" } ] })",
            R"(strings: { id = 24, number = 6, strings = [ [0] = "plain", [1] = "tab\\there", )"
            R"([2] = "quote\"back\\\\slash", [3] = "\\x1b[31mred\\x07", [4] = "café", [5] = "" ] })",
            R"(strings: { id = 25, number = 1, strings = [ [0] = "not \\xff UTF-8" ] })",
            R"(restart: { pid = 4712, ticks_per_second = 1000000000, epoch_ns = 1795237921000000000, )"
            R"(text = "core event" })",
            R"(calibration: { ticks_per_second = 2000000000, epoch_ns = 1795237920000000000 })"}) {
        EXPECT_NE(std::find(found.begin(), found.end(), expected), found.end()) << expected << "\n"
                                                                                << testing::PrintToString(found);
    }
}

TEST(CtfExport, HasAFolderForEveryProgramOfANodeAndNamesItsHost)
{
    const scratch_folder folder;
    exported("ctf", folder.path("out"), samples().at(3).make(folder));
    EXPECT_EQ(shell("cd '" + folder.path("out") + "' && find . -type f | sort"),
              "./.qntrace-export\n"
              "./prod/host1/00000000000000a1/indexer/app.trc.stream\n"
              "./prod/host1/00000000000000a1/indexer/metadata\n"
              "./prod/host2/00000000000000a2/indexer/app.trc.stream\n"
              "./prod/host2/00000000000000a2/indexer/metadata\n");
    EXPECT_EQ(shell("babeltrace2 --no-delta '" + folder.path("out") +
                    "' | sed 's/^[^ ]* \\(host[12]\\) .* id = \\([0-9]*\\) .*/\\1 \\2/'"),
              "host1 1\nhost1 2\nhost2 11\nhost1 3\nhost2 12\nhost1 4\nhost2 13\nhost1 5\nhost1 6\n");
}

TEST(CtfExport, BeginsAsManyStreamsAsItsClockNeeds)
{
    const scratch_folder folder;
    exported("ctf", folder.path("out"), samples().at(4).make(folder));
    // 15, 13, 5, 1 are records that go back one below the other, and no five do.
    EXPECT_EQ(shell("find '" + folder.path("out") + "' -name '*.stream*' | wc -l"), "4\n");
}

TEST(CtfExport, KeepsTheTimesOfManyFilesOfOneNameThatOverlap)
{
    const scratch_folder folder;
    strings files;
    for (std::uint32_t i = 0; i < 100; ++i) {
        const auto name = std::to_string(i);
        std::filesystem::create_directory(folder.path(name));
        files.push_back(folder.file(name + "/app.trc", ids_from(1000 - i, {i, i, i}).bytes()));
    }
    exported("ctf", folder.path("out"), files);
    EXPECT_EQ(sorted(events_in(folder.path("out"))), sorted(events_merged(files)));
    EXPECT_EQ(shell("babeltrace2 '" + folder.path("out") + "' | grep -c problem || true"), "0\n");
}

TEST(CtfExport, CountsWhatIsMissingOfAFileWithoutRecords)
{
    const scratch_folder folder;
    trace_builder file;
    file.seq = 6; // three records were overwritten
    file.add(0xFFFF, file.body().u32(1));
    file.close();
    exported("ctf", folder.path("out"), {folder.file("a.trc", file.bytes())});
    EXPECT_EQ(discarded_in(folder.path("out")), 4U);
}

TEST(CtfExport, SaysWhatIsWrongWithARecord)
{
    const scratch_folder folder;
    trace_builder file;
    file.add_id(1);
    file.add(12, file.body().u32(22).u32(100).u32(3)); // a hundred values, room for one
    file.add(77, file.body().u32(5));
    file.close();
    exported("ctf", folder.path("out"), {folder.file("a.trc", file.bytes())});
    EXPECT_EQ(
        fields_of(folder.path("out")),
        (strings{
            R"(id: { id = 1 })",
            R"(values32: { problem = "100 values are announced, 1 fit" }, { id = 22, number = 1, values = [ [0] = 3 ] })",
            R"(unknown: { problem = "no record is of kind 77" }, )"
            R"({ code = 77, length = 4, bytes = [ [0] = 0x5, [1] = 0x0, [2] = 0x0, [3] = 0x0 ] })"}));
}

// The times of all events, and what is wrong with each.
strings times_and_problems(const std::string &ctf)
{
    static const std::regex time(R"(^\[0*(\d+)\])");
    static const std::regex problem(R"re(problem = "((?:[^"\\]|\\.)*)")re");
    strings found;
    for (const auto &line : lines_of(shell("babeltrace2 --clock-cycles --no-delta '" + ctf + "' 2>/dev/null"))) {
        std::smatch when;
        std::smatch what;
        std::regex_search(line, when, time);
        found.push_back(when[1].str() + (std::regex_search(line, what, problem) ? " " + what[1].str() : ""));
    }
    return found;
}

TEST(CtfExport, TellsTheCounterOfRecordsWhoseTimeIsNotKnown)
{
    const scratch_folder folder;
    trace_builder file;
    file.put_u64(24, 0); // no time base
    file.add_id(1);
    file.add_start(1, trace_builder::ticks_per_second, trace_builder::epoch_ns);
    file.add_id(2);
    file.close();
    exported("ctf", folder.path("out"), {folder.file("a.trc", file.bytes())});
    EXPECT_EQ(times_and_problems(folder.path("out")),
              (strings{R"(0 the record\'s time is not known, its counter is 1123456789)", "1795237921123457789",
                       "1795237921123458789"}));
}

TEST(CtfExport, TellsTimesBefore1970InWords)
{
    const scratch_folder folder;
    trace_builder file;
    file.put_u64(32, static_cast<std::uint64_t>(-5'000'000'000));
    file.add_id(1);
    file.close();
    exported("ctf", folder.path("out"), {folder.file("a.trc", file.bytes())});
    EXPECT_EQ(times_and_problems(folder.path("out")),
              (strings{R"(0 the record\'s time is -3876543211 ns since 1970)"}));
}

TEST(CtfExport, GivesUpWithTimesThatGoBackAllTheTimeAndKeepsThemInWords)
{
    const scratch_folder folder;
    trace_builder file(16384);
    for (std::uint32_t i = 0; i < 100; ++i) {
        file.counter = 1'000'000'000 - i;
        file.add_id(i);
    }
    file.close();
    exported("ctf", folder.path("out"), {folder.file("a.trc", file.bytes())});
    EXPECT_EQ(events_in(folder.path("out")).size(), 100U);
    EXPECT_EQ(shell("find '" + folder.path("out") + "' -name '*.stream*' | wc -l"), "64\n");
    const auto printed = shell("babeltrace2 '" + folder.path("out") + "'");
    EXPECT_NE(printed.find("time is 1795237920999999901 ns since 1970"), std::string::npos) << printed;
}

} // namespace
} // namespace qn::test
