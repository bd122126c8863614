// Values of QN_TR_FILE_SIZE: codes, offsets and the sizes that the trace files get, as the model says.
#include <map>

#include "components/map_model.h"
#include "fuzz/fuzz_support.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    using namespace qn;
    const fuzz::input input = fuzz::read_input(data, size);
    if (!input.ok) return 0;
    fuzz::components();
    const test::size_verdict expected = test::judge_sizes(input.text);

    cu_set_no_error_1();
    const int status = parse_fileSize_spec(input.text.c_str());
    if (expected.code == test::refused_without_message)
        fuzz::require(status == expected.code && test::last_error().code == 0, "an empty value", input.text);
    else
        fuzz::require_outcome(status, expected.code, expected.offset, input.text);

    std::map<std::string, uint32_t> sizes{{"", default_file_size}};
    for (const test::size_element &element : expected.elements) sizes[element.file] = element.size;
    fuzz::require(anchors.numAnchors == sizes.size(), "number of trace files", input.text);
    for (const auto &[file, bytes] : sizes) {
        const trace_anchor_t *anchor = findOrCreateAnchorForFile(file.c_str(), 0);
        fuzz::require(anchor != nullptr && anchor->uRequestedFileSize == bytes, "a size", input.text);
    }
    fuzz::forget_trace_files();
    return 0;
}
