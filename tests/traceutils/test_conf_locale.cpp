// A file means the same whatever locale the program has set.
#include <clocale>

#include <gtest/gtest.h>

#include "traceutils/conf_seen.h"

namespace
{
using namespace qn::test;

// The program's locale while a test runs.
class ConfLocale : public testing::Test
{
protected:
    void SetUp() override { ASSERT_NE(std::setlocale(LC_ALL, utf8), nullptr); }
    void TearDown() override { std::setlocale(LC_ALL, "C"); }

    static constexpr const char *utf8 = "C.UTF-8"; // the C library brings it along
};

// Bytes as ISO 8859-1 has them; none is UTF-8.
constexpr const char *section_sign = "\xa7";
constexpr const char *accents = "\xe0\xe9";

TEST_F(ConfLocale, ACommentIsOneWhateverBytesStandBeforeItsSign)
{
    const std::string note = std::string(section_sign) + " 1 # old\n";
    EXPECT_EQ(read_conf(note + "t:\npat = /x\n" + note + "dest = /d\n").chunks,
              (std::vector{comment(note), good("t", {{"pat", "/x"}, {"dest", "/d"}}, "t:\npat = /x\ndest = /d\n")}));
}

TEST_F(ConfLocale, AHeaderIsOneWhateverBytesStandBeforeItsColon)
{
    const std::string text = std::string(accents) + ":" + section_sign + ":\npat = /y\n";
    EXPECT_EQ(read_conf(text).chunks,
              (std::vector{good(std::string(accents) + ":" + section_sign, {{"pat", "/y"}}, text)}));
}

TEST_F(ConfLocale, IsTheProgramsOwnAgainAfterTheRead)
{
    ASSERT_EQ(read_conf("t:\npat = /x\n").status, 0);
    EXPECT_EQ(MB_CUR_MAX, 6U);
}
} // namespace
