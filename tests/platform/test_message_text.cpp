// The message of an error: each conversion filled in as printf would, and never anything that was not recorded.
#include <cerrno>
#include <climits>
#include <clocale>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <cwchar>

#include "error_support.h"

namespace
{
template <typename... insert_types>
void expect_as_printf(const char *text, insert_types... inserts)
{
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
    char expected[8192];
    std::snprintf(expected, sizeof expected, text, inserts...);
#pragma GCC diagnostic pop
    EXPECT_EQ(message(text, inserts...), expected);
}

TEST(MessageText, IsTheDefaultTextWhenNothingIsInserted)
{
    cu_set_error_1(14, nullptr, nullptr, 1, 14, "Memory allocation failed.\n");
    EXPECT_EQ(message_of(*present_error()), "Memory allocation failed.\n");
}

TEST(MessageText, IntegersAreShownAsPrintfShowsThem)
{
    expect_as_printf("%d|%i|%u|%o|%x|%X", -5, 7, 4000000000U, 8U, 255U, 255U);
    expect_as_printf("%+d|% d|%05d|%-5d|%5d|%.3d", 1, 2, 3, 4, 5, 6);
    expect_as_printf("%#x|%#o|%-+6d|%06.2d", 16U, 8U, 1, 2);
    expect_as_printf("%d %d", INT_MIN, INT_MAX);
}

TEST(MessageText, ShortLengthsCutTheValue) { expect_as_printf("%hhd|%hhu|%hd|%hu", 300, 300, 70000, 70000); }

TEST(MessageText, LongIntegersKeepAllTheirBits)
{
    expect_as_printf("%ld|%lu|%lx", LONG_MIN, ULONG_MAX, 0x123456789abcdefL);
    expect_as_printf("%lld|%llu", LLONG_MIN, ULLONG_MAX);
    expect_as_printf("%zu|%td|%jd", SIZE_MAX, PTRDIFF_MIN, INTMAX_MAX);
}

TEST(MessageText, QuadLengthMeansLongLong)
{
    EXPECT_EQ(message("%qd %Ld", 5000000000LL, -5000000000LL), "5000000000 -5000000000");
}

TEST(MessageText, FloatingNumbersAreShownAsPrintfShowsThem)
{
    expect_as_printf("%f|%.2f|%e|%G|%10.3g|%a", 3.25, 2.005, 12345.678, 1e-10, 0.5, 1.0);
    expect_as_printf("%f", 1e300);
}

TEST(MessageText, ALongDoubleIsRoundedToADouble) { EXPECT_EQ(message("%.3Lf|%s", 2.5L, "x"), "2.500|x"); }

TEST(MessageText, StringsAreCutAndPadded)
{
    expect_as_printf("%s|%10s|%-10s|%.3s|%8.2s|", "text", "right", "left", "abcdef", "xyz");
    EXPECT_EQ(message("<%.0s>", "gone"), "<>");
}

TEST(MessageText, ALongStringIsCutToItsPrecisionOnly)
{
    const std::string longer(6000, 'x');
    EXPECT_EQ(message("%s", longer.c_str()), longer);
    for (const char *text : {"%.4094s", "%.4095s", "%.4096s", "%.5000s", "%.7000s", "%.2147483647s"})
        expect_as_printf(text, longer.c_str());
    expect_as_printf("%.*s", 5000, longer.c_str());
}

TEST(MessageText, ANullStringReadsAsSuch)
{
    EXPECT_EQ(message("<%s>", static_cast<const char *>(nullptr)), "<(null)>");
}

TEST(MessageText, AStringInsertIsNotTakenForAFormat) { EXPECT_EQ(message("%s", "%s%n%d%%"), "%s%n%d%%"); }

TEST(MessageText, CharactersAreShownAndPadded)
{
    expect_as_printf("%c|%3c|%-3c|", 'a', 'b', 'c');
    EXPECT_EQ(message("a%cb", 0), "ab");
}

TEST(MessageText, PointersAreShownAndNotFollowed)
{
    void *nowhere = reinterpret_cast<void *>(uintptr_t{0x1234});
    expect_as_printf("%p|%12p|%-12p|", nowhere, nowhere, nowhere);
}

TEST(MessageText, AStarTakesWidthAndPrecisionFromTheInserts)
{
    expect_as_printf("%*d|%.*f|%*.*s|", 6, 42, 2, 3.14159, 5, 2, "abc");
    expect_as_printf("%*d|", -6, 42);
    expect_as_printf("%.*s|", -1, "whole");
}

TEST(MessageText, PositionsChooseTheInsert)
{
    EXPECT_EQ(message("%2$s-%1$d-%2$s", 7, "x"), "x-7-x");
    EXPECT_EQ(message("%2$*1$d|", 4, 9), "   9|");
}

TEST(MessageText, APercentSignIsOnePercentSign) { EXPECT_EQ(message("100%% of %d", 5), "100% of 5"); }

TEST(MessageText, TheStoringConversionStoresNothingAndTakesItsInsert)
{
    int touched = 77;
    EXPECT_EQ(message("a%nb %d", &touched, 5), "ab 5");
    EXPECT_EQ(touched, 77);
}

TEST(MessageText, WideCharactersBecomeMultibyteText)
{
    if (std::setlocale(LC_ALL, "C.UTF-8") == nullptr) GTEST_SKIP() << "no UTF-8 locale here";
    EXPECT_EQ(message("%ls|%S|%lc", L"gr\u00fcn", L"x", static_cast<wint_t>(0x20ac)), "gr\u00fcn|x|\u20ac");
    EXPECT_EQ(message("%ls %d", static_cast<const wchar_t *>(nullptr), 3), "(null) 3");
}

TEST(MessageText, APrecisionCutsWideTextBetweenCharacters)
{
    if (std::setlocale(LC_ALL, "C.UTF-8") == nullptr) GTEST_SKIP() << "no UTF-8 locale here";
    for (const char *text : {"<%.0ls>", "<%.1ls>", "<%.2ls>", "<%.3ls>", "<%.4ls>", "<%.6ls>", "<%.9ls>", "<%-6.4ls>"})
        expect_as_printf(text, L"\u20ac\u20acx");
    expect_as_printf("<%.*ls>", 5, L"x\u20acx");
}

TEST(MessageText, WideTextThatIsShownTwiceIsCutForEachConversion)
{
    if (std::setlocale(LC_ALL, "C.UTF-8") == nullptr) GTEST_SKIP() << "no UTF-8 locale here";
    EXPECT_EQ(message("%1$.2ls|%1$.5ls|%1$ls", L"\u20ac\u20ac"), "|\u20ac|\u20ac\u20ac");
}

TEST(MessageText, OfWideTextOnlyWhatIsShownMustExistInTheLocale)
{
    std::setlocale(LC_ALL, "C");
    EXPECT_EQ(message("<%.1ls> %d", L"x\u20ac", 3), "<x> 3");
}

TEST(MessageText, WideTextThatTheLocaleDoesNotHaveIsEmpty)
{
    std::setlocale(LC_ALL, "C");
    EXPECT_EQ(message("<%ls> %d", L"\u20ac", 3), "<> 3");
}

TEST(MessageText, AnUnknownConversionStaysAsItIsWritten)
{
    cu_set_error_1(1, nullptr, nullptr, 1, 1, "%d of %y and %s", 4);
    EXPECT_EQ(message_of(*present_error()), "4 of %y and %s");
}

TEST(MessageText, AnEnormousWidthIsBounded)
{
    EXPECT_EQ(message("%2147483647d", 1).size(), 4095U);
    EXPECT_EQ(message("%*d", INT_MAX, 1).size(), 4095U);
    EXPECT_EQ(message("%*d", INT_MIN, 1).size(), 4095U);
    EXPECT_EQ(message("%.99999d", 1).size(), 4095U);
}

TEST(MessageText, ATextWithoutItsInsertStaysAsItIsWritten)
{
    char text[] = "needs %s and %d, 100%%";
    cu_error_t made{};
    made.cu_error_id = 1;
    made.cu_msg_default = text;
    EXPECT_EQ(message_of(made), "needs %s and %d, 100%");
}

TEST(MessageText, AnInsertOfAnotherTypeIsNotReadAsAString)
{
    char text[] = "<%s> <%d>";
    cu_error_arg_t inserts[2]{};
    inserts[0].cu_arg_type = CU_ERROR_ARG_INT;
    inserts[0].cu_arg_value.cu_int = 0x1234;
    inserts[1].cu_arg_type = CU_ERROR_ARG_INT;
    inserts[1].cu_arg_value.cu_int = 8;
    cu_error_t made{};
    made.cu_msg_default = text;
    made.cu_arg_cnt = 2;
    made.cu_args = inserts;
    EXPECT_EQ(message_of(made), "<%s> <8>");
}

TEST(MessageText, AnInsertCountWithoutInsertsIsNone)
{
    char text[] = "<%d>";
    cu_error_t made{};
    made.cu_msg_default = text;
    made.cu_arg_cnt = 3;
    EXPECT_EQ(message_of(made), "<%d>");
}

TEST(MessageText, WithoutAnyTextItIsEmpty)
{
    cu_set_no_error_1();
    EXPECT_EQ(message_of(*present_error()), "");
}

TEST(MessageText, NullArgumentsAreRefused)
{
    char *text = nullptr;
    const cu_error_t none{};
    EXPECT_EQ(cu_get_errmsg_1(nullptr, &text), EINVAL);
    EXPECT_EQ(text, nullptr);
    EXPECT_EQ(cu_get_errmsg_1(&none, nullptr), EINVAL);
}
} // namespace
