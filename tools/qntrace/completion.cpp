// qntrace completion: a script by which a shell completes the commands and options of qntrace, made from the tables
// that the command line is parsed by.
#include <string>
#include <string_view>
#include <vector>

#include <fmt/format.h>

#include "tools/qntrace/commands.h"
#include "tools/qntrace/console/output.h"

namespace qn::dump
{
namespace
{

// What does not depend on the tables. A word "--option=value" comes as three: "=" breaks words.
constexpr std::string_view bash_function = R"bash(_qntrace() {
    local current=${COMP_WORDS[COMP_CWORD]} before=${COMP_WORDS[COMP_CWORD - 1]} command='' word
    if [ "$current" = '=' ]; then
        current=''
    elif [ "$before" = '=' ]; then
        before=${COMP_WORDS[COMP_CWORD - 2]}
    fi
    for word in "${COMP_WORDS[@]:1:COMP_CWORD - 1}"; do
        if [ -n "$word" ] && [ -n "$(_qntrace_words "$word")" ]; then
            command=$word
            break
        fi
    done
    local words=$(_qntrace_values "$command $before")
    if [ -z "$words" ] && { [ -z "$command" ] || [ "${current:0:1}" = '-' ]; }; then
        words=$(_qntrace_words "$command")
    fi
    COMPREPLY=($(compgen -W "$words" -- "$current"))
}
# Where there is nothing to offer, bash completes the names of files.
complete -o default -F _qntrace qntrace
)bash";

std::vector<std::string> option_names(const CLI::App &command)
{
    std::vector<std::string> names;
    for (const CLI::Option *option : command.get_options()) {
        for (const auto &name : option->get_snames()) names.push_back("-" + name);
        for (const auto &name : option->get_lnames()) names.push_back("--" + name);
    }
    return names;
}

// The words that an option takes, separated by blanks. They stand in its type's name: WHEN:{auto,always,never}.
std::string values_of(const CLI::Option &option)
{
    const auto type = option.get_type_name();
    const auto begin = type.find('{'), end = type.find('}');
    if (begin == std::string::npos || end == std::string::npos) return {};
    auto values = type.substr(begin + 1, end - begin - 1);
    for (char &c : values)
        if (c == ',') c = ' ';
    return values;
}

std::vector<const CLI::App *> subcommands(const CLI::App &app)
{
    return app.get_subcommands([](const CLI::App *command) { return !command->get_name().empty(); });
}

std::string bash_script(const CLI::App &app)
{
    std::vector<std::string> names;
    for (const CLI::App *command : subcommands(app)) names.push_back(command->get_name());
    const auto own_options = option_names(app);
    names.insert(names.end(), own_options.begin(), own_options.end());

    std::string out = "# Completes the commands and options of qntrace in bash; made by qntrace completion bash.\n";
    out += "_qntrace_words() {\n    case $1 in\n";
    out += fmt::format("    '') echo '{}' ;;\n", fmt::join(names, " "));
    for (const CLI::App *command : subcommands(app))
        out += fmt::format("    {}) echo '{}' ;;\n", command->get_name(), fmt::join(option_names(*command), " "));
    out += "    esac\n}\n_qntrace_values() {\n    case $1 in\n";
    for (const CLI::App *command : subcommands(app)) {
        for (const CLI::Option *option : command->get_options()) {
            const auto values = values_of(*option);
            if (values.empty()) continue;
            for (const auto &long_name : option->get_lnames())
                out += fmt::format("    '{} --{}') echo '{}' ;;\n", command->get_name(), long_name, values);
            if (option->get_positional())
                out += fmt::format("    '{0} {0}') echo '{1}' ;;\n", command->get_name(), values);
        }
    }
    out += "    esac\n}\n";
    out += bash_function;
    return out;
}

} // namespace

void add_completion_command(CLI::App &app, int &status)
{
    auto *command = app.add_subcommand("completion", "Print the script by which a shell completes command lines");
    command->add_option("SHELL", "The shell: bash")->required()->check(CLI::IsMember({"bash"}));
    command->callback([&app, &status] {
        write_data(bash_script(app));
        flush_data();
        status = status_sound;
    });
}

} // namespace qn::dump
