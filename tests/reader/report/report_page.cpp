#include "reader/report/report_page.h"

#include <filesystem>

#include <gtest/gtest.h>

namespace qn::test
{

std::string report_page::between(const std::string &begin, const std::string &end) const
{
    const auto from = html.find(begin);
    const auto to = html.find(end, from == std::string::npos ? 0 : from + begin.size());
    if (from == std::string::npos || to == std::string::npos) {
        ADD_FAILURE() << "no " << begin << " ... " << end;
        return {};
    }
    return html.substr(from + begin.size(), to - from - begin.size());
}

std::string report_page::data_text() const
{
    return between(R"(<script type="application/json" id="data">)", "</script>");
}

report_page make_page(std::vector<std::string> arguments)
{
    const scratch_folder folder;
    const auto path = folder.path("page.html");
    arguments.insert(arguments.begin(), {"report", "--utc", "-o", path});
    report_page page;
    page.made = run_qntrace(arguments);
    if (std::filesystem::exists(path)) page.html = contents_of(path);
    return page;
}

report_page page_of(const trace_builder &file, std::vector<std::string> arguments)
{
    const scratch_folder folder;
    arguments.push_back(folder.file("a.trc", file.bytes()));
    return make_page(arguments);
}

} // namespace qn::test
