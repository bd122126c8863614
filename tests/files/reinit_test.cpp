// A trace that cannot go on: its file is put aside and it starts afresh.
#include <filesystem>
#include <thread>

#include <gtest/gtest.h>

#include "files/page_set.h"

namespace
{
using namespace qn::test;

class TraceToReinitialise : public testing::Test
{
protected:
    void SetUp() override { ASSERT_EQ(program.register_now(), 0); }
    void TearDown() override
    {
        if (anchor != nullptr) stop(anchor);
    }

    // Starts the file and writes three ids into it.
    void start_file(const std::string &name)
    {
        anchor = anchor_for(name);
        ASSERT_EQ(start(anchor), 0) << last_error().text;
        write_ids(anchor, 3);
    }
    qn_int32_t reinit()
    {
        const qn::tr::anchor_set_lock set(anchor);
        return trace_reinit(anchor);
    }

    scratch folder;
    std::string file = folder / "f";
    client program{"ABCD"};
    trace_anchor_t *anchor = nullptr;
};

TEST_F(TraceToReinitialise, LeavesTheOldContentsUnderItsNameWithSave)
{
    start_file(file);
    const std::string before = file_bytes(file);
    EXPECT_EQ(reinit(), 0);
    EXPECT_EQ(file_bytes(file + ".save"), before);
}

TEST_F(TraceToReinitialise, GoesOnInAFreshFile)
{
    start_file(file);
    EXPECT_EQ(reinit(), 0);
    const auto records = trace_image::of_file(file).records();
    ASSERT_EQ(records.size(), 1U);
    EXPECT_EQ(records[0].function(), 16);
    EXPECT_EQ(records[0].sequence(), 2U);
    EXPECT_FALSE(std::filesystem::equivalent(file, file + ".save"));
    write_ids(anchor, 2);
    EXPECT_EQ(ids_in(file), (std::vector<uint32_t>{1, 2}));
    EXPECT_EQ(ids_in(file + ".save"), (std::vector<uint32_t>{1, 2, 3}));
}

TEST_F(TraceToReinitialise, HasItsFlagsClearedInTheSavedFile)
{
    start_file(file);
    qn::tr::header_of(anchor)->uFlags = 0x8000;
    EXPECT_EQ(reinit(), 0);
    EXPECT_EQ(trace_image::of_file(file + ".save").u16(4), 0) << "it was stopped cleanly";
}

TEST_F(TraceToReinitialise, ReplacesAnEarlierSavedFile)
{
    write_file(file + ".save", "from long ago");
    start_file(file);
    const std::string before = file_bytes(file);
    EXPECT_EQ(reinit(), 0);
    EXPECT_EQ(file_bytes(file + ".save"), before);
}

TEST_F(TraceToReinitialise, GoesOnInItsFileWhenThatCannotBeSaved)
{
    std::filesystem::create_directory(file + ".save");
    start_file(file);
    EXPECT_EQ(reinit(), 0);
    EXPECT_EQ(ids_in(file), (std::vector<uint32_t>{1, 2, 3})) << "sound, so it was continued";
    EXPECT_TRUE(std::filesystem::is_directory(file + ".save"));
}

TEST_F(TraceToReinitialise, ReturnsTheResultOfTheStart)
{
    start_file(file);
    anchor->uRequestedFileSize = 0;
    EXPECT_EQ(reinit(), 21);
    EXPECT_TRUE(exists(file + ".save"));
    EXPECT_EQ(anchor->pMap, nullptr);
}

// Nothing is stopped that has nothing to trace: the mapping goes with the saved file.
TEST_F(TraceToReinitialise, StaysMappedWhileItIsOff)
{
    start_file(file);
    program.levels[0] = 0;
    const unsigned char *map = anchor->pMap;
    EXPECT_EQ(reinit(), 0);
    EXPECT_EQ(anchor->pMap, map);
    EXPECT_TRUE(exists(file + ".save"));
    EXPECT_FALSE(exists(file));
}

// A file that a specification has come to govern becomes a page set when it is started next. Look-ups in other threads
// compare its name meanwhile, under the global mutex.
class TraceToBecomeAPageSet : public TraceToReinitialise
{
protected:
    void SetUp() override
    {
        TraceToReinitialise::SetUp();
        start_file(file);
        spool.onoff = 1;
        spool.pages = 2;
        spool.pg_size = 65536;
        anchors.bMultipageEnabled = 1;
        anchor->spool = &spool;
        anchor->bSpoolProcessed = 1;
    }
    void TearDown() override
    {
        TraceToReinitialise::TearDown();
        anchor->spool = nullptr;
    }

    trace_spool_spec_t spool{};
};

TEST_F(TraceToBecomeAPageSet, StaysASingleFileWhileAnotherThreadHoldsTheGlobalMutex)
{
    {
        const qn::tr::global_lock global;
        std::thread([this] { EXPECT_EQ(reinit(), 0); }).join();
    }
    EXPECT_EQ(anchor->fileName, file);
    EXPECT_EQ(anchor->nextPage, nullptr);
    EXPECT_EQ(trace_image::of_file(file).records_of(16).size(), 1U);
    stop(anchor);
    ASSERT_EQ(start(anchor), 0);
    EXPECT_EQ(anchor->fileName, file + ".1.sp") << "at the next start";
}

TEST_F(TraceToBecomeAPageSet, BecomesOneWhenItsFileIsPutAside)
{
    EXPECT_EQ(reinit(), 0);
    EXPECT_EQ(ids_in(file + ".save").size(), 3U);
    EXPECT_EQ(anchor->fileName, file + ".1.sp");
    EXPECT_EQ(trace_image::of_file(file + ".1.sp").records_of(16).size(), 1U);
    EXPECT_TRUE(exists(file + ".2.sp"));
    EXPECT_FALSE(exists(file));
}

// The second of three pages is damaged while it is written; the first is full of records.
class PageToReinitialise : public PageSet
{
protected:
    void SetUp() override
    {
        ASSERT_EQ(program.register_now(), 0);
        ASSERT_EQ(start_set("t", 3), 0);
        while (head->pActivePg == head) write_ids(head, 1);
        write_ids(head, 2);
        ASSERT_EQ(head->pActivePg, page(2));
        page(2)->pNextFree->length = 0;
        first_page = ids_in(folder / "t.1.sp");
        EXPECT_EQ(tr_ms_record_id_1("TEST", 8, head), 0);
    }

    client program{"ABCD"};
    std::vector<uint32_t> first_page;
};

TEST_F(PageToReinitialise, IsPutAsideAlone)
{
    EXPECT_EQ(page(2)->fileName, folder / "t.2.sp");
    EXPECT_TRUE(exists(folder / "t.2.sp.save"));
    EXPECT_FALSE(exists(folder / "t.1.sp.save"));
    EXPECT_FALSE(exists(folder / "t.3.sp.save"));
    EXPECT_FALSE(std::filesystem::equivalent(folder / "t.2.sp", folder / "t.2.sp.save"));
}

TEST_F(PageToReinitialise, LeavesTheOtherPagesWhatTheyHold)
{
    EXPECT_EQ(ids_in(folder / "t.1.sp"), first_page);
    EXPECT_EQ(trace_image::of_file(folder / "t.1.sp").records_of(16).size(), 1U) << "the one of the first start";
    EXPECT_TRUE(trace_image::of_file(folder / "t.3.sp").records().empty());
}

TEST_F(PageToReinitialise, GoesOnBeingWritten)
{
    EXPECT_EQ(head->pActivePg, page(2));
    const trace_image fresh = trace_image::of_file(folder / "t.2.sp");
    EXPECT_EQ(fresh.u8(192), 1);
    ASSERT_EQ(fresh.records().size(), 1U);
    EXPECT_EQ(fresh.records()[0].function(), 16);
    write_ids(head, 2);
    EXPECT_EQ(ids_in(folder / "t.2.sp"), (std::vector<uint32_t>{1, 2}));
}

class NameOfLength : public TraceToReinitialise, public testing::WithParamInterface<size_t>
{
protected:
    std::string name() const
    {
        std::string text = folder.folder() + "/";
        while (text.size() + 3 <= GetParam()) text += "./";
        return text + std::string(GetParam() - text.size(), 'f');
    }
};

using NameWithRoom = NameOfLength;

TEST_P(NameWithRoom, IsSaved)
{
    start_file(name());
    EXPECT_EQ(reinit(), 0);
    EXPECT_TRUE(exists(name() + ".save"));
    EXPECT_TRUE(ids_in(name()).empty());
}

INSTANTIATE_TEST_SUITE_P(Lengths, NameWithRoom, testing::Values(100, 4089, 4090));

using NameWithoutRoom = NameOfLength;

TEST_P(NameWithoutRoom, IsNotSaved)
{
    start_file(name());
    EXPECT_EQ(reinit(), 0);
    EXPECT_EQ(ids_in(name()).size(), 3U) << "sound, so it was continued";
    size_t files = 0;
    for ([[maybe_unused]] const auto &entry : std::filesystem::directory_iterator(folder.folder())) ++files;
    EXPECT_EQ(files, 1U);
}

INSTANTIATE_TEST_SUITE_P(Lengths, NameWithoutRoom, testing::Values(4091, 4092, 4095));
} // namespace
