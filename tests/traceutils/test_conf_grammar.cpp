// What a line is: a comment, a header, a pair, or none of them.
#include <cctype>

#include <gtest/gtest.h>

#include "traceutils/conf_seen.h"

namespace
{
using namespace qn::test;

// The pairs of a trace section whose "pat" line is that one; none when the line is no pair.
pairs pairs_of(const std::string &line)
{
    const conf_seen seen = read_conf("t:\n" + line + "\n");
    return seen.chunks.empty() ? pairs{} : seen.chunks[0].pairs;
}

// The name that a line gives to its section; "(none)" when it is no header.
std::string name_of(const std::string &line)
{
    const conf_seen seen = read_conf(line + "\npat = /x\nspooling = ON\n");
    return seen.chunks.empty() ? "(none)" : seen.chunks[0].name;
}

TEST(ConfGrammar, CommentsOnlyAreCommentChunks)
{
    EXPECT_EQ(read_conf("# one\n  two # x\n#\n").chunks,
              (std::vector{comment("# one\n"), comment("two # x\n"), comment("#\n")}));
}

TEST(ConfGrammar, ANumberSignAnywhereMakesAComment)
{
    EXPECT_EQ(read_conf("name: # note\n").chunks, (std::vector{comment("name: # note\n")}));
    EXPECT_EQ(read_conf("pat = /x#\n").chunks, (std::vector{comment("pat = /x#\n")}));
}

TEST(ConfGrammar, ACommentInASectionIsDropped)
{
    EXPECT_EQ(read_conf("t:\npat = /x\n# note\ndest = /tmp # spool here\nsize = 1\n").chunks,
              (std::vector{good("t", {{"pat", "/x"}, {"size", "1"}}, "t:\npat = /x\nsize = 1\n")}));
}

TEST(ConfGrammar, AHeadersNameIsAllBeforeTheLastColon)
{
    EXPECT_EQ(name_of("abc:"), "abc");
    EXPECT_EQ(name_of("a:b:c"), "a:b");
    EXPECT_EQ(name_of("::"), ":");
    EXPECT_EQ(name_of("two words : and more"), "two words ");
    EXPECT_EQ(name_of("pat = /x:"), "pat = /x");
    EXPECT_EQ(name_of("  \tname:"), "name");
}

TEST(ConfGrammar, AHeaderNeedsAName)
{
    EXPECT_EQ(name_of(":"), "(none)");
    EXPECT_EQ(name_of("  :x"), "(none)");
    EXPECT_EQ(name_of("name"), "(none)");
}

TEST(ConfGrammar, BlanksAndTabsMayStandAroundTheEqualsSignAndAtTheEnd)
{
    const pairs expected = {{"pat", "/x"}};
    EXPECT_EQ(pairs_of("pat=/x"), expected);
    EXPECT_EQ(pairs_of(" \tpat \t= \t/x \t"), expected);
    EXPECT_EQ(pairs_of("pat\t=\t/x"), expected);
}

TEST(ConfGrammar, OtherWhiteSpaceMayNot)
{
    EXPECT_EQ(pairs_of("pat = /x\r"), pairs{});
    EXPECT_EQ(pairs_of("pat\v= /x"), pairs{});
    EXPECT_EQ(pairs_of("pat =\f/x"), pairs{});
}

TEST(ConfGrammar, AValueIsMadeOfLettersDigitsAndAFewSigns)
{
    const std::string value = "azAZ09-_/*.$$";
    EXPECT_EQ(pairs_of("pat = " + value), (pairs{{"pat", value}}));
}

TEST(ConfGrammar, DollarSignsStandAtTheEndOfAValueOnly)
{
    EXPECT_EQ(pairs_of("pat = $"), pairs{});
    EXPECT_EQ(pairs_of("pat = a$b"), pairs{});
    EXPECT_EQ(pairs_of("pat = $a"), pairs{});
}

TEST(ConfGrammar, NoOtherCharacterBelongsToAValue)
{
    for (int c = 1; c < 256; ++c) {
        const char character = static_cast<char>(c);
        if (std::isalnum(c) != 0 || std::string("-_/*.").find(character) != std::string::npos) continue;
        if (character == '\n') continue; // a line of its own behind it
        EXPECT_EQ(pairs_of(std::string("pat = a") + character + "b"), pairs{}) << "character " << c;
    }
}

TEST(ConfGrammar, AValueIsNotEmptyAndNotSplitByBlanks)
{
    EXPECT_EQ(pairs_of("pat ="), pairs{});
    EXPECT_EQ(pairs_of("pat = a b"), pairs{});
    EXPECT_EQ(pairs_of("pat = = a"), pairs{});
}

TEST(ConfGrammar, AKeyIsOneWordOfLettersMinusAndUnderscore)
{
    EXPECT_EQ(pairs_of("= /x"), pairs{});
    EXPECT_EQ(pairs_of("p1 = /x"), pairs{});
    EXPECT_EQ(pairs_of("my pat = /x"), pairs{});
    // A pair with another key fails a default section, which a line that is no pair ends.
    EXPECT_TRUE(read_conf("default:\n-_azAZ = 1\n").chunks.empty());
    EXPECT_EQ(read_conf("default:\np1 = 1\n").chunks, (std::vector{good("default", {}, "default:\n")}));
}

TEST(ConfGrammar, KeysAreComparedWithoutRegardToCaseAndKeptAsTheyAre)
{
    EXPECT_EQ(read_conf("t:\nPAT = /x\nSpooling = ON\n").chunks,
              (std::vector{good("t", {{"PAT", "/x"}, {"Spooling", "ON"}}, "t:\nPAT = /x\nSpooling = ON\n")}));
}

TEST(ConfGrammar, AKeyIsTheWholeWord)
{
    EXPECT_EQ(pairs_of("pa = /x"), pairs{});
    EXPECT_EQ(pairs_of("patt = /x"), pairs{});
}

TEST(ConfGrammar, NamesOfSectionsAreComparedWithRegardToCase)
{
    // As trace sections these lack "pat"; as what they look like they would be complete.
    EXPECT_TRUE(read_conf("Default:\ndest = /x\n").chunks.empty());
    EXPECT_TRUE(read_conf("default :\ndest = /x\n").chunks.empty());
    EXPECT_EQ(read_conf("SPOOLAREA_a:\npat = /x\n").sections(),
              (std::vector{good("SPOOLAREA_a", {{"pat", "/x"}}, "SPOOLAREA_a:\npat = /x\n")}));
    EXPECT_EQ(read_conf("spoolarea:\npat = /x\n").sections(),
              (std::vector{good("spoolarea", {{"pat", "/x"}}, "spoolarea:\npat = /x\n")}));
}

TEST(ConfGrammar, TheBareSpoolPrefixNamesASpoolSection)
{
    EXPECT_EQ(read_conf("spoolarea_:\nspool_dir = /d\ncleanup = ON\n").chunks,
              (std::vector{good("spoolarea_", {{"spool_dir", "/d"}, {"cleanup", "ON"}},
                                "spoolarea_:\nspool_dir = /d\ncleanup = ON\n")}));
}
} // namespace
