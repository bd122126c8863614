// A ring is followed while a writer works on it: between any two of the follower's readings he may do any number of his
// stores. Nothing is shown torn, nothing twice, nothing out of order, and what is not shown is told.
#include <gtest/gtest.h>

#include <cstring>
#include <functional>
#include <random>
#include <utility>
#include <vector>

#include "reader/follow/model_writer.h"
#include "tools/qntrace/follow/ring_follower.h"

namespace qn::test
{
namespace
{

using dump::ring_follower;

// What a ring held after every store of its writer.
struct history {
    std::vector<std::vector<std::byte>> moments;
    std::vector<std::size_t> complete;  // how many records had been completed at each of them
    std::vector<std::uint32_t> written; // numbers of the completed records
    std::uint32_t last_seq = 0;         // given out, fillers included
};

history history_of(std::size_t ring_bytes, const std::function<void(model_writer &)> &write)
{
    history past;
    model_writer *writer = nullptr;
    const auto keep = [&] {
        past.moments.emplace_back(writer->bytes().begin(), writer->bytes().end());
        past.complete.push_back(writer->written().size());
    };
    model_writer working(ring_bytes, keep);
    writer = &working;
    keep();
    write(working);
    past.written = working.written();
    past.last_seq = working.last_seq();
    return past;
}

// Shows a moment of the history, and goes on to a later one behind every reading.
class moving_source final : public reader::byte_source
{
public:
    using steps = std::function<std::size_t()>;

    moving_source(const history &past, std::size_t begin, steps next) : past_(past), at_(begin), next_(std::move(next))
    {
    }

    std::uint64_t size() const override { return past_.moments[0].size(); }
    std::size_t read_at(std::uint64_t offset, std::span<std::byte> into) override
    {
        const std::size_t count = reader::memory_source(past_.moments[at_]).read_at(offset, into);
        at_ = std::min(at_ + next_(), past_.moments.size() - 1);
        return count;
    }
    bool at_end() const { return at_ + 1 == past_.moments.size(); }

private:
    const history &past_;
    std::size_t at_;
    steps next_;
};

// Checks all that is handed out.
class checking_listener final : public dump::ring_listener
{
public:
    void record(const reader::trace_record &record) override
    {
        const auto &header = record.raw.header;
        if (!shown.empty()) {
            EXPECT_GT(header.seq, shown.back());
        }
        shown.push_back(header.seq);
        const auto *values = std::get_if<reader::values_32_body>(&record.body);
        ASSERT_NE(values, nullptr);
        EXPECT_EQ(record.problem, "");
        EXPECT_EQ(header.thread, header.seq);
        EXPECT_EQ(header.counter, header.seq);
        EXPECT_EQ(values->id, header.seq);
        for (std::size_t i = 0; i < values->values.size(); ++i) EXPECT_EQ(values->values[i], header.seq);
    }
    void lost(const dump::lost_records &lost) override { missing += lost.count; }
    void found(const reader::finding &finding) override
    {
        EXPECT_EQ(finding.level, reader::finding::severity::loss) << finding.text;
        ++unfinished;
    }

    std::vector<std::uint32_t> shown;
    std::uint64_t missing = 0;
    std::uint64_t unfinished = 0;
};

reader::file_header header_of(const history &past, std::size_t moment)
{
    reader::memory_source source(past.moments[moment]);
    reader::window window(source);
    return *reader::read_header(window, [](const reader::finding &) {});
}

// Follows from a moment of the history until its end.
checking_listener follow(const history &past, std::size_t begin, moving_source::steps steps)
{
    moving_source source(past, begin, std::move(steps));
    checking_listener seen;
    ring_follower ring(source, header_of(past, begin), begin == 0);
    for (int rounds = 0;; ++rounds) {
        const bool was_at_end = source.at_end();
        const auto done = ring.advance(seen);
        EXPECT_NE(done, ring_follower::progress::new_life);
        if (was_at_end && done == ring_follower::progress::nothing) break;
        if (rounds > 100000) {
            ADD_FAILURE() << "the follower does not come to an end";
            break;
        }
    }
    ring.finish(seen);
    return seen;
}

// All numbers that are neither shown nor told as missing are those of fillers, which carry nothing.
void expect_accounted(const history &past, const checking_listener &seen)
{
    const std::uint64_t fillers = past.last_seq / 2 - past.written.size();
    const std::uint64_t told = seen.shown.size() + seen.missing;
    EXPECT_LE(told, past.last_seq / 2);
    EXPECT_GE(told + fillers, past.last_seq / 2);
    // Whatever the last ring still holds is shown.
    ASSERT_FALSE(seen.shown.empty());
    EXPECT_EQ(seen.shown.back(), past.written.back());
}

history small_ring(std::size_t ring_bytes, int records)
{
    return history_of(ring_bytes, [&](model_writer &writer) {
        for (int i = 0; i < records; ++i) writer.write(static_cast<std::uint32_t>(i * 7 % 4));
    });
}

TEST(RingFollower, ShowsEveryRecordOnceToAWriterOfOneStoreAReading)
{
    const auto past = small_ring(400, 60);
    const auto seen = follow(past, 0, [] { return 1; });
    EXPECT_EQ(seen.shown, past.written);
    EXPECT_EQ(seen.missing, 0u);
    EXPECT_EQ(seen.unfinished, 0u);
}

TEST(RingFollower, ShowsWhatIsCompleteWhereverTheWriterStands)
{
    const auto past = small_ring(400, 30);
    for (std::size_t moment = 0; moment < past.moments.size(); ++moment) {
        moving_source source(past, moment, [] { return 0; });
        checking_listener seen;
        ring_follower ring(source, header_of(past, moment), false);
        while (ring.advance(seen) == ring_follower::progress::some) {
        }
        EXPECT_TRUE(ring.caught_up());
        const auto there = past.complete[moment];
        EXPECT_EQ(seen.shown.empty() ? 0 : seen.shown.back(), there == 0 ? 0 : past.written[there - 1]);
        // Those before them are overwritten, or it is just being done.
        EXPECT_TRUE(std::equal(seen.shown.rbegin(), seen.shown.rend(), past.written.rend() - there));
        EXPECT_GE(seen.shown.size(), std::min<std::size_t>(there, 5));
        EXPECT_EQ(seen.unfinished, 0u);
        ASSERT_FALSE(HasFailure()) << "moment " << moment;
    }
}

// One jump of any length behind any of the readings: every pair of moments that two readings can be of.
TEST(RingFollower, IsCorrectWithEveryJumpOfTheWriterBehindEveryReading)
{
    const auto past = small_ring(300, 14);
    for (std::size_t begin = 0; begin < past.moments.size(); begin += 2) {
        for (std::size_t reading = 0; reading < 14; ++reading) {
            for (std::size_t jump = 1; begin + jump < past.moments.size(); ++jump) {
                std::size_t readings = 0;
                const auto seen = follow(past, begin, [&]() -> std::size_t {
                    const std::size_t now = readings++;
                    return now == reading ? jump : now > reading + 20 ? 1000 : 0;
                });
                if (begin == 0) expect_accounted(past, seen);
                ASSERT_FALSE(HasFailure()) << "begin " << begin << " reading " << reading << " jump " << jump;
            }
        }
    }
}

TEST(RingFollower, IsCorrectWithAWriterOfAnySpeed)
{
    std::mt19937 random(20261121);
    for (int rings = 0; rings < 100; ++rings) {
        const auto past = small_ring(200 + 4 * (random() % 100), 120);
        for (int run = 0; run < 100; ++run) {
            const std::size_t fastest = 1 + random() % 400;
            const auto seen = follow(past, 0, [&] { return random() % 4 == 0 ? random() % fastest : random() % 3; });
            expect_accounted(past, seen);
            ASSERT_FALSE(HasFailure()) << "ring " << rings << " run " << run;
        }
    }
}

TEST(RingFollower, PassesARecordThatWasNotCompletedWhenAnotherFollows)
{
    const auto past = history_of(400, [](model_writer &writer) {
        for (int i = 0; i < 40; ++i) i % 5 == 2 ? writer.begin_and_die(2) : writer.write(1);
    });
    const auto seen = follow(past, 0, [] { return 1; });
    EXPECT_EQ(seen.shown, past.written);
    EXPECT_EQ(seen.unfinished, 8u);
    EXPECT_EQ(seen.missing, 0u);
}

TEST(RingFollower, WaitsForTheNewestRecordToBeCompleted)
{
    const auto past = history_of(400, [](model_writer &writer) {
        writer.write(1);
        writer.begin_and_die(2);
    });
    moving_source source(past, past.moments.size() - 1, [] { return 0; });
    checking_listener seen;
    ring_follower ring(source, header_of(past, past.moments.size() - 1), true);
    while (ring.advance(seen) == ring_follower::progress::some) {
    }
    EXPECT_EQ(seen.unfinished, 0u);
    ring.finish(seen);
    EXPECT_EQ(seen.unfinished, 1u);
}

TEST(RingFollower, TellsThatTheRingWasStartedAnew)
{
    auto past = small_ring(400, 20);
    const auto fresh = small_ring(400, 2);
    const std::size_t before = past.moments.size() - 1;
    past.moments.push_back(fresh.moments.back());
    bool anew = false;
    moving_source source(past, before, [&] { return anew ? 1 : 0; });
    checking_listener seen;
    ring_follower ring(source, header_of(past, before), false);
    while (ring.advance(seen) == ring_follower::progress::some) {
    }
    anew = true;
    (void)ring.advance(seen);
    EXPECT_EQ(ring.advance(seen), ring_follower::progress::new_life);
}

// Takes whatever is handed out.
struct any_listener final : dump::ring_listener {
    void record(const reader::trace_record &) override {}
    void lost(const dump::lost_records &) override {}
    void found(const reader::finding &) override {}
};

TEST(RingFollower, ComesToAnEndWhateverTheBytesAre)
{
    std::mt19937 random(20261121);
    const auto past = small_ring(400, 40);
    for (int run = 0; run < 20000; ++run) {
        const std::size_t moment = random() % past.moments.size();
        auto bytes = past.moments[moment];
        const auto header = header_of(past, moment);
        for (unsigned changes = 1 + random() % 20; changes != 0; --changes)
            bytes[random() % 8 == 0 ? 44 + random() % 4 : 200 + random() % 400] = std::byte(random() % 256);
        reader::memory_source source(bytes);
        any_listener nobody;
        ring_follower ring(source, header, false);
        int rounds = 0;
        while (ring.advance(nobody) == ring_follower::progress::some) ASSERT_LT(++rounds, 1000) << "run " << run;
        ring.finish(nobody);
    }
}

} // namespace
} // namespace qn::test
