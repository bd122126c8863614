#include "reader/manual/manual_page.h"

#include <algorithm>
#include <filesystem>
#include <ostream>
#include <regex>
#include <sstream>
#include <string_view>

#include "reader/program.h"

namespace qn::test
{
namespace
{

void replace_all(std::string &text, std::string_view part, std::string_view by)
{
    for (auto at = text.find(part); at != std::string::npos; at = text.find(part, at + by.size()))
        text.replace(at, part.size(), by);
}

std::string without_escapes(std::string text)
{
    replace_all(text, "\\(dq", "\"");
    replace_all(text, "\\(rs", "\\");
    replace_all(text, "\\-", "-");
    replace_all(text, "\\&", "");
    replace_all(text, "\\e", "\\");
    return text;
}

std::vector<std::string> lines_of(const std::string &text)
{
    std::vector<std::string> lines;
    std::istringstream in(text);
    for (std::string line; std::getline(in, line);) lines.push_back(line);
    return lines;
}

// What stands behind the prompt of a line .RB "$ " "command", or nothing.
std::string behind(const std::string &prompt, const std::string &line)
{
    const std::string begin = ".RB \"" + prompt + " \" \"";
    if (!line.starts_with(begin) || !line.ends_with('"')) return {};
    return line.substr(begin.size(), line.size() - begin.size() - 1);
}

bool matches(std::vector<std::string>::const_iterator shown, std::vector<std::string>::const_iterator shown_end,
             std::vector<std::string>::const_iterator line, std::vector<std::string>::const_iterator line_end)
{
    for (; shown != shown_end; ++shown, ++line) {
        if (*shown == "...") {
            for (auto rest = line;; ++rest) {
                if (matches(shown + 1, shown_end, rest, line_end)) return true;
                if (rest == line_end) return false;
            }
        }
        if (line == line_end || *shown != *line) return false;
    }
    return line == line_end;
}

} // namespace

std::string manual_page::command() const
{
    const std::string prefix = "qntrace-";
    return name.starts_with(prefix) ? name.substr(prefix.size()) : "";
}

std::vector<manual_example> manual_page::examples() const
{
    std::vector<manual_example> found;
    bool in_example = false;
    for (const auto &line : lines_of(text)) {
        if (line == ".EX" || line == ".EE") {
            in_example = false;
        } else if (const auto command = behind("$", line); !command.empty()) {
            in_example = true;
            found.push_back({command, ""});
        } else if (const auto more = behind(">", line); in_example && !more.empty()) {
            found.back().command += "\n" + more;
        } else if (in_example) {
            found.back().shown += line + "\n";
        }
    }
    return found;
}

std::set<std::string> manual_page::options() const { return long_options(text); }

std::set<std::string> manual_page::options_in(const std::vector<std::string> &sections) const
{
    std::string part;
    bool wanted = false;
    for (const auto &line : lines_of(text)) {
        if (line.starts_with(".SH "))
            wanted = std::find(sections.begin(), sections.end(), line.substr(4)) != sections.end();
        else if (wanted)
            part += line + "\n";
    }
    return long_options(part);
}

void PrintTo(const manual_page &page, std::ostream *out) { *out << page.name; }

std::vector<manual_page> manual_pages()
{
    std::vector<manual_page> pages;
    for (const auto &entry : std::filesystem::directory_iterator(MAN_FOLDER)) {
        if (entry.path().extension() != ".1") continue;
        pages.push_back({entry.path().stem(), entry.path(), without_escapes(contents_of(entry.path()))});
    }
    std::sort(pages.begin(), pages.end(),
              [](const manual_page &left, const manual_page &right) { return left.name < right.name; });
    return pages;
}

std::set<std::string> long_options(const std::string &text)
{
    static const std::regex option("--[a-z][-a-z]*");
    return {std::sregex_token_iterator(text.begin(), text.end(), option), std::sregex_token_iterator()};
}

bool is_shown(const std::string &shown, const std::string &printed)
{
    const auto expected = lines_of(shown);
    const auto lines = lines_of(printed);
    return matches(expected.begin(), expected.end(), lines.begin(), lines.end());
}

} // namespace qn::test
