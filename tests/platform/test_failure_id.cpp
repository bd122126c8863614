// Failure identifiers.
#include <cctype>
#include <chrono>
#include <mutex>
#include <set>
#include <string>
#include <thread>
#include <unistd.h>
#include <vector>

#include <gtest/gtest.h>

#include "platform/ffdc/failure_id.h"
#include "support/private_var.h"

namespace
{
std::string new_id()
{
    fc_eid_t id;
    qn::ffdc::make_failure_id(id);
    return id;
}

TEST(FailureId, Has42CharactersInThreeGroups)
{
    const std::string id = new_id();
    ASSERT_EQ(id.size(), 42U);
    for (size_t i = 0; i < id.size(); ++i) {
        if (i == 16 || i == 33) {
            EXPECT_EQ(id[i], '.');
        } else {
            EXPECT_TRUE(std::isxdigit(static_cast<unsigned char>(id[i]))) << id;
        }
    }
}

TEST(FailureId, TellsTimeAndProcess)
{
    const auto now = [] { return std::chrono::system_clock::now().time_since_epoch() / std::chrono::nanoseconds(1); };
    const auto before = now();
    const std::string id = new_id();
    const auto time = std::stoll(id.substr(17, 16), nullptr, 16);
    EXPECT_GE(time, before);
    EXPECT_LE(time, now());
    EXPECT_EQ(std::stoul(id.substr(34), nullptr, 16) >> 10, static_cast<unsigned long>(getpid()));
}

TEST(FailureId, NamesTheSameHostEachTime) { EXPECT_EQ(new_id().substr(0, 16), new_id().substr(0, 16)); }

TEST(FailureId, BeginsWithTheFirst16DigitsOfTheMachineId)
{
    EXPECT_TRUE(qn::test::in_private_var([] {
        qn::test::use_machine_id("fedcba98765432100123456789abcdef\n");
        EXPECT_EQ(new_id().substr(0, 17), "fedcba9876543210.");
        return true;
    }));
}

TEST(FailureId, BeginsWithAnotherNumberWhereTheMachineIdIsNone)
{
    EXPECT_TRUE(qn::test::in_private_var([] {
        qn::test::use_machine_id("0x12345678901234567890\n");
        const std::string id = new_id();
        EXPECT_NE(id.substr(0, 16), "0012345678901234");
        EXPECT_NE(id.substr(0, 16), "0000000000000000");
        EXPECT_EQ(id.substr(0, 16), new_id().substr(0, 16));
        return true;
    }));
}

TEST(FailureId, IsNeverGivenTwice)
{
    std::set<std::string> ids;
    std::mutex guard;
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
        threads.emplace_back([&] {
            for (int i = 0; i < 250; ++i) {
                const std::string id = new_id();
                const std::lock_guard lock(guard);
                ids.insert(id);
            }
        });
    for (std::thread &thread : threads) thread.join();
    EXPECT_EQ(ids.size(), 1000U);
}
} // namespace
