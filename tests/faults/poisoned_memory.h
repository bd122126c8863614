// Memory that tells where it comes from: a program linked with this file has malloc() and its kin of its own, which
// fill every block with a pattern when it is given and when it is taken back. Stack and vector registers get it on
// demand.
#pragma once

#include <cstdint>
#include <functional>
#include <string_view>

namespace qn::test
{
// Two patterns that differ in every byte: what a file has of them differs between two runs, be it a single byte.
enum class poison { one, other };

// From now on; what was allocated before is not touched.
void poison_memory(poison with);

// Fills the stack below the caller and the vector registers, and makes the call.
void with_poisoned_stack(const std::function<void()> &call);

// Where there are three bytes of a pattern in a row, in whatever phase; npos when nowhere.
size_t find_poison(std::string_view bytes);

// The pattern that is in use, eight bytes.
std::string_view poison_pattern();
} // namespace qn::test
