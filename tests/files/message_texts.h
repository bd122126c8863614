// The message texts written down a second time: a text that changes in the library is found by a test that fails.
#pragma once

#include <array>

namespace qn::test
{
inline constexpr std::array<const char *, 41> message_texts = {
    "Reserved: DO NOT USE!",
    "2625-000 Number of categories is invalid.\n",
    "2625-001 Component identifier is missing.\n",
    "2625-002 Category list pointer is NULL.\n",
    "2625-003 Detail Level array pointer is NULL.\n",
    "2625-004 Category name in entry %d of category list is NULL.\n",
    "2625-005 Identifier for category \"%s\" is greater than the number of categories.\n",
    "2625-006 The default level for category \"%s\" is greater than the maximum possible (256).\n",
    "2625-007 The minimum level for category \"%s\" is greater than the maximum possible (256).\n",
    "2625-008 Internal error. Not able to obtain mutex lock, error=%d.\n",
    "2625-009 Syntax error in trace specification at offset %d, component identifier expected.\n",
    "2625-010 Syntax error in trace specification at offset %d, separator ':' expected.\n",
    "2625-011 Syntax error in trace specification at offset %d, category name expected.\n",
    "2625-012 Syntax error in trace specification at offset %d, detail level value expected.\n",
    "2625-013 Memory allocation failed.\n",
    "2625-014 Syntax error in trace specification at offset %d, component id is not a valid regular expression.\n",
    "2625-015 Syntax error in trace specification at offset %d, category is not a valid regular expression.\n",
    "2625-016 Trace filename \"%s\" is invalid.\n",
    "2625-017 Error %d opening trace file.\n",
    "2625-018 Error %d returned from fstat() on trace file.\n",
    "2625-019 Trace file \"%s\" is not a regular file.\n",
    "2625-020 Error %d was returned when attempting to mmap() trace file.\n",
    "2625-021 Error %d was returned when attempting to change the size of the trace file.\n",
    "2625-022 Error %d was returned when attempting to clear the contents of the trace file.\n",
    "Size of trace file was modified to fit within limits.\n",
    "Trace is not active so the size returned is the requested size.\n",
    "2625-025 Component \"%s\" is not registered.\n",
    "2625-026 The string parameter is a NULL pointer or a null string.\n",
    "2625-027 Error %d was returned from vsprintf()\n",
    "2625-028 Too many data blocks (%d) were specified.\n",
    "2625-029 The pointer for data block %d is NULL.\n",
    "2625-030 The length of data block %d is <= zero.\n",
    "2625-031 Error %d was returned from msync() attempting to flush trace file.\n",
    "2625-032 The format parameter is a NULL pointer or a null string.\n",
    "2625-033 The number of strings parameter is too big.\n",
    "2625-034 Trace file cannot be put in AFS file system on linux.\n",
    "2625-035 There is insufficient free space in file system to create trace file.\n",
    "2625-036 The specified file \"%s\" is not a valid trace file.\n",
    "2625-037 The specified query handle is not valid.\n",
    "2625-038 The component ID is already in use.\n",
    "2625-039 The write() system call failed, errno(%d).\n",
};
} // namespace qn::test
