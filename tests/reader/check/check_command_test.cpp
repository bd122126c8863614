// qntrace check: its output, its exit statuses, and which files it takes.
#include <filesystem>

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include "reader/check/long_trace.h"
#include "reader/program.h"
#include "reader/spool_directory.h"

namespace qn::test
{
namespace
{

outcome check(std::vector<std::string> arguments)
{
    arguments.insert(arguments.begin(), {"check", "--utc"});
    return run_qntrace(arguments);
}

// Three records, and the beginning of the second one destroyed.
trace_builder torn()
{
    trace_builder file;
    file.add_id(1);
    const auto second = file.add_id(2);
    file.add_id(3);
    file.close();
    file.set_oldest(200);
    for (std::size_t i = 0; i < 28; ++i) file.put_u8(second + i, 0xFF);
    return file;
}

trace_builder sound()
{
    trace_builder file;
    file.add_id(1);
    file.add_id(2);
    file.close();
    return file;
}

TEST(Check, PrintsALineForASoundFile)
{
    const scratch_folder folder;
    const auto path = folder.file("app.trc", sound().bytes());
    const auto shown = check({path});
    EXPECT_EQ(shown.status, 0);
    EXPECT_EQ(shown.out, path + ": sound, 2 records\n");
    EXPECT_EQ(shown.err, "");
}

TEST(Check, TellsUnderADamagedFileWhatIsWrongWhereAndWhatIsLeft)
{
    const scratch_folder folder;
    const auto path = folder.file("app.trc", torn().bytes());
    const auto shown = check({path});
    EXPECT_EQ(shown.status, 1);
    EXPECT_EQ(shown.out,
              path + ": damaged, 1 record from 2026-11-21T05:12:01.123456789Z to "
                     "2026-11-21T05:12:01.123456789Z can be read, 3864 of 3896 bytes of the ring cannot\n"
                     "  offset 232: record length 4294967295 is not a multiple of 4, behind sequence number 2\n");
}

TEST(Check, KeepsEveryByteOfANameThatIsNoUtf8InJson)
{
    const scratch_folder folder;
    const auto shown = check({"--json", folder.file("b\xfcro.trc", sound().bytes())});
    EXPECT_TRUE(is_ascii(shown.out)) << shown.out;
    const auto object = nlohmann::json::parse(shown.out);
    EXPECT_EQ(object.at("encoding"), "latin-1");
    EXPECT_EQ(object["file"], folder.path("b\xc3\xbcro.trc"));
}

TEST(Check, PrintsAJsonObjectForAFile)
{
    const scratch_folder folder;
    const auto path = folder.file("app.trc", torn().bytes());
    const auto shown = check({"--json", path});
    EXPECT_EQ(shown.status, 1);
    const auto object = nlohmann::json::parse(shown.out);
    EXPECT_EQ(object["file"], path);
    EXPECT_EQ(object["status"], "damaged");
    EXPECT_EQ(object["records"], 1);
    EXPECT_EQ(object["unreadable_bytes"], 3864);
    EXPECT_EQ(object["first_ns"], "1795237921123456789");
    ASSERT_EQ(object["findings"].size(), 1U);
    EXPECT_EQ(object["findings"][0]["severity"], "damage");
    EXPECT_EQ(object["findings"][0]["offset"], 232);
    EXPECT_EQ(object["findings"][0]["behind_seq"], 2);
}

TEST(Check, QuietTellsByItsExitStatusOnly)
{
    const scratch_folder folder;
    const auto good = folder.file("good.trc", sound().bytes());
    const auto bad = folder.file("bad.trc", torn().bytes());
    EXPECT_EQ(check({"--quiet", good}).status, 0);
    const auto shown = check({"-q", bad});
    EXPECT_EQ(shown.status, 1);
    EXPECT_EQ(shown.out + shown.err, "");
}

TEST(Check, CountsTheWorstOfSeveralFiles)
{
    const scratch_folder folder;
    const auto good = folder.file("good.trc", sound().bytes());
    const auto bad = folder.file("bad.trc", torn().bytes());
    EXPECT_EQ(check({bad, good}).status, 1);
    const auto missing = check({good, folder.path("missing.trc"), bad});
    EXPECT_EQ(missing.status, 3);
    EXPECT_NE(missing.err.find("missing.trc: cannot be opened"), std::string::npos);
    EXPECT_NE(missing.out.find("good.trc: sound"), std::string::npos);
    EXPECT_NE(missing.out.find("bad.trc: damaged"), std::string::npos);
}

TEST(Check, NeedsAFile) { EXPECT_EQ(check({}).status, 2); }

TEST(Check, ANamedFileThatIsNoTraceFileIsDamaged)
{
    const scratch_folder folder;
    const auto path = folder.file("notes.txt", std::as_bytes(std::span("no trace")));
    const auto shown = check({path});
    EXPECT_EQ(shown.status, 1);
    EXPECT_EQ(shown.out, path + ": damaged, nothing can be read\n"
                                "  not a trace file: 9 bytes are too short for a header\n");
}

TEST(Check, AFoldersFilesThatAreNoTraceFilesArePassedOver)
{
    const scratch_folder folder;
    folder.file("notes.txt", std::as_bytes(std::span("no trace")));
    const auto path = folder.file("app.trc", sound().bytes());
    const auto shown = check({folder.path(".")});
    EXPECT_EQ(shown.status, 0);
    EXPECT_EQ(shown.out, folder.path("./app.trc") + ": sound, 2 records\n");
    EXPECT_EQ(shown.err, "qntrace: " + folder.path(".") + ": 1 other file was passed over\n");
    EXPECT_EQ(check({"--quiet", folder.path(".")}).err, "");
}

TEST(Check, AFoldersTraceFilesAreCheckedAlsoWhenTheirHeaderIsCutOrTorn)
{
    const scratch_folder folder;
    const auto bytes = sound().copy();
    folder.file("cut.trc", std::span(bytes).first(100));
    trace_builder bounds = sound();
    bounds.put_u32(8, 0xFFFFFFFF);
    bounds.put_u32(20, 0);
    folder.file("bounds.trc", bounds.bytes());
    trace_builder mark = sound();
    for (std::size_t i = 0; i < 12; ++i) mark.put_u8(i, 0xFF);
    folder.file("mark.trc", mark.bytes());
    const auto shown = check({folder.path(".")});
    EXPECT_EQ(shown.status, 1);
    for (const auto *name : {"cut.trc", "bounds.trc", "mark.trc"})
        EXPECT_NE(shown.out.find(std::string(name) + ": damaged"), std::string::npos) << name << shown.out;
    EXPECT_EQ(shown.err, "");
}

TEST(Check, APageInAFolderIsAPageAlsoWhenItsHeaderIsGone)
{
    const scratch_folder folder;
    folder.file("app.trc.1.sp", sound().bytes());
    folder.file("app.trc.2.sp", std::vector<std::byte>(4096));
    const auto shown = check({folder.path(".")});
    EXPECT_EQ(shown.status, 1);
    EXPECT_NE(shown.out.find("app.trc.2.sp: damaged, nothing can be read"), std::string::npos) << shown.out;
}

TEST(Check, ATracesNameStandsForItsPages)
{
    const scratch_folder folder;
    folder.file("app.trc.1.sp", sound().bytes());
    folder.file("app.trc.2.sp", torn().bytes());
    const auto shown = check({folder.path("app.trc")});
    EXPECT_EQ(shown.status, 1);
    EXPECT_NE(shown.out.find("app.trc.1.sp: sound"), std::string::npos) << shown.out;
    EXPECT_NE(shown.out.find("app.trc.2.sp: damaged"), std::string::npos) << shown.out;
}

TEST(Check, APageAndItsCopyAreBothChecked)
{
    const scratch_folder folder;
    const auto below = folder.path("spool/host1/00000000000000a1/app");
    std::filesystem::create_directories(below);
    folder.file("app.trc.1.sp", sound().bytes());
    folder.file("spool/host1/00000000000000a1/app/app.trc.1.sp.2026_11_21_05_12_01.000001", sound().bytes());
    const auto shown = check({folder.path("app.trc.1.sp"), folder.path("spool")});
    EXPECT_EQ(shown.status, 0);
    EXPECT_EQ(std::count(shown.out.begin(), shown.out.end(), '\n'), 2) << shown.out;
}

TEST(Check, AnEmptyFolderIsToldAndSound)
{
    const scratch_folder folder;
    const auto shown = check({folder.path(".")});
    EXPECT_EQ(shown.status, 0);
    EXPECT_EQ(shown.err, "qntrace: there are no trace files\n");
}

TEST(Check, TheGoldenTraceIsSoundButForItsUnfinishedRecord)
{
    const auto shown = check({GOLDEN_TRACE});
    EXPECT_EQ(shown.status, 0);
    EXPECT_NE(shown.out.find(": sound, 97 records; lost: 1 record unfinished\n"), std::string::npos) << shown.out;
}

TEST(Check, BytesOfANameDoNotReachTheTerminal)
{
    const scratch_folder folder;
    const auto path = folder.file("a\x1b[31m.trc", sound().bytes());
    const auto shown = check({path});
    EXPECT_EQ(shown.out.find('\x1b'), std::string::npos);
    EXPECT_NE(shown.out.find("a\\x1b[31m.trc: sound"), std::string::npos) << shown.out;
}

} // namespace
} // namespace qn::test
