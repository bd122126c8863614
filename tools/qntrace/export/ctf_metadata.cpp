#include "tools/qntrace/export/ctf_metadata.h"

#include <fmt/format.h>

#include "tools/qntrace/export/ctf_event.h"
#include "tools/qntrace/format/escape.h"

namespace qn::dump
{
namespace
{

constexpr const char *beginning = R"(/* CTF 1.8 */

typealias integer { size = 8; align = 8; signed = false; } := uint8_t;
typealias integer { size = 8; align = 8; signed = false; base = hexadecimal; } := xint8_t;
typealias integer { size = 16; align = 8; signed = false; } := uint16_t;
typealias integer { size = 32; align = 8; signed = false; } := uint32_t;
typealias integer { size = 32; align = 8; signed = false; base = hexadecimal; } := xint32_t;
typealias integer { size = 32; align = 8; signed = true; } := int32_t;
typealias integer { size = 64; align = 8; signed = false; } := uint64_t;
typealias integer { size = 64; align = 8; signed = false; base = hexadecimal; } := xint64_t;
typealias integer { size = 64; align = 8; signed = true; } := int64_t;
typealias floating_point { exp_dig = 11; mant_dig = 53; align = 8; } := double_t;

trace {
    major = 1;
    minor = 8;
    byte_order = le;
    packet.header := struct {
        uint32_t magic;
        uint32_t stream_id;
    };
};
)";

constexpr const char *clock_and_stream = R"(
clock {
    name = wall;
    description = "Nanoseconds since 1970-01-01T00:00:00Z";
    freq = 1000000000;
    offset_s = 0;
    offset = 0;
    absolute = true;
};

typealias integer { size = 64; align = 8; signed = false; map = clock.wall.value; } := time_t;

stream {
    id = 0;
    packet.context := struct {
        time_t timestamp_begin;
        time_t timestamp_end;
        uint64_t content_size;
        uint64_t packet_size;
        uint64_t packet_seq_num;
        uint64_t events_discarded;
        string file;
    };
    event.header := struct {
        uint8_t id;
        time_t timestamp;
    };
    event.context := struct {
        uint32_t seq;
        xint32_t thread;
        string comp;
    };
};

)";

// Escaped twice: once as everywhere, and the backslashes of that for CTF's language.
std::string quoted(std::string_view text)
{
    std::string escaped;
    append_escaped(escaped, text, charset::ascii);
    std::string out;
    append_quoted(out, escaped, charset::ascii);
    return out;
}

} // namespace

std::string ctf_metadata(const trace_source &source)
{
    std::string out = beginning;
    out += "\nenv {\n    tracer_name = \"qntrace\";\n";
    const auto add = [&out](const char *name, std::string_view value) {
        if (!value.empty()) out += fmt::format("    {} = {};\n", name, quoted(value));
    };
    add("hostname", source.node());
    add("program", source.program);
    add("node", source.node_id);
    add("cluster", source.cluster);
    out += "};\n";
    out += clock_and_stream;
    out += ctf_event_types();
    out += ctf_event_classes();
    return out;
}

} // namespace qn::dump
