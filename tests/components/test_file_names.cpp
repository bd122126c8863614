// Reading a file name off a map or size specification.
#include <gtest/gtest.h>

#include "components/components_seen.h"

namespace
{
using namespace qn::test;

struct reading {
    std::string name;
    std::string rest;
    bool operator==(const reading &) const = default;
};

std::ostream &operator<<(std::ostream &out, const reading &seen)
{
    return out << '[' << seen.name << "][" << seen.rest << ']';
}

// The text up to `length` characters; the buffer for the name has `room` bytes.
reading read(const std::string &text, size_t length = std::string::npos, int room = 4096)
{
    std::vector<char> name(static_cast<size_t>(room), '?');
    const char *last = text.c_str() + std::min(length, text.size());
    const char *rest = parseFileName(text.c_str(), last, name.data(), room);
    EXPECT_LE(rest, last);
    return {name.data(), {rest, last}};
}

TEST(FileName, EndsAtACommaABlankOrAQuote)
{
    EXPECT_EQ(read("/tmp/x.trc,AB:*"), (reading{"/tmp/x.trc", "AB:*"}));
    EXPECT_EQ(read("/tmp/x.trc AB:*"), (reading{"/tmp/x.trc", "AB:*"}));
    EXPECT_EQ(read("/tmp/x.trc\"AB:*"), (reading{"/tmp/x.trc", "AB:*"}));
    EXPECT_EQ(read("/tmp/x.trc"), (reading{"/tmp/x.trc", ""}));
}

TEST(FileName, MayHoldBlanksAndCommasInQuotes)
{
    EXPECT_EQ(read("\"/tmp/a b.trc\",AB:*"), (reading{"/tmp/a b.trc", "AB:*"}));
    EXPECT_EQ(read("\"/tmp/a,b.trc\"AB:*"), (reading{"/tmp/a,b.trc", "AB:*"}));
    EXPECT_EQ(read("\"  x\" AB:*"), (reading{"  x", "AB:*"}));
}

TEST(FileName, RunsToTheEndWhenAQuoteStaysOpen) { EXPECT_EQ(read("\"/tmp/a b,AB:*"), (reading{"/tmp/a b,AB:*", ""})); }

TEST(FileName, SkipsBlanksInFront)
{
    EXPECT_EQ(read("   /tmp/x,AB"), (reading{"/tmp/x", "AB"}));
    EXPECT_EQ(read("   \"/tmp/x\",AB"), (reading{"/tmp/x", "AB"}));
    EXPECT_EQ(read("\t/tmp/x,AB"), (reading{"\t/tmp/x", "AB"})) << "a tab is no blank";
}

TEST(FileName, IsFollowedByOneCommaAndThenBlanks)
{
    EXPECT_EQ(read("x,   AB"), (reading{"x", "AB"}));
    EXPECT_EQ(read("x,,AB"), (reading{"x", ",AB"}));
    EXPECT_EQ(read("x\",AB"), (reading{"x", "AB"})) << "a closing quote counts without an opening one";
    EXPECT_EQ(read("\"x\"\"AB"), (reading{"x", "\"AB"})) << "only one of them";
    EXPECT_EQ(read("x  ,AB"), (reading{"x", ",AB"})) << "no comma behind blanks";
}

TEST(FileName, MayBeEmpty)
{
    EXPECT_EQ(read(""), (reading{"", ""}));
    EXPECT_EQ(read("   "), (reading{"", ""}));
    EXPECT_EQ(read(",AB"), (reading{"", "AB"}));
    EXPECT_EQ(read("\"\",AB"), (reading{"", "AB"}));
    EXPECT_EQ(read("\""), (reading{"", ""}));
}

TEST(FileName, EndsAtTheLastPositionEvenWhereTheTextGoesOn)
{
    EXPECT_EQ(read("/tmp/x.trc,AB", 6), (reading{"/tmp/x", ""}));
    EXPECT_EQ(read("\"/tmp/x.trc\",AB", 5), (reading{"/tmp", ""}));
    EXPECT_EQ(read("/tmp/x.trc,AB", 11), (reading{"/tmp/x.trc", ""}));
    EXPECT_EQ(read("   x", 2), (reading{"", ""}));
    EXPECT_EQ(read("x,   AB", 3), (reading{"x", ""}));
}

TEST(FileName, IsCutToItsBufferAndReadOverWhole)
{
    EXPECT_EQ(read("/tmp/x,AB", std::string::npos, 5), (reading{"/tmp", "AB"}));
    EXPECT_EQ(read("/tmp/x,AB", std::string::npos, 7), (reading{"/tmp/x", "AB"}));
    EXPECT_EQ(read("/tmp/x,AB", std::string::npos, 6), (reading{"/tmp/", "AB"}));
    EXPECT_EQ(read("\"a b\",AB", std::string::npos, 1), (reading{"", "AB"}));
    const std::string longest(4095, 'n');
    EXPECT_EQ(read(longest + "n,AB"), (reading{longest, "AB"}));
}
} // namespace
