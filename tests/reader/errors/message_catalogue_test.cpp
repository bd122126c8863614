// Where the message of an error record comes from.
#include <filesystem>
#include <fstream>

#include <gtest/gtest.h>

#include "reader/errors/error_records.h"
#include "reader/spool_directory.h"

namespace qn::test
{
namespace
{

// A catalogue app.cat in a folder of its own, with the text of message 7 of set 1.
struct catalogue : scratch_folder {
    explicit catalogue(const std::string &text)
    {
        std::ofstream(path("app.msg")) << "$set 1\n7 " << text << "\n";
        EXPECT_EQ(run_program(GENCAT_PROGRAM, {path("app.cat"), path("app.msg")}).status, 0);
    }

    // The message and where it came from, as `qntrace errors` finds them for a record.
    std::string message_of(const error_record &error) const
    {
        trace_builder file;
        add_error(file, error);
        file.close();
        const auto trace = scratch_folder::file("a.trc", file.bytes());
        surroundings around;
        around.environment.push_back("NLSPATH=" + path("%N"));
        const auto shown = run_qntrace({"errors", "--json", trace}, around);
        EXPECT_EQ(shown.status, 0) << shown.err;
        const auto latest = rows(shown).at(0).at("latest");
        return latest.at("message_from").get<std::string>() + ": " + latest.at("message").get<std::string>();
    }
};

error_record in_catalogue(const std::string &name)
{
    error_record error;
    error.catalogue = name;
    return error;
}

TEST(ErrorMessage, IsTheCataloguesWithTheRecordsArguments)
{
    const catalogue texts("%2$s laesst sich nicht oeffnen (%1$d)\\n");
    EXPECT_EQ(texts.message_of(in_catalogue("app.cat")), "catalogue: /tmp/a laesst sich nicht oeffnen (13)");
}

TEST(ErrorMessage, IsTheDefaultOneWithoutACatalogue)
{
    const catalogue texts("never asked for");
    EXPECT_EQ(texts.message_of(in_catalogue("other.cat")), "default: Cannot open \"/tmp/a\": error 13.");
    EXPECT_EQ(texts.message_of({}), "default: Cannot open \"/tmp/a\": error 13.");
}

TEST(ErrorMessage, IsTheDefaultOneWhereTheCatalogueHasNone)
{
    const catalogue texts("another number");
    auto error = in_catalogue("app.cat");
    error.number = 8;
    EXPECT_EQ(texts.message_of(error), "default: Cannot open \"/tmp/a\": error 13.");
}

TEST(ErrorMessage, IsTheDefaultOneWhereTheCatalogueWantsOtherArguments)
{
    for (const char *text : {"%s failed", "%1$d %2$d", "%1$d %3$s", "%n", "100%"})
        EXPECT_EQ(catalogue(text).message_of(in_catalogue("app.cat")), "default: Cannot open \"/tmp/a\": error 13.")
            << text;
}

TEST(ErrorMessage, NeverComesFromAFileThatTheTraceNamesByItsPath)
{
    const catalogue texts("planted");
    EXPECT_EQ(texts.message_of(in_catalogue(texts.path("app.cat"))), "default: Cannot open \"/tmp/a\": error 13.");
    EXPECT_EQ(texts.message_of(in_catalogue("./app.cat")), "default: Cannot open \"/tmp/a\": error 13.");
}

TEST(ErrorMessage, TellsTheIdsWhenThereIsNoText)
{
    const catalogue texts("another number");
    auto error = in_catalogue("app.cat");
    error.number = 8;
    error.default_message.reset();
    EXPECT_EQ(texts.message_of(error), "ids: error 18, message 8 in set 1 of app.cat");
    error.catalogue.reset();
    EXPECT_EQ(texts.message_of(error), "ids: error 18, message 8 in set 1");
}

TEST(ErrorMessage, SurvivesNumbersThatNoCatalogueHas)
{
    const catalogue texts("text");
    auto error = in_catalogue("app.cat");
    for (const std::uint32_t number : {0U, 0x7FFFFFFFU, 0x80000000U, 0xFFFFFFFFU}) {
        error.set = number;
        error.number = number;
        EXPECT_EQ(texts.message_of(error), "default: Cannot open \"/tmp/a\": error 13.");
    }
}

} // namespace
} // namespace qn::test
