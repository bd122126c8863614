// Error records that belong together, counted.
//
// Those with the same message do: catalogue, set and number, error id and unformatted text; the arguments may differ.
// Errors can be put together by the node or the component that they come from instead.
#pragma once

#include <cstdint>
#include <ctime>
#include <map>
#include <optional>
#include <string>
#include <unordered_map>
#include <vector>

#include "tools/qntrace/errors/messages.h"
#include "tools/qntrace/reader/reader.h"
#include "tools/qntrace/traces/trace_set.h"

namespace qn::dump
{

// One error record, kept beyond its reading.
struct error_event {
    std::size_t source = 0; // index
    std::optional<timespec> time;
    std::string component;
    std::uint32_t thread = 0;
    std::uint32_t seq = 0;
    std::uint32_t error_id = 0;
    error_message message;
    std::optional<std::string> catalogue;
    std::uint32_t message_set = 0;
    std::uint32_t message_number = 0;
    std::optional<std::string> default_message; // unformatted
    std::optional<std::string> file;            // of the source code
    std::optional<std::string> function;
    std::uint32_t line = 0;
    std::optional<std::string> ffdc_id;
};

error_event event_of(std::size_t source, const reader::trace_record &record, const reader::error_body &error,
                     message_catalogues &catalogues);

enum class error_grouping { message, node, component };
enum class error_order { count, last };

struct error_group {
    std::uint64_t count = 0;
    std::optional<timespec> first; // of those that have a time
    std::optional<timespec> last;
    std::map<std::string, std::uint64_t> nodes; // how many come from each
    error_event latest;
};

class error_groups
{
public:
    static constexpr std::size_t most_groups = 10'000;
    // Of each text of a group; what is longer is cut, and says so.
    static constexpr std::size_t longest_text = 4096;

    // The sources must outlive it.
    error_groups(const std::vector<trace_source> &sources, error_grouping by) : by_(by), sources_(sources) {}

    void add(error_event event);

    std::uint64_t errors() const { return errors_; }
    std::size_t size() const { return groups_.size(); }
    // Errors that came when there was no more room for their group.
    std::uint64_t without_group() const { return without_group_; }
    // The largest or the latest first; all of them for `most` 0.
    std::vector<const error_group *> sorted(error_order order, std::size_t most) const;

private:
    std::string key_of(const error_event &event) const;

    error_grouping by_;
    const std::vector<trace_source> &sources_;
    std::unordered_map<std::string, error_group> groups_;
    std::uint64_t errors_ = 0;
    std::uint64_t without_group_ = 0;
};

} // namespace qn::dump
