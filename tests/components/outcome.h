// What a control call returned beside what it left in the error record, compared in one piece.
#pragma once

#include <ostream>
#include <string>

#include "support/last_error.h"

namespace qn::test
{
struct outcome {
    int status = 0;
    int code = 0;
    int message_number = 0;
    std::string text;

    bool operator==(const outcome &) const = default;
};

inline std::ostream &operator<<(std::ostream &out, const outcome &seen)
{
    return out << "status " << seen.status << ", error " << seen.code << ", message " << seen.message_number << " \""
               << seen.text << '"';
}

// To be called right behind the call that gave the status.
inline outcome after(qn_int32_t status)
{
    const error_seen error = last_error();
    if (error.code == 0) return {status, 0, 0, ""};
    return {status, error.code, error.message_number, error.text};
}

inline outcome success() { return {}; }

inline outcome failure(int code, int message_number, const std::string &text)
{
    return {code, code, message_number, text};
}

inline outcome lock_failure(int lock_result)
{
    return failure(
        9, 9, "2625-008 Internal error. Not able to obtain mutex lock, error=" + std::to_string(lock_result) + ".\n");
}

inline outcome no_memory() { return failure(14, 14, "2625-013 Memory allocation failed.\n"); }

// A file in a folder that does not exist.
inline outcome no_such_file() { return failure(18, 18, "2625-017 Error 2 opening trace file.\n"); }

// A syntax error of a level, map or size specification, at an offset counted from 0.
inline outcome syntax_error(int code, int offset)
{
    const char *what = "";
    const char *label = "";
    switch (code) {
    case 10: label = "2625-009", what = "component identifier expected"; break;
    case 11: label = "2625-010", what = "separator ':' expected"; break;
    case 12: label = "2625-011", what = "category name expected"; break;
    case 13: label = "2625-012", what = "detail level value expected"; break;
    case 15: label = "2625-014", what = "component id is not a valid regular expression"; break;
    case 16: label = "2625-015", what = "category is not a valid regular expression"; break;
    default: break;
    }
    return failure(code, code,
                   std::string(label) + " Syntax error in trace specification at offset " + std::to_string(offset) +
                       ", " + what + ".\n");
}
} // namespace qn::test
