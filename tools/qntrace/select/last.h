// The newest records of a reading, kept beyond it: copies of their bytes, as many as are asked for and no more.
#pragma once

#include <cstddef>
#include <ctime>
#include <optional>
#include <vector>

#include "tools/qntrace/reader/reader.h"

namespace qn::dump
{

class last_records
{
public:
    explicit last_records(std::size_t most) : most_(most) {}

    void keep(const reader::trace_record &record);

    // Calls `take` with each of them, oldest first.
    template <typename Take>
    void for_each(const Take &take) const
    {
        for (std::size_t i = 0; i < kept_.size(); ++i) {
            take(kept_[(oldest_ + i) % kept_.size()].restored());
        }
    }

private:
    struct copy {
        reader::raw_record raw; // its bytes stand below
        std::vector<std::byte> bytes;
        std::optional<timespec> time;

        reader::trace_record restored() const;
    };

    // Uses the room again that the record before had.
    static void assign(copy &place, const reader::trace_record &record);

    std::size_t most_;
    std::vector<copy> kept_; // a ring once there are `most_`
    std::size_t oldest_ = 0;
};

} // namespace qn::dump
