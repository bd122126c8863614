// String inserts that need not end with a NUL: how much of them is read, and what the record keeps.
#include <algorithm>
#include <string_view>
#include <sys/mman.h>
#include <unistd.h>

#include "error_support.h"

namespace
{
// Characters with nothing behind the last one: reading on is the end of the program.
template <typename character>
class before_a_hole
{
public:
    explicit before_a_hole(std::basic_string_view<character> text)
    {
        void *pages = mmap(nullptr, bytes_, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
        if (pages == MAP_FAILED) std::abort();
        pages_ = static_cast<char *>(pages);
        char *const hole = pages_ + bytes_ - static_cast<size_t>(getpagesize());
        mprotect(hole, static_cast<size_t>(getpagesize()), PROT_NONE);
        text_ = reinterpret_cast<character *>(hole) - text.size();
        std::copy(text.begin(), text.end(), text_);
    }
    before_a_hole(const before_a_hole &) = delete;
    before_a_hole &operator=(const before_a_hole &) = delete;
    ~before_a_hole() { munmap(pages_, bytes_); }

    const character *text() const { return text_; }

private:
    size_t bytes_ = static_cast<size_t>(getpagesize()) * 4;
    char *pages_ = nullptr;
    character *text_ = nullptr;
};
using unended_text = before_a_hole<char>;
using unended_wide_text = before_a_hole<wchar_t>;

TEST(BoundedInserts, AStringIsReadNoFurtherThanItsPrecision)
{
    const unended_text four("abcd");
    EXPECT_EQ(message("<%.4s> <%.2s>", four.text(), four.text()), "<abcd> <ab>");
}

TEST(BoundedInserts, AStringIsReadNoFurtherThanItsStarSays)
{
    const unended_text four("abcd");
    EXPECT_EQ(message("<%.*s> <%*.*s> %d", 4, four.text(), 6, 3, four.text(), 8), "<abcd> <   abc> 8");
}

TEST(BoundedInserts, AStringIsReadNoFurtherThanAStarAtALaterPositionSays)
{
    const unended_text four("abcd");
    EXPECT_EQ(message("<%1$.*2$s>", four.text(), 4), "<abcd>");
}

TEST(BoundedInserts, PrecisionZeroReadsNothing)
{
    const unended_text empty("");
    EXPECT_EQ(message("<%.0s> <%.s>", empty.text(), empty.text()), "<> <>");
}

TEST(BoundedInserts, APrecisionOfThousandsBoundsTheReadingToo)
{
    const std::string longer(9000, 'x');
    const unended_text unended(longer);
    EXPECT_EQ(message("%.9000s", unended.text()), longer);
}

TEST(BoundedInserts, WideTextIsReadNoFurtherThanItsPrecision)
{
    const unended_wide_text four(L"abcd");
    EXPECT_EQ(message("<%.4ls> <%.*S>", four.text(), 3, four.text()), "<abcd> <abc>");
}

TEST(BoundedInserts, AStringThatEndsBeforeItsPrecisionIsWhole)
{
    const unended_text ended(std::string_view("ab\0", 3));
    EXPECT_EQ(message("<%.4s>", ended.text()), "<ab>");
}

TEST(BoundedInserts, TheLongestOfSeveralPrecisionsCounts)
{
    const unended_text four("abcd");
    EXPECT_EQ(message("<%1$.2s> <%1$.4s> <%1$.3s>", four.text()), "<ab> <abcd> <abc>");
}

TEST(BoundedInserts, AConversionWithoutAPrecisionNeedsTheWholeString)
{
    EXPECT_EQ(message("<%1$.2s> <%1$s>", "abcdef"), "<ab> <abcdef>");
    EXPECT_EQ(message("<%1$s> <%1$.2s>", "abcdef"), "<abcdef> <ab>");
}

TEST(BoundedInserts, ANegativeStarNeedsTheWholeString)
{
    EXPECT_EQ(message("<%.*s> <%.*ls>", -1, "abcdef", -7, L"ghi"), "<abcdef> <ghi>");
}

TEST(BoundedInserts, ANullStringWithAPrecisionStaysNull)
{
    cu_set_error_1(1, nullptr, nullptr, 1, 1, "%.9s %.9ls", static_cast<char *>(nullptr),
                   static_cast<wchar_t *>(nullptr));
    const owned_error error = present_error();
    ASSERT_EQ(error->cu_arg_cnt, 2U);
    EXPECT_EQ(error->cu_args[0].cu_arg_value.cu_char_str, nullptr);
    EXPECT_EQ(error->cu_args[1].cu_arg_value.cu_char_str, nullptr);
}

TEST(BoundedInserts, TheRecordKeepsWhatWasRead)
{
    cu_set_error_1(1, nullptr, nullptr, 1, 1, "%.4s", "abcdef");
    const owned_error error = present_error();
    ASSERT_EQ(error->cu_arg_cnt, 1U);
    EXPECT_EQ(error->cu_args[0].cu_arg_type, CU_ERROR_ARG_CHAR_STR);
    EXPECT_STREQ(error->cu_args[0].cu_arg_value.cu_char_str, "abcd");
}
} // namespace
