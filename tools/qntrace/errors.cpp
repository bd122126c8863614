// qntrace errors: the error records of many files with their messages, in groups or one by one.
#include <algorithm>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include <fmt/format.h>

#include "tools/qntrace/commands.h"
#include "tools/qntrace/console/output.h"
#include "tools/qntrace/console/terminal.h"
#include "tools/qntrace/errors/error_json.h"
#include "tools/qntrace/errors/error_text.h"
#include "tools/qntrace/format/json_text.h"
#include "tools/qntrace/select/selection.h"
#include "tools/qntrace/traces/clock_offsets.h"
#include "tools/qntrace/traces/losses_json.h"
#include "tools/qntrace/traces/read_merged.h"

namespace qn::dump
{
namespace
{

struct errors_options {
    bool json = false;
    bool utc = false;
    bool all = false;
    error_grouping by = error_grouping::message;
    error_order order = error_order::count;
    std::size_t top = 0; // 0: all groups
    std::vector<std::string> offsets;
    std::vector<std::string> files;
    std::shared_ptr<const selection> selected;
};

struct error_totals {
    std::uint64_t files = 0;
    losses lost;
};

std::string groups_text(std::size_t count) { return fmt::format("{} group{}", count, count == 1 ? "" : "s"); }

// What the command prints, in either form.
class errors_output
{
public:
    errors_output(const std::vector<trace_source> &sources, const errors_options &options)
        : sources_(sources), options_(options),
          text_(sources, {options.utc, locale_charset(), options.json ? 0 : output_columns()}), times_(options.utc)
    {
    }

    void event(const error_event &event)
    {
        out_.clear();
        if (options_.json)
            append_json([&](const json_text &text) { return event_json(event, sources_[event.source], times_, text); });
        else
            text_.event(out_, event);
        write_data(out_);
    }

    void groups(const error_groups &groups)
    {
        const auto sorted = groups.sorted(options_.order, options_.top);
        for (const error_group *group : sorted) {
            out_.clear();
            if (options_.json) {
                const trace_source &source = sources_[group->latest.source];
                append_json([&](const json_text &text) { return group_json(*group, source, times_, text); });
            } else {
                text_.group(out_, *group, options_.by);
            }
            write_data(out_);
        }
        if (options_.json) return;
        if (sorted.size() < groups.size())
            write_data(fmt::format("and {} more\n", groups_text(groups.size() - sorted.size())));
        if (groups.without_group() > 0)
            write_data(fmt::format("and {} errors of still more groups\n", groups.without_group()));
    }

    void totals(const error_groups &groups, const error_totals &totals)
    {
        out_.clear();
        if (options_.json) {
            append_json([&](const json_text &) {
                nlohmann::ordered_json object = {
                    {"type", "total"}, {"files", totals.files}, {"errors", groups.errors()}};
                if (!options_.all) {
                    object["groups"] = groups.size();
                    object["without_group"] = groups.without_group();
                }
                object.update(losses_json(totals.lost));
                return object;
            });
        } else {
            if (groups.errors() > 0) out_ += '\n';
            out_ += fmt::format("errors   {}", groups.errors());
            if (!options_.all && groups.size() > 0) out_ += fmt::format(" in {}", groups_text(groups.size()));
            out_ += fmt::format("\nfiles    {}\n", totals.files);
            text_.losses_line(out_, totals.lost);
        }
        write_data(out_);
    }

private:
    template <typename Make>
    void append_json(const Make &make)
    {
        append_object(out_, [&make](text_encoder &encode) {
            return make([&encode](std::string_view text) { return encode.text(text); });
        });
    }

    const std::vector<trace_source> &sources_;
    const errors_options &options_;
    error_text text_;
    timestamps times_;
    std::string out_;
};

int print_errors(const std::vector<trace_source> &sources, const clock_offsets &offsets, const errors_options &options)
{
    errors_output output(sources, options);
    message_catalogues catalogues;
    error_groups groups(sources, options.by);
    error_totals totals;
    const auto after_file = [&totals](std::size_t, const losses &lost) {
        ++totals.files;
        totals.lost.add(lost);
    };
    const int status =
        read_merged({sources, offsets, options.utc, after_file}, [&](std::size_t source, const merge_stream &stream) {
            const auto *error = std::get_if<reader::error_body>(&stream.record().body);
            if (error == nullptr) return;
            if (!options.selected->admits({sources[source].path, stream.header()}, stream.record())) return;
            error_event event = event_of(source, stream.record(), *error, catalogues);
            if (options.all) output.event(event);
            groups.add(std::move(event));
        });
    if (!options.all) output.groups(groups);
    output.totals(groups, totals);
    flush_data();
    return status;
}

int show_errors(const errors_options &options)
{
    const clock_offsets offsets(options.offsets);
    const trace_set set = find_traces(options.files);
    offsets.check(set.sources);
    return std::max(set.status, print_errors(set.sources, offsets, options));
}

// An option that takes one of a few words.
template <typename Choice>
void add_choice(CLI::App &command, const std::string &name, Choice &chosen,
                const std::map<std::string, Choice> &choices, const std::string &description)
{
    const auto choose = [&chosen, choices](const std::string &word) { chosen = choices.at(word); };
    command.add_option_function<std::string>(name, choose, description)
        ->check(CLI::IsMember(choices))
        ->type_name("WHAT");
}

} // namespace

void add_errors_command(CLI::App &app, int &status)
{
    const auto options = std::make_shared<errors_options>();
    auto *command = app.add_subcommand("errors", "Show the error records with their messages");
    command->add_flag("--json", options->json, "Print one JSON object a line instead of text");
    command->add_flag("--utc", options->utc, "Print times in UTC instead of the local time zone");
    add_choice(*command, "--by", options->by,
               {{"message", error_grouping::message},
                {"node", error_grouping::node},
                {"component", error_grouping::component}},
               "What the records of a group have in common; the message unless given");
    add_choice(*command, "--sort", options->order, {{"count", error_order::count}, {"last", error_order::last}},
               "The largest groups first, or those with the latest records; count unless given");
    auto *top = command->add_option("--top", options->top, "Only the first N groups")->type_name("N");
    command->add_flag("--all", options->all, "Print every error record, in order of time")->excludes(top);
    add_offset_option(*command, options->offsets);
    options->selected = add_selection_options(*command);
    add_traces_option(*command, options->files);
    command->callback([options, &status] { status = show_errors(*options); });
}

} // namespace qn::dump
