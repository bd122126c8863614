// The seed corpus of a fuzz target, through the target's own entry function. That ends the program at an input with which
// something is not as it should be, so reaching the end is the test.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

#include <gtest/gtest.h>

namespace qn::test
{
// Returns how many inputs the folder has; a corpus of fewer than ten has not been found.
inline size_t run_corpus(const std::filesystem::path &folder, int (*target)(const uint8_t *, size_t))
{
    size_t files = 0;
    for (const auto &entry : std::filesystem::directory_iterator(folder)) {
        std::ifstream file(entry.path(), std::ios::binary);
        const std::string bytes{std::istreambuf_iterator<char>(file), {}};
        EXPECT_FALSE(file.bad()) << entry.path();
        EXPECT_EQ(target(reinterpret_cast<const uint8_t *>(bytes.data()), bytes.size()), 0) << entry.path();
        ++files;
    }
    EXPECT_GE(files, 10U) << "the seed corpus in " << folder << " was not found";
    return files;
}
} // namespace qn::test
