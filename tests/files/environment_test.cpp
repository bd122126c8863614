// Initialisation from the environment, by the first call that needs it.
#include <atomic>
#include <cstdlib>
#include <filesystem>
#include <thread>

#include <sys/syslog.h>
#include <unistd.h>

#include <cu_tr_proxy.h>
#include <gtest/gtest.h>

#include "files/support_calls.h"
#include "files/support_files.h"

namespace
{
using namespace qn::test;

std::string default_file()
{
    char name[4096];
    EXPECT_EQ(tr_get_filename_1(name), 0);
    return name;
}

qn_uint32_t default_size()
{
    qn_uint32_t size = 0;
    EXPECT_EQ(tr_get_size_1(&size), 25) << "the trace is not active";
    return size;
}

TEST(Environment, WithoutVariablesGivesTheDefaults)
{
    EXPECT_EQ(default_file(), "");
    EXPECT_EQ(default_size(), 65536U);
    EXPECT_EQ(global_debug_level, 0U);
    EXPECT_EQ(use_msync_enabled_except_flush, 0);
    EXPECT_EQ(anchors.pFirstTraceSpec, nullptr);
    EXPECT_EQ(anchors.pFirstMapSpec, nullptr);
    EXPECT_EQ(anchors.numAnchors, 1U);
    EXPECT_EQ(anchors.bInitialized, 1);
    EXPECT_EQ(anchors.pageSize, sysconf(_SC_PAGESIZE));
    EXPECT_TRUE(system_log_openings().empty());
}

TEST(Environment, WithoutAFileNameTracesNothingByDefault)
{
    client program("ABCD");
    EXPECT_EQ(program.register_now(), 0);
    EXPECT_EQ(tr_record_id_1("ABCD", 1), 0);
    EXPECT_EQ(anchors.pMap, nullptr);
}

TEST(Environment, WithVariablesThatAreEmptyGivesTheDefaults)
{
    for (const char *name : {"QN_TR_FILENAME", "QN_TR_SIZE", "QN_TR_DEBUG_LEVEL", "QN_TR_USE_MSYNC",
                             "QN_TR_TRACE_LEVELS", "QN_TR_FILE_MAP", "QN_TR_FILE_SIZE"})
        setenv(name, "", 1);
    leave_marker();
    EXPECT_EQ(default_file(), "");
    EXPECT_EQ(default_size(), 65536U);
    EXPECT_EQ(global_debug_level, 0U);
    EXPECT_EQ(use_msync_enabled_except_flush, 0);
    EXPECT_EQ(anchors.numAnchors, 1U);
}

struct name_case {
    const char *directory;
    const char *value;
    const char *name;
};

void PrintTo(const name_case &given, std::ostream *out) { *out << given.value << " in " << given.directory; }

class FileNameValue : public testing::TestWithParam<name_case>
{
};

TEST_P(FileNameValue, NamesTheDefaultFile)
{
    std::filesystem::current_path(GetParam().directory);
    setenv("QN_TR_FILENAME", GetParam().value, 1);
    EXPECT_EQ(default_file(), GetParam().name);
}

INSTANTIATE_TEST_SUITE_P(Values, FileNameValue,
                         testing::Values(name_case{"/", "trace.out", "/trace.out"},
                                         name_case{"/tmp", "trace.out", "/tmp/trace.out"},
                                         name_case{"/tmp", "/x/trace.out", "/x/trace.out"},
                                         name_case{"/tmp", "./a/../b", "/tmp/./a/../b"}, name_case{"/", "//x", "//x"}));

TEST(FileNameVariable, IsCutToItsField)
{
    std::filesystem::current_path("/tmp");
    const std::string value(5000, 'v');
    setenv("QN_TR_FILENAME", value.c_str(), 1);
    EXPECT_EQ(default_file(), ("/tmp/" + value).substr(0, 4095));
}

TEST(FileNameVariable, IsCutToItsFieldAlsoWhenItIsAbsolute)
{
    const std::string value = "/" + std::string(5000, 'v');
    setenv("QN_TR_FILENAME", value.c_str(), 1);
    EXPECT_EQ(default_file(), value.substr(0, 4095));
}

TEST(FileNameVariable, LetsTheFirstComponentStartTheFile)
{
    const scratch folder;
    setenv("QN_TR_FILENAME", (folder / "f").c_str(), 1);
    setenv("QN_TR_SIZE", "131072", 1);
    client program("ABCD");
    EXPECT_EQ(program.register_now(), 0);
    EXPECT_EQ(tr_record_id_1("ABCD", 5), 0);
    EXPECT_EQ(trace_image::of_file(folder / "f").size(), 131072U);
    EXPECT_EQ(ids_in(folder / "f"), std::vector<uint32_t>{5});
    EXPECT_EQ(tr_set_filename_1(nullptr), 0);
}

struct number_case {
    const char *value;
    qn_uint32_t number;
};

void PrintTo(const number_case &given, std::ostream *out) { *out << given.value; }

class SizeVariable : public testing::TestWithParam<number_case>
{
};

TEST_P(SizeVariable, IsTheRequestedSize)
{
    setenv("QN_TR_SIZE", GetParam().value, 1);
    EXPECT_EQ(default_size(), GetParam().number);
}

INSTANTIATE_TEST_SUITE_P(Values, SizeVariable,
                         testing::Values(number_case{"0x20000", 131072}, number_case{"100000", 100000},
                                         number_case{"0200000", 65536}, number_case{"010000", 4096},
                                         number_case{"0", 65536}, number_case{"0x0", 65536}, number_case{"many", 65536},
                                         number_case{"70000 bytes", 70000}, number_case{" 70000", 70000},
                                         number_case{"4294967297", 1}, number_case{"0x100010000", 65536}));

class DebugValue : public testing::TestWithParam<number_case>
{
};

TEST_P(DebugValue, IsTheDebugLevel)
{
    setenv("QN_TR_DEBUG_LEVEL", GetParam().value, 1);
    default_file();
    EXPECT_EQ(global_debug_level, GetParam().number);
    EXPECT_EQ(system_log_openings().size(), GetParam().number != 0 ? 1U : 0U);
}

INSTANTIATE_TEST_SUITE_P(Values, DebugValue,
                         testing::Values(number_case{"8", 8}, number_case{"1", 1}, number_case{"0x10", 16},
                                         number_case{"010", 8}, number_case{"0", 0}, number_case{"on", 0}));

TEST(DebugVariable, OpensTheSystemLogOfDaemons)
{
    setenv("QN_TR_DEBUG_LEVEL", "1", 1);
    default_file();
    const auto openings = system_log_openings();
    ASSERT_EQ(openings.size(), 1U);
    EXPECT_EQ(openings[0].identity, "opal_trace");
    EXPECT_EQ(openings[0].options, LOG_CONS | LOG_NDELAY | LOG_PID);
    EXPECT_EQ(openings[0].facility, LOG_DAEMON);
}

TEST(DebugVariable, IsInForceForTheFirstStart)
{
    const scratch folder;
    setenv("QN_TR_DEBUG_LEVEL", "8", 1);
    setenv("QN_TR_FILENAME", (folder / "f").c_str(), 1);
    client program("ABCD");
    ASSERT_EQ(program.register_now(), 0);
    EXPECT_TRUE(system_log_has("\ttrace: reInit block for " + folder / "f" + "\n"));
    EXPECT_EQ(tr_set_filename_1(nullptr), 0);
}

class SyncVariable : public testing::TestWithParam<number_case>
{
};

TEST_P(SyncVariable, IsOnUnlessItIsZero)
{
    setenv("QN_TR_USE_MSYNC", GetParam().value, 1);
    default_file();
    EXPECT_EQ(use_msync_enabled_except_flush, static_cast<int>(GetParam().number));
}

INSTANTIATE_TEST_SUITE_P(Values, SyncVariable,
                         testing::Values(number_case{"1", 1}, number_case{"2", 1}, number_case{"-1", 1},
                                         number_case{"0", 0}, number_case{"yes", 0}, number_case{"0x1", 0}));

TEST(LevelVariable, SetsTheLevelsOfComponentsThatRegister)
{
    setenv("QN_TR_TRACE_LEVELS", "ABCD:c1=7", 1);
    client program("ABCD", 3);
    ASSERT_EQ(program.register_now(), 0);
    EXPECT_EQ(program.levels, (std::vector<tr_detail_level_t>{1, 7, 1}));
}

TEST(LevelVariable, ThatIsFaultyDoesNotHinderTheProgram)
{
    setenv("QN_TR_TRACE_LEVELS", "ABCD:c1=7,rubbish", 1);
    client program("ABCD", 3);
    EXPECT_EQ(program.register_now(), 0);
    EXPECT_EQ(program.levels, (std::vector<tr_detail_level_t>{1, 1, 1})) << "it is taken whole or not at all";
}

TEST(MapVariable, SendsCategoriesToTheirFile)
{
    const scratch folder;
    setenv("QN_TR_FILE_MAP", (folder / "m" + ",ABCD:c1").c_str(), 1);
    client program("ABCD", 2);
    ASSERT_EQ(program.register_now(), 0);
    ASSERT_NE(program.tokens, nullptr);
    EXPECT_EQ(program.tokens[0], nullptr);
    EXPECT_EQ(program.tokens[1], findOrCreateAnchorForFile((folder / "m").c_str(), 0));
    EXPECT_EQ(trace_image::of_file(folder / "m").size(), 65536U);
    EXPECT_EQ(tr_set_filename_1(nullptr), 0);
}

TEST(FileSizeVariable, SetsTheSizesOfFiles)
{
    setenv("QN_TR_FILE_SIZE", "/tmp/one,0x30000;/tmp/two,8192", 1);
    default_file();
    qn_uint32_t size = 0;
    EXPECT_EQ(tr_get_file_size_1("/tmp/one", &size), 25);
    EXPECT_EQ(size, 196608U);
    EXPECT_EQ(tr_get_file_size_1("/tmp/two", &size), 25);
    EXPECT_EQ(size, 8192U);
    EXPECT_EQ(anchors.numAnchors, 3U);
}

TEST(Environment, IsReadOnce)
{
    setenv("QN_TR_FILENAME", "/tmp/first", 1);
    EXPECT_EQ(default_file(), "/tmp/first");
    setenv("QN_TR_FILENAME", "/tmp/second", 1);
    EXPECT_EQ(default_file(), "/tmp/first");
}

TEST(Environment, IsReadOnceByManyFirstCalls)
{
    setenv("QN_TR_DEBUG_LEVEL", "1", 1);
    setenv("QN_TR_FILE_SIZE", "/tmp/one,8192", 1);
    constexpr int callers = 8;
    std::atomic<int> ready{0};
    std::vector<std::thread> threads;
    for (int i = 0; i < callers; ++i)
        threads.emplace_back([&] {
            ++ready;
            while (ready.load() < callers) std::this_thread::yield();
            EXPECT_EQ(default_file(), "");
        });
    for (std::thread &thread : threads) thread.join();
    EXPECT_EQ(system_log_openings().size(), 1U);
    EXPECT_EQ(anchors.numAnchors, 2U);
}

TEST(Environment, InitialisesAnyAnchor)
{
    setenv("QN_TR_FILENAME", "/tmp/named", 1);
    setenv("QN_TR_SIZE", "8192", 1);
    trace_anchor_t *anchor = anchor_for("/tmp/before", 99);
    anchor->alloc_cnt = 5;
    {
        const qn::tr::global_lock global;
        EXPECT_EQ(init(anchor), 0);
    }
    EXPECT_STREQ(anchor->fileName, "/tmp/named");
    EXPECT_EQ(anchor->uRequestedFileSize, 8192U);
    EXPECT_EQ(anchor->alloc_cnt, 0U);
    EXPECT_EQ(anchor->bInitialized, 1);
    EXPECT_STREQ(anchors.fileName, "");
    EXPECT_EQ(anchors.bInitialized, 0);
}

TEST(Proxy, LetsLibrariesBelowTraceThroughThisOne)
{
    const scratch folder;
    EXPECT_EQ(cu_trp_printf_1("PRXY", 7, "before %d", 1), 0);
    ASSERT_EQ(tr_set_filename_1((folder / "f").c_str()), 0);
    client program("ABCD");
    ASSERT_EQ(program.register_now(), 0);
    EXPECT_EQ(cu_trp_printf_1("PRXY", 8, "after %d", 2), 0);
    const auto records = trace_image::of_file(folder / "f").records_of(15);
    ASSERT_EQ(records.size(), 1U);
    EXPECT_EQ(records[0].component(), "PRXY");
    EXPECT_EQ(records[0].u32(28), 8U);
    EXPECT_EQ(records[0].text(40), "after 2");

    int syncs = 0;
    calls().msync = [&](void *, size_t, int) {
        ++syncs;
        return 0;
    };
    EXPECT_EQ(cu_trp_flush_1(), 0);
    EXPECT_EQ(syncs, 1);
    calls() = {};
    EXPECT_EQ(tr_set_filename_1(nullptr), 0);
}

TEST(GlobalStop, IsForGood)
{
    EXPECT_EQ(master_override_off(), 0);
    global_stop_trace();
    EXPECT_EQ(master_override_off(), 1);
    EXPECT_EQ(global_switch, 1);
    global_stop_trace();
    EXPECT_EQ(master_override_off(), 1);
}

TEST(GlobalStop, KeepsWritersFromAMappedTrace)
{
    const scratch folder;
    trace_anchor_t *anchor = anchor_for(folder / "f");
    ASSERT_EQ(start(anchor), 0);
    global_stop_trace();
    const std::string before = file_bytes(folder / "f");
    EXPECT_EQ(tr_ms_record_id_1("TEST", 1, anchor), 0);
    EXPECT_EQ(tr_ms_record_id_1(nullptr, 1, anchor), 0);
    EXPECT_EQ(file_bytes(folder / "f"), before);
    stop(anchor);
}
} // namespace
