// One text made twice: by the library's own function and by vsnprintf(), which it is to agree with.
#pragma once

#include <cstdarg>

namespace qn::test
{
// Makes the text in buffers of every size from 0 to well beyond it, and compares all there is to compare: the text up to
// its terminator, the bytes behind the buffer, the result, errno. The arguments are what the format takes, of any type.
void expect_as_vsnprintf(const char *format, ...);
} // namespace qn::test
