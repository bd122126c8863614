// What the reading core has to say about a file beside its records.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>

namespace qn::reader
{

struct finding {
    enum class severity {
        note,   // worth telling, and no fault of the file
        loss,   // a record was not completed: its writer is at work, or died; the file is as it should be
        damage, // the file is truncated, torn or corrupt; what was sound is still delivered
    };

    severity level = severity::damage;
    std::optional<std::uint64_t> offset; // in the file; absent when it concerns the file as a whole
    std::string text;                    // a clause without its full stop; holds no bytes of the file
    std::optional<std::uint32_t> seq;    // of the record that it concerns, as far as there is one
};

// Called as soon as something is found, that is before the next record is delivered.
using finding_sink = std::function<void(const finding &)>;

} // namespace qn::reader
