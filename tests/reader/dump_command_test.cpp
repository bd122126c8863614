// The real command: options, several files, exit statuses, streams.
#include <gtest/gtest.h>

#include <atomic>
#include <csignal>
#include <thread>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <nlohmann/json.hpp>

#include "reader/every_kind.h"
#include "reader/program.h"
#include "reader/reading.h"

namespace qn::test
{
namespace
{

using strings = std::vector<std::string>;

trace_builder two_ids()
{
    trace_builder file;
    file.add_id(1);
    file.add_id(2);
    file.close();
    return file;
}

trace_builder damaged()
{
    auto file = two_ids();
    file.put_u32(232, 0); // the length of the second record
    return file;
}

std::string with_name(std::string dump, const std::string &name)
{
    const std::string_view built_in = "test.trc";
    return dump.replace(dump.find(built_in), built_in.size(), name);
}

std::size_t count(std::string_view text, std::string_view part)
{
    std::size_t result = 0;
    for (auto at = text.find(part); at != std::string_view::npos; at = text.find(part, at + 1)) {
        ++result;
    }
    return result;
}

TEST(DumpCommand, ASoundFileIsPrintedWithStatus0)
{
    const scratch_folder folder;
    const auto sound = two_ids();
    const auto path = folder.file("a.trc", sound.bytes());
    const auto run = run_qntrace({"dump", "--utc", path});
    EXPECT_EQ(run.status, 0);
    EXPECT_EQ(run.out, with_name(text_of(sound.bytes(), {.with_header = true}), path));
    EXPECT_EQ(run.err, "");
}

TEST(DumpCommand, TimesAreLocalUnlessUtcIsAskedFor)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", two_ids().bytes());
    const auto run = run_qntrace({"dump", path}, {.environment = {"LC_ALL=C", "TZ=XYZ-5:30"}});
    EXPECT_NE(run.out.find("2026-11-21T10:42:01.123456789+05:30         2  0x00007f01"), std::string::npos);
    const auto utc = run_qntrace({"dump", "--utc", path}, {.environment = {"LC_ALL=C", "TZ=XYZ-5:30"}});
    EXPECT_NE(utc.out.find("2026-11-21T05:12:01.123456789Z         2  0x00007f01"), std::string::npos);
}

TEST(DumpCommand, JsonIsOneObjectALine)
{
    const scratch_folder folder;
    const auto file = every_kind();
    const auto path = folder.file("a.trc", file.bytes());
    const auto run = run_qntrace({"dump", "--json", "--utc", path});
    EXPECT_EQ(run.out, with_name(json_of(file.bytes(), {.with_header = true}), path));
    strings kinds;
    for (std::size_t at = 0; at < run.out.size();) {
        const auto end = run.out.find('\n', at);
        const auto object = nlohmann::json::parse(run.out.substr(at, end - at));
        kinds.push_back(object["type"] == "header" ? "header" : object["kind"]);
        at = end + 1;
    }
    EXPECT_EQ(kinds, (strings{"header", "note", "start", "id", "id", "data", "values32", "values64", "error", "strings",
                              "strings", "strings", "restart", "calibration", "id"}));
}

TEST(DumpCommand, RawShowsFillersAndUnfinishedRecords)
{
    const scratch_folder folder;
    const auto file = every_kind();
    const auto path = folder.file("a.trc", file.bytes());
    auto run = run_qntrace({"dump", "--raw", "--utc", path});
    EXPECT_EQ(run.out, with_name(text_of(file.bytes(), {.raw = true, .with_header = true}), path));
    run = run_qntrace({"dump", "--raw", "--json", "--utc", path});
    EXPECT_EQ(run.out, with_name(json_of(file.bytes(), {.raw = true, .with_header = true}), path));
}

TEST(DumpCommand, TheLocaleDecidesWhetherUtf8IsPrinted)
{
    const scratch_folder folder;
    trace_builder file;
    file.add_strings(1, {"caf\xc3\xa9"});
    file.close();
    const auto path = folder.file("a.trc", file.bytes());
    EXPECT_NE(run_qntrace({"dump", path}, {.environment = {"LC_ALL=C.UTF-8"}}).out.find("\"caf\xc3\xa9\""),
              std::string::npos);
    EXPECT_NE(run_qntrace({"dump", path}, {.environment = {"LC_ALL=C"}}).out.find(R"("caf\xc3\xa9")"),
              std::string::npos);
}

TEST(DumpCommand, HelpAndVersionGoToStandardOutput)
{
    for (const auto &arguments : {strings{"--help"}, strings{"dump", "--help"}, strings{"--version"}}) {
        const auto run = run_qntrace(arguments);
        EXPECT_EQ(run.status, 0);
        EXPECT_EQ(run.err, "");
        EXPECT_NE(run.out, "");
    }
    EXPECT_NE(run_qntrace({"--help"}).out.find("dump"), std::string::npos);
    const auto help = run_qntrace({"dump", "--help"}).out;
    for (const auto *option : {"--json", "--raw", "--utc", "FILE"}) {
        EXPECT_NE(help.find(option), std::string::npos) << option;
    }
    EXPECT_EQ(run_qntrace({"--version"}).out.substr(0, 8), "qntrace ");
}

TEST(DumpCommand, WrongUsageIsStatus2WithNothingOnStandardOutput)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", two_ids().bytes());
    for (const auto &arguments : {strings{}, strings{"dump"}, strings{"frobnicate"}, strings{"dump", "--jsn", path},
                                  strings{"dump", "--raw=perhaps", path}, strings{"--json", "dump", path}}) {
        const auto run = run_qntrace(arguments);
        EXPECT_EQ(run.status, 2);
        EXPECT_EQ(run.out, "");
        EXPECT_NE(run.err, "");
    }
}

TEST(DumpCommand, WhatCannotBeReadIsStatus3)
{
    const scratch_folder folder;
    const auto fifo = folder.path("fifo");
    ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
    const auto missing = folder.path("missing");
    const auto dangling = folder.path("dangling");
    ASSERT_EQ(symlink(missing.c_str(), dangling.c_str()), 0);
    const struct {
        std::string path;
        std::string message;
    } cases[] = {
        {missing, "cannot be opened: No such file or directory"},
        {dangling, "cannot be opened: No such file or directory"},
        {folder.path(""), "is not a regular file: Is a directory"},
        {fifo, "is not a regular file: Invalid argument"},
        {"/dev/null", "is not a regular file: Invalid argument"},
        {"/proc/self/mem", "cannot be read: Input/output error"}, // regular, and nothing at offset 0
        {"", "cannot be opened: No such file or directory"},
    };
    for (const auto &unreadable : cases) {
        const auto run = run_qntrace({"dump", unreadable.path});
        EXPECT_EQ(run.status, 3) << unreadable.path;
        EXPECT_EQ(run.out, "");
        EXPECT_EQ(run.err, "qntrace: " + unreadable.path + ": " + unreadable.message + "\n");
    }
}

TEST(DumpCommand, AFileWithoutPermissionIsStatus3)
{
    const scratch_folder folder;
    const auto path = folder.file("secret.trc", two_ids().bytes());
    ASSERT_EQ(chmod(path.c_str(), 0), 0);
    const auto run = run_qntrace({"dump", path}, {.as_nobody = true});
    if (run.status == 127) GTEST_SKIP() << "the command lies where nobody can run it";
    EXPECT_EQ(run.status, 3);
    EXPECT_EQ(run.err, "qntrace: " + path + ": cannot be opened: Permission denied\n");
}

TEST(DumpCommand, ADamagedFileIsShownAsFarAsItIsSoundWithStatus1)
{
    const scratch_folder folder;
    const auto path = folder.file("bad.trc", damaged().bytes());
    const auto run = run_qntrace({"dump", path});
    EXPECT_EQ(run.status, 1);
    EXPECT_EQ(count(run.out, "id=1\n"), 1u);
    EXPECT_EQ(count(run.out, "id=2\n"), 0u);
    EXPECT_EQ(run.err, "qntrace: " + path + ": offset 232: record length 0 is less than a record header\n");
}

TEST(DumpCommand, ATruncatedFileIsStatus1)
{
    const scratch_folder folder;
    const auto sound = two_ids();
    const auto path = folder.file("cut.trc", sound.bytes().first(1000));
    const auto run = run_qntrace({"dump", path});
    EXPECT_EQ(run.status, 1);
    EXPECT_EQ(count(run.out, "  id  "), 2u);
    EXPECT_NE(run.err.find("offset 1000: the file is truncated: it has 1000 bytes of 4096\n"), std::string::npos);
}

TEST(DumpCommand, ATornLastRecordIsStatus1AndTheOthersAreShown)
{
    const scratch_folder folder;
    auto file = two_ids();
    file.put_u16(232 + 4, 0xFFFF);
    const auto path = folder.file("torn.trc", file.bytes());
    const auto run = run_qntrace({"dump", path});
    EXPECT_EQ(run.status, 1);
    EXPECT_EQ(count(run.out, "  id  "), 1u);
    EXPECT_EQ(run.err, "qntrace: " + path +
                           ": offset 232: this record is being written, or its writer died before it was complete"
                           " (sequence number 4)\n");
}

TEST(DumpCommand, AnEmptyFileAndAForeignFileAreStatus1)
{
    const scratch_folder folder;
    const auto empty = folder.file("empty", {});
    auto run = run_qntrace({"dump", empty});
    EXPECT_EQ(run.status, 1);
    EXPECT_EQ(run.out, "");
    EXPECT_EQ(run.err, "qntrace: " + empty + ": not a trace file: 0 bytes are too short for a header\n");
    run = run_qntrace({"dump", QNTRACE_PROGRAM});
    EXPECT_EQ(run.status, 1);
    EXPECT_EQ(run.out, "");
    EXPECT_EQ(count(run.err, "\n"), 1u);
}

TEST(DumpCommand, OfSeveralFilesAllAreProcessedAndTheWorstCounts)
{
    const scratch_folder folder;
    const auto sound = folder.file("sound.trc", two_ids().bytes());
    const auto bad = folder.file("bad.trc", damaged().bytes());
    const auto missing = folder.path("missing.trc");
    const auto status_of = [](const strings &files) {
        strings arguments = {"dump"};
        arguments.insert(arguments.end(), files.begin(), files.end());
        return run_qntrace(arguments).status;
    };
    EXPECT_EQ(status_of({sound, sound}), 0);
    EXPECT_EQ(status_of({bad, sound}), 1);
    EXPECT_EQ(status_of({sound, bad}), 1);
    EXPECT_EQ(status_of({missing, bad, sound}), 3);
    EXPECT_EQ(status_of({sound, bad, missing}), 3);

    const auto run = run_qntrace({"dump", missing, bad, sound});
    EXPECT_EQ(count(run.out, "file     "), 2u);
    EXPECT_LT(run.out.find(bad), run.out.find(sound));
    EXPECT_EQ(count(run.out, "id=1\n"), 2u);
    EXPECT_EQ(count(run.err, "\n"), 2u);
    EXPECT_EQ(count(run_qntrace({"dump", "--json", sound, bad}).out, "\"type\":\"header\""), 2u);
}

TEST(DumpCommand, AFileOfRubbishHasItsMessagesCounted)
{
    trace_builder file(200 + 28 * 150);
    while (file.at < file.bytes().size()) {
        file.add(0xFFFF, file.body());
    }
    const scratch_folder folder;
    const auto path = folder.file("torn.trc", file.bytes());
    const auto run = run_qntrace({"dump", path});
    EXPECT_EQ(run.status, 1);
    EXPECT_EQ(count(run.err, "\n"), 101u);
    EXPECT_NE(run.err.find("qntrace: " + path + ": 50 more problems are not shown\n"), std::string::npos);
}

TEST(DumpCommand, FileNamesAreEscapedToo)
{
    const scratch_folder folder;
    const auto name = "evil\x1b[2J\nname";
    auto run = run_qntrace({"dump", folder.path(name)});
    EXPECT_NE(run.err.find("evil\\x1b[2J\\nname: cannot be opened"), std::string::npos);
    run = run_qntrace({"dump", folder.file(name, two_ids().bytes())});
    EXPECT_NE(run.out.find("evil\\x1b[2J\\nname\nformat"), std::string::npos);
    run = run_qntrace({"dump", "--json", folder.file("\xff", two_ids().bytes())});
    EXPECT_NE(run.out.find(R"(/\u00ff",)"), std::string::npos);
    EXPECT_NE(run.out.find(R"("encoding":"latin-1")"), std::string::npos);
}

trace_builder long_trace()
{
    trace_builder file(1 << 20);
    while (file.at + 64 < file.bytes().size()) {
        file.add_id(1);
    }
    file.close();
    return file;
}

TEST(DumpCommand, AReaderThatGoesAwayEndsItQuietly)
{
    const scratch_folder folder;
    const auto path = folder.file("long.trc", long_trace().bytes());
    for (const bool ignored : {false, true}) {
        const auto run = run_qntrace({"dump", path}, {.ignore_sigpipe = ignored, .nobody_reads = true});
        EXPECT_EQ(run.signal, SIGPIPE);
        EXPECT_EQ(run.err, "");
    }
}

TEST(DumpCommand, AFullDiskIsStatus3)
{
    const scratch_folder folder;
    for (const auto &path :
         {folder.file("short.trc", two_ids().bytes()), folder.file("long.trc", long_trace().bytes())}) {
        const auto run = run_qntrace({"dump", path}, {.out_file = "/dev/full"});
        EXPECT_EQ(run.status, 3);
        EXPECT_EQ(run.err, "qntrace: standard output cannot be written: No space left on device\n");
    }
}

TEST(DumpCommand, AFileThatIsCutAndRewrittenMeanwhileDoesNoHarm)
{
    const scratch_folder folder;
    const auto whole = long_trace();
    const auto path = folder.file("live.trc", whole.bytes());
    std::atomic<bool> stop = false;
    std::thread meddler([&] {
        const int descriptor = open(path.c_str(), O_RDWR | O_CLOEXEC);
        for (unsigned round = 0; !stop; ++round) {
            const auto length = static_cast<off_t>(round * 7919 % whole.bytes().size());
            if (ftruncate(descriptor, length) != 0) break;
            if (pwrite(descriptor, whole.bytes().data(), whole.bytes().size(), 0) < 0) break;
        }
        close(descriptor);
    });
    for (int i = 0; i < 20; ++i) {
        const auto run = run_qntrace({"dump", "--json", path});
        EXPECT_TRUE(run.status == 0 || run.status == 1) << run.status << ' ' << run.signal << run.err;
    }
    stop = true;
    meddler.join();
}

} // namespace
} // namespace qn::test
