// From counter values to wall-clock time.
//
// A file may be written by several processes, before and after a reboot, so it holds several time bases: the header's
// holds for the oldest records, then that of each start, restart or calibration record from that record on.
#pragma once

#include <cstdint>
#include <ctime>
#include <optional>

#include <qn_cu.h>

#include "tools/qntrace/reader/decode.h"

namespace qn::reader
{

class current_time_base
{
public:
    explicit current_time_base(const cu_timeinfo_t &info) : info_(info) {}

    // Called with each record, in order, before its own time is asked for.
    void pass(const record_body &body);
    // Nothing when the base in force is unusable.
    std::optional<timespec> time_of(std::uint64_t counter) const;
    // The base in force.
    const cu_timeinfo_t &info() const { return info_; }

private:
    void use(const cu_timeinfo_t &info);

    cu_timeinfo_t info_;
};

} // namespace qn::reader
