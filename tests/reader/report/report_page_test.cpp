// qntrace report: the page as a file, and that nothing in a trace becomes a part of it.
#include <filesystem>
#include <fstream>

#include <gtest/gtest.h>

#include "reader/errors/error_records.h"
#include "reader/every_kind.h"
#include "reader/report/report_page.h"
#include "reader/spool_directory.h"

namespace qn::test
{
namespace
{

using strings = std::vector<std::string>;

// As other programs compute it.
std::string hash_of(const std::string &text)
{
    const scratch_folder folder;
    const auto path = folder.path("text");
    std::ofstream(path, std::ios::binary) << text;
    const auto done = run_program(
        "/bin/sh", {"-c", "sha256sum <\"$0\" | cut -c1-64 | tr a-f A-F | basenc --base16 -d | base64", path},
        {.environment = {"PATH=/usr/bin:/bin"}});
    EXPECT_EQ(done.status, 0) << done.err;
    return "sha256-" + done.out.substr(0, done.out.find('\n'));
}

TEST(ReportPage, LetsTheBrowserRunNothingButItsOwnScriptAndStyle)
{
    const auto page = page_of(two_records());
    EXPECT_EQ(page.between(R"(<meta http-equiv="Content-Security-Policy" content=")", "\""),
              "default-src 'none'; script-src '" + hash_of(page.between("<script>", "</script>")) + "'; style-src '" +
                  hash_of(page.between("<style>", "</style>")) +
                  "'; img-src data:; base-uri 'none'; form-action 'none'");
}

TEST(ReportPage, NamesNothingToLoad)
{
    const auto page = page_of(two_records());
    for (const char *reference : {" src=", "url(", "@import", "href=\"http", "<iframe", "<object", "<embed"})
        EXPECT_EQ(page.html.find(reference), std::string::npos) << reference;
}

TEST(ReportPage, TellsWhoseTheChartLibraryIs)
{
    EXPECT_NE(page_of(two_records()).html.find("Permission is hereby granted"), std::string::npos);
}

TEST(ReportPage, HasNoMarkupWithinItsData)
{
    trace_builder file;
    file.component = "<!--";
    file.add_strings(1, {"</script><script>alert(1)</script>", "<!--<script>"});
    error_record error;
    error.default_message = error.name = "</ScRiPt><img src=x onerror=alert(1)>";
    error.file = error.function = error.ffdc_id = error.catalogue = "</script>";
    add_error(file, error);
    file.put_text(132, "</script>");
    file.close();
    const auto page = page_of(file, {"--grep", "script|Script|ScRiPt"});
    EXPECT_EQ(page.data_text().find('<'), std::string::npos);
    const auto data = page.data();
    EXPECT_EQ(data.at("rows").at(0).at("text").at(0), R"(id=1 "</script><script>alert(1)</script>" "<!--<script>")");
    EXPECT_EQ(data.at("components").at(0).at("name"), "<!--");
    EXPECT_EQ(data.at("processes").at(0).at("program"), "</script>");
    EXPECT_EQ(data.at("errors").at("rows").at(0).at("latest").at("message"), "</ScRiPt><img src=x onerror=alert(1)>");
}

TEST(ReportPage, HasItsTitleAsText)
{
    const auto page = page_of(two_records(), {"--title", "</title><script>alert(1)</script> & more"});
    EXPECT_EQ(page.between("<title>", "</title>"), "&lt;/title>&lt;script>alert(1)&lt;/script> &amp; more");
    EXPECT_EQ(page.data().at("title"), "</title><script>alert(1)</script> & more");
}

TEST(ReportPage, HoldsNoControlCharacters)
{
    const auto page = page_of(every_kind());
    for (const char c : page.data_text()) EXPECT_TRUE(c == '\n' || static_cast<unsigned char>(c) >= 0x20);
    const auto data = page.data();
    std::string all;
    for (const auto &row : data.at("rows"))
        for (const auto &text : row.at("text")) all += text.get<std::string>();
    EXPECT_NE(all.find(R"(\x1b[31mred\x07)"), std::string::npos);
    EXPECT_NE(all.find("caf\xc3\xa9"), std::string::npos);
}

TEST(ReportPage, IsAlwaysTheSame)
{
    EXPECT_EQ(page_of(every_kind()).html.size(), page_of(every_kind()).html.size());
    const scratch_folder folder;
    const auto path = folder.file("a.trc", every_kind().bytes());
    EXPECT_EQ(make_page({path}).html, make_page({path}).html);
}

TEST(ReportPage, TellsOfDamageAndIsMadeAllTheSame)
{
    const auto page = page_of(every_kind());
    EXPECT_EQ(page.made.status, 1);
    EXPECT_NE(page.data().at("notes").at(0).get<std::string>().find("damaged"), std::string::npos);
}

TEST(ReportPage, IsMadeOfASoundTraceInSilence)
{
    const auto page = page_of(two_records());
    EXPECT_EQ(page.made.status, 0);
    EXPECT_EQ(page.made.out, "");
    EXPECT_EQ(page.made.err, "");
    EXPECT_TRUE(page.data().at("notes").empty());
}

TEST(ReportPage, DoesNotTakeThePlaceOfATrace)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", two_records().bytes());
    const auto before = contents_of(path);
    std::filesystem::create_symlink(path, folder.path("link.html"));
    EXPECT_EQ(run_qntrace({"report", "-o", path, path}).status, 2);
    EXPECT_EQ(run_qntrace({"report", "-o", folder.path("link.html"), path}).status, 2);
    EXPECT_EQ(contents_of(path), before);
}

strings names_in(const std::string &folder)
{
    strings names;
    for (const auto &entry : std::filesystem::directory_iterator(folder)) names.push_back(entry.path().filename());
    std::sort(names.begin(), names.end());
    return names;
}

TEST(ReportPage, TakesThePlaceOfAnEarlierOneAndLeavesNothingBeside)
{
    const scratch_folder folder;
    const auto trace = folder.file("a.trc", two_records().bytes());
    const auto page = folder.path("page.html");
    std::ofstream(page) << "earlier";
    EXPECT_EQ(run_qntrace({"report", "-o", page, trace}).status, 0);
    EXPECT_TRUE(contents_of(page).starts_with("<!DOCTYPE html>"));
    EXPECT_EQ(names_in(folder.path("")), (strings{"a.trc", "page.html"}));
}

TEST(ReportPage, LeavesAnEarlierOneWhenTheRequestIsWrong)
{
    const scratch_folder folder;
    const auto page = folder.path("page.html");
    std::ofstream(page) << "earlier";
    EXPECT_EQ(
        run_qntrace({"report", "-o", page, "--offset", "none=1s", folder.file("a.trc", two_records().bytes())}).status,
        2);
    EXPECT_EQ(run_qntrace({"report", "-o", page, folder.path("none.trc")}).status, 3);
    EXPECT_EQ(contents_of(page), "earlier");
    EXPECT_EQ(names_in(folder.path("")), (strings{"a.trc", "page.html"}));
}

TEST(ReportPage, TellsWhenItCannotBeWritten)
{
    const scratch_folder folder;
    const auto trace = folder.file("a.trc", two_records().bytes());
    for (const auto &output : {folder.path("none/page.html"), std::string("/dev/full")}) {
        const auto made = run_qntrace({"report", "-o", output, trace});
        EXPECT_EQ(made.status, 3) << output;
        EXPECT_NE(made.err.find(output + ": cannot be "), std::string::npos) << made.err;
    }
    EXPECT_EQ(names_in(folder.path("")), (strings{"a.trc"}));
}

TEST(ReportPage, GoesToWhereALinkLeads)
{
    const scratch_folder folder;
    const auto trace = folder.file("a.trc", two_records().bytes());
    std::filesystem::create_symlink("/proc/self/fd/1", folder.path("link"));
    const auto made = run_qntrace({"report", "-o", folder.path("link"), trace});
    EXPECT_EQ(made.status, 0);
    EXPECT_TRUE(made.out.starts_with("<!DOCTYPE html>"));
    EXPECT_TRUE(made.out.ends_with("</html>\n"));
    EXPECT_TRUE(std::filesystem::is_symlink(folder.path("link")));
}

TEST(ReportPage, NeedsAName) { EXPECT_EQ(run_qntrace({"report", "a.trc"}).status, 2); }

} // namespace
} // namespace qn::test
