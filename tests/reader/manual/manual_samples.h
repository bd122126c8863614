// The folder in which the examples of the manual pages are run:
//
//   app.trc      a trace with records of every kind
//   torn.trc     the same with some bytes overwritten
//   spool/       what two nodes of a cluster have copied
//   trace.conf   a configuration file
#pragma once

#include "reader/program.h"

namespace qn::test
{

class manual_samples
{
public:
    manual_samples();
    // Runs a shell command there. Its two streams come back as one.
    outcome run(const std::string &command) const;

private:
    scratch_folder folder_;
};

} // namespace qn::test
