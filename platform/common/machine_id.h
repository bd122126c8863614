// The number of the machine, as both libraries read it. No state, no lock.
#pragma once

#include <cerrno>
#include <charconv>
#include <cstdint>

#include "platform/common/files.h"

namespace qn::platform
{
// Stores the first 16 hexadecimal digits of /etc/machine-id in *id. Returns 0, the error of opening or reading the file,
// or ENODATA when it does not begin with so many.
inline int read_machine_id(uint64_t *id)
{
    char digits[16];
    size_t length = 0;
    const int error = read_file("/etc/machine-id", digits, &length);
    if (error != 0) return error;
    uint64_t number = 0;
    const char *const end = digits + sizeof digits;
    const auto [stopped, fault] = std::from_chars(digits, digits + length, number, 16);
    if (fault != std::errc{} || stopped != end) return ENODATA;
    *id = number;
    return 0;
}
} // namespace qn::platform
