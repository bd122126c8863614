// The message catalogue that is installed: it says what the default texts say, and it is found through NLSPATH.
#include <cstdlib>
#include <filesystem>

#include <nl_types.h>

#include <gtest/gtest.h>

#include "files/message_texts.h"
#include "files/support_files.h"

namespace
{
using namespace qn::test;

constexpr const char *missing = "not in the catalogue";

class Catalogue : public testing::Test
{
protected:
    void SetUp() override
    {
        setenv("NLSPATH", (std::filesystem::path(QN_TR_CATALOGUE).parent_path() / "%N").c_str(), 1);
        catalogue = catopen("qn_tr.cat", NL_CAT_LOCALE);
        ASSERT_NE(catalogue, reinterpret_cast<nl_catd>(-1));
    }
    void TearDown() override
    {
        if (catalogue != reinterpret_cast<nl_catd>(-1)) catclose(catalogue);
    }

    nl_catd catalogue = reinterpret_cast<nl_catd>(-1);
};

TEST_F(Catalogue, HasEveryDefaultTextUnderItsNumber)
{
    for (size_t number = 1; number < message_texts.size(); ++number)
        EXPECT_STREQ(catgets(catalogue, 1, static_cast<int>(number), missing), message_texts[number]) << number;
}

TEST_F(Catalogue, HasNoTextBeyondTheTable)
{
    EXPECT_STREQ(catgets(catalogue, 1, 0, missing), missing);
    EXPECT_STREQ(catgets(catalogue, 1, 41, missing), missing);
}

TEST_F(Catalogue, DescribesTheFailureThatCanBeFiled)
{
    EXPECT_STREQ(catgets(catalogue, 2, 1, missing), "A syntax error in the spooling configuration has occurred.");
}

// A default text that no catalogue has tells which of the two was shown.
TEST_F(Catalogue, IsWhereMessagesComeFrom)
{
    cu_set_error_1(18, nullptr, "qn_tr.cat", 1, 18, "default %d\n", 13);
    EXPECT_EQ(last_error().text, "2625-017 Error 13 opening trace file.\n");
    cu_set_error_1(17, nullptr, "qn_tr.cat", 1, 17, "default %s\n", "/x/y");
    EXPECT_EQ(last_error().text, "2625-016 Trace filename \"/x/y\" is invalid.\n");
}

TEST_F(Catalogue, GivesTheErrorsOfTheLibraryTheSameTextsAsWithoutIt)
{
    std::vector<std::string> with;
    for (int number = 1; number <= 40; ++number) {
        set_error(99, number);
        with.push_back(last_error().text);
    }
    unsetenv("NLSPATH");
    for (int number = 1; number <= 40; ++number) {
        set_error(99, number);
        EXPECT_EQ(last_error().text, with[static_cast<size_t>(number) - 1]) << number;
    }
}

TEST_F(Catalogue, ServesAFailingCall)
{
    const scratch folder;
    trace_anchor_t *anchor = anchor_for(folder / "missing/f");
    EXPECT_EQ(start(anchor), 18);
    EXPECT_EQ(last_error().text, "2625-017 Error " + std::to_string(ENOENT) + " opening trace file.\n");
}
} // namespace
