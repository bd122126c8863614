// qntrace dump with a selection: on the golden trace, on a trace that the library has just written, and its colours.
#include <gtest/gtest.h>

#include <ctime>
#include <sstream>
#include <string>
#include <vector>

#include <nlohmann/json.hpp>

#include "reader/every_kind.h"
#include "reader/program.h"
#include "reader/reading.h"
#include "reader/terminal.h"

namespace qn::test
{
namespace
{

using strings = std::vector<std::string>;
using seqs = std::vector<std::uint32_t>;

const std::string golden_trace = std::string(GOLDEN_FOLDER) + "/golden.trc";

outcome dump(strings options, const std::string &path, const surroundings &around = {})
{
    options.insert(options.begin(), "dump");
    options.push_back(path);
    return run_qntrace(options, around);
}

seqs seqs_of(const std::string &lines)
{
    seqs result;
    std::istringstream in(lines);
    for (std::string line; std::getline(in, line);) {
        const auto object = nlohmann::json::parse(line);
        if (object["type"] == "record") result.push_back(object["seq"]);
    }
    return result;
}

// Sequence numbers of the records of the golden trace that are shown.
seqs shown(strings options)
{
    options.emplace_back("--json");
    return seqs_of(dump(options, golden_trace).out);
}

TEST(DumpSelection, TakesNamesAndNumbersInListsAndAgain)
{
    EXPECT_EQ(shown({"--comp", "TEXT"}), (seqs{236, 238, 240, 242, 244}));
    EXPECT_EQ(shown({"--comp", "TEXT,AB"}), (seqs{236, 238, 240, 242, 244, 248, 250}));
    EXPECT_EQ(shown({"--comp", "TEXT", "--comp=AB"}), (seqs{236, 238, 240, 242, 244, 248, 250}));
    EXPECT_EQ(shown({"--kind", "restart,error", "--kind", "data"}), (seqs{232, 248, 250, 254, 256}));
    EXPECT_EQ(shown({"--id", "30-32,201", "--id", "221"}), (seqs{62, 64, 66, 224, 248}));
    EXPECT_EQ(shown({"--thread", "0x26a1d6c0"}), (seqs{236, 238, 240, 242, 244}));
    EXPECT_EQ(shown({"--thread", "648140480,0x1"}), (seqs{236, 238, 240, 242, 244}));
}

TEST(DumpSelection, TakesTimesToTheNanosecond)
{
    EXPECT_EQ(shown({"--since", "2026-11-21T07:02:27.709651209Z"}), (seqs{254, 256}));
    EXPECT_EQ(shown({"--since", "2026-11-21T07:02:27.709651210Z"}), seqs{256});
    EXPECT_EQ(shown({"--until", "2026-11-21T07:02:27.706437539"}), (seqs{62, 64}));
    EXPECT_EQ(shown({"--until", "2026-11-21T07:02:27.706437538"}), seqs{62});
}

TEST(DumpSelection, TakesRegularAndFilterExpressions)
{
    EXPECT_EQ(shown({"--grep", "^Cannot read|formatted [0-9]+"}), (seqs{244, 254}));
    EXPECT_EQ(shown({"--grep", "-x"}), seqs{});
    EXPECT_EQ(shown({"--grep", "[qz]"}), seqs{236}); // no list in brackets
    EXPECT_EQ(shown({"--where", R"(comp == "IDX" && id >= 200 && !(kind == "error"))"}), (seqs{224, 226, 228, 230}));
    EXPECT_EQ(shown({"--where", "value == -1", "--id", "204"}), seqs{230});
    EXPECT_EQ(
        shown({"--where", R"(file =~ "/golden\\.trc$" && program == "write_golden" && node == 0xabcd && id < 31)"}),
        seqs{62});
}

TEST(DumpSelection, LastTakesTheNewestOfWhatIsSelected)
{
    EXPECT_EQ(shown({"--last", "2"}), (seqs{254, 256}));
    EXPECT_EQ(shown({"--last", "2", "--comp", "TEXT"}), (seqs{242, 244}));
    EXPECT_EQ(shown({"--last", "0"}), seqs{});
    EXPECT_EQ(shown({"--last", "1000000000000", "--comp", "AB"}), (seqs{248, 250}));
}

TEST(DumpSelection, LastCountsForEachFile)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", every_kind().bytes());
    EXPECT_EQ(seqs_of(run_qntrace({"dump", "--json", "--last", "1", golden_trace, path}).out), (seqs{256, 28}));
}

TEST(DumpSelection, ShowsTheChosenRecordsAsTheWholeDumpDoes)
{
    const scratch_folder folder;
    const auto file = every_kind();
    const auto path = folder.file("a.trc", file.bytes());
    for (const bool raw : {false, true}) {
        for (const bool json : {false, true}) {
            strings options = {"--utc"};
            if (raw) options.emplace_back("--raw");
            if (json) options.emplace_back("--json");
            const auto whole = dump(options, path).out;
            for (const strings &all_of_them : {strings{"--last", "100"}, strings{"--where", "seq >= 0"},
                                               strings{"--last", "16", "--where", "seq >= 0"}}) {
                auto chosen = options;
                chosen.insert(chosen.end(), all_of_them.begin(), all_of_them.end());
                EXPECT_EQ(dump(chosen, path).out, whole);
            }
        }
    }
}

TEST(DumpSelection, FillersAndUnfinishedRecordsAreThereToBeSelectedWithRawOnly)
{
    EXPECT_EQ(shown({"--kind", "free,unfinished"}), seqs{});
    EXPECT_EQ(shown({"--kind", "unfinished", "--raw"}), seqs{258});
}

TEST(DumpSelection, PrintsTheHeaderOfAFileOfWhichNothingIsSelected)
{
    const auto run = dump({"--utc", "--comp", "NONE"}, golden_trace);
    EXPECT_EQ(run.out.substr(0, 5), "file ");
    EXPECT_EQ(run.out.substr(run.out.rfind("TIME")).find('\n'), run.out.size() - run.out.rfind("TIME") - 1);
}

TEST(DumpSelection, TellsWhatIsWrongWithAFileWhateverIsSelected)
{
    const auto run = dump({"--comp", "NONE"}, golden_trace);
    EXPECT_EQ(run.status, 1);
    EXPECT_NE(run.err.find("offset 1112: this record is being written"), std::string::npos);
}

TEST(DumpSelection, RelativeTimesAreThoseOfTheClock)
{
    const scratch_folder folder;
    const auto path = folder.path("new.trc");
    timespec before = {};
    clock_gettime(CLOCK_REALTIME, &before);
    ASSERT_EQ(run_program(WRITE_GOLDEN_PROGRAM, {path}).status, 0);
    const auto all = seqs_of(dump({"--json"}, path).out);
    ASSERT_FALSE(all.empty());
    EXPECT_EQ(seqs_of(dump({"--json", "--since", "-1h"}, path).out), all);
    EXPECT_EQ(seqs_of(dump({"--json", "--where", "time > \"-1h\" && time < \"-0s\""}, path).out), all);
    EXPECT_EQ(seqs_of(dump({"--json", "--until", "-1h"}, path).out), seqs{});
    EXPECT_EQ(seqs_of(dump({"--json", "--since", "@" + std::to_string(before.tv_sec - 1)}, path).out), all);
}

TEST(DumpSelection, WhatTheLibraryHasWrittenIsFoundByItsContents)
{
    const scratch_folder folder;
    const auto path = folder.path("new.trc");
    ASSERT_EQ(run_program(WRITE_GOLDEN_PROGRAM, {path}).status, 0);
    const auto ids_of = [&](const strings &options) {
        strings with_json = options;
        with_json.emplace_back("--json");
        std::vector<std::uint32_t> ids;
        std::istringstream in(dump(with_json, path).out);
        for (std::string line; std::getline(in, line);) {
            const auto object = nlohmann::json::parse(line);
            if (object["type"] == "record") ids.push_back(object["id"]);
        }
        return ids;
    };
    EXPECT_EQ(ids_of({"--comp", "TEXT", "--id", "0-1000"}), (seqs{211, 212, 213, 214}));
    EXPECT_EQ(ids_of({"--where", "value == -5 || value == 0xfffffffffffeee90"}), (seqs{202, 203}));
    EXPECT_EQ(ids_of({"--grep", "error 13 after 100 of 1099511627776 bytes, 12\\.5 %"}), seqs{231});
    EXPECT_EQ(ids_of({"--where", "text == \"formatted 42\""}), seqs{214});
    EXPECT_EQ(ids_of({"--kind", "id", "--last", "3"}), (seqs{108, 109, 110}));
}

TEST(DumpSelection, AWrongOptionIsStatus2AndSaysWhatWasExpected)
{
    const struct {
        strings options;
        std::string message;
    } cases[] = {
        {{"--kind", "id,ids"}, "--kind: ids is no kind; there are free, unfinished, id, note, data, "},
        {{"--thread", "main"}, "--thread: expected a number of at most 32 bits"},
        {{"--id", "9-1"}, "--id: expected a number N, or a range N-M that goes up"},
        {{"--since", "soon"}, "--since: expected a time such as 2026-11-21T05:12:01.123456789Z"},
        {{"--until", "10min"}, "--until: expected a time such as 2026-11-21T05:12:01.123456789Z"},
        {{"--grep", "*("}, "--grep: this is no regular expression: "},
        {{"--last", "-1"}, "--last: expected a number"},
        {{"--last", "many"}, "--last: expected a number"},
        {{"--color", "blue"}, "--color: blue not in {auto,always,never}"},
        {{"--where", "comp = \"IDX\""}, "--where: column 6: expected == or =~\n    comp = \"IDX\"\n         ^\n"},
    };
    for (const auto &wrong : cases) {
        const auto run = dump(wrong.options, golden_trace);
        EXPECT_EQ(run.status, 2);
        EXPECT_EQ(run.out, "");
        EXPECT_EQ(run.err.substr(0, wrong.message.size()), wrong.message);
    }
}

TEST(DumpSelection, TheHelpHasItsOptions)
{
    const auto help = run_qntrace({"dump", "--help"}).out;
    for (const auto *option :
         {"--comp", "--kind", "--thread", "--id", "--since", "--until", "--grep", "--where", "--last", "--color"}) {
        EXPECT_NE(help.find(option), std::string::npos) << option;
    }
}

std::string without_colors(std::string text)
{
    for (const std::string color : {"\x1b[36m", "\x1b[32m", "\x1b[1;31m", "\x1b[1;33m", "\x1b[m"}) {
        for (auto at = text.find(color); at != std::string::npos; at = text.find(color)) {
            text.erase(at, color.size());
        }
    }
    return text;
}

bool is_colored(const std::string &text) { return text.find('\x1b') != std::string::npos; }

TEST(DumpColor, ShowsComponentsKindsErrorsAndNotices)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", every_kind().bytes());
    const auto out = dump({"--utc", "--color", "always"}, path).out;
    for (const std::string line :
         {"0x00007f01  \x1b[36mIDX\x1b[m   \x1b[32mid\x1b[m           id=17\n",
          "\x1b[36m____\x1b[m  \x1b[1;33mnote\x1b[m         \x1b[1;33m\"SPOOL: app.1.sp not spooled 2 consecutive "
          "times\"\x1b[m\n",
          "\x1b[36mIDX\x1b[m   \x1b[1;31merror\x1b[m        \x1b[1;31mid=31 error=18 at app.c:120 in open_it\n",
          "    argument 6 pointer 0x7fff1000\x1b[m\n", "\x1b[1;33mrestart\x1b[m      \x1b[1;33mpid=4712"}) {
        EXPECT_NE(out.find(line), std::string::npos) << line;
    }
}

TEST(DumpColor, AddsNothingButColorsAndTakesNoneFromTheFile)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", every_kind().bytes());
    for (const strings &options : {strings{"--utc"}, strings{"--utc", "--raw"}}) {
        auto colored = options;
        colored.emplace_back("--color=always");
        const auto plain = dump(options, path).out;
        EXPECT_FALSE(is_colored(plain));
        EXPECT_EQ(without_colors(dump(colored, path).out), plain);
    }
}

TEST(DumpColor, IsNotForJson) { EXPECT_FALSE(is_colored(dump({"--json", "--color", "always"}, golden_trace).out)); }

TEST(DumpColor, IsWantedWhenAskedForWhateverTheEnvironmentSays)
{
    EXPECT_TRUE(is_colored(dump({"--color", "always"}, golden_trace, {.environment = {"NO_COLOR=1"}}).out));
    EXPECT_FALSE(is_colored(dump({"--color", "auto"}, golden_trace).out)); // no terminal
    EXPECT_FALSE(is_colored(dump({"--color", "never"}, golden_trace).out));
}

bool is_colored_on_a_terminal(strings options, strings environment)
{
    options.insert(options.begin(), "dump");
    options.push_back(golden_trace);
    environment.emplace_back("QNTRACE_PAGER=");
    return is_colored(run_on_terminal(options, environment).screen);
}

TEST(DumpColor, IsForATerminalUnlessTheEnvironmentSaysNo)
{
    EXPECT_TRUE(is_colored_on_a_terminal({}, {"TERM=xterm"}));
    EXPECT_TRUE(is_colored_on_a_terminal({}, {"TERM=xterm", "NO_COLOR="}));
    EXPECT_FALSE(is_colored_on_a_terminal({}, {"TERM=xterm", "NO_COLOR=1"}));
    EXPECT_FALSE(is_colored_on_a_terminal({}, {"TERM=dumb"}));
    EXPECT_FALSE(is_colored_on_a_terminal({"--color", "never"}, {"TERM=xterm"}));
    EXPECT_TRUE(is_colored_on_a_terminal({"--color", "always"}, {"TERM=dumb"}));
}

} // namespace
} // namespace qn::test
