// The seed corpus of the fuzz target for existing trace files, through the target's own entry function. It ends the program
// at a file that is not sound behind a start, so reaching the end is the test.
#include <cstdint>
#include <filesystem>

#include <gtest/gtest.h>

#include "faults/campaign.h"
#include "support/scratch.h"

extern "C" int fuzz_start(const uint8_t *data, size_t size);

namespace
{
TEST(StartFuzzCorpus, ExistingFilesRunClean)
{
    size_t files = 0;
    for (const auto &entry : std::filesystem::directory_iterator(QN_FUZZ_CORPUS)) {
        const std::string bytes = qn::test::file_bytes(entry.path());
        EXPECT_EQ(fuzz_start(reinterpret_cast<const uint8_t *>(bytes.data()), bytes.size()), 0) << entry.path();
        ++files;
    }
    EXPECT_GE(files, 10U) << "the seed corpus was not found";
    qn::test::count("Damaged files are started", "executions", files);
}
} // namespace
