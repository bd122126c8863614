// Text out of a trace file, made safe to print.
//
// Whatever stands in a file may have been put there to harm the terminal of its reader. So only characters that print
// themselves are passed; everything else is written as an escape that tells its bytes.
#pragma once

#include <string>
#include <string_view>

namespace qn::dump
{

// Which characters beyond ASCII may be printed as they are.
enum class charset {
    ascii, // none
    utf_8, // well-formed UTF-8 that is visible and does not turn the direction of the text
};

// The charset of the user's locale. Call setlocale() first.
charset locale_charset();

// Appends `text` with \n, \r, \t, \\ and \xNN for what may not be printed, and \" when it stands in quotes.
void append_escaped(std::string &out, std::string_view text, charset printable);
void append_quoted(std::string &out, std::string_view text, charset printable);

// The length of the well-formed UTF-8 character that `text` begins with; 0 when there is none.
std::size_t utf_8_length(std::string_view text);
bool is_utf_8(std::string_view text);

} // namespace qn::dump
