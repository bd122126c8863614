#include <qn_cu.h>

static_assert(sizeof(cu_timeinfo_t) == 16, "stored in trace files");
static_assert(sizeof(cu_cluster_info_t) == 64 + 64 + 4, "two texts and a number");
