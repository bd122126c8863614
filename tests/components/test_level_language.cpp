// The language of level specifications: what an element is, and with which code and at which offset a faulty one is
// refused. The offset counts bytes of the whole specification.
#include <gtest/gtest.h>

#include "components/components_seen.h"
#include "components/mutexes.h"
#include "components/outcome.h"
#include "support/failing_memory.h"

namespace
{
using namespace qn::test;

struct element {
    std::string component;
    std::string category;
    int level;
    bool operator==(const element &) const = default;
};

std::ostream &operator<<(std::ostream &out, const element &each)
{
    return out << '{' << each.component << ':' << each.category << '=' << each.level << '}';
}

using elements = std::vector<element>;
constexpr int no_level = -1;

elements parsed(const std::string &text)
{
    level_list list;
    EXPECT_EQ(list.parse(text), 0) << text;
    EXPECT_TRUE(is_well_linked(list.first, list.last)) << text;
    elements found;
    for (const trace_level_spec_t *node = list.first; node != nullptr; node = node->pNext)
        found.push_back({node->pCompId, node->pCategory, node->detailLevel});
    return found;
}

outcome parse_of(const std::string &text)
{
    level_list list;
    return after(list.parse(text));
}

TEST(LevelLanguage, ReadsAnElementWithAndWithoutALevel)
{
    EXPECT_EQ(parsed("AB:Errors"), (elements{{"AB", "Errors", no_level}}));
    EXPECT_EQ(parsed("AB:Errors=4"), (elements{{"AB", "Errors", 4}}));
}

TEST(LevelLanguage, ReadsElementsSeparatedByCommas)
{
    EXPECT_EQ(parsed("AB:x=4,CD:y,EF:z=0"), (elements{{"AB", "x", 4}, {"CD", "y", no_level}, {"EF", "z", 0}}));
}

TEST(LevelLanguage, AcceptsNothingAndATrailingComma)
{
    EXPECT_EQ(parsed(""), elements{});
    EXPECT_EQ(parsed("a:b,"), (elements{{"a", "b", no_level}}));
    EXPECT_EQ(parsed("a:b=1,c:d=2,"), (elements{{"a", "b", 1}, {"c", "d", 2}}));
}

TEST(LevelLanguage, PutsThePatternForEverythingInPlaceOfALoneStar)
{
    EXPECT_EQ(parsed("*:*=4"), (elements{{".*", ".*", 4}}));
    EXPECT_EQ(parsed("A*:x*"), (elements{{"A*", "x*", no_level}})) << "a star with company stays";
}

TEST(LevelLanguage, SkipsBlanksBeforeAnElementAndAroundALevel)
{
    EXPECT_EQ(parsed("  AB:x=  4  ,  CD:y=5"), (elements{{"AB", "x", 4}, {"CD", "y", 5}}));
}

TEST(LevelLanguage, KeepsBlanksBehindTheComponentAndBeforeTheCategory)
{
    EXPECT_EQ(parsed("AB :  x=1"), (elements{{"AB ", "  x", 1}}));
}

TEST(LevelLanguage, DropsBlanksBehindTheCategory)
{
    EXPECT_EQ(parsed("AB:x y  =1,CD:z  "), (elements{{"AB", "x y", 1}, {"CD", "z", no_level}}));
}

TEST(LevelLanguage, TakesNoTabForABlank)
{
    EXPECT_EQ(parsed("\tAB:x\t"), (elements{{"\tAB", "x\t", no_level}}));
    EXPECT_EQ(parse_of("a:b=1\t"), syntax_error(13, 5));
}

TEST(LevelLanguage, EndsTheComponentAtTheFirstColonOutsideBracketsAndBraces)
{
    EXPECT_EQ(parsed("[[:upper:]]+:Info=2"), (elements{{"[[:upper:]]+", "Info", 2}}));
    EXPECT_EQ(parsed("A{2}[:]:x:y=1"), (elements{{"A{2}[:]", "x:y", 1}}));
    EXPECT_EQ(parse_of("[a:b]=1"), syntax_error(11, 7));
    EXPECT_EQ(parse_of("{a:b}=1"), syntax_error(11, 7));
    EXPECT_EQ(parse_of("a]:b"), syntax_error(11, 4)) << "a group that closes without having opened counts too";
    EXPECT_EQ(parse_of("a}:b"), syntax_error(11, 4));
}

TEST(LevelLanguage, CountsBracketsAfreshInEachElement)
{
    EXPECT_EQ(parse_of("a:[b,c:d"), syntax_error(16, 2)) << "the first element's category is cut at the comma";
    EXPECT_EQ(parsed("[[:alpha:]]:x,b:y"), (elements{{"[[:alpha:]]", "x", no_level}, {"b", "y", no_level}}));
}

TEST(LevelLanguage, CutsAnElementAtACommaWithinBraces) { EXPECT_EQ(parse_of("ab{1,2}:x"), syntax_error(11, 4)); }

TEST(LevelLanguage, EndsTheCategoryAtTheFirstEqualsSign)
{
    EXPECT_EQ(parsed("A=B:x=1"), (elements{{"A=B", "x", 1}})) << "the component may hold one";
    EXPECT_EQ(parse_of("A:x=1=2"), syntax_error(13, 5));
}

TEST(LevelLanguage, ReadsLevelsInThreeBases)
{
    EXPECT_EQ(parsed("a:b=16,a:b=0x10,a:b=0X1f,a:b=020,a:b=0"),
              (elements{{"a", "b", 16}, {"a", "b", 16}, {"a", "b", 31}, {"a", "b", 16}, {"a", "b", 0}}));
}

TEST(LevelLanguage, KeepsThirtyTwoBitsOfALevel)
{
    EXPECT_EQ(parsed("a:b=256,a:b=4294967296,a:b=4294967297,a:b=2147483648"),
              (elements{{"a", "b", 256}, {"a", "b", 0}, {"a", "b", 1}, {"a", "b", INT32_MIN}}));
}

TEST(LevelLanguage, TakesMinusOneAndWhatWrapsToItForNoLevel)
{
    EXPECT_EQ(parsed("a:b=-1,a:b=4294967295,a:b=99999999999999999999999"),
              (elements{{"a", "b", no_level}, {"a", "b", no_level}, {"a", "b", no_level}}));
    EXPECT_EQ(parsed("a:b=-2,a:b=+7"), (elements{{"a", "b", -2}, {"a", "b", 7}}));
}

TEST(LevelLanguage, ReportsAMissingComponentPattern)
{
    EXPECT_EQ(parse_of(":x"), syntax_error(10, 0));
    EXPECT_EQ(parse_of("   :x"), syntax_error(10, 3));
    EXPECT_EQ(parse_of("a:b,:x"), syntax_error(10, 4));
}

TEST(LevelLanguage, ReportsAnElementWithoutAnyText)
{
    EXPECT_EQ(parse_of("a:b, "), syntax_error(10, 5));
    EXPECT_EQ(parse_of("  "), syntax_error(10, 2));
    EXPECT_EQ(parse_of(",a:b"), syntax_error(10, 0));
    EXPECT_EQ(parse_of("a:b,,c:d"), syntax_error(10, 4));
    EXPECT_EQ(parse_of("a:b,  ,c:d"), syntax_error(10, 6));
    EXPECT_EQ(parse_of("a:b,,"), syntax_error(10, 4)) << "only the last comma is a trailing one";
}

TEST(LevelLanguage, ReportsAMissingColon)
{
    EXPECT_EQ(parse_of("abc"), syntax_error(11, 3));
    EXPECT_EQ(parse_of("  abc  "), syntax_error(11, 7));
    EXPECT_EQ(parse_of("ok:x=1,bad"), syntax_error(11, 10));
    EXPECT_EQ(parse_of("bad,ok:x=1"), syntax_error(11, 3));
    EXPECT_EQ(parse_of("abc=4"), syntax_error(11, 5));
}

TEST(LevelLanguage, ReportsAMissingCategoryPattern)
{
    EXPECT_EQ(parse_of("abc:"), syntax_error(12, 4));
    EXPECT_EQ(parse_of("abc:=3"), syntax_error(12, 4));
    EXPECT_EQ(parse_of("abc:   "), syntax_error(12, 7));
    EXPECT_EQ(parse_of("abc:  =3"), syntax_error(12, 6));
    EXPECT_EQ(parse_of("a:b,abc:,c:d"), syntax_error(12, 8));
}

TEST(LevelLanguage, ReportsALevelThatIsNoNumber)
{
    EXPECT_EQ(parse_of("abc:x="), syntax_error(13, 6));
    EXPECT_EQ(parse_of("abc:x=4z"), syntax_error(13, 7));
    EXPECT_EQ(parse_of("abc:x=z"), syntax_error(13, 6));
    EXPECT_EQ(parse_of("abc:x=   "), syntax_error(13, 9));
    EXPECT_EQ(parse_of("abc:x=  4  5"), syntax_error(13, 11));
    EXPECT_EQ(parse_of("abc:x=,c:d"), syntax_error(13, 6));
    EXPECT_EQ(parse_of("abc:x=08"), syntax_error(13, 7)) << "8 is no octal digit";
    EXPECT_EQ(parse_of("abc:x=0xg"), syntax_error(13, 7)) << "the number is the 0";
    EXPECT_EQ(parse_of("a:b=1,abc:x=-"), syntax_error(13, 12));
}

TEST(LevelLanguage, ReportsAComponentPatternThatDoesNotCompile)
{
    EXPECT_EQ(parse_of("(a:b"), syntax_error(15, 0));
    EXPECT_EQ(parse_of("  a(:b"), syntax_error(15, 2));
    EXPECT_EQ(parse_of("a:b, *+(:c=1"), syntax_error(15, 5));
}

TEST(LevelLanguage, ReportsACategoryPatternThatDoesNotCompile)
{
    EXPECT_EQ(parse_of("a:(b"), syntax_error(16, 2));
    EXPECT_EQ(parse_of("a: [b=3"), syntax_error(16, 2)) << "its blanks belong to the pattern";
    EXPECT_EQ(parse_of("a:b,cc:d("), syntax_error(16, 7));
}

TEST(LevelLanguage, LooksAtTheLevelBeforeItCompiles)
{
    EXPECT_EQ(parse_of("(a:(b=z"), syntax_error(13, 6));
    EXPECT_EQ(parse_of("(a:(b=3"), syntax_error(15, 0)) << "and at the component first";
}

TEST(LevelParser, AppendsBehindWhatTheListHolds)
{
    level_list list;
    ASSERT_EQ(list.parse("a:b=1"), 0);
    const trace_level_spec_t *first = list.first;
    ASSERT_EQ(list.parse("c:d=2,e:f=3"), 0);
    EXPECT_EQ(list.first, first);
    EXPECT_TRUE(is_well_linked(list.first, list.last));
    EXPECT_EQ(count_of(list.first), 3U);
    EXPECT_STREQ(list.last->pCompId, "e");
}

TEST(LevelParser, KeepsANodeAndItsPatternsInOneBlock)
{
    level_list list;
    const allocation_sizes allocated;
    ASSERT_EQ(list.parse("abc:de"), 0);
    EXPECT_EQ(list.first->pCompId, reinterpret_cast<char *>(list.first + 1));
    EXPECT_EQ(list.first->pCategory, list.first->pCompId + 4);
    EXPECT_TRUE(allocated.has(sizeof(trace_level_spec_t) + 4 + 3));
}

TEST(LevelParser, LeavesTheListAsItWasOnAnError)
{
    level_list list;
    EXPECT_NE(list.parse("ok:x=1,ok:y,bad"), 0);
    EXPECT_EQ(list.first, nullptr);
    EXPECT_EQ(list.last, nullptr);

    ASSERT_EQ(list.parse("a:b,c:d"), 0);
    trace_level_spec_t *const first = list.first;
    trace_level_spec_t *const last = list.last;
    for (const char *faulty : {"ok:x=1,ok:y,bad", "ok:x,:y", "ok:x,y:", "ok:x,y:z=", "ok:x,(:z", "ok:x,y:("}) {
        EXPECT_NE(list.parse(faulty), 0) << faulty;
        EXPECT_EQ(list.first, first);
        EXPECT_EQ(list.last, last);
        EXPECT_TRUE(is_well_linked(list.first, list.last)) << faulty;
        EXPECT_EQ(count_of(list.first), 2U);
    }
}

TEST(LevelParser, LeavesTheListAsItWasWhenMemoryRunsOut)
{
    level_list list;
    ASSERT_EQ(list.parse("a:b"), 0);
    for (int number = 1; number <= 3; ++number) {
        int status = 0;
        {
            const failing_allocation out_of_memory(number);
            status = parse_trace_spec("c:d,e:f,g:h", &list.first, &list.last);
        }
        EXPECT_EQ(after(status), no_memory());
        EXPECT_EQ(list.first, list.last);
        EXPECT_EQ(list.first->pNext, nullptr);
    }
}

TEST(LevelParser, LeavesTheListAsItWasWhenTheThreadIsCancelled)
{
    level_list list;
    ASSERT_EQ(list.parse("a:b"), 0);
    ASSERT_TRUE(is_cancelled_in([&] {
        const cancellation_in_pattern cancellation(4); // the second element's category
        list.parse("c:d,e:f");
    }));
    EXPECT_EQ(count_of(list.first), 1U);
    EXPECT_TRUE(is_well_linked(list.first, list.last));
}

TEST(LevelParser, RollsBackToAnEmptyList)
{
    level_list list;
    cancel_parse_trace_spec_data_t before{&list.first, &list.last, nullptr};
    ASSERT_EQ(list.parse("a:b,c:d"), 0);
    cancel_parse_trace_spec(&before);
    EXPECT_EQ(list.first, nullptr);
    EXPECT_EQ(list.last, nullptr);
}

TEST(LevelParser, RollsBackToTheNodeThatWasLast)
{
    level_list list;
    ASSERT_EQ(list.parse("a:b,c:d"), 0);
    cancel_parse_trace_spec_data_t before{&list.first, &list.last, list.last};
    ASSERT_EQ(list.parse("e:f,g:h"), 0);
    cancel_parse_trace_spec(&before);
    EXPECT_EQ(count_of(list.first), 2U);
    EXPECT_TRUE(is_well_linked(list.first, list.last));
}
} // namespace
