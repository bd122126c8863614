// What processor, hypervisor and kernel say about the counter's frequency. To be believed where a measurement
// agrees.
#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <string_view>

namespace qn::cu
{
// In kilohertz, the most trustworthy one first.
using hint_list = std::array<std::optional<uint64_t>, 3>;
hint_list frequency_hints();

// The frequency in the text of /proc/cpuinfo, where "cpu MHz" is the counter's and not what the processor
// happens to run at.
std::optional<uint64_t> frequency_in_cpuinfo(std::string_view text);
} // namespace qn::cu
