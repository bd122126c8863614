// The seed corpus of the fuzz target for existing trace files, which are started.
#include "faults/campaign.h"
#include "support/fuzz_corpus.h"

extern "C" int fuzz_start(const uint8_t *data, size_t size);

TEST(StartFuzzCorpus, ExistingFilesRunClean)
{
    const size_t files = qn::test::run_corpus(QN_FUZZ_CORPUS, fuzz_start);
    qn::test::count("Damaged files are started", "executions", files);
}
