// Random records of every kind and size, and restarts in between, against a model of the ring.
#include <unistd.h>

#include <gtest/gtest.h>

#include "recording/one_trace.h"
#include "recording/random_writer.h"
#include "recording/ring_model.h"

using namespace qn::test;

namespace
{
struct run {
    uint32_t file_bytes;
    int compare_every; // so many records
};

std::ostream &operator<<(std::ostream &out, const run &of) { return out << of.file_bytes << " bytes"; }

constexpr int records_per_run = 20000; // five runs
constexpr int restart_every = 1900;

class RingModel : public testing::TestWithParam<run>
{
protected:
    // Makes a call and has the model do the same; what the model was told.
    template <class Call>
    void mirror(Call call)
    {
        const uint64_t from = counter();
        const random_record record = call();
        const uint64_t to = counter();
        if (model_.write(record.function, record.component, record.body))
            model_.stamped(from, to, static_cast<uint32_t>(pthread_self()));
    }

    // The start record that the library has just written, or writes in `restart`.
    template <class Restart>
    void mirror_start(Restart restart)
    {
        mirror([&]() -> random_record {
            restart();
            return {16, "____", expected_bytes().anything(4).u32(static_cast<uint32_t>(getpid())).anything(16)};
        });
        model_.expect_equal(trace_image::of_file(file_));
    }

    void compare()
    {
        const trace_image image = trace_image::of_file(file_);
        model_.expect_equal(image);
        if (model_.overwritten_start().empty()) return;
        ASSERT_EQ(image.bytes().substr(24, 16), model_.overwritten_start().substr(36, 16)) << "time base in the header";
        ASSERT_EQ(image.bytes().substr(48, 4), model_.overwritten_start().substr(32, 4)) << "process in the header";
    }

    const scratch folder_;
    const std::string file_ = folder_ / "app.trc";
    ring_model model_{GetParam().file_bytes};

private:
    static uint64_t counter()
    {
        qn_uint64_t now = 0;
        cu_get_ctr_1(&now);
        return now;
    }
};
} // namespace

INSTANTIATE_TEST_SUITE_P(Of, RingModel,
                         testing::Values(run{4096, 10}, run{8192, 15}, run{12288, 20}, run{65536, 50},
                                         run{1048576, 500}),
                         [](const auto &info) { return std::to_string(info.param.file_bytes) + "Bytes"; });

TEST_P(RingModel, AgreesWithTheFile)
{
    setenv("QN_TR_SIZE", std::to_string(GetParam().file_bytes).c_str(), 1);
    client component("TEST");
    ASSERT_EQ(tr_set_filename_1(file_.c_str()), 0);
    mirror_start([&] { EXPECT_EQ(component.register_now(), 0); });

    random_writer writer(GetParam().file_bytes, model_.longest_record());
    for (int i = 1; i <= records_per_run; ++i) {
        mirror([&] { return writer.write(); });
        if (i % GetParam().compare_every == 0) compare();
        if (i % restart_every == 0) {
            EXPECT_EQ(tr_unregister_component_1("TEST"), 0); // stops the trace
            mirror_start([&] { EXPECT_EQ(component.register_now(), 0); });
        }
        if (HasFatalFailure() || HasNonfatalFailure()) FAIL() << "record " << i;
    }
    compare();
    EXPECT_GT(model_.last_sequence(), 2U * (records_per_run / 2)); // most of them were written
}
