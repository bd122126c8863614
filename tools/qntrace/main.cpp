// qntrace: reads what the tracing library has written.
//
// Data goes to standard output, everything else to standard error. Exit status: 0 all sound, 1 some file is damaged
// (what is sound was shown), 2 wrong usage, 3 a file cannot be read or the output not be written.
#include <clocale>
#include <csignal>
#include <exception>
#include <sstream>
#include <stdexcept>

#include <fmt/format.h>

#include "tools/qntrace/commands.h"
#include "tools/qntrace/console/output.h"

namespace
{

int run(int argc, char **argv)
{
    int status = qn::dump::status_sound;
    CLI::App app("Reads the trace files of libqn_tr.", "qntrace");
    app.set_version_flag("--version", "qntrace " QNTRACE_VERSION, "Print the version and exit");
    app.require_subcommand(1);
    app.footer("Exit status: 0 all sound, 1 some file is damaged or faulty (what is sound is shown),\n"
               "2 wrong usage, 3 a file cannot be read.");
    qn::dump::add_check_command(app, status);
    qn::dump::add_dump_command(app, status);
    qn::dump::add_errors_command(app, status);
    qn::dump::add_export_command(app, status);
    qn::dump::add_follow_command(app, status);
    qn::dump::add_info_command(app, status);
    qn::dump::add_merge_command(app, status);
    qn::dump::add_salvage_command(app, status);
    qn::dump::add_report_command(app, status);
    qn::dump::add_stats_command(app, status);
    qn::dump::add_spool_command(app, status);
    qn::dump::add_config_command(app, status);
    qn::dump::add_completion_command(app, status);
    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError &error) {
        std::ostringstream data;
        std::ostringstream messages;
        const bool asked_for = app.exit(error, data, messages) == 0;
        qn::dump::write_data(data.str());
        qn::dump::flush_data();
        qn::dump::write_error_text(messages.str());
        return asked_for ? qn::dump::status_sound : qn::dump::status_usage;
    } catch (const std::invalid_argument &error) { // arguments that a command cannot do anything with
        qn::dump::write_message(error.what());
        return qn::dump::status_usage;
    }
    return status;
}

} // namespace

int main(int argc, char **argv)
{
    // A reader that has seen enough (head, a pager) ends this program quietly, whatever its parent ignores.
    std::signal(SIGPIPE, SIG_DFL);
    std::setlocale(LC_CTYPE, "");
    std::setlocale(LC_MESSAGES, ""); // whose message catalogues are taken
    qn::dump::occupy_standard_descriptors();
    try {
        return run(argc, argv);
    } catch (const std::exception &error) {
        // Not through write_message(), which would write the data first that may be what has failed.
        qn::dump::write_error_text(fmt::format("qntrace: {}\n", error.what()));
        return qn::dump::status_io_error;
    }
}
