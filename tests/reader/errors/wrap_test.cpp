// Long text on several lines.
#include <string>

#include <gtest/gtest.h>

#include "tools/qntrace/format/wrap.h"

namespace qn::test
{
namespace
{

std::string wrapped(std::string_view text, std::size_t indent, std::size_t columns)
{
    std::string out(indent, '>');
    dump::append_wrapped(out, text, indent, columns);
    return out;
}

TEST(Wrap, KeepsOneLineWhenThereIsNoTerminal) { EXPECT_EQ(wrapped("one two three", 2, 0), ">>one two three\n"); }

TEST(Wrap, BreaksAtBlanksAndGoesOnBelow) { EXPECT_EQ(wrapped("one two three", 2, 9), ">>one two\n  three\n"); }

TEST(Wrap, FillsALineToItsLastColumn) { EXPECT_EQ(wrapped("one two", 2, 9), ">>one two\n"); }

TEST(Wrap, LeavesALongWordWhole) { EXPECT_EQ(wrapped("a wordthatislong b", 2, 8), ">>a\n  wordthatislong\n  b\n"); }

TEST(Wrap, CountsCharactersNotBytes)
{
    EXPECT_EQ(wrapped("\xc3\xa9\xc3\xa9 \xc3\xa9\xc3\xa9", 2, 7), ">>\xc3\xa9\xc3\xa9 \xc3\xa9\xc3\xa9\n");
}

TEST(Wrap, KeepsBlanksWithinALine) { EXPECT_EQ(wrapped("a  b", 2, 80), ">>a  b\n"); }

TEST(Wrap, EndsWhenTheTextDoes) { EXPECT_EQ(wrapped("", 2, 4), ">>\n"); }

} // namespace
} // namespace qn::test
