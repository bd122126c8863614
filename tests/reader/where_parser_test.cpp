// Filter expressions as text: their operators and precedence, and every mistake with its column.
#include <gtest/gtest.h>

#include <string>

#include "reader/select_reading.h"
#include "tools/qntrace/select/where_error.h"

namespace qn::test
{
namespace
{

using dump::where_error;

// Records with the ids 1 to 8, and so the sequence numbers 2 to 16.
trace_builder eight_ids()
{
    trace_builder file;
    for (std::uint32_t id = 1; id <= 8; ++id) {
        file.add_id(id);
    }
    file.close();
    return file;
}

// The ids that are let pass.
seqs ids_where(std::string_view expression)
{
    auto ids = seqs_where(eight_ids(), "kind == \"id\" && (" + std::string(expression) + ")");
    for (auto &id : ids) {
        id /= 2;
    }
    return ids;
}

std::string error_of(std::string_view expression)
{
    try {
        const dump::where_expression parsed(expression, test_now);
    } catch (const where_error &error) {
        return error.what();
    }
    return "";
}

// "COLUMN: MESSAGE", without the lines that show the expression.
std::string mistake(std::string_view expression)
{
    try {
        const dump::where_expression parsed(expression, test_now);
    } catch (const where_error &error) {
        const std::string_view what = error.what();
        const auto message = what.find(": ") + 2;
        return std::to_string(error.column()) + ": " + std::string(what.substr(message, what.find('\n') - message));
    }
    return "";
}

TEST(WhereOperators, EqualAndNotEqual)
{
    EXPECT_EQ(ids_where("id == 3"), seqs{3});
    EXPECT_EQ(ids_where("id != 3"), (seqs{1, 2, 4, 5, 6, 7, 8}));
}

TEST(WhereOperators, TheFourOrders)
{
    EXPECT_EQ(ids_where("id < 3"), (seqs{1, 2}));
    EXPECT_EQ(ids_where("id <= 3"), (seqs{1, 2, 3}));
    EXPECT_EQ(ids_where("id > 6"), (seqs{7, 8}));
    EXPECT_EQ(ids_where("id >= 6"), (seqs{6, 7, 8}));
}

TEST(WhereOperators, TheFieldMayStandOnTheRight)
{
    EXPECT_EQ(ids_where("3 > id"), (seqs{1, 2}));
    EXPECT_EQ(ids_where("3 >= id"), (seqs{1, 2, 3}));
    EXPECT_EQ(ids_where("6 < id"), (seqs{7, 8}));
    EXPECT_EQ(ids_where("6 <= id"), (seqs{6, 7, 8}));
    EXPECT_EQ(ids_where("3 == id"), seqs{3});
    EXPECT_EQ(ids_where("3 != id && id <= 4"), (seqs{1, 2, 4}));
}

TEST(WhereOperators, MatchAndNotMatch)
{
    EXPECT_EQ(ids_where("comp =~ \"^T.S\""), (seqs{1, 2, 3, 4, 5, 6, 7, 8}));
    EXPECT_EQ(ids_where("comp =~ \"X\""), seqs{});
    EXPECT_EQ(ids_where("comp !~ \"X\" && id == 1"), seqs{1});
}

TEST(WhereOperators, InIsEqualToAnyOfAList)
{
    EXPECT_EQ(ids_where("id in (2, 0x5,7)"), (seqs{2, 5, 7}));
    EXPECT_EQ(ids_where("id in (4)"), seqs{4});
    EXPECT_EQ(ids_where("!(id in (1, 2, 3, 4)) && comp in (\"X\", \"TEST\")"), (seqs{5, 6, 7, 8}));
}

TEST(WhereOperators, AndOrAndNot)
{
    EXPECT_EQ(ids_where("id > 2 && id < 5"), (seqs{3, 4}));
    EXPECT_EQ(ids_where("id < 2 || id > 7"), (seqs{1, 8}));
    EXPECT_EQ(ids_where("!(id < 7)"), (seqs{7, 8}));
    EXPECT_EQ(ids_where("!!(id < 2)"), seqs{1});
}

TEST(WherePrecedence, AndBindsMoreTightlyThanOr)
{
    EXPECT_EQ(ids_where("id == 1 || id == 2 && id == 3"), seqs{1});
    EXPECT_EQ(ids_where("id == 3 && id == 2 || id == 1"), seqs{1});
    EXPECT_EQ(ids_where("(id == 1 || id == 2) && id == 2"), seqs{2});
}

TEST(WherePrecedence, NotBindsMoreTightlyThanAnd)
{
    EXPECT_EQ(ids_where("!(id > 3) && id != 1"), (seqs{2, 3}));
    EXPECT_EQ(ids_where("!(id > 3 && id != 5)"), (seqs{1, 2, 3, 5}));
    EXPECT_EQ(ids_where("!(id > 2) || id == 8"), (seqs{1, 2, 8}));
}

TEST(WherePrecedence, LongChainsAreDecidedByAnyOfTheirParts)
{
    EXPECT_EQ(ids_where("id == 2 || id == 4 || id == 6 || id == 8"), (seqs{2, 4, 6, 8}));
    EXPECT_EQ(ids_where("id != 2 && id != 4 && id != 6 && id != 8"), (seqs{1, 3, 5, 7}));
}

TEST(WhereLiterals, NumbersAreDecimalOrHexadecimal)
{
    EXPECT_EQ(ids_where("id == 0x3"), seqs{3});
    EXPECT_EQ(ids_where("id == 0X3"), seqs{3});
    EXPECT_EQ(ids_where("id == 003"), seqs{3});
    EXPECT_EQ(ids_where("id > -1 && id < 2"), seqs{1});
    EXPECT_EQ(ids_where("id < 18446744073709551615 && id > -9223372036854775808 && id < 0x2"), seqs{1});
}

TEST(WhereLiterals, QuotesAndBackslashesAreEscapedInStrings)
{
    trace_builder file;
    file.add_strings(1, {"say \"hi\""});
    file.add_strings(2, {"C:\\dir"});
    file.close();
    EXPECT_EQ(seqs_where(file, R"(text == "say \"hi\"")"), seqs{2});
    EXPECT_EQ(seqs_where(file, R"(text == "C:\\dir")"), seqs{4});
    EXPECT_EQ(seqs_where(file, R"(text =~ "C:\\\\d")"), seqs{4});
}

TEST(WhereLiterals, BlanksBetweenTokensMeanNothing)
{
    EXPECT_EQ(ids_where("id==3||id==4"), (seqs{3, 4}));
    EXPECT_EQ(ids_where(" \t\n( id\r==  3 ) "), seqs{3});
}

TEST(WhereMistakes, AreFoundWhereAnOperatorIsMisspelt)
{
    EXPECT_EQ(mistake("id = 3"), "4: expected == or =~");
    EXPECT_EQ(mistake("id == 3 & id == 4"), "9: expected &&");
    EXPECT_EQ(mistake("id == 3 | id == 4"), "9: expected ||");
    EXPECT_EQ(mistake("id ~ 3"), "4: no field, number, string in double quotes or operator begins with this");
    EXPECT_EQ(mistake("id - 3"), "4: no field, number, string in double quotes or operator begins with this");
    EXPECT_EQ(mistake("id 3"), "4: expected one of == != < <= > >= =~ !~ or in");
    EXPECT_EQ(mistake("id"), "3: expected one of == != < <= > >= =~ !~ or in");
    EXPECT_EQ(mistake("id == 3 id == 4"), "9: expected && or ||");
    EXPECT_EQ(mistake("id == 3 && && id == 4"), "12: expected a field, a number or a string");
}

TEST(WhereMistakes, AreFoundInStrings)
{
    EXPECT_EQ(mistake("comp == 'IDX'"), "9: expected a string in double quotes");
    EXPECT_EQ(mistake("comp == \"IDX"), "9: this string has no closing quote");
    EXPECT_EQ(mistake("comp == \""), "9: this string has no closing quote");
    EXPECT_EQ(mistake(R"(text =~ "a\.b")"), R"(11: in a string, write \\ for a backslash and \" for a quote)");
    EXPECT_EQ(mistake("text =~ \"a\\"), R"(11: in a string, write \\ for a backslash and \" for a quote)");
}

TEST(WhereMistakes, AreFoundInNumbers)
{
    const std::string expected = "expected a number of at most 64 bits, decimal or hexadecimal behind 0x";
    EXPECT_EQ(mistake("id == 12ab"), "7: " + expected);
    EXPECT_EQ(mistake("id == 0x"), "7: " + expected);
    EXPECT_EQ(mistake("id == 0xfg"), "7: " + expected);
    EXPECT_EQ(mistake("id == 18446744073709551616"), "7: " + expected);
    EXPECT_EQ(mistake("id == -9223372036854775809"), "7: " + expected);
}

TEST(WhereMistakes, AreFoundWhereAPartIsMissing)
{
    EXPECT_EQ(mistake(""), "1: expected a field, a number or a string");
    EXPECT_EQ(mistake("   "), "4: expected a field, a number or a string");
    EXPECT_EQ(mistake("id =="), "6: expected a field, a number or a string");
    EXPECT_EQ(mistake("id == 3 &&"), "11: expected a field, a number or a string");
    EXPECT_EQ(mistake("== 3"), "1: expected a field, a number or a string");
    EXPECT_EQ(mistake("()"), "2: expected a field, a number or a string");
}

TEST(WhereMistakes, AreFoundInParentheses)
{
    EXPECT_EQ(mistake("(id == 3"), "9: expected &&, || or the ) for the ( at column 1");
    EXPECT_EQ(mistake("id == 1 || ((id == 3) id == 4)"), "23: expected &&, || or the ) for the ( at column 12");
    EXPECT_EQ(mistake("id == 3)"), "8: this ) closes nothing");
    EXPECT_EQ(mistake("!id == 3"), "2: what ! inverts stands in parentheses");
    EXPECT_EQ(mistake("! 3 == id"), "3: what ! inverts stands in parentheses");
    EXPECT_EQ(mistake("id ! 3"), "4: expected one of == != < <= > >= =~ !~ or in");
}

TEST(WhereMistakes, AreFoundInLists)
{
    EXPECT_EQ(mistake("id in 3"), "7: expected ( and a list of numbers or strings");
    EXPECT_EQ(mistake("id in ()"), "8: expected a number or a string");
    EXPECT_EQ(mistake("id in (3"), "9: expected , or ) in the list");
    EXPECT_EQ(mistake("id in (3,)"), "10: expected a number or a string");
    EXPECT_EQ(mistake("id in (3 4)"), "10: expected , or ) in the list");
    EXPECT_EQ(mistake("id in (3, seq)"), "11: expected a number or a string");
    EXPECT_EQ(mistake("3 in (3)"), "1: expected a field before in");
    EXPECT_EQ(mistake("id in (3, \"a\")"), "11: expected a number without quotes for id");
    EXPECT_EQ(mistake("comp in (\"a\", 3)"), "15: expected a string in double quotes for comp");
}

TEST(WhereMistakes, AreFoundInFields)
{
    const std::string fields = "comp, kind, id, thread, seq, pid, time, length, text, value, file, program, node";
    EXPECT_EQ(mistake("component == \"IDX\""), "1: no field has this name; there are " + fields);
    EXPECT_EQ(mistake("id == 3 && ID == 4"), "12: no field has this name; there are " + fields);
    EXPECT_EQ(mistake("id == seq"), "7: expected a number or a string");
    EXPECT_EQ(mistake("3 == 4"), "1: expected a field on one side of the comparison");
    EXPECT_EQ(mistake("1 < id < 4"), "8: comparisons are not chained; join them with &&");
    EXPECT_EQ(mistake("id in (1) == 4"), "11: comparisons are not chained; join them with &&");
}

TEST(WhereMistakes, AreFoundInTypes)
{
    for (const std::string field : {"id", "thread", "seq", "pid", "length", "value", "node"}) {
        const auto column = std::to_string(field.size() + 5);
        EXPECT_EQ(mistake(field + " == \"3\""), column + ": expected a number without quotes for " + field);
        EXPECT_EQ(mistake(field + " =~ \"3\""),
                  std::to_string(field.size() + 2) + ": " + field + " is a number; =~ is for text");
    }
    for (const std::string field : {"comp", "kind", "text", "file", "program"}) {
        EXPECT_EQ(mistake(field + " == 3"),
                  std::to_string(field.size() + 5) + ": expected a string in double quotes for " + field);
        for (const std::string order : {"<", "<=", ">", ">="}) {
            const auto message = ": " + field + " has no order; expected one of == != =~ !~ or in";
            EXPECT_EQ(mistake(field + " " + order + " \"a\""), std::to_string(field.size() + 2) + message);
        }
    }
    EXPECT_EQ(mistake("time >= 3"), "9: expected a string in double quotes for time");
    EXPECT_EQ(mistake("time !~ \"2026\""), "6: time is a time; !~ is for text");
    EXPECT_EQ(mistake("\"a\" =~ text"), "1: expected the field before the operator");
    EXPECT_EQ(mistake("text =~ 3"), "9: expected a string in double quotes for text");
}

TEST(WhereMistakes, AreFoundInWhatALiteralSays)
{
    EXPECT_EQ(mistake("text =~ \"a(b\""), "9: this is no regular expression: Unmatched ( or \\(");
    EXPECT_EQ(mistake("id == 3 && text !~ \"[a\"").substr(0, 34), "20: this is no regular expression:");
    EXPECT_EQ(mistake("text =~ \"" + std::string(1001, '(') + "\""),
              "9: a regular expression of 1001 bytes is too long: 1000 are taken");
    EXPECT_EQ(mistake("time >= \"yesterday\"").substr(0, 26), "9: expected a time such as");
    EXPECT_EQ(
        mistake("kind == \"ids\""),
        "9: no kind has this name; there are free, unfinished, id, note, data, values32, values64, error, strings, "
        "start, calibration, restart, unknown");
}

TEST(WhereMistakes, AreShownUnderTheExpression)
{
    EXPECT_EQ(error_of("id == 3 &&\n\tseq = 4"), "column 17: expected == or =~\n"
                                                 "    id == 3 &&  seq = 4\n"
                                                 "                    ^");
}

TEST(WhereMistakes, CountCharactersNotBytes)
{
    EXPECT_EQ(error_of("text == \"\xc3\xa9\xe2\x82\xac\" && x"),
              "column 17: no field has this name; there are comp, kind, "
              "id, thread, seq, pid, time, length, text, value, file, "
              "program, node\n"
              "    text == \"\xc3\xa9\xe2\x82\xac\" && x\n"
              "                    ^");
}

TEST(WhereNesting, IsTakenUpToItsLimit)
{
    const std::string open(100, '(');
    const std::string close(100, ')');
    EXPECT_EQ(ids_where("id == 3"), ids_where("id == 3 && " + open.substr(1) + "id == 3" + close.substr(1)));
    EXPECT_EQ(mistake(open + "id == 3" + close), "");
    EXPECT_EQ(mistake(open + "(id == 3)" + close), "101: parentheses and ! are nested more than 100 deep");
    EXPECT_EQ(mistake(std::string(101, '!') + "(id == 3)"), "101: parentheses and ! are nested more than 100 deep");
    EXPECT_EQ(mistake(std::string(1'000'000, '(')), "101: parentheses and ! are nested more than 100 deep");
}

TEST(WhereNesting, IsLeftWithItsParenthesis)
{
    std::string chain = "((id == 1))";
    for (int i = 0; i < 1000; ++i) {
        chain += " || ((id == 2))";
    }
    EXPECT_EQ(ids_where(chain), (seqs{1, 2}));
}

} // namespace
} // namespace qn::test
