// Failure identifiers: unique without asking anybody.
#pragma once

#include <qn_ffdc.h>

namespace qn::ffdc
{
void make_failure_id(fc_eid_t &id);
} // namespace qn::ffdc
