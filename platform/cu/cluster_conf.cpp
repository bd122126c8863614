// The text of cluster.conf: "key = value" lines, what is malformed is passed over. Pure functions, no state.
#include "platform/cu/cluster_conf.h"

#include <algorithm>
#include <charconv>
#include <span>

namespace qn::cu
{
namespace
{
constexpr std::string_view blanks = " \t\r\f\v";

std::string_view trimmed(std::string_view text)
{
    const size_t first = text.find_first_not_of(blanks);
    if (first == std::string_view::npos) return {};
    return text.substr(first, text.find_last_not_of(blanks) - first + 1);
}

// Nothing but the whole of `digits` counts as the number.
template <typename number_type>
std::optional<number_type> parse_number(std::string_view digits, int base)
{
    number_type number = 0;
    const char *const end = digits.data() + digits.size();
    const auto [stopped, error] = std::from_chars(digits.data(), end, number, base);
    if (error != std::errc{} || stopped != end) return std::nullopt;
    return number;
}

// A number of 1 to 16 hexadecimal digits, with or without "0x".
std::optional<qn_uint64_t> parse_hexadecimal(std::string_view digits)
{
    if (digits.starts_with("0x") || digits.starts_with("0X")) digits.remove_prefix(2);
    return digits.size() <= 16 ? parse_number<qn_uint64_t>(digits, 16) : std::nullopt;
}

void store_text(std::string_view value, std::span<char> field)
{
    value = value.substr(0, value.find('\0')).substr(0, field.size() - 1);
    std::fill(std::copy(value.begin(), value.end(), field.begin()), field.end(), '\0');
}

void store(std::string_view key, std::string_view value, cluster_conf &conf)
{
    if (key == "cluster_name") {
        store_text(value, conf.info.cu_cluster_name);
    } else if (key == "cluster_id") {
        store_text(value, conf.info.cu_cluster_ID);
    } else if (key == "node_number") {
        conf.info.cu_node_number = parse_number<qn_int32_t>(value, 10).value_or(conf.info.cu_node_number);
    } else if (key == "node_id") {
        if (const auto id = parse_hexadecimal(value)) conf.node_id = id;
    }
}
} // namespace

cluster_conf parse_cluster_conf(std::string_view text)
{
    cluster_conf conf;
    while (!text.empty()) {
        const size_t end = std::min(text.find('\n'), text.size());
        std::string_view line = text.substr(0, end);
        text.remove_prefix(std::min(end + 1, text.size()));
        line = line.substr(0, line.find('#'));
        const size_t equals = line.find('=');
        if (equals == std::string_view::npos) continue;
        store(trimmed(line.substr(0, equals)), trimmed(line.substr(equals + 1)), conf);
    }
    return conf;
}
} // namespace qn::cu
