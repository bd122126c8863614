#include "tools/qntrace/traces/trace_set.h"

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <filesystem>
#include <map>
#include <regex>
#include <stdexcept>
#include <string_view>
#include <utility>

#include <CLI/CLI.hpp>
#include <fmt/format.h>

#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"
#include "tools/qntrace/spool/tree.h"
#include "tools/qntrace/traces/trace_lives.h"

namespace qn::dump
{
namespace
{

namespace fs = std::filesystem;

struct page_name {
    std::string trace;
    std::uint32_t page = 0;
};

// The name of a page file taken apart; nothing for any other name.
std::optional<page_name> parse_page_name(std::string_view name)
{
    constexpr std::string_view suffix = ".sp";
    if (!name.ends_with(suffix)) return std::nullopt;
    name.remove_suffix(suffix.size());
    const auto dot = name.rfind('.');
    if (dot == std::string_view::npos || dot == 0) return std::nullopt;
    page_name parts{std::string(name.substr(0, dot)), 0};
    const std::string_view digits = name.substr(dot + 1);
    const auto [end, error] = std::from_chars(digits.data(), digits.data() + digits.size(), parts.page);
    if (error != std::errc() || end != digits.data() + digits.size() || parts.page == 0) return std::nullopt;
    return parts;
}

// The page file's name within a copy's: without the time, which are the last two of its parts.
std::string_view source_name_of_copy(std::string_view name)
{
    name.remove_suffix(name.size() - name.rfind('.'));
    name.remove_suffix(name.size() - name.rfind('.'));
    return name;
}

// Trace, page and copy from a file's name.
trace_source named_source(const std::string &path)
{
    trace_source source;
    source.path = path;
    std::string name = fs::path(path).filename();
    source.copy = parse_copy_name(name).has_value();
    if (source.copy) name = source_name_of_copy(name);
    if (auto page = parse_page_name(name)) {
        source.trace = std::move(page->trace);
        source.page = page->page;
    } else {
        source.trace = std::move(name);
    }
    return source;
}

// Host, node and program from the folders of a copy, when they are those of a spool directory. What is above the host
// is a cluster or nothing, which cannot be seen from below.
void take_folders(trace_source &source)
{
    std::error_code error;
    const fs::path program = fs::absolute(source.path, error).lexically_normal().parent_path();
    const fs::path node = program.parent_path();
    const std::string node_id = node.filename();
    if (!is_node_folder(node_id)) return;
    source.program = program.filename();
    source.host = node.parent_path().filename();
    // The digits are all 0 where the library does not know the node either.
    if (node_id.find_first_not_of('0') != std::string::npos) source.node_id = node_id;
}

// The cluster, where the folder that was named is a spool directory.
void take_cluster(trace_source &source, const std::vector<std::string> &folders)
{
    if (begin_with_cluster(folders)) source.cluster = folders.front();
}

class collector
{
public:
    collector(duplicates choice, passed_over others) : choice_(choice), others_(others) {}

    void add(const std::string &argument)
    {
        std::error_code error;
        if (fs::is_directory(argument, error))
            add_folder(argument);
        else
            add_trace(argument);
    }

    trace_set take() { return std::move(set_); }

private:
    // Below a folder: the copies; in it: what is a trace file.
    void add_folder(const std::string &folder)
    {
        std::vector<trace_source> found;
        const auto visit = [&](const spooled_copy &copy) {
            trace_source source = named_source(copy.path);
            take_folders(source);
            take_cluster(source, copy.folders);
            found.push_back(std::move(source));
        };
        const auto report = [&](const std::string &path, const std::string &why) { tell(path, why); };
        spool_tree(visit, report).walk(folder);
        std::uint64_t others = 0;
        std::error_code error;
        for (fs::directory_iterator entry(folder, error), end; !error && entry != end; entry.increment(error)) {
            std::error_code gone;
            if (!entry->is_regular_file(gone)) continue;
            trace_source source = named_source(entry->path());
            if (source.copy) continue;
            try {
                const bool is_page = choice_ == duplicates::kept && source.page != 0;
                if (is_page || is_meant_as_trace_file(source.path))
                    found.push_back(std::move(source));
                else
                    ++others;
            } catch (const reader::io_error &failure) {
                tell(source.path, failure.what());
            }
        }
        std::sort(found.begin(), found.end(),
                  [](const auto &left, const auto &right) { return left.path < right.path; });
        for (trace_source &source : found) examine(std::move(source));
        if (others != 0 && others_ == passed_over::told)
            write_message(fmt::format("{}: {} passed over", printable_name(folder),
                                      others == 1 ? "1 other file was" : fmt::format("{} other files were", others)));
    }

    void add_trace(const std::string &path)
    {
        trace_source source = named_source(path);
        // Copies and pages, of which thousands may be named, are no names of traces.
        const bool may_have_pages = !source.copy && source.page == 0;
        const auto pages = may_have_pages ? pages_of(path) : std::map<std::uint32_t, std::string>();
        if (source.copy) take_folders(source);
        std::error_code error;
        if (pages.empty() || fs::exists(fs::symlink_status(path, error))) examine(std::move(source));
        for (const auto &[number, page] : pages) examine(named_source(page));
    }

    // Opens a file for a first look.
    void examine(trace_source source)
    {
        try {
            look_at(source);
        } catch (const reader::io_error &error) {
            tell(source.path, error.what());
            return;
        }
        set_.sources.push_back(std::move(source));
    }

    void tell(const std::string &path, const std::string &why)
    {
        write_message(fmt::format("{}: {}", printable_name(path), why));
        set_.status = status_io_error;
    }

    duplicates choice_;
    passed_over others_;
    trace_set set_;
};

// A live file's header has no host and no cluster; a copy from the same node tells them.
void share_hosts(std::vector<trace_source> &sources)
{
    std::map<std::string, const trace_source *> named;
    for (const trace_source &source : sources)
        if (!source.host.empty() && !source.node_id.empty()) named.emplace(source.node_id, &source);
    for (trace_source &source : sources) {
        const auto known = named.find(source.node_id);
        if (!source.host.empty() || known == named.end()) continue;
        source.cluster = known->second->cluster;
        source.host = known->second->host;
    }
}

} // namespace

std::string trace_source::node() const
{
    if (!host.empty()) return host;
    if (!node_id.empty()) return node_id;
    return fmt::format("node{}", node_number);
}

std::map<std::uint32_t, std::string> pages_of(const std::string &path)
{
    std::map<std::uint32_t, std::string> pages;
    const fs::path base(path);
    std::error_code error;
    const fs::path folder = base.has_parent_path() ? base.parent_path() : fs::path(".");
    for (fs::directory_iterator entry(folder, error), end; !error && entry != end; entry.increment(error)) {
        const auto name = parse_page_name(entry->path().filename().string());
        if (name && name->trace == base.filename())
            pages.emplace(name->page, (base.parent_path() / entry->path().filename()).string());
    }
    return pages;
}

trace_set find_traces(const std::vector<std::string> &arguments, duplicates choice, passed_over others)
{
    collector collect(choice, others);
    for (const auto &argument : arguments) collect.add(argument);
    trace_set set = collect.take();
    if (choice == duplicates::dropped) drop_duplicates(set.sources);
    share_hosts(set.sources);
    return set;
}

void add_traces_option(CLI::App &command, std::vector<std::string> &arguments)
{
    command
        .add_option("FILE", arguments,
                    "Trace files, pages and copies; traces by name, for all of their pages; folders, for all\n"
                    "copies below them and the trace files in them")
        ->required();
}

void check_output(const std::string &output, const trace_set &traces)
{
    for (const trace_source &source : traces.sources) {
        std::error_code error;
        if (fs::equivalent(output, source.path, error))
            throw std::invalid_argument(fmt::format("{} is one of the traces", printable_name(output)));
    }
}

} // namespace qn::dump
