// Each system call of each exported call fails, with each error that a file system, a limit or a signal may give, or does
// less than it was asked for.
#include <cerrno>
#include <cstring>

#include <gtest/gtest.h>

#include "faults/attacked_calls.h"
#include "faults/campaign.h"
#include "faults/system_calls.h"

namespace
{
using namespace qn::test;

std::vector<intervention> interventions_in(const std::vector<long> &calls)
{
    std::vector<intervention> all;
    for (uint64_t number = 1; number <= calls.size(); ++number) {
        for (const int error : {ENOSPC, EDQUOT, EIO, EINTR, EMFILE, ENOMEM, EACCES})
            all.push_back({intervention::fails, number, error});
        if (can_be_cut_short(calls[number - 1])) all.push_back({intervention::is_cut_short, number, 0});
    }
    return all;
}

std::string describe(const attacked_call &call, const intervention &with, const std::vector<long> &calls)
{
    return std::string(call.name) + ", system call " + std::to_string(with.number) + " (" +
           std::to_string(calls[with.number - 1]) + ") " +
           (with.what == intervention::fails ? strerrorname_np(with.error) : "cut short");
}

TEST(FailingSystemCalls, DoNoHarm)
{
    const uint32_t stride = rounds(29, 1);
    uint32_t turn = 0;
    uint64_t faults = 0;
    uint64_t executions = 0;
    for (const attacked_call &call : attacked_calls()) {
        watched process;
        const aftermath undisturbed = play_watched(call, {}, process);
        if (!process.possible) GTEST_SKIP() << "no process may be traced here";
        ASSERT_EQ(undisturbed.stage, aftermath::ended) << call.name << ": " << undisturbed.how_it_ended();
        const std::vector<long> calls = process.calls;
        for (const intervention &with : interventions_in(calls)) {
            if (turn++ % stride != 0) continue;
            SCOPED_TRACE(describe(call, with, calls));
            const aftermath told = play_watched(call, with, process);
            ++executions;
            faults += told.faults;
            expect_no_harm(call, told, undisturbed);
        }
    }
    count("Every system call fails in turn", "rounds", 1);
    count("Every system call fails in turn", "faults", faults);
    count("Every system call fails in turn", "executions", executions);
}
} // namespace
