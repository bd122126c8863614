// The golden trace: today's reader decodes a committed file to committed text and JSON, and today's library still
// writes those records.
#include <gtest/gtest.h>

#include <sstream>

#include <nlohmann/json.hpp>

#include "reader/program.h"

namespace qn::test
{
namespace
{

std::string golden(const std::string &name) { return std::string(GOLDEN_FOLDER) + "/" + name; }

// The outcome of a dump, with the file called golden.trc wherever it lies.
outcome dump_golden(std::vector<std::string> arguments)
{
    const auto path = golden("golden.trc");
    arguments.push_back(path);
    auto run = run_qntrace(arguments);
    for (auto *stream : {&run.out, &run.err}) {
        for (auto at = stream->find(path); at != std::string::npos; at = stream->find(path)) {
            stream->replace(at, path.size(), "golden.trc");
        }
    }
    return run;
}

// A dump's objects without what differs from one run of the writing program to the next.
std::vector<nlohmann::json> lasting_parts(const std::string &lines)
{
    std::vector<nlohmann::json> result;
    std::istringstream in(lines);
    for (std::string line; std::getline(in, line);) {
        auto object = nlohmann::json::parse(line);
        for (const auto *varying : {"file", "build", "pid", "program", "base_program", "node_number", "node_id",
                                    "tz_offset_minutes", "time", "time_ns", "time_base", "thread", "counter"}) {
            object.erase(varying);
        }
        result.push_back(object);
    }
    return result;
}

TEST(GoldenTrace, ItsTextIsTheCommittedOne)
{
    const auto run = dump_golden({"dump", "--utc"});
    EXPECT_EQ(run.out, contents_of(golden("golden.txt")));
    EXPECT_EQ(run.err, contents_of(golden("golden.err")));
    EXPECT_EQ(run.status, 1); // its last record was never completed
}

TEST(GoldenTrace, ItsJsonIsTheCommittedOne)
{
    const auto run = dump_golden({"dump", "--json", "--utc"});
    EXPECT_EQ(run.out, contents_of(golden("golden.json")));
    EXPECT_EQ(run.err, contents_of(golden("golden.err")));
    EXPECT_EQ(run.status, 1);
}

TEST(GoldenTrace, ItsRawTextIsTheCommittedOne)
{
    EXPECT_EQ(dump_golden({"dump", "--raw", "--utc"}).out, contents_of(golden("golden.raw.txt")));
}

TEST(GoldenTrace, TheLibraryStillWritesItsRecords)
{
    const scratch_folder folder;
    const auto path = folder.path("new.trc");
    const auto written = run_program(WRITE_GOLDEN_PROGRAM, {path});
    ASSERT_EQ(written.status, 0) << written.err;
    const auto run = run_qntrace({"dump", "--json", "--utc", path});
    EXPECT_EQ(lasting_parts(run.out), lasting_parts(contents_of(golden("golden.json"))));
}

} // namespace
} // namespace qn::test
