#include "faults/campaign.h"

#include <cstdlib>
#include <fcntl.h>
#include <string>
#include <unistd.h>

#include <gtest/gtest.h>

namespace qn::test
{
uint32_t rounds(uint32_t fast, uint32_t whole)
{
    const char *campaign = std::getenv("QN_CAMPAIGN");
    return campaign != nullptr && std::string_view(campaign) == "whole" ? whole : fast;
}

uint32_t rounds_of_every_build(uint32_t fast, uint32_t whole)
{
    return std::getenv("QN_CAMPAIGN") != nullptr ? whole : fast;
}

void count(std::string_view item, std::string_view what, uint64_t number)
{
    const char *results = std::getenv("QN_CAMPAIGN_RESULTS");
    if (results == nullptr) return;
    const testing::TestInfo *test = testing::UnitTest::GetInstance()->current_test_info();
    std::string line = R"({"test": ")";
    line.append(test->test_suite_name()).append(".").append(test->name());
    line.append(R"(", "item": ")").append(item).append(R"(", "what": ")").append(what);
    line.append(R"(", "number": )").append(std::to_string(number)).append("}\n");

    // One write of a file opened for appending: tests that run side by side do not tear each other's lines.
    const int fd = open(results, O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0644);
    const bool written = fd != -1 && write(fd, line.data(), line.size()) == static_cast<ssize_t>(line.size());
    if (fd != -1) close(fd);
    EXPECT_TRUE(written) << results;
}
} // namespace qn::test
