// Finding the printf conversions of a message text. Pure functions, no state.
//
// What the parts of a text mean is settled here once; recording reads the inserts by it (inserts.h), and so
// does the filling in of any text, a catalogue's too (render.h). A text is never handed to printf whole.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include <qn_cu.h>

namespace qn::cu
{
constexpr int most_positions = 64;      // "%64$d" is the last position that counts
constexpr int widest_conversion = 4095; // a larger width, or precision of a number, counts as this one

// How an insert is passed through the variable argument list.
enum class passed_as { integer, long_integer, long_long, floating, long_double, text, wide_text, pointer };

// What it is in an error record.
cu_error_arg_type_t recorded_type(passed_as kind);

// A width or a precision: a number, or the number of the insert that holds it.
struct extent {
    std::optional<int> number;
    std::optional<size_t> insert;
};

// One "%..." of a text.
struct conversion {
    size_t begin = 0; // of the '%'
    size_t end = 0;   // behind its letter
    std::string flags;
    extent width;
    extent precision;
    std::string_view narrow; // "hh", "h" or nothing
    bool wide = false;       // %lc: the integer is a wide character
    char letter = '%';
    std::optional<size_t> insert; // which insert it shows; none for "%%"
    passed_as kind = passed_as::integer;
};

// An insert that a text takes, whether it shows it once, more often or never.
struct named_insert {
    passed_as kind;
    std::vector<extent> precisions; // of a string: that of each conversion that shows it, none included
};

struct text_conversions {
    std::vector<conversion> list;
    std::vector<named_insert> inserts; // in argument order
    bool understood = true;            // false: there is a '%' that makes no sense; the list ends before it
};

text_conversions find_conversions(std::string_view text);
} // namespace qn::cu
