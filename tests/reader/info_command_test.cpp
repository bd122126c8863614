// qntrace info: what it says of a file, as text and as JSON, and its exit statuses.
#include <atomic>
#include <thread>

#include <fcntl.h>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <unistd.h>

#include "reader/every_kind.h"
#include "reader/program.h"
#include "reader/trace_builder.h"

namespace qn::test
{
namespace
{

using json = nlohmann::json;

// Three records whose first sequence number says that four came before them.
trace_builder three_of_seven()
{
    trace_builder file;
    file.seq = 8;
    file.add_id(1);
    file.add_id(2);
    file.add_id(3);
    file.close();
    return file;
}

json info_of(const trace_builder &file, const scratch_folder &folder)
{
    const auto shown = run_qntrace({"info", "--json", "--utc", folder.file("a.trc", file.bytes())});
    EXPECT_EQ(shown.status, 0) << shown.err;
    return json::parse(shown.out);
}

TEST(InfoCommand, CountsTheRecordsAndThoseLostBeforeTheOldest)
{
    const scratch_folder folder;
    const json info = info_of(three_of_seven(), folder);
    EXPECT_EQ(info["records"], 3);
    EXPECT_EQ(info["lost"], 4);
    EXPECT_EQ(info["unfinished"], 0);
}

TEST(InfoCommand, LosesNothingWhenTheFirstRecordIsThere)
{
    const scratch_folder folder;
    trace_builder file;
    file.add_id(1);
    file.close();
    EXPECT_EQ(info_of(file, folder)["lost"], 0);
}

TEST(InfoCommand, TellsSequenceAndTimeOfTheOldestAndTheNewestRecord)
{
    const scratch_folder folder;
    const json info = info_of(three_of_seven(), folder);
    EXPECT_EQ(info["oldest"]["sequence"], 10);
    EXPECT_EQ(info["newest"]["sequence"], 14);
    EXPECT_EQ(info["oldest"]["time"], "2026-11-21T05:12:01.123456789Z");
    EXPECT_EQ(info["oldest"]["time_ns"], std::to_string(trace_builder::epoch_ns + 1'123'456'789));
    EXPECT_EQ(info["newest"]["time"], "2026-11-21T05:12:01.123458789Z");
}

TEST(InfoCommand, TellsWhoWroteTheFile)
{
    const scratch_folder folder;
    trace_builder file = three_of_seven();
    file.put_u8(1, 5);
    file.put_u32(48, 4242);
    file.put_text(52, "/opt/app/bin/daemon");
    file.put_text(100, "some build");
    file.put_text(132, "daemon");
    const json info = info_of(file, folder);
    EXPECT_EQ(info["pid"], 4242);
    EXPECT_EQ(info["program"], "/opt/app/bin/daemon");
    EXPECT_EQ(info["base_program"], "daemon");
    EXPECT_EQ(info["build"], "some build");
    EXPECT_EQ(info["platform"], 5);
}

TEST(InfoCommand, TellsThePidOfAFileOfEitherByteOrder)
{
    const scratch_folder folder;
    for (const endian order : {endian::little, endian::big}) {
        const auto path = folder.file("every.trc", every_kind(order).bytes());
        EXPECT_EQ(json::parse(run_qntrace({"info", "--json", path}).out)["pid"], 4711);
        EXPECT_NE(run_qntrace({"info", path}).out.find("\nprocess    4711\n"), std::string::npos);
    }
}

TEST(InfoCommand, TellsNodeSizesTimeBaseZoneAndPageState)
{
    const scratch_folder folder;
    trace_builder file = three_of_seven();
    file.put_u16(6, 7);
    file.put_u64(180, 0xABCDEF);
    file.put_u8(192, 4);
    file.put_u32(196, static_cast<std::uint32_t>(-60));
    const json info = info_of(file, folder);
    EXPECT_EQ(info["node_number"], 7);
    EXPECT_EQ(info["node_id"], "0000000000abcdef");
    EXPECT_EQ(info["file_bytes"], 4096);
    EXPECT_EQ(info["ring_bytes"], 3896);
    EXPECT_EQ(info["ticks_per_second"], std::to_string(trace_builder::ticks_per_second));
    EXPECT_EQ(info["ns_at_tick_0"], std::to_string(trace_builder::epoch_ns));
    EXPECT_EQ(info["page_state"], 4);
    EXPECT_EQ(info["zone_minutes_west"], -60);
}

TEST(InfoCommand, SaysTheSameAsTextALineEach)
{
    const scratch_folder folder;
    const auto shown = run_qntrace({"info", "--utc", folder.file("a.trc", three_of_seven().bytes())});
    EXPECT_EQ(shown.status, 0);
    EXPECT_NE(shown.out.find("records    3, 4 lost before the oldest, 0 unfinished\n"), std::string::npos) << shown.out;
    EXPECT_NE(shown.out.find("oldest     2026-11-21T05:12:01.123456789Z, sequence 10\n"), std::string::npos)
        << shown.out;
    EXPECT_NE(shown.out.find("size       4096 bytes, 3896 of them the ring\n"), std::string::npos) << shown.out;
}

TEST(InfoCommand, EscapesWhatAProgramCallsItself)
{
    const scratch_folder folder;
    trace_builder file = three_of_seven();
    file.put_text(52, "\x1b[2Jx");
    const auto shown = run_qntrace({"info", folder.file("a.trc", file.bytes())});
    EXPECT_EQ(shown.out.find('\x1b'), std::string::npos);
    EXPECT_NE(shown.out.find("\\x1b[2Jx"), std::string::npos) << shown.out;
}

TEST(InfoCommand, WritesJsonInAscii)
{
    const scratch_folder folder;
    trace_builder file = three_of_seven();
    file.put_text(52, "d\xc3\xa4mon");
    const auto shown = run_qntrace({"info", "--json", folder.file("a.trc", file.bytes())});
    EXPECT_TRUE(is_ascii(shown.out)) << shown.out;
    EXPECT_EQ(json::parse(shown.out)["program"], "d\xc3\xa4mon");
    EXPECT_FALSE(json::parse(shown.out).contains("encoding"));
}

TEST(InfoCommand, KeepsEveryByteOfNamesThatAreNoUtf8InJson)
{
    const scratch_folder folder;
    trace_builder file = three_of_seven();
    file.put_text(52, "d\xe4mon");
    const json info = info_of(file, folder);
    EXPECT_EQ(info.at("encoding"), "latin-1");
    EXPECT_EQ(info["program"], "d\xc3\xa4mon");
}

TEST(InfoCommand, ADamagedFileIsCountedAsFarAsItIsSoundWithStatus1)
{
    const scratch_folder folder;
    trace_builder file = three_of_seven();
    file.put_u32(232, 0); // the length of the second record
    const auto shown = run_qntrace({"info", "--json", folder.file("a.trc", file.bytes())});
    EXPECT_EQ(shown.status, 1);
    EXPECT_EQ(json::parse(shown.out)["records"], 1);
    EXPECT_NE(shown.err.find("offset 232"), std::string::npos) << shown.err;
}

TEST(InfoCommand, ReadsASoundFileThatIsShorterThanAPage)
{
    const scratch_folder folder;
    trace_builder file(200 + 2 * 32);
    file.add_id(1);
    file.close();
    const json info = info_of(file, folder);
    EXPECT_EQ(info["records"], 1);
    EXPECT_EQ(info["file_bytes"], 264);
}

TEST(InfoCommand, AFileOfZerosIsNoTraceFileWithStatus1)
{
    const scratch_folder folder;
    const auto path = folder.file("zeros", byte_string().zeros(4095).bytes());
    const auto shown = run_qntrace({"info", path});
    EXPECT_EQ(shown.status, 1);
    EXPECT_EQ(shown.out, "");
    EXPECT_EQ(shown.err, "qntrace: " + path + ": offset 0: not a trace file: its header makes no sense\n");
}

// The writer of a file may cut it at any moment, to which a mapping of it answers with SIGBUS.
TEST(InfoCommand, AFileThatIsCutAndMadeWholeAgainMeanwhileDoesNoHarm)
{
    const scratch_folder folder;
    const auto whole = three_of_seven();
    const auto path = folder.file("live.trc", whole.bytes());
    std::atomic<bool> stop = false;
    std::thread meddler([&] {
        const int descriptor = open(path.c_str(), O_RDWR | O_CLOEXEC);
        while (!stop) {
            if (ftruncate(descriptor, 0) != 0) break;
            if (pwrite(descriptor, whole.bytes().data(), whole.bytes().size(), 0) < 0) break;
        }
        close(descriptor);
    });
    for (int i = 0; i < 300; ++i) EXPECT_EQ(run_qntrace({"info", path}).signal, 0);
    stop = true;
    meddler.join();
}

TEST(InfoCommand, AMissingFileIsStatus3AndTheOthersAreStillShown)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", three_of_seven().bytes());
    const auto shown = run_qntrace({"info", folder.path("missing"), path});
    EXPECT_EQ(shown.status, 3);
    EXPECT_NE(shown.out.find("records    3"), std::string::npos) << shown.out;
    EXPECT_EQ(shown.err, "qntrace: " + folder.path("missing") + ": cannot be opened: No such file or directory\n");
}

} // namespace
} // namespace qn::test
