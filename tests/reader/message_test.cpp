// A message's inserts, from a message and arguments that nobody vouches for.
#include <gtest/gtest.h>

#include <bit>

#include "tools/qntrace/reader/message.h"

namespace qn::reader
{
namespace
{

error_argument number(std::int64_t value)
{
    return {argument_type::long_long_value, static_cast<std::uint64_t>(value), std::nullopt};
}

error_argument real(double value)
{
    return {argument_type::double_value, std::bit_cast<std::uint64_t>(value), std::nullopt};
}

error_argument text(std::string_view value) { return {argument_type::string, 72, value}; }

error_argument pointer(std::uint64_t value) { return {argument_type::pointer, value, std::nullopt}; }

TEST(Message, IntegersAreConvertedAsPrintfDoes)
{
    EXPECT_EQ(fill_in("%d %i %u", {number(-5), number(6), number(7)}), "-5 6 7");
    EXPECT_EQ(fill_in("%d", {number(0x1'0000'0007)}), "7");
    EXPECT_EQ(fill_in("%u", {number(-1)}), "4294967295");
    EXPECT_EQ(fill_in("%lu", {number(-1)}), "18446744073709551615");
    EXPECT_EQ(fill_in("%hhd %hd", {number(0x1FF), number(0x12345)}), "-1 9029");
    EXPECT_EQ(fill_in("%lld", {number(INT64_MIN)}), "-9223372036854775808");
    EXPECT_EQ(fill_in("%x %X %o %#x %#o", {number(255), number(255), number(8), number(255), number(8)}),
              "ff FF 10 0xff 010");
    EXPECT_EQ(fill_in("[%5d|%-5d|%05d|%+d|% d]", {number(42), number(42), number(-42), number(42), number(42)}),
              "[   42|42   |-0042|+42| 42]");
    EXPECT_EQ(fill_in("[%.4d|%6.3d|%.0d]", {number(42), number(7), number(0)}), "[0042|   007|]");
    EXPECT_EQ(fill_in("[%#06x]", {number(255)}), "[0x00ff]");
    EXPECT_EQ(fill_in("%c%c", {number('o'), number('k')}), "ok");
}

TEST(Message, DoublesAreConvertedAsPrintfDoes)
{
    EXPECT_EQ(fill_in("%f %e %g %.2f", {real(1.5), real(1500), real(0.0001), real(2.345)}),
              "1.500000 1.500000e+03 0.0001 2.35");
    EXPECT_EQ(fill_in("[%8.1f|%-8.1f|%08.1f|%+g]", {real(1.5), real(1.5), real(-1.5), real(2)}),
              "[     1.5|1.5     |-00001.5|+2]");
    EXPECT_EQ(fill_in("%Lf %a", {real(0.5), real(1)}), "0.500000 0x1p+0");
}

TEST(Message, StringsArePaddedAndCut)
{
    EXPECT_EQ(fill_in("[%s|%5s|%-5s|%.2s]", {text("abc"), text("abc"), text("abc"), text("abc")}),
              "[abc|  abc|abc  |ab]");
    EXPECT_EQ(fill_in("%s", {{argument_type::string, 0, std::nullopt}}), "(null)");
}

TEST(Message, PointersAreHexadecimal) { EXPECT_EQ(fill_in("at %p", {pointer(0x7fff1000)}), "at 0x7fff1000"); }

TEST(Message, PositionsChooseTheirArguments)
{
    EXPECT_EQ(fill_in("%2$s is %1$d, %2$s!", {number(4), text("it")}), "it is 4, it!");
}

TEST(Message, WidthAndPrecisionMayBeArguments)
{
    EXPECT_EQ(fill_in("[%*d|%-*d|%.*f]", {number(4), number(7), number(3), number(7), number(1), real(2.25)}),
              "[   7|7  |2.2]");
    EXPECT_EQ(fill_in("[%*d]", {number(-4), number(7)}), "[7   ]");
}

TEST(Message, ADoubledPerCentSignIsOne) { EXPECT_EQ(fill_in("100%% of %d", {number(3)}), "100% of 3"); }

TEST(Message, AConversionWithoutItsArgumentStaysAsItStands)
{
    EXPECT_EQ(fill_in("%d and %s", {number(1)}), "1 and %s");
    EXPECT_EQ(fill_in("%3$d", {number(1)}), "%3$d");
    EXPECT_EQ(fill_in("%0$d", {number(1)}), "%0$d");
    EXPECT_EQ(fill_in("%999999999$d", {number(1)}), "%999999999$d");
}

TEST(Message, AConversionThatDoesNotMatchItsArgumentStaysAsItStands)
{
    EXPECT_EQ(fill_in("%s %d %f %p", {number(1), text("a"), number(2), number(3)}), "%s %d %f %p");
    EXPECT_EQ(fill_in("%-8.3s|", {real(1)}), "%-8.3s|");
}

TEST(Message, WhatWritesThroughAPointerInPrintfDoesNothing)
{
    EXPECT_EQ(fill_in("%n%hhn%1$n", {pointer(0x1000), pointer(0x2000)}), "%n%hhn%1$n");
}

TEST(Message, AnUnfinishedConversionStaysAsItStands)
{
    for (const std::string_view cut : {"%", "%5", "%1$", "%-08", "%.", "%.3", "%ll", "%*"}) {
        EXPECT_EQ(fill_in(std::string("a ") + std::string(cut), {number(1), number(2)}), "a " + std::string(cut));
    }
}

TEST(Message, HugeWidthsAndPrecisionsAreBounded)
{
    EXPECT_LE(fill_in("%999999999d", {number(1)}).size(), 1024u);
    EXPECT_LE(fill_in("%.999999999d", {number(1)}).size(), 1024u);
    EXPECT_LE(fill_in("%99999999999999999999d", {number(1)}).size(), 1024u);
    EXPECT_LE(fill_in("%.999999999f", {real(1)}).size(), 2048u);
    EXPECT_LE(fill_in("%*s", {number(INT32_MIN), text("x")}).size(), 1024u);
    EXPECT_LE(fill_in("%.999999999f", {real(1e308)}).size(), 2048u);
}

} // namespace
} // namespace qn::reader
