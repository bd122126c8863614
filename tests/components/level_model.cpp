#include "components/level_model.h"

#include <algorithm>
#include <limits>

#include <regex.h>

#include "trace/files/pattern_cost.h"

namespace
{
using namespace qn::test;

struct piece {
    size_t begin;
    std::string text;
};

// The pieces between commas; nothing behind a comma that ends the text.
std::vector<piece> split_at_commas(const std::string &text)
{
    std::vector<piece> pieces;
    size_t begin = 0;
    while (begin < text.size()) {
        const size_t comma = text.find(',', begin);
        if (comma == std::string::npos) {
            pieces.push_back({begin, text.substr(begin)});
            break;
        }
        pieces.push_back({begin, text.substr(begin, comma - begin)});
        begin = comma + 1;
    }
    return pieces;
}

int digit_of(char c)
{
    if (c >= '0' && c <= '9') return c - '0';
    if (c >= 'a' && c <= 'z') return c - 'a' + 10;
    if (c >= 'A' && c <= 'Z') return c - 'A' + 10;
    return 99;
}

// Judges one element; `verdict` gains it or a code.
void judge_element(const piece &element, level_verdict &verdict)
{
    const std::string &text = element.text;
    const auto fail = [&](int code, size_t offset) {
        verdict.code = code;
        verdict.offset = static_cast<int>(element.begin + offset);
    };
    const size_t start = text.find_first_not_of(' ');
    if (start == std::string::npos) return fail(10, text.size());
    const size_t colon = colon_outside_groups(text.substr(start));
    if (colon == 0) return fail(10, start);
    if (colon == std::string::npos) return fail(11, text.size());
    const std::string component = text.substr(start, colon);

    const size_t category_start = start + colon + 1;
    const size_t equals = std::min(text.find('=', category_start), text.size());
    std::string category = text.substr(category_start, equals - category_start);
    category.erase(category.find_last_not_of(' ') + 1);
    if (category.empty()) return fail(12, equals);

    int32_t level = -1;
    if (equals < text.size()) {
        const size_t digits = std::min(text.find_first_not_of(' ', equals + 1), text.size());
        const number read = read_number(text, digits);
        const size_t behind = read.found ? std::min(text.find_first_not_of(' ', read.end), text.size()) : digits;
        if (!read.found || behind != text.size()) return fail(13, behind);
        level = static_cast<int32_t>(static_cast<uint32_t>(read.value));
    }
    if (!is_pattern(star_spelled_out(component))) return fail(15, start);
    if (!is_pattern(star_spelled_out(category))) return fail(16, category_start);
    verdict.elements.push_back({star_spelled_out(component), star_spelled_out(category), level});
}

class pattern
{
public:
    explicit pattern(const std::string &text)
        : result_(qn::tr::is_affordable(text.c_str())
                      ? regcomp(&regex_, text.c_str(), REG_EXTENDED | REG_ICASE | REG_NEWLINE | REG_NOSUB)
                      : REG_ESPACE)
    {
    }
    pattern(const pattern &) = delete;
    pattern &operator=(const pattern &) = delete;
    ~pattern()
    {
        if (compiles()) regfree(&regex_);
    }
    bool compiles() const { return result_ == 0; }
    bool matches(const std::string &name) const { return regexec(&regex_, name.c_str(), 0, nullptr, 0) == 0; }

private:
    regex_t regex_{};
    int result_;
};
} // namespace

namespace qn::test
{
number read_number(const std::string &text, size_t at)
{
    const std::string white = " \t\n\v\f\r";
    while (at < text.size() && white.find(text[at]) != std::string::npos) ++at;
    bool negative = false;
    if (at < text.size() && (text[at] == '-' || text[at] == '+')) negative = text[at++] == '-';

    int base = 10;
    if (at < text.size() && text[at] == '0') {
        base = 8;
        const bool x = at + 1 < text.size() && (text[at + 1] == 'x' || text[at + 1] == 'X');
        if (x && at + 2 < text.size() && digit_of(text[at + 2]) < 16) {
            base = 16;
            at += 2;
        }
    }
    number read;
    bool too_large = false;
    for (; at < text.size() && digit_of(text[at]) < base; ++at) {
        const auto digit = static_cast<uint64_t>(digit_of(text[at]));
        const auto factor = static_cast<uint64_t>(base);
        too_large = too_large || read.value > (std::numeric_limits<uint64_t>::max() - digit) / factor;
        read.value = read.value * factor + digit;
        read.found = true;
        read.end = at + 1;
    }
    if (too_large)
        read.value = std::numeric_limits<uint64_t>::max();
    else if (negative)
        read.value = 0 - read.value;
    return read;
}

std::string star_spelled_out(const std::string &pattern) { return pattern == "*" ? ".*" : pattern; }

level_verdict judge_levels(const std::string &specification)
{
    level_verdict verdict;
    for (const piece &element : split_at_commas(specification)) {
        judge_element(element, verdict);
        if (verdict.code == 0) continue;
        verdict.elements.clear();
        break;
    }
    return verdict;
}

bool is_pattern(const std::string &text) { return pattern(text).compiles(); }

bool matches(const std::string &text, const std::string &name)
{
    const pattern compiled(text);
    return compiled.compiles() && compiled.matches(name);
}

size_t colon_outside_groups(const std::string &text)
{
    const auto balance = [&](size_t end, char open, char close) {
        const auto from = text.begin();
        const auto to = from + static_cast<std::ptrdiff_t>(end);
        return std::count(from, to, open) - std::count(from, to, close);
    };
    size_t colon = text.find(':');
    while (colon != std::string::npos && (balance(colon, '[', ']') != 0 || balance(colon, '{', '}') != 0))
        colon = text.find(':', colon + 1);
    return colon;
}

void model_component::apply(const level_element &element)
{
    const pattern component_pattern(element.component);
    const pattern category_pattern(element.category);
    if (!component_pattern.matches(id)) return;
    for (const model_category &category : categories) {
        if (!category_pattern.matches(category.name)) continue;
        const auto asked = static_cast<uint32_t>(element.level);
        const uint32_t level = element.level == -1 ? category.standard : std::max(asked, category.minimum);
        levels[category.id] = static_cast<uint8_t>(level & 0xFF);
    }
}
} // namespace qn::test
