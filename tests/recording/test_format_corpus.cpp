// The seed corpus of the fuzz target for formats of texts.
#include "support/fuzz_corpus.h"

extern "C" int fuzz_format(const uint8_t *data, size_t size);

TEST(FuzzCorpus, FormatsRunClean) { qn::test::run_corpus(QN_FUZZ_CORPUS, fuzz_format); }
