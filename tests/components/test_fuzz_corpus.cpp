// The seed corpora of the fuzz targets, through the targets' own entry functions. These end the program at an input on
// which the library and the model disagree, so reaching the end is the test.
#include "support/fuzz_corpus.h"

extern "C" {
int fuzz_levels(const uint8_t *data, size_t size);
int fuzz_map(const uint8_t *data, size_t size);
int fuzz_sizes(const uint8_t *data, size_t size);
int fuzz_selection(const uint8_t *data, size_t size);
}

namespace
{
TEST(FuzzCorpus, LevelsRunClean) { qn::test::run_corpus(QN_FUZZ_CORPUS "/levels", fuzz_levels); }
TEST(FuzzCorpus, FileMapsRunClean) { qn::test::run_corpus(QN_FUZZ_CORPUS "/map", fuzz_map); }
TEST(FuzzCorpus, FileSizesRunClean) { qn::test::run_corpus(QN_FUZZ_CORPUS "/sizes", fuzz_sizes); }
TEST(FuzzCorpus, SelectionsRunClean) { qn::test::run_corpus(QN_FUZZ_CORPUS "/selection", fuzz_selection); }
} // namespace
