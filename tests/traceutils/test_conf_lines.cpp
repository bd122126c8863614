// How the file is cut into lines: long ones, white space, odd bytes, no line end.
#include <gtest/gtest.h>

#include "traceutils/conf_seen.h"

namespace
{
using namespace qn::test;
using namespace std::string_literals;

constexpr size_t most = 1022;

// A comment of that many characters, without its line end.
std::string comment_of(size_t characters) { return "#" + std::string(characters - 1, 'x'); }

TEST(ConfLines, AnEmptyFileIsAnEmptyConfiguration)
{
    const conf_seen seen = read_conf("");
    EXPECT_EQ(seen.status, 0);
    EXPECT_TRUE(seen.chunks.empty());
}

TEST(ConfLines, ALineOf1021CharactersAndItsEndAreOneLine)
{
    const std::string line = comment_of(1021) + "\n";
    EXPECT_EQ(read_conf(line + "#2\n").chunks, (std::vector{comment(line), comment("#2\n")}));
}

TEST(ConfLines, TheEndOfALineOf1022CharactersIsABlankLineOfItsOwn)
{
    const std::string line = comment_of(1022);
    EXPECT_EQ(read_conf(line + "\n#2\n").chunks, (std::vector{comment(line), comment("#2\n")}));
}

TEST(ConfLines, ALineOf1023CharactersIsSplit)
{
    const std::string line = comment_of(1022) + "#\n";
    EXPECT_EQ(read_conf(line).chunks, (std::vector{comment(line.substr(0, most)), comment("#\n")}));
}

TEST(ConfLines, ALineOf1500CharactersIsOneOf1022AndOneOf478)
{
    const std::string line = comment_of(1022) + "#" + std::string(477, 'y');
    const auto chunks = read_conf(line).chunks;
    ASSERT_EQ(chunks.size(), 2U);
    EXPECT_EQ(chunks[0].text.size(), 1022U);
    EXPECT_EQ(chunks[1].text, "#" + std::string(477, 'y'));
}

TEST(ConfLines, TheRestOfASplitLineIsALineLikeAnyOther)
{
    const std::string text = "#" + std::string(most - 1, 'x') + "  t:\npat = /x\n";
    EXPECT_EQ(read_conf(text).sections(), (std::vector{good("t", {{"pat", "/x"}}, "t:\npat = /x\n")}));
}

TEST(ConfLines, ASplitValueLosesWhatIsBeyondTheLine)
{
    const std::string value(1400, 'v');
    const std::string line = "pat = " + value; // 1406 characters: 1022 and 384 of the value, which are no header
    const std::string kept = value.substr(0, most - 6);
    EXPECT_EQ(read_conf("t:\n" + line + "\n").chunks, (std::vector{good("t", {{"pat", kept}}, "t:\npat = " + kept)}));
}

TEST(ConfLines, AHeaderNameOf1021CharactersIsKeptWhole)
{
    const std::string name(1021, 'n');
    EXPECT_EQ(read_conf(name + ":\npat = /x\n").sections().at(0).name, name);
}

TEST(ConfLines, TheLastLineNeedsNoLineEnd)
{
    EXPECT_EQ(read_conf("t:\npat = /x").chunks, (std::vector{good("t", {{"pat", "/x"}}, "t:\npat = /x")}));
}

TEST(ConfLines, WhiteSpaceInFrontIsRemovedFromTheTextToo)
{
    EXPECT_EQ(read_conf(" \t\v\f\r# note\n \t\v\f\rt:\n \t\v\f\rpat = /x\n").chunks,
              (std::vector{comment("# note\n"), good("t", {{"pat", "/x"}}, "t:\npat = /x\n")}));
}

TEST(ConfLines, BlankLinesAreIgnoredAndInNoText)
{
    EXPECT_EQ(read_conf("\n \nt:\n\n \t\v\f\r\npat = /x\n\n").chunks,
              (std::vector{good("t", {{"pat", "/x"}}, "t:\npat = /x\n")}));
}

TEST(ConfLines, BytesAbove127AreNoWhiteSpace)
{
    EXPECT_EQ(read_conf("\x85\xa0\xff#\n").chunks, (std::vector{comment("\x85\xa0\xff#\n")}));
    EXPECT_EQ(read_conf("\xff\xa0:\npat = /x\n").sections().at(0).name, "\xff\xa0");
}

TEST(ConfLines, ANulEndsItsLineAndNoOther)
{
    const std::string text = "t\0ignored:\n#1\nt\0#\n:\n\0#2\nu:\npat = /x\0y$\nsize = 1\n"s;
    const conf_seen seen = read_conf(text);
    EXPECT_EQ(seen.status, 0);
    EXPECT_EQ(seen.chunks, (std::vector{comment("#1\n"), failed("", {}, "tt:\n"),
                                        good("u", {{"pat", "/x"}, {"size", "1"}}, "u:\npat = /xsize = 1\n")}));
}

TEST(ConfLines, TenMegabytesOfOneLineAreAFaultySectionOfAllItsText)
{
    const std::string text(10 << 20, 'x');
    const conf_seen seen = read_conf(text + "\nt:\npat = /x\n");
    EXPECT_EQ(seen.status, 0);
    ASSERT_EQ(seen.chunks.size(), 2U);
    EXPECT_EQ(seen.chunks[0].text.size(), text.size() + 1); // its last piece has the line end
    EXPECT_EQ(seen.chunks[1], good("t", {{"pat", "/x"}}, "t:\npat = /x\n"));
}

TEST(ConfLines, TenMegabytesOfNulsAreABlankLine)
{
    EXPECT_EQ(read_conf(std::string(10 << 20, '\0') + "\n# end\n").chunks, (std::vector{comment("# end\n")}));
}

TEST(ConfLines, TenMegabytesOfOneCommentAreACommentAPiece)
{
    const auto chunks = read_conf(std::string(10 << 20, '#')).chunks;
    ASSERT_EQ(chunks.size(), ((10U << 20) + most - 1) / most);
    EXPECT_EQ(chunks.front().text, std::string(most, '#'));
}
} // namespace
