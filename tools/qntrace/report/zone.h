// The zone in which a page shows its times: it has one offset from UTC for all of them.
#pragma once

#include <cstdint>

namespace qn::dump
{

struct page_zone {
    bool utc = true;
    int offset_minutes = 0; // east of Greenwich
};

// The local zone, unless its offset changes between the two times, or they are too far apart to tell: then UTC.
page_zone local_zone(std::int64_t first_ns, std::int64_t last_ns);

} // namespace qn::dump
