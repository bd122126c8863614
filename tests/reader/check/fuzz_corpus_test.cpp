// The seed corpora of the reader's fuzz targets, through the targets' own entry functions. These end the program at an
// input with which something is not as it should be, so reaching the end is the test.
#include "support/fuzz_corpus.h"

extern "C" {
int fuzz_reader(const uint8_t *data, size_t size);
int fuzz_where(const uint8_t *data, size_t size);
}

namespace qn::test
{
namespace
{
TEST(ReaderFuzzCorpus, TraceFilesRunClean) { run_corpus(QN_FUZZ_CORPUS "/reader", fuzz_reader); }
TEST(ReaderFuzzCorpus, FilterExpressionsRunClean) { run_corpus(QN_FUZZ_CORPUS "/where", fuzz_where); }

} // namespace
} // namespace qn::test
