// Values of QN_TR_FILE_MAP: elements, codes and offsets as the model says, and the tokens of the categories they meet.
#include "components/map_model.h"
#include "fuzz/fuzz_support.h"

namespace
{
using namespace qn;

// The file that the last matching element sends a category to; null when none does.
const std::string *file_for(const std::vector<test::map_element> &elements, const std::string &id,
                            const std::string &category)
{
    const std::string *file = nullptr;
    for (const test::map_element &element : elements)
        if (test::matches(element.component, id) && test::matches(element.category, category)) file = &element.file;
    return file;
}

bool has_its_file(tr_file_token_t token, const std::string *file)
{
    if (file == nullptr) return token == nullptr;
    return token != nullptr && token->fileName == *file;
}
} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    const fuzz::input input = fuzz::read_input(data, size);
    if (!input.ok) return 0;
    const auto components = fuzz::components();
    const test::map_verdict expected = test::judge_map(input.text);

    test::map_list list;
    cu_set_no_error_1();
    const int status = list.parse(input.text);
    if (expected.code == test::refused_without_message)
        fuzz::require(status == expected.code && test::last_error().code == 0, "an empty value", input.text);
    else
        fuzz::require_outcome(status, expected.code, expected.offset, input.text);
    fuzz::require(test::is_well_linked(list.first, list.last), "links", input.text);
    fuzz::require(test::count_of(list.first) == expected.elements.size(), "number of elements", input.text);

    trace_map_spec_t *node = list.first;
    for (const test::map_element &element : expected.elements) {
        fuzz::require(node->fileName == element.file && node->pCompId == element.component &&
                          node->pCategory == element.category,
                      "an element", input.text);
        process_map_spec(&anchors, node, nullptr);
        node = node->pNext;
    }
    for (const test::twin *each : components)
        for (size_t i = 0; i < each->model.categories.size(); ++i)
            fuzz::require(has_its_file(each->real.tokens[i],
                                       file_for(expected.elements, each->model.id, each->model.categories[i].name)),
                          "a token", input.text);
    fuzz::forget_trace_files();
    return 0;
}
