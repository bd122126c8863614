// The records that the library writes itself: start, restart and time calibration.
#include <cstring>
#include <functional>
#include <unistd.h>
#include <utility>

#include <gtest/gtest.h>

#include "recording/counter_stand_ins.h"
#include "recording/expected_bytes.h"
#include "recording/one_trace.h"
#include "trace/trace.h"

using namespace qn::test;

namespace
{
constexpr uint16_t start_kind = 16;
constexpr uint16_t calibration_kind = 17;
constexpr uint16_t restart_kind = 19;

expected_bytes start_body()
{
    return expected_bytes()
        .anything(4)
        .u32(static_cast<uint32_t>(getpid()))
        .u64(time_base.timeinfo1)
        .u64(time_base.timeinfo2);
}

// A core event that was announced for a file; gone at the end of the test.
class core_event
{
public:
    core_event(const std::string &file, const std::string &message) : file_(file), message_(message)
    {
        gCoreTrcFile = file_.data();
        gCoreMessage = message_.data();
    }
    core_event(const core_event &) = delete;
    core_event &operator=(const core_event &) = delete;
    ~core_event()
    {
        gCoreTrcFile = nullptr;
        gCoreMessage = nullptr;
    }

private:
    std::string file_;
    std::string message_;
};

record_image newest(const one_trace &trace) { return trace.image().records().back(); }

std::function<void()> during_comparison; // runs once, inside the next strcmp() of the library
} // namespace

// In place of strcmp() in this program (linked with --wrap). Visible, because the linker looks at the shared libraries'
// calls too.
#pragma GCC visibility push(default)
extern "C" {
int __real_strcmp(const char *left, const char *right);

int __wrap_strcmp(const char *left, const char *right)
{
    const auto action = std::exchange(during_comparison, nullptr);
    if (action) action();
    return __real_strcmp(left, right);
}
}
#pragma GCC visibility pop

TEST(StartRecord, IsTheFirstRecordOfANewFile)
{
    const one_trace trace;
    const auto records = trace.image().records();
    ASSERT_EQ(records.size(), 1U);
    EXPECT_EQ(records[0].offset, 200U);
    EXPECT_EQ(records[0].length(), 52U);
    EXPECT_EQ(records[0].sequence(), 2U);
    expect_record(records[0], start_kind, "____", start_body());
}

TEST(StartRecord, LeavesItsTraceIdUnwritten)
{
    const one_trace trace;
    // A new file is filled with a pattern that counts through the byte values.
    EXPECT_EQ(newest(trace).bytes.substr(28, 4), "\xE4\xE5\xE6\xE7");
}

TEST(StartRecord, IsWrittenOnceForEveryStart)
{
    const one_trace trace;
    EXPECT_EQ(tr_set_filename_1(nullptr), 0);
    client other("ELSE");
    EXPECT_EQ(other.register_now(), 0);
    EXPECT_EQ(trace.image().records_of(start_kind).size(), 2U);
    EXPECT_EQ(newest(trace).sequence(), 4U);
}

TEST(StartRecord, IsNotWrittenWhileTracingIsStopped)
{
    const one_trace trace;
    const std::string before = trace.image().bytes();
    global_stop_trace();
    EXPECT_EQ(int_record_start(&anchors), 0);
    EXPECT_EQ(trace.image().bytes(), before);
}

TEST(StartRecord, IsNotWrittenIntoATraceThatIsNotActive)
{
    const one_trace trace;
    const std::string before = trace.image().bytes();
    anchors.uMaxSize = 0;
    EXPECT_EQ(int_record_start(&anchors), 0);
    EXPECT_EQ(trace.image().bytes(), before);
}

TEST(StartRecord, IsDroppedWithoutSpace)
{
    const one_trace trace;
    const std::string before = trace.image().bytes();
    anchors.uMaxSize = 48;
    EXPECT_EQ(int_record_start(&anchors), 0);
    EXPECT_EQ(trace.image().bytes(), before);
}

TEST(RestartRecord, CarriesTheMessageOfTheCoreEvent)
{
    const one_trace trace;
    const core_event event(trace.file(), "it crashed");
    EXPECT_EQ(int_record_start(&anchors), 0);
    const record_image record = newest(trace);
    EXPECT_EQ(record.length(), 64U); // 52 and 11, rounded up
    expect_record(record, restart_kind, "____", start_body().string("it crashed").pad_to_4());
}

TEST(RestartRecord, TakesTheStartRecordsPlaceWhenTheFileIsStarted)
{
    const one_trace trace;
    const core_event event(trace.file(), "gone");
    EXPECT_EQ(tr_set_filename_1(nullptr), 0);
    client other("ELSE");
    EXPECT_EQ(other.register_now(), 0);
    EXPECT_EQ(trace.image().records_of(start_kind).size(), 1U);
    EXPECT_EQ(newest(trace).function(), restart_kind);
}

TEST(RestartRecord, IsNotWrittenIntoAnotherFile)
{
    const one_trace trace;
    const core_event event(trace.file(), "gone");
    const std::string other = trace.folder() / "other.trc";
    start_another(other);
    const auto records = trace_image::of_file(other).records();
    ASSERT_EQ(records.size(), 1U);
    EXPECT_EQ(records[0].function(), start_kind);
}

TEST(RestartRecord, NeedsTheWholeNameOfTheFile)
{
    const one_trace trace;
    const core_event event(trace.file() + "x", "gone");
    EXPECT_EQ(int_record_start(&anchors), 0);
    EXPECT_EQ(newest(trace).function(), start_kind);

    const core_event shorter(trace.file().substr(0, trace.file().size() - 1), "gone");
    EXPECT_EQ(int_record_start(&anchors), 0);
    EXPECT_EQ(newest(trace).function(), start_kind);
}

TEST(RestartRecord, NeedsAMessage)
{
    const one_trace trace;
    const core_event event(trace.file(), "gone");
    gCoreMessage = nullptr;
    EXPECT_EQ(int_record_start(&anchors), 0);
    EXPECT_EQ(newest(trace).function(), start_kind);
}

TEST(RestartRecord, CarriesTheMessageOfAnEventThatIsTakenBackMeanwhile)
{
    const one_trace trace;
    const core_event event(trace.file(), "gone");
    during_comparison = [] { tr_core_event_1(nullptr, nullptr); };
    EXPECT_EQ(int_record_start(&anchors), 0);
    EXPECT_EQ(gCoreMessage, nullptr);
    EXPECT_EQ(newest(trace).function(), restart_kind);
    EXPECT_EQ(newest(trace).text(52), "gone");
}

TEST(RestartRecord, ByItselfIsAStartRecordWithoutAMessage)
{
    const one_trace trace;
    EXPECT_EQ(segfault_restart(&anchors), 0);
    EXPECT_EQ(trace.image().records_of(start_kind).size(), 2U);
    EXPECT_EQ(newest(trace).length(), 52U);
}

TEST(RestartRecord, IsWrittenAtEveryStartFromThenOn)
{
    const one_trace trace;
    const core_event event(trace.file(), "gone");
    EXPECT_EQ(int_record_start(&anchors), 0);
    EXPECT_EQ(int_record_start(&anchors), 0);
    EXPECT_EQ(trace.image().records_of(restart_kind).size(), 2U);
    EXPECT_STREQ(gCoreMessage, "gone");
}

TEST(RestartRecord, IsNotWrittenWhileTracingIsStopped)
{
    const one_trace trace;
    const core_event event(trace.file(), "gone");
    global_stop_trace();
    EXPECT_EQ(int_record_start(&anchors), 0);
    EXPECT_TRUE(trace.image().records_of(restart_kind).empty());
}

TEST(RestartRecord, ByItselfDoesNotAskForTheStopSwitch)
{
    const one_trace trace;
    const core_event event(trace.file(), "gone");
    global_stop_trace();
    EXPECT_EQ(segfault_restart(&anchors), 0);
    EXPECT_EQ(trace.image().records_of(restart_kind).size(), 1U);
}

TEST(RestartRecord, IsNotWrittenIntoATraceThatIsNotActive)
{
    const one_trace trace;
    const core_event event(trace.file(), "gone");
    const std::string before = trace.image().bytes();
    anchors.uMaxSize = 0;
    EXPECT_EQ(segfault_restart(&anchors), 0);
    EXPECT_EQ(trace.image().bytes(), before);
}

TEST(RestartRecord, IsDroppedWhenItsMessageIsTooLong)
{
    const one_trace trace;
    const std::string before = trace.image().bytes();
    const core_event event(trace.file(), std::string(trace.usual_bytes, 'm'));
    EXPECT_EQ(int_record_start(&anchors), 0);
    EXPECT_EQ(trace.image().bytes(), before);
}

// The message's length and the record's.
class RestartRecordLength : public testing::TestWithParam<std::pair<size_t, uint32_t>>
{
};

INSTANTIATE_TEST_SUITE_P(Of, RestartRecordLength,
                         testing::Values(std::pair(0, 56), std::pair(1, 56), std::pair(2, 56), std::pair(3, 56),
                                         std::pair(4, 60), std::pair(5, 60), std::pair(6, 60), std::pair(7, 60),
                                         std::pair(8, 64)),
                         [](const auto &info) { return std::to_string(info.param.first) + "Characters"; });

TEST_P(RestartRecordLength, HasRoomForTheTerminator)
{
    const one_trace trace;
    const std::string message = std::string("12345678").substr(0, GetParam().first);
    const core_event event(trace.file(), message);
    EXPECT_EQ(int_record_start(&anchors), 0);
    const record_image record = newest(trace);
    EXPECT_EQ(record.function(), restart_kind);
    EXPECT_EQ(record.length(), GetParam().second);
    EXPECT_EQ(record.text(52), message);
}

TEST(CalibrationRecord, ReBasesTheFilesTimeInformation)
{
    const one_trace trace;
    const cu_timeinfo_t of_file{12345, 67890};
    std::memcpy(anchors.pMap + 24, &of_file, sizeof of_file);
    EXPECT_EQ(__time_calibration(&anchors), 0);
    const record_image record = newest(trace);
    EXPECT_EQ(record.length(), 44U);
    expect_record(record, calibration_kind, "____", expected_bytes().u64(67891).u64(12347));
    EXPECT_EQ(trace.image().u64(24), 12345U); // the file's own stays
    EXPECT_EQ(trace.image().u64(32), 67890U);
}

TEST(CalibrationRecord, IsNotWrittenIntoATraceThatIsNotActive)
{
    const one_trace trace;
    const std::string before = trace.image().bytes();
    anchors.uMaxSize = 0;
    EXPECT_EQ(__time_calibration(&anchors), 0);
    EXPECT_EQ(trace.image().bytes(), before);
}

TEST(CalibrationRecord, IsDroppedWithoutSpace)
{
    const one_trace trace;
    const std::string before = trace.image().bytes();
    anchors.uMaxSize = 40;
    EXPECT_EQ(__time_calibration(&anchors), 0);
    EXPECT_EQ(trace.image().bytes(), before);
}
