#include "reader/spool_directory.h"

#include <filesystem>
#include <sstream>

#include <gtest/gtest.h>

namespace qn::test
{

trace_builder two_records(std::uint64_t seconds, std::size_t size)
{
    trace_builder file(size);
    file.counter = seconds * trace_builder::ticks_per_second;
    file.add_id(1);
    file.add_id(2);
    file.close();
    return file;
}

spool_directory::spool_directory() : root(folder.path("spool")) { std::filesystem::create_directory(root); }

std::string spool_directory::put(const std::string &below, const std::string &name, const trace_builder &file) const
{
    std::filesystem::create_directories(root + "/" + below);
    return folder.file("spool/" + below + "/" + name, file.bytes());
}

std::string spool_directory::put(const std::string &name, const trace_builder &file) const
{
    return put(usual_folder, name, file);
}

std::vector<nlohmann::json> rows(const outcome &shown)
{
    std::vector<nlohmann::json> found;
    std::istringstream lines(shown.out);
    for (std::string line; std::getline(lines, line);) found.push_back(nlohmann::json::parse(line));
    return found;
}

std::vector<nlohmann::json> sound_rows(const std::vector<std::string> &directories)
{
    std::vector<std::string> arguments = {"spool", "--json", "--utc"};
    arguments.insert(arguments.end(), directories.begin(), directories.end());
    const auto shown = run_qntrace(arguments);
    EXPECT_EQ(shown.status, 0) << shown.err;
    return rows(shown);
}

} // namespace qn::test
