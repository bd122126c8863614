#include "tools/qntrace/report/page.h"

#include <array>
#include <functional>
#include <stdexcept>

#include <fmt/format.h>

#include "tools/qntrace/format/escape.h"

namespace qn::dump
{
namespace
{

std::uint32_t nibble(char digit) { return static_cast<std::uint32_t>(digit <= '9' ? digit - '0' : digit - 'a' + 10); }

std::string base64_of(std::string_view hexadecimal)
{
    static constexpr std::string_view digits = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    std::string out;
    // Three nibbles are two digits. Those of a SHA-256 end with one nibble: four bits, and two zeros behind them.
    std::size_t at = 0;
    for (; at + 3 <= hexadecimal.size(); at += 3) {
        const std::uint32_t bits =
            nibble(hexadecimal[at]) << 8 | nibble(hexadecimal[at + 1]) << 4 | nibble(hexadecimal[at + 2]);
        out += digits[bits >> 6];
        out += digits[bits & 63];
    }
    out += digits[nibble(hexadecimal[at]) << 2];
    out += '=';
    return out;
}

std::string html_text(std::string_view text)
{
    std::string out;
    std::string printable;
    append_escaped(printable, text, charset::utf_8);
    for (const char c : printable) {
        switch (c) {
        case '<': out += "&lt;"; break;
        case '&': out += "&amp;"; break;
        default: out += c;
        }
    }
    return out;
}

// A place in the page, and what is written there.
struct place {
    std::string_view name;
    std::function<void()> fill;
};

} // namespace

void write_page(const page_assets &assets, const report_data &data, const page_options &options, const text_sink &write)
{
    const std::array<place, 6> places = {{
        {"@TITLE@", [&] { write(html_text(options.title)); }},
        {"@STYLE_HASH@", [&] { write("sha256-" + base64_of(assets.style_sha256)); }},
        {"@SCRIPT_HASH@", [&] { write("sha256-" + base64_of(assets.script_sha256)); }},
        {"@STYLE@", [&] { write(assets.style); }},
        {"@SCRIPT@", [&] { write(assets.script); }},
        {"@DATA@", [&] { write_page_json(data, options, write); }},
    }};
    std::string_view rest = assets.page;
    while (!rest.empty()) {
        const place *next = nullptr;
        std::size_t at = rest.size();
        for (const place &each : places) {
            const auto found = rest.find(each.name);
            if (found >= at) continue;
            at = found;
            next = &each;
        }
        write(rest.substr(0, at));
        if (next == nullptr) return;
        next->fill();
        rest.remove_prefix(at + next->name.size());
    }
}

} // namespace qn::dump
