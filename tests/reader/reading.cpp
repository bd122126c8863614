#include "reader/reading.h"

#include <fmt/format.h>

#include "tools/qntrace/format/json.h"
#include "tools/qntrace/format/record_names.h"
#include "tools/qntrace/format/text.h"

namespace qn::test
{
namespace
{

constexpr std::string_view file_name = "test.trc";

std::vector<std::string> texts(const std::vector<reader::finding> &findings, bool notes)
{
    std::vector<std::string> result;
    for (const auto &found : findings) {
        if ((found.level == reader::finding::severity::note) != notes) continue;
        result.push_back(found.offset ? fmt::format("{}: {}", *found.offset, found.text) : found.text);
    }
    return result;
}

template <typename Format>
std::string dump(std::span<const std::byte> bytes, const dump_choice &choice, Format format)
{
    reader::memory_source source(bytes);
    reader::trace_reader trace(source, [](const reader::finding &) {});
    std::string out;
    if (!trace.header()) return out;
    format.header(out, file_name, *trace.header());
    if (!choice.with_header) out.clear();
    while (const auto record = trace.next()) {
        const bool hidden = std::holds_alternative<reader::free_body>(record->body) ||
                            std::holds_alternative<reader::unfinished_body>(record->body);
        if (choice.raw || !hidden) format.record(out, *record);
    }
    return out;
}

} // namespace

std::vector<std::uint32_t> reading::data_seqs() const
{
    std::vector<std::uint32_t> result;
    for (const auto &record : records) {
        if (record.kind != "free" && record.kind != "unfinished") result.push_back(record.header.seq);
    }
    return result;
}

std::vector<std::string> reading::damage() const { return texts(findings, false); }
std::vector<std::string> reading::notes() const { return texts(findings, true); }

reading read_all(reader::byte_source &source)
{
    reading result;
    reader::trace_reader trace(source, [&](const reader::finding &found) { result.findings.push_back(found); });
    result.header = trace.header();
    while (const auto record = trace.next()) {
        kept_record kept{record->raw.offset, record->raw.header, std::string(dump::kind_name(record->body)),
                         record->problem, std::nullopt};
        if (record->time) kept.time_ns = dump::nanoseconds_text(*record->time);
        result.records.push_back(kept);
    }
    return result;
}

reading read_all(std::span<const std::byte> bytes)
{
    reader::memory_source source(bytes);
    return read_all(source);
}

std::string text_of(std::span<const std::byte> bytes, const dump_choice &choice)
{
    dump::text_options options;
    options.raw = choice.raw;
    options.utc = true;
    options.printable = choice.utf_8 ? dump::charset::utf_8 : dump::charset::ascii;
    return dump(bytes, choice, dump::text_dump(options));
}

std::string json_of(std::span<const std::byte> bytes, const dump_choice &choice)
{
    return dump(bytes, choice, dump::json_dump({choice.raw, true}));
}

} // namespace qn::test
