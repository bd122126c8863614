#include "tools/qntrace/reader/time_base.h"

namespace qn::reader
{

void current_time_base::pass(const record_body &body)
{
    if (const auto *start = std::get_if<start_body>(&body)) use(start->time_info);
    if (const auto *restart = std::get_if<restart_body>(&body)) use(restart->start.time_info);
    if (const auto *calibration = std::get_if<calibration_body>(&body)) use(calibration->time_info);
}

// A base without a tick rate can only be damage; the one before it is the better guess.
void current_time_base::use(const cu_timeinfo_t &info)
{
    if (info.timeinfo1 != 0) info_ = info;
}

std::optional<timespec> current_time_base::time_of(std::uint64_t counter) const
{
    timespec time = {};
    if (info_.timeinfo1 == 0 || cu_ctr_to_time_1(&info_, counter, &time) != 0) return std::nullopt;
    return time;
}

} // namespace qn::reader
