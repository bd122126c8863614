// Trace files: any bytes are read, shown in both formats, verified and salvaged, within bounds; what is salvaged is
// sound.
#include <cstdio>

#include <unistd.h>

#include "fuzz/fuzz_input.h"
#include "tools/qntrace/check/file_check.h"
#include "tools/qntrace/format/json.h"
#include "tools/qntrace/format/text.h"
#include "tools/qntrace/reader/reader.h"
#include "tools/qntrace/salvage/ring_writer.h"
#include "tools/qntrace/salvage/sound_records.h"

namespace
{
using namespace qn;
using bytes = std::span<const std::byte>;

// Of how many bytes each are the outcomes, at most.
struct bounds {
    explicit bounds(std::size_t size)
        : records(size / 28 + 2), findings(4 * records + 16), output(4096 + 64 * size + 1024 * records)
    {
    }
    std::size_t records, findings, output;
};

template <typename Format>
void show(bytes file, const bounds &most, Format format)
{
    reader::memory_source source(file);
    std::size_t findings = 0;
    reader::trace_reader trace(source, [&](const reader::finding &) { ++findings; });
    std::size_t records = 0;
    std::string out;
    if (trace.header()) format.header(out, "fuzz.trc", *trace.header());
    while (const auto record = trace.next()) {
        format.record(out, *record);
        ++records;
    }
    fuzz::require(records <= most.records, "the number of records", "");
    fuzz::require(findings <= most.findings, "the number of findings", "");
    fuzz::require(out.size() <= most.output, "the size of the output", "");
    fuzz::require(!trace.header() || trace.unreadable_bytes() <= UINT32_MAX, "the bytes that cannot be read", "");
}

dump::file_check check(bytes file)
{
    reader::memory_source source(file);
    return dump::check_file(source);
}

// A size in the header that is far from the file's would be that of the new file too.
bool told_size_is_near(const reader::file_header &header, std::size_t size) { return header.file_size <= 2 * size; }

void salvage(bytes file)
{
    reader::memory_source source(file);
    reader::trace_reader trace(source, [](const reader::finding &) {});
    if (!trace.header() || !told_size_is_near(*trace.header(), file.size())) return;
    static std::FILE *const out = std::tmpfile();
    fuzz::require(out != nullptr && ftruncate(fileno(out), 0) == 0, "the temporary file", "");
    std::rewind(out);
    std::vector<std::byte> header(file.begin(), file.begin() + static_cast<std::ptrdiff_t>(trace.header()->ring.begin));
    std::uint64_t saved = 0;
    {
        dump::ring_writer ring(out, std::move(header), *trace.header());
        dump::sound_records sound(*trace.header(), [&](const reader::trace_record &record, const cu_timeinfo_t &base) {
            if (ring.add(record, base) && reader::carries_data(record.body)) ++saved;
        });
        while (const auto record = trace.next()) sound.pass(*record);
        sound.finish();
        ring.finish();
    }
    std::fflush(out);
    std::fseek(out, 0, SEEK_END);
    std::vector<std::byte> salvaged(static_cast<std::size_t>(std::ftell(out)));
    std::rewind(out);
    fuzz::require(std::fread(salvaged.data(), 1, salvaged.size(), out) == salvaged.size(), "the temporary file", "");
    const auto outcome = check(salvaged);
    fuzz::require(outcome.sound(), outcome.findings.empty() ? "?" : outcome.findings[0].what.text.c_str(), "");
    fuzz::require(outcome.records >= saved, "the number of salvaged records",
                  ""); // and time calibrations for lost starts
}
} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    const auto file = std::as_bytes(std::span(data, size));
    const bounds most(size);
    show(file, most, dump::text_dump({true, true, dump::charset::utf_8}));
    show(file, most, dump::json_dump({true, true}));
    const auto checked = check(file);
    fuzz::require(checked.findings.size() <= dump::file_check::most_findings, "the number of findings kept", "");
    fuzz::require(checked.unreadable_bytes <= checked.ring_bytes, "the bytes of the ring that cannot be read", "");
    salvage(file);
    return 0;
}
