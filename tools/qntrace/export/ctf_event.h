// A record as an event of a CTF stream, and the description of all events for the metadata of a trace.
//
// Both stand side by side so that they agree. Everything is little-endian and aligned to bytes. The event class of a
// kind has the kind's number in the format of trace files; a record that is not sound has a class of its own, with the
// same name and fields, and a context that tells what is wrong.
#pragma once

#include <cstdint>
#include <string>

#include "tools/qntrace/reader/reader.h"

namespace qn::dump
{

void append_u32(std::string &out, std::uint32_t value);
void append_u64(std::string &out, std::uint64_t value);
// With its NUL; bytes that are no visible UTF-8 are escapes.
void append_text(std::string &out, std::string_view text);

// Appends the event, at the time given.
void append_ctf_event(std::string &out, const reader::trace_record &record, std::uint64_t ns,
                      const std::string &problem);

// The event blocks of the metadata, with the types that they use before them.
std::string ctf_event_types();
std::string ctf_event_classes();

} // namespace qn::dump
