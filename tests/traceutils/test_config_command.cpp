// qntrace config: what it says of a file, as text and as JSON, and its exit statuses; and that the sample and the
// manual page show files that are right.
#include <filesystem>
#include <sstream>

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include "reader/program.h"
#include "support/private_var.h"
#include "support/scratch.h"

namespace qn::test
{
namespace
{

using json = nlohmann::json;

// The command's outcome on a file of that text.
outcome config_of(const std::string &text, const std::vector<std::string> &options = {})
{
    const scratch files;
    write_file(files / "trace.conf", text);
    std::vector<std::string> arguments = {"config"};
    arguments.insert(arguments.end(), options.begin(), options.end());
    arguments.push_back(files / "trace.conf");
    return run_qntrace(arguments);
}

std::vector<json> objects_of(const outcome &shown)
{
    std::vector<json> objects;
    std::istringstream lines(shown.out);
    for (std::string line; std::getline(lines, line);) objects.push_back(json::parse(line));
    return objects;
}

std::vector<json> sections_of(const std::string &text) { return objects_of(config_of(text, {"--json"})); }

json only_section_of(const std::string &text)
{
    const auto sections = sections_of(text);
    EXPECT_EQ(sections.size(), 1U);
    return sections.empty() ? json::object() : sections[0];
}

TEST(ConfigCommand, KeepsEveryByteOfANameThatIsNoUtf8InJson)
{
    const json section = only_section_of("b\xfcro:\npat = /x\n");
    EXPECT_EQ(section.at("encoding"), "latin-1");
    EXPECT_EQ(section.at("section"), "b\xc3\xbcro");
}

TEST(ConfigCommand, ShowsATraceSectionAsTheSpoolerTakesIt)
{
    const json section = only_section_of("# note\nt:\npat = /x.*\nspooling = on\ndest = /d\ntracesize = 8388609\n");
    EXPECT_EQ(section["type"], "trace");
    EXPECT_EQ(section["section"], "t");
    EXPECT_EQ(section["line"], 2);
    EXPECT_EQ(section["pattern"], "/x.*");
    EXPECT_EQ(section["spooling"], true);
    EXPECT_EQ(section["dest"], "/d");
    EXPECT_EQ(section["pages"], 32);
    EXPECT_EQ(section["page_bytes"], 262144);
    EXPECT_EQ(section["trace_bytes"], 8388608);
    EXPECT_EQ(section["sync_seconds"], 3600);
    EXPECT_FALSE(section.contains("fault"));
    EXPECT_FALSE(section.contains("notes"));
}

TEST(ConfigCommand, AppliesTheSmallestSizes)
{
    const json section = only_section_of("t:\npat = /x\npages = 2\nsize = 1000\n");
    EXPECT_EQ(section["pages"], 8);
    EXPECT_EQ(section["trace_bytes"], 2097152);
    EXPECT_EQ(section["spooling"], false);
    EXPECT_EQ(section["dest"], "/dev/null");
}

TEST(ConfigCommand, AppliesPagesTimesSize)
{
    EXPECT_EQ(only_section_of("t:\npat = /x\npages = 4\nsize = 1048576\n")["pages"], 16);
}

TEST(ConfigCommand, AppliesTheTraceSizeOfTheDefaultSection)
{
    const auto sections = sections_of("default:\ntracesize = 4194304\nt:\npat = /x\n");
    ASSERT_EQ(sections.size(), 2U);
    EXPECT_EQ(sections[0]["type"], "default");
    EXPECT_EQ(sections[0]["trace_bytes"], 4194304);
    EXPECT_EQ(sections[1]["pages"], 16);
}

TEST(ConfigCommand, SaysWhichDefaultSectionCounts)
{
    const auto sections = sections_of("default:\ntracesize = 1\ndest = a b\ndefault:\ntracesize = 2\ncolour = red\n"
                                      "default:\ntracesize = 3\ndefault:\ntracesize = 4\n");
    ASSERT_EQ(sections.size(), 5U);
    EXPECT_EQ(sections[0]["trace_bytes"], 1);
    EXPECT_EQ(sections[1]["type"], "faulty"); // "dest = a b" ended the first, and opened none
    EXPECT_EQ(sections[2]["type"], "faulty");
    EXPECT_FALSE(sections[3].contains("trace_bytes"));
    EXPECT_EQ(sections[3]["notes"][0], "only the first default section counts");
    EXPECT_FALSE(sections[4].contains("trace_bytes"));
}

TEST(ConfigCommand, ShowsTheValuesOfASpoolSectionAndThatTheLibraryCleansNothing)
{
    const json section = only_section_of("spoolarea_a:\nspool_dir = /d\ncleanup = ON\nspool_cleanup_interval = 1\n"
                                         "spool_retention_days = 2\nspool_directory_max_size = 3\n"
                                         "spool_startup_interval = 4\n");
    EXPECT_EQ(section["type"], "spool");
    EXPECT_EQ(section["spool_dir"], "/d");
    EXPECT_EQ(section["cleanup"], "ON");
    EXPECT_EQ(section["cleanup_interval"], 1);
    EXPECT_EQ(section["retention_days"], 2);
    EXPECT_EQ(section["dir_size"], 3);
    EXPECT_EQ(section["startup_interval"], 4);
    EXPECT_EQ(section["notes"], json({"the library itself removes nothing from a spool directory"}));
}

TEST(ConfigCommand, ShowsFaultySectionsInFileOrderWithLineAndReason)
{
    const outcome shown = config_of("t:\npat = /x\npat = /y\nu:\npat = /u\nv:\npages = 1\n", {"--json"});
    EXPECT_EQ(shown.status, 1);
    const auto sections = objects_of(shown);
    ASSERT_EQ(sections.size(), 3U);
    EXPECT_EQ(sections[0], json({{"type", "faulty"}, {"section", "t"}, {"line", 3}, {"fault", "a second \"pat\""}}));
    EXPECT_EQ(sections[1]["section"], "u");
    EXPECT_EQ(sections[1]["line"], 4);
    EXPECT_EQ(sections[2], json({{"type", "faulty"},
                                 {"section", "v"},
                                 {"line", 6},
                                 {"fault", "\"pat\" is missing at the end of the file"}}));
}

TEST(ConfigCommand, APatternThatIsNoExpressionIsAFault)
{
    const outcome shown = config_of("t:\npat = *.trc\nspooling = ON\n", {"--json"});
    EXPECT_EQ(shown.status, 1);
    EXPECT_EQ(objects_of(shown).at(0)["fault"], "the pattern is no POSIX extended regular expression");
}

TEST(ConfigCommand, NotesWhatIsNotTakenAsItWasMeant)
{
    const auto notes = [](const std::string &line) {
        return only_section_of("t:\npat = /x\n" + line + "\n").value("notes", json::array());
    };
    EXPECT_EQ(notes("sync_interval = 60"), json({"sync_interval is not used"}));
    EXPECT_EQ(notes("pages = 4k"), json({"pages = 4k is taken as 4"}));
    EXPECT_EQ(notes("pages = -1"), json({"pages = -1 is taken as 4294967295"}));
    EXPECT_EQ(notes("spooling = YES"), json({"spooling = YES is neither ON nor OFF"}));
    EXPECT_EQ(notes("Dest = /d"), json({"Dest is not used: keys are looked up in lower case"}));
    EXPECT_EQ(notes("spooling = ON"), json({"full pages are written anew without having been copied"}));
    EXPECT_EQ(notes("dest = /d\nspooling = off\npages = 4"), json::array());
}

TEST(ConfigCommand, NotesAnEmptyPattern)
{
    const json section = only_section_of("t:\nPAT = /x\n");
    EXPECT_EQ(section["pattern"], "");
    EXPECT_EQ(section["notes"], json({"PAT is not used: keys are looked up in lower case",
                                      "the empty pattern matches every trace file"}));
}

TEST(ConfigCommand, SaysTheSameAsText)
{
    const outcome shown = config_of("t:\npat = /x\nspooling = ON\ndest = /d\nsync_interval = 1\nu:\nnonsense\n");
    EXPECT_EQ(shown.status, 1);
    EXPECT_EQ(shown.err, "");
    EXPECT_EQ(shown.out, "line 1: trace section \"t\"\n"
                         "    pattern           \"/x\"\n"
                         "    spooling          on\n"
                         "    destination       \"/d\"\n"
                         "    pages             8\n"
                         "    page size         262144 bytes\n"
                         "    trace size        2097152 bytes\n"
                         "    sync interval     3600 seconds\n"
                         "    note              sync_interval is not used\n"
                         "line 7: faulty section \"u\"\n"
                         "    fault             not of the form KEY = VALUE\n");
}

TEST(ConfigCommand, EscapesNamesForTheTerminal)
{
    const outcome shown = config_of("\x1b[2Jx\xff:\npat = /x\n");
    EXPECT_EQ(shown.status, 0);
    EXPECT_EQ(shown.out.find('\x1b'), std::string::npos);
    EXPECT_NE(shown.out.find(R"("\x1b[2Jx\xff")"), std::string::npos) << shown.out;
}

TEST(ConfigCommand, JsonIsSoundWhateverANameHolds)
{
    EXPECT_EQ(only_section_of("\x1b\xff\":\npat = /x\n")["section"], "\x1b\xC3\xBF\"");
}

TEST(ConfigCommand, AFileWithoutSectionsIsSound)
{
    const outcome shown = config_of("# note\n");
    EXPECT_EQ(shown.status, 0);
    EXPECT_EQ(shown.out, "");
    EXPECT_NE(shown.err.find("there are no sections"), std::string::npos) << shown.err;
}

TEST(ConfigCommand, AMissingFileIsStatus3)
{
    const scratch files;
    const outcome shown = run_qntrace({"config", files / "missing.conf"});
    EXPECT_EQ(shown.status, 3);
    EXPECT_EQ(shown.out, "");
    EXPECT_NE(shown.err.find("missing.conf: No such file or directory"), std::string::npos) << shown.err;
}

TEST(ConfigCommand, AFolderIsStatus3)
{
    const scratch files;
    EXPECT_EQ(run_qntrace({"config", files.folder()}).status, 3);
}

TEST(ConfigCommand, AFileThatMayNotBeReadIsStatus3)
{
    const scratch files;
    write_file(files / "trace.conf", "t:\npat = /x\n");
    std::filesystem::permissions(files.folder(), std::filesystem::perms(0755));
    std::filesystem::permissions(files / "trace.conf", std::filesystem::perms(0));
    EXPECT_EQ(run_qntrace({"config", files / "trace.conf"}, {.as_nobody = true}).status, 3);
}

TEST(ConfigCommand, MoreThanOneFileIsWrongUsage) { EXPECT_EQ(run_qntrace({"config", "a", "b"}).status, 2); }

TEST(ConfigCommand, WithoutANameTheSystemsFileIsShown)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories("/var/qn/cfg");
        std::filesystem::create_directories("/var/tmp");
        write_file("/var/qn/cfg/trace.conf", "t:\npat = /x\n");
        const outcome shown = run_qntrace({"config", "--json"});
        EXPECT_EQ(shown.status, 0);
        EXPECT_EQ(objects_of(shown).at(0)["section"], "t");
        return true;
    }));
}

TEST(ConfigCommand, TheSampleHasNoFaultAndASectionOfEachKind)
{
    const outcome shown = run_qntrace({"config", "--json", SAMPLE_FILE});
    EXPECT_EQ(shown.status, 0) << shown.out;
    std::vector<std::string> types;
    for (const json &section : objects_of(shown)) types.push_back(section["type"]);
    EXPECT_EQ(types, (std::vector<std::string>{"default", "trace", "trace", "spool"}));
}

TEST(ConfigCommand, TheManualPagesExampleHasNoFault)
{
    const std::string page = contents_of(MANUAL_PAGE);
    const auto begin = page.find("\n.EX\n");
    ASSERT_NE(begin, std::string::npos);
    const auto end = page.find("\n.EE\n", begin);
    const outcome shown = config_of(page.substr(begin + 5, end - begin - 4), {"--json"});
    EXPECT_EQ(shown.status, 0) << shown.out;
    EXPECT_EQ(objects_of(shown).size(), 3U);
}

} // namespace
} // namespace qn::test
