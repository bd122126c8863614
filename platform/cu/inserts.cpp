// Reading the inserts of a message from a variable argument list. Pure functions, no state.
#include "platform/cu/inserts.h"

#include <algorithm>
#include <climits>
#include <cstdint>
#include <cstring>
#include <cwchar>
#include <optional>

namespace qn::cu
{
namespace
{
// At most `most` bytes, and never a part of a character. In the locale of the process; a string with a character that
// this locale does not have gives "".
std::string narrow(const wchar_t *wide, size_t most)
{
    std::string text;
    std::mbstate_t state{};
    for (; text.size() < most && *wide != L'\0'; ++wide) {
        char bytes[MB_LEN_MAX];
        const size_t length = std::wcrtomb(bytes, *wide, &state);
        if (length == static_cast<size_t>(-1)) return {};
        if (length > most - text.size()) break;
        text.append(bytes, length);
    }
    return text;
}

// How much of a string the conversions show that it is for; nothing when it is all of it.
std::optional<size_t> bytes_shown(const named_insert &string, const std::vector<cu_error_arg_t> &args)
{
    int most = 0;
    for (const extent &precision : string.precisions) {
        const int bytes =
            precision.insert ? args[*precision.insert].cu_arg_value.cu_int : precision.number.value_or(-1);
        if (bytes < 0) return std::nullopt;
        most = std::max(most, bytes);
    }
    return static_cast<size_t>(most);
}

// A string that is shown in part may go on behind that part without an end.
char *settled_text(char *text, std::optional<size_t> most, std::deque<std::string> &texts)
{
    if (text == nullptr || !most) return text;
    return texts.emplace_back(text, strnlen(text, *most)).data();
}

char *settled_wide_text(const void *wide, std::optional<size_t> most, std::deque<std::string> &texts)
{
    if (wide == nullptr) return nullptr;
    return texts.emplace_back(narrow(static_cast<const wchar_t *>(wide), most.value_or(SIZE_MAX))).data();
}

// An insert with nothing in it, the unused bytes of the union included: they are recorded as they are.
cu_error_arg_t empty_insert(passed_as kind)
{
    cu_error_arg_t insert;
    std::memset(&insert, 0, sizeof insert);
    insert.cu_arg_type = recorded_type(kind);
    return insert;
}

// Strings are copied only now: the precision of one may be an argument behind it.
void settle_strings(std::span<const named_insert> named, insert_list &inserts)
{
    for (size_t i = 0; i < named.size(); ++i) {
        auto &value = inserts.args[i].cu_arg_value;
        if (named[i].kind == passed_as::text) {
            value.cu_char_str = settled_text(value.cu_char_str, bytes_shown(named[i], inserts.args), inserts.texts);
        } else if (named[i].kind == passed_as::wide_text) {
            value.cu_char_str =
                settled_wide_text(value.cu_void_ptr, bytes_shown(named[i], inserts.args), inserts.texts);
        }
    }
}
} // namespace

void read_inserts(std::span<const named_insert> named, va_list arguments, insert_list &inserts)
{
    inserts.args.clear();
    inserts.texts.clear();
    for (const named_insert &one : named) {
        cu_error_arg_t insert = empty_insert(one.kind);
        auto &value = insert.cu_arg_value;
        switch (one.kind) {
        case passed_as::integer: value.cu_int = va_arg(arguments, int); break;
        case passed_as::long_integer: value.cu_long = va_arg(arguments, long); break;
        case passed_as::long_long: value.cu_long_long = va_arg(arguments, long long); break;
        case passed_as::floating: value.cu_double = va_arg(arguments, double); break;
        case passed_as::long_double: value.cu_double = static_cast<double>(va_arg(arguments, long double)); break;
        case passed_as::text: value.cu_char_str = va_arg(arguments, char *); break;
        case passed_as::wide_text: value.cu_void_ptr = va_arg(arguments, wchar_t *); break;
        case passed_as::pointer: value.cu_void_ptr = va_arg(arguments, void *); break;
        }
        inserts.args.push_back(insert);
    }
    settle_strings(named, inserts);
}
} // namespace qn::cu
