// How often the times of a file's records step back: a clock that was set, or counters that do not agree.
#pragma once

#include <cstdint>
#include <ctime>
#include <optional>
#include <string>

namespace qn::dump
{

class clock_steps
{
public:
    // Called with the time of each record that has one, in the order of the ring.
    void pass(const timespec &time);
    bool any() const { return count_ != 0; }
    // What any() asks for, in words.
    std::string text() const;

private:
    std::optional<timespec> last_;
    std::uint64_t count_ = 0;
    std::int64_t longest_ns_ = 0;
};

} // namespace qn::dump
