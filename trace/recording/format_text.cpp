// Done here, in one pass: literal text, %%, and %d %i %u %o %x %X %c %s %p, with a length modifier, a width and the flags
// - and 0. A format with anything else, and a text that may not fit, is left to vsnprintf(), from the start: up to there
// nothing but the buffer has changed.
#include "trace/recording/format_text.h"

#include <bit>
#include <climits>
#include <cstdint>
#include <cstdio>
#include <cstring>

namespace
{
static_assert(sizeof(long) == 8 && sizeof(size_t) == 8 && sizeof(intmax_t) == 8 && sizeof(ptrdiff_t) == 8,
              "l, ll, z, j and t say one and the same");

constexpr size_t longest_short_text = 16; // what a loop copies in less time than calls of the C library take
constexpr size_t longest_number = 22;     // 64 bits in octal

constexpr const char *lower_case = "0123456789abcdef";
constexpr const char *upper_case = "0123456789ABCDEF";

// Two digits a step, which halves the divisions.
constexpr const char *digit_pairs = "00010203040506070809101112131415161718192021222324252627282930313233343536373839"
                                    "40414243444546474849505152535455565758596061626364656667686970717273747576777879"
                                    "8081828384858687888990919293949596979899";

// The functions that put something return the end of it.

char *put_digit_pair(char *to, uint64_t value)
{
    std::memcpy(to, digit_pairs + value * 2, 2);
    return to + 2;
}

char *put_below_100(char *to, uint64_t value)
{
    if (value > 9) return put_digit_pair(to, value);
    *to = static_cast<char>('0' + value);
    return to + 1;
}

[[gnu::noinline]] char *put_four_digits_more(char *to, uint64_t value);

[[gnu::noinline]] char *put_decimal(char *to, uint64_t value)
{
    if (value < 100) return put_below_100(to, value);
    if (value < 10000) {
        const auto few = static_cast<unsigned>(value);
        return put_digit_pair(put_below_100(to, few / 100), few % 100);
    }
    return put_four_digits_more(to, value);
}

char *put_four_digits_more(char *to, uint64_t value)
{
    to = put_decimal(to, value / 10000);
    const auto last = static_cast<unsigned>(value % 10000);
    return put_digit_pair(put_digit_pair(to, last / 100), last % 100);
}

char *put_signed(char *to, int64_t value)
{
    if (value >= 0) return put_decimal(to, static_cast<uint64_t>(value));
    *to = '-';
    return put_decimal(to + 1, -static_cast<uint64_t>(value));
}

// In base 8 or 16: 3 or 4 bits a digit.
char *put_bits(char *to, uint64_t value, unsigned bits, const char *digits)
{
    char *const end = to + (std::bit_width(value | 1) + bits - 1) / bits;
    for (char *place = end; place != to; value >>= bits) *--place = digits[value & ((1U << bits) - 1)];
    return end;
}

// Null: it does not fit.
char *put_string(char *to, const char *end, const char *string)
{
    const size_t length = std::strlen(string);
    if (length > static_cast<size_t>(end - to)) return nullptr;
    return static_cast<char *>(mempcpy(to, string, length));
}

// Kept in a structure, so that whoever gets a reference to it can take the next one.
struct argument_reader {
    va_list list;
};

// A conversion and what stands between it and its %.
struct field {
    bool left = false;
    bool zeros = false;
    size_t width = 0;
    unsigned unused_bits = 32; // of an integer's 64
    char conversion = '\0';
};

// Returns what stands behind the conversion; null: vsnprintf() is to judge it.
const char *read_field(const char *from, size_t room, field &to)
{
    for (; *from == '-' || *from == '0'; ++from) (*from == '-' ? to.left : to.zeros) = true;
    for (; *from >= '0' && *from <= '9'; ++from) {
        to.width = to.width * 10 + static_cast<size_t>(*from - '0');
        if (to.width > room) return nullptr;
    }
    const bool modified = *from == 'h' || *from == 'l' || *from == 'j' || *from == 'z' || *from == 't';
    if (modified) {
        const bool twice = from[0] == from[1] && (*from == 'h' || *from == 'l');
        if (*from == 'h')
            to.unused_bits = twice ? 56 : 48;
        else
            to.unused_bits = 0;
        from += twice ? 2 : 1;
    }
    to.conversion = *from;
    switch (to.conversion) {
    case 'd':
    case 'i':
    case 'u':
    case 'o':
    case 'x':
    case 'X': return from + 1;
    case 'c':
    case 's':
    case 'p': return modified || to.zeros ? nullptr : from + 1; // not theirs
    default: return nullptr;
    }
}

char *pad(char *from, char *end, const field &as)
{
    const size_t missing = as.width - static_cast<size_t>(end - from);
    if (as.left) {
        std::memset(end, ' ', missing);
    } else {
        if (as.zeros && *from == '-') ++from;
        std::memmove(from + missing, from, static_cast<size_t>(end - from));
        std::memset(from, as.zeros ? '0' : ' ', missing);
    }
    return end + missing;
}

// Puts a field, of which `format` is what stands behind the %, and moves `format` behind the conversion. Null: it is for
// vsnprintf().
char *put_field(char *to, const char *limit, const char *&format, argument_reader &arguments)
{
    field as;
    format = read_field(format, static_cast<size_t>(limit - to), as);
    if (format == nullptr) return nullptr;
    char *end = to;
    if (as.conversion == 's') {
        const char *string = va_arg(arguments.list, const char *);
        end = string == nullptr ? nullptr : put_string(to, limit, string);
        if (end == nullptr) return nullptr;
    } else if (as.conversion == 'p') {
        const void *pointer = va_arg(arguments.list, const void *);
        if (pointer == nullptr) return nullptr;
        std::memcpy(to, "0x", 2);
        end = put_bits(to + 2, reinterpret_cast<uintptr_t>(pointer), 4, lower_case);
    } else {
        const uint64_t argument =
            as.unused_bits == 0 ? va_arg(arguments.list, unsigned long) : va_arg(arguments.list, unsigned);
        const uint64_t value = argument << as.unused_bits >> as.unused_bits;
        switch (as.conversion) {
        case 'u': end = put_decimal(to, value); break;
        case 'o': end = put_bits(to, value, 3, lower_case); break;
        case 'x': end = put_bits(to, value, 4, lower_case); break;
        case 'X': end = put_bits(to, value, 4, upper_case); break;
        case 'c':
            *end++ = static_cast<char>(value);
            if (*to == '\0') return nullptr;
            break;
        default: end = put_signed(to, static_cast<int64_t>(argument << as.unused_bits) >> as.unused_bits); // d or i
        }
    }
    return static_cast<size_t>(end - to) < as.width ? pad(to, end, as) : end;
}

// Puts a conversion, of which `format` is what stands behind the %, and moves `format` behind it. Null: it is for
// vsnprintf(). Some come as they are here, without flags and width.
[[gnu::noinline]] char *put_conversion(char *to, const char *limit, const char *&format, argument_reader &arguments)
{
    if (format[0] == '%') {
        *to++ = '%';
        ++format;
    } else if (format[0] == 'x') {
        to = put_bits(to, va_arg(arguments.list, unsigned), 4, lower_case);
        ++format;
    } else if (format[0] == 'l' && format[1] == 'd') {
        to = put_signed(to, va_arg(arguments.list, long));
        format += 2;
    } else if (format[0] == 'l' && format[1] == 'u') {
        to = put_decimal(to, va_arg(arguments.list, unsigned long));
        format += 2;
    } else {
        to = put_field(to, limit, format, arguments);
    }
    return to;
}

// Puts the text and its terminator, which stands at `limit` at the latest. Returns the terminator's place; null: the
// format, or so long a text, is for vsnprintf(). A text made here has no NUL inside.
inline char *put_text(char *to, char *limit, const char *format, argument_reader &arguments)
{
    // Where a short literal text and a number still fit. Others see to their room.
    const char *const last = limit - longest_short_text - longest_number;
    while (to <= last) {
        size_t length = 0;
        char c = 0;
        while ((c = format[length]) != '%' && c != '\0') {
            if (length == longest_short_text) [[unlikely]] {
                length = static_cast<size_t>(strchrnul(format, '%') - format);
                if (length > static_cast<size_t>(limit - longest_number - to)) return nullptr;
                std::memcpy(to, format, length);
                c = format[length];
                break;
            }
            to[length++] = c;
        }
        to += length;
        format += length;
        if (c == '\0') {
            *to = '\0';
            return to;
        }
        const char conversion = format[1];
        if (conversion == 'd') [[likely]] {
            to = put_signed(to, va_arg(arguments.list, int));
            format += 2;
        } else if (conversion == 's') {
            const char *string = va_arg(arguments.list, const char *);
            if (string == nullptr) return nullptr;
            to = put_string(to, limit, string);
            if (to == nullptr) return nullptr;
            format += 2;
        } else if (conversion == 'u') {
            to = put_decimal(to, va_arg(arguments.list, unsigned));
            format += 2;
        } else {
            const char *behind = format + 1; // so that the address of `format` is not taken
            to = put_conversion(to, limit, behind, arguments);
            if (to == nullptr) return nullptr;
            format = behind;
        }
    }
    return nullptr;
}
} // namespace

namespace qn::tr
{
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral" // the exported calls check the client's format
made_text format_text(char *to, size_t size, const char *format, va_list args)
{
    if (size > longest_short_text + longest_number && size <= INT_MAX) {
        argument_reader copy;
        va_copy(copy.list, args);
        const char *const end = put_text(to, to + size - 1, format, copy);
        va_end(copy.list);
        if (end != nullptr) return {static_cast<int>(end - to), static_cast<size_t>(end - to)};
    }
    const int result = std::vsnprintf(to, size, format, args);
    return {result, result >= 0 && size != 0 ? std::strlen(to) : 0};
}
#pragma GCC diagnostic pop
} // namespace qn::tr
