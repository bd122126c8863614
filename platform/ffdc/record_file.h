// The files of /var/qn/ffdc that failure records are appended to.
#pragma once

#include <string>

namespace qn::ffdc
{
// Appends `record`, which ends with an empty line, to the component's file by one write. Returns 0, also when the folder
// does not exist, or errno: EFBIG, with nothing written, where the process may not have so large a file, and ENOSPC when
// the disk was full; a piece of the record may be there then, and the next record begins behind an empty line.
int append_record(const char *component, const std::string &record);
} // namespace qn::ffdc
