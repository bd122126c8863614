// A folder for one test's files; removed with everything in it when the test ends.
#pragma once

#include <string>

namespace qn::test
{
class scratch
{
public:
    scratch();
    scratch(const scratch &) = delete;
    scratch &operator=(const scratch &) = delete;
    ~scratch();

    std::string folder() const { return folder_; }
    std::string operator/(const std::string &name) const { return folder_ + "/" + name; }

private:
    std::string folder_;
};

// A file's bytes as they are on the disk; fails the test when it cannot be read.
std::string file_bytes(const std::string &name);
void write_file(const std::string &name, const std::string &bytes);
} // namespace qn::test
