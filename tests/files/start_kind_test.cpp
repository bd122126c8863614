// Trace file names that do not lead to a plain new file: folders, pipes, devices, links, very long names.
#include <cerrno>
#include <filesystem>

#include <sys/stat.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "files/support_files.h"

namespace
{
using namespace qn::test;

class TraceFileName : public testing::Test
{
protected:
    void expect_failure(const std::string &name, int code, const std::string &text)
    {
        trace_anchor_t *anchor = anchor_for(name);
        const int descriptors = open_descriptors();
        EXPECT_EQ(start(anchor), code);
        EXPECT_EQ(last_error().code, code);
        EXPECT_EQ(last_error().text, text);
        EXPECT_EQ(open_descriptors(), descriptors);
        EXPECT_EQ(anchor->pMap, nullptr);
    }

    // A name of that many characters that leads to `file` in the scratch folder.
    std::string long_name(size_t length, const std::string &file) const
    {
        std::string name = folder.folder() + "/";
        while (name.size() + 2 + file.size() <= length) name += "./";
        if (name.size() + file.size() < length) name += "/";
        return name + file;
    }

    scratch folder;
};

TEST_F(TraceFileName, OfAFolderCannotBeOpened)
{
    expect_failure(folder.folder(), 18, "2625-017 Error " + std::to_string(EISDIR) + " opening trace file.\n");
}

TEST_F(TraceFileName, InAMissingFolderCannotBeOpened)
{
    expect_failure(folder / "missing/f", 18, "2625-017 Error " + std::to_string(ENOENT) + " opening trace file.\n");
    EXPECT_FALSE(exists(folder / "missing"));
}

TEST_F(TraceFileName, BelowAPlainFileCannotBeOpened)
{
    write_file(folder / "f", "text");
    expect_failure(folder / "f/g", 18, "2625-017 Error " + std::to_string(ENOTDIR) + " opening trace file.\n");
}

TEST_F(TraceFileName, OfAPipeIsRefused)
{
    const std::string name = folder / "pipe";
    ASSERT_EQ(mkfifo(name.c_str(), 0600), 0);
    expect_failure(name, 20, "2625-019 Trace file \"" + name + "\" is not a regular file.\n");
    EXPECT_TRUE(std::filesystem::is_fifo(name));
}

TEST_F(TraceFileName, OfADeviceIsRefused)
{
    expect_failure("/dev/null", 20, "2625-019 Trace file \"/dev/null\" is not a regular file.\n");
}

TEST_F(TraceFileName, OfADanglingLinkCreatesTheFileThatItLeadsTo)
{
    ASSERT_EQ(symlink("target", (folder / "link").c_str()), 0);
    trace_anchor_t *anchor = anchor_for(folder / "link");
    ASSERT_EQ(start(anchor), 0);
    EXPECT_EQ(trace_image::of_file(folder / "target").size(), 65536U);
    EXPECT_TRUE(std::filesystem::is_symlink(folder / "link"));
    stop(anchor);
}

TEST_F(TraceFileName, OfALinkIntoNowhereCannotBeOpened)
{
    ASSERT_EQ(symlink("missing/target", (folder / "link").c_str()), 0);
    expect_failure(folder / "link", 18, "2625-017 Error " + std::to_string(ENOENT) + " opening trace file.\n");
}

TEST_F(TraceFileName, OfALinkToItselfCannotBeOpened)
{
    ASSERT_EQ(symlink("link", (folder / "link").c_str()), 0);
    expect_failure(folder / "link", 18, "2625-017 Error " + std::to_string(ELOOP) + " opening trace file.\n");
}

TEST_F(TraceFileName, MayHave4095Characters)
{
    const std::string name = long_name(4095, "abc");
    ASSERT_EQ(name.size(), 4095U);
    client program("ABCD");
    ASSERT_EQ(tr_set_filename_1(name.c_str()), 0);
    ASSERT_EQ(program.register_now(), 0) << last_error().text;
    char got[4096];
    EXPECT_EQ(tr_get_filename_1(got), 0);
    EXPECT_EQ(got, name);
    EXPECT_TRUE(exists(folder / "abc"));
    EXPECT_EQ(tr_set_filename_1(nullptr), 0);
}

TEST_F(TraceFileName, Of4096CharactersIsCutByOne)
{
    const std::string name = long_name(4096, "abc");
    ASSERT_EQ(name.size(), 4096U);
    client program("ABCD");
    ASSERT_EQ(tr_set_filename_1(name.c_str()), 0);
    ASSERT_EQ(program.register_now(), 0) << last_error().text;
    char got[4096];
    EXPECT_EQ(tr_get_filename_1(got), 0);
    EXPECT_EQ(got, name.substr(0, 4095));
    EXPECT_TRUE(exists(folder / "ab"));
    EXPECT_FALSE(exists(folder / "abc"));
    EXPECT_EQ(tr_set_filename_1(nullptr), 0);
}

TEST_F(TraceFileName, Of4096CharactersIsItsOwnCurrentName)
{
    const std::string name = long_name(4096, "abc");
    client program("ABCD");
    ASSERT_EQ(tr_set_filename_1(name.c_str()), 0);
    ASSERT_EQ(program.register_now(), 0);
    ASSERT_EQ(tr_set_filename_1(name.c_str()), 0);
    EXPECT_EQ(trace_image::of_file(folder / "ab").records_of(16).size(), 1U) << "it was not started again";
    EXPECT_EQ(tr_set_filename_1(nullptr), 0);
}

TEST_F(TraceFileName, WithAPathComponentThatIsTooLongCannotBeOpened)
{
    expect_failure(folder / std::string(300, 'n'), 18,
                   "2625-017 Error " + std::to_string(ENAMETOOLONG) + " opening trace file.\n");
}
} // namespace
