// What no caller can be told: the line on standard error, and first-failure records.
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <filesystem>

#include <fcntl.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "files/support_calls.h"
#include "files/support_files.h"

namespace
{
using namespace qn::test;

// What the body writes to standard error.
std::string standard_error_of(const std::string &file, const std::function<void()> &body)
{
    std::fflush(stderr);
    const int kept = dup(2);
    const int fd = ::open(file.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
    dup2(fd, 2);
    close(fd);
    body();
    std::fflush(stderr);
    dup2(kept, 2);
    close(kept);
    return file_bytes(file);
}

// The seconds of a test: one of them is what ctime() was given.
bool begins_with_a_time_between(const std::string &text, time_t from, time_t to)
{
    for (time_t time = from; time <= to; ++time) {
        char line[64];
        if (text.rfind(ctime_r(&time, line), 0) == 0) return true;
    }
    return false;
}

TEST(LogTrcError, PrintsTimeOptionAndText)
{
    const scratch folder;
    const time_t before = time(nullptr);
    const std::string printed = standard_error_of(folder / "stderr", [] { log_trc_error("Hello\n", '0'); });
    EXPECT_TRUE(begins_with_a_time_between(printed, before, time(nullptr))) << printed;
    ASSERT_NE(printed.find('\n'), std::string::npos);
    EXPECT_EQ(printed.substr(printed.find('\n') + 1), "0:Hello\n");
}

TEST(LogTrcError, PrintsAnyOptionAndAddsNoLineEnd)
{
    const scratch folder;
    const std::string printed = standard_error_of(folder / "stderr", [] { log_trc_error("100% %s", 'x'); });
    ASSERT_NE(printed.find('\n'), std::string::npos);
    EXPECT_EQ(printed.substr(printed.find('\n') + 1), "x:100% %s");
}

struct text_building {
    const fc_err_tbl_t *entry;
    const void *detail_data;
    int detail_data_len;
    const char *buffer;
    int buffer_size;
    nl_catd catalogue;
};

class LogError : public testing::Test
{
protected:
    void SetUp() override
    {
        calls().failure_text = [this](const fc_err_tbl_t *entry, const void *data, int length, char *buffer, int size,
                                      nl_catd catalogue) {
            built.push_back({entry, data, length, buffer, size, catalogue});
            std::strcpy(buffer, "the text");
            return 8;
        };
        calls().failure_filed = [this](const failure_filing &filing) {
            filed.push_back(filing);
            text_is_the_one_built = filing.text == built.back().buffer;
            return 1; // nobody looks at it
        };
        calls().catopen = [this](const char *name, int flag) {
            EXPECT_STREQ(name, "qn_tr.cat");
            EXPECT_EQ(flag, NL_CAT_LOCALE);
            return opened = __real_catopen(name, flag);
        };
        calls().catclose = [this](nl_catd catalogue) {
            closed.push_back(catalogue);
            return __real_catclose(catalogue);
        };
    }

    void file_a_failure() { log_error(0, source, 77, version, 1, detail, sizeof detail, detail_file); }

    char source[16] = "source.c";
    char version[8] = "1.2";
    char detail[4] = {1, 2, 3, 4};
    char detail_file[16] = "/tmp/detail";
    std::vector<text_building> built;
    std::vector<failure_filing> filed;
    std::vector<nl_catd> closed;
    nl_catd opened = nullptr;
    bool text_is_the_one_built = false;
};

TEST_F(LogError, BuildsTheTextInABufferOf946Bytes)
{
    file_a_failure();
    ASSERT_EQ(built.size(), 1U);
    EXPECT_EQ(built[0].entry, &fc_errtbl_trace[0]);
    EXPECT_EQ(built[0].detail_data, detail);
    EXPECT_EQ(built[0].detail_data_len, 4);
    EXPECT_EQ(built[0].buffer_size, 946);
    EXPECT_EQ(built[0].catalogue, opened);
}

TEST_F(LogError, FilesTheRecordWithWhatItWasGiven)
{
    file_a_failure();
    ASSERT_EQ(filed.size(), 1U);
    EXPECT_EQ(filed[0].reserved0, 0);
    EXPECT_EQ(filed[0].component, "trace");
    EXPECT_EQ(filed[0].subsystem, "OPAL");
    EXPECT_EQ(filed[0].file, "source.c");
    EXPECT_EQ(filed[0].version, "1.2");
    EXPECT_EQ(filed[0].line, 77);
    EXPECT_EQ(filed[0].reserved1, 0);
    EXPECT_EQ(filed[0].log_event, 1);
    EXPECT_EQ(filed[0].error_id, 0);
    EXPECT_EQ(filed[0].detail_data, detail);
    EXPECT_EQ(filed[0].detail_data_len, 4);
    EXPECT_EQ(filed[0].detail_data_file, "/tmp/detail");
    EXPECT_TRUE(text_is_the_one_built);
}

TEST_F(LogError, GoesOnWithoutACatalogue)
{
    setenv("NLSPATH", "/nonexistent/%N", 1);
    file_a_failure();
    EXPECT_EQ(opened, reinterpret_cast<nl_catd>(-1));
    EXPECT_EQ(filed.size(), 1U);
    EXPECT_TRUE(closed.empty());
}

TEST_F(LogError, ClosesTheCatalogueThatItOpened)
{
    setenv("NLSPATH", (std::filesystem::path(QN_TR_CATALOGUE).parent_path() / "%N").c_str(), 1);
    file_a_failure();
    ASSERT_NE(opened, reinterpret_cast<nl_catd>(-1));
    EXPECT_EQ(closed, std::vector<nl_catd>{opened});
}
} // namespace
