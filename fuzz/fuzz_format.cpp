// Formats of formatted texts: the library makes the text that vsnprintf() makes.
#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstring>

#include "fuzz/fuzz_input.h"
#include "trace/recording/format_text.h"

// The sanitizers' own vsnprintf() reads on behind a format that ends within a conversion.
extern "C" {
[[gnu::visibility("default")]] const char *__asan_default_options() { return "check_printf=0"; }
[[gnu::visibility("default")]] const char *__tsan_default_options() { return "check_printf=0"; }
}

namespace
{
constexpr size_t value_bytes = 8;
constexpr size_t most_conversions = 8;

// What every string conversion gets, a wide one too.
alignas(wchar_t) constexpr std::array<char, 32> string{"a string of 19 bytes"};

// Formats that take something else than values, strings and numbers, or years.
bool is_fit(const std::string &format)
{
    if (format.find_first_of("*$nL") != std::string::npos) return false;
    if (std::count(format.begin(), format.end(), '%') > static_cast<long>(most_conversions)) return false;
    size_t digits = 0;
    for (const char c : format) {
        digits = c >= '0' && c <= '9' ? digits + 1 : 0;
        if (digits > 4) return false;
    }
    return true;
}

#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
void compare(size_t size, const char *format, ...)
{
    std::array<char, 1280> expected{};
    std::array<char, 1280> text{};
    va_list args;
    va_start(args, format);
    errno = ENOENT;
    const int expected_result = std::vsnprintf(expected.data(), size, format, args);
    va_end(args);
    va_start(args, format);
    errno = ENOENT;
    const auto [result, length] = qn::tr::format_text(text.data(), size, format, args);
    va_end(args);

    qn::fuzz::require(result == expected_result, "a result", format);
    if (size == 0 || result < 0) return;
    const size_t kept = std::min(size, static_cast<size_t>(result) + 1);
    qn::fuzz::require(std::memcmp(text.data(), expected.data(), kept) == 0, "a text", format);
    qn::fuzz::require(length == std::strlen(expected.data()), "a length", format);
}
#pragma GCC diagnostic pop
} // namespace

// A value, the size of the buffer by 5 bytes, and the format.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    if (size <= value_bytes) return 0;
    uint64_t v = 0;
    std::memcpy(&v, data, value_bytes);
    const size_t buffer = data[value_bytes] * size_t{5};
    const std::string bytes(data + value_bytes + 1, data + size);
    const std::string format = bytes.c_str();
    if (!is_fit(format)) return 0;
    if (format.find_first_of("sS") != std::string::npos) v = reinterpret_cast<uint64_t>(string.data());
    double d = 0;
    std::memcpy(&d, &v, sizeof d);
    // Each conversion may take a number of 16 bytes, from behind the registers.
    compare(buffer, format.c_str(), v, v, v, v, v, v, v, v, v, v, v, v, v, v, v, v, v, v, v, v, v, v, v, v, d, d, d, d,
            d, d, d, d);
    return 0;
}
