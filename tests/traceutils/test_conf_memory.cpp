// The reader and the interpreter when memory runs out or a pattern does not compile: the code, what is recorded, and
// that nothing is left behind.
#include <gtest/gtest.h>

#include "components/outcome.h"
#include "support/failing_memory.h"
#include "support/scratch.h"
#include "traceutils/conf_seen.h"

namespace
{
using namespace qn::test;

// Comments, a failed section, sections of each kind, one of them left open at the end.
const char *const every_kind =
    "# note\nnonsense\ndefault:\ndest = /d\nt:\npat = /x\nspooling = ON\npages = 1\ndest = /d\n"
    "size = 1\ntracesize = 1\nsync_interval = 1\n# note\nspoolarea_a:\nspool_dir = /d\n"
    "cleanup = ON\nu:\npat = /u\n";

class ConfMemory : public ::testing::Test
{
protected:
    void SetUp() override { write_file(file, every_kind); }

    qn_int32_t read(trace_raw_config_t **config) { return qn::tr::read_conf_file(file.c_str(), config, nullptr); }

    const scratch files;
    const std::string file = files / "trace.conf";
    char place = 0;
    trace_raw_config_t *const untouched = reinterpret_cast<trace_raw_config_t *>(&place);
};

TEST_F(ConfMemory, AReadThatRunsOutOfMemoryIsError14AndLeavesNothing)
{
    int failures = 0;
    for (int number = 1;; ++number) {
        const size_t before = live_blocks();
        trace_raw_config_t *config = untouched;
        leave_marker();
        qn_int32_t status = 0;
        bool happened = false;
        {
            const failing_allocation one(number);
            status = read(&config);
            happened = one.happened();
        }
        if (!happened) {
            EXPECT_EQ(status, 0);
            tr_free_trace_raw_config_1(config);
            EXPECT_EQ(live_blocks(), before);
            break;
        }
        ++failures;
        EXPECT_EQ(after(status), no_memory()) << "allocation " << number;
        EXPECT_EQ(config, untouched) << "allocation " << number;
        EXPECT_EQ(live_blocks(), before) << "allocation " << number;
    }
    // The record, two comments and five sections, each with its chunk; values, and lists.
    EXPECT_GT(failures, 30);
}

TEST_F(ConfMemory, APatternThatDoesNotCompileHasItsOwnCodeAndNoMessage)
{
    for (int number = 1; number <= 3; ++number) {
        const failing_pattern one(number);
        const size_t before = live_blocks();
        trace_raw_config_t *config = untouched;
        leave_marker();
        EXPECT_EQ(read(&config), 41 + number);
        EXPECT_TRUE(marker_is_there());
        EXPECT_EQ(config, untouched);
        EXPECT_EQ(live_blocks(), before);
    }
}

TEST_F(ConfMemory, AMatchThatRunsOutOfMemoryIsError14AndLeavesNothing)
{
    const size_t before = live_blocks();
    int failures = 0;
    for (int number = 1;; ++number) {
        const failing_match one(number);
        trace_raw_config_t *config = untouched;
        leave_marker();
        const qn_int32_t status = read(&config);
        if (!one.happened()) {
            tr_free_trace_raw_config_1(config);
            break;
        }
        ++failures;
        EXPECT_EQ(after(status), no_memory()) << "match " << number;
        EXPECT_EQ(config, untouched);
        EXPECT_EQ(live_blocks(), before);
    }
    EXPECT_GT(failures, 18); // one for each line at least
}

TEST_F(ConfMemory, AFreedConfigurationAndItsElementsLeaveNothing)
{
    const size_t before = live_blocks();
    trace_raw_config_t *config = nullptr;
    trace_conf_data_t *data = nullptr;
    ASSERT_EQ(read(&config), 0);
    ASSERT_EQ(tr_parse_all_sections_1(config, &data, 1), 0);
    EXPECT_GT(live_blocks(), before);
    tr_free_trace_raw_config_1(config);
    tr_free_trace_conf_data_1(data);
    EXPECT_EQ(live_blocks(), before);
}

TEST_F(ConfMemory, WithoutMemoryForItsRecordTheInterpreterReturns14AndRecordsNothing)
{
    const conf_of conf(every_kind);
    char byte;
    auto *const nothing = reinterpret_cast<trace_conf_data_t *>(&byte);
    trace_conf_data_t *data = nothing;
    leave_marker();
    const failing_allocation first(1);
    EXPECT_EQ(tr_parse_all_sections_1(conf.get(), &data, 1), 14);
    EXPECT_EQ(data, nothing);
    EXPECT_TRUE(marker_is_there());
}

TEST_F(ConfMemory, AnElementThatCannotBeAllocatedIsLeftOutAloneAndTheResultIs0)
{
    const conf_of conf("a:\npat = /a\nb:\npat = /b\nc:\npat = /c\n");
    const auto names_without = [&](int allocation) {
        trace_conf_data_t *data = nullptr;
        leave_marker();
        {
            const failing_allocation one(allocation);
            EXPECT_EQ(tr_parse_all_sections_1(conf.get(), &data, 1), 0);
            EXPECT_TRUE(one.happened());
        }
        EXPECT_TRUE(marker_is_there());
        std::string names;
        for (unsigned i = 0; i < data->num_elements; ++i) names += data->pTraceConfigElement[i]->sect_name;
        tr_free_trace_conf_data_1(data);
        return names;
    };
    EXPECT_EQ(names_without(2), "bc"); // the list
    EXPECT_EQ(names_without(3), "bc"); // the first element; the list is grown again
    EXPECT_EQ(names_without(4), "ac");
    EXPECT_EQ(names_without(5), "ab");
}
} // namespace
