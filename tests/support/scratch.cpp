#include "support/scratch.h"

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <unistd.h>

#include <gtest/gtest.h>

namespace qn::test
{
scratch::scratch() : scratch(std::filesystem::temp_directory_path().string()) {}

scratch::scratch(const std::string &parent)
{
    std::string name = parent + "/qn_tr_test_XXXXXX";
    if (mkdtemp(name.data()) == nullptr) std::abort();
    folder_ = name;
}

scratch::~scratch()
{
    std::error_code ignored;
    std::filesystem::remove_all(folder_, ignored);
}

std::string memory_folder()
{
    constexpr const char *in_memory = "/dev/shm";
    return access(in_memory, W_OK | X_OK) == 0 ? in_memory : std::filesystem::temp_directory_path().string();
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
