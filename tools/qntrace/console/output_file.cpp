#include "tools/qntrace/console/output_file.h"

#include <cerrno>
#include <cstring>

#include <fmt/format.h>
#include <sys/stat.h>
#include <unistd.h>

#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"

namespace qn::dump
{

output_file::output_file(const std::string &path) : path_(path), written_path_(path)
{
    struct stat status = {};
    if (lstat(path.c_str(), &status) != 0 || S_ISREG(status.st_mode))
        written_path_ = fmt::format("{}.{}.part", path, getpid());
    file_.reset(std::fopen(written_path_.c_str(), "we"));
    if (!file_) fail();
}

output_file::~output_file()
{
    if (file_ && written_path_ != path_) unlink(written_path_.c_str());
}

void output_file::write(std::string_view text)
{
    if (std::fwrite(text.data(), 1, text.size(), file_.get()) != text.size()) fail();
}

void output_file::finish()
{
    if (std::fflush(file_.get()) != 0) fail();
    if (written_path_ != path_ && std::rename(written_path_.c_str(), path_.c_str()) != 0) fail();
    file_.reset();
}

void output_file::fail() const
{
    throw output_error(fmt::format("{} cannot be written: {}", printable_name(path_), std::strerror(errno)));
}

} // namespace qn::dump
