// Which records a command is asked for: the options for it, which several commands share, and the answer for a record.
#pragma once

#include <bitset>
#include <cstdint>
#include <ctime>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

#include <CLI/CLI.hpp>

#include "tools/qntrace/reader/reader.h"
#include "tools/qntrace/select/pattern.h"
#include "tools/qntrace/select/record.h"
#include "tools/qntrace/select/where.h"

namespace qn::dump
{

// Selects every record until it is told otherwise. Each kind of condition must hold; of the values given for one, any.
class selection
{
public:
    bool admits(const trace_origin &origin, const reader::trace_record &record) const;
    // Whether it was told nothing, so that records need not be decoded to be admitted.
    bool admits_all() const;

    // All throw std::invalid_argument for text that is not what they take; what() says what was expected.
    void add_component(std::string_view name);
    void add_kind(std::string_view name);
    void add_thread(std::string_view number);
    void add_ids(std::string_view number_or_range);
    // Both are included. What is relative counts from `now`.
    void set_since(std::string_view time, const timespec &now);
    void set_until(std::string_view time, const timespec &now);
    void set_grep(const std::string &expression);
    void set_where(std::string_view expression, const timespec &now);

private:
    struct id_range {
        std::uint32_t first, last;
    };

    bool admits_header(const reader::trace_record &record) const;
    bool admits_id(const reader::record_body &body) const;
    bool admits_time(const std::optional<timespec> &time) const;

    std::vector<std::string> components_;
    std::bitset<std::variant_size_v<reader::record_body>> kinds_;
    std::vector<std::uint32_t> threads_;
    std::vector<id_range> ids_;
    std::optional<timespec> since_;
    std::optional<timespec> until_;
    std::optional<pattern> grep_;
    std::optional<where_expression> where_;
};

// Adds --comp, --kind, --thread, --id, --since, --until, --grep and --where to a command. The result holds what they
// say once the command line is parsed.
std::shared_ptr<const selection> add_selection_options(CLI::App &command);

} // namespace qn::dump
