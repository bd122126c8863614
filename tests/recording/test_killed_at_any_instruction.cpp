// A writer that is stopped behind each of its instructions: whenever it may be killed, the file holds a sound ring, and
// in it every record that this call does not overwrite.
#include <cstdlib>
#include <functional>
#include <optional>
#include <set>

#include <gtest/gtest.h>

#include "faults/campaign.h"
#include "recording/one_trace.h"
#include "recording/ring_layout.h"
#include "recording/single_step.h"

using namespace qn::test;

namespace
{
constexpr uint32_t file_bytes = 4096;

struct scene {
    const char *name;
    std::vector<uint32_t> lengths; // of the records in the ring, which fill its 3896 bytes
    size_t oldest;
    std::function<qn_int32_t()> call;
};

std::ostream &operator<<(std::ostream &out, const scene &of) { return out << of.name; }

qn_int32_t write_32_bytes() { return tr_record_id_1("COMP", 7); }
qn_int32_t write_100_bytes() { return tr_record_strings_1("COMP", 7, 1, std::string(59, 's').c_str()); }

std::vector<scene> scenes()
{
    return {
        {"Split", {1000, 100, 2796}, 1, write_32_bytes},
        {"Exact", {1000, 60, 2836}, 1, write_32_bytes},
        {"ExactToTheEnd", {3836, 60}, 1, write_32_bytes},
        {"SplitAtTheEnd", {3832, 64}, 1, write_32_bytes},
        {"SeveralSplit", {1000, 40, 32, 36, 48, 2740}, 1, write_100_bytes},
        {"SeveralExact", {1000, 40, 40, 48, 2768}, 1, write_100_bytes},
        {"SeveralExactToTheEnd", {3768, 40, 40, 48}, 1, write_100_bytes},
        {"WrapAndSplit", {500, 3356, 40}, 2, write_32_bytes},
        {"WrapAndExact", {60, 3796, 40}, 2, write_32_bytes},
        {"WrapOverSeveral", {32, 36, 500, 3228, 32, 68}, 4, write_100_bytes},
        {"ManyRecords",
         {32, 32, 32, 32, 32, 32, 32, 32, 32, 32, 32, 3544},
         1,
         [] { return tr_record_strings_1("COMP", 7, 1, std::string(230, 's').c_str()); }},
    };
}

enum class locked { by_mutex, by_bias };

class KilledWriter : public testing::TestWithParam<std::tuple<scene, locked>>
{
protected:
    static const scene &tested() { return std::get<scene>(GetParam()); }

    // In the writing process.
    void prepare() const
    {
        setenv("QN_TR_SIZE", std::to_string(file_bytes).c_str(), 1);
        client component("TEST");
        if ((tr_set_filename_1(file_.c_str()) | component.register_now()) != 0) std::abort();
        if (std::get<locked>(GetParam()) == locked::by_bias) become_biased();
        std::vector<planned_record> ring;
        const auto count = static_cast<uint32_t>(tested().lengths.size());
        for (uint32_t i = 0; i < count; ++i) {
            const auto age = static_cast<uint32_t>((i + count - tested().oldest) % count);
            ring.push_back({tested().lengths[i], 1, 100 + 2 * age});
        }
        lay_out(ring, tested().oldest, 100 + 2 * (count - 1));
    }

    static void become_biased()
    {
        for (qn_uint32_t i = 0; i < 300; ++i)
            if (write_32_bytes() != 0) std::abort();
        if (anchors.anchorBias.towards == nullptr) std::abort();
    }

    // The file behind each instruction that changed it; the first and the last are those before and after the call.
    void step_through()
    {
        std::optional<tail_reader> file;
        const stepped seen = single_step([this] { prepare(); }, tested().call,
                                         [&] { images_.emplace_back(file.emplace(file_).bytes()); },
                                         [&] {
                                             if (file->bytes() != images_.back()) images_.emplace_back(file->bytes());
                                         });
        if (!seen.possible) GTEST_SKIP() << "no process may be traced here";
        ASSERT_EQ(seen.ended_by, 0);
        ASSERT_GT(images_.size(), 5U) << "the call was not seen";
        count("A writer stopped at every instruction", "rounds", 1);
        count("A writer stopped at every instruction", "faults", seen.instructions);
    }

    // A record that is to be found: its place, and everything in it.
    using found_records = std::set<std::pair<uint64_t, std::string>>;
    static found_records data_in(const std::vector<record_image> &ring)
    {
        found_records found;
        for (const record_image &record : ring)
            if (record.is_data()) found.emplace(record.offset, record.bytes);
        return found;
    }

    const scratch folder_;
    const std::string file_ = folder_ / "app.trc";
    std::vector<std::string> images_;
};
} // namespace

std::string name_of(const testing::TestParamInfo<std::tuple<scene, locked>> &info)
{
    const bool biased = std::get<locked>(info.param) == locked::by_bias;
    return std::string(std::get<scene>(info.param).name) + (biased ? "ByBias" : "");
}

#ifdef __SANITIZE_THREAD__
const auto ways = testing::Values(locked::by_mutex);
#else
const auto ways = testing::Values(locked::by_mutex, locked::by_bias);
#endif
INSTANTIATE_TEST_SUITE_P(AtAnyInstruction, KilledWriter, testing::Combine(testing::ValuesIn(scenes()), ways), name_of);

TEST_P(KilledWriter, LeavesASoundRing)
{
    step_through();
    if (HasFatalFailure() || IsSkipped()) return;
    for (const std::string &bytes : images_) {
        const trace_image image(bytes);
        uint32_t last = 0;
        bool first = true;
        for (const record_image &record : image.ring()) {
            const uint32_t sequence = record.sequence();
            EXPECT_TRUE(sequence == 4095 || sequence % 2 == 0) << sequence << " at " << record.offset;
            // Only what stands at the free pointer may have been half begun.
            if (sequence != 4095 && (!first || record.is_data())) {
                EXPECT_GT(sequence, last) << "at " << record.offset;
                last = sequence;
            }
            first = false;
        }
        if (HasNonfatalFailure()) FAIL() << "the oldest record was said to be at " << image.oldest_offset();
    }
}

TEST_P(KilledWriter, LosesOnlyTheRecordsThatItOverwrites)
{
    step_through();
    if (HasFatalFailure() || IsSkipped()) return;
    found_records to_stay = data_in(trace_image(images_.back()).ring());
    const found_records before = data_in(trace_image(images_.front()).ring());
    std::erase_if(to_stay, [&](const auto &record) { return !before.contains(record); });
    for (const std::string &bytes : images_) {
        const found_records now = data_in(trace_image(bytes).ring());
        for (const auto &[offset, record] : to_stay)
            ASSERT_TRUE(now.contains({offset, record})) << "the record at " << offset << " is lost";
    }
}

TEST_P(KilledWriter, NeverShowsAHalfWrittenRecord)
{
    step_through();
    if (HasFatalFailure() || IsSkipped()) return;
    const found_records before = data_in(trace_image(images_.front()).ring());
    const found_records after = data_in(trace_image(images_.back()).ring());
    for (const std::string &bytes : images_)
        for (const auto &record : data_in(trace_image(bytes).ring()))
            ASSERT_TRUE(before.contains(record) || after.contains(record)) << "at " << record.first;
}
