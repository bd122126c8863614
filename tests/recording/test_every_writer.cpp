// What holds for every record writer, called in each of its forms.
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "recording/one_trace.h"
#include "recording/writers.h"
#include "trace/trace.h"

using namespace qn::test;

namespace
{
class Writer : public testing::TestWithParam<writer_call>
{
};

std::string name_of(const testing::TestParamInfo<writer_call> &info) { return info.param.name; }
} // namespace

INSTANTIATE_TEST_SUITE_P(Every, Writer, testing::ValuesIn(all_writers()), name_of);

TEST_P(Writer, WritesItsRecordToTheDefaultFile)
{
    const one_trace trace;
    EXPECT_EQ(GetParam().write("COMP", nullptr), 0);
    expect_record(trace.only_record(), GetParam().function, "COMP", GetParam().body);
}

TEST_P(Writer, WritesToTheFileOfItsToken)
{
    const one_trace trace;
    const tr_file_token_t token = start_another(trace.folder() / "other.trc");
    EXPECT_EQ(GetParam().write("COMP", token), 0);

    std::vector<record_image> other = trace_image::of_file(trace.folder() / "other.trc").records();
    ASSERT_FALSE(other.empty());
    EXPECT_EQ(other.front().function(), 16);
    if (GetParam().takes_token) {
        ASSERT_EQ(other.size(), 2U);
        expect_record(other[1], GetParam().function, "COMP", GetParam().body);
        EXPECT_TRUE(trace.written().empty());
    } else {
        EXPECT_EQ(other.size(), 1U);
        EXPECT_EQ(trace.written().size(), 1U);
    }
}

TEST(EveryWriter, IsThere) { EXPECT_EQ(all_writers().size(), 35U); }

TEST(EveryWriter, NumbersAndStampsItsRecord)
{
    const one_trace trace;
    uint32_t sequence = 2;
    uint64_t stamp = 0;
    for (const writer_call &writer : all_writers()) {
        SCOPED_TRACE(writer.name);
        EXPECT_EQ(writer.write("COMP", nullptr), 0);
        const record_image record = trace.written().back();
        EXPECT_EQ(record.sequence(), sequence += 2);
        EXPECT_EQ(record.thread(), static_cast<uint32_t>(pthread_self()));
        EXPECT_GE(record.time_stamp(), stamp);
        stamp = record.time_stamp();
    }
}

TEST(EveryWriter, DoesNothingWhileTracingIsStopped)
{
    const one_trace trace;
    const std::string before = trace.image().bytes();
    global_stop_trace();
    for (const writer_call &writer : all_writers()) {
        SCOPED_TRACE(writer.name);
        leave_marker();
        EXPECT_EQ(writer.write("COMP", nullptr), 0);
        EXPECT_TRUE(marker_is_there());
    }
    EXPECT_EQ(trace.image().bytes(), before);
}

TEST(EveryWriter, LooksAtTheStopSwitchBeforeTheComponent)
{
    const one_trace trace;
    global_stop_trace();
    for (const writer_call &writer : all_writers()) {
        SCOPED_TRACE(writer.name);
        EXPECT_EQ(writer.write(nullptr, nullptr), 0);
        EXPECT_EQ(writer.write("", nullptr), 0);
    }
}

TEST(EveryWriter, RefusesAMissingComponent)
{
    const one_trace trace;
    const std::string before = trace.image().bytes();
    for (const writer_call &writer : all_writers()) {
        SCOPED_TRACE(writer.name);
        leave_marker();
        EXPECT_EQ(writer.write(nullptr, nullptr), 2);
        EXPECT_EQ(writer.write("", nullptr), 2);
        EXPECT_TRUE(marker_is_there());
    }
    EXPECT_EQ(trace.image().bytes(), before);
}

TEST(EveryWriter, Returns9WhenItCannotLock)
{
    const one_trace trace;
    const std::string before = trace.image().bytes();
    {
        const unlockable lock(anchors.anchorMutex);
        for (const writer_call &writer : all_writers()) {
            SCOPED_TRACE(writer.name);
            leave_marker();
            EXPECT_EQ(writer.write("COMP", nullptr), 9);
            EXPECT_TRUE(marker_is_there());
        }
    }
    EXPECT_EQ(trace.image().bytes(), before);
    EXPECT_TRUE(is_free(anchors.anchorMutex));
}

TEST(EveryWriter, LocksTheFileOfItsTokenOnly)
{
    const one_trace trace;
    const tr_file_token_t token = start_another(trace.folder() / "other.trc");
    const unlockable lock(anchors.anchorMutex); // the default file's
    for (const writer_call &writer : all_writers()) {
        SCOPED_TRACE(writer.name);
        EXPECT_EQ(writer.write("COMP", token), writer.takes_token ? 0 : 9);
    }
}

TEST(EveryWriter, WritesNothingIntoATraceThatIsNotActive)
{
    const one_trace trace;
    const std::string before = trace.image().bytes();
    anchors.uMaxSize = 0;
    for (const writer_call &writer : all_writers()) {
        SCOPED_TRACE(writer.name);
        leave_marker();
        EXPECT_EQ(writer.write("COMP", nullptr), 0);
        EXPECT_TRUE(marker_is_there());
    }
    EXPECT_EQ(trace.image().bytes(), before);
}

TEST(EveryWriter, WritesNothingWithoutATraceFile)
{
    for (const writer_call &writer : all_writers()) {
        SCOPED_TRACE(writer.name);
        EXPECT_EQ(writer.write("COMP", nullptr), 0);
    }
    EXPECT_EQ(anchors.pMap, nullptr);
}

TEST(EveryWriter, NeedsNoRegistration)
{
    const one_trace trace;
    EXPECT_EQ(all_writers().front().write("NONE", nullptr), 0);
    EXPECT_EQ(trace.only_record().component(), "NONE");
}

TEST(EveryWriter, LeavesTheErrorRecordAloneWhenItWrites)
{
    const one_trace trace;
    for (const writer_call &writer : all_writers()) {
        SCOPED_TRACE(writer.name);
        leave_marker();
        EXPECT_EQ(writer.write("COMP", nullptr), 0);
        EXPECT_TRUE(marker_is_there());
    }
}

TEST(EveryWriter, LeavesTheLockFree)
{
    const one_trace trace;
    for (const writer_call &writer : all_writers()) {
        SCOPED_TRACE(writer.name);
        writer.write("COMP", nullptr);
        EXPECT_TRUE(is_free(anchors.anchorMutex));
    }
}

TEST(ComponentIdentifier, IsCutToFourCharacters)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_id_1("ABCDEF", 1), 0);
    EXPECT_EQ(trace.only_record().component(), "ABCD");
}

TEST(ComponentIdentifier, ThatIsShorterBringsTheBytesBehindIt)
{
    const one_trace trace;
    const char component[] = {'A', '\0', 'x', 'y', 'z'};
    EXPECT_EQ(tr_record_id_1(component, 1), 0);
    EXPECT_EQ(trace.only_record().component(), std::string("A\0xy", 4));
}

TEST(ComponentIdentifier, MayEndWithTheLastByteOfTheMemory)
{
    const one_trace trace;
    const auto page = static_cast<size_t>(sysconf(_SC_PAGESIZE));
    void *two = mmap(nullptr, 2 * page, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    ASSERT_NE(two, MAP_FAILED);
    char *pages = static_cast<char *>(two);
    ASSERT_EQ(munmap(pages + page, page), 0);
    pages[page - 2] = 'Z';
    EXPECT_EQ(tr_record_id_1(pages + page - 2, 1), 0);
    EXPECT_EQ(trace.only_record().component().substr(0, 2), std::string("Z\0", 2));
    munmap(pages, page);
}

TEST(ForkedChild, WritesNothing)
{
    const one_trace trace;
    const std::string before = trace.image().bytes();
    const pid_t child = fork();
    if (child == 0) {
        qn_int32_t status = 0;
        for (const writer_call &writer : all_writers()) status |= writer.write("COMP", nullptr);
        _exit(status);
    }
    int status = -1;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
    EXPECT_EQ(trace.image().bytes(), before);
}
