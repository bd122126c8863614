// Filter expressions, points in time, durations and numbers, as a user gives them to the reader's commands: refused with
// a place inside the text, or taken and then evaluated over records of every kind.
#include <optional>

#include "fuzz/fuzz_input.h"
#include "reader/every_kind.h"
#include "tools/qntrace/format/durations.h"
#include "tools/qntrace/select/number.h"
#include "tools/qntrace/select/time.h"
#include "tools/qntrace/select/where.h"
#include "tools/qntrace/select/where_error.h"

namespace
{
using namespace qn;

constexpr timespec now = {1'795'237'921, 500'000'000};

std::optional<dump::where_expression> parse(const std::string &text)
{
    try {
        return dump::where_expression(text, now);
    } catch (const dump::where_error &error) {
        fuzz::require(error.column() >= 1 && error.column() <= text.size() + 1, "the column", text);
        fuzz::require(*error.what() != '\0', "the message", text);
        return std::nullopt;
    }
}

// What an expression and its opposite say of every record.
void evaluate(const std::string &text)
{
    const auto expression = parse(text);
    if (!expression) return;
    const auto opposite = parse("!(" + text + ")");
    static const auto file = test::every_kind();
    reader::memory_source source(file.bytes());
    reader::trace_reader trace(source, [](const reader::finding &) {});
    const dump::trace_origin origin{"fuzz.trc", trace.header().value()};
    while (const auto record = trace.next()) {
        const bool holds = expression->holds(origin, *record);
        fuzz::require(!opposite || opposite->holds(origin, *record) != holds, "the opposite", text);
    }
}

void read_time(const std::string &text)
{
    try {
        const timespec time = dump::parse_time(text, now);
        fuzz::require(time.tv_nsec >= 0 && time.tv_nsec < 1'000'000'000, "the nanoseconds of a time", text);
    } catch (const std::invalid_argument &error) {
        fuzz::require(*error.what() != '\0', "the message about a time", text);
    }
}

void read_duration(const std::string &text)
{
    const auto duration = dump::parse_duration(text);
    if (!duration) return;
    fuzz::require(dump::parse_duration(dump::duration_text(*duration)) == duration, "the duration as a text", text);
}
} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    const fuzz::input input = fuzz::read_input(data, size);
    if (!input.ok) return 0;
    evaluate(input.text);
    read_time(input.text);
    read_duration(input.text);
    dump::parse_number(input.text);
    return 0;
}
