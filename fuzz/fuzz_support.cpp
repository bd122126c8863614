#include "fuzz/fuzz_support.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>

namespace qn::fuzz
{
void require_outcome(int status, int code, int offset, const std::string &text)
{
    const test::outcome seen = test::after(status);
    const test::outcome expected = code == 0 ? test::success() : test::syntax_error(code, offset);
    if (!(seen == expected))
        std::fprintf(stderr, "status %d, error %d, %snot error %d at %d\n", seen.status, seen.code, seen.text.c_str(),
                     code, offset);
    require(seen == expected, "another outcome than the model's", text);
}

std::array<test::twin *, 3> components()
{
    static test::twin first("AB", {{1, "Errors", 1, 1}, {0, "Flow", 3, 0}, {2, "My Info", 200, 7}});
    static test::twin second("AB01", {{0, "x", 0, 9}, {0, "one\ntwo", 5, 2}});
    static test::twin third("cd", {{0, "aa:5", 255, 255}});
    static const bool registered = [] {
        for (test::twin *each : {&first, &second, &third})
            require(each->real.register_now() == 0, "registration", each->real.id);
        return true;
    }();
    (void)registered;
    return {&first, &second, &third};
}

void forget_trace_files()
{
    while (anchors.next != nullptr) {
        trace_anchor_t *anchor = anchors.next;
        anchors.next = anchor->next;
        pthread_mutex_destroy(&anchor->anchorMutex);
        std::free(anchor);
    }
    anchors.numAnchors = 1;
    anchors.uRequestedFileSize = default_file_size;
    for (const test::twin *each : components()) std::fill_n(each->real.tokens, each->real.categories.size(), nullptr);
}
} // namespace qn::fuzz
