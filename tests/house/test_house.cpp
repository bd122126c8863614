// The rules of the house that a machine can keep: which folder may include which, how long files are, what is left
// behind in them.
#include <algorithm>
#include <filesystem>
#include <fstream>
#include <map>
#include <regex>
#include <set>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace
{
namespace fs = std::filesystem;

const fs::path source = QN_SOURCE_FOLDER;

std::vector<std::string> lines_of(const fs::path &file)
{
    std::ifstream in(file);
    EXPECT_TRUE(in.good()) << file;
    std::vector<std::string> lines;
    for (std::string line; std::getline(in, line);) lines.push_back(line);
    return lines;
}

std::vector<fs::path> code_below(const std::vector<std::string> &folders)
{
    std::vector<fs::path> files;
    for (const std::string &folder : folders)
        for (const auto &entry : fs::recursive_directory_iterator(source / folder)) {
            const std::string type = entry.path().extension();
            if (entry.is_regular_file() && (type == ".cpp" || type == ".h" || type == ".c"))
                files.push_back(entry.path());
        }
    return files;
}

// The table "| `folder` | `folder`, `folder` |" of docs/architecture.md: from whom to whom an include may go.
std::map<std::string, std::set<std::string>> allowed_arrows()
{
    std::map<std::string, std::set<std::string>> arrows;
    const std::regex row(R"(^\| `(\w+)` \| (.*) \|.*$)");
    const std::regex name(R"(`(\w+)`)");
    for (const std::string &line : lines_of(source / "docs/architecture.md")) {
        std::smatch match;
        if (!std::regex_match(line, match, row)) continue;
        const std::string targets = match[2].str().substr(0, match[2].str().find(" | "));
        for (std::sregex_iterator it(targets.begin(), targets.end(), name), end; it != end; ++it)
            arrows[match[1]].insert((*it)[1]);
    }
    return arrows;
}

TEST(House, SubsystemsIncludeOnlyWhomTheArchitectureAllows)
{
    const auto arrows = allowed_arrows();
    ASSERT_GE(arrows.size(), 5U) << "the table of arrows was not found";
    const std::regex include(R"re(^#include "trace/(\w+)/.*")re");
    for (const fs::path &file : code_below({"trace"})) {
        const std::string folder = file.parent_path().filename();
        if (folder == "trace") continue; // the roof includes everything
        for (const std::string &line : lines_of(file)) {
            std::smatch match;
            if (!std::regex_search(line, match, include) || match[1] == folder) continue;
            const auto allowed = arrows.find(folder);
            EXPECT_TRUE(allowed != arrows.end() && allowed->second.count(match[1]) == 1)
                << file << " includes " << match[1];
        }
    }
}

TEST(House, ThePlatformLibrariesKnowNothingOfTheTracingLibrary)
{
    for (const fs::path &file : code_below({"platform"}))
        for (const std::string &line : lines_of(file)) {
            EXPECT_EQ(line.find("#include \"trace/"), std::string::npos) << file;
            EXPECT_EQ(line.find("#include <qn_tr.h>"), std::string::npos) << file;
        }
}

// Reading traces takes nothing but the layout from the recorder; showing the configuration takes its reader and its rules.
TEST(House, TheReaderSharesOnlyTheLayoutAndTheConfigurationWithTheRecorder)
{
    const std::set<std::string> shared = {"files/format.h", "files/compiled_pattern.h", "spooling/spool_shape.h",
                                          "traceutils/traceutils.h"};
    const std::regex include(R"re(^#include "trace/([^"]*)")re");
    for (const fs::path &file : code_below({"tools"}))
        for (const std::string &line : lines_of(file)) {
            std::smatch match;
            if (std::regex_search(line, match, include)) {
                EXPECT_EQ(shared.count(match[1]), 1U) << file << " includes " << match[1];
            }
        }
}

TEST(House, NoFileOfTheLibraryOutgrowsItsRoom)
{
    constexpr size_t most_lines = 400;
    for (const fs::path &file : code_below({"trace", "platform", "tools"}))
        EXPECT_LE(lines_of(file).size(), most_lines) << file;
}

// By a function that never gives a file the number of a standard stream; only a thread that has a table of
// descriptors of its own may do without.
TEST(House, EveryFileIsOpenedInOnePlaceSoThatAnExecutedProgramDoesNotGetIt)
{
    const std::regex opening(R"(\b(?:open|openat|openat2|creat|fopen|freopen|mkstemp|mkostemp|pipe|dup|socket)\()");
    const std::regex closed_on_exec(R"(O_CLOEXEC|fopen\([^"]*"[a-z]*e[a-z]*")");
    size_t openings = 0;
    for (const fs::path &file : code_below({"trace", "platform"}))
        for (const std::string &line : lines_of(file)) {
            if (line.find("//") != std::string::npos || !std::regex_search(line, opening)) continue;
            ++openings;
            EXPECT_TRUE(std::regex_search(line, closed_on_exec)) << file << ": " << line;
            const std::string name = file.filename();
            EXPECT_TRUE(name == "descriptors.h" || name == "spool_thread.cpp") << file << ": " << line;
        }
    EXPECT_GE(openings, 3U);
}

// What a file or a caller holds is checked and told, and never the end of the program.
TEST(House, NothingIsAsserted)
{
    const std::regex asserting(R"(\bassert *\(|<cassert>|<assert\.h>)");
    for (const fs::path &file : code_below({"trace", "platform", "tools", "include"}))
        for (const std::string &line : lines_of(file)) EXPECT_FALSE(std::regex_search(line, asserting)) << file << line;
}

// A name that somebody chose is never a format: the compiler looks at every call.
TEST(House, FormatsAreCheckedByTheCompiler)
{
    std::string flags;
    for (const std::string &line : lines_of(source / "cmake/flags.cmake")) flags += line + "\n";
    for (const char *flag : {"-Wformat=2", "-Werror=format-security", "-fstack-protector-strong", "_FORTIFY_SOURCE=3"})
        EXPECT_NE(flags.find(flag), std::string::npos) << flag;
}

TEST(House, NothingIsMarkedAsUnfinished)
{
    const std::regex marker("\\b(TO"
                            "DO|FIX"
                            "ME|X"
                            "XX)\\b");
    for (const fs::path &file : code_below({"trace", "platform", "tools", "include", "tests", "bench", "examples"}))
        for (const std::string &line : lines_of(file))
            EXPECT_FALSE(std::regex_search(line, marker)) << file << ": " << line;
}

TEST(House, EveryFolderOfTheMapInTheReadmeExists)
{
    const std::regex row(R"(^\| `([a-z/]+)/` \|.*$)");
    size_t folders = 0;
    for (const std::string &line : lines_of(source / "README.md")) {
        std::smatch match;
        if (!std::regex_match(line, match, row)) continue;
        ++folders;
        EXPECT_TRUE(fs::is_directory(source / match[1].str())) << match[1];
    }
    EXPECT_GE(folders, 8U);
}

TEST(House, NoFunctionOnACancellationPathIsNoexcept)
{
    // A cancelled thread unwinds its stack; a noexcept function on the way would end the program instead.
    for (const fs::path &file : code_below({"trace"}))
        for (const std::string &line : lines_of(file)) {
            if (line.find("//") == 0) continue;
            EXPECT_EQ(line.find(" noexcept"), std::string::npos) << file << ": " << line;
            EXPECT_EQ(line.find("catch (...)"), std::string::npos) << file << ": " << line;
        }
}
} // namespace
