#include "components/map_model.h"

#include <algorithm>

#include "components/level_model.h"

namespace
{
using namespace qn::test;

constexpr size_t longest_name = 4095;

struct file_and_rest {
    std::string file;
    std::string rest;
    size_t rest_at; // in the value
};

size_t behind_blanks(const std::string &text, size_t at)
{
    return std::min(text.find_first_not_of(' ', at), text.size());
}

file_and_rest take_file_name(const std::string &element, size_t element_at)
{
    size_t at = behind_blanks(element, 0);
    const bool quoted = at < element.size() && element[at] == '"';
    if (quoted) ++at;
    const size_t end = std::min(element.find_first_of(quoted ? "\"" : ", \"", at), element.size());
    const std::string name = element.substr(at, std::min(end - at, longest_name));
    at = end;
    for (const char once : {'"', ','})
        if (at < element.size() && element[at] == once) ++at;
    at = behind_blanks(element, at);
    return {name, element.substr(at), element_at + at};
}

std::vector<file_and_rest> split_at_semicolons(const std::string &value)
{
    std::vector<file_and_rest> elements;
    for (size_t begin = 0; begin < value.size();) {
        const size_t end = std::min(value.find(';', begin), value.size());
        elements.push_back(take_file_name(value.substr(begin, end - begin), begin));
        begin = end + 1;
    }
    return elements;
}
} // namespace

namespace qn::test
{
map_verdict judge_selection(const std::string &file, const std::string &selection)
{
    const auto fault = [](int code, size_t offset) { return map_verdict{code, static_cast<int>(offset), {}}; };
    if (selection.empty()) return fault(11, 0);
    size_t start = behind_blanks(selection, 0);
    if (selection.substr(start, 1) == ",") start = behind_blanks(selection, start + 1);
    const size_t end = std::min(selection.find(',', start), selection.size());
    const std::string pair = selection.substr(start, end - start);

    const size_t colon = colon_outside_groups(pair);
    if (colon == 0) return fault(10, start);
    if (colon == std::string::npos) return fault(11, end);
    const std::string component = star_spelled_out(pair.substr(0, colon));
    const std::string behind = pair.substr(colon + 1);
    const std::string category = star_spelled_out(behind.substr(0, behind.find(' ')));
    if (category.empty()) return fault(12, start + colon + 1);
    const bool goes_on = end < selection.size() && behind_blanks(selection, end + 1) < selection.size();
    if (goes_on) return fault(11, end);
    if (!is_pattern(component)) return fault(15, start);
    if (!is_pattern(category)) return fault(16, start + colon + 1);
    return {0, 0, {{file.substr(0, longest_name), component, category}}};
}

map_verdict judge_map(const std::string &value)
{
    if (value.empty()) return {refused_without_message, 0, {}};
    map_verdict all;
    for (const file_and_rest &element : split_at_semicolons(value)) {
        const map_verdict one = element.rest.empty() ? map_verdict{11, static_cast<int>(element.rest_at), {}}
                                                     : judge_selection(element.file, element.rest);
        all.elements.insert(all.elements.end(), one.elements.begin(), one.elements.end());
        if (one.code == 0) continue;
        all.code = one.code;
        all.offset = one.offset;
        break;
    }
    return all;
}

size_verdict judge_sizes(const std::string &value)
{
    if (value.empty()) return {refused_without_message, 0, {}};
    size_verdict all;
    for (const file_and_rest &element : split_at_semicolons(value)) {
        if (element.rest.empty()) {
            all.code = 11;
            all.offset = static_cast<int>(element.rest_at);
            break;
        }
        all.elements.push_back({element.file, static_cast<uint32_t>(read_number(element.rest, 0).value)});
    }
    return all;
}
} // namespace qn::test
