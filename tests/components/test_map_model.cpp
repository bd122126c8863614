// Random file maps, selections and file sizes, through the library and through a model that knows nothing of it.
#include <map>
#include <random>

#include <gtest/gtest.h>

#include "components/components_seen.h"
#include "components/map_model.h"
#include "components/outcome.h"

namespace
{
using namespace qn::test;

// Strings of fragments that the languages are made of.
class random_strings
{
public:
    std::string next(size_t most_fragments)
    {
        std::string text;
        for (size_t count = below(most_fragments + 1); count > 0; --count) text += fragments_[below(fragments_.size())];
        return text;
    }

private:
    size_t below(size_t bound) { return std::uniform_int_distribution<size_t>(0, bound - 1)(engine_); }

    std::mt19937_64 engine_{19840101}; // the same strings in every run
    const std::vector<std::string> fragments_ = {"/tmp/x,AB:*", "/tmp/y CD:x", "\"/tmp/a b\",",
                                                 "/tmp/z,64;",  "AB:Errors",   "*:*",
                                                 "x",           "AB",          ":",
                                                 ":",           ",",           ",",
                                                 ";",           ";",           " ",
                                                 " ",           "\"",          "[",
                                                 "]",           "{",           "}",
                                                 "(",           ")",           "0x20",
                                                 "017",         "-1",          "99k",
                                                 "[[:alpha:]]", "A{2}",        "\t",
                                                 "*",           "4294967297"};
};

outcome expected(int code, int offset) { return code == 0 ? success() : syntax_error(code, offset); }

TEST(MapModel, AgreesOnSelections)
{
    random_strings strings;
    std::vector<int> times_seen(20, 0);
    for (int i = 0; i < 20000; ++i) {
        const std::string text = strings.next(8);
        const map_verdict verdict = judge_selection("f", text);
        ++times_seen[static_cast<size_t>(verdict.code)];
        map_list list;
        cu_set_no_error_1();
        ASSERT_EQ(after(list.select(text, "f")), expected(verdict.code, verdict.offset)) << '"' << text << '"';
        ASSERT_EQ(count_of(list.first), verdict.elements.size());
        if (verdict.elements.empty()) continue;
        ASSERT_EQ(list.first->pCompId, verdict.elements[0].component) << '"' << text << '"';
        ASSERT_EQ(list.first->pCategory, verdict.elements[0].category) << '"' << text << '"';
    }
    for (const int code : {0, 10, 11, 12, 15, 16})
        EXPECT_GT(times_seen[static_cast<size_t>(code)], 100) << "the strings should meet code " << code;
}

TEST(MapModel, AgreesOnFileMaps)
{
    random_strings strings;
    for (int i = 0; i < 20000; ++i) {
        const std::string text = strings.next(12);
        const map_verdict verdict = judge_map(text);
        map_list list;
        leave_marker();
        const int status = list.parse(text);
        if (verdict.code == refused_without_message) {
            ASSERT_EQ(status, refused_without_message);
            ASSERT_TRUE(marker_is_there());
        } else if (verdict.code == 0) {
            ASSERT_EQ(status, 0) << '"' << text << '"';
        } else {
            ASSERT_EQ(after(status), expected(verdict.code, verdict.offset)) << '"' << text << '"';
        }
        std::vector<map_element> held;
        for (const trace_map_spec_t *node = list.first; node != nullptr; node = node->pNext)
            held.push_back({node->fileName, node->pCompId, node->pCategory});
        ASSERT_EQ(held, verdict.elements) << '"' << text << '"';
        ASSERT_TRUE(is_well_linked(list.first, list.last));
    }
}

TEST(MapModel, AgreesOnFileSizes)
{
    random_strings strings;
    std::map<std::string, uint32_t> sizes{{"", 65536}};
    for (int i = 0; i < 2000; ++i) {
        const std::string text = strings.next(8);
        const size_verdict verdict = judge_sizes(text);
        const int status = parse_fileSize_spec(text.c_str());
        if (verdict.code == refused_without_message) {
            ASSERT_EQ(status, refused_without_message);
        } else {
            ASSERT_EQ(after(status), expected(verdict.code, verdict.offset)) << '"' << text << '"';
        }
        for (const size_element &element : verdict.elements) sizes[element.file] = element.size;
    }
    EXPECT_GT(sizes.size(), 100U);
    ASSERT_EQ(anchors.numAnchors, sizes.size());
    for (const auto &[file, size] : sizes) {
        const trace_anchor_t *anchor = findOrCreateAnchorForFile(file.c_str(), 0);
        ASSERT_NE(anchor, nullptr) << file;
        EXPECT_EQ(anchor->uRequestedFileSize, size) << file;
    }
}
} // namespace
