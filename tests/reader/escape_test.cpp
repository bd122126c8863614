// What may reach a terminal.
#include <gtest/gtest.h>

#include "tools/qntrace/format/escape.h"

namespace qn::dump
{
namespace
{

std::string escaped(std::string_view text, charset printable = charset::utf_8)
{
    std::string out;
    append_escaped(out, text, printable);
    return out;
}

std::string quoted(std::string_view text)
{
    std::string out;
    append_quoted(out, text, charset::utf_8);
    return out;
}

TEST(Escape, PrintableAsciiPasses)
{
    std::string printable;
    for (char c = 0x20; c < 0x7F; ++c) {
        if (c != '\\') printable += c;
    }
    EXPECT_EQ(escaped(printable), printable);
    EXPECT_EQ(escaped(printable, charset::ascii), printable);
}

TEST(Escape, ControlBytesBecomeEscapes)
{
    EXPECT_EQ(escaped("a\nb\rc\td"), "a\\nb\\rc\\td");
    EXPECT_EQ(escaped(std::string_view("\0\x01\x1b\x7f", 4)), "\\x00\\x01\\x1b\\x7f");
}

TEST(Escape, ABackslashIsDoubledSoThatNothingIsAmbiguous)
{
    EXPECT_EQ(escaped("\\x1b"), "\\\\x1b");
    EXPECT_EQ(quoted("say \"\\\""), "\"say \\\"\\\\\\\"\"");
    EXPECT_EQ(escaped("\""), "\"");
}

TEST(Escape, Utf8PassesOnlyWhereItCanBeShown)
{
    EXPECT_EQ(escaped("\xc3\xa9\xe2\x82\xac\xf0\x9f\x90\xa7"), "\xc3\xa9\xe2\x82\xac\xf0\x9f\x90\xa7");
    EXPECT_EQ(escaped("\xc3\xa9", charset::ascii), "\\xc3\\xa9");
}

TEST(Escape, InvisibleAndDirectionTurningCharactersBecomeEscapes)
{
    EXPECT_EQ(escaped("\xc2\x9b"), "\\xc2\\x9b");                   // a control sequence introducer
    EXPECT_EQ(escaped("\xc2\xa0"), "\\xc2\\xa0");                   // a space that is none
    EXPECT_EQ(escaped("\xe2\x80\xae"), "\\xe2\\x80\\xae");          // right to left from here
    EXPECT_EQ(escaped("\xe2\x81\xa6"), "\\xe2\\x81\\xa6");          // an isolate
    EXPECT_EQ(escaped("\xe2\x80\x8b"), "\\xe2\\x80\\x8b");          // no width
    EXPECT_EQ(escaped("\xef\xbb\xbf"), "\\xef\\xbb\\xbf");          // a byte order mark
    EXPECT_EQ(escaped("\xf3\xa0\x80\x81"), "\\xf3\\xa0\\x80\\x81"); // a tag
}

TEST(Escape, MalformedUtf8BecomesBytes)
{
    EXPECT_EQ(escaped("\xff"), "\\xff");
    EXPECT_EQ(escaped("\xc3"), "\\xc3");
    EXPECT_EQ(escaped("\xc3("), "\\xc3(");
    EXPECT_EQ(escaped("\x80"), "\\x80");
    EXPECT_EQ(escaped("\xc0\xaf"), "\\xc0\\xaf");                   // overlong
    EXPECT_EQ(escaped("\xe0\x9f\xbf"), "\\xe0\\x9f\\xbf");          // overlong
    EXPECT_EQ(escaped("\xed\xa0\x80"), "\\xed\\xa0\\x80");          // a surrogate
    EXPECT_EQ(escaped("\xf4\x90\x80\x80"), "\\xf4\\x90\\x80\\x80"); // behind the last character
    EXPECT_EQ(escaped("\xe2\x82"), "\\xe2\\x82");
}

TEST(Escape, WellFormedUtf8IsRecognised)
{
    EXPECT_TRUE(is_utf_8(""));
    EXPECT_TRUE(is_utf_8("a\xc3\xa9\xe2\x82\xac\xf0\x9f\x90\xa7\n"));
    EXPECT_FALSE(is_utf_8("a\xc3"));
    EXPECT_FALSE(is_utf_8("\xed\xbf\xbf"));
}

} // namespace
} // namespace qn::dump
