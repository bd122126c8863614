#include "tools/qntrace/spool/tree.h"

#include <cerrno>
#include <climits>
#include <cstring>
#include <memory>
#include <regex>

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "tools/qntrace/reader/source.h"

namespace qn::dump
{
namespace
{

struct close_folder {
    void operator()(DIR *folder) const { closedir(folder); }
};
using open_folder = std::unique_ptr<DIR, close_folder>;

// Opens a folder by a path of any length: the kernel takes one only in pieces shorter than PATH_MAX. Null with errno.
open_folder open_folder_at(std::string_view path)
{
    int at = AT_FDCWD;
    for (;;) {
        const bool last = path.size() < PATH_MAX;
        const auto cut = last ? path.size() : path.rfind('/', PATH_MAX - 2) + 1;
        // A single name longer than the longest path is none that could exist; the kernel says so.
        const std::string piece(path.substr(0, cut == 0 ? path.size() : cut));
        const int opened = openat(at, piece.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC | O_NONBLOCK);
        const int error = errno;
        if (at != AT_FDCWD) close(at);
        if (opened < 0) {
            errno = error;
            return nullptr;
        }
        path.remove_prefix(piece.size());
        while (path.starts_with('/')) path.remove_prefix(1);
        at = opened;
        if (path.empty()) break;
    }
    open_folder folder(fdopendir(at));
    if (!folder) close(at);
    return folder;
}

std::vector<std::string> names_in(std::string_view path)
{
    std::vector<std::string> names;
    while (!path.empty()) {
        const auto end = std::min(path.find('/'), path.size());
        if (end > 0) names.emplace_back(path.substr(0, end));
        path.remove_prefix(std::min(end + 1, path.size()));
    }
    return names;
}

std::string why(int error) { return reader::io_error(error, "cannot be read").what(); }

} // namespace

std::optional<copy_name> parse_copy_name(std::string_view name)
{
    // The microseconds are at least two characters wide, and not padded with zeros.
    static const std::regex copy(R"(([\s\S]+)\.\d{4}(?:_\d\d){5}\.(?: \d|\d{2,6}))");
    static const std::regex page(R"(([\s\S]+)\.\d+\.sp)");
    std::match_results<std::string_view::const_iterator> parts;
    if (!std::regex_match(name.begin(), name.end(), parts, copy)) return std::nullopt;
    const std::string source = parts[1];
    std::smatch page_parts;
    if (std::regex_match(source, page_parts, page)) return copy_name{page_parts[1], true};
    return copy_name{source, false};
}

bool is_node_folder(std::string_view name)
{
    return name.size() == 16 && name.find_first_not_of("0123456789abcdef") == std::string_view::npos;
}

bool begin_with_cluster(const std::vector<std::string> &folders)
{
    return folders.size() == 5 && is_node_folder(folders[3]); // cluster, cluster id, host, node id, program
}

void spool_tree::walk(const std::string &directory)
{
    pending_.push_back(directory);
    while (!pending_.empty()) {
        const std::string path = std::move(pending_.back());
        pending_.pop_back();
        enter(path, directory.size());
    }
}

// Visits the copies in one folder, and leaves its folders to be entered.
void spool_tree::enter(const std::string &path, std::size_t root_length)
{
    const open_folder folder = open_folder_at(path);
    struct stat status = {};
    if (!folder || fstat(dirfd(folder.get()), &status) != 0) {
        const bool removed_meanwhile = errno == ENOENT && path.size() > root_length;
        if (!removed_meanwhile) report_(path, why(errno));
        return;
    }
    if (!entered_.emplace(status.st_dev, status.st_ino).second) return;

    spooled_copy entry;
    entry.folders = names_in(std::string_view(path).substr(root_length));
    entry.folder = dirfd(folder.get());
    for (;;) {
        errno = 0;
        const dirent *found = readdir(folder.get());
        if (found == nullptr) break;
        entry.file = found->d_name;
        if (entry.file == "." || entry.file == "..") continue;
        entry.path = path;
        if (!entry.path.ends_with('/')) entry.path += '/';
        entry.path += entry.file;
        look_at(entry);
    }
    if (errno != 0) report_(path, why(errno));
}

void spool_tree::look_at(spooled_copy &entry)
{
    struct stat status = {};
    if (fstatat(entry.folder, entry.file.c_str(), &status, 0) != 0) {
        const int error = errno;
        const bool dangling =
            fstatat(entry.folder, entry.file.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0 && S_ISLNK(status.st_mode);
        if (!dangling && error != ENOENT) report_(entry.path, why(error));
        return;
    }
    if (S_ISDIR(status.st_mode)) {
        pending_.push_back(entry.path);
        return;
    }
    auto name = parse_copy_name(entry.file);
    if (!name || !S_ISREG(status.st_mode)) return;
    entry.name = std::move(*name);
    entry.bytes = static_cast<std::uint64_t>(status.st_size);
    visit_(entry);
}

} // namespace qn::dump
