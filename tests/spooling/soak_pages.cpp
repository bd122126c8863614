#include "spooling/soak_pages.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <regex>

#include <gtest/gtest.h>

namespace
{
using namespace qn::test;
namespace fs = std::filesystem;

constexpr size_t ring_offset = 200;
constexpr uint8_t state_ready = 4;

// The header of a page and of its first record, without the rest.
struct page_start {
    std::array<char, ring_offset + 28> bytes{};

    explicit page_start(const std::string &path)
    {
        std::ifstream file(path, std::ios::binary);
        file.read(bytes.data(), static_cast<std::streamsize>(bytes.size()));
        EXPECT_TRUE(file.good()) << path;
    }
    uint8_t state() const { return static_cast<uint8_t>(bytes[offset_of_page_state]); }
    uint64_t first_stamp() const
    {
        uint64_t stamp = 0;
        std::memcpy(&stamp, bytes.data() + ring_offset + 20, sizeof stamp);
        return stamp;
    }
};

// A copy's name is the page's, with the time of the copy behind it.
std::string page_of_copy(const std::string &name)
{
    static const std::regex copy(R"((.+\.\d+\.sp)\.\d{4}(?:_\d\d){5}\.(?: \d|\d{2,6}))");
    std::smatch parts;
    EXPECT_TRUE(std::regex_match(name, parts, copy)) << name;
    return parts[1];
}
} // namespace

namespace qn::test
{
std::vector<std::string> copies_in(const std::string &spool_folder)
{
    std::vector<std::string> found;
    std::error_code none;
    for (const auto &entry : fs::recursive_directory_iterator(spool_folder, none))
        if (entry.is_regular_file()) found.push_back(entry.path());
    return found;
}

std::vector<page_file> pages_written(const std::string &live_folder, const std::string &spool_folder)
{
    std::vector<page_file> pages;
    for (const std::string &path : copies_in(spool_folder))
        pages.push_back({path, page_of_copy(fs::path(path).filename()), true, page_start(path).first_stamp()});
    for (const auto &entry : fs::directory_iterator(live_folder)) {
        const page_start start(entry.path());
        if (start.state() != state_ready)
            pages.push_back({entry.path(), entry.path().filename(), false, start.first_stamp()});
    }
    std::sort(pages.begin(), pages.end(),
              [](const page_file &left, const page_file &right) { return left.first_stamp < right.first_stamp; });
    return pages;
}

uint32_t overwritten_before(const page_file &page, const trace_image &image)
{
    const auto notices = image.records_of(2);
    if (notices.empty()) return 0;
    EXPECT_EQ(notices.size(), 1U) << page.path;
    EXPECT_EQ(notices[0].offset, ring_offset) << page.path;
    EXPECT_EQ(notices[0].sequence(), 0U) << page.path;
    EXPECT_EQ(notices[0].component(), "____") << page.path;
    static const std::regex wording(R"(SPOOL: /.*/(.+) not spooled ([1-9][0-9]*) consecutive time(s?))");
    const std::string text = notices[0].text(28);
    std::smatch parts;
    EXPECT_TRUE(std::regex_match(text, parts, wording)) << text;
    EXPECT_EQ(parts[1], page.page);
    const auto times = static_cast<uint32_t>(std::stoul(parts[2]));
    EXPECT_EQ(parts[3], times > 1 ? "s" : "") << text;
    return times;
}

std::map<record_author, std::vector<uint32_t>> numbers_in_pages(const std::vector<page_file> &pages)
{
    std::map<record_author, std::vector<uint32_t>> numbers;
    for (const page_file &page : pages) {
        SCOPED_TRACE(page.path);
        for (const auto &[author, in_page] : numbers_in(page.image().ring())) {
            auto &of_author = numbers[author];
            of_author.insert(of_author.end(), in_page.begin(), in_page.end());
        }
    }
    return numbers;
}
} // namespace qn::test
