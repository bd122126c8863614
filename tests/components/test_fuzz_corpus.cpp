// The seed corpora of the fuzz targets, through the targets' own entry functions. These end the program at an input on
// which the library and the model disagree, so reaching the end is the test.
#include <cstdint>
#include <filesystem>

#include <gtest/gtest.h>

#include "support/scratch.h"

extern "C" {
int fuzz_levels(const uint8_t *data, size_t size);
int fuzz_map(const uint8_t *data, size_t size);
int fuzz_sizes(const uint8_t *data, size_t size);
int fuzz_selection(const uint8_t *data, size_t size);
}

namespace
{
void run_corpus(const char *name, int (*target)(const uint8_t *, size_t))
{
    size_t files = 0;
    for (const auto &entry : std::filesystem::directory_iterator(std::filesystem::path(QN_FUZZ_CORPUS) / name)) {
        const std::string bytes = qn::test::file_bytes(entry.path());
        EXPECT_EQ(target(reinterpret_cast<const uint8_t *>(bytes.data()), bytes.size()), 0) << entry.path();
        ++files;
    }
    EXPECT_GE(files, 10U) << "the seed corpus of " << name << " was not found";
}

TEST(FuzzCorpus, LevelsRunClean) { run_corpus("levels", fuzz_levels); }
TEST(FuzzCorpus, FileMapsRunClean) { run_corpus("map", fuzz_map); }
TEST(FuzzCorpus, FileSizesRunClean) { run_corpus("sizes", fuzz_sizes); }
TEST(FuzzCorpus, SelectionsRunClean) { run_corpus("selection", fuzz_selection); }
} // namespace
