// The seed corpora of the reader's fuzz targets, through the targets' own entry functions. These end the program at an
// input with which something is not as it should be, so reaching the end is the test.
#include <cstdint>
#include <filesystem>

#include <gtest/gtest.h>

#include "reader/program.h"

extern "C" {
int fuzz_reader(const uint8_t *data, size_t size);
int fuzz_where(const uint8_t *data, size_t size);
}

namespace qn::test
{
namespace
{

void run_corpus(const char *name, int (*target)(const uint8_t *, size_t))
{
    size_t files = 0;
    for (const auto &entry : std::filesystem::directory_iterator(std::filesystem::path(QN_FUZZ_CORPUS) / name)) {
        const std::string bytes = contents_of(entry.path());
        EXPECT_EQ(target(reinterpret_cast<const uint8_t *>(bytes.data()), bytes.size()), 0) << entry.path();
        ++files;
    }
    EXPECT_GE(files, 10U) << "the seed corpus of " << name << " was not found";
}

TEST(ReaderFuzzCorpus, TraceFilesRunClean) { run_corpus("reader", fuzz_reader); }
TEST(ReaderFuzzCorpus, FilterExpressionsRunClean) { run_corpus("where", fuzz_where); }

} // namespace
} // namespace qn::test
