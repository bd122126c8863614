// A salvaged trace is as good as the one that was lost: the next start of the program goes on in it.
#include <fstream>

#include <gtest/gtest.h>

#include "reader/spool_directory.h"
#include "reader/trace_set_files.h"

namespace qn::test
{
namespace
{

std::vector<std::uint64_t> values_in(const std::string &path)
{
    return written_values(rows(run_qntrace({"merge", "--json", path})));
}

// The offset of the record that holds the value.
std::uint64_t place_of(const std::string &path, std::uint64_t value)
{
    for (const auto &object : rows(run_qntrace({"dump", "--json", "--raw", path})))
        if (object.value("kind", "") == "values64" && object["values"][0] == std::to_string(value))
            return object["offset"];
    ADD_FAILURE() << value << " is not there";
    return 0;
}

void destroy(const std::string &path, std::uint64_t offset)
{
    std::fstream file(path, std::ios::in | std::ios::out | std::ios::binary);
    file.seekp(static_cast<std::streamoff>(offset));
    ASSERT_TRUE(file.write("\xFF\xFF\xFF\xFF", 4).flush());
}

std::vector<std::uint64_t> numbers(std::uint64_t first, std::uint64_t end)
{
    std::vector<std::uint64_t> all;
    for (auto value = first; value < end; ++value) all.push_back(value);
    return all;
}

TEST(SalvageReuse, TheNextStartGoesOnBehindTheSalvagedRecords)
{
    const scratch_folder folder;
    const auto lost = folder.path("lost.trc");
    const auto saved = folder.path("saved.trc");
    {
        const writing_program program(lost, "", 0, 200);
    }
    destroy(lost, place_of(lost, 150));
    EXPECT_EQ(run_qntrace({"salvage", lost, "-o", saved}).status, 1);
    ASSERT_EQ(values_in(saved), numbers(0, 150));

    {
        const writing_program program(saved, "", 1000, 20);
    }
    auto expected = numbers(0, 150);
    for (const auto value : numbers(1000, 1020)) expected.push_back(value);
    EXPECT_EQ(values_in(saved), expected);
    EXPECT_EQ(run_qntrace({"check", "-q", saved}).status, 0);
}

TEST(SalvageReuse, ATraceThatWasStartedOnceMoreWrapsInASoundRing)
{
    const scratch_folder folder;
    const auto lost = folder.path("lost.trc");
    const auto saved = folder.path("saved.trc");
    {
        const writing_program program(lost, "", 0, 5000);
    } // the ring has room for some 1400
    destroy(lost, place_of(lost, 4990));
    EXPECT_EQ(run_qntrace({"salvage", lost, "-o", saved}).status, 1);
    {
        const writing_program program(saved, "", 10000, 5000);
    }
    const auto found = values_in(saved);
    ASSERT_GT(found.size(), 1000U);
    EXPECT_EQ(found, numbers(15000 - found.size(), 15000));
    EXPECT_EQ(run_qntrace({"check", "-q", saved}).status, 0);
}

} // namespace
} // namespace qn::test
