// The tables and views of an export to SQLite.
#pragma once

namespace qn::dump
{

// What is made before the first record, and what goes faster behind the last one.
extern const char *const sqlite_tables;
extern const char *const sqlite_indices_and_views;

} // namespace qn::dump
