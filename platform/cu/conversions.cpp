// Finding the printf conversions of a message text. Pure functions, no state.
#include "platform/cu/conversions.h"

#include <algorithm>
#include <climits>

namespace qn::cu
{
namespace
{
// How an insert that is only skipped over ("%2$s" without "%1$...") is taken to be passed.
constexpr passed_as unnamed = passed_as::integer;

// Walks over one text. Every read_... takes what it finds at the present place; false means that it makes no
// sense.
class conversion_reader
{
public:
    explicit conversion_reader(std::string_view text) : text_(text) {}

    text_conversions read_all()
    {
        while ((at_ = text_.find('%', at_)) != std::string_view::npos) {
            const size_t named_before = named_.size();
            if (!read_conversion()) {
                found_.understood = false;
                named_.resize(named_before);
                break;
            }
        }
        for (const auto &kind : named_) found_.inserts.push_back({kind.value_or(unnamed), {}});
        for (const conversion &one : found_.list)
            if (one.letter == 's') found_.inserts[*one.insert].precisions.push_back(one.precision);
        return std::move(found_);
    }

private:
    bool read_conversion()
    {
        conversion one;
        one.begin = at_++;
        const std::optional<int> position = read_position();
        one.flags = read_any_of("-+ #0'");
        if (!read_extent(one.width, widest_conversion)) return false;
        if (take('.')) {
            const bool negative = take('-');
            if (!read_extent(one.precision, INT_MAX)) return false; // a string's does not widen anything
            if (!one.precision.insert && !one.precision.number) one.precision.number = 0;
            if (negative) one.precision = {};
        }
        const std::string length = read_any_of("hlqLjztZ");
        if (at_ == text_.size()) return false;
        one.letter = text_[at_++];
        one.end = at_;
        if (one.letter != '%') {
            if (!settle_kind(one, length) || !name_insert(position, one.kind, one.insert)) return false;
        }
        found_.list.push_back(std::move(one));
        return true;
    }

    // "3$"; nothing is taken when there is no '$' behind the digits.
    std::optional<int> read_position()
    {
        const size_t before = at_;
        const std::optional<int> number = read_number(widest_conversion);
        if (number && take('$')) return number;
        at_ = before;
        return std::nullopt;
    }

    // A number above `most` counts as that.
    std::optional<int> read_number(int most)
    {
        if (!at_digit()) return std::nullopt;
        long number = 0;
        for (; at_digit(); ++at_) number = std::min(number * 10 + (text_[at_] - '0'), long{most});
        return static_cast<int>(number);
    }

    bool read_extent(extent &found, int most)
    {
        if (!take('*')) {
            found.number = read_number(most);
            return true;
        }
        return name_insert(read_position(), passed_as::integer, found.insert);
    }

    std::string read_any_of(std::string_view characters)
    {
        const size_t from = at_;
        while (at_ < text_.size() && characters.find(text_[at_]) != std::string_view::npos) ++at_;
        return std::string(text_.substr(from, at_ - from));
    }

    bool settle_kind(conversion &one, const std::string &length)
    {
        switch (one.letter) {
        case 'd':
        case 'i':
        case 'o':
        case 'u':
        case 'x':
        case 'X': return settle_integer(one, length);
        case 'e':
        case 'E':
        case 'f':
        case 'F':
        case 'g':
        case 'G':
        case 'a':
        case 'A':
            one.kind = length == "L" ? passed_as::long_double : passed_as::floating;
            return length.empty() || length == "L" || length == "l";
        case 'C':
        case 'c':
            one.wide = one.letter == 'C' || length == "l";
            one.letter = 'c';
            return length.empty() || length == "l";
        case 'S':
        case 's':
            one.kind = one.letter == 'S' || length == "l" ? passed_as::wide_text : passed_as::text;
            one.letter = 's';
            return length.empty() || length == "l";
        case 'p': one.kind = passed_as::pointer; return length.empty();
        case 'n': one.kind = passed_as::pointer; return true;
        default: return false;
        }
    }

    static bool settle_integer(conversion &one, const std::string &length)
    {
        if (length.empty() || length == "h" || length == "hh") {
            one.narrow = std::string_view("hh").substr(0, length.size());
            return true;
        }
        if (length == "ll" || length == "q" || length == "L") {
            one.kind = passed_as::long_long;
            return true;
        }
        one.kind = passed_as::long_integer;
        return length == "l" || length == "j" || length == "z" || length == "t" || length == "Z";
    }

    // Gives a conversion its insert: the one at `position`, else the next. A text uses the one way or the
    // other, and an insert is passed in one way only.
    bool name_insert(std::optional<int> position, passed_as kind, std::optional<size_t> &insert)
    {
        if (positions_used_.value_or(position.has_value()) != position.has_value()) return false;
        positions_used_ = position.has_value();
        if (position && (*position < 1 || *position > most_positions)) return false;
        const size_t index = position ? static_cast<size_t>(*position) - 1 : named_.size();
        if (index >= named_.size()) named_.resize(index + 1);
        if (named_[index].value_or(kind) != kind) return false;
        named_[index] = kind;
        insert = index;
        return true;
    }

    bool at_digit() const { return at_ < text_.size() && text_[at_] >= '0' && text_[at_] <= '9'; }

    bool take(char character)
    {
        if (at_ == text_.size() || text_[at_] != character) return false;
        ++at_;
        return true;
    }

    std::string_view text_;
    size_t at_ = 0;
    std::optional<bool> positions_used_;
    std::vector<std::optional<passed_as>> named_;
    text_conversions found_;
};
} // namespace

cu_error_arg_type_t recorded_type(passed_as kind)
{
    switch (kind) {
    case passed_as::integer: return CU_ERROR_ARG_INT;
    case passed_as::long_integer: return CU_ERROR_ARG_LONG;
    case passed_as::long_long: return CU_ERROR_ARG_LONG_LONG;
    case passed_as::floating:
    case passed_as::long_double: return CU_ERROR_ARG_DOUBLE;
    case passed_as::text:
    case passed_as::wide_text: return CU_ERROR_ARG_CHAR_STR;
    case passed_as::pointer: break;
    }
    return CU_ERROR_ARG_VOID_PTR;
}

text_conversions find_conversions(std::string_view text) { return conversion_reader(text).read_all(); }
} // namespace qn::cu
