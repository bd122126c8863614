// The worked example of docs/format.md: its bytes are read by the real command, whose output is the one it shows.
#include <gtest/gtest.h>

#include <sstream>

#include "reader/program.h"

namespace qn::test
{
namespace
{

// The lines of the fenced block behind the marker <!-- example: NAME -->.
std::string example(const std::string &name)
{
    const auto document = contents_of(FORMAT_DOCUMENT);
    const auto marker = document.find("<!-- example: " + name + " -->\n```\n");
    if (marker == std::string::npos) throw std::runtime_error("docs/format.md has no example " + name);
    const auto begin = document.find("```\n", marker) + 4;
    return document.substr(begin, document.find("```\n", begin) - begin);
}

// "OFFSET  BYTES  EXPLANATION": the bytes, two blanks end them.
std::vector<std::byte> example_bytes()
{
    std::vector<std::byte> bytes;
    std::istringstream lines(example("bytes"));
    for (std::string line; std::getline(lines, line);) {
        if (line.size() < 6 || line[3] == ' ') continue; // a heading
        EXPECT_EQ(std::stoul(line.substr(0, 4)), bytes.size()) << line;
        std::istringstream tokens(line.substr(6, line.find("  ", 6) - 6));
        for (std::string token; tokens >> token;) {
            const std::size_t count = token.size() > 2 ? std::stoul(token.substr(3)) : 1;
            bytes.insert(bytes.end(), count, static_cast<std::byte>(std::stoul(token.substr(0, 2), nullptr, 16)));
        }
    }
    return bytes;
}

TEST(FormatDocument, TheExamplesBytesAreReadAsTheDocumentShows)
{
    auto bytes = example_bytes();
    ASSERT_EQ(bytes.size(), 408u); // the header and five record headers with their bodies: none is left out
    bytes.resize(4096);
    const scratch_folder folder;
    const auto path = folder.file("example.trc", bytes);
    const auto shown = [&](std::vector<std::string> arguments) {
        arguments.push_back(path);
        auto run = run_qntrace(arguments);
        EXPECT_EQ(run.status, 0) << run.err;
        const auto at = run.out.find(path);
        return at == std::string::npos ? run.out : run.out.replace(at, path.size(), "example.trc");
    };
    EXPECT_EQ(shown({"dump", "--utc"}), example("text"));
    EXPECT_EQ(shown({"dump", "--utc", "--json"}), example("json"));
}

} // namespace
} // namespace qn::test
