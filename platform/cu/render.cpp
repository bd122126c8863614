// Filling the inserts of an error record into a text. Pure functions, no state.
#include "platform/cu/render.h"

#include <algorithm>
#include <climits>
#include <cstdio>
#include <cstring>
#include <cwchar>

namespace qn::cu
{
namespace
{
using insert_span = std::span<const cu_error_arg_t>;

bool insert_fits(std::optional<size_t> insert, cu_error_arg_type_t type, insert_span inserts)
{
    return !insert || (*insert < inserts.size() && inserts[*insert].cu_arg_type == type);
}

bool conversion_fits(const conversion &one, insert_span inserts)
{
    return insert_fits(one.insert, recorded_type(one.kind), inserts) &&
           insert_fits(one.width.insert, CU_ERROR_ARG_INT, inserts) &&
           insert_fits(one.precision.insert, CU_ERROR_ARG_INT, inserts);
}

// Width and precision as they hold for one conversion, whether written in the text or taken from an insert.
struct layout {
    std::string flags;
    size_t width = 0;
    std::optional<size_t> precision;
    bool left() const { return flags.find('-') != std::string::npos; }
};

std::optional<int> value_of(const extent &found, insert_span inserts)
{
    return found.insert ? inserts[*found.insert].cu_arg_value.cu_int : found.number;
}

layout layout_of(const conversion &one, insert_span inserts)
{
    layout found{.flags = one.flags, .width = 0, .precision = {}};
    int width = value_of(one.width, inserts).value_or(0);
    if (width < 0) {
        found.flags += '-';
        width = width == INT_MIN ? INT_MAX : -width;
    }
    found.width = static_cast<size_t>(std::min(width, widest_conversion));
    const std::optional<int> precision = value_of(one.precision, inserts);
    if (precision && *precision >= 0) found.precision = static_cast<size_t>(*precision);
    return found;
}

void append_padded(std::string &out, const layout &how, std::string_view text)
{
    const size_t padding = how.width > text.size() ? how.width - text.size() : 0;
    if (!how.left()) out.append(padding, ' ');
    out.append(text);
    if (how.left()) out.append(padding, ' ');
}

// How many of the first `most` bytes belong to characters that end in them. In the locale of the process; a byte that
// has no meaning in it counts as a character.
size_t whole_characters(const char *text, size_t most)
{
    size_t done = 0;
    while (done < most && text[done] != '\0') {
        std::mbstate_t state{};
        const size_t found = std::mbrlen(text + done, strnlen(text + done, MB_LEN_MAX), &state);
        const size_t bytes = found <= MB_LEN_MAX ? found : 1;
        if (bytes > most - done) break;
        done += bytes;
    }
    return done;
}

// A precision counts bytes; what was wide text is cut between its characters.
size_t bytes_to_show(const char *text, std::optional<size_t> precision, passed_as kind)
{
    if (!precision) return std::strlen(text);
    return kind == passed_as::wide_text ? whole_characters(text, *precision) : strnlen(text, *precision);
}

void append_string(std::string &out, const layout &how, passed_as kind, const char *text)
{
    if (text == nullptr) text = "(null)";
    append_padded(out, how, {text, bytes_to_show(text, how.precision, kind)});
}

void append_character(std::string &out, const layout &how, const conversion &one, int character)
{
    char bytes[MB_LEN_MAX] = {static_cast<char>(character)};
    size_t length = character != 0 ? 1 : 0; // a NUL would end the message
    if (one.wide && character != 0) {
        std::mbstate_t state{};
        length = std::wcrtomb(bytes, static_cast<wchar_t>(character), &state);
        if (length == static_cast<size_t>(-1)) length = 0;
    }
    append_padded(out, how, {bytes, length});
}

// The format is built of checked parts for exactly this type of value, which the compiler cannot see.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
template <typename value_type>
void append_value(std::string &out, const layout &how, std::string_view length, char letter, value_type value)
{
    std::string format = "%" + how.flags;
    if (how.width > 0) format += std::to_string(how.width);
    if (how.precision) format += "." + std::to_string(std::min(*how.precision, size_t{widest_conversion}));
    format += length;
    format += letter;
    const int bytes = std::snprintf(nullptr, 0, format.c_str(), value);
    if (bytes <= 0) return;
    const size_t before = out.size();
    out.resize(before + static_cast<size_t>(bytes) + 1); // snprintf ends it with a NUL
    std::snprintf(out.data() + before, static_cast<size_t>(bytes) + 1, format.c_str(), value);
    out.pop_back();
}
#pragma GCC diagnostic pop

void append_pointer(std::string &out, const layout &how, const void *pointer)
{
    const layout plain{.flags = how.left() ? "-" : "", .width = how.width, .precision = {}};
    append_value(out, plain, "", 'p', pointer);
}

void append_conversion(std::string &out, const conversion &one, insert_span inserts)
{
    if (one.letter == '%') {
        out += '%';
        return;
    }
    if (one.letter == 'n') return; // would store; there is nothing to show
    const layout how = layout_of(one, inserts);
    const auto &value = inserts[*one.insert].cu_arg_value;
    switch (recorded_type(one.kind)) {
    case CU_ERROR_ARG_INT:
        if (one.letter == 'c') return append_character(out, how, one, value.cu_int);
        return append_value(out, how, one.narrow, one.letter, value.cu_int);
    case CU_ERROR_ARG_LONG: return append_value(out, how, "l", one.letter, value.cu_long);
    case CU_ERROR_ARG_LONG_LONG: return append_value(out, how, "ll", one.letter, value.cu_long_long);
    case CU_ERROR_ARG_DOUBLE: return append_value(out, how, "", one.letter, value.cu_double);
    case CU_ERROR_ARG_CHAR_STR: return append_string(out, how, one.kind, value.cu_char_str);
    case CU_ERROR_ARG_VOID_PTR: return append_pointer(out, how, value.cu_void_ptr);
    case CU_ERROR_ARG_RESERVED: return;
    }
}
} // namespace

bool conversions_fit(const text_conversions &conversions, insert_span inserts)
{
    return conversions.understood && std::all_of(conversions.list.begin(), conversions.list.end(),
                                                 [&](const conversion &one) { return conversion_fits(one, inserts); });
}

std::string fill_in(std::string_view text, const text_conversions &conversions, insert_span inserts)
{
    std::string out;
    size_t done = 0;
    for (const conversion &one : conversions.list) {
        out.append(text.substr(done, one.begin - done));
        if (conversion_fits(one, inserts)) {
            append_conversion(out, one, inserts);
        } else {
            out.append(text.substr(one.begin, one.end - one.begin));
        }
        done = one.end;
    }
    return out.append(text.substr(done));
}
} // namespace qn::cu
