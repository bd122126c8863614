// What processor, hypervisor and kernel say about the counter's frequency. No state.
#include "platform/cu/frequency_hints.h"

#include <algorithm>
#include <charconv>
#include <cpuid.h>

#include "platform/common/files.h"

namespace qn::cu
{
namespace
{
// The value behind "key :" at the start of a line; empty when there is none.
std::string_view cpuinfo_value(std::string_view text, std::string_view key)
{
    while (!text.empty()) {
        const size_t end = std::min(text.find('\n'), text.size());
        const std::string_view line = text.substr(0, end);
        text.remove_prefix(std::min(end + 1, text.size()));
        const size_t colon = line.find(':');
        if (!line.starts_with(key) || colon == std::string_view::npos) continue;
        if (line.substr(key.size(), colon - key.size()).find_first_not_of("\t ") != std::string_view::npos) continue;
        return line.substr(std::min(line.find_first_not_of(' ', colon + 1), line.size()));
    }
    return {};
}

bool has_word(std::string_view text, std::string_view word)
{
    for (size_t at = text.find(word); at != std::string_view::npos; at = text.find(word, at + 1)) {
        const size_t end = at + word.size();
        if ((at == 0 || text[at - 1] == ' ') && (end == text.size() || text[end] == ' ')) return true;
    }
    return false;
}

// "2445.426", always with three decimals, is 2445426 kHz.
std::optional<uint64_t> parse_mhz(std::string_view text)
{
    const size_t point = text.find('.');
    if (point == std::string_view::npos || text.size() != point + 4) return std::nullopt;
    uint64_t mhz = 0, khz = 0;
    const char *const end = text.data() + text.size();
    if (std::from_chars(text.data(), text.data() + point, mhz).ptr != text.data() + point) return std::nullopt;
    if (std::from_chars(text.data() + point + 1, end, khz).ptr != end) return std::nullopt;
    return mhz * 1000 + khz;
}

// The first processor's part is enough; a machine with hundreds of them would take its time over the rest.
std::optional<uint64_t> kernel_says()
{
    char text[4096];
    size_t length = 0;
    if (platform::read_file("/proc/cpuinfo", text, &length) != 0) return std::nullopt;
    return frequency_in_cpuinfo({text, length});
}

// Crystal frequency times the ratio of counter to crystal, in the kernel's arithmetic.
std::optional<uint64_t> processor_says()
{
    constexpr unsigned counter_leaf = 0x15;
    unsigned denominator, numerator, crystal_hz, unused;
    if (__get_cpuid(counter_leaf, &denominator, &numerator, &crystal_hz, &unused) == 0) return std::nullopt;
    if (denominator == 0 || numerator == 0 || crystal_hz == 0) return std::nullopt;
    return static_cast<uint64_t>(crystal_hz / 1000) * numerator / denominator;
}

std::optional<uint64_t> hypervisor_says()
{
    constexpr unsigned hypervisor_present = 1U << 31;
    constexpr unsigned first_leaf = 0x40000000, frequency_leaf = 0x40000010;
    unsigned eax, ebx, ecx, edx;
    if (__get_cpuid(1, &eax, &ebx, &ecx, &edx) == 0 || (ecx & hypervisor_present) == 0) return std::nullopt;
    __cpuid(first_leaf, eax, ebx, ecx, edx);
    if (eax < frequency_leaf) return std::nullopt;
    __cpuid(frequency_leaf, eax, ebx, ecx, edx);
    return eax != 0 ? std::optional<uint64_t>(eax) : std::nullopt;
}
} // namespace

std::optional<uint64_t> frequency_in_cpuinfo(std::string_view text)
{
    const std::string_view flags = cpuinfo_value(text, "flags");
    if (!has_word(flags, "tsc_known_freq") || has_word(flags, "aperfmperf")) return std::nullopt;
    return parse_mhz(cpuinfo_value(text, "cpu MHz"));
}

hint_list frequency_hints() { return {kernel_says(), hypervisor_says(), processor_says()}; }
} // namespace qn::cu
