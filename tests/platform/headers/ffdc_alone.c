#include <qn_ffdc.h>

_Static_assert(sizeof(fc_eid_t) == 43, "42 characters and a NUL");
