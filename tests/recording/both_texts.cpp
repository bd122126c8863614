#include "recording/both_texts.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "trace/recording/format_text.h"

// The sanitizers' own vsnprintf() reads on behind a format that ends within a conversion.
extern "C" {
[[gnu::visibility("default")]] const char *__asan_default_options() { return "check_printf=0"; }
[[gnu::visibility("default")]] const char *__tsan_default_options() { return "check_printf=0"; }
}

namespace qn::test
{
namespace
{
constexpr size_t beyond = 64; // more than a number, or what stands behind the buffer

#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
// Returns vsnprintf()'s result.
int compare(size_t size, const char *format, va_list args)
{
    std::vector<char> expected(size + beyond, '#');
    std::vector<char> text(size + beyond, '#');

    va_list copy;
    va_copy(copy, args);
    errno = EISDIR;
    const int result = std::vsnprintf(expected.data(), size, format, copy);
    const int expected_errno = errno;
    va_end(copy);
    va_copy(copy, args);
    errno = EISDIR;
    const tr::made_text made = tr::format_text(text.data(), size, format, copy);
    EXPECT_EQ(errno, expected_errno);
    va_end(copy);

    EXPECT_EQ(made.result, result);
    EXPECT_EQ(std::string(text.data() + size, beyond), std::string(beyond, '#'));
    if (size == 0 || result < 0) return result;
    EXPECT_EQ(made.length, std::strlen(text.data()));
    // A NUL that %c brings is not the end.
    const size_t kept = std::min(size, static_cast<size_t>(result) + 1);
    EXPECT_EQ(std::string(text.data(), kept), std::string(expected.data(), kept));
    return result;
}
#pragma GCC diagnostic pop
} // namespace

void expect_as_vsnprintf(const char *format, ...)
{
    va_list args;
    va_start(args, format);
    const int length = compare(0, format, args);
    for (size_t size = 1; size <= static_cast<size_t>(std::max(length, 0)) + beyond; ++size) {
        compare(size, format, args);
        if (!testing::Test::HasFailure()) continue;
        ADD_FAILURE() << '"' << format << "\" in " << size << " bytes";
        break;
    }
    va_end(args);
}
} // namespace qn::test
