// How sections begin, end and fail.
#include <gtest/gtest.h>

#include "traceutils/conf_seen.h"

namespace
{
using namespace qn::test;

using chunks = std::vector<chunk_seen>;

chunks read_chunks(const std::string &text) { return read_conf(text).chunks; }

const pairs all_trace_pairs = {{"pat", "/x"},  {"spooling", "ON"},   {"pages", "4"},         {"dest", "/d"},
                               {"size", "99"}, {"tracesize", "100"}, {"sync_interval", "60"}};
const pairs all_spool_pairs = {{"spool_dir", "/d"},
                               {"cleanup", "ON"},
                               {"spool_cleanup_interval", "1"},
                               {"spool_retention_days", "2"},
                               {"spool_directory_max_size", "3"},
                               {"spool_startup_interval", "4"}};
const pairs all_default_pairs = {{"spooling", "ON"}, {"tracesize", "1"}, {"dest", "/d"}};

std::string text_of(const std::string &name, const pairs &list)
{
    std::string text = name + ":\n";
    for (const auto &[key, value] : list) text += key + " = " + value + "\n";
    return text;
}

TEST(ConfStates, TheUsualFileHasThreeGoodSections)
{
    const std::string standard = "default:\ntracesize = 2097152\nspooling = OFF\ndest = /var/qn/trace_spool\n";
    const std::string daemon = "daemon_traces:\npat = /var/qn/.*/log/.*\nspooling = ON\npages = 4\n"
                               "dest = /data/trace_spool\nsize = 1048576\n";
    const std::string area = "spoolarea_main:\nspool_dir = /data/trace_spool\ncleanup = ON\n"
                             "spool_retention_days = 7\nspool_directory_max_size = 1024\n";
    EXPECT_EQ(read_chunks("# trace settings\n" + standard + daemon + area),
              (chunks{comment("# trace settings\n"),
                      good("default", {{"tracesize", "2097152"}, {"spooling", "OFF"}, {"dest", "/var/qn/trace_spool"}},
                           standard),
                      good("daemon_traces",
                           {{"pat", "/var/qn/.*/log/.*"},
                            {"spooling", "ON"},
                            {"pages", "4"},
                            {"dest", "/data/trace_spool"},
                            {"size", "1048576"}},
                           daemon),
                      good("spoolarea_main",
                           {{"spool_dir", "/data/trace_spool"},
                            {"cleanup", "ON"},
                            {"spool_retention_days", "7"},
                            {"spool_directory_max_size", "1024"}},
                           area)}));
}

TEST(ConfStates, EveryKeyOfATraceSectionIsTaken)
{
    const std::string text = text_of("t", all_trace_pairs);
    EXPECT_EQ(read_chunks(text), chunks{good("t", all_trace_pairs, text)});
}

TEST(ConfStates, EveryKeyOfASpoolSectionIsTaken)
{
    const std::string text = text_of("spoolarea_a", all_spool_pairs);
    EXPECT_EQ(read_chunks(text), chunks{good("spoolarea_a", all_spool_pairs, text)});
}

TEST(ConfStates, EveryKeyOfADefaultSectionIsTaken)
{
    const std::string text = text_of("default", all_default_pairs);
    EXPECT_EQ(read_chunks(text), chunks{good("default", all_default_pairs, text)});
}

// A comment behind a section that is closed is a chunk; in an open section it would be dropped.
TEST(ConfStates, ASectionWithAllItsKeysIsClosedAtOnce)
{
    for (const auto &[name, list] : std::vector<std::pair<std::string, pairs>>{
             {"t", all_trace_pairs}, {"spoolarea_a", all_spool_pairs}, {"default", all_default_pairs}}) {
        const std::string text = text_of(name, list);
        EXPECT_EQ(read_chunks(text + "# behind\n"), (chunks{good(name, list, text), comment("# behind\n")}));
    }
}

TEST(ConfStates, ASectionWithAKeyLeftStaysOpen)
{
    for (const auto &[name, list] : std::vector<std::pair<std::string, pairs>>{
             {"t", all_trace_pairs}, {"spoolarea_a", all_spool_pairs}, {"default", all_default_pairs}}) {
        pairs fewer = list;
        fewer.pop_back();
        const std::string text = text_of(name, fewer);
        EXPECT_EQ(read_chunks(text + "# behind\n"), chunks{good(name, fewer, text)});
    }
}

TEST(ConfStates, ACompleteTraceSectionEndsAtTheNextHeader)
{
    EXPECT_EQ(read_chunks("a:\npat = /a\nb:\npat = /b\n"),
              (chunks{good("a", {{"pat", "/a"}}, "a:\npat = /a\n"), good("b", {{"pat", "/b"}}, "b:\npat = /b\n")}));
}

TEST(ConfStates, ACompleteSpoolSectionEndsAtTheNextHeader)
{
    const std::string area = "spoolarea_a:\ncleanup = ON\nspool_dir = /d\n";
    EXPECT_EQ(read_chunks(area + "b:\npat = /b\n"),
              (chunks{good("spoolarea_a", {{"cleanup", "ON"}, {"spool_dir", "/d"}}, area),
                      good("b", {{"pat", "/b"}}, "b:\npat = /b\n")}));
}

TEST(ConfStates, ADefaultSectionEndsAtTheNextHeaderWithWhateverItHas)
{
    EXPECT_EQ(read_chunks("default:\ndefault:\ndest = /d\nb:\npat = /b\n"),
              (chunks{good("default", {}, "default:\n"), good("default", {{"dest", "/d"}}, "default:\ndest = /d\n"),
                      good("b", {{"pat", "/b"}}, "b:\npat = /b\n")}));
}

TEST(ConfStates, AtTheEndOfTheFileACompleteSectionIsKept)
{
    EXPECT_EQ(read_chunks("t:\npat = /x\n"), chunks{good("t", {{"pat", "/x"}}, "t:\npat = /x\n")});
    EXPECT_EQ(read_chunks("default:\n"), chunks{good("default", {}, "default:\n")});
    EXPECT_EQ(read_chunks("spoolarea_:\nspool_dir = /d\ncleanup = OFF\n").size(), 1U);
}

TEST(ConfStates, AtTheEndOfTheFileAnIncompleteSectionIsDropped)
{
    EXPECT_EQ(read_chunks("t:\nspooling = ON\n"), chunks{});
    EXPECT_EQ(read_chunks("t:\n"), chunks{});
    EXPECT_EQ(read_chunks("spoolarea_a:\nspool_dir = /d\n"), chunks{});
    EXPECT_EQ(read_chunks("spoolarea_a:\ncleanup = ON\n"), chunks{});
}

TEST(ConfStates, AtTheEndOfTheFileAFailedSectionIsDropped)
{
    EXPECT_EQ(read_chunks("t:\npat = /x\npat = /y\n"), chunks{});
}

TEST(ConfStates, AFailedSectionBecomesAChunkAtTheNextHeader)
{
    EXPECT_EQ(read_chunks("t:\nsize = 10 MB\npages = 3\nu:\npat = /u\n"),
              (chunks{failed("t", {}, "t:\nsize = 10 MB\npages = 3\n"), good("u", {{"pat", "/u"}}, "u:\npat = /u\n")}));
}

TEST(ConfStates, AFailedSectionKeepsThePairsFromBeforeTheFault)
{
    EXPECT_EQ(read_chunks("t:\npages = 3\nnonsense\nsize = 4\nu:\npat = /u\n").at(0),
              failed("t", {{"pages", "3"}}, "t:\npages = 3\nnonsense\nsize = 4\n"));
}

TEST(ConfStates, CommentsInAFailedSectionAreChunksBeforeIt)
{
    EXPECT_EQ(read_chunks("t:\nnonsense\n# kept\nmore\nu:\npat = /u\n"),
              (chunks{comment("# kept\n"), failed("t", {}, "t:\nnonsense\nmore\n"),
                      good("u", {{"pat", "/u"}}, "u:\npat = /u\n")}));
}

TEST(ConfStates, AHeaderThatFollowsAFailedSectionMayFailItself)
{
    EXPECT_EQ(read_chunks("t:\nnonsense\nu:\nnonsense\nv:\npat = /v\n"),
              (chunks{failed("t", {}, "t:\nnonsense\n"), failed("u", {}, "u:\nnonsense\n"),
                      good("v", {{"pat", "/v"}}, "v:\npat = /v\n")}));
}

TEST(ConfStates, ARepeatedKeyFailsItsSection)
{
    EXPECT_EQ(read_chunks("t:\npat = /x\ndest = /a\ndest = /b\nu:\npat = /u\n").at(0),
              failed("t", {{"pat", "/x"}, {"dest", "/a"}}, "t:\npat = /x\ndest = /a\ndest = /b\n"));
    EXPECT_EQ(read_chunks("spoolarea_a:\ncleanup = ON\nCLEANUP = ON\nu:\npat = /u\n").at(0),
              failed("spoolarea_a", {{"cleanup", "ON"}}, "spoolarea_a:\ncleanup = ON\nCLEANUP = ON\n"));
    EXPECT_EQ(read_chunks("default:\ndest = /a\ndest = /b\nu:\npat = /u\n").at(0),
              failed("default", {{"dest", "/a"}}, "default:\ndest = /a\ndest = /b\n"));
}

TEST(ConfStates, EveryKeyMayAppearOnceOnly)
{
    for (const auto &[name, list] : std::vector<std::pair<std::string, pairs>>{
             {"t", all_trace_pairs}, {"spoolarea_a", all_spool_pairs}, {"default", all_default_pairs}})
        for (const auto &[key, value] : list) {
            const std::string text = name + ":\n" + key + " = " + value + "\n" + key + " = 1\n";
            EXPECT_EQ(read_chunks(text + "u:\npat = /u\n").at(0), failed(name, {{key, value}}, text));
        }
}

TEST(ConfStates, AnUnknownKeyFailsAnIncompleteSection)
{
    EXPECT_EQ(read_chunks("t:\ncolour = red\nu:\npat = /u\n").at(0), failed("t", {}, "t:\ncolour = red\n"));
    EXPECT_EQ(read_chunks("spoolarea_a:\nspool_dir = /d\npat = /x\nu:\npat = /u\n").at(0),
              failed("spoolarea_a", {{"spool_dir", "/d"}}, "spoolarea_a:\nspool_dir = /d\npat = /x\n"));
}

TEST(ConfStates, AnUnknownKeyAlwaysFailsADefaultSection)
{
    EXPECT_EQ(read_chunks("default:\ndest = /d\npages = 3\nu:\npat = /u\n").at(0),
              failed("default", {{"dest", "/d"}}, "default:\ndest = /d\npages = 3\n"));
}

TEST(ConfStates, AnUnknownKeyEndsACompleteSectionAndStartsAFailedOneWithoutAName)
{
    EXPECT_EQ(read_chunks("t:\npat = /x\ncolour = red\nsize = 1\nu:\npat = /u\n"),
              (chunks{good("t", {{"pat", "/x"}}, "t:\npat = /x\n"), failed("", {}, "colour = red\nsize = 1\n"),
                      good("u", {{"pat", "/u"}}, "u:\npat = /u\n")}));
}

TEST(ConfStates, ABlankInAValueFailsAnIncompleteTraceSectionAndEndsACompleteOne)
{
    EXPECT_EQ(read_chunks("t:\nsize = 10 MB\nu:\npat = /u\n").at(0), failed("t", {}, "t:\nsize = 10 MB\n"));
    EXPECT_EQ(read_chunks("t:\npat = /x\nsize = 10 MB\nu:\npat = /u\n"),
              (chunks{good("t", {{"pat", "/x"}}, "t:\npat = /x\n"), failed("", {}, "size = 10 MB\n"),
                      good("u", {{"pat", "/u"}}, "u:\npat = /u\n")}));
}

TEST(ConfStates, AHeaderBehindAnIncompleteTraceSectionIsItsFaultAndOpensNothing)
{
    EXPECT_EQ(read_chunks("t:\npages = 3\nu:\npat = /u\nv:\npat = /v\n"),
              (chunks{failed("t", {{"pages", "3"}}, "t:\npages = 3\nu:\npat = /u\n"),
                      good("v", {{"pat", "/v"}}, "v:\npat = /v\n")}));
}

TEST(ConfStates, AHeaderBehindAnIncompleteSpoolSectionIsItsFaultAndOpensNothing)
{
    EXPECT_EQ(read_chunks("spoolarea_a:\nspool_dir = /d\nu:\npat = /u\nv:\npat = /v\n").at(0),
              failed("spoolarea_a", {{"spool_dir", "/d"}}, "spoolarea_a:\nspool_dir = /d\nu:\npat = /u\n"));
}

TEST(ConfStates, APairBeforeAnyHeaderMakesAFailedSectionWithoutAName)
{
    EXPECT_EQ(read_chunks("pat = /x\nu:\npat = /u\n"),
              (chunks{failed("", {}, "pat = /x\n"), good("u", {{"pat", "/u"}}, "u:\npat = /u\n")}));
}

TEST(ConfStates, APairBehindASectionWithAllItsKeysIsAFaultOfItsOwn)
{
    const std::string full = text_of("default", all_default_pairs);
    EXPECT_EQ(read_chunks(full + "dest = /again\nu:\npat = /u\n"),
              (chunks{good("default", all_default_pairs, full), failed("", {}, "dest = /again\n"),
                      good("u", {{"pat", "/u"}}, "u:\npat = /u\n")}));
}

TEST(ConfStates, SeenKeysAreForgottenAtTheNextHeader)
{
    EXPECT_EQ(read_chunks("t:\npat = /x\npat = /y\nu:\npages = 1\n"),
              chunks{failed("t", {{"pat", "/x"}}, "t:\npat = /x\npat = /y\n")});
}

TEST(ConfStates, MoreThanAHundredChunksAreKeptInOrder)
{
    std::string text;
    chunks expected;
    for (int i = 0; i < 150; ++i) {
        const std::string section = "t" + std::to_string(i) + ":\npat = /x\n";
        text += section + "spooling = ON\n" + "sync_interval = 1\ntracesize = 1\ndest = /d\npages = 1\nsize = 1\n# c\n";
        expected.push_back(good("t" + std::to_string(i),
                                {{"pat", "/x"},
                                 {"spooling", "ON"},
                                 {"sync_interval", "1"},
                                 {"tracesize", "1"},
                                 {"dest", "/d"},
                                 {"pages", "1"},
                                 {"size", "1"}},
                                section + "spooling = ON\nsync_interval = 1\ntracesize = 1\ndest = /d\npages = 1\n"
                                          "size = 1\n"));
        expected.push_back(comment("# c\n"));
    }
    EXPECT_EQ(read_chunks(text), expected);
}
} // namespace
