#include "traceutils/conf_model.h"

#include <algorithm>
#include <cstdlib>
#include <map>
#include <optional>
#include <set>

namespace qn::test
{
namespace
{
struct model_line {
    std::string text;
    unsigned number;
};

// Pieces of at most 1022 characters, cut at a NUL, without the white space in front; empty ones are left out.
std::vector<model_line> lines_of(const std::string &bytes)
{
    std::vector<model_line> lines;
    unsigned number = 1;
    for (size_t at = 0; at < bytes.size();) {
        const size_t line_end = bytes.find('\n', at);
        const size_t end = std::min({line_end == std::string::npos ? line_end : line_end + 1, at + 1022, bytes.size()});
        std::string text = bytes.substr(at, end - at);
        const bool ended = text.back() == '\n';
        text.resize(std::min(text.size(), text.find('\0')));
        const size_t first = text.find_first_not_of(" \t\n\v\f\r");
        if (first != std::string::npos) lines.push_back({text.substr(first), number});
        if (ended) ++number;
        at = end;
    }
    return lines;
}

std::optional<std::string> header_name(const std::string &line)
{
    const size_t colon = line.rfind(':');
    if (colon == std::string::npos || colon == 0) return std::nullopt;
    return line.substr(0, colon);
}

constexpr const char *letters = "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ";

std::optional<std::pair<std::string, std::string>> key_and_value(std::string line)
{
    if (line.ends_with('\n')) line.pop_back();
    size_t at = 0;
    const auto take = [&](const std::string &characters) {
        const size_t end = std::min(line.find_first_not_of(characters, at), line.size());
        const std::string taken = line.substr(at, end - at);
        at = end;
        return taken;
    };
    const std::string key = take(std::string(letters) + "-_");
    take(" \t");
    const bool equals = line.compare(at, 1, "=") == 0;
    if (key.empty() || !equals) return std::nullopt;
    ++at;
    take(" \t");
    std::string value = take(std::string(letters) + "0123456789-_/*.");
    if (value.empty()) return std::nullopt;
    value += take("$");
    take(" \t");
    if (at != line.size()) return std::nullopt;
    return {{key, value}};
}

std::string lower(std::string text)
{
    std::transform(text.begin(), text.end(), text.begin(), [](char c) { return c >= 'A' && c <= 'Z' ? c + 32 : c; });
    return text;
}

bool is_spool(const std::string &name) { return name.starts_with("spoolarea_"); }

std::set<std::string> keys_for(const std::string &name)
{
    if (name == "default") return {"spooling", "tracesize", "dest"};
    if (is_spool(name))
        return {"spool_dir",
                "cleanup",
                "spool_cleanup_interval",
                "spool_retention_days",
                "spool_directory_max_size",
                "spool_startup_interval"};
    return {"pat", "spooling", "pages", "dest", "size", "tracesize", "sync_interval"};
}

// The parser with its steps in the order in which they are laid down.
class model_parser
{
public:
    conf_seen seen;

    void take(const model_line &line)
    {
        if (line.text.find('#') != std::string::npos) {
            if (!in_section_) seen.chunks.push_back(comment(line.text));
            return;
        }
        while (step(line)) {
        }
    }

    void end_of_file()
    {
        if (!in_section_) return;
        if (is_complete())
            append();
        else
            seen.faults.push_back({first_line_, section_.name});
    }

private:
    // True when the line is to be processed again.
    bool step(const model_line &line)
    {
        if (!in_section_)
            expect_header(line);
        else if (leaves_section(line.text)) {
            append();
            return true;
        } else
            take_pair(line);
        const bool full = in_section_ && found_ == keys_for(section_.name);
        section_.text += line.text;
        if (full) append();
        return false;
    }

    void begin(const chunk_seen &section, const model_line &line)
    {
        section_ = section;
        first_line_ = line.number;
    }

    void expect_header(const model_line &line)
    {
        if (!section_.failed) begin({}, line);
        const auto name = header_name(line.text);
        if (!name) return fail(line);
        if (section_.failed) append();
        begin({.name = *name}, line);
        found_.clear();
        in_section_ = true;
    }

    bool leaves_section(const std::string &line) const
    {
        const auto pair = key_and_value(line);
        if (pair && keys_for(section_.name).count(lower(pair->first)) == 1) return false;
        if (section_.name == "default") return !pair;
        return is_complete();
    }

    void take_pair(const model_line &line)
    {
        const auto pair = key_and_value(line.text);
        const std::string key = pair ? lower(pair->first) : "";
        if (keys_for(section_.name).count(key) == 0 || found_.count(key) == 1) return fail(line);
        section_.pairs.push_back(*pair);
        found_.insert(key);
    }

    void fail(const model_line &line)
    {
        if (!section_.failed) seen.faults.push_back({line.number, section_.name});
        section_.failed = true;
        in_section_ = false;
    }

    bool is_complete() const
    {
        if (section_.name == "default") return true;
        if (is_spool(section_.name)) return found_.count("spool_dir") == 1 && found_.count("cleanup") == 1;
        return found_.count("pat") == 1;
    }

    void append()
    {
        seen.chunks.push_back(section_);
        seen.section_lines.push_back(first_line_);
        section_ = {};
        in_section_ = false;
    }

    chunk_seen section_;
    bool in_section_ = false;
    std::set<std::string> found_;
    unsigned first_line_ = 0;
};

class interpreter
{
public:
    explicit interpreter(const chunk_seen &section) : section_(section) {}

    std::string text(const std::string &key, const std::string &absent, size_t most = 1023) const
    {
        for (const auto &[name, value] : section_.pairs)
            if (name == key) return value.substr(0, most);
        return absent;
    }
    std::string number(const std::string &key, const std::string &absent = "0") const
    {
        const std::string value = text(key, "");
        return value.empty() ? absent : std::to_string(static_cast<unsigned>(std::atoi(value.c_str())));
    }

private:
    const chunk_seen &section_;
};
} // namespace

conf_seen judge_conf(const std::string &bytes)
{
    model_parser parser;
    for (const model_line &line : lines_of(bytes)) parser.take(line);
    parser.end_of_file();
    return parser.seen;
}

std::ostream &operator<<(std::ostream &out, const element_seen &element)
{
    out << element.name << " {";
    for (const std::string &value : element.values) out << " \"" << value << '"';
    return out << " }";
}

std::vector<element_seen> judge_sections(const std::vector<chunk_seen> &chunks)
{
    std::vector<chunk_seen> sections;
    for (const chunk_seen &chunk : chunks)
        if (!chunk.comment && !chunk.failed) sections.push_back(chunk);
    const auto standard = std::find_if(sections.begin(), sections.end(),
                                       [](const chunk_seen &section) { return section.name == "default"; });
    const std::string trace_size = standard != sections.end() ? interpreter(*standard).number("tracesize") : "0";

    std::vector<element_seen> elements;
    for (const chunk_seen &section : sections) {
        const interpreter values(section);
        if (section.name == "default")
            elements.push_back(
                {section.name,
                 {values.text("dest", "/dev/null"), values.number("tracesize"), values.text("spooling", "OFF", 3)}});
        else if (is_spool(section.name))
            elements.push_back({section.name,
                                {values.text("spool_dir", ""), values.text("cleanup", "", 3),
                                 values.number("spool_cleanup_interval"), values.number("spool_retention_days"),
                                 values.number("spool_directory_max_size"), values.number("spool_startup_interval")}});
        else
            elements.push_back({section.name,
                                {values.text("dest", "/dev/null"), values.text("pat", ""), values.number("pages"),
                                 values.number("size"), values.number("tracesize", trace_size),
                                 values.text("spooling", "OFF", 3), "0"}});
    }
    return elements;
}

std::vector<element_seen> elements_of(const trace_conf_data_t &data)
{
    std::vector<element_seen> elements;
    for (unsigned i = 0; i < data.num_elements; ++i) {
        const trace_config_element_t &element = *data.pTraceConfigElement[i];
        element_seen &seen = elements.emplace_back();
        seen.name = element.sect_name;
        const trace_element_t &trace = element.element.trace_element;
        const spool_element_t &spool = element.element.spool_element;
        const default_element_t &standard = element.element.default_element;
        switch (element.elementType) {
        case 1:
            seen.values = {trace.dest,
                           trace.pattern,
                           std::to_string(trace.pages),
                           std::to_string(trace.pg_size),
                           std::to_string(trace.trace_size),
                           trace.spooling,
                           std::to_string(trace.sync_interval)};
            break;
        case 2:
            seen.values = {spool.spool_dir,
                           spool.cleanup,
                           std::to_string(spool.cleanup_interval),
                           std::to_string(spool.retention_days),
                           std::to_string(spool.dir_size),
                           std::to_string(spool.startup_interval)};
            break;
        default: seen.values = {standard.dest, std::to_string(standard.trace_size), standard.spooling}; break;
        }
    }
    return elements;
}
} // namespace qn::test
