#include "tools/qntrace/console/findings.h"

#include <fmt/format.h>

#include "tools/qntrace/console/output.h"
#include "tools/qntrace/format/escape.h"

namespace qn::dump
{
namespace
{
constexpr std::uint64_t most_shown = 100;
} // namespace

std::string printable_name(const std::string &path)
{
    std::string name;
    append_escaped(name, path, locale_charset());
    return name;
}

void finding_printer::operator()(const reader::finding &found)
{
    if (found.level != reader::finding::severity::note) faulty_ = true;
    if (++count_ > most_shown) return;
    const auto where = found.offset ? fmt::format("offset {}: ", *found.offset) : std::string();
    write_message(fmt::format("{}: {}{}", name_, where, found.text));
}

void finding_printer::finish() const
{
    if (count_ > most_shown) {
        write_message(fmt::format("{}: {} more problems are not shown", name_, count_ - most_shown));
    }
}

int finding_printer::status() const { return faulty_ ? status_damaged : status_sound; }

} // namespace qn::dump
