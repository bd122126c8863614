// qntrace export --to sqlite: the database shell finds what the other commands show.
#include <gtest/gtest.h>

#include "export/samples.h"
#include "reader/every_kind.h"
#include "reader/spool_directory.h"

namespace qn::test
{
namespace
{

using nlohmann::json;

// The rows of a query, their columns with a tab between them.
std::string query(const std::string &database, const std::string &sql)
{
    return shell("sqlite3 -readonly -separator \"$(printf '\\t')\" '" + database + "' <<'END_OF_QUERY'\n" + sql +
                 "\nEND_OF_QUERY");
}

class Sqlite : public testing::TestWithParam<sample>
{
};

TEST_P(Sqlite, CountsInItsViewsWhatStatsCounts)
{
    const scratch_folder folder;
    const auto arguments = GetParam().make(folder);
    const auto database = folder.path("out.db");
    exported("sqlite", database, arguments);
    auto expected = counts_by_stats(arguments);
    std::erase_if(expected, [](const auto &count) {
        // The column has escapes where stats replaces what is no text.
        return count.first.find_first_of("\\\x01") != std::string::npos;
    });
    auto found = counts_in(query(database, "SELECT 'component ' || comp, records FROM per_component;\n"
                                           "SELECT 'kind ' || kind, records FROM per_kind;\n"
                                           "SELECT 'id ' || comp || ' ' || id, records FROM per_id;\n"
                                           "SELECT 'thread ' || thread, records FROM per_thread;"));
    std::erase_if(found, [](const auto &count) { return count.first.find('\\') != std::string::npos; });
    EXPECT_EQ(found, expected);
}

TEST_P(Sqlite, HasEveryRecordWithItsTime)
{
    const scratch_folder folder;
    const auto arguments = GetParam().make(folder);
    const auto database = folder.path("out.db");
    exported("sqlite", database, arguments);
    strings expected;
    for (const auto &line : merged_lines(arguments)) {
        const auto object = json::parse(line);
        expected.push_back(object.at("time").get<std::string>() + " " + object.at("time_ns").get<std::string>() + " " +
                           std::to_string(object.at("seq").get<std::uint32_t>()) + " " +
                           std::to_string(object.at("thread").get<std::uint32_t>()) + " " +
                           object.at("kind").get<std::string>());
    }
    EXPECT_EQ(
        lines_of(query(database, "SELECT t.time || ' ' || time_ns || ' ' || r.seq || ' ' || r.thread || ' ' || r.kind"
                                 " FROM records AS r JOIN records_text AS t USING (record_id)"
                                 " ORDER BY record_id;")),
        expected);
}

TEST_P(Sqlite, HasTheBodiesOfDump)
{
    const scratch_folder folder;
    const auto arguments = GetParam().make(folder);
    const auto database = folder.path("out.db");
    exported("sqlite", database, arguments);
    const auto bodies = lines_of(query(database, "SELECT body FROM records ORDER BY record_id;"));
    const auto merged = merged_lines(arguments);
    ASSERT_EQ(bodies.size(), merged.size());
    for (std::size_t i = 0; i < merged.size(); ++i) {
        const auto expected = json::parse(merged[i]);
        const auto body = json::parse(bodies[i]);
        for (const auto &[name, value] : body.items()) EXPECT_EQ(value, expected.at(name)) << merged[i];
        for (const char *member : {"values", "strings", "blocks", "text", "message", "pid", "code"})
            EXPECT_EQ(body.contains(member), expected.contains(member)) << merged[i];
    }
}

TEST_P(Sqlite, CountsWhatIsMissing)
{
    const scratch_folder folder;
    const auto arguments = GetParam().make(folder);
    const auto database = folder.path("out.db");
    exported("sqlite", database, arguments);
    counts found;
    for (const char *what : {"unfinished", "missing", "overwritten", "unspooled_pages"})
        found[what] = std::stoull(query(database, std::string("SELECT sum(") + what + ") FROM losses;"));
    EXPECT_EQ(found, losses_by_stats(arguments));
}

TEST_P(Sqlite, IsASoundDatabase)
{
    const scratch_folder folder;
    const auto database = folder.path("out.db");
    exported("sqlite", database, GetParam().make(folder));
    EXPECT_EQ(query(database, "PRAGMA integrity_check; PRAGMA foreign_key_check;"), "ok\n");
}

INSTANTIATE_TEST_SUITE_P(Samples, Sqlite, testing::ValuesIn(samples()), sample_name);

TEST(SqliteExport, KeepsValuesOf64BitsAndWhatIsWrongWithRecords)
{
    const scratch_folder folder;
    const auto database = folder.path("out.db");
    exported("sqlite", database, {folder.file("a.trc", every_kind().bytes())});
    EXPECT_EQ(query(database, "SELECT json_extract(body, '$.values') FROM records WHERE kind = 'values64';"),
              "[\"7\",\"18446744073709481616\",\"9223372036854775808\"]\n");
    trace_builder file;
    file.put_u64(24, 0); // no time base
    file.add_id(7);
    file.close();
    const auto untimed = folder.path("untimed.db");
    exported("sqlite", untimed, {folder.file("b.trc", file.bytes())});
    EXPECT_EQ(query(untimed, "SELECT ifnull(time_ns, 'none'), id, problem FROM records;"),
              "none\t7\tthe record's time is not known, its counter is 1123456789\n");
}

TEST(SqliteExport, ShowsErrorsAndSecondsInViews)
{
    const scratch_folder folder;
    const auto database = folder.path("out.db");
    exported("sqlite", database, {folder.file("a.trc", every_kind().bytes())});
    EXPECT_EQ(query(database, "SELECT comp, id, error_id, function, file, line FROM errors;"),
              "IDX\t31\t18\topen_it\tapp.c\t120\n");
    EXPECT_EQ(query(database, "SELECT second, records FROM per_second;"),
              "1795237920\t2\n1795237921\t11\n1795237922\t1\n");
}

TEST(SqliteExport, WritesTimesBefore1970)
{
    const scratch_folder folder;
    trace_builder file;
    file.put_u64(32, static_cast<std::uint64_t>(-5'000'000'000));
    file.add_id(1);
    file.close();
    const auto database = folder.path("out.db");
    exported("sqlite", database, {folder.file("a.trc", file.bytes())});
    EXPECT_EQ(query(database, "SELECT r.time_ns, t.time, s.second FROM records r JOIN records_text t USING (record_id),"
                              " per_second s;"),
              "-3876543211\t1969-12-31T23:59:56.123456789Z\t-4\n");
}

} // namespace
} // namespace qn::test
