// Configuration files: chunks with their lines and faults, and what the sections mean, as the model says.
#include "fuzz/fuzz_support.h"
#include "traceutils/conf_model.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    using namespace qn;
    const std::string text(data, data + size);
    const test::conf_seen expected = test::judge_conf(text);
    const test::conf_seen seen = test::read_conf(text);
    fuzz::require(seen.status == 0, "the status", text);
    fuzz::require(seen.chunks == expected.chunks, "the chunks", text);
    fuzz::require(seen.section_lines == expected.section_lines, "the lines of the sections", text);
    fuzz::require(seen.faults == expected.faults, "the faults", text);

    const test::conf_of conf(text);
    trace_conf_data_t *elements = nullptr;
    fuzz::require(tr_parse_all_sections_1(conf.get(), &elements, 1) == 0, "the status of the sections", text);
    fuzz::require(test::elements_of(*elements) == test::judge_sections(expected.chunks), "the elements", text);
    tr_free_trace_conf_data_1(elements);
    return 0;
}
