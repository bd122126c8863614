// One file by two names in one process, and traces whose names look like another trace's pages. A file is mapped once:
// who comes second is told, and what the first one records is whole.
#include <atomic>
#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <thread>

#include <gtest/gtest.h>
#include <unistd.h>

#include "faults/campaign.h"
#include "faults/program.h"
#include "recording/numbered_records.h"
#include "support/last_error.h"
#include "support/scratch.h"
#include "support/trace_image.h"
#include "trace/trace.h"

namespace
{
using namespace qn::test;

class TwoNames : public testing::Test
{
protected:
    TwoNames() { alarm(60); }
    ~TwoNames() override { count("Two names of one trace file", "rounds", 1); }

    void expect_refused(qn_int32_t status) const
    {
        EXPECT_EQ(status, QN_TR_EOPEN);
        EXPECT_EQ(last_error().code, QN_TR_EOPEN);
        EXPECT_EQ(last_error().text, "2625-017 Error " + std::to_string(EBUSY) + " opening trace file.\n");
    }
    static tr_file_token_t mapped() { return component().tokens[1]; }
    static std::vector<uint32_t> ids_in(const std::string &file)
    {
        std::vector<uint32_t> ids;
        for (const record_image &record : trace_image::of_file(file).records_of(1)) ids.push_back(record.u32(28));
        return ids;
    }

    const scratch folder;
};

struct other_name {
    const char *kind;
    void (*make)(const std::string &file, const std::string &name); // null: nothing is to be made
    const char *name;                                               // behind the folder's
};

class OtherName : public TwoNames, public testing::WithParamInterface<other_name>
{
};

TEST_P(OtherName, OfATraceThatIsStartedIsRefusedUntilThatIsStopped)
{
    running(folder.folder());
    const std::string name = folder.folder() + GetParam().name;
    if (GetParam().make != nullptr) GetParam().make(files().trace, name);
    expect_refused(tr_set_file_map_1(name.c_str(), "COMP:c1"));
    for (qn_uint32_t id = 1; id <= 5; ++id) {
        EXPECT_EQ(tr_record_id_1("COMP", id), 0);
        EXPECT_EQ(tr_ms_record_id_1("COMP", 100 + id, mapped()), 0) << "dropped";
    }
    EXPECT_EQ(ids_in(files().trace), (std::vector<uint32_t>{1, 2, 3, 4, 5}));

    EXPECT_EQ(tr_set_filename_1(""), 0);
    EXPECT_EQ(tr_set_trace_levels_1("COMP:*=3"), 0);
    EXPECT_EQ(tr_ms_record_id_1("COMP", 6, mapped()), 0);
    EXPECT_EQ(ids_in(files().trace), (std::vector<uint32_t>{6})) << "begun afresh: its size is another";
}

INSTANTIATE_TEST_SUITE_P(
    Kinds, OtherName,
    testing::Values(
        other_name{"HardLink",
                   [](const std::string &f, const std::string &n) { std::filesystem::create_hard_link(f, n); },
                   "/link"},
        other_name{"SymbolicLink",
                   [](const std::string &f, const std::string &n) { std::filesystem::create_symlink(f, n); }, "/link"},
        other_name{"Dot", nullptr, "/./app.trc"}, other_name{"Slashes", nullptr, "//app.trc"}),
    [](const testing::TestParamInfo<other_name> &info) { return info.param.kind; });

TEST_F(TwoNames, OfAFileThatIsMappedIsTheDefaultTracesToo)
{
    registered(folder.folder());
    ASSERT_EQ(tr_set_file_map_1(files().mapped.c_str(), "COMP:c1"), 0);
    expect_refused(tr_set_filename_1(files().mapped.c_str()));
    EXPECT_EQ(tr_record_id_1("COMP", 100), 0);
    EXPECT_EQ(tr_ms_record_id_1("COMP", 1, mapped()), 0);
    EXPECT_EQ(ids_in(files().mapped), (std::vector<uint32_t>{1}));
}

TEST_F(TwoNames, OfAPageSetAreRefusedAsAWhole)
{
    with_page_set(folder.folder());
    ASSERT_EQ(name_it({}), 0);
    expect_refused(tr_set_file_map_1((folder.folder() + "//app.trc").c_str(), "COMP:c1"));
    for (const trace_anchor_t *page = mapped()->nextPage; page != mapped(); page = page->nextPage)
        EXPECT_EQ(page->pMap, nullptr);
    EXPECT_EQ(write_ids(1, 1000), 0);
    wait_for_queue();
}

TEST_F(TwoNames, OneOfThemAPagesAreRefused)
{
    with_page_set(folder.folder());
    ASSERT_EQ(name_it({}), 0);
    expect_refused(tr_set_file_map_1((files().trace + ".2.sp").c_str(), "COMP:c1"));
}

// The page set that comes later leaves that page out, and leaves the trace alone when it is stopped and resized.
TEST_F(TwoNames, OneOfThemAPagesLeaveTheTraceThatIsThereFirstAlone)
{
    registered(folder.folder());
    ASSERT_EQ(tr_set_file_size_1("", 1 << 20), 0);
    ASSERT_EQ(tr_set_filename_1((files().trace + ".2.sp").c_str()), 0);
    {
        const qn::tr::global_lock global;
        ASSERT_EQ(addSpoolCfgElement(files().spool.c_str(), "app\\.trc", 4, 1, 60, &anchors.pFirstSpoolSpec,
                                     &anchors.pLastSpoolSpec, 0, program_file_bytes),
                  0);
    }
    ASSERT_EQ(tr_set_file_map_1(files().trace.c_str(), "COMP:c1"), 0);
    ASSERT_NE(mapped()->nextPage, nullptr);

    static constexpr uint32_t records = 3000;
    std::atomic<bool> enough{false};
    std::thread resizing([&] {
        for (qn_uint32_t turn = 0; !enough; ++turn)
            tr_set_file_size_1(files().trace.c_str(), (4 + turn % 2) * program_file_bytes);
    });
    std::vector<std::thread> threads;
    for (uint32_t thread = 0; thread < 4; ++thread)
        threads.emplace_back([=] {
            for (uint32_t number = 0; number < records; ++number) {
                EXPECT_EQ(write_numbered({1, thread}, number), 0);
                EXPECT_EQ(write_numbered({2, thread}, number, mapped()), 0);
            }
        });
    for (std::thread &thread : threads) thread.join();
    enough = true;
    resizing.join();
    for (const auto &[author, found] : numbers_in(trace_image::of_file(anchors.fileName).ring())) {
        ASSERT_EQ(author.run, 1U);
        ASSERT_EQ(found.size(), records);
    }
}
} // namespace
