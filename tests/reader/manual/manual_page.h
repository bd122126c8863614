// A manual page of qntrace as the tests see it: its examples and the options that it describes.
#pragma once

#include <iosfwd>
#include <set>
#include <string>
#include <vector>

namespace qn::test
{

// One command of an example, possibly of several lines, and what the page says that it prints.
struct manual_example {
    std::string command;
    std::string shown; // empty: the page does not say; a line "..." stands for any lines
};

struct manual_page {
    std::string name; // qntrace or qntrace-COMMAND
    std::string path;
    std::string text; // the page's source with its escapes undone

    // Of a page of its own; empty for that of qntrace itself.
    std::string command() const;
    std::vector<manual_example> examples() const;
    // The long options in a part of the page: all of it, or the sections of these names.
    std::set<std::string> options() const;
    std::set<std::string> options_in(const std::vector<std::string> &sections) const;
};

// How a test's parameter is printed.
void PrintTo(const manual_page &page, std::ostream *out);

std::vector<manual_page> manual_pages(); // by name

std::set<std::string> long_options(const std::string &text);
// Whether `shown` is what was printed, its lines "..." standing for any lines.
bool is_shown(const std::string &shown, const std::string &printed);

} // namespace qn::test
