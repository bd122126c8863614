// A trace split into page files: their names, sizes, links, states, and what a failure leaves.
#include <cerrno>
#include <filesystem>

#include <gtest/gtest.h>

#include "files/page_set.h"
#include "files/support_calls.h"

namespace
{
using namespace qn::test;

TEST_F(PageSet, HasOneFileForEachPage)
{
    ASSERT_EQ(start_set("t", 3), 0);
    EXPECT_STREQ(head->fileName, (folder / "t.1.sp").c_str());
    EXPECT_STREQ(page(2)->fileName, (folder / "t.2.sp").c_str());
    EXPECT_STREQ(page(3)->fileName, (folder / "t.3.sp").c_str());
    for (const char *name : {"t.1.sp", "t.2.sp", "t.3.sp"}) EXPECT_TRUE(exists(folder / name)) << name;
    EXPECT_FALSE(exists(folder / "t"));
    EXPECT_FALSE(exists(folder / "t.4.sp"));
}

TEST_F(PageSet, IsARingThatItsHeadLeads)
{
    ASSERT_EQ(start_set("t", 3), 0);
    EXPECT_NE(page(2), head);
    EXPECT_NE(page(3), page(2));
    EXPECT_EQ(page(3)->nextPage, head);
    for (int number = 1; number <= 3; ++number) {
        EXPECT_EQ(page(number)->p_head_spool_anchor, head);
        EXPECT_EQ(page(number)->ppActivePg, &head->pActivePg);
        EXPECT_EQ(page(number)->pSpoolMutex, head->pSpoolMutex);
        EXPECT_EQ(page(number)->spool, &spool);
        EXPECT_NE(page(number)->pMap, nullptr);
    }
    EXPECT_EQ(head->pActivePg, head);
    EXPECT_NE(head->pSpoolMutex, nullptr);
    EXPECT_EQ(anchors.numAnchors, 2U) << "pages are not in the list";
}

TEST_F(PageSet, SharesARecursiveMutex)
{
    ASSERT_EQ(start_set("t", 2), 0);
    ASSERT_EQ(pthread_mutex_lock(head->pSpoolMutex), 0);
    EXPECT_EQ(pthread_mutex_trylock(head->pSpoolMutex), 0);
    EXPECT_FALSE(is_free(*head->pSpoolMutex));
    pthread_mutex_unlock(head->pSpoolMutex);
    pthread_mutex_unlock(head->pSpoolMutex);
    EXPECT_TRUE(is_free(*head->pSpoolMutex));
}

// From the moment that the set's lock is the one that writers take.
TEST_F(PageSet, IsLockedWhileItIsMade)
{
    int mapped = 0;
    calls().mmap = [&](size_t size, int protection, int flags, int fd, off_t offset) {
        EXPECT_EQ(qn::tr::anchor_set_mutex(head), head->pSpoolMutex);
        EXPECT_FALSE(is_free(*head->pSpoolMutex));
        ++mapped;
        return __real_mmap(nullptr, size, protection, flags, fd, offset);
    };
    EXPECT_EQ(start_set("t", 2), 0);
    calls() = {};
    EXPECT_EQ(mapped, 2);
    EXPECT_TRUE(is_free(*head->pSpoolMutex));
}

TEST_F(PageSet, IsFoundByTheNameOfTheTrace)
{
    ASSERT_EQ(start_set("t", 3), 0);
    EXPECT_EQ(findOrCreateAnchorForFile((folder / "t").c_str(), 1), head);
    trace_anchor_t *other = findOrCreateAnchorForFile((folder / "t.2.sp").c_str(), 1);
    EXPECT_NE(other, head);
    EXPECT_NE(other, page(2));
}

TEST_F(PageSet, HasItsHeadActiveAndTheOthersReady)
{
    ASSERT_EQ(start_set("t", 3), 0);
    EXPECT_EQ(trace_image::of_file(folder / "t.1.sp").u8(192), 1);
    EXPECT_EQ(trace_image::of_file(folder / "t.2.sp").u8(192), 4);
    EXPECT_EQ(trace_image::of_file(folder / "t.3.sp").u8(192), 4);
}

TEST_F(PageSet, HasOneStartRecordInItsActivePage)
{
    ASSERT_EQ(start_set("t", 3), 0);
    const auto records = trace_image::of_file(folder / "t.1.sp").records();
    ASSERT_EQ(records.size(), 1U);
    EXPECT_EQ(records[0].function(), 16);
    EXPECT_TRUE(trace_image::of_file(folder / "t.2.sp").records().empty());
    EXPECT_TRUE(trace_image::of_file(folder / "t.3.sp").records().empty());
}

TEST_F(PageSet, TakesRecordsInItsActivePageThroughAnyPage)
{
    ASSERT_EQ(start_set("t", 3), 0);
    EXPECT_EQ(tr_ms_record_id_1("TEST", 7, page(2)), 0);
    EXPECT_EQ(ids_in(folder / "t.1.sp"), std::vector<uint32_t>{7});
}

TEST_F(PageSet, OfOnePageLeadsToItself)
{
    ASSERT_EQ(start_set("t", 1), 0);
    EXPECT_STREQ(head->fileName, (folder / "t.1.sp").c_str());
    EXPECT_EQ(head->nextPage, head);
    EXPECT_EQ(trace_image::of_file(folder / "t.1.sp").u8(192), 1);
    EXPECT_FALSE(exists(folder / "t.2.sp"));
}

TEST_F(PageSet, TellsWhatItCreates)
{
    debug_on();
    ASSERT_EQ(start_set("t", 3), 0);
    EXPECT_TRUE(system_log_has("creating page '" + folder / "t.1.sp" + "'\n"));
    EXPECT_TRUE(system_log_has("creating page anchor '" + folder / "t.2.sp" + "'\n"));
    EXPECT_TRUE(system_log_has("creating page anchor '" + folder / "t.3.sp" + "'\n"));
    EXPECT_TRUE(system_log_has("init_trace_header: setting " + folder / "t.1.sp" + " to TR_ACTIVE\n"));
    EXPECT_TRUE(system_log_has("init_trace_header: setting " + folder / "t.2.sp" + " to TR_READY\n"));
    EXPECT_TRUE(system_log_has("init_trace_header: setting " + folder / "t.3.sp" + " to TR_READY\n"));
}

TEST_F(PageSet, IsNotMadeUnlessTracesMayHavePages)
{
    anchors.bMultipageEnabled = 0;
    ASSERT_EQ(start_set("t", 3), 0);
    EXPECT_EQ(head->nextPage, nullptr);
    EXPECT_TRUE(exists(folder / "t"));
    EXPECT_EQ(trace_image::of_file(folder / "t").records_of(16).size(), 1U);
}

TEST_F(PageSet, IsNotMadeByASpecificationThatIsOff)
{
    spool.onoff = 0;
    ASSERT_EQ(start_set("t", 3), 0);
    EXPECT_EQ(head->nextPage, nullptr);
    EXPECT_STREQ(head->fileName, (folder / "t").c_str());
    EXPECT_EQ(trace_image::of_file(folder / "t").u8(192), 0);
    EXPECT_EQ(trace_image::of_file(folder / "t").records_of(16).size(), 1U);
}

TEST_F(PageSet, IsNotMadeOfNoPages)
{
    ASSERT_EQ(start_set("t", 0), 0);
    EXPECT_EQ(head->nextPage, nullptr);
    EXPECT_TRUE(exists(folder / "t"));
}

TEST_F(PageSet, LeavesASingleFileItsStartRecordAndNoState)
{
    ASSERT_EQ(start_set("t", 0), 0);
    EXPECT_EQ(trace_image::of_file(folder / "t").records_of(16).size(), 1U);
    EXPECT_EQ(trace_image::of_file(folder / "t").u8(192), 0);
}

TEST_F(PageSet, LeavesASingleFileThatIsContinuedItsStartRecordAndNoState)
{
    ASSERT_EQ(start_set("t", 0), 0);
    stop(head);
    for (const uint8_t state : {1, 4}) {
        put<uint8_t>(folder / "t", 192, state);
        ASSERT_EQ(start(head), 0);
        EXPECT_EQ(trace_image::of_file(folder / "t").u8(192), 0);
        stop(head);
    }
    EXPECT_EQ(trace_image::of_file(folder / "t").records_of(16).size(), 3U);
}

struct page_size {
    qn_uint32_t specified;
    qn_uint32_t requested; // of the whole trace, split into three pages
    qn_uint32_t adjusted;
    qn_uint32_t file;
};

void PrintTo(const page_size &given, std::ostream *out) { *out << given.specified << " of " << given.requested; }

class PageSizes : public PageSet, public testing::WithParamInterface<page_size>
{
};

TEST_P(PageSizes, AreReckonedAndWrittenBack)
{
    spool.pg_size = GetParam().specified;
    ASSERT_EQ(start_set("t", 3, GetParam().requested), 0);
    EXPECT_EQ(spool.pg_size, GetParam().adjusted);
    for (int number = 1; number <= 3; ++number) {
        EXPECT_EQ(page(number)->uRequestedFileSize, GetParam().adjusted);
        EXPECT_EQ(trace_image::of_file(page(number)->fileName).size(), GetParam().file);
    }
}

// With memory pages of 4096 bytes, bit 12 is cleared behind the addition.
INSTANTIATE_TEST_SUITE_P(Values, PageSizes,
                         testing::Values(page_size{0, 196608, 65536, 65536}, page_size{0, 65536, 25941, 28672},
                                         page_size{65536, 1, 65536, 65536}, page_size{65537, 1, 65537, 69632},
                                         page_size{69632, 1, 73728, 73728}, page_size{4096, 1, 8192, 8192},
                                         page_size{8192, 1, 8192, 8192}, page_size{4095, 1, 4095, 4096},
                                         page_size{20480, 1, 24576, 24576}));

struct trace_name {
    const char *given;
    const char *first_page;
};

void PrintTo(const trace_name &name, std::ostream *out) { *out << name.given; }

class PageNames : public PageSet, public testing::WithParamInterface<trace_name>
{
};

TEST_P(PageNames, AreMadeOfTheBaseName)
{
    std::filesystem::create_directory(folder / "d.d");
    ASSERT_EQ(start_set(GetParam().given, 2), 0);
    EXPECT_STREQ(head->fileName, (folder / GetParam().first_page).c_str());
    EXPECT_TRUE(exists(folder / GetParam().first_page));
}

// Only a name whose first ".sp" ends it is cut, at its second dot from the end, wherever that is.
INSTANTIATE_TEST_SUITE_P(Values, PageNames,
                         testing::Values(trace_name{"t", "t.1.sp"}, trace_name{"t.3.sp", "t.1.sp"},
                                         trace_name{"t.1.sp", "t.1.sp"}, trace_name{"t.a.sp", "t.1.sp"},
                                         trace_name{"t.x.12.sp", "t.x.1.sp"}, trace_name{"t.sp.1.sp", "t.sp.1.sp.1.sp"},
                                         trace_name{"t.spx", "t.spx.1.sp"}, trace_name{"t.log", "t.log.1.sp"},
                                         trace_name{"d.d/t.sp", "d.1.sp"}));

TEST_F(PageSet, KeepsTheEarlierPagesMappedWhenOneCannotBeStarted)
{
    std::filesystem::create_directory(folder / "t.2.sp");
    EXPECT_EQ(start_set("t", 3), 18);
    EXPECT_EQ(last_error().text, "2625-017 Error " + std::to_string(EISDIR) + " opening trace file.\n");
    EXPECT_NE(head->pMap, nullptr);
    EXPECT_EQ(page(2)->pMap, nullptr);
    EXPECT_EQ(page(3)->pMap, nullptr);
    EXPECT_TRUE(trace_image::of_file(folder / "t.1.sp").records().empty()) << "no start record";
}

TEST_F(PageSet, CannotBeMadeWithoutMemoryForItsMutex)
{
    prepare("t", 3);
    calls().malloc = [](size_t) -> void * { return nullptr; };
    EXPECT_EQ(start(head), 14);
    EXPECT_EQ(last_error().code, 14);
    EXPECT_EQ(last_error().text, "2625-013 Memory allocation failed.\n");
    EXPECT_EQ(head->pMap, nullptr);
    EXPECT_TRUE(is_free(head->anchorMutex));
}

TEST_F(PageSet, CannotBeMadeWithoutMemoryForAPage)
{
    prepare("t", 3);
    int allocations = 0;
    calls().calloc = [&](size_t count, size_t bytes) {
        return ++allocations < 2 ? __real_calloc(count, bytes) : nullptr;
    };
    EXPECT_EQ(start(head), -1);
    calls() = {};
    EXPECT_EQ(last_error().code, 14);
    EXPECT_EQ(last_error().text, "2625-013 Memory allocation failed.\n");
    EXPECT_EQ(head->pMap, nullptr);
    EXPECT_EQ(head->nextPage, nullptr) << "a single file as before";

    EXPECT_EQ(start(head), 0);
    for (int number = 1; number <= 3; ++number)
        EXPECT_NE(page(number)->pMap, nullptr) << "the next start makes all of the ring";
}

TEST_F(PageSet, IsStoppedInTheOrderOfTheRing)
{
    ASSERT_EQ(start_set("t", 3), 0);
    debug_on();
    {
        const qn::tr::anchor_set_lock set(page(2));
        EXPECT_EQ(stop_trace(page(2), 0), 0);
    }
    std::vector<std::string> stopped;
    for (const std::string &text : debug_lines())
        if (text.rfind("**@ stop_trace_page enter for ", 0) == 0) stopped.push_back(text);
    const std::string before = "**@ stop_trace_page enter for " + folder.folder() + "/";
    EXPECT_EQ(stopped, (std::vector<std::string>{before + "t.2.sp\n", before + "t.3.sp\n", before + "t.1.sp\n"}));
    for (int number = 1; number <= 3; ++number) EXPECT_EQ(page(number)->pMap, nullptr);
    EXPECT_EQ(head->nextPage, page(2)) << "the ring stays";
}
} // namespace
