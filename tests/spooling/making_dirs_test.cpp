// One directory that is made unless it is there, and a path of them.
#include <filesystem>
#include <regex>

#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

unsigned mode_of(const std::string &path)
{
    struct stat status {
    };
    EXPECT_EQ(stat(path.c_str(), &status), 0) << path;
    return status.st_mode & 07777;
}

class SubDir : public testing::Test
{
protected:
    int make() { return subdir(name.c_str()); }

    scratch folder;
    std::string name = folder / "d";
};

TEST_F(SubDir, IsMadeForItsOwnerAlone)
{
    umask(0);
    EXPECT_EQ(make(), 0);
    EXPECT_TRUE(std::filesystem::is_directory(name));
    EXPECT_EQ(mode_of(name), 0700U);
}

TEST_F(SubDir, IsLeftAsItIs)
{
    std::filesystem::create_directory(name);
    chmod(name.c_str(), 0755);
    write_file(name + "/f", "kept");
    EXPECT_EQ(make(), 0);
    EXPECT_EQ(mode_of(name), 0755U);
    EXPECT_EQ(file_bytes(name + "/f"), "kept");
}

TEST_F(SubDir, MayBeALinkToADirectory)
{
    std::filesystem::create_directory(folder / "real");
    std::filesystem::create_directory_symlink(folder / "real", name);
    EXPECT_EQ(make(), 0);
}

TEST_F(SubDir, MayNotBeAFile)
{
    write_file(name, "");
    EXPECT_EQ(make(), -1);
}

TEST_F(SubDir, MayNotBeALinkToNothing)
{
    std::filesystem::create_directory_symlink(folder / "missing", name);
    EXPECT_EQ(make(), -1);
    EXPECT_FALSE(exists(folder / "missing"));
}

TEST_F(SubDir, IsNotMadeWithoutItsParent)
{
    EXPECT_EQ(subdir((folder / "missing/d").c_str()), -1);
    EXPECT_FALSE(exists(folder / "missing"));
}

// Another process makes it between the look and the call.
TEST_F(SubDir, MayBeMadeByAnotherAtTheSameMoment)
{
    spool_calls().directory_made = [](const char *path) { std::filesystem::create_directory(path); };
    EXPECT_EQ(make(), 0);
    EXPECT_TRUE(std::filesystem::is_directory(name));
}

TEST_F(SubDir, MayNotBeAFileThatAnotherMakesAtTheSameMoment)
{
    spool_calls().directory_made = [](const char *path) { write_file(path, ""); };
    EXPECT_EQ(make(), -1);
}

TEST_F(SubDir, MayNotBeReadOnly)
{
    expect_in_private_var([] {
        std::filesystem::create_directory("/var/d");
        ASSERT_EQ(mount("tmpfs", "/var/d", "tmpfs", MS_RDONLY, nullptr), 0);
        EXPECT_EQ(subdir("/var/d"), -1);
        EXPECT_EQ(subdir("/var/d/e"), -1);
    });
}

TEST_F(SubDir, TellsThatItIsMade)
{
    debug_on();
    make();
    const auto lines = debug_lines();
    ASSERT_EQ(lines.size(), 3U);
    EXPECT_EQ(lines[0], "subdir checking: '" + name + "'\n");
    // Behind the result stands the text of some error, of no meaning.
    EXPECT_TRUE(std::regex_match(lines[1], std::regex("subdir creating: '" + literal_pattern(name) + "' \\(0:.+\\)\n")))
        << lines[1];
    EXPECT_EQ(lines[2], "subdir returning 0\n");
}

TEST_F(SubDir, TellsThatItIsThere)
{
    std::filesystem::create_directory(name);
    debug_on();
    make();
    EXPECT_EQ(debug_lines(), (std::vector<std::string>{"subdir checking: '" + name + "'\n", "subdir returning 0\n"}));
}

TEST_F(SubDir, TellsThatItCannotBeMadeButNotWhy)
{
    debug_on();
    const std::string below = folder / "missing/d";
    subdir(below.c_str());
    EXPECT_EQ(debug_lines(), (std::vector<std::string>{"subdir checking: '" + below + "'\n",
                                                       "subdir creating: '" + below + "' (-1:)\n"}));
}

TEST_F(SubDir, TellsThatSomethingElseIsThere)
{
    write_file(name, "");
    debug_on();
    make();
    EXPECT_TRUE(system_log_has("subdir checking: '" + name + "'\n"));
    EXPECT_TRUE(system_log_has("subdir creating: '" + name + "' (0)\n"));
}

TEST_F(SubDir, IsSilentBelowLevelEight)
{
    global_debug_level = 7;
    make();
    EXPECT_TRUE(system_log().empty());
}

class DirectoriesInPath : public testing::Test
{
protected:
    static int make(const std::string &path) { return create_all_directories_in_path(path.c_str()); }

    scratch folder;
};

TEST_F(DirectoriesInPath, AreAllMadeForTheirOwnerAlone)
{
    umask(0);
    EXPECT_EQ(make(folder / "a/b/c"), 0);
    for (const char *name : {"a", "a/b", "a/b/c"}) {
        EXPECT_TRUE(std::filesystem::is_directory(folder / name)) << name;
        EXPECT_EQ(mode_of(folder / name), 0700U) << name;
    }
}

TEST_F(DirectoriesInPath, MayBeThere)
{
    std::filesystem::create_directory(folder / "a");
    chmod((folder / "a").c_str(), 0755);
    EXPECT_EQ(make(folder / "a/b"), 0);
    EXPECT_EQ(make(folder / "a/b"), 0);
    EXPECT_EQ(mode_of(folder / "a"), 0755U);
}

TEST_F(DirectoriesInPath, MayEndInSlashesOrHaveDoubleOnes)
{
    EXPECT_EQ(make(folder / "a//b/"), 0);
    EXPECT_TRUE(std::filesystem::is_directory(folder / "a/b"));
    EXPECT_EQ(make(folder / "a/c//"), 0);
    EXPECT_TRUE(std::filesystem::is_directory(folder / "a/c"));
}

TEST_F(DirectoriesInPath, MayBeRelative)
{
    ASSERT_EQ(chdir(folder.folder().c_str()), 0);
    EXPECT_EQ(make("r/s"), 0);
    EXPECT_TRUE(std::filesystem::is_directory(folder / "r/s"));
}

TEST_F(DirectoriesInPath, MayBeTheRootAlone) { EXPECT_EQ(make("/"), 0); }

TEST_F(DirectoriesInPath, AreNotMadeOfNothing) { EXPECT_EQ(make(""), 1); }

TEST_F(DirectoriesInPath, AreNotMadeBelowAFile)
{
    write_file(folder / "f", "");
    EXPECT_EQ(make(folder / "f/a"), 1);
    EXPECT_EQ(make(folder / "f/a/b"), 1);
}

// That something is there is all that is asked of the last one.
TEST_F(DirectoriesInPath, MayEndInAFile)
{
    write_file(folder / "f", "");
    EXPECT_EQ(make(folder / "f"), 0);
}

TEST_F(DirectoriesInPath, StopWhereOneCannotBeMade)
{
    expect_in_private_var([] {
        std::filesystem::create_directories("/var/a/b");
        ASSERT_EQ(mount("tmpfs", "/var/a/b", "tmpfs", MS_RDONLY, nullptr), 0);
        EXPECT_EQ(make("/var/a/b/c/d"), 1);
        EXPECT_EQ(make("/var/a/b"), 0) << "which is there";
    });
}

TEST_F(DirectoriesInPath, LeaveThePathAsItWas)
{
    const std::string path = folder / "a/b";
    std::string given = path;
    create_all_directories_in_path(given.data());
    EXPECT_EQ(given, path);
}
} // namespace
