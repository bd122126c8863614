// A raw configuration as values, and reading one from a text.
#pragma once

#include <ostream>
#include <string>
#include <utility>
#include <vector>

#include "trace/traceutils/traceutils.h"

namespace qn::test
{
// One chunk of a raw configuration: a comment with its text, or a section.
struct chunk_seen {
    bool comment = false;
    bool failed = false;
    std::string name;
    std::vector<std::pair<std::string, std::string>> pairs;
    std::string text; // of the comment, or what was given to the section

    bool operator==(const chunk_seen &) const = default;
};

std::ostream &operator<<(std::ostream &out, const chunk_seen &chunk);

// Where a fault was found first, and in which section.
struct fault_seen {
    unsigned line = 0;
    std::string section;

    bool operator==(const fault_seen &) const = default;
};

std::ostream &operator<<(std::ostream &out, const fault_seen &fault);

struct conf_seen {
    int status = 0;
    std::vector<chunk_seen> chunks;
    std::vector<unsigned> section_lines; // of the chunks that are sections
    std::vector<fault_seen> faults;
    std::vector<std::string> reasons; // one for each fault

    std::vector<chunk_seen> sections() const; // without the comments
};

// What expectations are written with.
using pairs = std::vector<std::pair<std::string, std::string>>;
chunk_seen comment(const std::string &text);
chunk_seen good(const std::string &name, const pairs &list, const std::string &text);
chunk_seen failed(const std::string &name, const pairs &list, const std::string &text);

std::vector<chunk_seen> chunks_of(const trace_raw_config_t &config);

// A file in memory alone.
class text_file
{
public:
    explicit text_file(const std::string &text);
    text_file(const text_file &) = delete;
    text_file &operator=(const text_file &) = delete;
    ~text_file();
    std::string name() const;

private:
    int fd_;
};

// A text, or a file, through the library's reader.
conf_seen read_conf(const std::string &text);
conf_seen read_conf_of(const std::string &file_name);

// A configuration to work on; freed with its scope.
class conf_of
{
public:
    explicit conf_of(const std::string &text);
    conf_of(const conf_of &) = delete;
    conf_of &operator=(const conf_of &) = delete;
    ~conf_of();
    trace_raw_config_t *get() const { return config_; }

private:
    trace_raw_config_t *config_ = nullptr;
};
} // namespace qn::test
