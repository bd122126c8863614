// The default trace file's name: setting it in every way, and reading it.
#include <cerrno>
#include <filesystem>

#include <gtest/gtest.h>

#include "files/page_set.h"
#include "files/support_calls.h"
#include "trace/files/locks.h"

namespace
{
using namespace qn::test;

std::string current_name()
{
    char name[4096];
    EXPECT_EQ(tr_get_filename_1(name), 0);
    return name;
}

size_t starts_in(const std::string &file) { return trace_image::of_file(file).records_of(16).size(); }

class DefaultFile : public testing::Test
{
protected:
    void TearDown() override
    {
        calls() = {};
        EXPECT_EQ(tr_set_filename_1(nullptr), 0);
    }

    // A component with something to trace, tracing to "f".
    void trace_to_f()
    {
        ASSERT_EQ(program.register_now(), 0);
        ASSERT_EQ(tr_set_filename_1(f.c_str()), 0);
        ASSERT_NE(anchors.pMap, nullptr);
    }

    scratch folder;
    std::string f = folder / "f";
    std::string g = folder / "g";
    client program{"ABCD"};
};

TEST_F(DefaultFile, IsUnnamedAtFirst) { EXPECT_EQ(current_name(), ""); }

TEST_F(DefaultFile, IsStartedWhenItIsNamedAndSomethingTraces)
{
    ASSERT_EQ(program.register_now(), 0);
    EXPECT_EQ(tr_set_filename_1(f.c_str()), 0);
    EXPECT_EQ(current_name(), f);
    EXPECT_EQ(starts_in(f), 1U);
    EXPECT_EQ(tr_record_id_1("ABCD", 1), 0);
    EXPECT_EQ(ids_in(f), std::vector<uint32_t>{1});
}

TEST_F(DefaultFile, IsOnlyNamedWhileNothingTraces)
{
    EXPECT_EQ(tr_set_filename_1(f.c_str()), 0);
    EXPECT_EQ(current_name(), f);
    EXPECT_FALSE(exists(f));
    EXPECT_EQ(anchors.pMap, nullptr);
}

TEST_F(DefaultFile, StaysAsItIsUnderItsCurrentName)
{
    trace_to_f();
    const unsigned char *map = anchors.pMap;
    EXPECT_EQ(tr_set_filename_1(f.c_str()), 0);
    EXPECT_EQ(anchors.pMap, map);
    EXPECT_EQ(starts_in(f), 1U);
    EXPECT_EQ(last_error().code, 0);
}

TEST_F(DefaultFile, StaysUnnamedUnderTheEmptyName)
{
    leave_marker();
    EXPECT_EQ(tr_set_filename_1(""), 0);
    EXPECT_EQ(current_name(), "");
    EXPECT_EQ(last_error().code, 0);
}

TEST_F(DefaultFile, MovesToAnotherName)
{
    trace_to_f();
    qn::tr::header_of(&anchors)->uFlags = 0x8000;
    EXPECT_EQ(tr_record_id_1("ABCD", 1), 0);
    EXPECT_EQ(tr_set_filename_1(g.c_str()), 0);
    EXPECT_EQ(tr_record_id_1("ABCD", 2), 0);
    EXPECT_EQ(current_name(), g);
    EXPECT_EQ(ids_in(f), std::vector<uint32_t>{1});
    EXPECT_EQ(trace_image::of_file(f).u16(4), 0) << "the old file was stopped cleanly";
    EXPECT_EQ(ids_in(g), std::vector<uint32_t>{2});
}

TEST_F(DefaultFile, ComesBackToItsEarlierName)
{
    trace_to_f();
    EXPECT_EQ(tr_record_id_1("ABCD", 1), 0);
    EXPECT_EQ(tr_set_filename_1(g.c_str()), 0);
    EXPECT_EQ(tr_set_filename_1(f.c_str()), 0);
    EXPECT_EQ(tr_record_id_1("ABCD", 2), 0);
    EXPECT_EQ(ids_in(f), (std::vector<uint32_t>{1, 2}));
    EXPECT_EQ(starts_in(f), 2U);
}

TEST_F(DefaultFile, EndsUnderTheEmptyName)
{
    trace_to_f();
    EXPECT_EQ(tr_set_filename_1(""), 0);
    EXPECT_EQ(current_name(), "");
    EXPECT_EQ(anchors.pMap, nullptr);
    EXPECT_EQ(tr_record_id_1("ABCD", 1), 0);
    EXPECT_TRUE(ids_in(f).empty());
    EXPECT_EQ(program.levels[0], 1) << "the component stays";
}

TEST_F(DefaultFile, KeepsTheNewNameWhenThatCannotBeStarted)
{
    trace_to_f();
    const std::string missing = folder / "missing/f";
    EXPECT_EQ(tr_set_filename_1(missing.c_str()), 18);
    EXPECT_EQ(last_error().code, 18);
    EXPECT_EQ(last_error().text, "2625-017 Error " + std::to_string(ENOENT) + " opening trace file.\n");
    EXPECT_EQ(current_name(), missing);
    EXPECT_EQ(anchors.pMap, nullptr);
    EXPECT_EQ(tr_record_id_1("ABCD", 1), 0);
}

TEST_F(DefaultFile, StopsWithEveryOtherFileForANullPointer)
{
    trace_to_f();
    trace_anchor_t *other = anchor_for(g);
    ASSERT_EQ(start(other), 0);
    EXPECT_EQ(tr_set_filename_1(nullptr), 0);
    EXPECT_EQ(anchors.pMap, nullptr);
    EXPECT_EQ(other->pMap, nullptr);
    EXPECT_EQ(current_name(), f) << "the names stay";
    EXPECT_EQ(other->fileName, g);
    EXPECT_EQ(master_override_off(), 0);
}

TEST_F(DefaultFile, IsNotStartedAgainUnderItsNameOnceItWasStopped)
{
    trace_to_f();
    ASSERT_EQ(tr_set_filename_1(nullptr), 0);
    EXPECT_EQ(tr_set_filename_1(f.c_str()), 0);
    EXPECT_EQ(anchors.pMap, nullptr);
}

TEST_F(DefaultFile, CannotBeNamedOrReadWithoutTheLock)
{
    ASSERT_EQ(tr_set_filename_1(f.c_str()), 0);
    const std::string text =
        "2625-008 Internal error. Not able to obtain mutex lock, error=" + std::to_string(EAGAIN) + ".\n";
    char name[4096] = "untouched";
    {
        const exhausted_mutex global(anchors.anchorMutex);
        EXPECT_EQ(tr_set_filename_1(g.c_str()), 9);
        EXPECT_EQ(last_error().code, 9);
        EXPECT_EQ(last_error().text, text);
        EXPECT_EQ(tr_set_filename_1(nullptr), 9);
        cu_set_no_error_1();
        EXPECT_EQ(tr_get_filename_1(name), 9);
        EXPECT_EQ(last_error().message_number, 9);
        EXPECT_EQ(last_error().text, text);
    }
    EXPECT_STREQ(name, "untouched");
    EXPECT_EQ(current_name(), f);
}

TEST_F(DefaultFile, LeavesTheLockFreeWhenItsCallerIsCancelled)
{
    trace_to_f();
    cancelled_thread thread;
    calls().msync = [&](void *, size_t, int) {
        thread.block();
        return 0;
    };
    EXPECT_TRUE(thread.run([&] { tr_set_filename_1(g.c_str()); }));
    EXPECT_TRUE(is_free(anchors.anchorMutex));
    EXPECT_TRUE(is_free(spq.mutex));
    calls() = {};
    EXPECT_EQ(tr_set_filename_1(g.c_str()), 0);
    EXPECT_EQ(starts_in(g), 1U);
}

// The default trace as a set of pages: its trace's name is "t".
class DefaultPageSet : public PageSet
{
protected:
    void SetUp() override
    {
        ASSERT_EQ(program.register_now(), 0);
        anchors.bMultipageEnabled = 1;
        spool.pages = 2;
        spool.pg_size = 65536;
        anchors.spool = &spool;
        anchors.uRequestedFileSize = requested_size;
        ASSERT_EQ(tr_set_filename_1((folder / "t").c_str()), 0);
        ASSERT_NE(anchors.nextPage, nullptr);
        ASSERT_NE(anchors.nextPage, &anchors);
    }
    void TearDown() override
    {
        EXPECT_EQ(tr_set_filename_1(nullptr), 0);
        const qn::tr::anchor_set_lock set(&anchors); // the spool thread looks at it
        qn::tr::store_relaxed(anchors.spool, nullptr);
    }

    // Gives the default trace that name, which no specification governs: a page set of the library's own making.
    qn_uint32_t pages_of_implicit_set(const std::string &name)
    {
        EXPECT_EQ(tr_set_filename_1((folder / name).c_str()), 0);
        qn_uint32_t pages = 0;
        qn::tr::for_each_page(&anchors, [&](const trace_anchor_t *) { ++pages; });
        return pages;
    }

    static constexpr qn_uint32_t requested_size = 2097152;
    client program{"ABCD"};
};

TEST_F(DefaultPageSet, StaysAsItIsUnderTheNameOfItsTrace)
{
    const unsigned char *map = anchors.pMap;
    EXPECT_EQ(tr_set_filename_1((folder / "t").c_str()), 0);
    EXPECT_EQ(anchors.pMap, map);
    EXPECT_EQ(starts_in(folder / "t.1.sp"), 1U);
}

TEST_F(DefaultPageSet, StaysAsItIsUnderTheNameOfItsFirstPage)
{
    const unsigned char *map = anchors.pMap;
    EXPECT_EQ(tr_set_filename_1((folder / "t.1.sp").c_str()), 0);
    EXPECT_EQ(anchors.pMap, map);
    EXPECT_EQ(current_name(), folder / "t.1.sp");
}

TEST_F(DefaultPageSet, IsTakenApartForAnotherName)
{
    EXPECT_EQ(tr_record_id_1("ABCD", 1), 0);
    EXPECT_EQ(tr_set_filename_1((folder / "g").c_str()), 0);
    EXPECT_EQ(tr_record_id_1("ABCD", 2), 0);
    EXPECT_EQ(ids_in(folder / "t.1.sp"), std::vector<uint32_t>{1});
    EXPECT_EQ(findOrCreateAnchorForFile((folder / "t").c_str(), 0), nullptr);
    const std::string now = current_name();
    EXPECT_TRUE(now == folder / "g" || now == folder / "g.1.sp") << now;
    EXPECT_EQ(ids_in(now), std::vector<uint32_t>{2});
    qn::tr::for_each_page(&anchors, [this](const trace_anchor_t *page) {
        EXPECT_EQ(std::string(page->fileName).rfind(folder / "g", 0), 0U) << page->fileName;
    });
}

// The next file is a single one: traces may have no pages any more.
TEST_F(DefaultPageSet, LeavesTheNextNameTheSizeThatWasAskedFor)
{
    anchors.bMultipageEnabled = 0;
    EXPECT_EQ(tr_set_filename_1((folder / "g").c_str()), 0);
    EXPECT_EQ(trace_image::of_file(folder / "g").size(), requested_size);
}

TEST_F(DefaultPageSet, LeavesTheNextNameTheSizeThatItWasGivenSince)
{
    EXPECT_EQ(tr_set_size_1(1048576), 0);
    anchors.bMultipageEnabled = 0;
    EXPECT_EQ(tr_set_filename_1((folder / "g").c_str()), 0);
    EXPECT_EQ(trace_image::of_file(folder / "g").size(), 1048576U);
}

TEST_F(DefaultPageSet, HasAsManyPagesUnderTheNextName)
{
    const qn_uint32_t pages = pages_of_implicit_set("g");
    EXPECT_EQ(pages, requested_size / 262144);
    EXPECT_EQ(pages_of_implicit_set("h"), pages);
}

TEST_F(DefaultPageSet, LeadsAForkedChildToNoFreedPage)
{
    int children = 0;
    calls().free = [&children, page = anchors.nextPage](void *memory) {
        if (memory == page) {
            std::memset(memory, 0xEE, sizeof *page); // as another thread may, which is given that memory
            EXPECT_TRUE(in_child([] { return true; }));
            ++children;
        }
        __real_free(memory);
    };
    EXPECT_EQ(tr_set_filename_1((folder / "g").c_str()), 0);
    EXPECT_EQ(children, 1);
}

TEST_F(DefaultPageSet, LeadsAForkedChildToNoPageThatWasHalfTakenFromTheQueue)
{
    ASSERT_EQ(pthread_mutex_lock(&spq.mutex), 0);
    sp_q_element_t half{};
    half.pAnchor = &anchors;
    spq.pFirst = &half; // and the last one is gone
    spq.cnt = 1;
    EXPECT_TRUE(in_child([] { return tr_set_filename_1(nullptr) == 0; }));
    spq.pFirst = nullptr;
    spq.cnt = 0;
    pthread_mutex_unlock(&spq.mutex);
}

TEST_F(DefaultPageSet, StopsWholeForANullPointer)
{
    const trace_anchor_t *second = anchors.nextPage;
    EXPECT_EQ(tr_set_filename_1(nullptr), 0);
    EXPECT_EQ(anchors.pMap, nullptr);
    EXPECT_EQ(second->pMap, nullptr);
    EXPECT_EQ(anchors.nextPage, second) << "the set stays";
}
} // namespace
