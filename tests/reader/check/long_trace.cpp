#include "reader/check/long_trace.h"

#include <bit>

namespace qn::test
{
namespace
{

byte_string error_body(const trace_builder &file)
{
    constexpr std::uint32_t strings_at = 72 + 2 * 16;
    byte_string body = file.body();
    body.u32(31).u32(18).u32(120);
    body.u32(strings_at).u32(strings_at + 8).u32(0).u32(1).u32(17).u32(0).u32(strings_at + 14).u32(2);
    body.u32(0).u32(0).u64(13);
    body.u32(5).u32(0).u64(strings_at + 40);
    return body.text("open_it").text("app.c").text("error %d, file \"%s\"...").zeros(2).text("/tmp/app.conf");
}

// Some 3 KiB of records of all kinds, of which start, restart and calibration keep the time base.
void add_all_kinds(trace_builder &file, std::uint32_t id)
{
    file.component = "LONG";
    file.add_id(id);
    file.add_strings(id, {"plain", std::string(300, 's'), "caf\xc3\xa9", "\x1b[31m"});
    byte_string values_32 = file.body();
    values_32.u32(id).u32(150);
    for (std::uint32_t i = 0; i < 150; ++i) values_32.u32(i * 0x01010101);
    file.add(12, values_32);
    byte_string values_64 = file.body();
    values_64.u32(id).u32(100);
    for (std::uint64_t i = 0; i < 100; ++i) values_64.u64(i << 40);
    file.add(13, values_64);
    file.add(3, file.body().u32(id).u32(3).u32(5).chars("hello").zeros(3).u32(0).u32(400).zeros(400));
    file.add(14, error_body(file));
    file.add_start(4711, trace_builder::ticks_per_second, trace_builder::epoch_ns);
    file.add_start(4711, trace_builder::ticks_per_second, trace_builder::epoch_ns, 19, "it crashed");
    file.component = "____";
    file.add(17, file.body().u64(trace_builder::ticks_per_second).u64(trace_builder::epoch_ns));
}

constexpr std::size_t most_bytes_of_all_kinds = 4096;

} // namespace

trace_builder long_trace(endian order)
{
    trace_builder file(long_trace_bytes, order);
    const std::size_t oldest = 200 + 5 * most_bytes_of_all_kinds;
    file.at = oldest;
    for (std::uint32_t id = 1; file.at + most_bytes_of_all_kinds < long_trace_bytes; ++id) add_all_kinds(file, id);
    file.seq += 2;
    file.add_free(long_trace_bytes - file.at, file.seq);
    file.at = 200;
    for (std::uint32_t id = 100; file.at + most_bytes_of_all_kinds < oldest; ++id) add_all_kinds(file, id);
    file.set_oldest(file.at);
    file.add_free(oldest - file.at);
    return file;
}

} // namespace qn::test
