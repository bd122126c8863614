// qntrace errors: which records it takes, and how it shows them.
#include <filesystem>

#include <gtest/gtest.h>

#include "reader/errors/error_records.h"
#include "reader/every_kind.h"
#include "reader/spool_directory.h"

namespace qn::test
{
namespace
{

// At 1 ms and every second millisecond after it; between them records that are no errors.
trace_builder with_errors(const std::vector<error_record> &errors, std::uint64_t node_id = 0xABCD,
                          std::uint64_t first_ms = 1)
{
    trace_builder file(16384);
    file.put_u64(180, node_id);
    file.component = "IDX";
    file.counter = first_ms * 1'000'000;
    for (const auto &error : errors) {
        add_error(file, error);
        file.counter += 999'000;
        file.add_id(5);
        file.counter += 999'000;
    }
    file.close();
    return file;
}

error_record about(const std::string &name)
{
    error_record error;
    error.name = name;
    return error;
}

error_record other_error()
{
    error_record error;
    error.error_id = 19;
    error.set = 2;
    error.number = 3;
    error.default_message = "Out of memory";
    error.file.reset();
    error.function.reset();
    error.line = 0;
    error.ffdc_id = "FF1";
    return error;
}

TEST(Errors, AreShownInGroups)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", with_errors({about("/tmp/a"), other_error(), about("/tmp/b")}).bytes());
    const auto shown = run_qntrace({"errors", "--utc", path});
    EXPECT_EQ(shown.status, 0);
    EXPECT_EQ(shown.err, "");
    EXPECT_EQ(shown.out, R"(       2  Cannot open "/tmp/b": error 13.
          first    2026-11-21T05:12:00.001000000Z
          last     2026-11-21T05:12:00.005000000Z
          from     000000000000abcd/app/a.trc  IDX  0x00007f01
          error    18, set 1 message 7
          at       reader.c:120 in open_it
       1  Out of memory
          time     2026-11-21T05:12:00.003000000Z
          from     000000000000abcd/app/a.trc  IDX  0x00007f01
          error    19, set 2 message 3
          ffdc     FF1

errors   3 in 2 groups
files    1
lost     nothing that the files tell of
)");
}

TEST(Errors, AreShownOneByOneInOrderOfTime)
{
    const scratch_folder folder;
    const auto late = folder.file("late.trc", with_errors({about("/tmp/b")}, 0xABCD, 9).bytes());
    const auto early = folder.file("early.trc", with_errors({other_error()}).bytes());
    const auto shown = run_qntrace({"errors", "--utc", "--all", late, early});
    EXPECT_EQ(shown.out, R"(2026-11-21T05:12:00.001000000Z  000000000000abcd/app/early.trc  IDX  0x00007f01
          Out of memory
          error    19, set 2 message 3
          ffdc     FF1
2026-11-21T05:12:00.009000000Z  000000000000abcd/app/late.trc  IDX  0x00007f01
          Cannot open "/tmp/b": error 13.
          error    18, set 1 message 7
          at       reader.c:120 in open_it

errors   2
files    2
lost     nothing that the files tell of
)");
}

TEST(Errors, AreObjectsForPrograms)
{
    const scratch_folder folder;
    auto error = about("/tmp/a");
    error.catalogue = "app.cat";
    error.ffdc_id = "FF2";
    const auto path = folder.file("a.trc", with_errors({error}).bytes());
    const auto found = rows(run_qntrace({"errors", "--json", "--utc", path}));
    ASSERT_EQ(found.size(), 2U);
    const nlohmann::json time = {{"time", "2026-11-21T05:12:00.001000000Z"}, {"time_ns", "1795237920001000000"}};
    nlohmann::json latest = {{"type", "error"},
                             {"node", "000000000000abcd"},
                             {"node_id", "000000000000abcd"},
                             {"program", "app"},
                             {"trace", "a.trc"},
                             {"file", path},
                             {"comp", "IDX"},
                             {"thread", 0x7f01},
                             {"seq", 2},
                             {"error_id", 18},
                             {"message", "Cannot open \"/tmp/a\": error 13."},
                             {"message_from", "default"},
                             {"catalogue", "app.cat"},
                             {"message_set", 1},
                             {"message_number", 7},
                             {"default_message", "Cannot open \"%2$s\": error %1$d.\n"},
                             {"source_file", "reader.c"},
                             {"line", 120},
                             {"function", "open_it"},
                             {"ffdc_id", "FF2"}};
    latest.update(time);
    const nlohmann::json nodes = {{{"node", "000000000000abcd"}, {"errors", 1}}};
    EXPECT_EQ(
        found[0],
        (nlohmann::json{
            {"type", "group"}, {"errors", 1}, {"first", time}, {"last", time}, {"nodes", nodes}, {"latest", latest}}));
    EXPECT_EQ(found[1], (nlohmann::json{{"type", "total"},
                                        {"files", 1},
                                        {"errors", 1},
                                        {"groups", 1},
                                        {"without_group", 0},
                                        {"unfinished", 0},
                                        {"missing", 0},
                                        {"overwritten", 0},
                                        {"unspooled_pages", 0},
                                        {"last_reuse_time", 0}}));
}

TEST(Errors, ThatAreNotUtf8KeepEveryByte)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", with_errors({about("caf\xe9")}).bytes());
    const auto found = rows(run_qntrace({"errors", "--json", path})).at(0);
    EXPECT_EQ(found.at("encoding"), "latin-1");
    EXPECT_EQ(found.at("latest").at("message"), "Cannot open \"caf\u00e9\": error 13.");
}

TEST(Errors, DoNotReachTheTerminalRaw)
{
    const scratch_folder folder;
    auto hostile = about("\x1b[31m");
    hostile.file = hostile.function = hostile.ffdc_id = hostile.catalogue = "\x1b]0;x\x07";
    const auto path = folder.file("a.trc", with_errors({hostile}).bytes());
    for (const char *form : {"--by=message", "--by=node", "--all", "--json"}) {
        const auto shown = run_qntrace({"errors", form, path});
        EXPECT_NE(shown.out.find("31m"), std::string::npos);
        EXPECT_EQ(shown.out.find('\x1b'), std::string::npos);
        EXPECT_EQ(shown.out.find('\x07'), std::string::npos);
    }
}

TEST(Errors, AreCountedPerNodeOfASpoolTree)
{
    const spool_directory spool;
    spool.put("host1/0000000000000001/app", "app.trc.1.sp.2026_11_21_05_13_00.123456",
              with_errors({about("a"), about("b")}, 1));
    spool.put("host2/0000000000000002/app", "app.trc.1.sp.2026_11_21_05_13_00.123456", with_errors({about("c")}, 2));
    const auto found = rows(run_qntrace({"errors", "--json", spool.root})).at(0);
    EXPECT_EQ(found.at("nodes"),
              (nlohmann::json{{{"node", "host1"}, {"errors", 2}}, {{"node", "host2"}, {"errors", 1}}}));
}

TEST(Errors, HaveTheTimesOfTheirNodesClockPutRight)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", with_errors({other_error()}).bytes());
    const auto found = rows(run_qntrace({"errors", "--json", "--utc", "--offset", "000000000000abcd=+1s", path}));
    EXPECT_EQ(found.at(0).at("first").at("time"), "2026-11-21T05:12:01.001000000Z");
}

TEST(Errors, CanBeSelected)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", with_errors({about("/tmp/a"), other_error(), about("/tmp/b")}).bytes());
    const auto found = rows(run_qntrace({"errors", "--json", "--grep", "memory", path}));
    EXPECT_EQ(found.back().at("errors"), 1);
    EXPECT_EQ(found.at(0).at("latest").at("message"), "Out of memory");
}

TEST(Errors, BeyondTheTopOnesAreCounted)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", with_errors({about("/tmp/a"), other_error(), about("/tmp/b")}).bytes());
    const auto shown = run_qntrace({"errors", "--top", "1", path});
    EXPECT_EQ(shown.out.find("Out of memory"), std::string::npos);
    EXPECT_NE(shown.out.find("and 1 group more\n"), std::string::npos);
    EXPECT_NE(shown.out.find("errors   3 in 2 groups\n"), std::string::npos);
}

TEST(Errors, AreMissingFromATraceWithoutAny)
{
    const scratch_folder folder;
    const auto shown = run_qntrace({"errors", folder.file("a.trc", two_records().bytes())});
    EXPECT_EQ(shown.status, 0);
    EXPECT_EQ(shown.out, "errors   0\nfiles    1\nlost     nothing that the files tell of\n");
}

TEST(Errors, EndWithWhatIsMissing)
{
    const scratch_folder folder;
    const auto shown = run_qntrace({"errors", folder.file("a.trc", every_kind().bytes())});
    EXPECT_NE(shown.out.find("\nlost     1 record unfinished, 2 pages overwritten before they were copied\n"),
              std::string::npos)
        << shown.out;
}

TEST(Errors, OfADamagedFileAreShownAsFarAsItIsSound)
{
    const scratch_folder folder;
    trace_builder file;
    add_error(file, about("/tmp/a"));
    add_error(file, other_error());
    const auto torn = file.add_id(5);
    add_error(file, about("/tmp/b"));
    file.close();
    file.put_u32(torn, 0x13); // no length that a record may have
    const auto shown = run_qntrace({"errors", folder.file("a.trc", file.bytes())});
    EXPECT_EQ(shown.status, 1);
    EXPECT_NE(shown.out.find("errors   2 in 2 groups\n"), std::string::npos) << shown.out;
    EXPECT_NE(shown.err, "");
}

TEST(Errors, NeedAFileThatIsThere)
{
    const scratch_folder folder;
    EXPECT_EQ(run_qntrace({"errors", folder.path("none.trc")}).status, 3);
    EXPECT_EQ(run_qntrace({"errors"}).status, 2);
}

TEST(Errors, AreGroupedAndSortedByWhatTheOptionsName)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", with_errors({about("/tmp/a"), about("/tmp/b"), other_error()}).bytes());
    EXPECT_EQ(rows(run_qntrace({"errors", "--json", "--by", "component", path})).size(), 2U);
    EXPECT_EQ(rows(run_qntrace({"errors", "--json", "--sort", "last", path})).at(0).at("errors"), 1);
    EXPECT_EQ(run_qntrace({"errors", "--by", "colour", path}).status, 2);
    EXPECT_EQ(run_qntrace({"errors", "--all", "--top", "1", path}).status, 2);
}

} // namespace
} // namespace qn::test
