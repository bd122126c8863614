#include "reader/manual/manual_samples.h"

#include <cstdlib>
#include <filesystem>

#include "reader/trace_builder.h"

namespace qn::test
{
namespace
{

constexpr std::size_t torn_at = 2104; // where the header of a record is
constexpr std::size_t torn_bytes = 28;
constexpr std::uint32_t first_id = 100;

// A page that the program "indexer" of a node has filled with four records, a millisecond apart.
trace_builder page_of(std::uint64_t node, std::uint64_t first_ms)
{
    trace_builder page;
    page.put_text(52, "/usr/bin/indexer");
    page.put_text(132, "indexer");
    page.put_u64(180, node);
    page.put_u8(192, 8);
    page.component = "IDX";
    for (std::uint64_t i = 0; i < 4; ++i) {
        page.counter = (first_ms + i) * 1'000'000;
        page.add_id(first_id + static_cast<std::uint32_t>(i));
    }
    page.close();
    return page;
}

std::string path_with_qntrace()
{
    const char *path = std::getenv("PATH");
    return std::filesystem::path(QNTRACE_PROGRAM).parent_path().string() + ":" + (path == nullptr ? "/bin" : path);
}

} // namespace

manual_samples::manual_samples()
{
    namespace fs = std::filesystem;
    trace_builder torn;
    const auto app = contents_of(GOLDEN_FOLDER "/golden.trc");
    fs::copy_file(GOLDEN_FOLDER "/golden.trc", folder_.path("app.trc"));
    fs::copy_file(SAMPLE_CONFIGURATION, folder_.path("trace.conf"));
    auto bytes = std::as_bytes(std::span(app));
    std::vector<std::byte> damaged(bytes.begin(), bytes.end());
    std::fill_n(damaged.begin() + torn_at, torn_bytes, std::byte{0xFF});
    folder_.file("torn.trc", damaged);
    for (const std::uint64_t node : {1, 2}) {
        const auto below =
            "spool/prod/0001/host" + std::to_string(node) + "/00000000000000a" + std::to_string(node) + "/indexer";
        fs::create_directories(folder_.path(below));
        folder_.file(below + "/app.trc.1.sp.2026_11_21_05_12_0" + std::to_string(node) + ".000001",
                     page_of(0xA0 + node, 1000 + 2 * node).bytes());
    }
}

outcome manual_samples::run(const std::string &command) const
{
    surroundings around;
    around.environment.push_back("PATH=" + path_with_qntrace());
    around.environment.push_back("HOME=" + folder_.path(""));
    return run_program("/bin/sh", {"-c", "cd \"$0\" && { " + command + "\n} 2>&1", folder_.path("")}, around);
}

} // namespace qn::test
