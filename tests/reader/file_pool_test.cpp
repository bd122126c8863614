// Files that share fewer descriptors than there are files.
#include <cerrno>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "reader/program.h"
#include "reader/trace_builder.h"
#include "tools/qntrace/traces/file_pool.h"

namespace qn::test
{
namespace
{

namespace fs = std::filesystem;
using dump::file_pool;
using dump::pooled_file;

std::size_t open_descriptors()
{
    const fs::directory_iterator entries("/proc/self/fd");
    return static_cast<std::size_t>(std::distance(begin(entries), end(entries)));
}

std::string contents(pooled_file &file)
{
    std::vector<std::byte> bytes(file.size());
    const std::size_t count = file.read_at(0, bytes);
    return {reinterpret_cast<const char *>(bytes.data()), count};
}

std::string text_file(const scratch_folder &folder, const std::string &name, const std::string &text)
{
    return folder.file(name, byte_string().chars(text).bytes());
}

TEST(MergeFiles, AreAllReadableWithTwoDescriptors)
{
    const scratch_folder folder;
    const std::size_t before = open_descriptors();
    file_pool pool(2);
    std::vector<std::unique_ptr<pooled_file>> files;
    for (int i = 0; i < 10; ++i) {
        const auto number = std::to_string(i);
        files.push_back(std::make_unique<pooled_file>(pool, text_file(folder, number, "file " + number)));
    }
    for (int round = 0; round < 2; ++round) {
        for (std::size_t i = 0; i < files.size(); ++i) {
            EXPECT_EQ(contents(*files[i]), "file " + std::to_string(i));
            EXPECT_LE(open_descriptors(), before + 2);
        }
    }
    files.clear();
    EXPECT_EQ(open_descriptors(), before);
}

TEST(MergeFiles, TheOneThatWasNotReadForTheLongestTimeIsClosed)
{
    const scratch_folder folder;
    const auto path = text_file(folder, "a", "a");
    file_pool pool(2);
    pooled_file a(pool, path);
    pooled_file b(pool, text_file(folder, "b", "b"));
    EXPECT_EQ(contents(a), "a");
    pooled_file c(pool, text_file(folder, "c", "c"));
    fs::remove(path);
    EXPECT_EQ(contents(a), "a"); // still open: b had to go
}

TEST(MergeFiles, AFileThatWasReplacedWhileItWasClosedIsNotReadOn)
{
    const scratch_folder folder;
    const auto path = text_file(folder, "a", "old");
    file_pool pool(1);
    pooled_file a(pool, path);
    pooled_file b(pool, text_file(folder, "b", "b"));
    fs::rename(text_file(folder, "new", "new"), path);
    try {
        contents(a);
        FAIL() << "the other file was read";
    } catch (const reader::io_error &error) {
        EXPECT_EQ(error.code().value(), ESTALE);
    }
    EXPECT_EQ(contents(b), "b");
}

TEST(MergeFiles, AFileThatWasRemovedWhileItWasClosedCannotBeReadOn)
{
    const scratch_folder folder;
    const auto path = text_file(folder, "a", "old");
    file_pool pool(1);
    pooled_file a(pool, path);
    pooled_file b(pool, text_file(folder, "b", "b"));
    fs::remove(path);
    EXPECT_THROW(contents(a), reader::io_error);
}

} // namespace
} // namespace qn::test
