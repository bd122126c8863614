// The folders and files of an export that keeps the sources apart, as a spool directory does:
//
//   cluster / host / node id / program / ...
//
// All levels are always there, "unknown" where nothing tells; so a pattern of fixed depth names the same thing in every
// export. Names come from traces and may be anything: what is not harmless in a file name is written as %XX, so that
// nothing is ever written outside the tree, hidden, or mistaken for a pattern.
#pragma once

#include <map>
#include <set>
#include <string>
#include <string_view>

#include "tools/qntrace/traces/trace_set.h"

namespace qn::dump
{

// A single name of at most 200 characters; of longer ones the beginning.
std::string safe_name(std::string_view name);

// The folders of a source, with a '/' between them.
std::string folder_of(const trace_source &source);

class export_tree
{
public:
    explicit export_tree(std::string root) : root_(std::move(root)) {}

    // Makes the folders, and gives a path below the root that was not given before: FOLDER/NAMESUFFIX, or with a number
    // before the suffix.
    std::string add(const std::string &folder, std::string_view name, std::string_view suffix);
    std::string whole(const std::string &path) const { return root_ + "/" + path; }

private:
    std::string root_;
    std::set<std::string> given_;
    std::map<std::string, unsigned> numbers_; // of paths that were asked for again, the last one
};

} // namespace qn::dump
