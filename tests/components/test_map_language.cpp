// The languages of file maps: a value of elements, and the selection of one file. Codes and offsets of what is faulty.
#include <gtest/gtest.h>

#include "components/components_seen.h"
#include "components/mutexes.h"
#include "components/outcome.h"
#include "support/failing_memory.h"

namespace
{
using namespace qn::test;

struct element {
    std::string file;
    std::string component;
    std::string category;
    bool operator==(const element &) const = default;
};

std::ostream &operator<<(std::ostream &out, const element &each)
{
    return out << '{' << each.file << ' ' << each.component << ':' << each.category << '}';
}

using elements = std::vector<element>;

elements held_by(const map_list &list)
{
    EXPECT_TRUE(is_well_linked(list.first, list.last));
    elements found;
    for (const trace_map_spec_t *node = list.first; node != nullptr; node = node->pNext)
        found.push_back({node->fileName, node->pCompId, node->pCategory});
    return found;
}

elements parsed(const std::string &value)
{
    map_list list;
    EXPECT_EQ(list.parse(value), 0) << value;
    return held_by(list);
}

elements selected(const std::string &selection)
{
    map_list list;
    EXPECT_EQ(list.select(selection, "f"), 0) << selection;
    return held_by(list);
}

outcome parse_of(const std::string &value)
{
    map_list list;
    return after(list.parse(value));
}

// A selection that is refused leaves the list as it was, whatever it held.
outcome selection_of(const std::string &selection)
{
    map_list list;
    EXPECT_EQ(list.select("a:b"), 0);
    const elements before = held_by(list);
    const outcome seen = after(list.select(selection));
    if (seen.code != 0) {
        EXPECT_EQ(held_by(list), before) << selection;
    }
    return seen;
}

TEST(MapSelection, ReadsOnePair)
{
    EXPECT_EQ(selected("AB:Errors"), (elements{{"f", "AB", "Errors"}}));
    EXPECT_EQ(selected("  AB:Errors"), (elements{{"f", "AB", "Errors"}}));
    EXPECT_EQ(selected("*:*"), (elements{{"f", ".*", ".*"}}));
    EXPECT_EQ(selected("AB :x=3"), (elements{{"f", "AB ", "x=3"}})) << "a map has no level";
    EXPECT_EQ(selected("[[:upper:]]{2}:x:y"), (elements{{"f", "[[:upper:]]{2}", "x:y"}}));
}

TEST(MapSelection, MayBeginWithOneComma)
{
    EXPECT_EQ(selected(",AB:x"), (elements{{"f", "AB", "x"}}));
    EXPECT_EQ(selected(" ,  AB:x"), (elements{{"f", "AB", "x"}}));
    EXPECT_EQ(selection_of(",,AB:x"), syntax_error(11, 1));
}

TEST(MapSelection, IgnoresTheTextBehindABlank)
{
    EXPECT_EQ(selected("AB:Errors extra"), (elements{{"f", "AB", "Errors"}}));
    EXPECT_EQ(selected("AB:Errors "), (elements{{"f", "AB", "Errors"}}));
}

TEST(MapSelection, ReportsThatThereIsNone) { EXPECT_EQ(selection_of(""), syntax_error(11, 0)); }

TEST(MapSelection, ReportsAMissingComponentPattern)
{
    EXPECT_EQ(selection_of(":Errors"), syntax_error(10, 0));
    EXPECT_EQ(selection_of("  :Errors"), syntax_error(10, 2));
    EXPECT_EQ(selection_of(" , :Errors"), syntax_error(10, 3));
}

TEST(MapSelection, ReportsAMissingColon)
{
    EXPECT_EQ(selection_of("AB"), syntax_error(11, 2));
    EXPECT_EQ(selection_of("   "), syntax_error(11, 3));
    EXPECT_EQ(selection_of("[A:B]"), syntax_error(11, 5));
    EXPECT_EQ(selection_of("{A:B}"), syntax_error(11, 5));
    EXPECT_EQ(selection_of("A]:B"), syntax_error(11, 4));
    EXPECT_EQ(selection_of("AB,CD:x"), syntax_error(11, 2)) << "the selection ends at its comma";
}

TEST(MapSelection, ReportsAMissingCategoryPattern)
{
    EXPECT_EQ(selection_of("AB:"), syntax_error(12, 3));
    EXPECT_EQ(selection_of("AB: x"), syntax_error(12, 3));
    EXPECT_EQ(selection_of("AB:,CD:x"), syntax_error(12, 3));
}

TEST(MapSelection, ReportsPatternsThatDoNotCompile)
{
    EXPECT_EQ(selection_of("(A:x"), syntax_error(15, 0));
    EXPECT_EQ(selection_of(" , (A:x"), syntax_error(15, 3));
    EXPECT_EQ(selection_of("A:(x"), syntax_error(16, 2));
    EXPECT_EQ(selection_of("(A:(x"), syntax_error(15, 0));
}

TEST(MapSelection, IsRefusedAtTheCommaBehindWhichItGoesOn)
{
    EXPECT_EQ(selection_of("AB:A,CD:B"), syntax_error(11, 4));
    EXPECT_EQ(selection_of(",AB:A,CD:B"), syntax_error(11, 5));
    EXPECT_EQ(selection_of("AB:A extra,CD:B"), syntax_error(11, 10));
    EXPECT_EQ(selection_of("AB:A,,"), syntax_error(11, 4));
    EXPECT_EQ(selection_of("AB:A,x"), syntax_error(11, 4));
    EXPECT_EQ(selection_of("A{1,2}:x"), syntax_error(11, 3));
}

TEST(MapSelection, CutsALongFileName)
{
    map_list list;
    ASSERT_EQ(list.select("a:b", std::string(5000, 'n').c_str()), 0);
    EXPECT_EQ(list.first->fileName, std::string(4095, 'n'));
}

TEST(MapSelection, LeavesTheAnchorToTheApplication)
{
    map_list list;
    ASSERT_EQ(list.select("a:b"), 0);
    EXPECT_EQ(list.first->anchor_p, nullptr);
    EXPECT_EQ(anchors.numAnchors, 1U);
}

TEST(MapSelection, KeepsANodeAndItsPatternsInOneBlock)
{
    map_list list;
    const allocation_sizes allocated;
    ASSERT_EQ(list.select("abc:de"), 0);
    EXPECT_EQ(list.first->pCompId, reinterpret_cast<char *>(list.first + 1));
    EXPECT_EQ(list.first->pCategory, list.first->pCompId + 4);
    EXPECT_TRUE(allocated.has(sizeof(trace_map_spec_t) + 4 + 3));
}

TEST(MapSelection, LeavesTheListAsItWasWhenMemoryRunsOut)
{
    map_list list;
    ASSERT_EQ(list.select("a:b"), 0);
    int status = 0;
    {
        const failing_allocation out_of_memory(1);
        status = tr_set_file_map_chain("f", "c:d", &list.first, &list.last);
    }
    EXPECT_EQ(after(status), no_memory());
    EXPECT_EQ(count_of(list.first), 1U);
    EXPECT_TRUE(is_well_linked(list.first, list.last));
}

TEST(MapSelection, LeavesTheListAsItWasWhenTheThreadIsCancelled)
{
    map_list list;
    ASSERT_EQ(list.select("a:b"), 0);
    ASSERT_TRUE(is_cancelled_in([&] {
        const cancellation_in_pattern cancellation(2);
        list.select("c:d");
    }));
    EXPECT_EQ(count_of(list.first), 1U);
    EXPECT_TRUE(is_well_linked(list.first, list.last));
}

TEST(FileMapLanguage, ReadsElementsOfAFileAndASelection)
{
    EXPECT_EQ(parsed("/tmp/ab.trc,AB:Errors;/tmp/cd.trc CD:*"),
              (elements{{"/tmp/ab.trc", "AB", "Errors"}, {"/tmp/cd.trc", "CD", ".*"}}));
}

TEST(FileMapLanguage, ReadsAFileNameInQuotes)
{
    EXPECT_EQ(parsed("\"/tmp/a b.trc\",AB:*"), (elements{{"/tmp/a b.trc", "AB", ".*"}}));
    EXPECT_EQ(parsed("\"/tmp/a,b.trc\" AB:*"), (elements{{"/tmp/a,b.trc", "AB", ".*"}}));
}

TEST(FileMapLanguage, EndsAnElementAtASemicolonEvenInQuotes)
{
    EXPECT_EQ(parse_of("\"/tmp/a;b.trc\",AB:*"), syntax_error(11, 7));
}

TEST(FileMapLanguage, LetsASelectionBeginWithAComma)
{
    EXPECT_EQ(parsed("/tmp/x , AB:y"), (elements{{"/tmp/x", "AB", "y"}}));
}

TEST(FileMapLanguage, AllowsSeveralElementsForOneFile)
{
    EXPECT_EQ(parsed("x,A:a;x,B:b"), (elements{{"x", "A", "a"}, {"x", "B", "b"}}));
}

TEST(FileMapLanguage, RefusesAnEmptyValueWithoutAMessage)
{
    leave_marker();
    map_list list;
    EXPECT_EQ(list.parse(""), 17);
    EXPECT_TRUE(marker_is_there());
    EXPECT_EQ(list.first, nullptr);
}

TEST(FileMapLanguage, ReportsAMissingSelectionAtItsPlaceInTheValue)
{
    EXPECT_EQ(parse_of("/tmp/x.trc"), syntax_error(11, 10));
    EXPECT_EQ(parse_of("/tmp/x.trc,"), syntax_error(11, 11));
    EXPECT_EQ(parse_of("/tmp/x.trc,   "), syntax_error(11, 14));
    EXPECT_EQ(parse_of("\"/tmp/x\""), syntax_error(11, 8));
    EXPECT_EQ(parse_of("/tmp/a,AB:*;/tmp/b"), syntax_error(11, 18));
    EXPECT_EQ(parse_of("/tmp/a;/tmp/b,AB:*"), syntax_error(11, 6));
    EXPECT_EQ(parse_of(";/tmp/b,AB:*"), syntax_error(11, 0));
}

TEST(FileMapLanguage, CountsTheOffsetsOfASelectionFromItsStart)
{
    EXPECT_EQ(parse_of("/tmp/x,:a"), syntax_error(10, 0));
    EXPECT_EQ(parse_of("/tmp/x,AB:a;/tmp/y,AB"), syntax_error(11, 2));
    EXPECT_EQ(parse_of("/tmp/x,AB:"), syntax_error(12, 3));
    EXPECT_EQ(parse_of("/tmp/x,(:a"), syntax_error(15, 0));
    EXPECT_EQ(parse_of("/tmp/x,AB:("), syntax_error(16, 3));
    EXPECT_EQ(parse_of("/tmp/x,AB:a,CD:b"), syntax_error(11, 4));
}

TEST(FileMapLanguage, KeepsTheElementsBeforeAFaultyOne)
{
    map_list list;
    EXPECT_EQ(after(list.parse("x,A:a;y,:b;z,C:c")), syntax_error(10, 0));
    EXPECT_EQ(held_by(list), (elements{{"x", "A", "a"}}));
}
} // namespace
