// Reading the inserts of a message from a variable argument list. Pure functions, no state.
#include "platform/cu/inserts.h"

#include <cstring>
#include <cwchar>

namespace qn::cu
{
namespace
{
// In the locale of the process; a string with a character that this locale does not have gives "".
std::string narrow(const wchar_t *wide)
{
    std::mbstate_t state{};
    const wchar_t *from = wide;
    const size_t length = std::wcsrtombs(nullptr, &from, 0, &state);
    if (length == static_cast<size_t>(-1)) return {};
    std::string text(length, '\0');
    state = {};
    std::wcsrtombs(text.data(), &from, length, &state);
    return text;
}

char *narrowed_copy(const wchar_t *wide, insert_list &inserts)
{
    if (wide == nullptr) return nullptr;
    return inserts.narrowed.emplace_back(narrow(wide)).data();
}

// An insert with nothing in it, the unused bytes of the union included: they are recorded as they are.
cu_error_arg_t empty_insert(passed_as kind)
{
    cu_error_arg_t insert;
    std::memset(&insert, 0, sizeof insert);
    insert.cu_arg_type = recorded_type(kind);
    return insert;
}
} // namespace

void read_inserts(std::span<const passed_as> kinds, va_list arguments, insert_list &inserts)
{
    inserts.args.clear();
    inserts.narrowed.clear();
    for (const passed_as kind : kinds) {
        cu_error_arg_t insert = empty_insert(kind);
        auto &value = insert.cu_arg_value;
        switch (kind) {
        case passed_as::integer: value.cu_int = va_arg(arguments, int); break;
        case passed_as::long_integer: value.cu_long = va_arg(arguments, long); break;
        case passed_as::long_long: value.cu_long_long = va_arg(arguments, long long); break;
        case passed_as::floating: value.cu_double = va_arg(arguments, double); break;
        case passed_as::long_double: value.cu_double = static_cast<double>(va_arg(arguments, long double)); break;
        case passed_as::text: value.cu_char_str = va_arg(arguments, char *); break;
        case passed_as::wide_text:
            value.cu_char_str = narrowed_copy(va_arg(arguments, const wchar_t *), inserts);
            break;
        case passed_as::pointer: value.cu_void_ptr = va_arg(arguments, void *); break;
        }
        inserts.args.push_back(insert);
    }
}
} // namespace qn::cu
