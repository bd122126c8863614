// What the verification of a file has come to, as a line for people with what is wrong below it, and as a JSON line.
#pragma once

#include <string>

#include "tools/qntrace/check/file_check.h"

namespace qn::dump
{

std::string check_text(const std::string &path, const file_check &checked, bool utc);
std::string check_json(const std::string &path, const file_check &checked, bool utc);

} // namespace qn::dump
