// The local time zone, for a file's header.
#include "trace/recording/time_zone.h"

#include "platform/common/descriptors.h"
#include "trace/recording/recording.h"

int get_tz_offset(void)
{
    const time_t now = time(nullptr);
    tm local{};
    tm greenwich{};
    if (!qn::platform::local_time(now, local) || gmtime_r(&now, &greenwich) == nullptr) return -1;
    return qn::tr::zone_minutes(greenwich, local);
}

namespace qn::tr
{
int zone_minutes(const tm &greenwich, const tm &local)
{
    const int years = greenwich.tm_year - local.tm_year;
    const int days = greenwich.tm_yday - local.tm_yday;
    const int minutes = (greenwich.tm_hour - local.tm_hour) * 60 + greenwich.tm_min - local.tm_min;
    if (years > 0) return minutes + 1440;
    if (years < 0) return minutes - 1440;
    return days * 1440 + minutes;
}
} // namespace qn::tr
