// Which inserts a text names, and how each is passed.
#include "platform/cu/conversions.h"

#include <climits>

#include <gtest/gtest.h>

namespace
{
using namespace qn::cu;
using kinds = std::vector<passed_as>;

kinds inserts_of(std::string_view text)
{
    kinds found;
    for (const named_insert &insert : find_conversions(text).inserts) found.push_back(insert.kind);
    return found;
}

bool understood(std::string_view text) { return find_conversions(text).understood; }

constexpr auto integer = passed_as::integer;
constexpr auto long_integer = passed_as::long_integer;
constexpr auto long_long = passed_as::long_long;
constexpr auto text = passed_as::text;
constexpr auto wide_text = passed_as::wide_text;
constexpr auto pointer = passed_as::pointer;

TEST(Conversions, PlainTextHasNone)
{
    EXPECT_TRUE(find_conversions("no inserts here").list.empty());
    EXPECT_TRUE(understood("no inserts here"));
    EXPECT_TRUE(understood(""));
}

TEST(Conversions, APercentSignTakesNoInsert)
{
    EXPECT_EQ(inserts_of("100%% of %d"), kinds{integer});
    EXPECT_EQ(find_conversions("100%%").list.size(), 1U);
}

TEST(Conversions, EveryIntegerLetterTakesAnInt) { EXPECT_EQ(inserts_of("%d%i%o%u%x%X%c"), kinds(7, integer)); }

TEST(Conversions, ShortLengthsAreStillPassedAsInt) { EXPECT_EQ(inserts_of("%hd %hhu %hhx"), kinds(3, integer)); }

TEST(Conversions, LongLengthsArePassedAsLong) { EXPECT_EQ(inserts_of("%ld %zu %tx %jd"), kinds(4, long_integer)); }

TEST(Conversions, LongLongHasThreeSpellings) { EXPECT_EQ(inserts_of("%lld %qu %Lx"), kinds(3, long_long)); }

TEST(Conversions, FloatingLettersTakeADouble)
{
    EXPECT_EQ(inserts_of("%e%E%f%F%g%G%a%A"), kinds(8, passed_as::floating));
    EXPECT_EQ(inserts_of("%Lf"), kinds{passed_as::long_double});
}

TEST(Conversions, StringsAndPointersAreToldApart)
{
    EXPECT_EQ(inserts_of("%s %p %S %ls %n"), (kinds{text, pointer, wide_text, wide_text, pointer}));
}

TEST(Conversions, AStarTakesAnIntBeforeTheValue)
{
    EXPECT_EQ(inserts_of("%*.*s"), (kinds{integer, integer, text}));
    const conversion one = find_conversions("%*.*s").list.at(0);
    EXPECT_EQ(one.width.insert, 0U);
    EXPECT_EQ(one.precision.insert, 1U);
    EXPECT_EQ(one.insert, 2U);
}

TEST(Conversions, FlagsWidthAndPrecisionAreKept)
{
    const conversion one = find_conversions("<%-+08.3lx>").list.at(0);
    EXPECT_EQ(one.flags, "-+0");
    EXPECT_EQ(one.width.number, 8);
    EXPECT_EQ(one.precision.number, 3);
    EXPECT_EQ(one.letter, 'x');
    EXPECT_EQ(one.begin, 1U);
    EXPECT_EQ(one.end, 10U);
}

TEST(Conversions, APointAloneIsPrecisionZero) { EXPECT_EQ(find_conversions("%.s").list.at(0).precision.number, 0); }

TEST(Conversions, PositionsGiveTheOrderOfTheInserts)
{
    EXPECT_EQ(inserts_of("%2$s %1$ld"), (kinds{long_integer, text}));
    EXPECT_EQ(inserts_of("%1$d %1$x"), kinds{integer});
    EXPECT_EQ(inserts_of("%2$*1$d"), (kinds{integer, integer}));
}

TEST(Conversions, APositionThatIsLeftOutCountsAsAnInt) { EXPECT_EQ(inserts_of("%2$s"), (kinds{integer, text})); }

TEST(Conversions, OneInsertCannotBePassedInTwoWays)
{
    EXPECT_FALSE(understood("%1$d %1$s"));
    EXPECT_EQ(inserts_of("%1$d %1$s"), kinds{integer});
}

TEST(Conversions, PositionsAndSequenceDoNotMix)
{
    EXPECT_FALSE(understood("%1$d %d"));
    EXPECT_FALSE(understood("%d %1$d"));
    EXPECT_EQ(inserts_of("%d %2$s"), kinds{integer});
}

TEST(Conversions, FarAndZeroPositionsAreRefused)
{
    EXPECT_TRUE(understood("%64$d"));
    EXPECT_FALSE(understood("%65$d"));
    EXPECT_FALSE(understood("%0$d"));
    EXPECT_FALSE(understood("%99999999999999999999$d"));
    EXPECT_TRUE(inserts_of("%99999999999999999999$d").empty());
}

TEST(Conversions, AnUnknownLetterEndsTheReadingOfInserts)
{
    EXPECT_FALSE(understood("%d %y %s"));
    EXPECT_EQ(inserts_of("%d %y %s"), kinds{integer});
}

TEST(Conversions, AnUnknownLetterTakesItsStarsAway) { EXPECT_EQ(inserts_of("%d %*y"), kinds{integer}); }

TEST(Conversions, AnUnfinishedConversionIsNone)
{
    for (const char *unfinished : {"%", "%-", "%5", "%.", "%l", "%*", "%1$"}) {
        EXPECT_FALSE(understood(unfinished)) << unfinished;
        EXPECT_TRUE(inserts_of(unfinished).empty()) << unfinished;
    }
}

TEST(Conversions, LengthsThatNoLetterHasAreRefused)
{
    for (const char *wrong : {"%hs", "%lld%lls", "%zf", "%hhhd", "%lp", "%hf"})
        EXPECT_FALSE(understood(wrong)) << wrong;
}

TEST(Conversions, AStringInsertHasThePrecisionOfEachConversionThatShowsIt)
{
    const auto inserts = find_conversions("%1$.7s %2$d %1$.*2$s %1$s").inserts;
    ASSERT_EQ(inserts.size(), 2U);
    ASSERT_EQ(inserts[0].precisions.size(), 3U);
    EXPECT_EQ(inserts[0].precisions[0].number, 7);
    EXPECT_EQ(inserts[0].precisions[1].insert, 1U);
    EXPECT_FALSE(inserts[0].precisions[2].number || inserts[0].precisions[2].insert);
    EXPECT_TRUE(inserts[1].precisions.empty());
}

TEST(Conversions, EndlessNumbersAreBounded)
{
    EXPECT_EQ(find_conversions("%.999999999999999999999999s").list.at(0).precision.number, INT_MAX);
    EXPECT_EQ(find_conversions("%999999999999999999999999d").list.at(0).width.number, widest_conversion);
}
} // namespace
