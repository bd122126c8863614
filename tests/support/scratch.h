// A folder for one test's files; removed with everything in it when the test ends.
#pragma once

#include <string>

namespace qn::test
{
class scratch
{
public:
    scratch();
    explicit scratch(const std::string &parent);
    scratch(const scratch &) = delete;
    scratch &operator=(const scratch &) = delete;
    ~scratch();

    std::string folder() const { return folder_; }
    std::string operator/(const std::string &name) const { return folder_ + "/" + name; }

private:
    std::string folder_;
};

// A folder for scratch folders whose files are in memory, where there is one: for tests that start thousands of traces.
std::string memory_folder();

// A file's bytes as they are on the disk; fails the test when it cannot be read.
std::string file_bytes(const std::string &name);
void write_file(const std::string &name, const std::string &bytes);
} // namespace qn::test
