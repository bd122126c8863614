#include <qn_cu.h>

_Static_assert(sizeof(cu_timeinfo_t) == 16, "stored in trace files");
_Static_assert(CU_ERROR_ARG_VOID_PTR == 6 && CU_ERROR_ARG_CHAR_STR == 5, "stored in trace files");
_Static_assert(sizeof(((cu_error_arg_t *)0)->cu_arg_value) == 8, "stored in trace files");
