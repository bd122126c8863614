/*
 * qn_cu.h - common utilities: error records, the counter and its time base, cluster identity, process helpers.
 *
 * Link with -lqn_cu. Valid C11 and C++. What holds for every function unless its comment says otherwise:
 *
 *  - Any thread may call it at any time, before main and from exit handlers too.
 *  - None is a cancellation point: a cancelled thread finishes the call it is in. (The calls of cu_tr_proxy.h
 *    are the exception, they run another library's code.) Asynchronous cancellation is not supported.
 *  - A result of type int is 0 on success and otherwise the errno value that tells why; errno itself is not
 *    part of the result. On failure an output holds nothing of use, but never garbage that would be unsafe to
 *    release.
 *  - Descriptors are closed before the function returns. They are opened close-on-exec, but for that of the
 *    message catalogue, which the C library opens.
 */
#ifndef QN_CU_H
#define QN_CU_H

#include <qn.h>
#include <stddef.h>
#include <sys/types.h>
#include <time.h>

struct timespec; /* which strict ISO C before C11 does not have in <time.h> */

QN_BEGIN_DECLS

/* ---- error records ---- */

/* What an insert of a message is. The values are stored in trace files and never change. */
typedef enum cu_error_arg_type {
    CU_ERROR_ARG_INT = 0,       /* cu_int: %d and its kin, also with h or hh; %c; a '*' */
    CU_ERROR_ARG_LONG = 1,      /* cu_long: with l, z, t or j */
    CU_ERROR_ARG_LONG_LONG = 2, /* cu_long_long: with ll, q or L */
    CU_ERROR_ARG_DOUBLE = 3,    /* cu_double: %f %e %g %a; with L the value is rounded to a double */
    CU_ERROR_ARG_RESERVED = 4,  /* never set */
    CU_ERROR_ARG_CHAR_STR = 5,  /* cu_char_str: %s; the record's own copy, or null */
    CU_ERROR_ARG_VOID_PTR = 6   /* cu_void_ptr: %p; never followed */
} cu_error_arg_type_t;

/* One insert. The type says which member of the union holds it; the rest of the union is zero. */
typedef struct cu_error_arg {
    cu_error_arg_type_t cu_arg_type;
    union {
        int cu_int;
        long cu_long;
        long long cu_long_long;
        double cu_double;
        char *cu_char_str;
        void *cu_void_ptr;
    } cu_arg_value;
} cu_error_arg_t;

/*
 * An error: what happened, and the message that tells a human so. Every string may be null.
 */
typedef struct cu_error {
    int cu_error_id;         /* 0: no error */
    char *cu_ffdc_id;        /* identifier of the first-failure record that belongs to it */
    char *cu_msg_cat;        /* message catalogue, as catopen takes it */
    int cu_msg_set;          /* message set in the catalogue */
    int cu_msg_num;          /* message number in the set */
    char *cu_msg_default;    /* text where the catalogue has none, with printf conversions */
    unsigned cu_arg_cnt;     /* inserts in cu_args */
    cu_error_arg_t *cu_args; /* the inserts, in argument order; null when there is none */
} cu_error_t;

/*
 * Replaces the calling thread's error record.
 *
 *   error_id     the error's number, any value but 0
 *   ffdc_id      identifier of a first-failure record, or null
 *   msg_cat      name of the message catalogue, or null
 *   msg_set      message set, from 1
 *   msg_num      message number, from 1
 *   msg_default  default text, or null; its printf conversions say which inserts follow, so exactly those must
 * follow
 *   ...          the inserts
 *
 * Strings and inserts are copied; the caller's may go away after the call. Understood are the conversions
 * d i u o x X c s p e E f F g G a A %, the flags, a width and a precision (numbers or '*'), the lengths hh h l
 * ll q L j z t, and positions ("%2$s %1$d", up to 64). C and S and l with c or s (wide characters) are kept as
 * multibyte text, and n takes its argument and leaves it alone. Of a string with a precision no more is read, or
 * kept, than is shown; like printf's it need not end with a NUL. The reading of inserts stops for good at a
 * conversion that is none of these: it cannot be known what follows.
 *
 * Returns error_id, so that a function can end with "return cu_set_error_1(...)". It does not fail: when no
 * memory is left the record holds the id, message set and number and nothing else.
 *
 * There is no format attribute on purpose: the text usually comes from a message table, which the compiler
 * cannot see into.
 *
 *   return cu_set_error_1(18, NULL, "app.cat", 1, 18, "Error %d opening %s.\n", errno, path);
 */
QN_EXPORT int cu_set_error_1(int error_id, const char *ffdc_id, const char *msg_cat, int msg_set, int msg_num,
                             const char *msg_default, ...);

/*
 * Empties the calling thread's error record: the last operation went well. Returns 0.
 */
QN_EXPORT int cu_set_no_error_1(void);

/*
 * Stores in *error a copy of the calling thread's error record; all of it belongs to the caller, who releases
 * it with cu_rel_error_1, in any thread. Without an error the copy has cu_error_id 0. Does not change the
 * record.
 *
 * Returns 0; EINVAL when error is null; ENOMEM, with *error null, when there is no memory.
 */
QN_EXPORT int cu_get_error_1(cu_error_t **error);

/*
 * Releases a record that cu_get_error_1 made, its strings included. Null is ignored.
 */
QN_EXPORT void cu_rel_error_1(cu_error_t *error);

/*
 * Stores in *text the message of an error, with its inserts filled in; the caller releases it with free().
 *
 * The text is the catalogue's (found by NLSPATH and the locale's LC_MESSAGES; without NLSPATH under /usr/share/locale
 * alone, so that what was installed elsewhere needs it) when there is one and its
 * conversions fit the recorded inserts, otherwise cu_msg_default. A catalogue is data from outside: whatever
 * conversions it has, only recorded inserts of the right type are read. A conversion of the default text that
 * has no insert stays as it is written. A width, or the precision of a number, counts for at most 4095. The
 * precision of a string counts bytes; it does not cut a wide character in two. A null string insert reads
 * "(null)". Without any text the result is "".
 *
 * Returns 0; EINVAL when an argument is null; ENOMEM, with *text null, when there is no memory.
 */
QN_EXPORT int cu_get_errmsg_1(const cu_error_t *error, char **text);

/* ---- time ---- */

/*
 * The line that leads from counter values to wall-clock time. It is stored in trace files: 16 bytes, native
 * byte order.
 */
typedef struct cu_timeinfo {
    qn_uint64_t timeinfo1; /* counter ticks per second of CLOCK_REALTIME */
    qn_uint64_t timeinfo2; /* nanoseconds since the epoch at counter value 0; two's complement when negative */
} cu_timeinfo_t;

/*
 * Stores the counter in *ctr: the processor's time-stamp counter where it is invariant and the kernel trusts
 * it, otherwise the nanoseconds of CLOCK_MONOTONIC. The choice never changes while the process lives. Costs
 * what reading the counter costs. ctr must not be null and may have any alignment. Also safe in signal handlers.
 */
QN_EXPORT void cu_get_ctr_1(qn_uint64_t *ctr);

/*
 * Stores in *timeinfo the rate of the counter and a time base taken from the clock now.
 *
 * The first call of a process measures the rate: 0.4 ms where the thread keeps the processor, a little more than 1 ms
 * where nothing but the measurement tells. A thread that loses the processor meanwhile measures again, so on a busy
 * machine one call in ten takes some 5 ms, one in a hundred 15 ms, and there is no upper bound. Later calls take a few
 * microseconds; now and then they check the rate by the time since the library was loaded, and correct it if need be.
 *
 * Times converted with the result stay within 1 microsecond of CLOCK_REALTIME for a minute and more, for counters from
 * before the call too, as long as the clock is not set and its discipline (adjtimex) is not changed, from a second
 * before the call on. Where the kernel does not keep time by the counter itself, the rate is as good as its
 * measurement: 1e-8, on a busy machine 5e-8, which is 3 microseconds in a minute.
 *
 * Returns 0, EINVAL when timeinfo is null, or the error of the clock.
 */
QN_EXPORT int cu_get_procspeed_1(cu_timeinfo_t *timeinfo);

/*
 * Re-bases *timeinfo in place: after a clock step or a long time, the line passes through the clock's time of
 * now again. The rate is replaced by the present one, which a longer life of the process may have made more
 * exact. What *timeinfo held does not matter.
 *
 * Returns 0, EINVAL when timeinfo is null, or the error of the clock.
 */
QN_EXPORT int cu_compute_base_timeinfo_1(cu_timeinfo_t *timeinfo);

/*
 * Stores in *time the wall-clock time of counter value ctr: exact arithmetic, rounded down to the nanosecond.
 * tv_nsec is always 0 to 999999999, for times before the epoch too.
 *
 * Returns 0; EINVAL when an argument is null or timeinfo1 is 0; EOVERFLOW when the time does not fit a time_t.
 *
 *   cu_timeinfo_t base;  qn_uint64_t ctr;  struct timespec when;
 *   cu_get_procspeed_1(&base);
 *   cu_get_ctr_1(&ctr);
 *   cu_ctr_to_time_1(&base, ctr, &when);
 */
QN_EXPORT int cu_ctr_to_time_1(const cu_timeinfo_t *timeinfo, qn_uint64_t ctr, struct timespec *time);

/*
 * Stores CLOCK_REALTIME in *time. Returns 0, EINVAL when time is null, or the error of the clock.
 */
QN_EXPORT int cu_get_current_time_1(struct timespec *time);

/* ---- cluster ---- */

/*
 * Which cluster this host belongs to. A value longer than its field is cut; both strings always end with a NUL.
 */
typedef struct cu_cluster_info {
    char cu_cluster_ID[64];
    char cu_cluster_name[64];
    qn_int32_t cu_node_number; /* this host's number in the cluster */
} cu_cluster_info_t;

/*
 * Stores the cluster's identity in *info, as /var/qn/cfg/cluster.conf gives it at this moment:
 *
 *   # any text
 *   cluster_name = production
 *   cluster_id   = 7f3a
 *   node_number  = 3
 *   node_id      = 00c0ffee00c0ffee   # hexadecimal, see cu_get_node_id_1
 *
 * '#' starts a comment anywhere in a line. Blanks around key and value do not count; lines that make no sense
 * are ignored, and of two lines with the same key the last one holds. A missing string is "", a missing number
 * 0. Only whole lines in the first 64 KiB count.
 *
 * Returns 0; EINVAL when info is null; the error of opening or reading the file (ENOENT: no cluster here), with
 * *info all zero.
 */
QN_EXPORT int cu_get_cluster_info_1(cu_cluster_info_t *info);

/*
 * Stores in *node_id the number that identifies this host: node_id of the file above, else the first 16
 * hexadecimal digits of /etc/machine-id.
 *
 * Returns 0; EINVAL when node_id is null; with *node_id 0, the error of opening or reading /etc/machine-id, or
 * ENODATA when it does not begin with 16 hexadecimal digits.
 */
QN_EXPORT int cu_get_node_id_1(qn_uint64_t *node_id);

/* ---- processes, groups, signals ---- */

/*
 * Stores in buffer the arguments of process pid as the kernel keeps them: each with its NUL, one behind the
 * other. What does not fit into size bytes is cut; the buffer always ends in a NUL. Read as a C string it is
 * the command as it was invoked, "" for a process that has no arguments (a kernel thread, a zombie).
 *
 * Returns 0; EINVAL when buffer is null or size 0; otherwise the error of opening or reading (ENOENT: no such
 * process), with an empty string in the buffer.
 */
QN_EXPORT int cu_get_proc_args_1(pid_t pid, char *buffer, size_t size);

/*
 * Stores in *gid the number of the group "qnadm", whose members administer the software family. It is a group of
 * the machine, in /etc/group.
 *
 * Returns 0; EINVAL when gid is null; ENOENT when there is no such group; otherwise the error of opening or
 * reading that file.
 */
QN_EXPORT int cu_getadmin_group_id_1(gid_t *gid);

/*
 * Blocks every signal in the calling thread except those that the thread brings upon itself: SIGSEGV, SIGBUS,
 * SIGFPE, SIGILL, SIGTRAP, SIGSYS and SIGABRT. Blocking these would not save the thread, it would only lose the
 * handler. A library's helper thread calls this first, so that the application's signals go to the
 * application's threads.
 *
 * Returns 0 or the error of changing the mask.
 */
QN_EXPORT int cu_block_thread_allsig_except_syncsig_1(void);

QN_END_DECLS

#endif /* QN_CU_H */
