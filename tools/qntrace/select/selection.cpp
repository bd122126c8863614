#include "tools/qntrace/select/selection.h"

#include <algorithm>
#include <functional>
#include <limits>
#include <stdexcept>
#include <tuple>

#include <fmt/format.h>

#include "tools/qntrace/select/number.h"
#include "tools/qntrace/select/time.h"

namespace qn::dump
{
namespace
{

bool is_before(const timespec &left, const timespec &right)
{
    return std::tie(left.tv_sec, left.tv_nsec) < std::tie(right.tv_sec, right.tv_nsec);
}

template <typename T>
bool contains(const std::vector<T> &values, const T &value)
{
    return std::find(values.begin(), values.end(), value) != values.end();
}

std::optional<std::uint32_t> number_of_32_bits(std::string_view text)
{
    const auto number = parse_number(text);
    if (!number || *number > std::numeric_limits<std::uint32_t>::max()) return std::nullopt;
    return static_cast<std::uint32_t>(*number);
}

} // namespace

void selection::add_component(std::string_view name) { components_.emplace_back(without_trailing_blanks(name)); }

void selection::add_kind(std::string_view name)
{
    const auto &names = kind_names();
    const auto found = std::find(names.begin(), names.end(), name);
    if (found == names.end()) {
        throw std::invalid_argument(fmt::format("{} is no kind; there are {}", name, kind_list()));
    }
    kinds_.set(static_cast<std::size_t>(found - names.begin()));
}

void selection::add_thread(std::string_view number)
{
    const auto thread = number_of_32_bits(number);
    if (!thread) throw std::invalid_argument("expected a number of at most 32 bits, decimal or hexadecimal behind 0x");
    threads_.push_back(*thread);
}

void selection::add_ids(std::string_view number_or_range)
{
    const auto dash = number_or_range.find('-');
    const auto first = number_of_32_bits(number_or_range.substr(0, dash));
    const auto last = dash == std::string_view::npos ? first : number_of_32_bits(number_or_range.substr(dash + 1));
    if (!first || !last || *last < *first) {
        throw std::invalid_argument(
            "expected a number N, or a range N-M that goes up, of at most 32 bits, decimal or hexadecimal behind 0x");
    }
    ids_.push_back({*first, *last});
}

void selection::set_since(std::string_view time, const timespec &now) { since_ = parse_time(time, now); }
void selection::set_until(std::string_view time, const timespec &now) { until_ = parse_time(time, now); }
void selection::set_grep(const std::string &expression) { grep_.emplace(expression); }
void selection::set_where(std::string_view expression, const timespec &now) { where_.emplace(expression, now); }

// What costs least is asked first.
bool selection::admits_all() const
{
    return components_.empty() && kinds_.none() && threads_.empty() && ids_.empty() && !since_ && !until_ && !grep_ &&
           !where_;
}

bool selection::admits(const trace_origin &origin, const reader::trace_record &record) const
{
    if (!admits_header(record) || !admits_id(record.body) || !admits_time(record.time)) return false;
    if (where_ && !where_->holds(origin, record)) return false;
    return !grep_ || any_text(record.body, [this](std::string_view text) { return grep_->found_in(text); });
}

bool selection::admits_header(const reader::trace_record &record) const
{
    if (kinds_.any() && !kinds_[record.body.index()]) return false;
    if (!threads_.empty()) {
        const auto thread = thread_of(record);
        if (!thread || !contains(threads_, *thread)) return false;
    }
    if (components_.empty()) return true;
    const auto component = component_of(record);
    return component && std::find(components_.begin(), components_.end(), *component) != components_.end();
}

bool selection::admits_id(const reader::record_body &body) const
{
    if (ids_.empty()) return true;
    const auto id = id_of(body);
    return id && std::any_of(ids_.begin(), ids_.end(),
                             [&](const id_range &range) { return *id >= range.first && *id <= range.last; });
}

bool selection::admits_time(const std::optional<timespec> &time) const
{
    if (!since_ && !until_) return true;
    return time && !(since_ && is_before(*time, *since_)) && !(until_ && is_before(*until_, *time));
}

namespace
{

using values = std::vector<std::string>;

// Adds an option whose values go to `take`, which may throw std::invalid_argument.
void add_option(CLI::App &command, const std::string &name, const std::string &value, const std::string &description,
                bool many, const std::function<void(const std::string &)> &take)
{
    const auto take_all = [name, take](const values &given) {
        for (const auto &one : given) {
            try {
                take(one);
            } catch (const std::invalid_argument &error) {
                throw CLI::ValidationError(name, error.what());
            }
        }
    };
    auto *option = command.add_option_function<values>(name, take_all, description)->type_name(value);
    option->group("Selection");
    option->allow_extra_args(false); // what follows the value is a file
    if (many) {
        option->delimiter(',');
    } else {
        option->expected(1);
    }
}

} // namespace

std::shared_ptr<const selection> add_selection_options(CLI::App &command)
{
    const auto chosen = std::make_shared<selection>();
    timespec now = {};
    clock_gettime(CLOCK_REALTIME, &now);
    const auto several = [&](const char *name, const char *value, const char *description, auto take) {
        add_option(command, name, value, description, true,
                   [chosen, take](const auto &text) { (*chosen.*take)(text); });
    };
    several("--comp", "NAME", "Only records of these components", &selection::add_component);
    several("--kind", "NAME", "Only records of these kinds, as the column KIND has them", &selection::add_kind);
    several("--thread", "ID", "Only records of these threads", &selection::add_thread);
    several("--id", "N|N-M", "Only records with these ids", &selection::add_ids);
    const auto once = [&](const char *name, const char *value, const char *description, const auto &take) {
        add_option(command, name, value, description, false, take);
    };
    once("--since", "TIME", "Only records of this time and later: 2026-11-21T05:12:01Z, @SECONDS or -10min",
         [chosen, now](const auto &time) { chosen->set_since(time, now); });
    once("--until", "TIME", "Only records of this time and earlier",
         [chosen, now](const auto &time) { chosen->set_until(time, now); });
    once("--grep", "REGEX", "Only records in whose text this extended regular expression is found",
         [chosen](const auto &expression) { chosen->set_grep(expression); });
    once("--where", "EXPR", R"(Only records for which this holds: 'comp == "IDX" && id >= 100'; see qntrace(1))",
         [chosen, now](const auto &expression) { chosen->set_where(expression, now); });
    return chosen;
}

} // namespace qn::dump
