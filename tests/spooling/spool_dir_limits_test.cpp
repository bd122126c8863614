// Spool directories that cannot be: too long for their field, or with something in the way.
#include <algorithm>
#include <cstring>
#include <filesystem>

#include <sys/mount.h>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

class NoSpoolDir : public testing::Test
{
protected:
    NoSpoolDir()
    {
        be_on_a_known_node();
        std::strcpy(spec.pattern, "not to be touched");
    }

    const char *make(const std::string &dest)
    {
        std::strcpy(spec.dest, dest.c_str());
        return mkspooldir(&spec, "/tmp/a.trc");
    }
    void expect_field_kept() const
    {
        EXPECT_LT(strnlen(spec.dest, sizeof spec.dest), sizeof spec.dest);
        EXPECT_STREQ(spec.pattern, "not to be touched");
    }

    // A path below the folder of exactly that length.
    std::string path_of(size_t length) const
    {
        std::string path = folder.folder();
        while (length - path.size() > 250) path += "/" + std::string(100, 'd');
        return path + "/" + std::string(length - path.size() - 1, 'd');
    }

    scratch folder;
    trace_spool_spec_t spec{};
    static constexpr size_t node_path_bytes = 36; // with the slash before it
};

TEST_F(NoSpoolDir, IsMadeAtTheLengthThatFillsTheField)
{
    const std::string dest = path_of(4095 - node_path_bytes);
    ASSERT_EQ(make(dest), spec.dest);
    EXPECT_EQ(spec.dest, dest + "/" + node_path);
    EXPECT_EQ(std::strlen(spec.dest), 4095U);
    EXPECT_TRUE(std::filesystem::is_directory(spec.dest));
    expect_field_kept();
}

class TooLongSpoolDir : public NoSpoolDir, public testing::WithParamInterface<size_t>
{
};

// One byte too many for the program, for the slash before it, for the node, ... for the cluster's name.
TEST_P(TooLongSpoolDir, Fails)
{
    EXPECT_EQ(make(path_of(GetParam())), nullptr);
    expect_field_kept();
}

INSTANTIATE_TEST_SUITE_P(Lengths, TooLongSpoolDir,
                         testing::Values(4060, 4067, 4068, 4069, 4072, 4080, 4081, 4085, 4086, 4087, 4088, 4089, 4090,
                                         4091, 4092, 4093, 4094, 4095));

TEST_F(NoSpoolDir, FailsForAHostNameWithoutEnd)
{
    spool_calls().host_name = [](char *name, size_t size) {
        std::memset(name, 'h', size);
        return 0;
    };
    EXPECT_EQ(make(folder / "x"), nullptr);
    expect_field_kept();
}

TEST_F(NoSpoolDir, FailsForAProgramNameWithoutEnd)
{
    calls().proc_args = [](pid_t, char *buffer, size_t size) {
        std::memset(buffer, 'p', size);
        return 0;
    };
    EXPECT_EQ(make(folder / "x"), nullptr);
    expect_field_kept();
}

class FileInTheWay : public NoSpoolDir, public testing::WithParamInterface<int>
{
};

TEST_P(FileInTheWay, Fails)
{
    const std::vector<std::string> parts{"c1", "id1", "h1", "000000000000002a", "mydaemon"};
    std::string blocked = folder / "x";
    for (int level = 0; level < GetParam(); ++level) {
        std::filesystem::create_directory(blocked);
        blocked += "/" + parts[static_cast<size_t>(level)];
    }
    write_file(blocked, "in the way");

    EXPECT_EQ(make(folder / "x"), nullptr);
    EXPECT_EQ(file_bytes(blocked), "in the way");
    if (GetParam() > 0) {
        EXPECT_EQ(spec.dest, blocked) << "as far as it was made";
    }
}

INSTANTIATE_TEST_SUITE_P(AtEachLevel, FileInTheWay, testing::Range(0, 6));

TEST_F(NoSpoolDir, FailsBelowAFile)
{
    write_file(folder / "f", "");
    EXPECT_EQ(make(folder / "f/x"), nullptr);
    EXPECT_EQ(spec.dest, folder / "f/x");
}

TEST_F(NoSpoolDir, FailsOnAReadOnlyFileSystem)
{
    expect_in_private_var([this] {
        std::filesystem::create_directories("/var/x/c1");
        ASSERT_EQ(mount("tmpfs", "/var/x/c1", "tmpfs", MS_RDONLY, nullptr), 0);
        EXPECT_EQ(make("/var/x"), nullptr);
        EXPECT_STREQ(spec.dest, "/var/x/c1");
    });
}

TEST_F(NoSpoolDir, SwitchesASpecificationOffOnAReadOnlyFileSystem)
{
    expect_in_private_var([] {
        std::filesystem::create_directories("/var/x");
        ASSERT_EQ(mount("tmpfs", "/var/x", "tmpfs", MS_RDONLY, nullptr), 0);
        specifications list;
        trace_spool_spec_t *made = list.add("a", "/var/x");
        EXPECT_EQ(match_spool_file_name("/tmp/a", list.first), nullptr);
        EXPECT_EQ(made->onoff, 0);
    });
}
} // namespace
