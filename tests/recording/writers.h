// Every record writer of the public header, each with a call and what that call writes.
#pragma once

#include <cstdarg>
#include <functional>
#include <ostream>
#include <string>
#include <vector>

#include <qn_tr.h>

#include "recording/expected_bytes.h"

namespace qn::test
{
struct writer_call {
    const char *name;  // of the exported function
    uint16_t function; // the kind of its record
    bool takes_token;
    std::function<qn_int32_t(const char *component, tr_file_token_t token)> write;
    expected_bytes body; // what it writes behind the record header
};

inline std::ostream &operator<<(std::ostream &out, const writer_call &writer) { return out << writer.name; }

const std::vector<writer_call> &all_writers();

// An error with every part set that an error record holds, and no arguments. Not to be released.
cu_error_t *sample_error();

// Calls call(va_list) with what follows `unused`.
template <class Call>
qn_int32_t with_list(Call call, int unused, ...)
{
    va_list args;
    va_start(args, unused);
    const qn_int32_t status = call(args);
    va_end(args);
    return status;
}
} // namespace qn::test
