#include "tools/qntrace/check/report.h"

#include <fmt/format.h>
#include <nlohmann/json.hpp>

#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/format/json_text.h"
#include "tools/qntrace/format/timestamps.h"

namespace qn::dump
{
namespace
{

using json = nlohmann::ordered_json;

std::string records_text(const file_check &checked, timestamps &times)
{
    if (checked.records == 0) return "no records";
    auto text = fmt::format("{} record{}", checked.records, checked.records == 1 ? "" : "s");
    if (checked.sound()) return text;
    const auto time_text = [&times](const std::optional<timespec> &time) {
        return time ? times.text(*time).value_or("-") : "-";
    };
    return text + fmt::format(" from {} to {}", time_text(checked.first_time), time_text(checked.last_time));
}

std::string verdict(const file_check &checked, bool utc)
{
    timestamps times(utc);
    if (!checked.readable) return "damaged, nothing can be read";
    std::string text;
    if (checked.sound()) {
        text = fmt::format("sound, {}", records_text(checked, times));
    } else {
        text = fmt::format("damaged, {} can be read", records_text(checked, times));
        if (checked.unreadable_bytes != 0)
            text += fmt::format(", {} of {} bytes of the ring cannot", checked.unreadable_bytes, checked.ring_bytes);
    }
    if (checked.lost.any()) text += fmt::format("; lost: {}", losses_text(checked.lost, utc));
    return text;
}

const char *severity_name(reader::finding::severity level)
{
    switch (level) {
    case reader::finding::severity::note: return "note";
    case reader::finding::severity::loss: return "loss";
    case reader::finding::severity::damage: break;
    }
    return "damage";
}

json finding_object(const placed_finding &found, text_encoder &encode)
{
    json object = {{"severity", severity_name(found.what.level)}};
    if (found.what.offset) object["offset"] = *found.what.offset;
    if (found.what.seq) object["seq"] = *found.what.seq;
    if (found.behind) object["behind_seq"] = *found.behind;
    object["text"] = encode.text(found.what.text);
    return object;
}

void add_time(json &object, const std::string &name, const std::optional<timespec> &time, timestamps &times)
{
    if (!time) return;
    if (const auto text = times.text(*time)) object[name] = *text;
    object[name + "_ns"] = nanoseconds_text(*time);
}

} // namespace

std::string check_text(const std::string &path, const file_check &checked, bool utc)
{
    auto out = fmt::format("{}: {}\n", printable_name(path), verdict(checked, utc));
    for (const auto &found : checked.findings) {
        out += "  ";
        if (found.what.level != reader::finding::severity::damage)
            out += fmt::format("{}: ", severity_name(found.what.level));
        if (found.what.offset) out += fmt::format("offset {}: ", *found.what.offset);
        out += found.what.text;
        if (found.behind && found.what.offset && !found.what.seq)
            out += fmt::format(", behind sequence number {}", *found.behind);
        out += '\n';
    }
    if (checked.more_findings != 0) out += fmt::format("  {} more are not shown\n", checked.more_findings);
    return out;
}

std::string check_json(const std::string &path, const file_check &checked, bool utc)
{
    timestamps times(utc);
    std::string line;
    append_object(line, [&](text_encoder &encode) {
        json object = {{"type", "check"}};
        object["file"] = encode.text(path);
        object["status"] = checked.sound() ? "sound" : "damaged";
        object["readable"] = checked.readable;
        object["records"] = checked.records;
        add_time(object, "first", checked.first_time, times);
        add_time(object, "last", checked.last_time, times);
        object["ring_bytes"] = checked.ring_bytes;
        object["unreadable_bytes"] = checked.unreadable_bytes;
        object["unfinished"] = checked.lost.unfinished;
        object["missing"] = checked.lost.missing;
        object["unspooled_pages"] = checked.lost.unspooled;
        object["findings"] = json::array();
        for (const auto &found : checked.findings) object["findings"].push_back(finding_object(found, encode));
        object["more_findings"] = checked.more_findings;
        return object;
    });
    return line;
}

} // namespace qn::dump
