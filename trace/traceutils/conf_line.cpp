// Reading lines of the configuration file and telling comments, section headers and pairs apart. No lock.
#include "trace/traceutils/conf_line.h"

#include <cctype>

#include "trace/files/error_report.h"

namespace qn::tr
{
namespace
{
// In the order of the codes for one that does not compile: 42, 43, 44.
constexpr const char *texts[] = {
    "^(.+):.*$",
    "^[ \t]*([-_a-zA-Z]+)[ \t]*=[ \t]*([-_a-zA-Z0-9/*.]+[$]*)[ \t]*$",
    "^.*#.*",
};
enum { header_pattern, pair_pattern, comment_pattern };
constexpr qn_int32_t first_pattern_code = 42;

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

conf_patterns::~conf_patterns()
{
    while (count_ > 0) regfree(&compiled_[--count_]);
}

qn_int32_t conf_patterns::compile()
{
    for (const char *text : texts) {
        if (regcomp(&compiled_[count_], text, REG_EXTENDED | REG_ICASE | REG_NEWLINE) != 0)
            return first_pattern_code + count_;
        ++count_;
    }
    return 0;
}

// A pair has no ":" and so is never a header.
qn_int32_t conf_patterns::classify(const char *text, conf_line &line) const
{
    regmatch_t match[3];
    line = {.text = text};
    int result = regexec(&compiled_[comment_pattern], text, 0, nullptr, 0);
    if (result == 0) {
        line.type = conf_line_type::comment;
        return 0;
    }
    if (result == REG_NOMATCH) result = regexec(&compiled_[pair_pattern], text, 3, match, 0);
    if (result == 0) {
        line.type = conf_line_type::pair;
        line.key = part(text, match[1]);
        line.value = part(text, match[2]);
        return 0;
    }
    if (result == REG_NOMATCH) result = regexec(&compiled_[header_pattern], text, 2, match, 0);
    if (result == 0) {
        line.type = conf_line_type::header;
        line.name = part(text, match[1]);
        return 0;
    }
    return result == REG_NOMATCH ? 0 : set_error(QN_TR_ENOMEM, 14);
}
} // namespace qn::tr
