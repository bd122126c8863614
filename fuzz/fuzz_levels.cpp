// Level specifications: parsed and applied by the library and by the model; codes, offsets, elements and levels agree.
#include "fuzz/fuzz_support.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    using namespace qn;
    const fuzz::input input = fuzz::read_input(data, size);
    if (!input.ok) return 0;
    const auto components = fuzz::components();
    const test::level_verdict expected = test::judge_levels(input.text);

    test::level_list list;
    cu_set_no_error_1();
    fuzz::require_outcome(list.parse(input.text), expected.code, expected.offset, input.text);
    fuzz::require(test::is_well_linked(list.first, list.last), "links", input.text);
    fuzz::require(test::count_of(list.first) == expected.elements.size(), "number of elements", input.text);

    trace_level_spec_t *node = list.first;
    for (const test::level_element &element : expected.elements) {
        fuzz::require(node->pCompId == element.component && node->pCategory == element.category &&
                          node->detailLevel == element.level,
                      "an element", input.text);
        process_trace_spec(&anchors, node, nullptr);
        for (test::twin *each : components) each->model.apply(element);
        node = node->pNext;
    }
    for (const test::twin *each : components)
        fuzz::require(each->real.levels == each->model.levels, "levels", input.text);
    return 0;
}
