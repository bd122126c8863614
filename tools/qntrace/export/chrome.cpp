// Chrome's trace events, for the viewers of timelines: a process for every program of a node, a track for each thread.
//
// A record becomes a complete event that lasts until the next record of its thread, so that viewers which know nothing
// but stretches of time show it too; but no longer than `longest_ns`, so that a thread that is silent looks idle. The
// last record of a thread lasts `last_ns`. What is missing is an instant on all tracks.
//
// Viewers add the length of an event to its time as floating-point numbers. So that they never find two events nested
// that follow each other, an event ends a nanosecond before the next one.
#include <algorithm>
#include <map>
#include <optional>
#include <set>
#include <tuple>
#include <utility>

#include <fmt/format.h>
#include <nlohmann/json.hpp>

#include "tools/qntrace/console/output_file.h"
#include "tools/qntrace/export/format.h"
#include "tools/qntrace/export/record_time.h"
#include "tools/qntrace/format/durations.h"
#include "tools/qntrace/format/escape.h"
#include "tools/qntrace/format/json.h"
#include "tools/qntrace/format/record_names.h"
#include "tools/qntrace/select/record.h"

namespace qn::dump
{
namespace
{

using json = nlohmann::ordered_json;

constexpr std::int64_t longest_ns = 1'000'000;
constexpr std::int64_t last_ns = 1'000;

// Damaged files may have a thread in every record.
constexpr std::size_t most_waiting_bytes = std::size_t{8} << 20;
constexpr std::size_t most_named_threads = 100'000;

std::string printable(std::string_view text)
{
    std::string out;
    append_escaped(out, text, charset::utf_8);
    return out;
}

// Microseconds with the nanoseconds behind the point.
std::string microseconds(std::int64_t ns)
{
    const auto amount = ns < 0 ? 0 - static_cast<std::uint64_t>(ns) : static_cast<std::uint64_t>(ns);
    return fmt::format("{}{}.{:03}", ns < 0 ? "-" : "", amount / 1000, amount % 1000);
}

std::string event_name(const reader::trace_record &record)
{
    auto name = fmt::format("{} {}", component_name(record.raw.header), kind_name(record.body));
    if (const auto id = id_of(record.body)) name += fmt::format(" {}", *id);
    return printable(name);
}

class chrome_export final : public export_format
{
public:
    chrome_export(const source_list &sources, const std::string &path) : file_(path)
    {
        std::map<std::tuple<std::string, std::string, std::string, std::string>, std::uint32_t> numbers;
        for (const trace_source &source : sources) {
            const auto [known, is_new] = numbers.emplace(
                std::tuple(source.cluster, source.node(), source.node_id, source.program), numbers.size() + 1);
            sources_.push_back({known->second, {{"path", source.path}}, {}});
            if (is_new) processes_.emplace_back(known->second, fmt::format("{} on {}", source.program, source.node()));
        }
        for (const trace_source &source : sources) {
            const auto ns = source.first && source.first->time ? nanoseconds_of(*source.first->time) : std::nullopt;
            if (ns && (!first_ns_ || *ns < *first_ns_)) first_ns_ = ns;
        }
        file_.write("{\"displayTimeUnit\":\"ns\",\"traceEvents\":[\n");
        for (const auto &[number, name] : processes_) name_track("process_name", number, 0, name);
    }

    void record(std::size_t source, const merge_stream &stream) override
    {
        const auto &record = stream.record();
        const std::int64_t ns = place_of(record);
        losses_up_to(source, stream.lost(), ns);

        const track where{sources_[source].process, record.raw.header.thread};
        if (const auto before = waiting_.find(where); before != waiting_.end()) {
            emit(before->second, ns);
            waiting_bytes_ -= before->second.head.size() + before->second.tail.size();
            waiting_.erase(before);
        }
        if (waiting_bytes_ > most_waiting_bytes) emit_all(ns);
        name_thread(where);

        event next;
        next.ns = ns;
        next.head = fmt::format("{{\"name\":{},\"cat\":{},\"ph\":\"X\",\"pid\":{},\"tid\":{},\"ts\":{}",
                                json(event_name(record)).dump(-1, ' ', true),
                                json(printable(component_name(record.raw.header))).dump(-1, ' ', true), where.first,
                                where.second, microseconds(ns - *origin_ns_));
        next.tail = arguments(source, record);
        waiting_bytes_ += next.head.size() + next.tail.size();
        waiting_.emplace(where, std::move(next));
        newest_ns_ = ns;
    }

    void end_of_source(std::size_t source, const losses &lost) override
    {
        losses_up_to(source, lost, newest_ns_.value_or(origin_ns_.value_or(0)));
    }

    void finish() override
    {
        emit_all(std::nullopt);
        file_.write(fmt::format("\n],\"otherData\":{{\"origin_ns\":\"{}\",\"made_by\":\"qntrace export\"}}}}\n",
                                origin_ns_.value_or(0)));
        file_.close();
    }

private:
    using track = std::pair<std::uint32_t, std::uint32_t>; // process and thread

    struct source_state {
        std::uint32_t process;
        text_members origin;
        losses told;
    };

    // All but how long it lasts.
    struct event {
        std::int64_t ns = 0;
        std::string head;
        std::string tail;
    };

    // Where a record stands: at its time, or at that of the record before it.
    std::int64_t place_of(const reader::trace_record &record)
    {
        const auto ns = record_ns(record);
        if (!origin_ns_) origin_ns_ = ns ? *ns : first_ns_.value_or(0);
        std::int64_t since_origin = 0;
        if (ns && !__builtin_sub_overflow(*ns, *origin_ns_, &since_origin)) return *ns;
        return newest_ns_.value_or(*origin_ns_);
    }

    std::string arguments(std::size_t source, const reader::trace_record &record)
    {
        std::string object;
        format_.record(object, record, sources_[source].origin);
        object.pop_back(); // the end of the line
        return object;
    }

    void write_event(std::string_view text)
    {
        if (!first_) file_.write(",\n");
        first_ = false;
        file_.write(text);
    }

    void emit(const event &done, std::optional<std::int64_t> next_ns)
    {
        std::int64_t lasts = last_ns;
        if (next_ns) {
            const bool overflow = __builtin_sub_overflow(*next_ns, done.ns, &lasts);
            lasts = overflow ? longest_ns : std::min(lasts - 1, longest_ns);
        }
        write_event(fmt::format("{},\"dur\":{},\"args\":{}}}", done.head,
                                microseconds(std::max<std::int64_t>(lasts, 0)), done.tail));
    }

    // The records of all threads that come are later than `next_ns`, unless a clock steps back.
    void emit_all(std::optional<std::int64_t> next_ns)
    {
        for (const auto &[where, waiting] : waiting_) emit(waiting, next_ns);
        waiting_.clear();
        waiting_bytes_ = 0;
    }

    void name_track(const char *what, std::uint32_t process, std::uint32_t thread, const std::string &name)
    {
        const json object = {
            {"name", what}, {"ph", "M"}, {"pid", process}, {"tid", thread}, {"args", {{"name", printable(name)}}}};
        write_event(object.dump(-1, ' ', true));
    }

    void name_thread(const track &where)
    {
        if (named_.size() >= most_named_threads || !named_.insert(where).second) return;
        name_track("thread_name", where.first, where.second, fmt::format("thread {:#010x}", where.second));
    }

    // What went missing since the source's record before.
    void losses_up_to(std::size_t source, const losses &lost, std::int64_t ns)
    {
        source_state &state = sources_[source];
        json missing = json::object();
        const auto add = [&missing](const char *name, std::uint64_t now, std::uint64_t &told) {
            if (now > told) missing[name] = now - told;
            told = now;
        };
        add("unfinished", lost.unfinished, state.told.unfinished);
        add("missing", lost.missing, state.told.missing);
        add("overwritten", lost.overwritten, state.told.overwritten);
        add("unspooled_pages", lost.unspooled, state.told.unspooled);
        if (missing.empty()) return;
        missing["path"] = printable(state.origin.back().second);
        write_event(fmt::format("{{\"name\":\"lost\",\"cat\":\"lost\",\"ph\":\"i\",\"s\":\"g\",\"pid\":{},\"tid\":0,"
                                "\"ts\":{},\"args\":{}}}",
                                state.process, microseconds(ns - origin_ns_.value_or(0)), missing.dump(-1, ' ', true)));
    }

    output_file file_;
    std::vector<source_state> sources_;
    std::vector<std::pair<std::uint32_t, std::string>> processes_;
    json_dump format_{{false, true}};
    bool first_ = true;
    std::optional<std::int64_t> first_ns_;  // of the records that the sources begin with
    std::optional<std::int64_t> origin_ns_; // of the first record, from which all times count
    std::optional<std::int64_t> newest_ns_;
    std::map<track, event> waiting_; // each thread's last record, whose end is not known
    std::size_t waiting_bytes_ = 0;
    std::set<track> named_;
};

} // namespace

std::unique_ptr<export_format> make_chrome_export(const source_list &sources, const std::string &file)
{
    return std::make_unique<chrome_export>(sources, file);
}

} // namespace qn::dump
