// What the reading core finds in a file, told on standard error.
#pragma once

#include <cstdint>
#include <string>

#include "tools/qntrace/reader/finding.h"

namespace qn::dump
{

// A file's name as it may be printed.
std::string printable_name(const std::string &path);

// Tells what the reading core finds in one file. A file of rubbish may have a finding in every 28 bytes; nobody reads
// more than the first of them.
class finding_printer
{
public:
    explicit finding_printer(const std::string &path) : name_(printable_name(path)) {}

    void operator()(const reader::finding &found);
    void finish() const; // how many were not shown
    int status() const;  // status_sound or status_damaged

private:
    std::string name_;
    std::uint64_t count_ = 0;
    bool faulty_ = false; // damaged, or with a record that was not completed
};

} // namespace qn::dump
