// The arithmetic of get_tz_offset.
#pragma once

#include <ctime>

namespace qn::tr
{
// Minutes from local time to Greenwich time, given one instant in both; at most a day apart.
int zone_minutes(const tm &greenwich, const tm &local);
} // namespace qn::tr
