#include <cu_tr_proxy.h>

static_assert(sizeof(tr_proxy_func_table_t) == 2 * sizeof(void *), "two functions");
