// Strings records: counts, cuts and refusals.
#include <chrono>
#include <thread>

#include <gtest/gtest.h>

#include "recording/expected_bytes.h"
#include "recording/one_trace.h"
#include "recording/writers.h"
#include "trace/trace.h"

using namespace qn::test;
using qn::tr::store_relaxed;

namespace
{
constexpr uint16_t strings = 15;
constexpr uint32_t small_file = 4096; // its longest record has 1948 bytes
constexpr uint32_t longest = 1948;
} // namespace

TEST(StringsWriter, StoresStringsBackToBack)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 3, "a", "bcd", "ef"), 0);
    expect_record(trace.only_record(), strings, "COMP",
                  expected_bytes().u32(7).u32(3).u32(9).string("a").string("bcd").string("ef").pad_to_4());
}

TEST(StringsWriter, RoundsTheLengthUpToAMultipleOf4)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 1, "ab"), 0);
    const record_image record = trace.only_record();
    EXPECT_EQ(record.u32(36), 3U);
    EXPECT_EQ(record.length(), 44U);
}

TEST(StringsWriter, AddsNothingToAMultipleOf4)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 1, "abc"), 0);
    EXPECT_EQ(trace.only_record().length(), 44U);
}

TEST(StringsWriter, RefusesNoStrings)
{
    const one_trace trace;
    leave_marker();
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 0), 34);
    EXPECT_TRUE(marker_is_there());
    EXPECT_TRUE(trace.written().empty());
}

TEST(StringsWriter, Takes32Strings)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 32, "a", "b", "c", "d", "e", "f", "g", "h", "i", "j", "k", "l", "m", "n",
                                  "o", "p", "q", "r", "s", "t", "u", "v", "w", "x", "y", "z", "A", "B", "C", "D", "E",
                                  "F"),
              0);
    const record_image record = trace.only_record();
    EXPECT_EQ(record.u32(32), 32U);
    EXPECT_EQ(record.u32(36), 64U);
    EXPECT_EQ(record.text(40), "a");
    EXPECT_EQ(record.text(40 + 2 * 31), "F");
}

TEST(StringsWriter, Refuses33Strings)
{
    const one_trace trace;
    leave_marker();
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 33, "a"), 34);
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 0xFFFFFFFF, "a"), 34);
    EXPECT_TRUE(marker_is_there());
    EXPECT_TRUE(trace.written().empty());
}

TEST(StringsWriter, RefusesAnEmptyStringBehindAValidOne)
{
    const one_trace trace;
    leave_marker();
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 2, "valid", ""), 27);
    EXPECT_TRUE(marker_is_there());
    EXPECT_TRUE(trace.written().empty());
}

TEST(StringsWriter, RefusesANullString)
{
    const one_trace trace;
    const char *none = nullptr;
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 1, none), 27);
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 2, "valid", none), 27);
    EXPECT_EQ(tr_record_string_1("COMP", none), 27);
    EXPECT_EQ(tr_record_string_1("COMP", ""), 27);
    EXPECT_TRUE(trace.written().empty());
}

TEST(StringsWriter, ChecksTheComponentBeforeTheCount)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_strings_1("", 7, 0), 2);
}

TEST(StringsWriter, ChecksTheStringsBeforeTheLock)
{
    const one_trace trace;
    const unlockable lock(anchors.anchorMutex);
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 0), 34);
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 1, ""), 27);
}

TEST(StringsWriter, ChecksTheStringsOfATraceThatIsNotActive)
{
    const one_trace trace;
    anchors.uMaxSize = 0;
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 33, "a"), 34);
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 1, ""), 27);
}

TEST(StringsWriter, DropsTheStringsThatDoNotFit)
{
    const one_trace trace(small_file);
    const std::string first(999, 'x');
    const std::string second(longest - 1000, 'y'); // with its NUL a byte too long
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 3, first.c_str(), second.c_str(), "z"), 0);
    expect_record(trace.only_record(), strings, "COMP", expected_bytes().u32(7).u32(1).u32(1000).string(first));
}

TEST(StringsWriter, DoesNotLookAtStringsBehindTheCut)
{
    const one_trace trace(small_file);
    const std::string huge(longest, 'x');
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 3, "first", huge.c_str(), ""), 0);
    EXPECT_EQ(trace.only_record().u32(32), 1U);
}

TEST(StringsWriter, WritesOnlyTheFixedPartWhenTheFirstStringIsTooLong)
{
    const one_trace trace(small_file);
    const std::string huge(longest, 'x');
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 1, huge.c_str()), 0);
    expect_record(trace.only_record(), strings, "COMP", expected_bytes().u32(7).u32(0).u32(0));
}

TEST(StringsWriter, WritesOnlyTheFixedPartWhenTheFirstOfSeveralStringsIsTooLong)
{
    const one_trace trace(small_file);
    const std::string huge(longest, 'x');
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 2, huge.c_str(), "second"), 0);
    expect_record(trace.only_record(), strings, "COMP", expected_bytes().u32(7).u32(0).u32(0));
}

TEST(StringsWriter, WritesOnlyTheFixedPartWhenTheOnlyStringIsTooLong)
{
    const one_trace trace(small_file);
    const std::string huge(longest, 'x');
    EXPECT_EQ(tr_record_string_1("COMP", huge.c_str()), 0);
    expect_record(trace.only_record(), strings, "COMP", expected_bytes().u32(0xFFFFFFFF).u32(0).u32(0));
}

TEST(StringsWriter, WritesARecordOfTheLongestLength)
{
    const one_trace trace(small_file);
    const std::string text(longest - 41, 'x');
    EXPECT_EQ(tr_record_string_1("COMP", text.c_str()), 0);
    expect_record(trace.only_record(), strings, "COMP",
                  expected_bytes().u32(0xFFFFFFFF).u32(1).u32(longest - 40).string(text));
}

TEST(StringsWriter, LosesARecordWhoseStringsFitButNotWithTheFixedPart)
{
    const one_trace trace(small_file);
    const std::string text(longest - 40, 'x');
    EXPECT_EQ(tr_record_string_1("COMP", text.c_str()), 0);
    EXPECT_EQ(tr_record_strings_1("COMP", 7, 2, "y", text.c_str() + 2), 0);
    EXPECT_TRUE(trace.written().empty());
}

// The strings are measured before the lock is there. A trace that is started meanwhile is not to get a record of none.
TEST(StringsWriter, WritesNothingIntoATraceThatIsStartedWhileItWaits)
{
    const one_trace trace;
    ASSERT_EQ(lock_anchor_set(&anchors), 0);
    const qn_uint32_t active = anchors.uMaxSize;
    store_relaxed(anchors.uMaxSize, 0);
    std::thread one([] { EXPECT_EQ(tr_record_strings_1("COMP", 7, 1, "a"), 0); });
    std::thread two([] { EXPECT_EQ(tr_record_strings_1("COMP", 7, 2, "a", "b"), 0); });
    std::this_thread::sleep_for(std::chrono::milliseconds(50)); // for both to look
    store_relaxed(anchors.uMaxSize, active);
    EXPECT_EQ(unlock_anchor_set(&anchors), 0);
    one.join();
    two.join();
    for (const record_image &record : trace.written()) EXPECT_NE(record.u32(32), 0U); // who looked late
}
