#include "tools/qntrace/check/header_rules.h"

#include <cstddef>
#include <string>
#include <utility>

#include <fmt/format.h>

#include "tools/qntrace/format/record_names.h"
#include "trace/files/format.h"

namespace qn::dump
{
namespace
{

namespace format = qn::tr::format;
using severity = reader::finding::severity;

class header_check
{
public:
    header_check(const reader::byte_view &bytes, const reader::file_header &header, const reader::finding_sink &report)
        : bytes_(bytes), header_(header), report_(report)
    {
    }

    void identity()
    {
        constexpr std::uint8_t known = format::properties::little_endian | format::properties::always;
        if ((header_.properties & ~known) != 0)
            damage(offsetof(trace_file_header_t, uProperties),
                   fmt::format("the properties {:#04x} have bits that mean nothing", header_.properties));
        if (header_.platform != format::platform_linux)
            note(offsetof(trace_file_header_t, uPlatform),
                 fmt::format("the file is of platform {}, Linux is {}", header_.platform, format::platform_linux));
        if (header_.machine_id != 0)
            damage(offsetof(trace_file_header_t, machineId),
                   fmt::format("the machine identifier is {}, and always 0", header_.machine_id));
        if (header_.pid == 0) note(offsetof(trace_file_header_t, uPid), "the header names no process");
    }

    void words_of_readers()
    {
        if ((header_.flags & ~format::flag_writer_waits) != 0)
            damage(offsetof(trace_file_header_t, uFlags),
                   fmt::format("the flags {:#06x} have bits that mean nothing", header_.flags));
        if (header_.seq_lock % 2 != 0 && header_.seq_lock != format::seq_lock_none)
            damage(offsetof(trace_file_header_t, uSeqLock),
                   fmt::format("a reader holds the record {}, which no record can be", header_.seq_lock));
        if (header_.tail_request != 0)
            note(offsetof(trace_file_header_t, uTailReq), "a reader asks the writers to wait");
    }

    void texts()
    {
        text("program", offsetof(trace_file_header_t, program), sizeof(trace_file_header_t::program));
        text("build identifier", offsetof(trace_file_header_t, buildName), sizeof(trace_file_header_t::buildName));
        text("base name of the program", offsetof(trace_file_header_t, baseProgName),
             sizeof(trace_file_header_t::baseProgName));
    }

    void page()
    {
        if (header_.page_state && !is_page_state(*header_.page_state))
            damage(offsetof(trace_file_header_t, sp_flags),
                   fmt::format("no page has the state {}", *header_.page_state));
        if (header_.tz_offset_minutes && !is_zone_offset(*header_.tz_offset_minutes))
            damage(offsetof(trace_file_header_t, tz_offset),
                   fmt::format("no time zone is {} minutes from UTC", *header_.tz_offset_minutes));
    }

private:
    void text(const char *name, std::size_t at, std::size_t size)
    {
        if (!bytes_.holds(at, size) || at + size > header_.ring.begin) return;
        if (!reader::cut_at_nul(bytes_.chars(at, size)).terminated)
            damage(at, fmt::format("the {} has no end within its {} bytes", name, size));
    }

    void damage(std::uint64_t at, std::string text) { report_({severity::damage, at, std::move(text)}); }
    void note(std::uint64_t at, std::string text) { report_({severity::note, at, std::move(text)}); }

    const reader::byte_view &bytes_;
    const reader::file_header &header_;
    const reader::finding_sink &report_;
};

} // namespace

void check_header(const reader::byte_view &bytes, const reader::file_header &header, const reader::finding_sink &report)
{
    header_check check(bytes, header, report);
    check.identity();
    check.words_of_readers();
    check.texts();
    check.page();
}

bool is_page_state(std::uint8_t state) { return state == 0 || !page_state_name(state).empty(); }

bool is_zone_offset(std::int32_t minutes)
{
    constexpr std::int32_t most_minutes = 7 * 24 * 60;
    return minutes >= -most_minutes && minutes <= most_minutes;
}

} // namespace qn::dump
