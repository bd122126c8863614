// What the queue tells about itself.
#include <algorithm>
#include <cstdlib>

#include <sys/syslog.h>

#include <gtest/gtest.h>

#include "files/page_set.h"
#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

using lines = std::vector<std::string>;

class QueueLines : public PageSet
{
protected:
    void SetUp() override
    {
        ASSERT_EQ(start_set("t", 3), 0);
        debug_on();
    }
    ~QueueLines() override
    {
        for (const sp_q_element_t *element = spq.pLast; element != nullptr; element = spq.pLast)
            std::free(spool_dequeue_last_element_inside_spq(&spq));
    }

    void enqueue(int number) { spool_enqueue(nullptr, nullptr, page(number), &spq, 0); }
    void dequeue(int number) { std::free(spool_dequeue_element(&spq, page(number))); }
    void enqueue_all()
    {
        for (int number = 1; number <= 3; ++number) enqueue(number);
        clear_system_log();
    }
    std::string name(int number) const { return page(number)->fileName; }

    // The lines that begin so, sorted: the order in which the elements are told is nobody's business.
    static lines beginning(const std::string &text)
    {
        lines found;
        for (const std::string &line : debug_lines())
            if (line.rfind(text, 0) == 0) found.push_back(line);
        std::sort(found.begin(), found.end());
        return found;
    }
};

TEST_F(QueueLines, TellTheQueueBeforeAndAfterAPageComesIn)
{
    enqueue(1);
    EXPECT_EQ(beginning("spool_enqueue before"), lines{"spool_enqueue before: EMPTY\n"});
    EXPECT_EQ(beginning("spool_enqueue after"), lines{"spool_enqueue after: " + name(1) + "\n"});
    clear_system_log();

    enqueue(2);
    EXPECT_EQ(beginning("spool_enqueue before"), lines{"spool_enqueue before: " + name(1) + "\n"});
    EXPECT_EQ(beginning("spool_enqueue after"),
              (lines{"spool_enqueue after: " + name(1) + "\n", "spool_enqueue after: " + name(2) + "\n"}));
}

TEST_F(QueueLines, TellThePageAndItsSuccessor)
{
    page(2)->pMap[192] = 2;
    enqueue(2);
    EXPECT_TRUE(system_log_has(LOG_WARNING, name(2) + " added to queue (flags: 2); switching to " + name(3) +
                                                " (flags: 4 cnt: 1)\n"));
    enqueue(3);
    EXPECT_TRUE(system_log_has(LOG_WARNING, name(3) + " added to queue (flags: 4); switching to " + name(1) +
                                                " (flags: 1 cnt: 2)\n"));
}

TEST_F(QueueLines, TellNothingOfAPageForAFile)
{
    spool_enqueue("/tmp/f", "/d", nullptr, &spq, 0);
    EXPECT_EQ(beginning("/tmp/f"), lines{});
}

TEST_F(QueueLines, TellTheQueueBeforeAndAfterAPageIsTakenOut)
{
    enqueue(1);
    enqueue(2);
    clear_system_log();
    page(1)->pMap[192] = 2;
    dequeue(2);
    EXPECT_TRUE(system_log_has(LOG_WARNING, "spool_dequeue_element (" + name(2) + ")\n"));
    EXPECT_EQ(beginning("spool_dequeue_element before"), (lines{"spool_dequeue_element before: " + name(1) + ":2\n",
                                                                "spool_dequeue_element before: " + name(2) + ":4\n"}));
    EXPECT_TRUE(system_log_has(name(2) + " removing from queue (trace file) (spool_dequeue_element)\n"));
    EXPECT_EQ(beginning("spool_dequeue_element after"), lines{"spool_dequeue_element after: " + name(1) + "\n"});
}

TEST_F(QueueLines, TellThatNothingIsThereToBeTakenOut)
{
    dequeue(1);
    EXPECT_EQ(debug_lines(), (lines{"spool_dequeue_element (" + name(1) + ")\n",
                                    "spool_dequeue_element before: EMPTY\n", "spool_dequeue_element after: EMPTY\n"}));
}

TEST_F(QueueLines, TellThatAPageIsNotQueued)
{
    enqueue(1);
    clear_system_log();
    dequeue(2);
    EXPECT_EQ(beginning(name(2)), lines{});
    EXPECT_EQ(beginning("spool_dequeue_element after"), lines{"spool_dequeue_element after: " + name(1) + "\n"});
}

TEST_F(QueueLines, NameThePlaceOfAnElementThatIsTakenOut)
{
    enqueue_all();
    dequeue(2);
    EXPECT_TRUE(system_log_has("MID\n"));
    clear_system_log();
    dequeue(1);
    EXPECT_TRUE(system_log_has("LAST\n"));
    clear_system_log();
    enqueue(2);
    dequeue(2);
    EXPECT_TRUE(system_log_has("FIRST\n"));
    clear_system_log();
    dequeue(3);
    EXPECT_TRUE(system_log_has("ONLY\n"));
}

TEST_F(QueueLines, NameThePlaceOfTheOldestElement)
{
    enqueue(1);
    enqueue(2);
    clear_system_log();
    std::free(spool_dequeue_last_element_inside_spq(&spq));
    EXPECT_EQ(
        debug_lines(),
        (lines{name(1) + " removing from queue (trace file) (spool_dequeue_last_element_inside_spq)\n", "LAST\n"}));
    clear_system_log();
    std::free(spool_dequeue_last_element_inside_spq(&spq));
    EXPECT_EQ(
        debug_lines(),
        (lines{name(2) + " removing from queue (trace file) (spool_dequeue_last_element_inside_spq)\n", "ONLY\n"}));
    clear_system_log();
    EXPECT_EQ(spool_dequeue_last_element_inside_spq(&spq), nullptr);
    EXPECT_EQ(debug_lines(), lines{});
}

TEST_F(QueueLines, AreNotWrittenBelowLevelEight)
{
    global_debug_level = 7;
    enqueue_all();
    dequeue(2);
    std::free(spool_dequeue_last_element_inside_spq(&spq));
    EXPECT_TRUE(system_log().empty());
}
} // namespace
