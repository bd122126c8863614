// The message set of the library: what users are told, by message number.
//
// The table is the source of both the default texts and the message catalogue "qn_tr.cat".
#pragma once

inline constexpr int trapi_set_messages = 41; // numbers 0 to 40; 0 is a placeholder

extern const char *const cu_mesgtbl_trapi_set[trapi_set_messages];
extern const char cu_badid_trapi_set[]; // for a number outside 1 to 40
