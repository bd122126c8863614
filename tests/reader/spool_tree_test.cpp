// qntrace spool in trees that would lead it astray: links that lead back, pipes, depth, numbers.
#include <filesystem>

#include <fcntl.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "platform/instrumented.h"
#include "reader/spool_directory.h"

namespace qn::test
{
namespace
{

namespace fs = std::filesystem;

TEST(SpoolTree, CountsACopyOnceThatIsReachedTwice)
{
    const spool_directory spool;
    spool.put("app.trc.1.sp.2026_11_21_05_13_00.123456");
    fs::create_directory_symlink("c1", spool.root + "/id1");
    const auto found = sound_rows({spool.root, spool.root, spool.root + "/c1"});
    ASSERT_EQ(found.size(), 1U);
    EXPECT_EQ(found[0]["page_copies"], 1);
}

TEST(SpoolTree, FollowsALinkToAFolderElsewhere)
{
    const spool_directory spool;
    const spool_directory elsewhere;
    elsewhere.put("app.trc.1.sp.2026_11_21_05_13_00.123456");
    fs::create_directory_symlink(elsewhere.root + "/c1", spool.root + "/c1");
    const auto found = sound_rows({spool.root});
    ASSERT_EQ(found.size(), 1U);
    EXPECT_EQ(found[0]["host"], "h1");
}

TEST(SpoolTree, EndsInATreeWhoseLinksLeadBack)
{
    const spool_directory spool;
    spool.put("app.trc.1.sp.2026_11_21_05_13_00.123456");
    const auto deepest = spool.root + "/" + usual_folder;
    fs::create_directory_symlink(spool.root, deepest + "/up");
    fs::create_directory_symlink(".", deepest + "/here");
    fs::create_symlink("self", deepest + "/self");
    fs::create_symlink("nowhere", deepest + "/dangling");
    const auto found = sound_rows({spool.root});
    ASSERT_EQ(found.size(), 1U);
    EXPECT_EQ(found[0]["page_copies"], 1);
}

TEST(SpoolTree, DoesNotWaitForAPipeThatIsCalledLikeACopy)
{
    const spool_directory spool;
    ASSERT_EQ(mkfifo((spool.root + "/app.trc.1.sp.2026_11_21_05_13_00.123456").c_str(), 0600), 0);
    EXPECT_TRUE(sound_rows({spool.root}).empty());
}

// A chain of folders below an open one, removed from its end when the test ends.
class deep_chain
{
public:
    explicit deep_chain(const std::string &root, std::size_t length) : length_(length)
    {
        int at = open(root.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
        for (std::size_t i = 0; i < length; ++i) at = enter(at);
        bottom_ = at;
    }
    deep_chain(const deep_chain &) = delete;
    deep_chain &operator=(const deep_chain &) = delete;
    ~deep_chain()
    {
        for (std::size_t i = 0; i < length_; ++i) {
            const int above = openat(bottom_, "..", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
            close(bottom_);
            unlinkat(above, "d", AT_REMOVEDIR);
            bottom_ = above;
        }
        close(bottom_);
    }
    std::string path() const
    {
        std::string below;
        for (std::size_t i = 0; i < length_; ++i) below += "/d";
        return below;
    }
    void put(const char *name, const std::string &original) const
    {
        EXPECT_EQ(linkat(AT_FDCWD, original.c_str(), bottom_, name, 0), 0);
        name_ = name;
    }
    void take_away() const { unlinkat(bottom_, name_, 0); }

private:
    static int enter(int at)
    {
        EXPECT_EQ(mkdirat(at, "d", 0700), 0);
        const int inside = openat(at, "d", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
        EXPECT_GE(inside, 0);
        close(at);
        return inside;
    }

    std::size_t length_;
    int bottom_ = -1;
    mutable const char *name_ = nullptr;
};

// More folders than a process may have open, and a path longer than one that can be opened.
TEST(SpoolTree, FindsCopiesDeeperThanTheLongestPath)
{
    const spool_directory spool;
    const auto original = spool.folder.file("original", two_records().bytes());
    const deep_chain chain(spool.root, 2100);
    chain.put("app.trc.1.sp.2026_11_21_05_13_00.123456", original);
    const auto from_the_top = sound_rows({spool.root});
    const auto from_the_bottom = sound_rows({spool.root + chain.path()});
    chain.take_away();
    ASSERT_EQ(from_the_top.size(), 1U);
    EXPECT_EQ(from_the_top[0]["program"], "d");
    EXPECT_EQ(from_the_top[0]["page_copies"], 1);
    ASSERT_EQ(from_the_bottom.size(), 1U);
    EXPECT_EQ(from_the_bottom[0]["page_copies"], 1);
}

TEST(SpoolTree, NeedsNoMemoryForTheCopies)
{
    if (instrumented) GTEST_SKIP() << "a sanitizer keeps what was freed";
    const spool_directory spool;
    const auto largest_child = [] {
        struct rusage usage = {};
        getrusage(RUSAGE_CHILDREN, &usage);
        return usage.ru_maxrss;
    };
    const auto original = spool.put("app.trc.1.sp.2026_11_21_05_13_00.123456");
    EXPECT_EQ(sound_rows({spool.root}).at(0)["page_copies"], 1);
    const long with_one = largest_child();
    for (int i = 100000; i < 120000; ++i) {
        const auto name = spool.root + "/" + usual_folder + "/app.trc.2.sp.2026_11_21_05_13_00." + std::to_string(i);
        ASSERT_EQ(link(original.c_str(), name.c_str()), 0);
    }
    EXPECT_EQ(sound_rows({spool.root}).at(0)["page_copies"], 20001);
    EXPECT_LT(largest_child(), with_one + 512) << "kilobytes";
}

} // namespace
} // namespace qn::test
