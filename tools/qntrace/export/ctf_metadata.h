// The metadata of a CTF 1.8 trace: what its streams look like, in CTF's own language.
#pragma once

#include <string>

#include "tools/qntrace/traces/trace_set.h"

namespace qn::dump
{

constexpr std::uint32_t ctf_magic = 0xC1FC1FC1;

// For the streams of a program of a node, which `source` is one of.
std::string ctf_metadata(const trace_source &source);

} // namespace qn::dump
