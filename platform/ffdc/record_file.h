// The files of /var/qn/ffdc that failure records are appended to.
#pragma once

#include <string>

namespace qn::ffdc
{
// Appends `record` to the component's file, whole or not at all. Returns 0, also when the folder does not
// exist, or errno.
int append_record(const char *component, const std::string &record);
} // namespace qn::ffdc
