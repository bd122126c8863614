// Levels set while eight threads register, write and unregister. Made for the race detector; the assertions only see
// that every call goes through and that nothing is left behind.
#include <array>
#include <atomic>
#include <thread>

#include <gtest/gtest.h>

#include "components/components_seen.h"
#include "components/mutexes.h"
#include "support/scratch.h"
#include "support/trace_image.h"

namespace
{
using namespace qn::test;

// One client's life, over and over: what it writes depends on levels that others set meanwhile.
void live(int number, const std::atomic<bool> &enough, std::atomic<int> &failures)
{
    const char id[5] = {'T', static_cast<char>('0' + number), '\0', '\0', '\0'};
    client made(id, 4, 0);
    made.id.resize(4); // a record takes four bytes of the identifier
    do {
        if (made.register_now() != 0) ++failures;
        for (qn_uint32_t category = 0; category < 4; ++category) {
            const tr_file_token_t token = __atomic_load_n(&made.tokens[category], __ATOMIC_RELAXED);
            QN_TR_IF(made.levels, category, 1, failures += tr_ms_record_id_1(id, category, token) != 0 ? 1 : 0);
            QN_TR_IF(made.levels, category, 2,
                     failures += tr_ms_record_strings_1(id, category, token, 1, "text") != 0 ? 1 : 0);
        }
        if (tr_unregister_component_1(id) != 0) ++failures;
    } while (!enough);
}

class eight_clients
{
public:
    eight_clients()
    {
        for (int i = 0; i < 8; ++i) threads_.emplace_back([this, i] { live(i, enough_, failures); });
    }
    eight_clients(const eight_clients &) = delete;
    eight_clients &operator=(const eight_clients &) = delete;
    ~eight_clients() { end(); }

    void end()
    {
        enough_ = true;
        for (std::thread &thread : threads_)
            if (thread.joinable()) thread.join();
    }

    std::atomic<int> failures{0};

private:
    std::atomic<bool> enough_{false};
    std::vector<std::thread> threads_;
};

TEST(LevelThreads, SetLevelsWhileEightThreadsRegisterAndWrite)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "a.trc").c_str()), 0);
    client stays("STAY", 2);
    ASSERT_EQ(stays.register_now(), 0);
    {
        eight_clients clients;
        const std::array<const char *, 5> specifications = {"*:*=1", "T[0-3]:*=2", "*:c[12]=0", "T:*", "STAY:*=5"};
        int failures = 0;
        constexpr qn_uint32_t turns = 200; // every specification is kept, and applied at each registration
        for (qn_uint32_t turn = 0; turn < turns; ++turn)
            failures += tr_set_trace_levels_1(specifications[turn % specifications.size()]) != 0 ? 1 : 0;
        clients.end();
        EXPECT_EQ(failures, 0);
        EXPECT_EQ(clients.failures, 0);
    }
    ASSERT_EQ(tr_set_trace_levels_1("*:*=7"), 0);
    EXPECT_EQ(stays.levels, levels(2, 7));
    EXPECT_EQ(registered_ids(), std::vector<std::string>{"STAY"});
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
    EXPECT_FALSE(trace_image::of_file(files / "a.trc").records().empty()); // the ring tiles, too
}

TEST(LevelThreads, MapSizeFlushAndLookWhileEightThreadsRegisterAndWrite)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "a.trc").c_str()), 0);
    client stays("STAY", 2);
    ASSERT_EQ(stays.register_now(), 0);
    ASSERT_EQ(tr_set_trace_levels_1("*:*=2"), 0);
    const std::string mapped = files / "b.trc";
    ASSERT_EQ(tr_set_file_map_1(mapped.c_str(), "T:c[12]"), 0);
    {
        eight_clients clients;
        int failures = 0;
        for (qn_uint32_t turn = 0; turn < 40; ++turn) {
            qn_uint32_t size = 0;
            int count = 0;
            tr_mini_component_anchor_t *snapshot = nullptr;
            failures += tr_set_file_size_1(mapped.c_str(), 8192 + turn % 8 * 4096) != 0 ? 1 : 0;
            failures += tr_set_size_1(65536 + turn % 2 * 4096) != 0 ? 1 : 0;
            failures += tr_get_file_size_1(mapped.c_str(), &size) != 0 ? 1 : 0;
            failures += tr_get_current_trace_levels_1(&count, &snapshot);
            tr_release_comp_info_1(count, snapshot);
            failures += tr_flush_1() != 0 ? 1 : 0;
            if (turn % 16 == 0) failures += tr_set_file_map_1(mapped.c_str(), "T[4-7]:c3") != 0 ? 1 : 0;
        }
        clients.end();
        EXPECT_EQ(failures, 0);
        EXPECT_EQ(clients.failures, 0);
    }
    EXPECT_EQ(registered_ids(), std::vector<std::string>{"STAY"});
    EXPECT_FALSE(trace_image::of_file(mapped).records().empty());
}

TEST(LevelThreads, KeepPagesResidentWhileEightThreadsRegisterAndWrite)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "a.trc").c_str()), 0);
    client stays("STAY", 2);
    ASSERT_EQ(stays.register_now(), 0);
    ASSERT_EQ(tr_set_trace_levels_1("*:*=2"), 0);
    ASSERT_EQ(tr_set_file_map_1((files / "b.trc").c_str(), "T:c[12]"), 0); // a file with a lock of its own
    eight_clients clients;
    int failures = 0;
    for (qn_uint32_t turn = 0; turn < 40; ++turn) {
        failures += tr_pin_pages_1(1) != 0 ? 1 : 0;
        failures += tr_flush_1() != 0 ? 1 : 0;
        failures += tr_pin_pages_1(0) != 0 ? 1 : 0;
    }
    clients.end();
    EXPECT_EQ(failures, 0);
    EXPECT_EQ(clients.failures, 0);
}
} // namespace
