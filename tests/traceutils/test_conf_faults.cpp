// Where a fault is said to be, and of which section: at its first line, and those too that are dropped with the file.
#include <gtest/gtest.h>

#include "traceutils/conf_seen.h"

namespace
{
using namespace qn::test;

using faults = std::vector<fault_seen>;

TEST(ConfFaults, AGoodFileHasNone)
{
    EXPECT_EQ(read_conf("# note\ndefault:\ndest = /d\nt:\npat = /x\n").faults, faults{});
}

TEST(ConfFaults, AFaultIsInTheLineThatFailedItsSection)
{
    EXPECT_EQ(read_conf("t:\n\n# note\nnonsense\nmore\nu:\npat = /u\npat = /u\nv:\npat = /v\n").faults,
              (faults{{4, "t"}, {8, "u"}}));
}

TEST(ConfFaults, WhereAHeaderIsExpectedTheSectionHasNoName)
{
    EXPECT_EQ(read_conf("nonsense\nt:\npat = /x\ncolour = red\n").faults, (faults{{1, ""}, {4, ""}}));
}

TEST(ConfFaults, ASectionThatTheFileEndsInIsNamedByItsHeader)
{
    EXPECT_EQ(read_conf("t:\npat = /x\n\nspoolarea_a:\nspool_dir = /d\n\n").faults, (faults{{4, "spoolarea_a"}}));
}

TEST(ConfFaults, AFailedSectionAtTheEndOfTheFileIsToldOnce)
{
    EXPECT_EQ(read_conf("t:\npat = /x\npat = /y\nmore\n").faults, (faults{{3, "t"}}));
}

TEST(ConfFaults, TheRestOfASplitLineHasItsLinesNumber)
{
    EXPECT_EQ(read_conf("# note\n" + std::string(1022, 'x') + "t:\nu:\nnonsense\nv:\npat = /v\n").faults,
              (faults{{2, ""}, {3, "t"}}));
}

TEST(ConfFaults, EachSectionIsKnownByItsFirstLine)
{
    EXPECT_EQ(read_conf("# note\nnonsense\nmore\n\nt:\npat = /x\ncolour = red\nu:\npat = /u\n").section_lines,
              (std::vector<unsigned>{2, 5, 7, 8}));
}

TEST(ConfFaults, TheReasonNamesTheKeyThatIsWrong)
{
    const auto reasons = [](const std::string &text) { return read_conf(text).reasons; };
    const auto only = [](const std::string &reason) { return std::vector<std::string>{reason}; };
    EXPECT_EQ(reasons("nonsense\n"), only("a section header (NAME:) is expected here"));
    EXPECT_EQ(reasons("t:\nnonsense\n"), only("not of the form KEY = VALUE"));
    EXPECT_EQ(reasons("t:\nsize = 1\nSIZE = 2\n"), only("a second \"SIZE\""));
    EXPECT_EQ(reasons("t:\ncolour = 1\n"), only("a trace section has no key \"colour\""));
    EXPECT_EQ(reasons("spoolarea_a:\npat = 1\n"), only("a spool section has no key \"pat\""));
    EXPECT_EQ(reasons("default:\npat = 1\n"), only("a default section has no key \"pat\""));
}

TEST(ConfFaults, TheReasonNamesTheKeysThatAreMissing)
{
    EXPECT_EQ(
        read_conf("t:\nu:\n").reasons,
        (std::vector<std::string>{"\"pat\" is missing where the next header comes, which therefore opens no section"}));
    EXPECT_EQ(read_conf("spoolarea_a:\ncleanup = ON\n").reasons,
              (std::vector<std::string>{"\"spool_dir\" is missing at the end of the file"}));
    EXPECT_EQ(read_conf("spoolarea_a:\n").reasons,
              (std::vector<std::string>{"\"spool_dir\" and \"cleanup\" are missing at the end of the file"}));
}
} // namespace
