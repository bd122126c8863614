// The fault campaign's figures: how long a test attacks, and what it did.
#pragma once

#include <cstdint>
#include <string_view>

namespace qn::test
{
// How many rounds a test does: `fast` in the test suite, `whole` in ./dev campaign (QN_CAMPAIGN is "whole").
uint32_t rounds(uint32_t fast, uint32_t whole);

// The same for an attack that belongs to a sanitizer: `whole` in each build of ./dev campaign, not in the release one alone.
uint32_t rounds_of_every_build(uint32_t fast, uint32_t whole);

// Adds to the campaign's table, in the row `item`: what is one of "rounds", "faults" and "executions". The file named
// by QN_CAMPAIGN_RESULTS gets a line of JSON; without that variable nothing is kept.
void count(std::string_view item, std::string_view what, uint64_t number);
} // namespace qn::test
