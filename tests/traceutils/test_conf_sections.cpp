// What sections mean: the elements that they become.
#include <cstdlib>
#include <cstring>

#include <gtest/gtest.h>

#include "support/failing_memory.h"
#include "traceutils/conf_seen.h"

namespace
{
using namespace qn::test;

// The elements of a configuration text.
class elements
{
public:
    explicit elements(const std::string &text, int force = 1)
    {
        const conf_of conf(text);
        EXPECT_EQ(tr_parse_all_sections_1(conf.get(), &data_, force), 0);
    }
    elements(const elements &) = delete;
    elements &operator=(const elements &) = delete;
    ~elements() { tr_free_trace_conf_data_1(data_); }

    unsigned count() const { return data_->num_elements; }
    const trace_config_element_t &operator[](unsigned at) const
    {
        if (at >= count()) throw std::out_of_range("no such element");
        return *data_->pTraceConfigElement[at];
    }
    const trace_element_t &trace(unsigned at) const { return of_type(at, 1).element.trace_element; }
    const spool_element_t &spool(unsigned at) const { return of_type(at, 2).element.spool_element; }
    const default_element_t &standard(unsigned at) const { return of_type(at, 3).element.default_element; }
    const trace_conf_data_t *data() const { return data_; }

private:
    const trace_config_element_t &of_type(unsigned at, unsigned type) const
    {
        EXPECT_EQ((*this)[at].elementType, type);
        return (*this)[at];
    }

    trace_conf_data_t *data_ = nullptr;
};

TEST(ConfSections, AnEmptyConfigurationHasNoElements) { EXPECT_EQ(elements("# note\n").count(), 0U); }

TEST(ConfSections, TheUsualFileBecomesThreeElementsInFileOrder)
{
    const elements seen("# trace settings\ndefault:\ntracesize = 2097152\nspooling = OFF\ndest = /var/qn/trace_spool\n"
                        "daemon_traces:\npat = /var/qn/.*/log/.*\nspooling = ON\npages = 4\ndest = /data/trace_spool\n"
                        "size = 1048576\nspoolarea_main:\nspool_dir = /data/trace_spool\ncleanup = ON\n"
                        "spool_retention_days = 7\nspool_directory_max_size = 1024\n");
    ASSERT_EQ(seen.count(), 3U);
    EXPECT_STREQ(seen[0].sect_name, "default");
    EXPECT_STREQ(seen.standard(0).dest, "/var/qn/trace_spool");
    EXPECT_STREQ(seen.standard(0).spooling, "OFF");
    EXPECT_EQ(seen.standard(0).trace_size, 2097152U);
    EXPECT_STREQ(seen[1].sect_name, "daemon_traces");
    EXPECT_STREQ(seen.trace(1).pattern, "/var/qn/.*/log/.*");
    EXPECT_STREQ(seen.trace(1).dest, "/data/trace_spool");
    EXPECT_STREQ(seen.trace(1).spooling, "ON");
    EXPECT_EQ(seen.trace(1).pages, 4U);
    EXPECT_EQ(seen.trace(1).pg_size, 1048576U);
    EXPECT_EQ(seen.trace(1).trace_size, 2097152U);
    EXPECT_EQ(seen.trace(1).sync_interval, 0U);
    EXPECT_EQ(seen[1].flag, 0U);
    EXPECT_STREQ(seen[2].sect_name, "spoolarea_main");
    EXPECT_STREQ(seen.spool(2).spool_dir, "/data/trace_spool");
    EXPECT_STREQ(seen.spool(2).cleanup, "ON");
    EXPECT_EQ(seen.spool(2).cleanup_interval, 0U);
    EXPECT_EQ(seen.spool(2).retention_days, 7U);
    EXPECT_EQ(seen.spool(2).dir_size, 1024U);
    EXPECT_EQ(seen.spool(2).startup_interval, 0U);
    EXPECT_EQ(seen[2].flag, 0U);
}

TEST(ConfSections, ATraceSectionThatSaysNothingElseIsNotSpooled)
{
    const elements seen("t:\npat = /x\n");
    EXPECT_STREQ(seen.trace(0).dest, "/dev/null");
    EXPECT_STREQ(seen.trace(0).spooling, "OFF");
    EXPECT_EQ(seen.trace(0).pages, 0U);
    EXPECT_EQ(seen.trace(0).pg_size, 0U);
    EXPECT_EQ(seen.trace(0).trace_size, 0U);
}

TEST(ConfSections, ASpoolSectionTakesEveryValue)
{
    const elements seen("spoolarea_a:\nspool_dir = /d\ncleanup = ON\nspool_cleanup_interval = 1\n"
                        "spool_retention_days = 2\nspool_directory_max_size = 3\nspool_startup_interval = 4\n");
    EXPECT_EQ(seen.spool(0).cleanup_interval, 1U);
    EXPECT_EQ(seen.spool(0).retention_days, 2U);
    EXPECT_EQ(seen.spool(0).dir_size, 3U);
    EXPECT_EQ(seen.spool(0).startup_interval, 4U);
}

TEST(ConfSections, ADefaultSectionAloneIsOneElement)
{
    const elements seen("default:\n");
    ASSERT_EQ(seen.count(), 1U);
    EXPECT_STREQ(seen.standard(0).dest, "/dev/null");
    EXPECT_STREQ(seen.standard(0).spooling, "OFF");
    EXPECT_EQ(seen.standard(0).trace_size, 0U);
}

TEST(ConfSections, TheDefaultSectionSuppliesTheTraceSize)
{
    const elements seen("default:\ntracesize = 4096\nt:\npat = /x\nu:\npat = /x\ntracesize = 7\n");
    EXPECT_EQ(seen.trace(1).trace_size, 4096U);
    EXPECT_EQ(seen.trace(2).trace_size, 7U);
}

TEST(ConfSections, TheDefaultSectionSuppliesItFromBehindToo)
{
    EXPECT_EQ(elements("t:\npat = /x\ndefault:\ntracesize = 4096\n").trace(0).trace_size, 4096U);
}

TEST(ConfSections, TheDefaultSectionSuppliesNothingElse)
{
    const elements seen("default:\ndest = /d\nspooling = ON\nt:\npat = /x\n");
    EXPECT_STREQ(seen.standard(0).dest, "/d");
    EXPECT_STREQ(seen.standard(0).spooling, "ON");
    EXPECT_STREQ(seen.trace(1).dest, "/dev/null");
    EXPECT_STREQ(seen.trace(1).spooling, "OFF");
}

TEST(ConfSections, EachDefaultSectionIsAnElementAndTheFirstSupplies)
{
    const elements seen("default:\ntracesize = 1\ndefault:\ntracesize = 2\nt:\npat = /x\n");
    ASSERT_EQ(seen.count(), 3U);
    EXPECT_EQ(seen.standard(0).trace_size, 1U);
    EXPECT_EQ(seen.standard(1).trace_size, 2U);
    EXPECT_EQ(seen.trace(2).trace_size, 1U);
}

TEST(ConfSections, AFirstDefaultSectionWithoutATraceSizeSuppliesNone)
{
    EXPECT_EQ(elements("default:\ndest = /d\ndefault:\ntracesize = 2\nt:\npat = /x\n").trace(2).trace_size, 0U);
}

TEST(ConfSections, AFailedDefaultSectionIsNoElementAndSuppliesNothing)
{
    const elements seen("default:\ntracesize = 1\ncolour = red\nt:\npat = /x\n");
    ASSERT_EQ(seen.count(), 1U);
    EXPECT_EQ(seen.trace(0).trace_size, 0U);
}

TEST(ConfSections, FailedSectionsAndCommentsAreSkipped)
{
    const elements seen("# note\nnonsense\nt:\npat = /x\n# note\nu:\npat = /y\n");
    ASSERT_EQ(seen.count(), 2U);
    EXPECT_STREQ(seen[0].sect_name, "t");
    EXPECT_STREQ(seen[1].sect_name, "u");
}

TEST(ConfSections, TheSwitchIsWhatTheFileSaysCutToThreeCharacters)
{
    const auto switch_of = [](const std::string &value) {
        return std::string(elements("t:\npat = /x\nspooling = " + value + "\n").trace(0).spooling);
    };
    EXPECT_EQ(switch_of("YES"), "YES");
    EXPECT_EQ(switch_of("TRUE"), "TRU");
    EXPECT_EQ(switch_of("on"), "on");
    EXPECT_EQ(switch_of("$") + switch_of("0"), "OFF0"); // the first is no value: it ends the section
}

TEST(ConfSections, TheOtherSwitchesAreCutAsWell)
{
    EXPECT_STREQ(elements("default:\nspooling = TRUE\n").standard(0).spooling, "TRU");
    EXPECT_STREQ(elements("spoolarea_a:\nspool_dir = /d\ncleanup = TRUE\n").spool(0).cleanup, "TRU");
}

TEST(ConfSections, TheSyncIntervalIsNotRead)
{
    EXPECT_EQ(elements("t:\npat = /x\nsync_interval = 60\n").trace(0).sync_interval, 0U);
}

TEST(ConfSections, OfANumberTheLeadingDigitsCount)
{
    const auto pages_of = [](const std::string &value) {
        return elements("t:\npat = /x\npages = " + value + "\n").trace(0).pages;
    };
    EXPECT_EQ(pages_of("4k"), 4U);
    EXPECT_EQ(pages_of("ON"), 0U);
    EXPECT_EQ(pages_of("010"), 10U);
    EXPECT_EQ(pages_of("0x10"), 0U);
    EXPECT_EQ(pages_of("1.5"), 1U);
    EXPECT_EQ(pages_of("-1"), 4294967295U);
    EXPECT_EQ(pages_of("2147483647"), 2147483647U);
}

TEST(ConfSections, AKeyInAnotherCaseCountsAsAbsent)
{
    const elements seen("default:\nTRACESIZE = 1\nt:\nPAT = /x\nDest = /d\n"
                        "spoolarea_a:\nSPOOL_DIR = /d\nCleanup = ON\n");
    EXPECT_STREQ(seen.trace(1).pattern, "");
    EXPECT_STREQ(seen.trace(1).dest, "/dev/null");
    EXPECT_EQ(seen.trace(1).trace_size, 0U);
    EXPECT_STREQ(seen.spool(2).spool_dir, "");
    EXPECT_STREQ(seen.spool(2).cleanup, "");
}

TEST(ConfSections, ForceHasNoEffect)
{
    const elements seen("t:\npat = /x\n", 0);
    EXPECT_EQ(seen.count(), 1U);
}

TEST(ConfSections, ElementsOutliveTheRawConfiguration)
{
    const elements seen("t:\npat = /x\n"); // its configuration is freed
    EXPECT_STREQ(seen.trace(0).pattern, "/x");
}

TEST(ConfSections, SeveralHundredSectionsAreAllThere)
{
    std::string text;
    for (int i = 0; i < 250; ++i) text += "t" + std::to_string(i) + ":\npat = /" + std::to_string(i) + "\n";
    const elements seen(text);
    ASSERT_EQ(seen.count(), 250U);
    for (unsigned i = 0; i < 250; ++i) EXPECT_EQ(seen.trace(i).pattern, "/" + std::to_string(i));
}

TEST(ConfSections, ParsingOneSectionDoesNothing)
{
    const conf_of conf("t:\npat = /x\n");
    trace_conf_data_t *data = nullptr;
    EXPECT_EQ(tr_parse_section(conf.get()->ppChunkLst[0], &data, 1), 0);
    EXPECT_EQ(data, nullptr);
}

TEST(ConfSections, AValueIsThatOfTheFirstPairWithExactlyThatKey)
{
    const conf_of conf("t:\nPat = /x\npages = 3\nu:\npat = /u\n");
    const auto *section = static_cast<const trace_raw_section_t *>(conf.get()->ppChunkLst[0]->pChunk);
    EXPECT_STREQ(getValueFromKVList(section, "Pat"), "/x");
    EXPECT_STREQ(getValueFromKVList(section, "pages"), "3");
    EXPECT_EQ(getValueFromKVList(section, "pat"), nullptr);
    EXPECT_EQ(getValueFromKVList(section, "size"), nullptr);
}

// An empty list, and elements appended by hand.
class AddElement : public ::testing::Test
{
protected:
    ~AddElement() override { tr_free_trace_conf_data_1(data); }
    trace_conf_data_t *const data = static_cast<trace_conf_data_t *>(std::calloc(1, sizeof(trace_conf_data_t)));
    const std::string is_long = std::string(2000, 'x');
    const std::string cut = std::string(1023, 'x');
};

TEST_F(AddElement, CutsTheTextsOfATraceElement)
{
    EXPECT_EQ(addTraceElement(data, is_long.c_str(), is_long.c_str(), is_long.c_str(), 1, 2, 3, "ON!!"), 0);
    const trace_config_element_t &element = *data->pTraceConfigElement[0];
    EXPECT_EQ(element.sect_name, cut);
    EXPECT_EQ(element.element.trace_element.dest, cut);
    EXPECT_EQ(element.element.trace_element.pattern, cut);
    EXPECT_STREQ(element.element.trace_element.spooling, "ON!");
}

TEST_F(AddElement, CutsTheTextsOfASpoolElement)
{
    EXPECT_EQ(addSpoolElement(data, "spoolarea_a", is_long.c_str(), "ON!!", 1, 2, 3, 4), 0);
    EXPECT_EQ(data->pTraceConfigElement[0]->element.spool_element.spool_dir, cut);
    EXPECT_STREQ(data->pTraceConfigElement[0]->element.spool_element.cleanup, "ON!");
}

TEST_F(AddElement, CutsTheTextsOfADefaultElement)
{
    EXPECT_EQ(addDefaultElement(data, "default", is_long.c_str(), 1, "ON!!"), 0);
    EXPECT_EQ(data->pTraceConfigElement[0]->element.default_element.dest, cut);
    EXPECT_STREQ(data->pTraceConfigElement[0]->element.default_element.spooling, "ON!");
}

TEST_F(AddElement, GrowsTheListByAHundred)
{
    const auto add = [&] { return addDefaultElement(data, "default", "/d", 1, "ON"); };
    for (unsigned i = 0; i < 100; ++i) EXPECT_EQ(add(), 0);
    const size_t before = live_blocks();
    {
        const failing_allocation growth(1); // the list is full
        EXPECT_EQ(add(), 14);
        EXPECT_TRUE(growth.happened());
    }
    EXPECT_EQ(live_blocks(), before);
    EXPECT_EQ(data->num_elements, 100U);
    EXPECT_EQ(add(), 0);
    {
        const failing_allocation growth(2); // it is not full for another 99
        for (unsigned i = 0; i < 1; ++i) EXPECT_EQ(add(), 0);
        EXPECT_FALSE(growth.happened());
    }
}

TEST_F(AddElement, Returns14WithoutMemory)
{
    const auto fails = [](auto add) {
        const failing_allocation first(1);
        EXPECT_EQ(add(), 14);
    };
    fails([&] { return addTraceElement(data, "t", "/d", "/x", 1, 2, 3, "ON"); });
    fails([&] { return addSpoolElement(data, "spoolarea_a", "/d", "ON", 1, 2, 3, 4); });
    fails([&] { return addDefaultElement(data, "default", "/d", 1, "ON"); });
    EXPECT_EQ(data->num_elements, 0U);
}

TEST(ConfSections, PrintingShowsNamesPatternsAndDirectories)
{
    const elements seen("default:\ndest = /d\nt:\npat = /x\nspoolarea_a:\nspool_dir = /s\ncleanup = ON\n");
    testing::internal::CaptureStdout();
    printTraceConfData(seen.data());
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "\n\n printTraceConfData -- start Trace Conf Data \n"
                                                      "default:\n"
                                                      "t:\npat=/x\ndest=/dev/null\n"
                                                      "spoolarea_a:\nspooldir=/s\n"
                                                      " printTraceConfData -- end Trace Conf Data \n");
}
} // namespace
