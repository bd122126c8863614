// Spool directories: <destination>/<cluster name>/<cluster id>/<host>/<node id>/<program>, made level by level.
// Global mutex, held by the caller.
#include <array>
#include <cerrno>
#include <cinttypes>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <sys/stat.h>
#include <unistd.h>

#include "trace/files/cluster.h"
#include "trace/files/debug.h"
#include "trace/files/locks.h"
#include "trace/spooling/spool_list.h"

namespace
{
using namespace qn::tr;

constexpr mode_t directory_mode = 0700;
constexpr size_t path_bytes = sizeof(trace_spool_spec_t::dest);

// A path that grows by a level at a time, each made as it is added.
class growing_directory
{
public:
    explicit growing_directory(const char *path) : length_(strnlen(path, path_bytes - 1))
    {
        std::memcpy(path_.data(), path, length_);
        path_[length_] = '\0';
    }
    const char *path() const { return path_.data(); }
    bool ends_in_slash() const { return length_ > 0 && path_[length_ - 1] == '/'; }

    // Adds text as it stands; false, and nothing is added, when it does not fit.
    bool add(const char *text)
    {
        const size_t added = std::strlen(text);
        if (length_ + added >= path_bytes) return false;
        std::memcpy(path_.data() + length_, text, added + 1);
        length_ += added;
        return true;
    }
    // Makes the directory below under that name.
    bool enter(const char *name)
    {
        if (length_ + 1 + std::strlen(name) >= path_bytes) return false;
        return add("/") && add(name) && make();
    }
    bool make() const { return subdir(path()) == 0; }

private:
    std::array<char, path_bytes> path_;
    size_t length_;
};

// The two levels below the destination: which cluster, or in interworking mode what the link "/var/qn/IW" leads to.
struct cluster_levels {
    char first[sizeof(cu_cluster_info_t::cu_cluster_name)] = "";
    char second[sizeof(cu_cluster_info_t::cu_cluster_ID) + 1] = "";
};

const char *last_component(const char *path)
{
    const char *slash = std::strrchr(path, '/');
    return slash != nullptr ? slash + 1 : path;
}

cluster_levels levels_for(const char *trc_file)
{
    constexpr const char *interworking_link = "/var/qn/IW";
    constexpr size_t most_link_bytes = 64;
    cluster_levels levels;
    const cluster_facts cluster = known_cluster_or_none();
    if (std::strstr(trc_file, interworking_link) == nullptr) {
        std::snprintf(levels.first, sizeof levels.first, "%s", cluster.info.cu_cluster_name);
        std::snprintf(levels.second, sizeof levels.second, "%s", cluster.info.cu_cluster_ID);
        return levels;
    }
    char target[most_link_bytes + 1] = "";
    const ssize_t length = readlink(interworking_link, target, most_link_bytes);
    if (length >= 0) target[length] = '\0';
    std::snprintf(levels.first, sizeof levels.first, "IW");
    std::snprintf(levels.second, sizeof levels.second, "%s", length >= 0 ? last_component(target) : "unknown");
    return levels;
}

// The host's name up to its first dot; asked for once. Global mutex.
const char *host_name()
{
    static char host[4096] = "";
    if (host[0] != '\0') return host;
    if (gethostname(host, sizeof host) != 0) std::snprintf(host, sizeof host, "unknown");
    host[sizeof host - 1] = '\0';
    host[std::strcspn(host, ".")] = '\0';
    return host;
}

struct node_name {
    char text[17] = "";
    node_name()
    {
        qn_uint64_t node_id = 0;
        if (cu_get_node_id_1(&node_id) != 0) node_id = 0;
        std::snprintf(text, sizeof text, "%16.16" PRIx64, static_cast<uint64_t>(node_id));
    }
};

struct program_name {
    char arguments[4096];
    const char *base_name;
    program_name()
    {
        if (cu_get_proc_args_1(getpid(), arguments, sizeof arguments) != 0)
            std::snprintf(arguments, sizeof arguments, "/unknown");
        arguments[sizeof arguments - 1] = '\0';
        base_name = last_component(arguments);
        debug_error("mkspooldir: baseName: '%s' argsbuffer: %s\n", base_name, arguments);
    }
};

// Makes the levels below the destination; how far it came is in `directory`.
bool make_levels(growing_directory &directory, const char *trc_file)
{
    if (create_all_directories_in_path(directory.path()) != 0) return false;
    const cluster_levels levels = levels_for(trc_file);
    if (!directory.ends_in_slash() && !directory.add("/")) return false;
    return directory.add(levels.first) && directory.make() && directory.enter(levels.second) &&
           directory.enter(host_name()) && directory.enter(node_name().text) &&
           directory.enter(program_name().base_name);
}
} // namespace

char *mkspooldir(trace_spool_spec_t *spec, const char *trc_file)
{
    debug("entering mkspooldir: '%s'\n", spec->dest);
    if (std::strcmp(spec->dest, recycle_only) == 0) return spec->dest;

    growing_directory directory(spec->dest);
    const bool made = make_levels(directory, trc_file);
    set_destination(spec, directory.path());
    return made ? spec->dest : nullptr;
}

int subdir(const char *dir)
{
    debug("subdir checking: '%s'\n", dir);
    bool is_there = access(dir, F_OK) == 0;
    if (!is_there) {
        const int result = mkdir(dir, directory_mode);
        is_there = result != 0 && errno == EEXIST; // another process, which spools into the same tree, was faster
        // The text is empty exactly when there would be something to tell; whoever reads these lines knows them so.
        debug("subdir creating: '%s' (%d:%s)\n", dir, result, result == 0 ? std::strerror(errno) : "");
        if (result != 0 && !is_there) return result;
    }
    if (is_there) {
        struct stat status;
        if (access(dir, W_OK) != 0 || stat(dir, &status) != 0 || !S_ISDIR(status.st_mode)) {
            debug("subdir creating: '%s' (%d)\n", dir, 0);
            return -1;
        }
    }
    debug("subdir returning 0\n");
    return 0;
}

int create_all_directories_in_path(const char *p_path)
{
    char path[path_bytes];
    const size_t length = std::strlen(p_path);
    if (length >= sizeof path) return 1;
    std::memcpy(path, p_path, length + 1);

    for (char *slash = path[0] != '\0' ? std::strchr(path + 1, '/') : nullptr; slash != nullptr;
         slash = std::strchr(slash + 1, '/')) {
        *slash = '\0';
        const bool there = mkdir(path, directory_mode) == 0 || errno == EEXIST;
        *slash = '/';
        if (!there) return 1;
    }
    return mkdir(path, directory_mode) == 0 || errno == EEXIST ? 0 : 1;
}
