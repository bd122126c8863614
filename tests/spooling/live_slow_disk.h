// Slow writing: every write() of a spooled page takes its time, and takes only a part of what it is given.
#pragma once

namespace qn::test
{
// From here on, until the object ends.
class slow_disk
{
public:
    slow_disk();
    slow_disk(const slow_disk &) = delete;
    slow_disk &operator=(const slow_disk &) = delete;
    ~slow_disk();
};
} // namespace qn::test
