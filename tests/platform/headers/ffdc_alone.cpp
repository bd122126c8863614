#include <qn_ffdc.h>

static_assert(sizeof(fc_eid_t) == 43, "42 characters and a NUL");
