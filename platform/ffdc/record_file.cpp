// The files of /var/qn/ffdc. No lock: a record is appended by one write, and the kernel keeps such writes
// apart, between threads and between processes.
#include "platform/ffdc/record_file.h"

#include <cerrno>
#include <string_view>
#include <sys/stat.h>

#include "platform/common/file_size_limit.h"
#include "platform/common/files.h"

namespace qn::ffdc
{
namespace
{
constexpr std::string_view record_folder = "/var/qn/ffdc/";
constexpr size_t longest_name = 64;

bool may_name_a_file(char character)
{
    return (character >= 'a' && character <= 'z') || (character >= 'A' && character <= 'Z') ||
           (character >= '0' && character <= '9') || character == '-' || character == '_';
}

std::string record_path(const char *component)
{
    std::string_view name = component != nullptr && *component != '\0' ? component : "unknown";
    std::string path(record_folder);
    for (const char character : name.substr(0, longest_name)) path += may_name_a_file(character) ? character : '_';
    return path + ".log";
}

// What is missing at the end of the file to the empty line behind a record: the disk may have been full before the last
// one was whole.
std::string_view missing_end(int fd, off_t size)
{
    char last[2];
    if (size == 0) return "";
    if (size < 2 || pread(fd, last, sizeof last, size - 2) != sizeof last || last[1] != '\n') return "\n\n";
    return last[0] == '\n' ? "" : "\n";
}

int write_once(int fd, const std::string &record)
{
    ssize_t written;
    do written = write(fd, record.data(), record.size());
    while (written == -1 && errno == EINTR);
    if (written == -1) return errno;
    return static_cast<size_t>(written) == record.size() ? 0 : ENOSPC;
}

int append(int fd, const std::string &record)
{
    struct stat status;
    if (fstat(fd, &status) != 0) return errno;
    // A pipe whose reader leaves would end the program, and a device is nobody's record.
    if (!S_ISREG(status.st_mode)) return ENXIO;
    const std::string whole = std::string(missing_end(fd, status.st_size)) += record;
    if (platform::exceeds_file_size_limit(static_cast<uint64_t>(status.st_size) + whole.size())) return EFBIG;
    return write_once(fd, whole);
}
} // namespace

int append_record(const char *component, const std::string &record)
{
    struct stat folder;
    if (stat(std::string(record_folder).c_str(), &folder) != 0) return errno == ENOENT || errno == ENOTDIR ? 0 : errno;
    // Not through a link, and not into a pipe that nobody reads: others may be able to write into the folder.
    const platform::file out(record_path(component).c_str(), O_RDWR | O_APPEND | O_CREAT | O_NOFOLLOW | O_NONBLOCK,
                             0640);
    return out.error() != 0 ? out.error() : append(out.fd(), record);
}
} // namespace qn::ffdc
