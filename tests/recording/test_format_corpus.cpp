// The seed corpus of the fuzz target, through the target's own entry function. That ends the program at a format of which
// the library and vsnprintf() make different texts, so reaching the end is the test.
#include <cstdint>
#include <filesystem>

#include <gtest/gtest.h>

#include "support/scratch.h"

extern "C" int fuzz_format(const uint8_t *data, size_t size);

TEST(FuzzCorpus, FormatsRunClean)
{
    size_t files = 0;
    for (const auto &entry : std::filesystem::directory_iterator(QN_FUZZ_CORPUS)) {
        const std::string bytes = qn::test::file_bytes(entry.path());
        EXPECT_EQ(fuzz_format(reinterpret_cast<const uint8_t *>(bytes.data()), bytes.size()), 0) << entry.path();
        ++files;
    }
    EXPECT_GE(files, 10U) << "the seed corpus was not found";
}
