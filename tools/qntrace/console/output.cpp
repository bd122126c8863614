#include "tools/qntrace/console/output.h"

#include <cerrno>
#include <cstdio>
#include <cstring>

#include <fmt/format.h>

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
    fmt::print(stderr, "qntrace: {}\n", message);
}

} // namespace qn::dump
