// The queue of full pages and files: its order, its links, its answers, its lock.
#include <cstdlib>
#include <cstring>
#include <memory>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

// A queue of its own, with pages that have nothing but a name and a header.
class Queue : public testing::Test
{
protected:
    Queue()
    {
        init_recursive_mutex(&queue.mutex);
        pthread_cond_init(&queue.cond, nullptr);
    }
    ~Queue() override
    {
        for (sp_q_element_t *element = queue.pFirst; element != nullptr;) {
            sp_q_element_t *older = element->pNext;
            std::free(element);
            element = older;
        }
        pthread_cond_destroy(&queue.cond);
        pthread_mutex_destroy(&queue.mutex);
    }

    class page
    {
    public:
        explicit page(const char *name)
        {
            std::strcpy(anchor_->fileName, name);
            anchor_->pMap = reinterpret_cast<unsigned char *>(&header_);
        }
        operator trace_anchor_t *() const { return anchor_.get(); }
        trace_anchor_t *operator->() const { return anchor_.get(); }

    private:
        trace_file_header_t header_{};
        std::unique_ptr<trace_anchor_t> anchor_ = std::make_unique<trace_anchor_t>();
    };

    trace_anchor_t *enqueue(trace_anchor_t *full) { return spool_enqueue(nullptr, nullptr, full, &queue, 0); }
    void enqueue_all()
    {
        for (const page *full : {&p1, &p2, &p3}) enqueue(*full);
    }

    // The pages by their names, newest first, after a look at every link.
    std::vector<std::string> newest_first() const
    {
        std::vector<std::string> names;
        const sp_q_element_t *newer = nullptr;
        for (const sp_q_element_t *element = queue.pFirst; element != nullptr; element = element->pNext) {
            EXPECT_EQ(element->pPrev, newer);
            names.emplace_back(element->pAnchor != nullptr ? element->pAnchor->fileName : element->fileName);
            newer = element;
        }
        EXPECT_EQ(queue.pLast, newer);
        EXPECT_EQ(queue.cnt, static_cast<qn_int32_t>(names.size()));
        return names;
    }
    std::string take_oldest()
    {
        sp_q_element_t *oldest = spool_dequeue_last_element_inside_spq(&queue);
        if (oldest == nullptr) return "(none)";
        std::string name = oldest->pAnchor->fileName;
        std::free(oldest);
        return name;
    }
    bool dequeue(trace_anchor_t *which)
    {
        sp_q_element_t *element = spool_dequeue_element(&queue, which);
        if (element == nullptr) return false;
        EXPECT_EQ(element->pAnchor, which);
        std::free(element);
        return true;
    }

    page p1{"P1"}, p2{"P2"}, p3{"P3"};
    sp_q_t queue{};
};

using names = std::vector<std::string>;

TEST_F(Queue, GivesTheOldestFirst)
{
    enqueue_all();
    EXPECT_EQ(take_oldest(), "P1");
    EXPECT_EQ(take_oldest(), "P2");
    EXPECT_EQ(take_oldest(), "P3");
    EXPECT_EQ(take_oldest(), "(none)");
}

TEST_F(Queue, TakesNewElementsAtItsHead)
{
    enqueue_all();
    EXPECT_EQ(newest_first(), (names{"P3", "P2", "P1"}));
}

TEST_F(Queue, KeepsItsLinksWhileItIsEmptied)
{
    enqueue_all();
    take_oldest();
    EXPECT_EQ(newest_first(), (names{"P3", "P2"}));
    take_oldest();
    EXPECT_EQ(newest_first(), names{"P3"});
    take_oldest();
    EXPECT_EQ(newest_first(), names{});
    enqueue(p2);
    EXPECT_EQ(newest_first(), names{"P2"});
}

TEST_F(Queue, HoldsAPageByItsAnchorAlone)
{
    spool_enqueue("ignored", "ignored too", p1, &queue, 1);
    ASSERT_NE(queue.pFirst, nullptr);
    EXPECT_EQ(queue.pFirst->pAnchor, p1);
    EXPECT_STREQ(queue.pFirst->fileName, "");
    EXPECT_EQ(queue.pFirst->dest, nullptr);
}

TEST_F(Queue, HoldsAFileByACopyOfItsNameAndTheCallersDestination)
{
    char file[] = "/tmp/f";
    const char *dest = "/d";
    EXPECT_EQ(spool_enqueue(file, dest, nullptr, &queue, 1), nullptr);
    file[1] = 'X';
    ASSERT_NE(queue.pFirst, nullptr);
    EXPECT_EQ(queue.pFirst->pAnchor, nullptr);
    EXPECT_STREQ(queue.pFirst->fileName, "/tmp/f");
    EXPECT_EQ(queue.pFirst->dest, dest);
    EXPECT_EQ(queue.pFirst->del, 1);
}

TEST_F(Queue, TakesAFileNameThatFillsItsField)
{
    const std::string file(4095, 'f');
    spool_enqueue(file.c_str(), "/d", nullptr, &queue, 0);
    ASSERT_NE(queue.pFirst, nullptr);
    EXPECT_EQ(queue.pFirst->fileName, file);
    EXPECT_EQ(queue.pFirst->del, 0);
}

TEST_F(Queue, CutsALongerFileName)
{
    const std::string file(5000, 'f');
    const char *dest = "/d";
    spool_enqueue(file.c_str(), dest, nullptr, &queue, 0);
    ASSERT_NE(queue.pFirst, nullptr);
    EXPECT_EQ(queue.pFirst->fileName, file.substr(0, 4095));
    EXPECT_EQ(queue.pFirst->dest, dest);
}

TEST_F(Queue, AnswersWithTheNextPage)
{
    p1->nextPage = p2;
    p1->p_head_spool_anchor = p3;
    EXPECT_EQ(enqueue(p1), p2);
}

TEST_F(Queue, AnswersWithTheNextPageEvenIfThatIsQueued)
{
    p1->nextPage = p2;
    p2->nextPage = p1;
    enqueue(p2);
    EXPECT_EQ(enqueue(p1), p2);
}

TEST_F(Queue, AnswersWithTheHeadWhenThereIsNoNextPage)
{
    p1->p_head_spool_anchor = p3;
    EXPECT_EQ(enqueue(p1), p3);
}

TEST_F(Queue, HoldsAPageAsOftenAsItIsQueued)
{
    enqueue(p1);
    enqueue(p2);
    enqueue(p1);
    EXPECT_EQ(newest_first(), (names{"P1", "P2", "P1"}));
}

TEST_F(Queue, GivesUpTheNewerElementOfAPageFirst)
{
    enqueue(p1);
    const sp_q_element_t *older = queue.pLast;
    enqueue(p2);
    enqueue(p1);
    EXPECT_TRUE(dequeue(p1));
    EXPECT_EQ(newest_first(), (names{"P2", "P1"}));
    EXPECT_EQ(queue.pLast, older);
    EXPECT_TRUE(dequeue(p1));
    EXPECT_EQ(newest_first(), names{"P2"});
}

TEST_F(Queue, HasNothingOfAPageThatIsNotQueued)
{
    enqueue(p1);
    spool_enqueue("/f", "/d", nullptr, &queue, 0);
    EXPECT_FALSE(dequeue(p2));
    EXPECT_EQ(newest_first(), (names{"/f", "P1"}));
}

TEST_F(Queue, HasNothingWhenItIsEmpty)
{
    EXPECT_FALSE(dequeue(p1));
    spool_dequeue_and_delete_element(&queue, p1);
    EXPECT_EQ(newest_first(), names{});
}

TEST_F(Queue, GivesUpItsOnlyElement)
{
    enqueue(p1);
    EXPECT_TRUE(dequeue(p1));
    EXPECT_EQ(newest_first(), names{});
}

TEST_F(Queue, GivesUpItsOldestElement)
{
    enqueue_all();
    EXPECT_TRUE(dequeue(p1));
    EXPECT_EQ(newest_first(), (names{"P3", "P2"}));
}

TEST_F(Queue, GivesUpItsNewestElement)
{
    enqueue_all();
    EXPECT_TRUE(dequeue(p3));
    EXPECT_EQ(newest_first(), (names{"P2", "P1"}));
}

TEST_F(Queue, GivesUpAnElementInItsMiddle)
{
    enqueue_all();
    EXPECT_TRUE(dequeue(p2));
    EXPECT_EQ(newest_first(), (names{"P3", "P1"}));
}

TEST_F(Queue, DeletesTheElementOfAPage)
{
    enqueue_all();
    spool_dequeue_and_delete_element(&queue, p2);
    EXPECT_EQ(newest_first(), (names{"P3", "P1"}));
}

TEST_F(Queue, TakesNothingWithoutMemory)
{
    enqueue(p1);
    p2->nextPage = p3;
    calls().malloc = [](size_t) -> void * { return nullptr; };
    calls().calloc = [](size_t, size_t) -> void * { return nullptr; };
    EXPECT_EQ(enqueue(p2), nullptr);
    calls() = {};
    EXPECT_EQ(last_error().code, 14);
    EXPECT_EQ(last_error().text, "2625-013 Memory allocation failed.\n");
    EXPECT_EQ(newest_first(), names{"P1"});
    EXPECT_TRUE(is_free(queue.mutex));
}

TEST_F(Queue, WakesOneWaiterWhenAnElementIsIn)
{
    int signals = 0;
    calls().cond_signal = [&](pthread_cond_t *condition) {
        EXPECT_EQ(condition, &queue.cond);
        EXPECT_EQ(queue.cnt, 1);
        EXPECT_NE(queue.pFirst, nullptr);
        EXPECT_FALSE(is_free(queue.mutex));
        ++signals;
        return 0;
    };
    enqueue(p1);
    EXPECT_EQ(signals, 1);
}

TEST_F(Queue, WakesNobodyWhenAnElementLeaves)
{
    enqueue_all();
    calls().cond_signal = [&](pthread_cond_t *) {
        ADD_FAILURE() << "nothing to be done";
        return 0;
    };
    dequeue(p2);
    take_oldest();
}

TEST_F(Queue, IsLockedOnlyDuringTheCalls)
{
    enqueue(p1);
    EXPECT_TRUE(is_free(queue.mutex));
    dequeue(p1);
    EXPECT_TRUE(is_free(queue.mutex));
}

// Every debug line is a place where a thread may be cancelled.
TEST_F(Queue, IsUnlockedWhenAThreadIsCancelledInside)
{
    debug_on();
    cancelled_thread thread;
    spool_calls().log_line = [&](const std::string &text) {
        if (text.rfind("spool_enqueue after: ", 0) == 0) thread.block();
    };
    EXPECT_TRUE(thread.run([this] { enqueue(p1); }));
    EXPECT_TRUE(is_free(queue.mutex));

    cancelled_thread second;
    spool_calls().log_line = [&](const std::string &text) {
        if (text.rfind("spool_dequeue_element after: ", 0) == 0) second.block();
    };
    EXPECT_TRUE(second.run([this] { spool_dequeue_element(&queue, p2); }));
    EXPECT_TRUE(is_free(queue.mutex));
}

TEST_F(Queue, IsLockedWhileAPageIsTakenOut)
{
    enqueue(p1);
    debug_on();
    int lines = 0;
    spool_calls().log_line = [&](const std::string &) {
        ++lines;
        EXPECT_FALSE(is_free(queue.mutex));
    };
    EXPECT_TRUE(dequeue(p1));
    EXPECT_GT(lines, 0);
}
} // namespace
