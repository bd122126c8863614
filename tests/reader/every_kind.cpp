#include "reader/every_kind.h"

#include <bit>

namespace qn::test
{
namespace
{

// app tried to open a file in open_it(), app.c line 120; the message has all types of arguments.
byte_string error_body(endian order)
{
    constexpr std::string_view message = "Error %1$d opening \"%5$s\": %2$ld %3$lld %4$g";
    const std::uint32_t strings_at = 72 + 6 * 16;
    byte_string body(order);
    body.u32(31).u32(18).u32(120); // id, error, line
    body.u32(strings_at);          // "open_it", 8 bytes
    body.u32(strings_at + 8);      // "app.c", 6 bytes
    body.u32(strings_at + 14);     // "FF1", 4 bytes
    body.u32(1).u32(17);           // set, message
    body.u32(strings_at + 18);     // "app.cat", 8 bytes
    body.u32(strings_at + 26);     // the message
    body.u32(6);                   // arguments
    const auto argument = [&](std::uint32_t type, std::uint64_t value) { body.u32(type).u32(0x5A5A5A5A).u64(value); };
    argument(0, 0xFFFFFFFF00000000 | static_cast<std::uint32_t>(-13));
    argument(1, static_cast<std::uint64_t>(-5));
    argument(2, 1ULL << 40);
    argument(3, std::bit_cast<std::uint64_t>(0.5));
    argument(5, strings_at + 26 + message.size() + 1);
    argument(6, 0x7fff1000);
    body.text("open_it").text("app.c").text("FF1").text("app.cat");
    body.text(message);
    body.text("/tmp/\x1b[1m");
    return body;
}

} // namespace

trace_builder every_kind(endian order)
{
    trace_builder file(4096, order);
    file.component = "____";
    file.seq = static_cast<std::uint32_t>(-2);
    file.add(2, file.body().text("SPOOL: app.1.sp not spooled 2 consecutive times"));
    file.add_start(4711, trace_builder::ticks_per_second, trace_builder::epoch_ns);
    file.component = "IDX";
    file.add_id(17);
    file.add_id(0xFFFFFFFF);
    file.add(3, file.body()
                    .u32(21)
                    .u32(3)
                    .u32(5)
                    .chars("hello")
                    .zeros(3)
                    .u32(0)
                    .u32(20)
                    .chars("0123456789abcdef")
                    .u32(0x1B0A00FF));
    file.add(12, file.body().u32(22).u32(4).u32(3).u32(16).u32(0xFFFFFFFF).u32(0x12345678));
    file.add(13, file.body().u32(23).u32(3).u64(7).u64(static_cast<std::uint64_t>(-70000)).u64(1ULL << 63));
    file.add(14, error_body(order));
    file.component = "AB";
    file.add_strings(24, {"plain", "tab\there", "quote\"back\\slash", "\x1b[31mred\x07", "caf\xc3\xa9", ""});
    file.add_strings(0xFFFFFFFF, {"formatted text"});
    file.add_strings(25, {"not \xff UTF-8"});
    file.add_start(4712, trace_builder::ticks_per_second, trace_builder::epoch_ns + 1'000'000'000, 19, "core event");
    file.component = "____";
    file.add(17, file.body().u64(2 * trace_builder::ticks_per_second).u64(trace_builder::epoch_ns));
    file.component = "IDX2";
    file.add(0xFFFF, file.body().u32(1));
    file.add_id(99);
    file.close();
    return file;
}

} // namespace qn::test
