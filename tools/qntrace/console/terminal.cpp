#include "tools/qntrace/console/terminal.h"

#include <cstdlib>

#include <sys/ioctl.h>
#include <unistd.h>

namespace qn::dump
{
namespace
{

bool is_set(const char *variable)
{
    const char *value = std::getenv(variable);
    return value != nullptr && *value != '\0';
}

} // namespace

std::size_t output_columns()
{
    winsize size = {};
    return ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) == 0 ? size.ws_col : 0;
}

bool is_dumb_terminal()
{
    const char *terminal = std::getenv("TERM");
    return terminal != nullptr && std::string_view(terminal) == "dumb";
}

bool wants_color(std::string_view choice)
{
    if (choice != "auto") return choice == "always";
    return !is_set("NO_COLOR") && !is_dumb_terminal() && isatty(STDOUT_FILENO) != 0;
}

} // namespace qn::dump
