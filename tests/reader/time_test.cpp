// From counter values to the times on the page.
#include <gtest/gtest.h>

#include <cstdlib>
#include <ctime>

#include "reader/reading.h"
#include "reader/trace_builder.h"
#include "tools/qntrace/format/timestamps.h"

namespace qn::test
{
namespace
{

constexpr std::int64_t epoch = trace_builder::epoch_ns;

std::vector<std::int64_t> times_of_data(const trace_builder &file)
{
    std::vector<std::int64_t> result;
    for (const auto &record : read_all(file.bytes()).records) {
        if (record.kind != "free") result.push_back(std::stoll(record.time_ns.value_or("-1")));
    }
    return result;
}

TEST(Time, TheHeadersBaseHoldsForTheOldestRecords)
{
    trace_builder file;
    file.counter = 500;
    file.add_id(1);
    file.put_u64(24, 1000);
    file.put_u64(32, static_cast<std::uint64_t>(epoch));
    file.close();
    EXPECT_EQ(times_of_data(file), (std::vector<std::int64_t>{epoch + 500'000'000}));
}

TEST(Time, AStartARestartAndACalibrationChangeTheBaseFromThemselvesOn)
{
    trace_builder file;
    file.counter = 0;
    file.add_id(1);                                                                                // counter 0
    file.add_start(1, 2'000'000'000, static_cast<std::uint64_t>(epoch + 10'000));                  // 1000
    file.add_id(2);                                                                                // 2000
    file.add_start(2, 1'000'000'000, static_cast<std::uint64_t>(epoch + 20'000), 19, "restarted"); // 3000
    file.add_id(3);                                                                                // 4000
    file.add(17, file.body().u64(500'000'000).u64(static_cast<std::uint64_t>(epoch + 30'000)));    // 5000
    file.add_id(4);                                                                                // 6000
    file.close();
    EXPECT_EQ(times_of_data(file), (std::vector<std::int64_t>{epoch, epoch + 10'500, epoch + 11'000, epoch + 23'000,
                                                              epoch + 24'000, epoch + 40'000, epoch + 42'000}));
}

TEST(Time, TheBaseIsFollowedInTheOrderOfTheRingNotOfTheFile)
{
    trace_builder file;
    file.at = 200 + 32;
    file.counter = 1000;
    file.add_start(1, 1'000'000'000, static_cast<std::uint64_t>(epoch + 50'000));
    file.add_free(4096 - file.at);
    file.at = 200;
    file.counter = 3000;
    file.add_id(2); // the newest, at the beginning of the file
    file.set_oldest(232);
    EXPECT_EQ(times_of_data(file), (std::vector<std::int64_t>{epoch + 51'000, epoch + 53'000}));
}

TEST(Time, NanosecondsAreExact)
{
    trace_builder file;
    file.put_u64(24, 2'899'999'999);
    file.counter = 12'345'678'901'234'567;
    file.add_id(1);
    file.close();
    // floor(12345678901234567 * 10^9 / 2899999999)
    EXPECT_EQ(times_of_data(file), (std::vector<std::int64_t>{epoch + 4'257'130'657'066'102}));
}

class zone
{
public:
    explicit zone(const char *name)
    {
        setenv("TZ", name, 1);
        tzset();
    }
    ~zone()
    {
        unsetenv("TZ");
        tzset();
    }
};

TEST(Timestamps, UtcIsMarkedWithZ)
{
    dump::timestamps utc(true);
    EXPECT_EQ(utc.text({1'795'237'921, 123'456'789}), "2026-11-21T05:12:01.123456789Z");
    EXPECT_EQ(utc.text({1'795'237'921, 5}), "2026-11-21T05:12:01.000000005Z");
    EXPECT_EQ(utc.text({0, 0}), "1970-01-01T00:00:00.000000000Z");
    EXPECT_EQ(utc.text({-1, 999'999'999}), "1969-12-31T23:59:59.999999999Z");
    EXPECT_EQ(utc.width(), utc.text({0, 0})->size());
}

TEST(Timestamps, LocalTimesCarryTheirOffset)
{
    const zone berlin("CET-1CEST,M3.5.0,M10.5.0/3");
    dump::timestamps local(false);
    EXPECT_EQ(local.text({1'795'237'921, 1}), "2026-11-21T06:12:01.000000001+01:00");
    EXPECT_EQ(local.text({1'782'000'000, 0}), "2026-06-21T02:00:00.000000000+02:00");
    EXPECT_EQ(local.width(), local.text({0, 0})->size());
}

TEST(Timestamps, ZonesWestOfGreenwichAndWithHalfHoursAreShownAsTheyAre)
{
    {
        const zone newfoundland("NST3:30");
        EXPECT_EQ(dump::timestamps(false).text({1'795'237'921, 0}), "2026-11-21T01:42:01.000000000-03:30");
    }
    {
        const zone seconds("LMT-0:53:28"); // RFC 3339 has no seconds in an offset
        EXPECT_EQ(dump::timestamps(false).text({1'795'237'921, 0}), "2026-11-21T06:05:01.000000000+00:53");
    }
    {
        const zone seconds("LMT0:53:28");
        EXPECT_EQ(dump::timestamps(false).text({1'795'237'921, 0}), "2026-11-21T04:19:01.000000000-00:53");
    }
}

TEST(Timestamps, YearsThatCannotBeWrittenHaveNoText)
{
    dump::timestamps utc(true);
    EXPECT_EQ(utc.text({253402300799, 0}), "9999-12-31T23:59:59.000000000Z");
    EXPECT_FALSE(utc.text({253402300800, 0}));
    EXPECT_EQ(utc.text({-62167219200, 0}), "0000-01-01T00:00:00.000000000Z");
    EXPECT_FALSE(utc.text({-62167219201, 0}));
    EXPECT_FALSE(utc.text({INT64_MAX, 0}));
    EXPECT_FALSE(utc.text({INT64_MIN, 0}));
}

TEST(Timestamps, NanosecondsSinceTheEpochDoNotOverflow)
{
    EXPECT_EQ(dump::nanoseconds_text({1'795'237'921, 123'456'789}), "1795237921123456789");
    EXPECT_EQ(dump::nanoseconds_text({-1, 999'999'999}), "-1");
    EXPECT_EQ(dump::nanoseconds_text({INT64_MAX, 999'999'999}), "9223372036854775807999999999");
}

} // namespace
} // namespace qn::test
