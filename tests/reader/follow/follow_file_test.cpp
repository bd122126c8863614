// qntrace follow with a single file that a program writes meanwhile.
#include <gtest/gtest.h>

#include <csignal>
#include <fstream>
#include <map>
#include <regex>

#include <fcntl.h>
#include <unistd.h>

#include "reader/follow/follower.h"
#include "reader/follow/live_writer.h"
#include "reader/spool_directory.h"
#include "reader/trace_builder.h"

namespace qn::test
{
namespace
{

using numbers = std::vector<std::uint64_t>;

struct Follow : testing::Test {
    scratch_folder folder;
    std::string file = folder.path("app.trc");
};

TEST_F(Follow, ShowsWhatIsWrittenFromNowOn)
{
    live_writer writer(file);
    writer.write(10);
    auto running = follower::of({file});
    writer.write(5);
    running.wait_for_value(14);
    EXPECT_EQ(running.interrupted().status, 0);
    EXPECT_EQ(running.values(), counted(10, 5));
}

TEST_F(Follow, BeginsWithTheOldestRecordOnDemand)
{
    live_writer writer(file);
    writer.write(10);
    auto running = follower::of({"--from-start", file});
    writer.write(5);
    running.wait_for_value(14);
    EXPECT_EQ(running.interrupted().status, 0);
    EXPECT_EQ(running.values(), counted(0, 15));
}

TEST_F(Follow, BeginsWithTheNewestOfTheSelectedRecordsOnDemand)
{
    live_writer writer(file);
    writer.write(10);
    auto running = follower::of({"--last", "2", "--where", "value < 8 || value > 9", file});
    running.wait_for_value(7);
    writer.write(5);
    running.wait_for_value(14);
    EXPECT_EQ(running.values(), (numbers{6, 7, 10, 11, 12, 13, 14}));
}

TEST_F(Follow, PrintsTextWithOneHeader)
{
    live_writer writer(file);
    follower running({"follow", file});
    running.wait_for_out("BODY");
    writer.write(2);
    running.wait_for_out("id=1 [1]");
    const auto shown = running.interrupted().out;
    EXPECT_TRUE(shown.starts_with("file     " + file)) << shown;
    EXPECT_NE(shown.find("id=1 [0]"), std::string::npos);
    EXPECT_EQ(shown.find("TIME"), shown.rfind("TIME"));
}

TEST_F(Follow, EndsWithTheWriterAndShowsAllOfItsRecords)
{
    live_writer writer(file);
    auto running = follower::of({"--until-exit", file});
    writer.write(1000);
    writer.end();
    EXPECT_EQ(running.ended().status, 0);
    EXPECT_EQ(running.values(), counted(0, 1000));
}

TEST_F(Follow, EndsWithAWriterThatIsKilled)
{
    live_writer writer(file);
    auto running = follower::of({"--until-exit", file});
    writer.write(1000);
    writer.kill();
    EXPECT_EQ(running.ended().status, 0);
    EXPECT_EQ(running.values(), counted(0, 1000));
}

TEST_F(Follow, EndsWithTheLastWriterWhenTheStartOfAnEarlierOneWasOverwritten)
{
    live_writer(file).write(10);
    live_writer writer(file, 10);
    writer.write(7000); // once round, so that the header names the first one
    auto running = follower::of({"--until-exit", file});
    writer.write(100);
    running.wait_for_value(7109);
    writer.write(1);
    writer.end();
    EXPECT_EQ(running.ended().status, 0);
    EXPECT_EQ(running.values(), counted(7010, 101));
}

TEST_F(Follow, TellsAtItsEndThatTheNewestRecordIsNotComplete)
{
    trace_builder built;
    built.put_u32(48, 0); // no process
    built.add_id(1);
    const auto last = built.add_id(2);
    built.put_u16(last + 4, 0xFFFF);
    built.close();
    const auto path = folder.file("dead.trc", built.bytes());
    const auto shown = run_qntrace({"follow", "--from-start", "--until-exit", "--json", path});
    EXPECT_EQ(shown.status, 1);
    EXPECT_EQ(rows(shown).size(), 2u); // the header and one record
    EXPECT_NE(shown.err.find("was complete (sequence number 4)"), std::string::npos) << shown.err;
}

TEST_F(Follow, TellsThatAFileCannotBeFollowed)
{
    trace_builder built;
    built.put_u32(48, 0);
    built.put_u32(built.add_id(1), 0); // a record of no length
    built.close();
    const auto shown = run_qntrace({"follow", "--until-exit", folder.file("broken.trc", built.bytes())});
    EXPECT_EQ(shown.status, 1);
    EXPECT_NE(shown.err.find("cannot be followed"), std::string::npos) << shown.err;
}

TEST_F(Follow, GoesOnBehindDamage)
{
    trace_builder built;
    built.put_u32(48, 0);
    built.add_id(1);
    const auto oldest = built.at;
    built.put_u32(built.add_id(2), 30); // what is left of the lap before
    built.set_oldest(oldest);
    const auto path = folder.file("torn.trc", built.bytes());
    const auto shown = run_qntrace({"follow", "--from-start", "--until-exit", "--json", path});
    EXPECT_EQ(shown.status, 1);
    EXPECT_NE(shown.err.find("offset 232: the length of this record makes no sense"), std::string::npos) << shown.err;
    EXPECT_NE(shown.out.find("\"id\":1"), std::string::npos) << shown.out;
}

TEST_F(Follow, ShowsTheRecordsBehindADamagedNumber)
{
    trace_builder built;
    built.put_u32(48, 0);
    built.add_id(1);
    built.put_u32(built.add_id(2) + 8, 0x40000000);
    built.add_id(3);
    built.close();
    const auto path = folder.file("torn.trc", built.bytes());
    const auto shown = run_qntrace({"follow", "--from-start", "--until-exit", "--json", path});
    EXPECT_EQ(shown.status, 1);
    EXPECT_NE(shown.err.find("sequence number 6 follows 1073741824"), std::string::npos) << shown.err;
    EXPECT_NE(shown.out.find("\"id\":3"), std::string::npos) << shown.out;
}

TEST_F(Follow, ShowsAllPagesOfATraceThatNobodyWrites)
{
    trace_builder page(4096);
    page.component = "WRIT";
    page.add(13, page.body().u32(1).u32(1).u64(5));
    page.close();
    trace_builder empty = page;
    empty.put_u16(200 + 4, 65535); // its only record was not completed
    for (const auto *name : {"pages.trc.1.sp", "pages.trc.3.sp", "pages.trc.4.sp"}) folder.file(name, page.bytes());
    folder.file("pages.trc.2.sp", empty.bytes());
    follower running({"follow", "--json", "--from-start", "--until-exit", folder.path("pages.trc")});
    running.ended();
    EXPECT_EQ(running.values(), (std::vector<std::uint64_t>{5, 5, 5}));
}

TEST_F(Follow, EndsBySignalsWithAllThatWasWrittenShown)
{
    live_writer writer(file);
    for (const int signal : {SIGINT, SIGTERM}) {
        auto running = follower::of({"--from-start", file});
        running.send(signal);
        const auto ended = running.ended();
        EXPECT_EQ(ended.status, 0);
        EXPECT_EQ(ended.err, "");
        EXPECT_TRUE(ended.out.ends_with("}\n"));
    }
}

TEST_F(Follow, EndsQuietlyWhenNobodyReadsAnyMore)
{
    live_writer writer(file);
    int ends[2];
    ASSERT_EQ(pipe2(ends, O_CLOEXEC), 0);
    follower running({"follow", "--json", file}, ends[1]);
    close(ends[1]);
    char first = 0;
    ASSERT_EQ(read(ends[0], &first, 1), 1);
    close(ends[0]);
    const auto ended = running.ended(); // though nothing more is written
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "");
}

TEST_F(Follow, RefusesAFileThatIsNotThere)
{
    const auto shown = run_qntrace({"follow", file});
    EXPECT_EQ(shown.status, 3);
    EXPECT_EQ(shown.err, "qntrace: " + file + ": cannot be opened: No such file or directory\n");
}

TEST_F(Follow, RefusesAFileOfAnotherKind)
{
    std::ofstream(file) << "no trace at all, but a text that is long enough\n";
    const auto shown = run_qntrace({"follow", file});
    EXPECT_EQ(shown.status, 1);
    EXPECT_EQ(shown.err, "qntrace: " + file + ": not a trace file: its header makes no sense\n");
}

TEST_F(Follow, WaitsForAFileThatIsStillEmpty)
{
    std::ofstream{file};
    follower running({"follow", "--json", file});
    running.wait_until_open(file);
    live_writer writer(file);
    writer.write(3);
    running.wait_for_value(2);
    EXPECT_EQ(running.values(), counted(0, 3));
}

// Every gap of the sequence numbers is told, but for the fillers, which carry nothing.
TEST_F(Follow, ShowsOrTellsAllThatAFastWriterWritesRoundAndRound)
{
    constexpr std::uint64_t count = 400'000;
    live_writer writer(file);
    auto running = follower::of({"--until-exit", "--from-start", file});
    writer.write(count);
    writer.end();
    const auto ended = running.ended();
    std::map<std::uint64_t, std::uint64_t> told; // how many are lost, by the first of them
    static const std::regex lost("([0-9]+) records? w[a-z]+ overwritten before .* from sequence number ([0-9]+) on");
    for (std::sregex_iterator found(ended.err.begin(), ended.err.end(), lost), end; found != end; ++found)
        told[std::stoull((*found)[2])] = std::stoull((*found)[1]);
    EXPECT_EQ(ended.status, told.empty() ? 0 : 1) << ended.err;
    std::uint64_t next = 2;
    for (const auto &object : rows(ended)) {
        if (object.at("type") != "record") continue;
        const std::uint64_t seq = object.at("seq");
        // At most one filler before what is lost, and one behind it.
        for (int fillers = 0; next != seq;) {
            const auto gap = told.find(next);
            const bool is_filler = gap == told.end();
            fillers += is_filler;
            ASSERT_LE(fillers, 2) << next << "\n" << ended.err;
            next += is_filler ? 2 : 2 * gap->second;
            ASSERT_LE(next, seq) << ended.err;
        }
        next = seq + 2;
    }
    EXPECT_EQ(running.values().back(), count - 1);
}

TEST_F(Follow, GoesOnBehindADumpOfWhatIsThere)
{
    live_writer writer(file);
    writer.write(10);
    follower running({"dump", "--follow", "--json", file});
    running.wait_for_value(9);
    writer.write(5);
    running.wait_for_value(14);
    EXPECT_EQ(running.interrupted().status, 0);
    EXPECT_EQ(running.values(), counted(0, 15));
}

TEST_F(Follow, GoesOnBehindADumpOfTheNewestRecords)
{
    live_writer writer(file);
    writer.write(10);
    follower running({"dump", "--follow", "--last", "3", "--until-exit", "--json", file});
    running.wait_for_value(9);
    writer.write(5);
    writer.end();
    EXPECT_EQ(running.ended().status, 0);
    EXPECT_EQ(running.values(), counted(7, 8));
}

TEST_F(Follow, IsRefusedByADumpOfSeveralFilesOrOfRawRecords)
{
    EXPECT_EQ(run_qntrace({"dump", "--follow", file, file}).status, 2);
    EXPECT_EQ(run_qntrace({"dump", "--follow", "--raw", file}).status, 2);
    EXPECT_EQ(run_qntrace({"dump", "--until-exit", file}).status, 2);
}

} // namespace
} // namespace qn::test
