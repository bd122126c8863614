// Sizes of trace files: the language of QN_TR_FILE_SIZE, the calls that set a size, and those that tell it.
#include <filesystem>

#include <gtest/gtest.h>

#include "components/components_seen.h"
#include "components/mutexes.h"
#include "components/outcome.h"
#include "support/failing_memory.h"
#include "support/scratch.h"
#include "support/system_log.h"

namespace
{
using namespace qn::test;

outcome parse_of(const std::string &value) { return after(parse_fileSize_spec(value.c_str())); }

qn_uint32_t requested(const std::string &file)
{
    const trace_anchor_t *anchor = findOrCreateAnchorForFile(file.c_str(), 0);
    EXPECT_NE(anchor, nullptr) << file;
    return anchor != nullptr ? anchor->uRequestedFileSize : 0;
}

const outcome no_name = failure(17, 17, "2625-016 Trace filename \"\" is invalid.\n");
const outcome not_active = failure(25, 25, "Trace is not active so the size returned is the requested size.\n");

TEST(FileSizeLanguage, ReadsElementsOfAFileAndASize)
{
    EXPECT_EQ(parse_of("/tmp/ab.trc,1048576;/tmp/cd.trc 0x200000;\"/tmp/e f.trc\",0200"), success());
    EXPECT_EQ(requested("/tmp/ab.trc"), 1048576U);
    EXPECT_EQ(requested("/tmp/cd.trc"), 2097152U);
    EXPECT_EQ(requested("/tmp/e f.trc"), 128U);
}

TEST(FileSizeLanguage, IgnoresWhatFollowsTheNumber)
{
    EXPECT_EQ(parse_of("/tmp/x.trc,64k"), success());
    EXPECT_EQ(requested("/tmp/x.trc"), 64U);
    EXPECT_EQ(parse_of("/tmp/y.trc,  77 bytes, more;/tmp/z.trc,1"), success());
    EXPECT_EQ(requested("/tmp/y.trc"), 77U);
    EXPECT_EQ(requested("/tmp/z.trc"), 1U);
}

TEST(FileSizeLanguage, TakesTextWithoutDigitsForZero)
{
    EXPECT_EQ(parse_of("/tmp/x.trc,abc"), success());
    EXPECT_EQ(requested("/tmp/x.trc"), 0U);
    EXPECT_EQ(parse_of("/tmp/y.trc  ,4096"), success());
    EXPECT_EQ(requested("/tmp/y.trc"), 0U) << "a comma behind a blank belongs to the size";
}

TEST(FileSizeLanguage, KeepsThirtyTwoBits)
{
    EXPECT_EQ(parse_of("/tmp/x.trc,4294967297"), success());
    EXPECT_EQ(requested("/tmp/x.trc"), 1U);
    EXPECT_EQ(parse_of("/tmp/y.trc,-1"), success());
    EXPECT_EQ(requested("/tmp/y.trc"), 0xFFFFFFFFU);
}

TEST(FileSizeLanguage, MeansTheDefaultFileByTheEmptyName)
{
    EXPECT_EQ(parse_of(",8192"), success());
    EXPECT_EQ(anchors.uRequestedFileSize, 8192U);
    EXPECT_EQ(parse_of("\"\" 12288"), success());
    EXPECT_EQ(anchors.uRequestedFileSize, 12288U);
    EXPECT_EQ(anchors.numAnchors, 1U);
}

TEST(FileSizeLanguage, RefusesAnEmptyValueWithoutAMessage)
{
    leave_marker();
    EXPECT_EQ(parse_fileSize_spec(""), 17);
    EXPECT_TRUE(marker_is_there());
}

TEST(FileSizeLanguage, ReportsAMissingSizeAtItsPlaceInTheValue)
{
    EXPECT_EQ(parse_of("/tmp/x.trc"), syntax_error(11, 10));
    EXPECT_EQ(parse_of("/tmp/x.trc,"), syntax_error(11, 11));
    EXPECT_EQ(parse_of("/tmp/x.trc,   "), syntax_error(11, 14));
    EXPECT_EQ(parse_of("/tmp/a,1;/tmp/b"), syntax_error(11, 15));
    EXPECT_EQ(parse_of("\"/tmp/x,64"), syntax_error(11, 10)) << "the quote is never closed";
}

TEST(FileSizeLanguage, KeepsTheElementsBeforeAFaultyOne)
{
    EXPECT_EQ(parse_of("/tmp/a,1111;/tmp/b;/tmp/c,3333"), syntax_error(11, 18));
    EXPECT_EQ(requested("/tmp/a"), 1111U);
    EXPECT_EQ(findOrCreateAnchorForFile("/tmp/b", 0), nullptr);
    EXPECT_EQ(findOrCreateAnchorForFile("/tmp/c", 0), nullptr);
}

TEST(FileSizeLanguage, FailsWhenAnAnchorCannotBeMade)
{
    const failing_allocation out_of_memory(1);
    const int status = parse_fileSize_spec("/tmp/a,1111");
    ASSERT_TRUE(out_of_memory.happened());
    EXPECT_EQ(after(status), no_memory());
    EXPECT_EQ(anchors.numAnchors, 1U);
}

TEST(FileSizeLanguage, IsReadFromTheEnvironment)
{
    setenv("QN_TR_FILE_SIZE", "/tmp/a,1111", 1);
    client made("AB", 1, 0);
    ASSERT_EQ(made.register_now(), 0);
    EXPECT_EQ(requested("/tmp/a"), 1111U);
}

TEST(FileSize, IsKeptForAFileThatIsNotStarted)
{
    const scratch files;
    leave_marker();
    EXPECT_EQ(after(tr_set_file_size_1((files / "a.trc").c_str(), 12345)), success());
    EXPECT_EQ(requested(files / "a.trc"), 12345U);
    EXPECT_FALSE(std::filesystem::exists(files / "a.trc"));
    qn_uint32_t size = 0;
    EXPECT_EQ(after(tr_get_file_size_1((files / "a.trc").c_str(), &size)), not_active);
    EXPECT_EQ(size, 12345U);
}

TEST(FileSize, IsTheMappedSizeOfAFileThatIsStarted)
{
    const scratch files;
    ASSERT_EQ(tr_set_file_size_1((files / "a.trc").c_str(), 65537), 0);
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    leave_marker();
    qn_uint32_t size = 0;
    EXPECT_EQ(after(tr_get_file_size_1((files / "a.trc").c_str(), &size)), success());
    EXPECT_EQ(size, 69632U);
    EXPECT_EQ(std::filesystem::file_size(files / "a.trc"), 69632U);
}

TEST(FileSize, OfTheDefaultFileGoesByNoName)
{
    const scratch files;
    qn_uint32_t size = 0;
    EXPECT_EQ(after(tr_get_size_1(&size)), not_active);
    EXPECT_EQ(size, 65536U);
    EXPECT_EQ(after(tr_set_size_1(8192)), success());
    EXPECT_EQ(after(tr_get_file_size_1("", &size)), not_active);
    EXPECT_EQ(size, 8192U);
    ASSERT_EQ(tr_set_filename_1((files / "a.trc").c_str()), 0);
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    EXPECT_EQ(after(tr_get_size_1(&size)), success());
    EXPECT_EQ(size, 8192U);
    EXPECT_EQ(std::filesystem::file_size(files / "a.trc"), 8192U);
    EXPECT_EQ(anchors.numAnchors, 1U);
}

TEST(FileSize, OfAnUnknownFileIsRefusedAndMakesNoAnchor)
{
    qn_uint32_t size = 4711;
    EXPECT_EQ(after(tr_get_file_size_1("/tmp/never.trc", &size)), no_name);
    EXPECT_EQ(size, 4711U);
    EXPECT_EQ(anchors.numAnchors, 1U);
}

TEST(FileSize, OfNoFileIsRefused)
{
    qn_uint32_t size = 4711;
    EXPECT_EQ(after(tr_set_file_size_1(nullptr, 8192)), no_name);
    EXPECT_EQ(after(tr_get_file_size_1(nullptr, &size)), no_name);
    EXPECT_EQ(size, 4711U);
    EXPECT_EQ(anchors.uRequestedFileSize, 65536U) << "NULL is not the default file";
}

TEST(FileSize, StaysAsItIsOnceTracingIsStopped)
{
    ASSERT_EQ(tr_set_file_size_1("/tmp/a.trc", 12345), 0);
    global_stop_trace();
    leave_marker();
    qn_uint32_t size = 4711;
    EXPECT_EQ(tr_set_file_size_1("/tmp/a.trc", 99), 0);
    EXPECT_EQ(tr_set_file_size_1("/tmp/b.trc", 99), 0);
    EXPECT_EQ(tr_set_file_size_1(nullptr, 99), 0);
    EXPECT_EQ(tr_set_size_1(99), 0);
    EXPECT_EQ(tr_get_file_size_1("/tmp/a.trc", &size), 0);
    EXPECT_EQ(tr_get_file_size_1("/tmp/c.trc", &size), 0);
    EXPECT_EQ(tr_get_size_1(&size), 0);
    EXPECT_EQ(tr_set_size_in_anchor(&anchors, 99), 0);
    EXPECT_EQ(tr_get_size_from_anchor(&anchors, &size), 0);
    EXPECT_TRUE(marker_is_there());
    EXPECT_EQ(size, 4711U);
    EXPECT_EQ(requested("/tmp/a.trc"), 12345U);
    EXPECT_EQ(anchors.uRequestedFileSize, 65536U);
    EXPECT_EQ(anchors.numAnchors, 2U);
}

TEST(FileSize, FailsWhenTheAnchorsMutexCannotBeTaken)
{
    ASSERT_EQ(tr_set_file_size_1("/tmp/a.trc", 12345), 0);
    trace_anchor_t *anchor = findOrCreateAnchorForFile("/tmp/a.trc", 0);
    qn_uint32_t size = 4711;
    outcome set;
    outcome got;
    {
        const qn::tr::global_lock first_in_order;
        const exhausted_mutex exhausted(anchor->anchorMutex);
        set = after(tr_set_file_size_1("/tmp/a.trc", 99));
        got = after(tr_get_file_size_1("/tmp/a.trc", &size));
    }
    EXPECT_EQ(set, lock_failure(exhausted_mutex::lock_result));
    EXPECT_EQ(got, lock_failure(exhausted_mutex::lock_result));
    EXPECT_EQ(anchor->uRequestedFileSize, 12345U);
    EXPECT_EQ(size, 4711U);
}

TEST(FileSize, GoesOnWithoutTheGlobalMutexWhenThatCannotBeTaken)
{
    ASSERT_EQ(tr_set_file_size_1("/tmp/a.trc", 12345), 0);
    qn_uint32_t size = 0;
    outcome set;
    outcome got;
    {
        const exhausted_mutex exhausted(anchors.anchorMutex);
        set = after(tr_set_file_size_1("/tmp/a.trc", 99));
        got = after(tr_get_file_size_1("/tmp/a.trc", &size));
    }
    EXPECT_EQ(set, success());
    EXPECT_EQ(got, not_active);
    EXPECT_EQ(size, 99U);
}

TEST(FileSize, FailsWhenAnAnchorCannotBeMade)
{
    ASSERT_EQ(tr_set_size_1(8192), 0); // the library is initialised
    const failing_allocation out_of_memory(1);
    const qn_int32_t status = tr_set_file_size_1("/tmp/a.trc", 99);
    ASSERT_TRUE(out_of_memory.happened());
    EXPECT_EQ(after(status), no_memory());
    EXPECT_EQ(anchors.numAnchors, 1U);
}

TEST(FileSize, IsLoggedAlsoByTheCallThatInitialisesTheLibrary)
{
    setenv("QN_TR_DEBUG_LEVEL", "8", 1);
    ASSERT_EQ(tr_set_file_size_1("/tmp/a.trc", 99), 0);
    EXPECT_TRUE(system_log_has("tr_set_file_size: /tmp/a.trc\n"));
    EXPECT_TRUE(system_log_has("^^^ setting size in /tmp/a.trc"));
}

TEST(FileSize, IsNotLoggedWhereNothingChanges)
{
    setenv("QN_TR_DEBUG_LEVEL", "8", 1);
    ASSERT_EQ(tr_set_file_size_1("/tmp/a.trc", 99), 0);
    clear_system_log();
    ASSERT_EQ(tr_set_file_size_1("/tmp/a.trc", 99), 0);
    EXPECT_TRUE(system_log_has("tr_set_file_size: /tmp/a.trc\n"));
    EXPECT_FALSE(system_log_has("^^^ setting size in /tmp/a.trc"));
}
} // namespace
