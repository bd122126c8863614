// qntrace export --to jsonl: what jq, zcat and zstdcat read is what the other commands show.
#include <algorithm>
#include <filesystem>

#include <gtest/gtest.h>

#include "export/samples.h"
#include "reader/spool_directory.h"

namespace qn::test
{
namespace
{

using nlohmann::json;

// The records of a tree, whatever they are packed with.
strings lines_in_tree(const std::string &out)
{
    return lines_of(shell("find '" + out +
                          "' -name '*.jsonl' -exec cat {} + -o -name '*.jsonl.gz' -exec zcat {} + "
                          "-o -name '*.jsonl.zst' -exec zstdcat {} +"));
}

strings sorted(strings lines)
{
    std::sort(lines.begin(), lines.end());
    return lines;
}

constexpr const char *count_with_jq =
    "jq -n -r 'reduce inputs as $r ({}; .[\"component \" + $r.comp] += 1 | .[\"kind \" + $r.kind] += 1 |"
    " .[\"thread \" + ($r.thread | tostring)] += 1 |"
    " if $r.id != null and $r.id != 4294967295 then .[\"id \" + $r.comp + \" \" + ($r.id | tostring)] += 1 else . end)"
    " | to_entries[] | \"\\(.key)\\t\\(.value)\"'";

class Jsonl : public testing::TestWithParam<sample>
{
};

TEST_P(Jsonl, HasTheRecordsThatMergePrints)
{
    const scratch_folder folder;
    const auto arguments = GetParam().make(folder);
    exported("jsonl", folder.path("out"), arguments);
    const auto found = lines_in_tree(folder.path("out"));
    EXPECT_FALSE(found.empty());
    EXPECT_EQ(sorted(found), sorted(merged_lines(arguments)));
}

TEST_P(Jsonl, CountsInJqWhatStatsCounts)
{
    const scratch_folder folder;
    const auto arguments = GetParam().make(folder);
    exported("jsonl", folder.path("out"), arguments);
    EXPECT_EQ(counts_in(shell("find '" + folder.path("out") + "' -name '*.jsonl' -exec cat {} + | " + count_with_jq)),
              counts_by_stats(arguments));
}

TEST_P(Jsonl, TellsOfEverySourceWhatIsMissing)
{
    const scratch_folder folder;
    const auto arguments = GetParam().make(folder);
    exported("jsonl", folder.path("out"), arguments);
    const auto sums = shell("jq -s -r '(\"unfinished\", \"missing\", \"overwritten\", \"unspooled_pages\") as $m | "
                            "\"\\($m)\\t\\(map(.[$m]) | add)\"' '" +
                            folder.path("out/sources.ndjson") + "'");
    EXPECT_EQ(counts_in(sums), losses_by_stats(arguments));
}

INSTANTIATE_TEST_SUITE_P(Samples, Jsonl, testing::ValuesIn(samples()), sample_name);

TEST(JsonlExport, HasTheLinesOfDumpWithTheirOrigin)
{
    const scratch_folder folder;
    const auto arguments = samples().front().make(folder);
    exported("jsonl", folder.path("out"), arguments);
    const auto dumped = rows(run_qntrace({"dump", "--json", "--utc", arguments.front()}));
    auto found = lines_in_tree(folder.path("out"));
    ASSERT_EQ(found.size() + 1, dumped.size()); // the header
    for (std::size_t i = 0; i < found.size(); ++i) {
        auto object = json::parse(found[i]);
        EXPECT_EQ(object.at("path"), arguments.front());
        EXPECT_EQ(object.at("trace"), "every.trc");
        EXPECT_EQ(object.at("program"), "app");
        for (const char *origin : {"node", "node_id", "program", "trace", "path"}) object.erase(origin);
        EXPECT_EQ(object, dumped[i + 1]);
    }
}

TEST(JsonlExport, KeepsEveryByteOfNamesThatAreNoUtf8InTheListOfSources)
{
    const scratch_folder folder;
    auto file = ids_from(1, {1});
    file.put_text(132, "b\xfcro");
    exported("jsonl", folder.path("out"), {folder.file("a.trc", file.bytes())});
    const auto source = json::parse(contents_of(folder.path("out/sources.ndjson")));
    EXPECT_EQ(source.at("encoding"), "latin-1");
    EXPECT_EQ(source["program"], "b\xc3\xbcro");
}

class Packed : public testing::TestWithParam<std::pair<const char *, const char *>>
{
};

TEST_P(Packed, HoldsTheSameLines)
{
    const scratch_folder folder;
    const std::string file = folder.path("big.trc");
    {
        const writing_program writes(file, "", 0, 20'000);
    }
    exported("jsonl", folder.path("plain"), {file});
    exported("jsonl", folder.path("packed"), {"--compress", GetParam().first, file});
    for (const auto &path : tree_of(folder.path("packed"))) EXPECT_FALSE(path.ends_with(".jsonl")) << path;
    const auto lines = lines_in_tree(folder.path("packed"));
    EXPECT_GE(lines.size(), 1000U);
    EXPECT_EQ(lines, lines_in_tree(folder.path("plain")));
    EXPECT_EQ(shell("find '" + folder.path("packed") + "' -name '*" + GetParam().second + "' | wc -l"), "1\n");
}

INSTANTIATE_TEST_SUITE_P(Ways, Packed, testing::Values(std::pair("gzip", ".jsonl.gz"), std::pair("zstd", ".jsonl.zst")),
                         [](const auto &info) { return std::string(info.param.first); });

TEST(JsonlExport, KeepsClusterHostNodeAndProgramInItsFolders)
{
    const scratch_folder folder;
    const auto two_nodes = samples().at(3);
    exported("jsonl", folder.path("out"), two_nodes.make(folder));
    strings files;
    for (const auto &path : tree_of(folder.path("out")))
        if (path.ends_with(".jsonl")) files.push_back(path);
    EXPECT_EQ(files, (strings{"prod/host1/00000000000000a1/indexer/app.trc.1.sp.2026_11_21_05_12_01.000001.jsonl",
                              "prod/host1/00000000000000a1/indexer/app.trc.2.sp.2026_11_21_05_12_02.000001.jsonl",
                              "prod/host2/00000000000000a2/indexer/app.trc.1.sp.2026_11_21_05_12_01.000001.jsonl"}));
}

TEST(JsonlExport, MakesNoFileForASourceWithoutRecords)
{
    const scratch_folder folder;
    trace_builder empty;
    empty.close();
    exported("jsonl", folder.path("out"), {folder.file("empty.trc", empty.bytes())});
    EXPECT_EQ(tree_of(folder.path("out")), (strings{".qntrace-export", "sources.ndjson"}));
    const auto about = json::parse(contents_of(folder.path("out/sources.ndjson")));
    EXPECT_EQ(about.at("records"), 0);
    EXPECT_EQ(about.at("output"), nullptr);
}

TEST(JsonlExport, KeepsFilesOfOneNameApart)
{
    const scratch_folder folder;
    std::filesystem::create_directory(folder.path("a"));
    std::filesystem::create_directory(folder.path("b"));
    const auto a = folder.file("a/app.trc", ids_from(1, {1}).bytes());
    const auto b = folder.file("b/app.trc", ids_from(2, {2}).bytes());
    exported("jsonl", folder.path("out"), {a, b});
    EXPECT_EQ(lines_in_tree(folder.path("out")).size(), 2U);
    EXPECT_EQ(shell("cd '" + folder.path("out") + "' && find . -name '*.jsonl' | sort"),
              "./unknown/unknown/000000000000abcd/app/app.trc-2.jsonl\n"
              "./unknown/unknown/000000000000abcd/app/app.trc.jsonl\n");
}

} // namespace
} // namespace qn::test
