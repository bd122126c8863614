// What a file map does: tokens of registered and of later components, and the files it starts.
#include <filesystem>

#include <gtest/gtest.h>

#include "components/components_seen.h"
#include "components/mutexes.h"
#include "components/outcome.h"
#include "support/failing_memory.h"
#include "support/scratch.h"
#include "support/trace_image.h"

namespace
{
using namespace qn::test;

trace_anchor_t *anchor_of(const std::string &file) { return findOrCreateAnchorForFile(file.c_str(), 0); }

TEST(FileMap, SetsTokensByPositionWhereLevelsGoByIdentifier)
{
    const scratch files;
    client ab = client_with("AB", {{2, "a", 1, 0}, {0, "b", 1, 0}, {1, "c", 1, 0}});
    ASSERT_EQ(ab.register_now(), 0);
    EXPECT_EQ(after(tr_set_file_map_1((files / "x.trc").c_str(), "AB:a")), success());
    ASSERT_NE(anchor_of(files / "x.trc"), nullptr);
    EXPECT_EQ(ab.tokens[0], anchor_of(files / "x.trc"));
    EXPECT_EQ(ab.tokens[1], nullptr);
    EXPECT_EQ(ab.tokens[2], nullptr);
}

TEST(FileMap, MatchesAnywhereInTheNamesAndWithoutRegardToCase)
{
    const scratch files;
    client ab01("AB01", 2, 0);
    client other("CD", 2, 0);
    ASSERT_EQ(ab01.register_now(), 0);
    ASSERT_EQ(other.register_now(), 0);
    ASSERT_EQ(tr_set_file_map_1((files / "x.trc").c_str(), "ab:C1"), 0);
    EXPECT_EQ(ab01.tokens[0], nullptr);
    EXPECT_EQ(ab01.tokens[1], anchor_of(files / "x.trc"));
    EXPECT_EQ(other.tokens[1], nullptr);
}

TEST(FileMap, LetsALaterMapWin)
{
    const scratch files;
    client ab("AB", 2, 0);
    ASSERT_EQ(ab.register_now(), 0);
    ASSERT_EQ(tr_set_file_map_1((files / "x.trc").c_str(), "AB:*"), 0);
    ASSERT_EQ(tr_set_file_map_1((files / "y.trc").c_str(), "AB:c1"), 0);
    EXPECT_EQ(ab.tokens[0], anchor_of(files / "x.trc"));
    EXPECT_EQ(ab.tokens[1], anchor_of(files / "y.trc"));
}

TEST(FileMap, LeadsBackToTheDefaultFileByTheEmptyName)
{
    const scratch files;
    client ab("AB", 1, 0);
    ASSERT_EQ(ab.register_now(), 0);
    ASSERT_EQ(tr_set_file_map_1((files / "x.trc").c_str(), "AB:*"), 0);
    ASSERT_EQ(tr_set_file_map_1("", "AB:*"), 0);
    EXPECT_EQ(ab.tokens[0], &anchors);
}

TEST(FileMap, IsKeptForComponentsThatRegisterLater)
{
    const scratch files;
    ASSERT_EQ(tr_set_file_map_1((files / "x.trc").c_str(), "AB:*"), 0);
    ASSERT_EQ(tr_set_file_map_1((files / "y.trc").c_str(), "AB:c1"), 0);
    EXPECT_EQ(anchors.numAnchors, 1U) << "the file is looked up when the map meets a category";
    client ab("AB", 2, 0);
    ASSERT_EQ(ab.register_now(), 0);
    EXPECT_EQ(ab.tokens[0], anchor_of(files / "x.trc"));
    EXPECT_EQ(ab.tokens[1], anchor_of(files / "y.trc"));
    EXPECT_EQ(anchors.numAnchors, 3U);
}

TEST(FileMap, IsAppliedWholeAtEachCall)
{
    const scratch files;
    client ab("AB", 2, 0);
    ASSERT_EQ(ab.register_now(), 0);
    ASSERT_EQ(tr_set_file_map_1((files / "x.trc").c_str(), "AB:c0"), 0);
    ab.tokens[0] = nullptr;
    ASSERT_EQ(tr_set_file_map_1((files / "y.trc").c_str(), "AB:c1"), 0);
    EXPECT_EQ(ab.tokens[0], anchor_of(files / "x.trc"));
}

TEST(FileMap, LetsALaterMapWinAtEachCall)
{
    const scratch files;
    client ab("AB", 2, 0);
    ASSERT_EQ(ab.register_now(), 0);
    ASSERT_EQ(tr_set_file_map_1((files / "x.trc").c_str(), "AB:c0"), 0);
    ASSERT_EQ(tr_set_file_map_1((files / "y.trc").c_str(), "AB:*"), 0);
    ASSERT_EQ(tr_set_file_map_1((files / "z.trc").c_str(), "AB:c1"), 0);
    ab.tokens[0] = ab.tokens[1] = nullptr;
    ASSERT_EQ(tr_set_file_map_1((files / "z.trc").c_str(), "OTHER:*"), 0);
    EXPECT_EQ(ab.tokens[0], anchor_of(files / "y.trc"));
    EXPECT_EQ(ab.tokens[1], anchor_of(files / "z.trc"));
}

// The parser compiles both patterns to check them, then the application compiles both.
constexpr int last_compilation = 4;

TEST(FileMap, MeetsAgainAtTheNextCallWhatItCouldNotBeCompiledFor)
{
    const scratch files;
    client ab("AB", 1, 0);
    ASSERT_EQ(ab.register_now(), 0);
    for (const int number : {last_compilation - 1, last_compilation}) {
        const std::string file = files / std::to_string(number);
        {
            const failing_pattern failing(number);
            ASSERT_EQ(tr_set_file_map_1(file.c_str(), "AB:*"), 0);
        }
        EXPECT_EQ(anchor_of(file), nullptr);
        ASSERT_EQ(tr_set_file_map_1((files / "other.trc").c_str(), "OTHER:*"), 0);
        ASSERT_NE(anchor_of(file), nullptr);
        EXPECT_EQ(ab.tokens[0], anchor_of(file));
    }
}

TEST(FileMap, CompilesOnlyThePatternsOfTheCall)
{
    const scratch files;
    client ab("AB", 1, 0);
    ASSERT_EQ(ab.register_now(), 0);
    ASSERT_EQ(tr_set_file_map_1((files / "x.trc").c_str(), "AB:*"), 0);
    const auto map_with_cancellation_in = [&](int number) {
        const cancellation_in_pattern cancellation(number);
        tr_set_file_map_1((files / "y.trc").c_str(), "AB:*");
    };
    EXPECT_FALSE(is_cancelled_in([&] { map_with_cancellation_in(last_compilation + 1); }));
    EXPECT_TRUE(is_cancelled_in([&] { map_with_cancellation_in(last_compilation); }));
}

TEST(FileMap, ReportsThatMemoryRanOutForTheFileAndMeetsItAtTheNextCall)
{
    const scratch files;
    client ab("AB", 1, 0);
    ASSERT_EQ(ab.register_now(), 0);
    {
        const failing_allocation of_the_anchor(2); // behind the node
        const qn_int32_t status = tr_set_file_map_1((files / "x.trc").c_str(), "AB:*");
        ASSERT_TRUE(of_the_anchor.happened());
        EXPECT_EQ(after(status), no_memory());
    }
    EXPECT_EQ(ab.tokens[0], nullptr);
    EXPECT_EQ(after(tr_set_file_map_1((files / "y.trc").c_str(), "OTHER:*")), success());
    ASSERT_NE(anchor_of(files / "x.trc"), nullptr);
    EXPECT_EQ(ab.tokens[0], anchor_of(files / "x.trc"));
}

TEST(FileMap, ComesFromTheEnvironment)
{
    const scratch files;
    setenv("QN_TR_FILE_MAP", ("\"" + files / "a b.trc" + "\",AB:*;" + files / "y.trc" + " AB:c1 rest").c_str(), 1);
    client ab("AB", 3, 0);
    ASSERT_EQ(ab.register_now(), 0);
    EXPECT_EQ(ab.tokens[0], anchor_of(files / "a b.trc"));
    EXPECT_EQ(ab.tokens[1], anchor_of(files / "y.trc"));
    EXPECT_EQ(ab.tokens[2], anchor_of(files / "a b.trc"));
}

TEST(FileMap, SendsRecordsToTheirFile)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "default.trc").c_str()), 0);
    client ab("ABCD", 2);
    ASSERT_EQ(ab.register_now(), 0);
    ASSERT_EQ(tr_set_file_map_1((files / "errors.trc").c_str(), "ABCD:c1"), 0);
    ASSERT_EQ(tr_ms_record_id_1("ABCD", 10, ab.tokens[0]), 0);
    ASSERT_EQ(tr_ms_record_id_1("ABCD", 11, ab.tokens[1]), 0);
    constexpr uint16_t id_record = 1;
    const auto in_default = trace_image::of_file(files / "default.trc").records_of(id_record);
    const auto in_errors = trace_image::of_file(files / "errors.trc").records_of(id_record);
    ASSERT_EQ(in_default.size(), 1U);
    ASSERT_EQ(in_errors.size(), 1U);
    EXPECT_EQ(in_default[0].u32(28), 10U);
    EXPECT_EQ(in_errors[0].u32(28), 11U);
}

TEST(FileMap, StartsTheFileWhenSomethingIsTraced)
{
    const scratch files;
    client ab("AB");
    client silent("OFF", 1, 0);
    ASSERT_EQ(silent.register_now(), 0);
    ASSERT_EQ(tr_set_file_map_1((files / "x.trc").c_str(), "OFF:*"), 0);
    EXPECT_FALSE(std::filesystem::exists(files / "x.trc"));
    ASSERT_EQ(ab.register_now(), 0);
    EXPECT_TRUE(std::filesystem::exists(files / "x.trc"));
    ASSERT_EQ(tr_set_file_map_1((files / "y.trc").c_str(), "AB:*"), 0);
    EXPECT_TRUE(std::filesystem::exists(files / "y.trc"));
}

TEST(FileMap, ReturnsWhatTheLastStartReturned)
{
    const scratch files;
    client ab("AB", 2);
    ASSERT_EQ(ab.register_now(), 0);
    EXPECT_EQ(after(tr_set_file_map_1((files / "missing/x.trc").c_str(), "AB:c0")), no_such_file());
    EXPECT_NE(ab.tokens[0], nullptr);
    // The new file's start comes before the older one's.
    EXPECT_EQ(after(tr_set_file_map_1((files / "y.trc").c_str(), "AB:c1")), no_such_file());
    EXPECT_TRUE(std::filesystem::exists(files / "y.trc"));
    std::filesystem::create_directory(files / "missing");
    EXPECT_EQ(after(tr_set_file_map_1((files / "y.trc").c_str(), "AB:c1")), success());
}

TEST(FileMap, ChangesNothingWhenTheSelectionIsFaulty)
{
    const scratch files;
    client ab("AB", 1, 0);
    ASSERT_EQ(ab.register_now(), 0);
    ASSERT_EQ(tr_set_file_map_1((files / "x.trc").c_str(), "AB:*"), 0);
    EXPECT_EQ(after(tr_set_file_map_1((files / "y.trc").c_str(), "AB:A,CD:B")), syntax_error(11, 4));
    EXPECT_EQ(after(tr_set_file_map_1((files / "y.trc").c_str(), "")), syntax_error(11, 0));
    EXPECT_EQ(count_of(anchors.pFirstMapSpec), 1U);
    EXPECT_EQ(anchors.pFirstMapSpec, anchors.pLastMapSpec);
    EXPECT_EQ(ab.tokens[0], anchor_of(files / "x.trc"));
    EXPECT_EQ(anchor_of(files / "y.trc"), nullptr);
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
}

TEST(FileMap, ClearsTheErrorRecord)
{
    leave_marker();
    EXPECT_EQ(after(tr_set_file_map_1("/tmp/never.trc", "AB:*")), success());
}

TEST(FileMap, DoesNothingOnceTracingIsStopped)
{
    client ab("AB");
    ASSERT_EQ(ab.register_now(), 0);
    global_stop_trace();
    leave_marker();
    EXPECT_EQ(tr_set_file_map_1("/tmp/never.trc", "AB:*"), 0);
    EXPECT_EQ(tr_set_file_map_1("/tmp/never.trc", ":"), 0);
    EXPECT_TRUE(marker_is_there());
    EXPECT_EQ(anchors.pFirstMapSpec, nullptr);
    EXPECT_EQ(ab.tokens[0], nullptr);
}

TEST(FileMap, FailsWhenTheGlobalMutexCannotBeTaken)
{
    client ab("AB");
    ASSERT_EQ(ab.register_now(), 0);
    outcome seen;
    {
        const exhausted_mutex exhausted(anchors.anchorMutex);
        seen = after(tr_set_file_map_1("/tmp/never.trc", "AB:*"));
    }
    EXPECT_EQ(seen, lock_failure(exhausted_mutex::lock_result));
    EXPECT_EQ(anchors.pFirstMapSpec, nullptr);
}

TEST(FileMap, IsRolledBackWhenTheThreadIsCancelledInTheParser)
{
    ASSERT_EQ(tr_set_file_map_1("/tmp/never.trc", "AB:*"), 0);
    ASSERT_TRUE(is_cancelled_in([] {
        const cancellation_in_pattern cancellation(2);
        tr_set_file_map_1("/tmp/never.trc", "CD:*");
    }));
    EXPECT_EQ(count_of(anchors.pFirstMapSpec), 1U);
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
}

TEST(FileMap, ReachesOneComponentWhenAskedTo)
{
    client ab("AB", 1, 0);
    client cd("CD", 1, 0);
    ASSERT_EQ(ab.register_now(), 0);
    ASSERT_EQ(cd.register_now(), 0);
    map_list list;
    ASSERT_EQ(list.select("*:*", "/tmp/never.trc"), 0);
    EXPECT_EQ(process_map_spec(&anchors, list.first, registered("CD")), 0);
    EXPECT_EQ(ab.tokens[0], nullptr);
    EXPECT_EQ(cd.tokens[0], anchor_of("/tmp/never.trc"));
}

TEST(FileMap, DoesNothingWithAPatternThatDoesNotCompile)
{
    client ab("AB", 1, 0);
    ASSERT_EQ(ab.register_now(), 0);
    char good[] = ".*";
    char bad[] = "(";
    trace_map_spec_t spec{nullptr, nullptr, bad, good, nullptr, "/tmp/never.trc", false};
    EXPECT_EQ(process_map_spec(&anchors, &spec, nullptr), 0);
    spec.pCompId = good;
    spec.pCategory = bad;
    EXPECT_EQ(process_map_spec(&anchors, &spec, nullptr), 0);
    EXPECT_EQ(ab.tokens[0], nullptr);
    EXPECT_EQ(anchors.numAnchors, 1U);
}
} // namespace
