// The selection of one file: taken or refused as the model says; a refused one leaves the list as it was.
#include "components/map_model.h"
#include "fuzz/fuzz_support.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    using namespace qn;
    const fuzz::input input = fuzz::read_input(data, size);
    if (!input.ok) return 0;
    fuzz::components();
    const test::map_verdict expected = test::judge_selection("/tmp/x.trc", input.text);

    test::map_list list;
    fuzz::require(list.select("a:b") == 0, "the element that was there", input.text);
    const trace_map_spec_t *const before = list.last;
    cu_set_no_error_1();
    fuzz::require_outcome(list.select(input.text, "/tmp/x.trc"), expected.code, expected.offset, input.text);
    fuzz::require(test::is_well_linked(list.first, list.last), "links", input.text);
    if (expected.code != 0) {
        fuzz::require(list.first == before && list.last == before, "the list as it was", input.text);
        return 0;
    }
    const test::map_element &element = expected.elements[0];
    fuzz::require(test::count_of(list.first) == 2 && list.last->fileName == element.file &&
                      list.last->pCompId == element.component && list.last->pCategory == element.category,
                  "the element", input.text);
    return 0;
}
