#include "support/scratch.h"

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>

#include <gtest/gtest.h>

namespace qn::test
{
scratch::scratch()
{
    std::string name = (std::filesystem::temp_directory_path() / "qn_tr_test_XXXXXX").string();
    if (mkdtemp(name.data()) == nullptr) std::abort();
    folder_ = name;
}

scratch::~scratch()
{
    std::error_code ignored;
    std::filesystem::remove_all(folder_, ignored);
}

std::string file_bytes(const std::string &name)
{
    std::ifstream file(name, std::ios::binary);
    EXPECT_TRUE(file.good()) << name;
    return {std::istreambuf_iterator<char>(file), {}};
}

void write_file(const std::string &name, const std::string &bytes)
{
    std::ofstream file(name, std::ios::binary | std::ios::trunc);
    file.write(bytes.data(), static_cast<std::streamsize>(bytes.size()));
    EXPECT_TRUE(file.good()) << name;
}
} // namespace qn::test
