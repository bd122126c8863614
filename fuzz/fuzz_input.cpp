#include "fuzz/fuzz_input.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>

namespace qn::fuzz
{
input read_input(const uint8_t *data, size_t size)
{
    constexpr size_t most_bytes = 512;
    constexpr auto most_repetitions = 2;
    const auto *end = std::find(data, data + std::min(size, most_bytes), 0);
    std::string text(data, end);

    int repetitions = 0;
    for (size_t i = 0; i < text.size(); ++i) {
        const auto is_digit = [&](size_t at) { return at < text.size() && text[at] >= '0' && text[at] <= '9'; };
        if (text[i] == '+' || text[i] == '{') ++repetitions;
        if (text[i] == '{' && is_digit(i + 1) && is_digit(i + 2)) return {};
        if (text[i] == '\\' && is_digit(i + 1)) return {}; // a back reference tries every way to match
    }
    if (repetitions > most_repetitions) return {};
    return {text, true};
}

void require(bool holds, const char *what, const std::string &text)
{
    if (holds) return;
    std::fprintf(stderr, "%s: \"%s\"\n", what, text.c_str());
    std::abort();
}
} // namespace qn::fuzz
