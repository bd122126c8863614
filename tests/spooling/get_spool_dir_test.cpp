// Where a client learns in which directory a trace is spooled.
#include <cstdlib>
#include <filesystem>

#include <sys/syslog.h>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

class GetSpoolDir : public testing::Test
{
protected:
    GetSpoolDir() { be_on_a_known_node(); }
    void configure(const std::string &value) const { setenv("QN_TR_SPOOL", value.c_str(), 1); }
    static std::string directory_of(const char *file)
    {
        const char *directory = tr_get_spool_dir_1(file);
        return directory != nullptr ? directory : "(none)";
    }

    scratch folder;
    std::string x = folder / "x";
};

TEST_F(GetSpoolDir, GivesTheDirectoryOfAMatchingTrace)
{
    configure("a.trc:ON:8:" + x);
    EXPECT_EQ(directory_of("/tmp/a.trc"), x + "/" + node_path);
    EXPECT_TRUE(std::filesystem::is_directory(x + "/" + node_path));
}

TEST_F(GetSpoolDir, GivesTheSameForEachPage)
{
    configure("a.trc$:ON:8:" + x);
    EXPECT_EQ(directory_of("/tmp/a.trc.12.sp"), x + "/" + node_path);
    EXPECT_EQ(directory_of("/tmp/a.trc"), x + "/" + node_path);
}

TEST_F(GetSpoolDir, GivesNothingForOtherTraces)
{
    configure("a.trc:ON:8:" + x);
    EXPECT_EQ(directory_of("/tmp/b.trc"), "(none)");
    EXPECT_FALSE(exists(x));
}

TEST_F(GetSpoolDir, GivesNothingForATraceThatIsOffButMakesItsDirectory)
{
    configure("a.trc:OFF:8:" + x);
    EXPECT_EQ(directory_of("/tmp/a.trc"), "(none)");
    EXPECT_TRUE(std::filesystem::is_directory(x + "/" + node_path));
}

TEST_F(GetSpoolDir, GivesNothingForPagesThatAreNotCopied)
{
    configure("a.trc:ON:8:/dev/null");
    EXPECT_EQ(directory_of("/tmp/a.trc"), "(none)");
}

TEST_F(GetSpoolDir, GivesNothingWhenTheDirectoryCannotBeMade)
{
    write_file(x, "in the way");
    configure("a.trc:ON:8:" + x);
    EXPECT_EQ(directory_of("/tmp/a.trc"), "(none)");
    ASSERT_NE(anchors.pFirstSpoolSpec, nullptr);
    EXPECT_EQ(anchors.pFirstSpoolSpec->onoff, 0);
}

TEST_F(GetSpoolDir, GivesATreeThatAnotherProcessMakesAtTheSameMoment)
{
    configure("a.trc:ON:8:" + x);
    spool_calls().directory_made = [](const char *path) { std::filesystem::create_directory(path); };
    EXPECT_EQ(directory_of("/tmp/a.trc"), x + "/" + node_path);
}

TEST_F(GetSpoolDir, GivesATextThatStaysAsItIs)
{
    configure("a.trc:ON:8:" + x);
    const char *given = tr_get_spool_dir_1("/tmp/a.trc");
    ASSERT_NE(given, nullptr);
    turn_spooling_off_in_all_spool_specs();
    EXPECT_EQ(given, x + "/" + node_path);
}

TEST_F(GetSpoolDir, ReadsTheConfigurationOnce)
{
    configure("a.trc:ON:8:" + x);
    ASSERT_EQ(directory_of("/tmp/a.trc"), x + "/" + node_path);
    configure("b.trc:ON:8:" + x);
    EXPECT_EQ(directory_of("/tmp/b.trc"), "(none)");
    EXPECT_EQ(directory_of("/tmp/a.trc"), x + "/" + node_path);
    ASSERT_NE(anchors.pFirstSpoolSpec, nullptr);
    EXPECT_EQ(anchors.pFirstSpoolSpec->pNext, nullptr);
}

TEST_F(GetSpoolDir, ReadsTheConfigurationFile)
{
    expect_in_private_var([] {
        write_conf(section("traces", {"pat = a.trc", "dest = /var/x", "spooling = ON"}));
        EXPECT_EQ(directory_of("/tmp/a.trc"), "/var/x/" + node_path);
    });
}

TEST_F(GetSpoolDir, LeavesNoLockHeld)
{
    configure("a.trc:ON:8:" + x);
    directory_of("/tmp/a.trc");
    EXPECT_TRUE(is_free(anchors.anchorMutex));
    EXPECT_TRUE(is_free(spq.mutex));
}

TEST_F(GetSpoolDir, TellsWhatItGives)
{
    configure("a.trc:ON:8:" + x);
    debug_on();
    directory_of("/tmp/a.trc");
    EXPECT_TRUE(system_log_has(LOG_ERR, "tr_get_spool_dir returning: '" + x + "/" + node_path + "'\n"));
    directory_of("/tmp/b.trc");
    EXPECT_TRUE(system_log_has(LOG_ERR, "tr_get_spool_dir returning: '(NULL)'\n"));
}

TEST_F(GetSpoolDir, IsSilentBelowLevelEight)
{
    configure("a.trc:ON:8:" + x);
    global_debug_level = 7;
    directory_of("/tmp/a.trc");
    EXPECT_TRUE(system_log().empty());
}
} // namespace
