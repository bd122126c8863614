// The copies below a spool directory, one at a time.
//
// The library makes a copy's path like this, with every name as the administrator, the cluster and the client chose it:
//
//   SPOOL-DIRECTORY / cluster / cluster id / host / node id / program / app.trc.3.sp.2024_05_01_13_45_07.123456
//
// On a node of no cluster the first two are missing. Trees of any depth are walked, with one folder open at a time
// and no memory for the copies themselves. Symbolic links to folders are followed, and no folder is entered twice, so
// that a link that leads back ends there.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include <sys/types.h>

namespace qn::dump
{

struct copy_name {
    std::string trace;    // the name of the trace, without the number of its page
    bool of_page = false; // false: the copy of a whole file
};

// Nothing for a name that the library gives no copy.
std::optional<copy_name> parse_copy_name(std::string_view name);

// Whether that is the name of a node's folder: 16 hexadecimal digits.
bool is_node_folder(std::string_view name);

// Whether the folders on the way to a copy begin with a cluster and its identifier: when these two, and no others, stand
// between the folder that was named and the host.
bool begin_with_cluster(const std::vector<std::string> &folders);

struct spooled_copy {
    copy_name name;
    std::vector<std::string> folders; // on the way from the spool directory to the copy
    std::uint64_t bytes = 0;
    std::string path; // whole; possibly too long to be opened
    int folder = -1;  // where `file` stands; open while the copy is visited
    std::string file;
};

class spool_tree
{
public:
    using visitor = std::function<void(const spooled_copy &)>;
    // Told what cannot be looked at, and why.
    using unreadable_sink = std::function<void(const std::string &path, const std::string &why)>;

    spool_tree(visitor visit, unreadable_sink report) : visit_(std::move(visit)), report_(std::move(report)) {}

    // Visits every copy below `directory`, unless its folder was entered before.
    void walk(const std::string &directory);

private:
    void enter(const std::string &path, std::size_t root_length);
    void look_at(spooled_copy &entry);

    visitor visit_;
    unreadable_sink report_;
    std::vector<std::string> pending_; // folders still to be entered
    std::set<std::pair<dev_t, ino_t>> entered_;
};

} // namespace qn::dump
