// System calls on files that fail, or answer, as a test says. A program linked with this file needs the linker's --wrap
// for open, fstat, fstatfs and mmap; what is not told otherwise is passed on.
#pragma once

#include <vector>

namespace qn::test
{
// The next calls of open() fail, one with each of these errno values.
void fail_opens(const std::vector<int> &errors);
int opens_made(); // since the program started

void fail_fstat(int result, int with_errno); // every call from now on
void fail_fstatfs(int with_errno);
void answer_fstatfs_with_type(long type);
void fail_mmap(int with_errno);
} // namespace qn::test
