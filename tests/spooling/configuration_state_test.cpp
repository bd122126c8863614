// What the configuration file's presence and modification time ask for, and what is done about it.
#include <cstdlib>
#include <cstring>
#include <filesystem>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

// Each runs with an empty /var, and with one specification in the default anchor's list.
class ConfigurationState : public testing::Test
{
protected:
    void run(const std::function<void()> &body)
    {
        expect_in_private_var([&] {
            pthread_once(&trace_global_data_once, initialize_trace_global_data);
            specifications list;
            list.add("before", "/var/spool/before");
            install(list);
            body();
        });
    }
    static std::string destination() { return anchors.pFirstSpoolSpec->dest; }
    static std::string pattern() { return anchors.pFirstSpoolSpec->pattern; }
    static configuration_action_t determine() { return determine_configuration_action_from_the_configuration_file(); }
};

TEST_F(ConfigurationState, AsksForNothingYetAtALowerTime)
{
    EXPECT_EQ(TAKE_NO_ACTION, 0);
    EXPECT_EQ(RECONFIGURE, 1);
    EXPECT_EQ(TURN_SPOOLING_OFF, 2);
    EXPECT_EQ(configuration_file_last_modified, 0);
}

TEST_F(ConfigurationState, TurnsSpoolingOffWithoutAFile)
{
    run([] {
        configuration_file_last_modified = 4711;
        EXPECT_EQ(determine(), TURN_SPOOLING_OFF);
        EXPECT_EQ(determine(), TURN_SPOOLING_OFF) << "as long as it is missing";
        EXPECT_EQ(configuration_file_last_modified, 4711);
    });
}

TEST_F(ConfigurationState, ReconfiguresForANewerFile)
{
    run([] {
        write_conf("", 1000);
        EXPECT_EQ(determine(), RECONFIGURE);
        EXPECT_EQ(configuration_file_last_modified, 1000);
        EXPECT_EQ(determine(), TAKE_NO_ACTION);
        write_conf("", 1001);
        EXPECT_EQ(determine(), RECONFIGURE);
        EXPECT_EQ(configuration_file_last_modified, 1001);
    });
}

TEST_F(ConfigurationState, DoesNothingForAFileThatIsNotNewer)
{
    run([] {
        configuration_file_last_modified = 1000;
        write_conf("", 1000);
        EXPECT_EQ(determine(), TAKE_NO_ACTION);
        write_conf("", 999);
        EXPECT_EQ(determine(), TAKE_NO_ACTION);
        EXPECT_EQ(configuration_file_last_modified, 1000);
    });
}

TEST_F(ConfigurationState, DoesNothingWhenTheFileCannotBeLookedAt)
{
    run([] {
        std::filesystem::create_directories("/var/qn");
        write_file(conf_folder, "not a folder");
        EXPECT_EQ(determine(), TAKE_NO_ACTION);
        EXPECT_EQ(configuration_file_last_modified, 0);
    });
}

TEST_F(ConfigurationState, IsDeterminedWithoutTheLockToo)
{
    run([] {
        EXPECT_EQ(do_determine_configuration_action_from_the_configuration_file(), TURN_SPOOLING_OFF);
        write_conf("", 1000);
        const held_by_another hold(configuration_file_last_modified_mutex);
        EXPECT_EQ(do_determine_configuration_action_from_the_configuration_file(), RECONFIGURE);
        EXPECT_EQ(do_determine_configuration_action_from_the_configuration_file(), TAKE_NO_ACTION);
    });
}

TEST_F(ConfigurationState, AsksForNothingWhenItCannotBeLocked)
{
    run([] {
        write_conf("", 1000);
        {
            const exhausted_mutex unlockable(configuration_file_last_modified_mutex);
            EXPECT_EQ(determine(), TAKE_NO_ACTION);
            EXPECT_EQ(configuration_file_last_modified, 0);
        }
        EXPECT_TRUE(is_free(configuration_file_last_modified_mutex));
    });
}

TEST_F(ConfigurationState, IsLockedOnlyWhileItIsDetermined)
{
    run([] {
        write_conf("", 1000);
        determine();
        EXPECT_TRUE(is_free(configuration_file_last_modified_mutex));
    });
}

TEST_F(ConfigurationState, IsRecordedWhenTheLibraryIsInitialised)
{
    expect_in_private_var([] {
        write_conf(section("traces", {"pat = from_file"}), 1000);
        char name[4096];
        ASSERT_EQ(tr_get_filename_1(name), 0);
        EXPECT_EQ(configuration_file_last_modified, 1000);
        EXPECT_EQ(pattern(), "from_file");
        const trace_spool_spec_t *read = anchors.pFirstSpoolSpec;
        configure_if_necessary();
        EXPECT_EQ(anchors.pFirstSpoolSpec, read) << "not read a second time";
    });
}

// ---- What configure_if_necessary makes of it.

TEST_F(ConfigurationState, StopsCopyingWithoutAFile)
{
    run([] {
        configure_if_necessary();
        EXPECT_EQ(destination(), "/dev/null");
    });
}

TEST_F(ConfigurationState, StopsCopyingAtEveryCheckWithoutAFile)
{
    run([] {
        configure_if_necessary();
        std::strcpy(anchors.pFirstSpoolSpec->dest, "/var/spool/again");
        configure_if_necessary();
        EXPECT_EQ(destination(), "/dev/null");
    });
}

TEST_F(ConfigurationState, ReadsANewerFile)
{
    run([] {
        write_conf(section("traces", {"pat = after", "dest = /var/spool/after", "spooling = ON"}), 1000);
        configure_if_necessary();
        EXPECT_EQ(pattern(), "after");
        EXPECT_EQ(destination(), "/var/spool/after");
    });
}

TEST_F(ConfigurationState, ReadsAFileThatComesBackNewer)
{
    run([] {
        const std::string text = section("traces", {"pat = after", "dest = /var/spool/after", "spooling = ON"});
        write_conf(text, 1000);
        configure_if_necessary();
        std::filesystem::remove(conf_file);
        configure_if_necessary();
        EXPECT_EQ(destination(), "/dev/null");
        write_conf(text, 1001);
        configure_if_necessary();
        EXPECT_EQ(destination(), "/var/spool/after");
    });
}

TEST_F(ConfigurationState, IgnoresAFileThatComesBackAsItWas)
{
    run([] {
        const std::string text = section("traces", {"pat = after", "dest = /var/spool/after", "spooling = ON"});
        write_conf(text, 1000);
        configure_if_necessary();
        std::filesystem::remove(conf_file);
        configure_if_necessary();
        write_conf(text, 1000);
        configure_if_necessary();
        EXPECT_EQ(destination(), "/dev/null");
    });
}

TEST_F(ConfigurationState, LeavesAllAsItIsForAFileThatCannotBeLookedAt)
{
    run([] {
        std::filesystem::create_directories("/var/qn");
        write_file(conf_folder, "not a folder");
        configure_if_necessary();
        EXPECT_EQ(destination(), "/var/spool/before");
    });
}

class ConfiguredByEnvironment : public ConfigurationState, public testing::WithParamInterface<const char *>
{
};

// Present is enough, even without a value.
TEST_P(ConfiguredByEnvironment, IsNotConfiguredByTheFile)
{
    setenv("QN_TR_SPOOL", GetParam(), 1);
    run([] {
        configure_if_necessary();
        EXPECT_EQ(destination(), "/var/spool/before") << "although there is no file";
        write_conf(section("traces", {"pat = after"}), 1000);
        configure_if_necessary();
        EXPECT_EQ(pattern(), "before");
        EXPECT_EQ(configuration_file_last_modified, 0) << "the file is not even looked at";
    });
}

INSTANTIATE_TEST_SUITE_P(Values, ConfiguredByEnvironment, testing::Values("", "a:ON:8:/dev/null", "nonsense"));

// An empty value lets the file be read at the start, and never again.
TEST_F(ConfigurationState, ReadsTheFileOnceWithAnEmptyVariable)
{
    setenv("QN_TR_SPOOL", "", 1);
    expect_in_private_var([] {
        write_conf(section("traces", {"pat = first"}), 1000);
        char name[4096];
        ASSERT_EQ(tr_get_filename_1(name), 0);
        ASSERT_EQ(pattern(), "first");
        write_conf(section("traces", {"pat = second"}), 2000);
        configure_if_necessary();
        EXPECT_EQ(pattern(), "first");
    });
}

// ---- Turning everything off.

TEST_F(ConfigurationState, TurnsOffByTheDestinationAlone)
{
    run([] {
        trace_spool_spec_t *spec = anchors.pFirstSpoolSpec;
        spec->dir = spec->dest;
        turn_spooling_off_in_all_spool_specs();
        EXPECT_STREQ(spec->dest, "/dev/null");
        EXPECT_EQ(spec->onoff, 1);
        EXPECT_EQ(spec->pages, 8U);
        EXPECT_EQ(spec->dir, spec->dest);
    });
}

TEST_F(ConfigurationState, TurnsOffEverySpecificationOfTheList)
{
    expect_in_private_var([] {
        specifications list;
        for (const char *name : {"a", "b", "c"}) list.add(name, std::string("/var/spool/") + name);
        trace_spool_spec_t *first = list.first;
        install(list);
        turn_spooling_off_in_all_spool_specs();
        for (const trace_spool_spec_t *spec = first; spec != nullptr; spec = spec->pNext)
            EXPECT_STREQ(spec->dest, "/dev/null") << spec->pattern;
    });
}

TEST_F(ConfigurationState, TurnsNothingOffThatIsNotInTheList)
{
    run([] {
        trace_anchor_t *anchor = anchor_for("/var/a.trc");
        specifications other;
        anchor->spool = other.add("a.trc", "/var/spool/other");
        turn_spooling_off_in_all_spool_specs();
        EXPECT_STREQ(other.first->dest, "/var/spool/other");
        anchor->spool = nullptr;
    });
}

TEST_F(ConfigurationState, TurnsNothingOffWithoutItsLock)
{
    run([] {
        {
            const exhausted_mutex unlockable(anchors.anchorMutex);
            turn_spooling_off_in_all_spool_specs();
        }
        EXPECT_EQ(destination(), "/var/spool/before");
    });
}

TEST_F(ConfigurationState, LeavesNoLockHeld)
{
    run([] {
        turn_spooling_off_in_all_spool_specs();
        EXPECT_TRUE(is_free(anchors.anchorMutex));
        EXPECT_TRUE(is_free(spq.mutex));
        write_conf(section("traces", {"pat = after"}), 1000);
        configure_if_necessary();
        EXPECT_TRUE(is_free(anchors.anchorMutex));
        EXPECT_TRUE(is_free(spq.mutex));
        EXPECT_TRUE(is_free(configuration_file_last_modified_mutex));
    });
}

// ---- The client's call.

TEST_F(ConfigurationState, IsForgottenByTheClientsCall)
{
    run([] {
        const no_spool_thread thread;
        write_conf("", 1000);
        EXPECT_EQ(determine(), RECONFIGURE);
        tr_configure_1();
        EXPECT_EQ(configuration_file_last_modified, 0);
        EXPECT_EQ(determine(), RECONFIGURE) << "the file has not changed";
    });
}

TEST_F(ConfigurationState, IsLookedAtByAThreadThatTheClientsCallStartsOrWakes)
{
    run([] {
        const no_spool_thread thread;
        int signals = 0;
        calls().cond_signal = [&](pthread_cond_t *condition) {
            EXPECT_EQ(condition, &spq.cond);
            EXPECT_EQ(configuration_file_last_modified, 0);
            ++signals;
            return 0;
        };
        configuration_file_last_modified = 1000;
        tr_configure_1();
        EXPECT_EQ(thread.attempts(), 1);
        EXPECT_EQ(signals, 1);
        tr_configure_1();
        EXPECT_EQ(thread.attempts(), 1);
        EXPECT_EQ(signals, 2);
    });
}

TEST_F(ConfigurationState, MayBeTheClientsFirstCall)
{
    expect_in_private_var([] {
        const no_spool_thread thread;
        tr_configure_1();
        EXPECT_TRUE(is_free(configuration_file_last_modified_mutex));
        EXPECT_TRUE(is_free(spq.mutex));
    });
}
} // namespace
