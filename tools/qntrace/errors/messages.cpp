#include "tools/qntrace/errors/messages.h"

#include <climits>

#include <fmt/format.h>

#include "tools/qntrace/reader/message.h"

namespace qn::dump
{
namespace
{

constexpr std::size_t most_open = 64;

const auto no_catalogue = reinterpret_cast<nl_catd>(-1);

bool is_plain_name(const std::string &name)
{
    return !name.empty() && name.size() <= NAME_MAX && name.find('/') == std::string::npos;
}

// Nothing for what is no more than newlines.
std::optional<error_message> message_with(std::string text, error_message::origin from)
{
    text.erase(text.find_last_not_of('\n') + 1);
    if (text.empty()) return std::nullopt;
    return error_message{std::move(text), from};
}

std::optional<error_message> catalogue_message(const reader::error_body &error, message_catalogues &catalogues)
{
    if (!error.catalogue) return std::nullopt;
    const char *text = catalogues.text(std::string(*error.catalogue), error.message_set, error.message_number);
    if (text == nullptr) return std::nullopt;
    // Where it has other conversions, it is the catalogue of another version.
    auto filled = reader::fill_in_whole(text, error.arguments);
    return filled ? message_with(*std::move(filled), error_message::origin::catalogue) : std::nullopt;
}

std::string ids_text(const reader::error_body &error)
{
    const auto in = error.catalogue ? fmt::format(" of {}", *error.catalogue) : std::string();
    return fmt::format("error {}, message {} in set {}{}", error.error_id, error.message_number, error.message_set, in);
}

} // namespace

const char *message_catalogues::text(const std::string &catalogue, std::uint32_t set, std::uint32_t number)
{
    const auto possible = [](std::uint32_t value) { return value > 0 && value < INT_MAX; };
    if (!possible(set) || !possible(number)) return nullptr;
    const nl_catd opened = open(catalogue);
    if (opened == no_catalogue) return nullptr;
    return catgets(opened, static_cast<int>(set), static_cast<int>(number), nullptr);
}

nl_catd message_catalogues::open(const std::string &catalogue)
{
    if (!is_plain_name(catalogue)) return no_catalogue;
    const auto known = opened_.find(catalogue);
    if (known != opened_.end()) return known->second;
    if (opened_.size() == most_open) close();
    return opened_.emplace(catalogue, catopen(catalogue.c_str(), NL_CAT_LOCALE)).first->second;
}

void message_catalogues::close()
{
    for (const auto &[name, catalogue] : opened_)
        if (catalogue != no_catalogue) catclose(catalogue);
    opened_.clear();
}

error_message message_of(const reader::error_body &error, message_catalogues &catalogues)
{
    if (auto message = catalogue_message(error, catalogues)) return *std::move(message);
    if (error.default_message) {
        auto message =
            message_with(reader::fill_in(*error.default_message, error.arguments), error_message::origin::default_text);
        if (message) return *std::move(message);
    }
    return {ids_text(error), error_message::origin::ids};
}

} // namespace qn::dump
