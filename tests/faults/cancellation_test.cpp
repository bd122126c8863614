// A thread is cancelled at each cancellation point of each exported call, with the lines for debugging on: there are few
// things under a lock that do not write one. Every lock is free afterwards, and the same call works.
#include <cstdlib>

#include <gtest/gtest.h>

#include "faults/attacked_calls.h"
#include "faults/campaign.h"
#include "recording/blocked_calls.h"

namespace
{
using namespace qn::test;

constexpr qn_int32_t was_cancelled = -4242;
constexpr uint32_t stride = 7;

uint64_t points_left = 0; // until the one at which the call is cancelled; 0: it is not

qn_int32_t cancel(const attacked_call &call, const std::string &folder)
{
    if (points_left == 0) return call.call(folder);
    qn_int32_t status = 0;
    const bool cancelled = cancelled_in(
        any_call, [&] { status = call.call(folder); }, static_cast<int>(points_left));
    points_left = 0;
    return cancelled ? was_cancelled : status;
}

attacked_call cancelled_form_of(const attacked_call &call)
{
    attacked_call form = call;
    form.prepare = [&call](const std::string &folder) {
        setenv("QN_TR_DEBUG_LEVEL", "8", 1);
        call.prepare(folder);
    };
    form.call = [&call](const std::string &folder) { return cancel(call, folder); };
    form.codes = {was_cancelled};
    form.records_its_code = false;
    form.keeps_global_mutex = false;
    return form;
}

attack cancel_at(uint64_t point)
{
    return {[=] { points_left = point; }, [] { return uint64_t{0}; }};
}

class Cancellation : public testing::TestWithParam<const attacked_call *>
{
};

std::vector<const attacked_call *> all_calls()
{
    std::vector<const attacked_call *> calls;
    for (const attacked_call &call : attacked_calls()) calls.push_back(&call);
    return calls;
}

INSTANTIATE_TEST_SUITE_P(Of, Cancellation, testing::ValuesIn(all_calls()),
                         [](const auto &info) { return std::string(info.param->name); });

TEST_P(Cancellation, AtEachPointLeavesEveryLockFree)
{
    const attacked_call call = cancelled_form_of(*GetParam());
    const aftermath undisturbed = play_in_child(call, cancel_at(0));
    ASSERT_EQ(undisturbed.stage, aftermath::ended) << undisturbed.how_it_ended();
    const uint32_t times = rounds(1, 50);
    uint64_t executions = 0;
    uint64_t cancelled = 0;
    for (uint32_t round = 0; round < times && !HasFailure(); ++round)
        for (uint64_t point = 1;; point += rounds(stride, 1)) {
            SCOPED_TRACE("point " + std::to_string(point));
            const aftermath told = play_in_child(call, cancel_at(point));
            ++executions;
            expect_no_harm(call, told, undisturbed);
            if (told.stage != aftermath::ended || told.status != was_cancelled) break;
            ++cancelled;
        }
    count("Cancellation at every point", "rounds", times);
    count("Cancellation at every point", "faults", cancelled);
    count("Cancellation at every point", "executions", executions);
}
} // namespace
