// What registering and specifying cost, and what of it is the work itself: compiling the patterns once and matching them
// against every name that they may concern. One line of JSON for each step.
//
//   control_path FOLDER
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <optional>
#include <regex.h>
#include <string>
#include <vector>

#include <nlohmann/json.hpp>
#include <qn_tr.h>

namespace
{
constexpr unsigned components = 200, categories_of_each = 255, specifications = 1000, map_elements = 500;

void want(qn_int32_t status, const char *what)
{
    if (status == 0) return;
    std::fprintf(stderr, "%s: %d\n", what, static_cast<int>(status));
    std::exit(1);
}

template <class Step>
double milliseconds(Step step)
{
    const auto begin = std::chrono::steady_clock::now();
    step();
    return std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - begin).count();
}

std::string component_name(unsigned number) { return "C" + std::to_string(100 + number); }
std::string category_name(unsigned number) { return "Category" + std::to_string(number); }

// Pairs of patterns: a component's, and a category's.
std::vector<std::pair<std::string, std::string>> pattern_pairs(unsigned count)
{
    std::vector<std::pair<std::string, std::string>> pairs;
    for (unsigned i = 0; i < count; ++i)
        pairs.emplace_back(component_name(i % components), "Category" + std::to_string(i % 10) + ".*");
    return pairs;
}

class pattern
{
public:
    explicit pattern(const std::string &text)
    {
        want(regcomp(&regex_, text.c_str(), REG_EXTENDED | REG_NOSUB | REG_ICASE | REG_NEWLINE), "regcomp");
    }
    pattern(const pattern &) = delete;
    pattern &operator=(const pattern &) = delete;
    ~pattern() { regfree(&regex_); }
    bool matches(const std::string &name) const { return regexec(&regex_, name.c_str(), 0, nullptr, 0) == 0; }

private:
    regex_t regex_;
};

// The least that specifications can cost in one call: the patterns of each are compiled, and matched with the components
// from `first` to before `last` and with the categories of those that match.
void work_of(const std::vector<std::pair<std::string, std::string>> &pairs, unsigned first = 0,
             unsigned last = components)
{
    for (const auto &[component, category] : pairs) {
        const pattern for_component(component);
        std::optional<pattern> for_category;
        for (unsigned i = first; i < last; ++i) {
            if (!for_component.matches(component_name(i))) continue;
            if (!for_category) for_category.emplace(category);
            for (unsigned k = 0; k < categories_of_each; ++k) (void)for_category->matches(category_name(k));
        }
    }
}

void report(const char *step, double ms, double work_ms)
{
    nlohmann::ordered_json line{{"step", step}, {"ms", ms}};
    if (work_ms > 0) line["work_ms"] = work_ms;
    std::printf("%s\n", line.dump().c_str());
}
} // namespace

int main(int argc, char **argv)
{
    if (argc != 2) {
        std::fprintf(stderr, "usage: control_path FOLDER\n");
        return 2;
    }
    const std::string folder = argv[1];
    setenv("QN_TR_SPOOL", "none", 1);
    setenv("QN_TR_SIZE", "65536", 1);
    want(tr_set_filename_1((folder + "/trace").c_str()), "tr_set_filename_1");

    std::vector<std::string> names;
    for (unsigned i = 0; i < categories_of_each; ++i) names.push_back(category_name(i));
    std::vector<tr_category_description_t> categories;
    for (unsigned i = 0; i < categories_of_each; ++i) categories.push_back({i, names[i].c_str(), 1, 0});
    std::vector<std::vector<tr_detail_level_t>> levels(components, std::vector<tr_detail_level_t>(categories_of_each));
    const auto register_all = [&] {
        for (unsigned i = 0; i < components; ++i)
            want(tr_register_component_1(component_name(i).c_str(), levels[i].data(), categories.data(),
                                         categories_of_each),
                 "tr_register_component_1");
    };
    const auto unregister_all = [&] {
        for (unsigned i = 0; i < components; ++i)
            want(tr_unregister_component_1(component_name(i).c_str()), "tr_unregister_component_1");
    };

    report("register 200 components of 255 categories", milliseconds(register_all), 0);

    const auto pairs = pattern_pairs(specifications);
    std::string in_one;
    for (const auto &[component, category] : pairs)
        in_one += (in_one.empty() ? "" : ",") + component + ":" + category + "=2";
    const double work = milliseconds([&] { work_of(pairs); });
    report("1 000 level specifications in one call",
           milliseconds([&] { want(tr_set_trace_levels_1(in_one.c_str()), "tr_set_trace_levels_1"); }), work);
    report("1 000 level specifications, a call each", milliseconds([&] {
               for (const auto &[component, category] : pairs)
                   want(tr_set_trace_levels_1((component + ":" + category + "=3").c_str()), "tr_set_trace_levels_1");
           }),
           work);

    const auto mapped = pattern_pairs(map_elements);
    report("a file map of 500 elements", milliseconds([&] {
               for (const auto &[component, category] : mapped)
                   want(tr_set_file_map_1((folder + "/map").c_str(), (component + ":" + category).c_str()),
                        "tr_set_file_map_1");
           }),
           milliseconds([&] { work_of(mapped); }));

    report("unregister them", milliseconds(unregister_all), 0);
    auto all_pending = pairs;
    all_pending.insert(all_pending.end(), pairs.begin(), pairs.end());
    all_pending.insert(all_pending.end(), mapped.begin(), mapped.end());
    const double pending = milliseconds([&] {
        for (unsigned i = 0; i < components; ++i) work_of(all_pending, i, i + 1);
    });
    report("register them with all of that pending", milliseconds(register_all), pending);
    tr_term();
    return 0;
}
