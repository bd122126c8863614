#include "tools/qntrace/console/progress.h"

#include <algorithm>

#include <fmt/format.h>
#include <unistd.h>

#include "tools/qntrace/console/output.h"

namespace qn::dump
{
namespace
{

constexpr auto interval = std::chrono::milliseconds(200);
constexpr std::uint64_t records_between_looks_at_the_clock = 4096;

} // namespace

progress_line::progress_line(std::uint64_t total_bytes, bool data_to_stdout)
    : total_bytes_(std::max<std::uint64_t>(total_bytes, 1)),
      enabled_(isatty(STDERR_FILENO) == 1 && !(data_to_stdout && isatty(STDOUT_FILENO) == 1)),
      due_(std::chrono::steady_clock::now() + interval)
{
}

void progress_line::show(std::uint64_t records, std::uint64_t bytes_done)
{
    if (!enabled_ || records % records_between_looks_at_the_clock != 0) return;
    const auto now = std::chrono::steady_clock::now();
    if (now < due_) return;
    due_ = now + interval;
    shown_ = true;
    const std::uint64_t done = std::min(bytes_done, total_bytes_);
    const auto percent = static_cast<unsigned>(100.0 * static_cast<double>(done) / static_cast<double>(total_bytes_));
    write_error_text(fmt::format("\r\x1b[K{:3}%  {} records", percent, records));
}

void progress_line::clear()
{
    if (shown_) write_error_text("\r\x1b[K");
    shown_ = false;
}

} // namespace qn::dump
