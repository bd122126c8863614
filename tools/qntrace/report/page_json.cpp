#include "tools/qntrace/report/page_json.h"

#include <algorithm>
#include <set>

#include <fmt/format.h>
#include <nlohmann/json.hpp>

#include "tools/qntrace/errors/error_json.h"
#include "tools/qntrace/format/durations.h"
#include "tools/qntrace/format/escape.h"
#include "tools/qntrace/format/record_names.h"
#include "tools/qntrace/report/zone.h"
#include "tools/qntrace/select/record.h"
#include "tools/qntrace/traces/losses_json.h"

namespace qn::dump
{
namespace
{

using json = nlohmann::ordered_json;

constexpr std::int64_t second_ns = 1'000'000'000;
constexpr std::size_t most_error_rows = 1'000;

std::string printable(std::string_view text)
{
    std::string out;
    append_escaped(out, text, charset::utf_8);
    return out;
}

// JSON has < only within its texts.
std::string safe_in_html(const json &value)
{
    const std::string text = value.dump(-1, ' ', false, json::error_handler_t::replace);
    std::string out;
    out.reserve(text.size());
    for (const char c : text) {
        if (c == '<')
            out += "\\u003c";
        else
            out += c;
    }
    return out;
}

class page_writer
{
public:
    page_writer(const report_data &data, const page_options &options, const text_sink &write)
        : data_(data), options_(options), write_(write), first_(data.first_ns().value_or(0)),
          last_(data.last_ns().value_or(0)), zone_(options.utc ? page_zone{} : local_zone(first_, last_)),
          times_(zone_.utc), base_(first_ / second_ns - (first_ % second_ns < 0 ? 1 : 0))
    {
        rank_components();
    }

    void write()
    {
        write_("{");
        member("title", printable(options_.title));
        member("base", fmt::format("{}", base_));
        member("zone", {{"utc", zone_.utc}, {"offset_minutes", zone_.offset_minutes}});
        member("summary", summary());
        member("notes", notes());
        member("components", components());
        member("kinds", kind_names());
        member("rates", rates());
        member("processes", processes());
        member("marks", marks());
        member("errors", errors());
        write_("\"rows\":[");
        bool is_first = true;
        for (const timeline_row *row : data_.threads().sorted()) {
            if (!is_first) write_(",\n");
            is_first = false;
            write_(safe_in_html(row_json(*row)));
        }
        write_("]}");
    }

private:
    void member(const char *name, const json &value) const
    {
        write_(fmt::format("\"{}\":{},\n", name, safe_in_html(value)));
    }

    // The page shows those with the most records first.
    void rank_components()
    {
        const auto &all = data_.rates().components();
        for (std::size_t i = 0; i < all.size(); ++i) order_.push_back(i);
        std::stable_sort(order_.begin(), order_.end(), [&all](std::size_t left, std::size_t right) {
            return all[left].records > all[right].records;
        });
        rank_.resize(order_.size());
        for (std::size_t i = 0; i < order_.size(); ++i) rank_[order_[i]] = i;
    }

    // Seconds since the base, for drawing.
    double seconds(std::int64_t time_ns) const
    {
        const std::int64_t whole = time_ns / second_ns - base_;
        return static_cast<double>(whole) + static_cast<double>(time_ns % second_ns) / 1e9;
    }

    std::string time_text(std::int64_t time_ns) { return times_.text(later_by({0, 0}, time_ns)).value_or("-"); }

    json summary()
    {
        std::set<std::string> nodes, programs;
        for (const report_process &process : data_.processes()) {
            nodes.insert(printable(process.node));
            programs.insert(printable(process.program));
        }
        json object = {{"files", data_.files()},
                       {"nodes", nodes},
                       {"programs", programs},
                       {"records", data_.records()},
                       {"bytes", data_.bytes()},
                       {"errors", data_.errors().errors()},
                       {"without_time", data_.without_time()},
                       {"losses", losses_json(data_.lost())},
                       {"lost", losses_text(data_.lost(), zone_.utc)},
                       {"selection", printable(options_.selection)}};
        if (data_.first_ns()) {
            object["first"] = {{"text", time_text(first_)}, {"at", seconds(first_)}};
            object["last"] = {{"text", time_text(last_)}, {"at", seconds(last_)}};
        }
        return object;
    }

    json notes()
    {
        std::vector<std::string> all;
        if (options_.damaged)
            all.emplace_back("Some files are damaged or cannot be read. What is sound is shown; qntrace dump tells "
                             "what is wrong, and where.");
        for (auto &note : thinning_notes(data_)) all.push_back(std::move(note));
        if (data_.without_time() > 0)
            all.push_back(
                fmt::format("{} records have no known time: they are counted, and on no chart.", data_.without_time()));
        if (data_.marks().not_marked() > 0)
            all.push_back(
                fmt::format("{} losses are counted, and have no mark on the charts.", data_.marks().not_marked()));
        if (zone_.utc && !options_.utc && data_.first_ns())
            all.emplace_back("Times are in UTC: the offset of the local zone changes within the trace.");
        return all;
    }

    json components() const
    {
        json all = json::array();
        for (const std::size_t index : order_) {
            const component_rate &component = data_.rates().components()[index];
            all.push_back(
                {{"name", printable(component.name)}, {"records", component.records}, {"bytes", component.bytes}});
        }
        return all;
    }

    json rates() const
    {
        const time_buckets &all = data_.rates().all();
        if (all.all().empty()) return nullptr;
        const std::int64_t first = all.all().begin()->first;
        const auto count = static_cast<std::size_t>(all.all().rbegin()->first - first + 1);
        json counts = json::array();
        for (const std::size_t component : order_) {
            std::vector<std::uint64_t> records(count, 0);
            for (const auto &[index, bucket] : data_.rates().components()[component].buckets.all())
                records[static_cast<std::size_t>(index - first)] = bucket.records;
            counts.push_back(std::move(records));
        }
        return {{"begin", seconds(all.begin_of(first))},
                {"width", static_cast<double>(all.width()) / 1e9},
                {"width_text", duration_text(all.width())},
                {"counts", std::move(counts)}};
    }

    json processes() const
    {
        json all = json::array();
        for (const report_process &process : data_.processes())
            all.push_back({{"node", printable(process.node)}, {"program", printable(process.program)}});
        return all;
    }

    json marks() const
    {
        static constexpr const char *names[] = {"missing", "unfinished", "unspooled"}; // as loss_mark::kind has them
        json all = json::array();
        for (const loss_mark &mark : data_.marks().marks()) {
            all.push_back({{"what", names[static_cast<std::size_t>(mark.what)]},
                           {"count", mark.count},
                           {"process", data_.process_of(mark.source)},
                           {"trace", printable(data_.sources()[mark.source].trace)},
                           {"from", seconds(mark.from_ns)},
                           {"to", seconds(mark.to_ns)}});
        }
        return all;
    }

    json errors()
    {
        json all = json::array();
        for (const error_group *group : data_.errors().sorted(error_order::count, most_error_rows)) {
            const trace_source &source = data_.sources()[group->latest.source];
            json object =
                group_json(*group, source, times_, [](std::string_view text) { return json(printable(text)); });
            const auto last = group->last ? nanoseconds_of(*group->last) : std::nullopt;
            object["at"] = last ? json(seconds(*last)) : json(nullptr);
            all.push_back(std::move(object));
        }
        return {{"groups", data_.errors().size()},
                {"without_group", data_.errors().without_group()},
                {"rows", std::move(all)}};
    }

    // Columns beside each other; times as differences from one record to the next.
    json row_json(const timeline_row &row) const
    {
        std::vector<const timeline_record *> records;
        records.reserve(row.shown());
        for (const auto &kept : row.usual.kept()) records.push_back(&kept.record);
        for (const auto &kept : row.errors.kept()) records.push_back(&kept.record);
        std::stable_sort(records.begin(), records.end(),
                         [](const auto *left, const auto *right) { return left->time_ns < right->time_ns; });
        std::vector<std::int64_t> later_seconds;
        std::vector<std::int64_t> nanoseconds;
        std::vector<std::size_t> components;
        std::vector<std::uint32_t> kinds;
        json texts = json::array();
        std::int64_t last = base_;
        for (const timeline_record *record : records) {
            const std::int64_t ns = (record->time_ns % second_ns + second_ns) % second_ns;
            const std::int64_t second = (record->time_ns - ns) / second_ns;
            later_seconds.push_back(second - last);
            last = second;
            nanoseconds.push_back(ns);
            components.push_back(rank_[record->component]);
            kinds.push_back(record->kind);
            texts.push_back(record->text);
        }
        return {{"process", row.process},        {"thread", row.all_others ? json(nullptr) : json(row.thread)},
                {"records", row.records()},      {"errors", row.errors.offered()},
                {"s", std::move(later_seconds)}, {"ns", std::move(nanoseconds)},
                {"comp", std::move(components)}, {"kind", std::move(kinds)},
                {"text", std::move(texts)}};
    }

    const report_data &data_;
    const page_options &options_;
    const text_sink &write_;
    std::int64_t first_;
    std::int64_t last_;
    page_zone zone_;
    timestamps times_;
    std::int64_t base_; // seconds since the epoch
    std::vector<std::size_t> order_;
    std::vector<std::size_t> rank_; // by the index of a component
};

} // namespace

std::vector<std::string> thinning_notes(const report_data &data)
{
    std::vector<std::string> notes;
    const timeline &threads = data.threads();
    const std::uint64_t records = threads.records();
    if (threads.shown() < records) {
        const bool all_errors = threads.errors_left_out() == 0;
        notes.push_back(fmt::format("The timeline shows {} of {} records{}. Rates and counts are exact.",
                                    threads.shown(), records, all_errors ? ", every error among them" : ""));
    }
    if (data.errors().size() > most_error_rows || data.errors().without_group() > 0)
        notes.push_back(fmt::format("The table shows {} groups of errors; qntrace errors shows {} groups.",
                                    std::min(data.errors().size(), most_error_rows), data.errors().size()));
    return notes;
}

void write_page_json(const report_data &data, const page_options &options, const text_sink &write)
{
    page_writer(data, options, write).write();
}

} // namespace qn::dump
