/* What a C program does with the two libraries: raises an error, asks for it, tells the time, files a failure. */
#include <qn_cu.h>
#include <qn_ffdc.h>
#include <stdlib.h>
#include <string.h>

int c_client_error_text(const char *expected);
int c_client_time(double *seconds);
int c_client_failure(char *text, int size);

int c_client_error_text(const char *expected)
{
    cu_error_t *error;
    char *text;
    int equal;

    if (cu_set_error_1(7, NULL, NULL, 1, 7, "%s has %d of %ld", "disk", 3, 40L) != 7) return -1;
    if (cu_get_error_1(&error) != 0) return -2;
    if (cu_get_errmsg_1(error, &text) != 0) return -3;
    equal = strcmp(text, expected) == 0;
    free(text);
    cu_rel_error_1(error);
    return equal ? cu_set_no_error_1() : -4;
}

int c_client_time(double *seconds)
{
    cu_timeinfo_t base;
    qn_uint64_t ctr;
    struct timespec when;

    if (cu_get_procspeed_1(&base) != 0) return -1;
    cu_get_ctr_1(&ctr);
    if (cu_ctr_to_time_1(&base, ctr, &when) != 0) return -2;
    *seconds = (double)when.tv_sec + (double)when.tv_nsec / 1e9;
    return 0;
}

int c_client_failure(char *text, int size)
{
    static const fc_detail_field_t fields[] = {{"code", FC_DETAIL_INT, 0, sizeof(int)}};
    static const fc_err_tbl_t entry = {3, "C_CLIENT_ER", 1, 1, "A C program failed.", 1, fields};
    const int code = -9;

    return fc_mk_syslog_msg_1(&entry, &code, sizeof code, text, size, (nl_catd)-1);
}
