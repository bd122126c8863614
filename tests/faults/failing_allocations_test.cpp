// Memory runs out at each allocation of each exported call: once, and from then on.
#include <gtest/gtest.h>

#include "faults/all_allocations.h"
#include "faults/attacked_calls.h"
#include "faults/campaign.h"

namespace
{
using namespace qn::test;

attack fail_allocation(uint64_t number, running_out how)
{
    return {[=] { fail_allocations(number, how); }, stop_failing_allocations, live_allocations};
}

class FailingAllocations : public testing::Test
{
protected:
    // Plays the call with its first allocation failing, its second, ... until there are no more.
    void fail_each(const attacked_call &call, running_out how)
    {
        const aftermath undisturbed = play_in_child(call, fail_allocation(0, how));
        ASSERT_EQ(undisturbed.stage, aftermath::ended) << call.name << ": " << undisturbed.how_it_ended();
        for (uint64_t number = 1;; number += rounds(stride, 1)) {
            SCOPED_TRACE(std::string(call.name) + ", allocation " + std::to_string(number));
            const aftermath told = play_in_child(call, fail_allocation(number, how));
            ++executions;
            faults += told.faults;
            expect_no_harm(call, told, undisturbed);
            if (told.stage < aftermath::attacked || told.faults == 0) return;
        }
    }

    void fail_all_calls(running_out how)
    {
        for (const attacked_call &call : attacked_calls()) fail_each(call, how);
        count("Every allocation fails in turn", "rounds", 1);
        count("Every allocation fails in turn", "faults", faults);
        count("Every allocation fails in turn", "executions", executions);
    }

    static constexpr uint32_t stride = 7;
    uint64_t faults = 0;
    uint64_t executions = 0;
};

TEST_F(FailingAllocations, OnceDoNoHarm) { fail_all_calls(running_out::once); }
TEST_F(FailingAllocations, FromThenOnDoNoHarm) { fail_all_calls(running_out::for_good); }
} // namespace
