// Reading lines of the configuration file and telling comments, section headers and pairs apart. No lock.
#include "trace/traceutils/conf_line.h"

#include <cctype>

#include "trace/files/error_report.h"

namespace qn::tr
{
namespace
{
std::string_view part(const char *text, const regmatch_t &match)
{
    return {text + match.rm_so, static_cast<size_t>(match.rm_eo - match.rm_so)};
}
} // namespace

bool conf_lines::next()
{
    if (!goes_on_) ++number_;
    size_t length = 0;
    int c = 0;
    while (c != '\n' && length < sizeof line_ - 1 && (c = getc_unlocked(file_)) != EOF)
        line_[length++] = static_cast<char>(c);
    line_[length] = '\0';
    goes_on_ = c != '\n';
    return length > 0;
}

const char *conf_lines::text() const
{
    const char *text = line_;
    while (std::isspace(static_cast<unsigned char>(*text)) != 0) ++text;
    return text;
}

qn_int32_t conf_patterns::status() const
{
    if (!header_) return 42;
    if (!pair_) return 43;
    return comment_ ? 0 : 44;
}

// A pair has no ":" and so is never a header.
qn_int32_t conf_patterns::classify(const char *text, conf_line &line) const
{
    regmatch_t match[3];
    line = {.text = text};
    int result = comment_.compare(text);
    if (result == 0) {
        line.type = conf_line_type::comment;
        return 0;
    }
    if (result == REG_NOMATCH) result = pair_.compare(text, match);
    if (result == 0) {
        line.type = conf_line_type::pair;
        line.key = part(text, match[1]);
        line.value = part(text, match[2]);
        return 0;
    }
    if (result == REG_NOMATCH) result = header_.compare(text, match);
    if (result == 0) {
        line.type = conf_line_type::header;
        line.name = part(text, match[1]);
        return 0;
    }
    return result == REG_NOMATCH ? 0 : set_error(QN_TR_ENOMEM, 14);
}
} // namespace qn::tr
