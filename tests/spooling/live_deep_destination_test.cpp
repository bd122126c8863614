// A destination so deep that the spool directory below it would have too long a path.
#include <filesystem>
#include <iterator>

#include <gtest/gtest.h>

#include "spooling/soak_trace.h"
#include "trace/trace.h"

namespace
{
using namespace qn::test;
namespace fs = std::filesystem;

// A path of so many characters below the folder.
std::string path_of_length(const std::string &folder, size_t length)
{
    const std::string level(100, 'd');
    std::string path = folder + "/";
    while (path.size() + 2 * level.size() < length) path += level + "/";
    return path + std::string(length - path.size(), 'd');
}

class DeepDestination : public testing::TestWithParam<size_t>
{
};

TEST_P(DeepDestination, SwitchesItsSpecificationOffAndTracingWorks)
{
    const scratch folder;
    const std::string destination = path_of_length(folder.folder(), GetParam());
    ASSERT_EQ(destination.size(), GetParam());
    const soak_trace trace(8, soak_trace::usual_page_bytes, destination);
    EXPECT_EQ(anchors.pFirstSpoolSpec->onoff, 0);
    EXPECT_EQ(anchors.pFirstSpoolSpec->dir, nullptr);
    EXPECT_EQ(anchors.spool, nullptr);
    EXPECT_EQ(tr_get_spool_dir_1(trace.file().c_str()), nullptr);

    for (uint32_t number = 0; number < 100; ++number) ASSERT_EQ(write_numbered({0, 0}, number), 0);
    EXPECT_EQ(std::distance(fs::directory_iterator(trace.live_folder()), fs::directory_iterator{}), 1)
        << "a single file";
    const auto numbers = numbers_in(trace_image::of_file(trace.file()).ring());
    ASSERT_EQ(numbers.size(), 1U);
    EXPECT_EQ(numbers.begin()->second.size(), 100U);
}

// A node identifier has 16 digits, and a host and a program at least one character each.
INSTANTIATE_TEST_SUITE_P(Lengths, DeepDestination, testing::Values(4076U, 4085U, 4094U, 4095U));
} // namespace
