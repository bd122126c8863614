#include "faults/hostile_values.h"

#include "support/pattern_text.h"

namespace
{
using qn::test::nested;
using qn::test::repeated;

std::vector<std::string> formats_and_bytes()
{
    return {"",
            " ",
            "%n%n%s",
            "%s%s%s%s%s%s%s%s%s%s%s%s",
            "%1$n%2$s%99$s",
            "%*.*d%.2147483647f",
            "\n",
            "a\nb\r\n\tc",
            "\x1b[2J\x1b]0;title\x07",
            "\xff\xfe\xc0\x80\xed\xa0\x80",
            "/",
            "//",
            ".",
            "..",
            "../../../up",
            "/dev/null",
            "/dev/full",
            "/proc/self/mem",
            ",",
            ";",
            ":",
            ":::::",
            ",,,;;;:::===",
            "\"",
            "\"quoted\"",
            "=",
            "\\",
            "#",
            "a:b=c,d:e=f",
            "x.1.sp",
            "x.99999999999.sp",
            ".sp",
            std::string(255, 'a'),
            std::string(256, 'a'),
            std::string(1023, 'a'),
            std::string(1024, 'a'),
            std::string(4095, 'a'),
            std::string(4096, 'a'),
            std::string(100000, 'a'),
            repeated("a/", 2500),
            repeated("a:b,", 200)};
}

std::vector<std::string> numbers()
{
    return {"0",
            "-1",
            "1",
            "+5",
            "  12  ",
            "08",
            "0x",
            "0x7fffffffffffffff",
            "1e9",
            "1.5",
            "4096k",
            "12MMMMM",
            "2147483647",
            "2147483648",
            "-2147483649",
            "4294963200",
            "4294967295",
            "4294967296",
            "4294967297",
            "9223372036854775807",
            "9223372036854775808",
            "18446744073709551616",
            "-9223372036854775809",
            std::string(5000, '9')};
}

std::vector<std::string> patterns()
{
    return {"[",
            "(",
            ")",
            "*",
            "a**",
            "[[:none:]]",
            "[[.a.",
            "a{",
            "a{2,1}",
            "a{32768}",
            "(a{32767}){32767}",
            "((a{255}){255}){255}",
            "a{0,32767}",
            "(a?){32767}",
            nested("a", "+", 24),
            nested("a", "*", 2000),
            nested("a", "", 10000),
            nested("a", "", 45000),
            repeated("(", 99000),
            repeated("()", 45000),
            repeated("a*", 45000),
            repeated("|", 90000),
            repeated("*", 90000),
            "a" + repeated("+", 90000),
            repeated("(^|a)+", 200),
            repeated("(^|$|\\b|\\B|a)*", 5),
            nested("^|a", "+", 8),
            repeated("^", 60000),
            "\\B()*{0,30}[ab]",
            "(a*)\\1b",
            "(a*)(a*)(a*)\\1\\2\\3b",
            repeated("[a-z]", 19000)};
}
} // namespace

namespace qn::test
{
const std::vector<std::string> &hostile_values()
{
    static const std::vector<std::string> all = [] {
        std::vector<std::string> values;
        for (const auto &some : {formats_and_bytes(), numbers(), patterns()})
            values.insert(values.end(), some.begin(), some.end());
        return values;
    }();
    return all;
}
} // namespace qn::test
