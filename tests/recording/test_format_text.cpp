// format_text() against vsnprintf(), behaviour by behaviour. Each comparison is one of every buffer size.
#include <cerrno>
#include <cfloat>
#include <climits>
#include <clocale>
#include <cstdarg>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>

#include <gtest/gtest.h>

#include "recording/both_texts.h"
#include "trace/recording/format_text.h"

using namespace qn::test;

namespace
{
// A format of every integer conversion, with the same flags, width and length modifier.
template <class Value>
void expect_integers(const std::string &between, Value value)
{
    for (const char conversion : {'d', 'i', 'u', 'o', 'x', 'X'}) {
        const std::string format = "<%" + between + conversion + ">";
        expect_as_vsnprintf(format.c_str(), value);
    }
}

// The numbers at which something may go wrong: the extremes of every type, and where the number of digits changes.
template <class Value>
void expect_every_integer(const std::string &between)
{
    for (const long long value : {0LL,
                                  1LL,
                                  -1LL,
                                  7LL,
                                  8LL,
                                  9LL,
                                  10LL,
                                  15LL,
                                  16LL,
                                  99LL,
                                  100LL,
                                  999LL,
                                  1000LL,
                                  9999LL,
                                  10000LL,
                                  99999LL,
                                  100000LL,
                                  -9LL,
                                  -10LL,
                                  -100LL,
                                  1234567890123456789LL,
                                  static_cast<long long>(SCHAR_MIN),
                                  static_cast<long long>(SCHAR_MAX),
                                  static_cast<long long>(UCHAR_MAX),
                                  static_cast<long long>(SHRT_MIN),
                                  static_cast<long long>(SHRT_MAX),
                                  static_cast<long long>(USHRT_MAX),
                                  static_cast<long long>(INT_MIN),
                                  static_cast<long long>(INT_MAX),
                                  static_cast<long long>(UINT_MAX),
                                  LLONG_MIN,
                                  LLONG_MAX})
        expect_integers(between, static_cast<Value>(value));
}

// With what stands in the buffer, and the result.
struct made {
    std::string text;
    int result;
};

#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
made make(const char *format, ...)
{
    char buffer[256] = "";
    va_list args;
    va_start(args, format);
    const int result = qn::tr::format_text(buffer, sizeof buffer, format, args).result;
    va_end(args);
    return {buffer, result};
}

int make_nothing(const char *format, ...)
{
    va_list args;
    va_start(args, format);
    const qn::tr::made_text text = qn::tr::format_text(nullptr, 0, format, args);
    va_end(args);
    EXPECT_EQ(text.length, 0U);
    return text.result;
}
#pragma GCC diagnostic pop
} // namespace

TEST(FormatText, TakesLiteralText)
{
    for (size_t length = 0; length < 100; ++length) expect_as_vsnprintf(std::string(length, 'x').c_str());
}

TEST(FormatText, TakesLiteralTextOfEveryLengthBeforeAConversion)
{
    for (size_t length = 0; length < 100; ++length) expect_as_vsnprintf((std::string(length, 'x') + "%d|").c_str(), 42);
}

TEST(FormatText, TakesBytesThatAreNotAscii) { expect_as_vsnprintf("na\xC3\xAFve \xFF\x80%d\x01", 1); }

TEST(FormatText, WritesAPercentSign) { expect_as_vsnprintf("%%%d%%%% %%d", 5); }

TEST(FormatText, WritesInts) { expect_every_integer<int>(""); }

TEST(FormatText, WritesCharsAsNumbers) { expect_every_integer<int>("hh"); }

TEST(FormatText, WritesShorts) { expect_every_integer<int>("h"); }

TEST(FormatText, WritesLongs) { expect_every_integer<long>("l"); }

TEST(FormatText, WritesLongLongs) { expect_every_integer<long long>("ll"); }

TEST(FormatText, WritesSizes) { expect_every_integer<size_t>("z"); }

TEST(FormatText, WritesIntegersOfTheLargestType) { expect_every_integer<intmax_t>("j"); }

TEST(FormatText, WritesDifferencesOfPointers) { expect_every_integer<ptrdiff_t>("t"); }

TEST(FormatText, WritesEveryNumberOfDigits)
{
    unsigned long long value = 1;
    for (int digits = 1; digits < 20; ++digits, value *= 10) {
        expect_as_vsnprintf("%llu %llu %llu", value - 1, value, value + 1);
        expect_as_vsnprintf("%lld", -static_cast<long long>(value));
    }
}

TEST(FormatText, WritesEveryNumberOfBits)
{
    for (int bits = 0; bits < 64; ++bits)
        expect_as_vsnprintf("%llo %llx %lX", 1ULL << bits, (1ULL << bits) - 1, ~0UL << bits);
}

TEST(FormatText, PadsIntegers)
{
    for (const char *between : {"1", "3", "5", "12", "40"}) expect_every_integer<int>(between);
}

TEST(FormatText, PadsIntegersAtTheRight)
{
    for (const char *between : {"-", "-1", "-5", "-40", "--7"}) expect_every_integer<int>(between);
}

TEST(FormatText, PadsIntegersWithZeros)
{
    for (const char *between : {"0", "01", "05", "012", "040", "0007"}) expect_every_integer<int>(between);
}

TEST(FormatText, LeavesZerosOutWhereItPadsAtTheRight)
{
    for (const char *between : {"-05", "0-5", "00-012", "-0-40"}) expect_every_integer<int>(between);
}

TEST(FormatText, PadsIntegersOfEveryLength)
{
    for (const std::string between : {"25", "-25", "025"}) {
        expect_every_integer<int>(between + "hh");
        expect_every_integer<int>(between + "h");
        expect_every_integer<long>(between + "l");
        expect_every_integer<long long>(between + "ll");
        expect_every_integer<size_t>(between + "z");
        expect_every_integer<intmax_t>(between + "j");
        expect_every_integer<ptrdiff_t>(between + "t");
    }
}

TEST(FormatText, WritesCharacters)
{
    for (int character = 0; character < 256; ++character) expect_as_vsnprintf("<%c>", character);
}

TEST(FormatText, TakesTheLowByteOfACharacter) { expect_as_vsnprintf("%c%c%c", 'a' + 256, -1, 256); }

TEST(FormatText, PadsCharacters)
{
    for (const char *format : {"<%5c>", "<%-5c>", "<%1c>", "<%05c>", "<%-05c>"}) {
        expect_as_vsnprintf(format, 'a');
        expect_as_vsnprintf(format, 0);
    }
}

TEST(FormatText, WritesStrings)
{
    for (size_t length = 0; length < 300; length += 7) {
        const std::string string(length, 's');
        expect_as_vsnprintf("%s", string.c_str());
        expect_as_vsnprintf("a %s and %s.", string.c_str(), "");
    }
}

TEST(FormatText, WritesStringsThatFillTheUsualBuffer)
{
    for (size_t length = 1000; length < 1030; ++length) expect_as_vsnprintf("%s", std::string(length, 's').c_str());
}

TEST(FormatText, PadsStrings)
{
    for (const char *format : {"<%5s>", "<%-5s>", "<%1s>", "<%40s>", "<%-40s>", "<%05s>", "<%-05s>"}) {
        expect_as_vsnprintf(format, "");
        expect_as_vsnprintf(format, "abcde");
        expect_as_vsnprintf(format, "-ab");
    }
}

TEST(FormatText, WritesPointers)
{
    int here = 0;
    for (const char *format : {"<%p>", "<%1p>", "<%30p>", "<%-30p>", "<%030p>", "<%-030p>"}) {
        expect_as_vsnprintf(format, static_cast<void *>(&here));
        expect_as_vsnprintf(format, reinterpret_cast<void *>(1));
        expect_as_vsnprintf(format, reinterpret_cast<void *>(UINTPTR_MAX));
    }
}

TEST(FormatText, WritesNullPointersAndNullStrings)
{
    for (const char *format : {"<%p>", "<%10p>", "<%-10p>", "<%s>", "<%10s>", "<%-10s>", "<%3s>"})
        expect_as_vsnprintf(format, nullptr);
}

TEST(FormatText, TakesManyArguments)
{
    expect_as_vsnprintf("%d %s %lu %c %x %lld %s %d %5d|%-6s|%p", 1, "two", 3UL, '4', 5, 6LL, "seven", 8, 9, "ten",
                        reinterpret_cast<void *>(11));
}

TEST(FormatText, TakesArgumentsOfFloatingPointBetweenOthers)
{
    expect_as_vsnprintf("%d %f %s %g %d %.3e %a %d %d %d %d", 1, 2.5, "three", 4e100, 5, -DBL_MAX, 0.1, 6, 7, 8, 9);
}

TEST(FormatText, TakesLongDoubles) { expect_as_vsnprintf("%d %Lf %d", 1, 2.5L, 3); }

TEST(FormatText, TakesPrecisions)
{
    expect_as_vsnprintf("<%.3d> <%8.3d> <%08.3d> <%.0d> <%.s> <%.2s>", 5, 5, 5, 0, "abc", "abc");
}

TEST(FormatText, TakesAWidthFromTheArguments)
{
    expect_as_vsnprintf("%d <%*d> <%-*s> <%.*s>", 1, 7, 2, -9, "ab", 1, "cd");
}

TEST(FormatText, TakesTheOtherFlags)
{
    expect_as_vsnprintf("%+d % d %#x %#o %'d %Id %+5d %-+5d %0+5d", 1, 2, 3, 4, 5000000, 6, 7, 8, 9);
}

TEST(FormatText, TakesArgumentsByTheirPosition) { expect_as_vsnprintf("%2$s %1$d %2$s", 5, "b"); }

TEST(FormatText, TakesWideCharactersAndStrings)
{
    expect_as_vsnprintf("%d %lc%ls %S%C", 1, static_cast<wint_t>(L'w'), L"ide", L"W", static_cast<wint_t>(L'I'));
}

TEST(FormatText, FailsAtAWideCharacterThatTheLocaleLacks)
{
    const wchar_t no_character[] = {static_cast<wchar_t>(0x7FFFFFFF), 0};
    expect_as_vsnprintf("%d %ls", 1, no_character);
}

TEST(FormatText, TellsTheErrorOfTheCaller)
{
    expect_as_vsnprintf("%d: %m", 5);
    expect_as_vsnprintf("%s failed: %m (%d)", "something", 5);
    errno = ENOENT;
    EXPECT_EQ(make("%d: %m", 5).text, std::string("5: ") + std::strerror(ENOENT));
}

TEST(FormatText, CountsWhatItHasWritten)
{
    int count = 0;
    const made counted = make("%s:%n %d", "four", &count, 5); // in memory that nobody can write to, as %n has to be
    EXPECT_EQ(counted.text, "four: 5");
    EXPECT_EQ(counted.result, 7);
    EXPECT_EQ(count, 5);
}

TEST(FormatText, TakesConversionsThatNobodyKnows)
{
    for (const char *format : {"a %y b", "%d %!", "%v%d", "%-5k", "%hhc", "%lhd", "%hld", "%llld", "%hhhd", "%l5d",
                               "%5-d", "%zzd", "%5%", "%-%", "%l%", "% %"})
        expect_as_vsnprintf(format, 1, 2, 3);
}

TEST(FormatText, TakesConversionsThatTheFormatLeavesIncomplete)
{
    for (const char *format :
         {"%", "abc%", "%d %", "%-", "%0", "%05", "%12", "%l", "%ll", "%h", "%hh", "%z", "%-08l", "%.", "%d%d%"})
        expect_as_vsnprintf(format, 1, 2, 3);
}

TEST(FormatText, TakesTheOldNamesOfModifiers) { expect_as_vsnprintf("%qd %Ld %Zu", 1LL, 2LL, static_cast<size_t>(3)); }

TEST(FormatText, TakesLengthModifiersWhereTheyMeanNothing)
{
    expect_as_vsnprintf("%lp %zp %tp %hs %zs %hhc", &errno, &errno, &errno, "half", "sized", 'c');
}

TEST(FormatText, FillsABufferThatItJustFits)
{
    for (size_t width = 990; width < 1030; ++width)
        expect_as_vsnprintf(("%" + std::to_string(width) + "d%c").c_str(), 5, 'c');
}

TEST(FormatText, FailsAtAWidthThatIsNoInt)
{
    EXPECT_EQ(make("%99999999999d", 5).result, -1);
    EXPECT_EQ(make("%2147483648d", 5).result, -1);
    EXPECT_EQ(make("%18446744073709551621d", 5).result, -1); // 5, if it ran over
}

TEST(FormatText, FailsAtATextLongerThanAnInt) { EXPECT_EQ(make("%2147483647d%d", 5, 5).result, -1); }

TEST(FormatText, MeasuresATextWithoutABuffer)
{
    EXPECT_EQ(make_nothing("plain"), 5);
    EXPECT_EQ(make_nothing("%d of %d", 42, 1000), 10);
    EXPECT_EQ(make_nothing("%.2f", 2.5), 4);
    EXPECT_EQ(make_nothing(""), 0);
}

TEST(FormatText, TakesABufferThatIsSaidToBeEndless)
{
    char buffer[64];
    const auto make_endless = [&](const char *format, ...) {
        va_list args;
        va_start(args, format);
        const int result = qn::tr::format_text(buffer, INT_MAX, format, args).result;
        va_end(args);
        return result;
    };
    EXPECT_EQ(make_endless("%d of %s", 42, "many"), 10);
    EXPECT_STREQ(buffer, "42 of many");
}

TEST(FormatText, LeavesErrnoAlone)
{
    errno = EXDEV;
    make("%d %s %5x %-7ld %p %c %%", 1, "two", 3, 4L, static_cast<void *>(&errno), 'c');
    EXPECT_EQ(errno, EXDEV);
}

TEST(FormatText, EndsTheTextAtANulThatACharacterBrings)
{
    const made text = make("ab%cd", 0);
    EXPECT_EQ(text.text, "ab");
    EXPECT_EQ(text.result, 4);
}

TEST(FormatText, KnowsNothingOfTheLocale)
{
    if (std::setlocale(LC_ALL, "C.UTF-8") == nullptr) GTEST_SKIP() << "no such locale";
    expect_as_vsnprintf("na\xC3\xAFve %d \xC3 %s %5s %'d", 1, "\xC3\xA9", "\xC3\xA9", 1234567);
    expect_as_vsnprintf("%d %ls", 1, L"\x20AC");
}
