// How a copy is named: after its source and the local time of the copy, to the microsecond.
#include <unistd.h>

#include <gtest/gtest.h>

#include "spooling/copy_fixture.h"

namespace
{
using namespace qn::test;

TEST_F(Copying, NamesACopyAfterThePageAndTheLocalTime)
{
    be_at(13, 45, 7, 123456);
    ASSERT_EQ(copy_page(3), 0);
    EXPECT_EQ(only_copy(), "app.trc.3.sp.2024_05_01_13_45_07.123456");
}

struct microseconds {
    int value;
    const char *text;
};

void PrintTo(const microseconds &given, std::ostream *out) { *out << given.value; }

class CopyTime : public Copying, public testing::WithParamInterface<microseconds>
{
};

TEST_P(CopyTime, HasTheMicrosecondsAtLeastTwoCharactersWide)
{
    be_at(3, 4, 5, GetParam().value);
    ASSERT_EQ(copy_page(1), 0);
    EXPECT_EQ(only_copy(), std::string("app.trc.1.sp.2024_05_01_03_04_05.") + GetParam().text);
}

INSTANTIATE_TEST_SUITE_P(Values, CopyTime,
                         testing::Values(microseconds{5, " 5"}, microseconds{0, " 0"}, microseconds{42, "42"},
                                         microseconds{100, "100"}, microseconds{99999, "99999"},
                                         microseconds{999999, "999999"}));

TEST_F(Copying, NamesACopyAfterTheBaseNameOfAFile)
{
    be_at(13, 45, 7, 123456);
    write_file(folder / "core.dump", "x");
    ASSERT_EQ(copy_file(folder / "core.dump", copies), 0);
    EXPECT_EQ(only_copy(), "core.dump.2024_05_01_13_45_07.123456");
}

TEST_F(Copying, NamesACopyAfterTheWholeNameWithoutASlash)
{
    be_at(13, 45, 7, 1);
    ASSERT_EQ(chdir(folder.folder().c_str()), 0);
    write_file("plain", "x");
    ASSERT_EQ(copy_file("plain", copies), 0);
    EXPECT_EQ(only_copy(), "plain.2024_05_01_13_45_07. 1");
}

TEST_F(Copying, PutsTheCopyDirectlyIntoTheDestination)
{
    be_at(13, 45, 7, 5);
    write_file(folder / "f", "x");
    ASSERT_EQ(copy_file(folder / "f", copies + "/"), 0);
    EXPECT_TRUE(exists(copies + "/f.2024_05_01_13_45_07. 5"));
}

// Where the pages go is what the destination says now, not what it said when the directory was made.
TEST_F(Copying, PutsAPageWhereItsSpecificationSays)
{
    char elsewhere[] = "/dev/null";
    spool.dir = elsewhere;
    ASSERT_EQ(copy_page(1), 0);
    EXPECT_EQ(copied().size(), 1U);
}

TEST_F(Copying, TruncatesACopyOfThatNameFirst)
{
    be_at(13, 45, 7, 123456);
    const std::string name = copies + "/f.2024_05_01_13_45_07.123456";
    write_file(name, std::string(5000, 'o'));
    write_file(folder / "f", "new");
    ASSERT_EQ(copy_file(folder / "f", copies), 0);
    EXPECT_EQ(file_bytes(name), "new");
}

TEST_F(Copying, FailsWhereTheNameWouldBeTooLong)
{
    write_file(folder / "f", "x");
    const std::string deep = copies + "/" + std::string(4095 - copies.size() - 1, 'd');
    EXPECT_NE(copy_file(folder / "f", deep), 0);
    EXPECT_TRUE(copied().empty());
}

TEST_F(Copying, FailsForABaseNameThatLeavesNoRoomForTheTime)
{
    write_file(folder / std::string(255, 'f'), "x");
    EXPECT_NE(copy_file(folder / std::string(255, 'f'), copies), 0);
    EXPECT_TRUE(copied().empty());
}
} // namespace
