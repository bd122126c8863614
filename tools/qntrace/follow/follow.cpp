#include "tools/qntrace/follow/follow.h"

#include <fmt/format.h>

#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"
#include "tools/qntrace/follow/follow_wait.h"
#include "tools/qntrace/format/durations.h"

namespace qn::dump
{
namespace
{

void follow_until_told_to_end(trace_follower &trace, follow_output &output, const follow_options &options)
{
    follow_wait wait(options.interval);
    bool caught_up = false;
    bool writer_has_ended = false;
    for (;;) {
        const bool some = writer_has_ended ? trace.advance_to_the_end() : trace.advance();
        if (!caught_up && trace.caught_up()) {
            caught_up = true;
            output.caught_up();
        }
        if (some) {
            wait.reset();
            if (!wait.may_go_on()) return;
            continue;
        }
        flush_data();
        if (writer_has_ended) return;
        // What it has written up to its end is read before the following ends.
        writer_has_ended = options.until_exit && !trace.is_being_written();
        if (!writer_has_ended && !wait.wait()) return;
    }
}

} // namespace

void add_follow_options(CLI::App &command, follow_options &options, CLI::Option *follows)
{
    const auto take_interval = [&options](const std::string &text) {
        const auto interval = parse_duration(text);
        if (!interval || *interval <= 0) throw CLI::ValidationError("--interval", "expected a duration, like 20ms");
        options.interval = std::chrono::nanoseconds(*interval);
    };
    const auto added = {
        command.add_flag("--until-exit", options.until_exit,
                         "End when the process that writes the trace has ended, or has stopped tracing"),
        command
            .add_option_function<std::string>(
                "--interval", take_interval,
                "Look for new records at least this often while none come; 100ms unless said")
            ->type_name("DURATION"),
        command.add_flag("--coordinate", options.coordinate,
                         "Make the writers of a single file wait, for at most 2 s, before they overwrite what was not\n"
                         "read yet; writes to the file"),
    };
    for (auto *option : added) {
        if (follows == nullptr) continue;
        option->needs(follows)->group("Following");
        follows->group("Following");
    }
}

int follow(const std::string &name, const follow_options &options)
{
    follow_output output(options.output);
    try {
        trace_follower trace(name, options.coordinate, output);
        follow_until_told_to_end(trace, output, options);
        trace.finish();
    } catch (const reader::io_error &error) {
        write_message(fmt::format("{}: {}", printable_name(name), error.what()));
        return status_io_error;
    } catch (const not_a_trace &error) {
        write_message(fmt::format("{}: {}", printable_name(name), error.what()));
        return status_damaged;
    }
    flush_data();
    return output.status();
}

} // namespace qn::dump
