// The seed corpus of the fuzz target for configuration files.
#include "support/fuzz_corpus.h"

extern "C" int fuzz_conf(const uint8_t *data, size_t size);

TEST(FuzzCorpus, ConfigurationFilesRunClean) { qn::test::run_corpus(QN_FUZZ_CORPUS, fuzz_conf); }
