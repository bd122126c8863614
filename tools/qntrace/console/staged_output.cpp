#include "tools/qntrace/console/staged_output.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <stdexcept>
#include <utility>

#include <fcntl.h>
#include <fmt/format.h>
#include <sys/stat.h>
#include <unistd.h>

#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"
#include "tools/qntrace/console/output_file.h"

namespace qn::dump
{
namespace
{

namespace fs = std::filesystem;

// A name that nothing has, by a file or folder that has it now.
std::string claim(const std::string &path, bool folder)
{
    std::string name = path + ".partial-XXXXXX";
    if (folder) return mkdtemp(name.data()) == nullptr ? std::string() : name;
    const int descriptor = mkostemp(name.data(), O_CLOEXEC);
    if (descriptor < 0) return {};
    close(descriptor);
    return name;
}

// As if it had been made without a temporary name.
void give_usual_rights(const std::string &path, bool folder)
{
    const mode_t mask = umask(0);
    umask(mask);
    chmod(path.c_str(), (folder ? 0777 : 0666) & ~mask);
}

} // namespace

staged_output::staged_output(std::string path, output_kind kind, bool replace) : path_(std::move(path)), kind_(kind)
{
    while (path_.size() > 1 && path_.ends_with('/')) path_.pop_back();
    if (path_.empty()) throw std::invalid_argument("the name of the output is empty");
    look_at_what_is_there(replace);
    if (direct_)
        work_path_ = path_;
    else
        make();
}

staged_output::~staged_output()
{
    if (published_ || direct_ || work_path_.empty()) return;
    std::error_code error;
    fs::remove_all(work_path_, error);
}

void staged_output::look_at_what_is_there(bool replace)
{
    struct stat status = {};
    if (lstat(path_.c_str(), &status) != 0) {
        if (errno != ENOENT) fail("cannot be made", errno);
        return;
    }
    const auto refuse = [this](const char *why) {
        throw std::invalid_argument(fmt::format("{}: {}", printable_name(path_), why));
    };
    there_ = true;
    struct stat target = {};
    const bool is_special = stat(path_.c_str(), &target) == 0 && !S_ISREG(target.st_mode) && !S_ISDIR(target.st_mode);
    if (is_special && kind_ != output_kind::stream) refuse("is neither a file nor a folder");
    if (!is_special && !replace) refuse("is there already; --force replaces it");
    direct_ = is_special || (kind_ == output_kind::stream && S_ISLNK(status.st_mode));
    if (direct_) return;
    if (kind_ != output_kind::folder) {
        if (S_ISDIR(status.st_mode)) refuse("is a folder, and the output is a file");
        return;
    }
    std::error_code error;
    const bool ours =
        S_ISDIR(status.st_mode) && (fs::is_empty(path_, error) || fs::exists(fs::path(path_) / marker, error));
    if (!ours) refuse("is no folder that an export has made, and is not replaced");
}

void staged_output::make()
{
    const bool folder = kind_ == output_kind::folder;
    work_path_ = claim(path_, folder);
    if (work_path_.empty()) fail("cannot be made", errno);
    give_usual_rights(work_path_, folder);
    if (folder) output_file(work_path_ + "/" + marker).close();
}

void staged_output::publish()
{
    if (direct_) return;
    if (kind_ != output_kind::folder) make_durable();
    if (there_ && kind_ == output_kind::folder) {
        replace_folder();
    } else if (there_) {
        if (rename(work_path_.c_str(), path_.c_str()) != 0) fail("cannot be replaced", errno);
    } else if (renameat2(AT_FDCWD, work_path_.c_str(), AT_FDCWD, path_.c_str(), RENAME_NOREPLACE) != 0) {
        // Not every file system can do it in one step.
        const bool free_name = errno == EINVAL && access(path_.c_str(), F_OK) != 0;
        if (!free_name || rename(work_path_.c_str(), path_.c_str()) != 0) fail("cannot be given its name", errno);
    }
    published_ = true;
}

// A file that had the name is not given up for one that a power failure would leave empty.
void staged_output::make_durable()
{
    const int descriptor = open(work_path_.c_str(), O_RDONLY | O_CLOEXEC);
    const int error = descriptor < 0 || fsync(descriptor) != 0 ? errno : 0;
    if (descriptor >= 0) close(descriptor);
    if (error != 0) fail("cannot be written", error);
}

void staged_output::replace_folder()
{
    const std::string old = claim(path_, true);
    if (old.empty() || rename(path_.c_str(), old.c_str()) != 0) fail("cannot be replaced", errno);
    if (rename(work_path_.c_str(), path_.c_str()) != 0) {
        const int error = errno;
        if (rename(old.c_str(), path_.c_str()) != 0) errno = error; // it keeps its other name
        fail("cannot be replaced", error);
    }
    std::error_code error;
    fs::remove_all(old, error);
}

void staged_output::fail(const char *what, int error) const
{
    throw output_error(fmt::format("{}: {}: {}", printable_name(path_), what, std::strerror(error)));
}

} // namespace qn::dump
