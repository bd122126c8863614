#include "tools/qntrace/follow/follow.h"

#include <algorithm>

#include <fmt/format.h>

#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"
#include "tools/qntrace/follow/follow_wait.h"
#include "tools/qntrace/format/durations.h"

namespace qn::dump
{
namespace
{

using namespace std::chrono_literals;

void follow_until_told_to_end(trace_follower &trace, follow_output &output, const follow_options &options)
{
    follow_wait wait(options.interval);
    bool caught_up = false;
    bool writer_has_ended = false;
    for (;;) {
        if (trace.advance()) {
            wait.reset();
            if (!wait.may_go_on()) return;
        } else if (caught_up && writer_has_ended) {
            return;
        } else {
            flush_data();
            // What it has written up to its end is read before the following ends.
            writer_has_ended = options.until_exit && trace.has_file() && !trace.is_being_written();
            if (writer_has_ended)
                trace.look_at_all();
            else if (!wait.wait())
                return;
        }
        if (!caught_up && trace.caught_up()) {
            caught_up = true;
            output.caught_up();
        }
    }
}

} // namespace

void add_follow_options(CLI::App &command, follow_options &options)
{
    command.add_flag("--until-exit", options.until_exit,
                     "End when the process that writes the trace has ended, or has stopped tracing");
    const auto take_interval = [&options](const std::string &text) {
        const auto interval = parse_duration(text);
        if (!interval || *interval <= 0) throw CLI::ValidationError("--interval", "expected a duration, like 20ms");
        options.interval = std::chrono::nanoseconds(*interval);
    };
    command
        .add_option_function<std::string>("--interval", take_interval,
                                          "Look for new records at least this often while none come; 100ms unless said")
        ->type_name("DURATION");
    command.add_flag("--coordinate", options.coordinate,
                     "Make the writers of a single file wait, for at most 2 s, before they overwrite what was not\n"
                     "read yet; writes to the file");
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
    }
    flush_data();
    return output.status();
}

} // namespace qn::dump
