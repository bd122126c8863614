// Whose a trace file is: the owner's alone, or the administrative group's too where there is one.
#include <cerrno>

#include <sys/stat.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "files/support_calls.h"
#include "files/support_files.h"

namespace
{
using namespace qn::test;

mode_t mode_of(const std::string &file)
{
    struct stat status;
    EXPECT_EQ(::stat(file.c_str(), &status), 0);
    return status.st_mode & 07777;
}

void there_is_an_admin_group()
{
    calls().admin_group = [](gid_t *group) {
        *group = getegid();
        return 0;
    };
}

TEST(TraceFile, IsTheOwnersAloneWithoutAnAdministrativeGroup)
{
    const scratch folder;
    calls().admin_group = [](gid_t *) { return ENOENT; };
    int changes = 0;
    calls().fchown = [&](int, uid_t, gid_t) { return ++changes; };
    calls().fchmod = [&](int, mode_t) { return ++changes; };
    start_without_record(folder / "f");
    EXPECT_EQ(changes, 0);
    EXPECT_EQ(mode_of(folder / "f"), 0600U);
}

TEST(TraceFile, IsGivenToTheAdministrativeGroup)
{
    const scratch folder;
    there_is_an_admin_group();
    int given = 0;
    calls().fchown = [&](int fd, uid_t owner, gid_t group) {
        ++given;
        EXPECT_EQ(owner, static_cast<uid_t>(-1));
        EXPECT_EQ(group, getegid());
        return __real_fchown(fd, owner, group);
    };
    start_without_record(folder / "f");
    EXPECT_EQ(given, 1);
    EXPECT_EQ(mode_of(folder / "f"), 0660U);
}

TEST(TraceFile, IsGivenToTheGroupAlsoWhenItExistsAtItsSize)
{
    const scratch folder;
    trace_anchor_t *anchor = anchor_for(folder / "f");
    ASSERT_EQ(start(anchor), 0);
    stop(anchor);
    ASSERT_EQ(chmod((folder / "f").c_str(), 0600), 0);
    there_is_an_admin_group();
    ASSERT_EQ(start(anchor), 0);
    EXPECT_EQ(mode_of(folder / "f"), 0660U);
    stop(anchor);
}

TEST(TraceFile, IsStartedWhenItsGroupAndModeCannotBeChanged)
{
    const scratch folder;
    there_is_an_admin_group();
    calls().fchown = [](int, uid_t, gid_t) { return fail_with(EPERM); };
    calls().fchmod = [](int, mode_t) { return fail_with(EPERM); };
    trace_anchor_t *anchor = anchor_for(folder / "f");
    EXPECT_EQ(start(anchor), 0);
    stop(anchor);
}

// The two changes do not depend on each other.
TEST(TraceFile, GetsItsModeAlsoWhenItsGroupCannotBeChanged)
{
    const scratch folder;
    there_is_an_admin_group();
    calls().fchown = [](int, uid_t, gid_t) { return fail_with(EPERM); };
    start_without_record(folder / "f");
    EXPECT_EQ(mode_of(folder / "f"), 0660U);
}
} // namespace
