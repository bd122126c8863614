#include "tools/qntrace/salvage/new_file.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <utility>

#include <fcntl.h>
#include <fmt/format.h>
#include <sys/stat.h>
#include <unistd.h>

#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"

namespace qn::dump
{
new_file::new_file(std::string path, mode_t mode, bool may_replace) : path_(std::move(path)), may_replace_(may_replace)
{
    struct stat status = {};
    if (lstat(path_.c_str(), &status) == 0) {
        errno = EEXIST;
        if (!may_replace_) fail("is not replaced without --force");
        errno = S_ISDIR(status.st_mode) ? EISDIR : EINVAL;
        if (!S_ISREG(status.st_mode) && !S_ISLNK(status.st_mode)) fail("is not a regular file");
    }
    std::string name = path_ + ".XXXXXX";
    const int descriptor = mkostemp(name.data(), O_CLOEXEC);
    if (descriptor < 0) fail("cannot be created");
    temporary_ = std::move(name);
    stream_.reset(fdopen(descriptor, "wb"));
    if (!stream_) {
        close(descriptor);
        unlink(temporary_.c_str());
        fail("cannot be written");
    }
    fchmod(descriptor, mode);
}

void new_file::fail(const char *what) const
{
    throw output_error(fmt::format("{}: {}: {}", printable_name(path_), what, std::strerror(errno)));
}

new_file::~new_file()
{
    if (!temporary_.empty()) unlink(temporary_.c_str());
}

void new_file::put_in_place()
{
    // What was refused earlier is not forgotten: a full disk may have room for the last bytes again.
    const bool written = std::ferror(stream_.get()) == 0;
    if (std::fflush(stream_.get()) != 0 || !written || fsync(fileno(stream_.get())) != 0) fail("cannot be written");
    if (may_replace_) {
        if (rename(temporary_.c_str(), path_.c_str()) != 0) fail("cannot be put in its place");
        temporary_.clear();
    } else if (link(temporary_.c_str(), path_.c_str()) != 0) { // unlike rename(), this replaces nothing
        fail("cannot be put in its place");
    }
}

} // namespace qn::dump
