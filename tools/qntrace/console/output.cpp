#include "tools/qntrace/console/output.h"

#include <cerrno>
#include <cstdio>
#include <cstring>

#include <fcntl.h>
#include <fmt/format.h>
#include <unistd.h>

namespace qn::dump
{
namespace
{

[[noreturn]] void fail()
{
    throw output_error(fmt::format("standard output cannot be written: {}", std::strerror(errno)));
}

} // namespace

void write_data(std::string_view data)
{
    if (std::fwrite(data.data(), 1, data.size(), stdout) != data.size()) fail();
}

void flush_data()
{
    if (std::fflush(stdout) != 0) fail();
}

void write_message(std::string_view message)
{
    flush_data(); // so that on a terminal the message stands where it belongs
    write_error_text(fmt::format("qntrace: {}\n", message));
}

void write_error_text(std::string_view text)
{
    // Not by fmt::print(), which throws when a stream cannot be written.
    static_cast<void>(std::fwrite(text.data(), 1, text.size(), stderr));
}

void occupy_standard_descriptors()
{
    // In this order: the lowest free descriptor is taken.
    for (const int descriptor : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) {
        if (fcntl(descriptor, F_GETFD) != -1) continue;
        if (open("/dev/null", descriptor == STDIN_FILENO ? O_WRONLY : O_RDONLY) < 0) return;
    }
}

} // namespace qn::dump
