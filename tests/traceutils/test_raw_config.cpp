// Building a raw configuration piece by piece, finding a section in it, printing it.
#include <cstdlib>
#include <cstring>

#include <gtest/gtest.h>

#include "support/failing_memory.h"
#include "support/last_error.h"
#include "traceutils/conf_seen.h"

namespace
{
using namespace qn::test;

trace_raw_config_t *new_config()
{
    return static_cast<trace_raw_config_t *>(std::calloc(1, sizeof(trace_raw_config_t)));
}

trace_raw_section_t *new_section(const char *name)
{
    auto *section = static_cast<trace_raw_section_t *>(std::calloc(1, sizeof(trace_raw_section_t)));
    std::strcpy(section->sect_name, name);
    return section;
}

// A configuration of its own for each test, freed at its end.
class RawConfig : public ::testing::Test
{
protected:
    void TearDown() override
    {
        tr_free_trace_raw_config_1(config);
        EXPECT_EQ(live_blocks(), blocks_before) << "not everything was freed";
    }
    trace_raw_section_t *add_section(const char *name)
    {
        trace_raw_section_t *section = new_section(name);
        EXPECT_EQ(addRawElement(config, 1, section), 0);
        return section;
    }

    const size_t blocks_before = live_blocks();
    trace_raw_config_t *const config = new_config();
};

TEST_F(RawConfig, ChunksAreAppendedInOrder)
{
    trace_raw_section_t *section = add_section("t");
    char *text = strdup("# note\n");
    EXPECT_EQ(addRawElement(config, 2, text), 0);
    ASSERT_EQ(config->num_element, 2);
    EXPECT_EQ(config->ppChunkLst[0]->chunk_type, 1);
    EXPECT_EQ(config->ppChunkLst[0]->pChunk, section);
    EXPECT_EQ(config->ppChunkLst[1]->chunk_type, 2);
    EXPECT_EQ(config->ppChunkLst[1]->pChunk, text);
}

TEST_F(RawConfig, AnyTypeButCommentIsStoredAsSection)
{
    EXPECT_EQ(addRawElement(config, 0, new_section("a")), 0);
    EXPECT_EQ(addRawElement(config, 3, new_section("b")), 0);
    EXPECT_EQ(config->ppChunkLst[0]->chunk_type, 1);
    EXPECT_EQ(config->ppChunkLst[1]->chunk_type, 1);
}

TEST_F(RawConfig, TheChunkListGrowsByAHundred)
{
    for (int i = 0; i < 201; ++i) {
        EXPECT_EQ(addRawElement(config, 2, strdup("#")), 0);
        if (i % 100 == 0) {
            EXPECT_EQ(last_allocation(), static_cast<size_t>(i + 100) * sizeof(trace_chunk_t *));
        }
    }
}

TEST_F(RawConfig, ThePairListGrowsByTen)
{
    trace_raw_section_t *section = add_section("t");
    for (int i = 0; i < 21; ++i) {
        EXPECT_EQ(addKeyValue(section, "key", std::to_string(i).c_str()), 0);
        if (i % 10 == 0) {
            EXPECT_EQ(last_allocation(), static_cast<size_t>(i + 10) * sizeof(key_value_t));
        }
    }
    ASSERT_EQ(section->num_element, 21);
    EXPECT_STREQ(section->kv_list[20].pValue, "20");
}

TEST_F(RawConfig, AKeyIsCutTo1023CharactersAndAValueIsNot)
{
    trace_raw_section_t *section = add_section("t");
    EXPECT_EQ(addKeyValue(section, std::string(2000, 'k').c_str(), std::string(2000, 'v').c_str()), 0);
    EXPECT_EQ(section->kv_list[0].key, std::string(1023, 'k'));
    EXPECT_EQ(section->kv_list[0].pValue, std::string(2000, 'v'));
}

TEST_F(RawConfig, AValueIsACopy)
{
    trace_raw_section_t *section = add_section("t");
    char value[] = "before";
    EXPECT_EQ(addKeyValue(section, "key", value), 0);
    std::strcpy(value, "after");
    EXPECT_STREQ(section->kv_list[0].pValue, "before");
}

TEST_F(RawConfig, RawTextIsAllItsLines)
{
    trace_raw_section_t *section = add_section("t");
    EXPECT_EQ(section->pUntokenized_data, nullptr);
    std::string expected;
    for (int i = 0; i < 100; ++i) {
        const std::string line = "line " + std::to_string(i) + "\n";
        EXPECT_EQ(appendRawString(section, line.c_str()), 0);
        expected += line;
    }
    EXPECT_EQ(section->pUntokenized_data, expected);
}

TEST_F(RawConfig, RunningOutOfMemoryChangesNothingAndIsError14)
{
    trace_raw_section_t *section = add_section("t");
    EXPECT_EQ(addKeyValue(section, "key", "value"), 0);
    EXPECT_EQ(appendRawString(section, "text\n"), 0);
    const auto before = chunks_of(*config);
    const auto fails = [&](int number, auto call) {
        const failing_allocation one(number);
        leave_marker();
        EXPECT_EQ(call(), 14);
        EXPECT_TRUE(one.happened());
        EXPECT_EQ(last_error().code, 14);
        EXPECT_EQ(last_error().text, "2625-013 Memory allocation failed.\n");
        EXPECT_EQ(chunks_of(*config), before);
    };
    char data[] = "";
    fails(1, [&] { return addRawElement(config, 2, data); });
    fails(1, [&] { return addKeyValue(section, "key", "value"); });
    fails(1, [&] { return appendRawString(section, "more"); });
}

TEST_F(RawConfig, RunningOutOfMemoryWhereAListGrowsLeavesTheListAsItWas)
{
    trace_raw_section_t *section = add_section("t");
    for (int i = 0; i < 10; ++i) EXPECT_EQ(addKeyValue(section, "key", "value"), 0);
    for (int i = 1; i < 100; ++i) EXPECT_EQ(addRawElement(config, 2, strdup("#\n")), 0);
    const auto before = chunks_of(*config);
    {
        const failing_allocation second(2);
        EXPECT_EQ(addKeyValue(section, "key", "value"), 14);
    }
    char data[] = "";
    {
        const failing_allocation second(2);
        EXPECT_EQ(addRawElement(config, 2, data), 14);
    }
    EXPECT_EQ(chunks_of(*config), before);
}

TEST_F(RawConfig, ASectionIsFoundByItsExactName)
{
    add_section("Default");
    trace_raw_section_t *section = add_section("default");
    add_section("default2");
    EXPECT_EQ(tr_find_section_by_name_1(config, "default"), section);
    EXPECT_EQ(tr_find_section_by_name_1(config, "defaul"), nullptr);
    EXPECT_EQ(tr_find_section_by_name_1(config, ""), nullptr);
}

TEST_F(RawConfig, TheFirstSectionWithoutAnErrorIsFound)
{
    add_section("t")->bErr_flag = 1;
    trace_raw_section_t *first_good = add_section("t");
    add_section("t");
    EXPECT_EQ(tr_find_section_by_name_1(config, "t"), first_good);
}

TEST_F(RawConfig, AFailedSectionIsNotFound)
{
    add_section("t")->bErr_flag = 1;
    EXPECT_EQ(tr_find_section_by_name_1(config, "t"), nullptr);
}

TEST_F(RawConfig, ACommentIsNoSection)
{
    EXPECT_EQ(addRawElement(config, 2, strdup("t")), 0);
    EXPECT_EQ(tr_find_section_by_name_1(config, "t"), nullptr);
}

TEST_F(RawConfig, PrintingShowsGoodSectionsCommentsAndAllRawText)
{
    EXPECT_EQ(addRawElement(config, 2, strdup("# note")), 0);
    trace_raw_section_t *section = add_section("t");
    EXPECT_EQ(addKeyValue(section, "pat", "/x"), 0);
    EXPECT_EQ(appendRawString(section, "t: pat"), 0);
    trace_raw_section_t *bad = add_section("u");
    bad->bErr_flag = 1;
    EXPECT_EQ(appendRawString(bad, "u: nonsense"), 0);
    testing::internal::CaptureStdout();
    printConf(config);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "\n\n printConf - start \n"
                                                      "# note \n"
                                                      "t:\npat=/x\n"
                                                      "RAW String \n"
                                                      "\nt: pat \n"
                                                      "\nu: nonsense \n"
                                                      " printConf - End \n");
}
} // namespace
