// qntrace follow: prints the records of a live trace as they are written.
#include <memory>
#include <optional>
#include <string>

#include "tools/qntrace/commands.h"
#include "tools/qntrace/console/terminal.h"
#include "tools/qntrace/follow/follow.h"
#include "tools/qntrace/select/number.h"

namespace qn::dump
{

void add_follow_command(CLI::App &app, int &status)
{
    struct command_line {
        follow_options how;
        std::string color = "auto";
        bool from_start = false;
        std::string name;
    };
    const auto given = std::make_shared<command_line>();
    follow_output_options &output = given->how.output;
    auto *command = app.add_subcommand("follow", "Print the records of a live trace as they are written");
    auto *from_start =
        command->add_flag("--from-start", given->from_start, "Begin with the oldest record, not behind the newest one");
    const auto take_last = [&output](const std::string &number) {
        output.last = parse_number(number);
        if (!output.last) throw CLI::ValidationError("--last", "expected a number");
    };
    command
        ->add_option_function<std::string>("--last", take_last,
                                           "Begin with the newest N of the selected records that are there already")
        ->type_name("N")
        ->excludes(from_start);
    add_follow_options(*command, given->how);
    command->add_flag("--json", output.json, "Print one JSON object a line instead of text");
    command->add_flag("--utc", output.utc, "Print times in UTC instead of the local time zone");
    command->add_option("--color", given->color, "Whether the text is coloured; auto: on a terminal")
        ->type_name("WHEN")
        ->check(CLI::IsMember({"auto", "always", "never"}));
    output.selected = add_selection_options(*command);
    command->add_option("FILE", given->name, "A trace file, or a trace by its name, for its pages")->required();
    command->callback([given, &status] {
        follow_output_options &chosen = given->how.output;
        if (given->from_start) chosen.last.reset();
        chosen.colored = wants_color(given->color);
        status = follow(given->name, given->how);
    });
}

} // namespace qn::dump
