#include "tools/qntrace/stats/report.h"

#include <algorithm>
#include <vector>

#include <fmt/format.h>
#include <nlohmann/json.hpp>

#include "tools/qntrace/format/durations.h"
#include "tools/qntrace/format/escape.h"
#include "tools/qntrace/format/json_text.h"
#include "tools/qntrace/format/timestamps.h"
#include "tools/qntrace/traces/losses_json.h"

namespace qn::dump
{
namespace
{

using json = nlohmann::ordered_json;

constexpr std::size_t bar_width = 40;

timespec time_of(std::int64_t ns) { return later_by({0, 0}, ns); }

double rate(std::uint64_t records, std::int64_t ns)
{
    return static_cast<double>(records) * 1e9 / static_cast<double>(ns);
}

// From the first to the last record; nothing when that is no time, or more than can be counted.
std::optional<std::int64_t> span_of(const stats_tally &tally)
{
    std::int64_t span = 0;
    if (!tally.first_ns || __builtin_sub_overflow(*tally.last_ns, *tally.first_ns, &span) || span == 0)
        return std::nullopt;
    return span;
}

std::string component_text(std::uint64_t key)
{
    std::string out;
    append_escaped(out, component_of_key(key), locale_charset());
    return out;
}

class text_report
{
public:
    text_report(const stats_tally &tally, const stats_format &format)
        : tally_(tally), format_(format), times_(format.utc)
    {
    }

    std::string make()
    {
        summary();
        if (tally_.all.records == 0) return out_;
        table("COMP", tally_.components, format_.top, component_text);
        table("KIND", tally_.kinds, 0, [](std::uint64_t key) { return std::string(kind_of_key(key)); });
        table("COMP  ID", tally_.ids, format_.top, [](std::uint64_t key) {
            return fmt::format("{:<4}  {}", component_text(component_key_of_id_key(key)), id_of_key(key));
        });
        table("THREAD", tally_.threads, format_.top, [](std::uint64_t key) { return fmt::format("{:#010x}", key); });
        buckets();
        return out_;
    }

private:
    template <typename... Values>
    void line(fmt::format_string<const Values &...> text, const Values &...values)
    {
        fmt::format_to(std::back_inserter(out_), text, values...);
        out_ += '\n';
    }

    std::string time_text(std::int64_t ns) { return times_.text(time_of(ns)).value_or("-"); }

    void summary()
    {
        line("files    {}", tally_.files);
        line("records  {}, {} bytes", tally_.all.records, tally_.all.bytes);
        if (tally_.without_time > 0) line("         {} of them without a time", tally_.without_time);
        if (tally_.first_ns) line("first    {}", time_text(*tally_.first_ns));
        if (tally_.last_ns) line("last     {}", time_text(*tally_.last_ns));
        if (const auto span = span_of(tally_)) line("rate     {:.1f} records/s", rate(tally_.all.records, *span));
        line("lost     {}",
             tally_.lost.any() ? losses_text(tally_.lost, format_.utc) : "nothing that the files tell of");
        if (tally_.lost.unspooled == 0 && tally_.lost.last_reuse_time != 0)
            line("         a page was overwritten before it was copied, the last time at {}",
                 times_.text({static_cast<time_t>(tally_.lost.last_reuse_time), 0}).value_or("-"));
        if (tally_.lost.overwritten > 0)
            line("         {} overwritten before the oldest records, fillers included", tally_.lost.overwritten);
    }

    template <typename Name>
    void table(std::string_view head, const amount_table &table, std::size_t most, Name name)
    {
        const auto rows = table.largest(most);
        if (rows.empty()) return;
        std::size_t width = head.size();
        for (const auto &row : rows) width = std::max(width, name(row.key).size());
        width = std::max<std::size_t>(width, 12);
        line("");
        line("{:<{}}  {:>12}  {:>14}  {:>6}", head, width, "RECORDS", "BYTES", "SHARE");
        for (const auto &[key, counted] : rows) {
            const double share = 100.0 * static_cast<double>(counted.records) / static_cast<double>(tally_.all.records);
            line("{:<{}}  {:>12}  {:>14}  {:>5.1f}%", name(key), width, counted.records, counted.bytes, share);
        }
        if (const auto more = table.keys_left_out(most)) line("and {} more", more);
        if (table.without_a_row().records > 0) line("and {} records of still more", table.without_a_row().records);
    }

    void buckets()
    {
        const auto &all = tally_.buckets.all();
        if (all.empty()) return;
        std::uint64_t most = 0;
        for (const auto &[index, bucket] : all) most = std::max(most, bucket.records);
        const std::int64_t width = tally_.buckets.width();
        line("");
        line("{:<{}}  {:>12}  {:>14}  {:>8}  {:>12}", fmt::format("TIME, {} each", duration_text(width)),
             times_.width(), "RECORDS", "BYTES", "MISSING", "RECORDS/S");
        std::optional<std::int64_t> last;
        for (const auto &[index, bucket] : all) {
            if (last && index != *last + 1) line("{:<{}}  {:>12}", "...", times_.width(), 0);
            last = index;
            // What has any records has a bar.
            const auto length = std::max<std::uint64_t>(bucket.records * bar_width / most, 1);
            line("{:<{}}  {:>12}  {:>14}  {:>8}  {:>12.1f}  {}", time_text(tally_.buckets.begin_of(index)),
                 times_.width(), bucket.records, bucket.bytes, bucket.missing, rate(bucket.records, width),
                 std::string(length, '#'));
        }
    }

    const stats_tally &tally_;
    stats_format format_;
    timestamps times_;
    std::string out_;
};

json time_json(std::int64_t ns, timestamps &times)
{
    json object;
    if (const auto text = times.text(time_of(ns))) object["time"] = *text;
    object["time_ns"] = fmt::format("{}", ns);
    return object;
}

// An object that has no texts out of a trace.
void append_line(std::string &out, const json &object)
{
    append_object(out, [&](text_encoder &) { return object; });
}

template <typename AddKey>
void append_rows(std::string &out, const char *type, const amount_table &table, std::size_t most, AddKey add_key)
{
    for (const auto &row : table.largest(most)) {
        append_object(out, [&](text_encoder &encode) {
            json object = {{"type", type}};
            add_key(object, row.key, encode);
            object["records"] = row.counted.records;
            object["bytes"] = row.counted.bytes;
            return object;
        });
    }
}

json totals(const stats_tally &tally, timestamps &times)
{
    json object = {{"type", "total"},
                   {"files", tally.files},
                   {"records", tally.all.records},
                   {"bytes", tally.all.bytes},
                   {"without_time", tally.without_time}};
    object.update(losses_json(tally.lost));
    if (tally.first_ns) object["first"] = time_json(*tally.first_ns, times);
    if (tally.last_ns) object["last"] = time_json(*tally.last_ns, times);
    if (const auto span = span_of(tally)) object["records_per_second"] = rate(tally.all.records, *span);
    return object;
}

} // namespace

std::string stats_text(const stats_tally &tally, const stats_format &format)
{
    return text_report(tally, format).make();
}

std::string stats_json(const stats_tally &tally, const stats_format &format)
{
    timestamps times(format.utc);
    std::string out;
    append_line(out, totals(tally, times));
    append_rows(out, "component", tally.components, format.top,
                [](json &object, std::uint64_t key, text_encoder &encode) {
                    object["comp"] = encode.text(component_of_key(key));
                });
    append_rows(out, "kind", tally.kinds, 0,
                [](json &object, std::uint64_t key, text_encoder &) { object["kind"] = kind_of_key(key); });
    append_rows(out, "id", tally.ids, format.top, [](json &object, std::uint64_t key, text_encoder &encode) {
        object["comp"] = encode.text(component_of_key(component_key_of_id_key(key)));
        object["id"] = id_of_key(key);
    });
    append_rows(out, "thread", tally.threads, format.top,
                [](json &object, std::uint64_t key, text_encoder &) { object["thread"] = key; });
    const std::int64_t width = tally.buckets.width();
    for (const auto &[index, bucket] : tally.buckets.all()) {
        json object = {{"type", "bucket"}};
        object.update(time_json(tally.buckets.begin_of(index), times));
        object["width_ns"] = fmt::format("{}", width);
        object["records"] = bucket.records;
        object["bytes"] = bucket.bytes;
        object["missing"] = bucket.missing;
        object["records_per_second"] = rate(bucket.records, width);
        append_line(out, object);
    }
    return out;
}

} // namespace qn::dump
