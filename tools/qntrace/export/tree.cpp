#include "tools/qntrace/export/tree.h"

#include <filesystem>

#include <fmt/format.h>

#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"

namespace qn::dump
{
namespace
{

constexpr std::size_t longest_name = 200; // leaves room for a suffix in the 255 of most file systems

bool is_harmless(char c)
{
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '-' || c == '_' ||
           c == '.' || c == '+' || c == '@';
}

std::string level(std::string_view name) { return name.empty() ? "unknown" : safe_name(name); }

} // namespace

std::string safe_name(std::string_view name)
{
    std::string safe;
    for (const char c : name) {
        // A name that begins with one of these is passed over by many who read whole folders.
        const bool hides = safe.empty() && (c == '.' || c == '_');
        const std::string next =
            is_harmless(c) && !hides ? std::string(1, c) : fmt::format("%{:02X}", static_cast<unsigned char>(c));
        if (safe.size() + next.size() > longest_name) break;
        safe += next;
    }
    return safe.empty() ? "unnamed" : safe;
}

std::string folder_of(const trace_source &source)
{
    const bool host_known = !source.host.empty();
    const std::string node = source.node_id.empty() && !host_known ? source.node() : source.node_id;
    return level(source.cluster) + "/" + level(source.host) + "/" + level(node) + "/" + level(source.program);
}

std::string export_tree::add(const std::string &folder, std::string_view name, std::string_view suffix)
{
    std::error_code error;
    std::filesystem::create_directories(whole(folder), error);
    if (error)
        throw output_error(fmt::format("{}: cannot be made: {}", printable_name(whole(folder)), error.message()));
    const std::string base = folder + "/" + safe_name(name);
    std::string path = base + std::string(suffix);
    if (given_.insert(path).second) return path;
    unsigned &number = numbers_.emplace(path, 1).first->second;
    do {
        path = fmt::format("{}-{}{}", base, ++number, suffix);
    } while (!given_.insert(path).second);
    return path;
}

} // namespace qn::dump
