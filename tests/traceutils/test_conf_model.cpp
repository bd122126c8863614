// 20000 random files through the library and through a model that knows nothing of it: the same chunks with
// the same lines, the same faults, the same elements.
#include <random>

#include <gtest/gtest.h>

#include "traceutils/conf_model.h"

namespace
{
using namespace qn::test;

class random_files
{
public:
    std::string next()
    {
        std::string text;
        for (size_t sections = below(5); sections > 0; --sections) text += section();
        while (below(3) == 0 && !text.empty()) damage(text);
        return text;
    }

private:
    size_t below(size_t bound) { return std::uniform_int_distribution<size_t>(0, bound - 1)(engine_); }
    const std::string &one_of(const std::vector<std::string> &choices) { return choices[below(choices.size())]; }
    std::string blanks() { return std::string(below(4) == 0 ? below(3) : 0, below(2) == 0 ? ' ' : '\t'); }

    std::string section()
    {
        const size_t kind = below(3);
        std::string text = blanks() + one_of(names_[kind]) + ":" + blanks() + "\n";
        std::vector<std::string> keys = keys_[kind];
        std::shuffle(keys.begin(), keys.end(), engine_);
        keys.resize(below(3) == 0 ? below(keys.size() + 1) : keys.size());
        for (const std::string &key : keys) {
            text += blanks() + key + blanks() + "=" + blanks() + one_of(values_) + blanks() + "\n";
            if (below(10) == 0) text += one_of(lines_) + "\n";
        }
        return text;
    }
    void damage(std::string &text)
    {
        const size_t place = below(text.size());
        switch (below(4)) {
        case 0: text.erase(place, 1 + below(20)); break;
        case 1: text.insert(place, one_of(damages_)); break;
        case 2: text.insert(place, std::string(1015 + below(12), one_of(damages_)[0])); break;
        default: text[place] = static_cast<char>(below(256)); break;
        }
    }

    std::mt19937_64 engine_{19960421}; // the same files in every run
    const std::vector<std::vector<std::string>> names_ = {
        {"t", "other", "Default", "a:b", "spoolarea", "two words"}, {"spoolarea_a", "spoolarea_"}, {"default"}};
    const std::vector<std::vector<std::string>> keys_ = {
        {"pat", "spooling", "pages", "dest", "size", "tracesize", "sync_interval", "PAT", "Pages"},
        {"spool_dir", "cleanup", "spool_cleanup_interval", "spool_retention_days", "spool_directory_max_size",
         "spool_startup_interval"},
        {"spooling", "tracesize", "dest"}};
    const std::vector<std::string> values_ = {"/x", "ON", "OFF", "4", "-5", "4k", "TRUE", "/a/.*/b$", "1048576", "a b"};
    const std::vector<std::string> lines_ = {"# note",       "dest = /x # note", "",   " \t",      "nonsense",
                                             "colour = red", "dest = /again",    "t:", "default:", ":",
                                             "pat = /p"};
    const std::vector<std::string> damages_ = {
        ":", "#", "\n", "=", " ", "$", "\t", "\r", "\n\n", "x", "\n:\n", "\nt:\n", std::string(1, '\0')};
};

std::string shown(const std::string &text) { return ::testing::PrintToString(text); }

TEST(ConfModel, TheLibraryReadsRandomFilesAsTheModelDoes)
{
    random_files files;
    size_t good_sections = 0;
    size_t faults = 0;
    for (int i = 0; i < 20000; ++i) {
        const std::string text = files.next();
        const conf_seen expected = judge_conf(text);
        const conf_seen seen = read_conf(text);
        ASSERT_EQ(seen.status, 0);
        ASSERT_EQ(seen.chunks, expected.chunks) << shown(text);
        ASSERT_EQ(seen.section_lines, expected.section_lines) << shown(text);
        ASSERT_EQ(seen.faults, expected.faults) << shown(text);
        for (const chunk_seen &section : expected.sections()) good_sections += section.failed ? 0 : 1;
        faults += expected.faults.size();
    }
    EXPECT_GT(good_sections, 10000U) << "the files are too bad to tell much";
    EXPECT_GT(faults, 10000U) << "the files are too good to tell much";
}

TEST(ConfModel, TheLibraryUnderstandsRandomFilesAsTheModelDoes)
{
    random_files files;
    for (int i = 0; i < 20000; ++i) {
        const std::string text = files.next();
        const conf_of conf(text);
        trace_conf_data_t *data = nullptr;
        ASSERT_EQ(tr_parse_all_sections_1(conf.get(), &data, 1), 0);
        const auto seen = elements_of(*data);
        tr_free_trace_conf_data_1(data);
        ASSERT_EQ(seen, judge_sections(judge_conf(text).chunks)) << shown(text);
    }
}
} // namespace
