// What patterns that make the regular expression engine work hard cost a client of tr_set_trace_levels_1: the time and
// the memory of the call, most of it spent with the library's global lock held. Prints figures; nothing passes or fails.
//
// Each pattern is tried in a process of its own with 4 GiB of address space and 20 s of processor time, against a
// component with one category.
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <string>
#include <utility>
#include <vector>

#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <qn_tr.h>

#include "support/pattern_text.h"

namespace
{
using qn::test::nested;
using qn::test::repeated;

struct experiment {
    std::string title;
    std::string pattern; // for the category
    std::string name;    // of the category
};

std::vector<experiment> experiments()
{
    const std::string a24(24, 'a');
    const std::string a1000(1000, 'a');
    return {
        {"plain", "Errors", "Errors"},
        {"everything", "*", "Errors"},
        {"one bound", "a{255}", a1000},
        {"largest bound", "a{32767}", a1000},
        {"beyond the largest", "a{32768}", a1000},
        {"bound of a bound", "(a{100}){100}", a1000},
        {"bound of a bound", "(a{255}){255}", a1000},
        {"three bounds", "((a{100}){100}){100}", a1000},
        {"three bounds", "((a{255}){255}){255}", a1000},
        {"largest of largest", "(a{32767}){32767}", a1000},
        {"plus nested 10", nested("a", "+", 10), a1000},
        {"plus nested 16", nested("a", "+", 16), a1000},
        {"plus nested 20", nested("a", "+", 20), a1000},
        {"plus nested 24", nested("a", "+", 24), a1000},
        {"star nested 20", nested("a", "*", 20) + "b", a1000},
        {"stars in a row", repeated("(.*)*", 20) + "b", a1000},
        {"alternatives", "(a|aa)*(a|aa)*b", a1000},
        {"optional run", repeated("a?", 24) + repeated("a", 24), a24},
        {"distant letter", "(a|b)*a" + repeated("(a|b)", 16) + "c", repeated("ab", 500)},
        {"back reference", "(a*)\\1b", a1000},
        {"two back references", "(a*)(a*)\\1\\2b", std::string(200, 'a')},
        {"three back references", "(a*)(a*)(a*)\\1\\2\\3b", std::string(50, 'a')},
        {"back ref. of alternatives", "((a|aa)*)\\1b", std::string(40, 'a')},
        {"parentheses 10000 deep", nested("a", "", 10000), a1000},
        {"parentheses 100000 deep", nested("a", "", 100000), a1000},
    };
}

struct outcome {
    int status = 0;
    double seconds = 0;
};

// In the child: sets the level by the pattern, tells how that went.
outcome try_pattern(const experiment &each)
{
    tr_detail_level_t levels[1] = {};
    const tr_category_description_t categories[1] = {{0, each.name.c_str(), 1, 0}};
    tr_register_component_1("PC", levels, categories, 1);
    const std::string specification = "PC:" + each.pattern + "=3";
    const auto start = std::chrono::steady_clock::now();
    outcome seen;
    seen.status = tr_set_trace_levels_1(specification.c_str());
    seen.seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
    return seen;
}

void limit(int resource, rlim_t most)
{
    const rlimit limits{most, most};
    setrlimit(static_cast<__rlimit_resource>(resource), &limits);
}

// Prints how one call went: its code and time, or what killed it, and the process's largest size.
void run_and_print(const experiment &each)
{
    int ends[2];
    if (pipe(ends) != 0) return;
    const pid_t child = fork();
    if (child == 0) {
        limit(RLIMIT_AS, rlim_t{4} << 30);
        limit(RLIMIT_CPU, 20);
        limit(RLIMIT_CORE, 0);
        const outcome seen = try_pattern(each);
        const bool told = write(ends[1], &seen, sizeof seen) == static_cast<ssize_t>(sizeof seen);
        _exit(told ? 0 : 1);
    }
    close(ends[1]);
    outcome seen;
    const bool told = read(ends[0], &seen, sizeof seen) == static_cast<ssize_t>(sizeof seen);
    close(ends[0]);
    int status = 0;
    rusage used{};
    wait4(child, &status, 0, &used);
    if (told)
        std::printf("  code %2d %10.6f s", seen.status, seen.seconds);
    else
        std::printf("  killed by signal %2d ", WTERMSIG(status));
    std::printf(" %6.0f MiB", static_cast<double>(used.ru_maxrss) / 1024);
}

void measure(experiment each)
{
    const std::string shown = each.pattern.size() <= 28 ? each.pattern : each.pattern.substr(0, 25) + "...";
    const size_t length = each.name.size();
    std::printf("%-25s %-28s", each.title.c_str(), shown.c_str());
    const std::string name = std::exchange(each.name, "x");
    run_and_print(each);
    each.name = name;
    run_and_print(each);
    std::printf(" (%zu)\n", length);
    std::fflush(stdout);
}
} // namespace

int main()
{
    std::printf("%-25s %-28s  %-32s  %s\n", "", "category pattern", "against a category \"x\"",
                "against one that nearly matches (its length)");
    for (const experiment &each : experiments()) measure(each);
    return 0;
}
