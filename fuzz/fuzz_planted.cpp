// Not a target: ends at inputs that begin with "BUG". run.sh has it found first, which shows that it would find one.
#include <cstring>

#include "fuzz/fuzz_input.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    qn::fuzz::require(size < 3 || std::memcmp(data, "BUG", 3) != 0, "the planted bug", "BUG");
    return 0;
}
