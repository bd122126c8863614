// Formatted text: a strings record with one string, made in a buffer of 1024 characters.
#include <gtest/gtest.h>

#include "recording/expected_bytes.h"
#include "recording/one_trace.h"
#include "recording/writers.h"
#include "trace/trace.h"

using namespace qn::test;

namespace
{
constexpr uint16_t strings = 15;

expected_bytes one_string(std::string_view text)
{
    return expected_bytes().u32(7).u32(1).u32(static_cast<uint32_t>(text.size() + 1)).string(text).pad_to_4();
}

#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
// With a format that no compiler checks, and no inserts.
qn_int32_t write_unchecked(const char *component, const char *format)
{
    return with_list([=](va_list args) { return tr_record_vfmt_string_1(component, 7, format, args); }, 0);
}
#pragma GCC diagnostic pop
} // namespace

TEST(FormattedWriter, FillsTheInsertsIn)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_fmt_string_1("COMP", 7, "%s: %5d of 0x%llX, %.2f%%", "part", -42, 0xABCDEF012345ULL, 2.5), 0);
    expect_record(trace.only_record(), strings, "COMP", one_string("part:   -42 of 0xABCDEF012345, 2.50%"));
}

TEST(FormattedWriter, FillsNumbersTextsAndWidthsIn)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_fmt_string_1("COMP", 7, "%s of %lu (%-4d|%04hhX|%c) at %p: %i%%", "part", 1234567890123UL, -5,
                                     300, 'x', reinterpret_cast<void *>(0xABCDE), 100),
              0);
    expect_record(trace.only_record(), strings, "COMP",
                  one_string("part of 1234567890123 (-5  |002C|x) at 0xabcde: 100%"));
}

TEST(FormattedWriter, TakesATextWithoutInserts)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_fmt_string_1("COMP", 7, "plain"), 0);
    expect_record(trace.only_record(), strings, "COMP", one_string("plain"));
}

TEST(FormattedWriter, RefusesAMissingFormat)
{
    const one_trace trace;
    leave_marker();
    EXPECT_EQ(write_unchecked("COMP", nullptr), 33);
    EXPECT_EQ(write_unchecked("COMP", ""), 33);
    EXPECT_TRUE(marker_is_there());
    EXPECT_TRUE(trace.written().empty());
}

TEST(FormattedWriter, ChecksTheComponentBeforeTheFormat)
{
    const one_trace trace;
    EXPECT_EQ(write_unchecked("", ""), 2);
}

TEST(FormattedWriter, ChecksTheFormatBeforeTheLock)
{
    const one_trace trace;
    const unlockable lock(anchors.anchorMutex);
    EXPECT_EQ(write_unchecked("COMP", ""), 33);
}

TEST(FormattedWriter, ReportsATextThatCannotBeMade)
{
    const one_trace trace;
    leave_marker();
    const wchar_t no_character[] = {static_cast<wchar_t>(0x7FFFFFFF), 0};
    EXPECT_EQ(tr_record_fmt_string_1("COMP", 7, "%ls", no_character), 28);
    EXPECT_TRUE(marker_is_there());
    EXPECT_TRUE(trace.written().empty());
    EXPECT_TRUE(is_free(anchors.anchorMutex));
}

TEST(FormattedWriter, FormatsNothingForATraceThatIsNotActive)
{
    const one_trace trace;
    anchors.uMaxSize = 0;
    const wchar_t no_character[] = {static_cast<wchar_t>(0x7FFFFFFF), 0};
    EXPECT_EQ(tr_record_fmt_string_1("COMP", 7, "%ls", no_character), 0);
}

TEST(FormattedWriter, Keeps1023Characters)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_fmt_string_1("COMP", 7, "%1023d", 5), 0);
    expect_record(trace.only_record(), strings, "COMP", one_string(std::string(1022, ' ') + "5"));
}

TEST(FormattedWriter, CutsALongerTextTo1023Characters)
{
    const one_trace trace;
    std::string text;
    for (int i = 0; i < 2000; ++i) text += static_cast<char>('a' + i % 26);
    EXPECT_EQ(tr_record_fmt_string_1("COMP", 7, "%s", text.c_str()), 0);
    const record_image record = trace.only_record();
    expect_record(record, strings, "COMP", one_string(text.substr(0, 1023)));
    EXPECT_EQ(record.length(), 1064U);
}

TEST(FormattedWriter, EndsTheTextAtANulThatAnInsertBrings)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_fmt_string_1("COMP", 7, "ab%cde", '\0'), 0);
    expect_record(trace.only_record(), strings, "COMP", one_string("ab"));
}

TEST(FormattedWriter, EndsALongTextAtANulThatAnInsertBrings)
{
    const one_trace trace;
    const std::string rest(2000, 'r');
    EXPECT_EQ(tr_record_fmt_string_1("COMP", 7, "ab%c%s", '\0', rest.c_str()), 0);
    expect_record(trace.only_record(), strings, "COMP", one_string("ab"));
}

TEST(FormattedWriter, WritesAnEmptyTextAsItsTerminator)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_fmt_string_1("COMP", 7, "%s", ""), 0);
    expect_record(trace.only_record(), strings, "COMP", one_string(""));
}

TEST(FormattedWriter, CutsTheTextToTheLongestRecord)
{
    const one_trace trace;
    anchors.uMaxSize = 60;
    EXPECT_EQ(tr_record_fmt_string_1("COMP", 7, "%s", "0123456789abcdefghijklmnop"), 0);
    expect_record(trace.only_record(), strings, "COMP", one_string("0123456789abcdefghi")); // 20 bytes with the NUL
}

TEST(FormattedWriter, LeavesATextThatJustFitsAlone)
{
    const one_trace trace;
    anchors.uMaxSize = 60;
    EXPECT_EQ(tr_record_fmt_string_1("COMP", 7, "%s", "0123456789abcdefghi"), 0);
    expect_record(trace.only_record(), strings, "COMP", one_string("0123456789abcdefghi"));
}

TEST(FormattedWriter, DoesNotReadMoreThanAPrecisionAllows)
{
    const one_trace trace;
    const char no_string[] = {'a', 'b', 'c'}; // without a terminator
    EXPECT_EQ(tr_record_fmt_string_1("COMP", 7, "%.3s", no_string), 0);
    expect_record(trace.only_record(), strings, "COMP", one_string("abc"));
}
