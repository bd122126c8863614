/*
 * qn_ffdc.h - first-failure data capture: one report per failure, in the system log and in a file, under one
 * identifier.
 *
 * Link with -lqn_ffdc. Valid C11 and C++. Any thread may call these functions at any time; none is a
 * cancellation point.
 *
 * A component keeps a table of its failures (fc_err_tbl_t). To report one it builds the text for the system
 * log, which may come from its message catalogue, and then files the report:
 *
 *   char text[946];
 *   fc_eid_t id;
 *   fc_mk_syslog_msg_1(&table[0], &state, sizeof state, text, sizeof text, catalogue);
 *   fc_log_error_1(id, 0, "trace", "OPAL", __FILE__, "1.0", __LINE__, 0, FC_EVENT_ERROR, table[0].fc_error_id,
 *                  &state, sizeof state, NULL, text);
 */
#ifndef QN_FFDC_H
#define QN_FFDC_H

#include <nl_types.h>
#include <qn.h>
#include <stddef.h>

QN_BEGIN_DECLS

/*
 * A failure identifier: 42 characters and a NUL. It reads HOST.TIME.PROCESS, all hexadecimal: 16 digits for the
 * host, 16 for the nanoseconds since the epoch, 8 for the process id and a running number. Unique without
 * asking anybody.
 */
typedef char fc_eid_t[43];

/* How bad an event is; the system log's priorities are LOG_ERR, LOG_WARNING and LOG_INFO. Other values count as
 * FC_EVENT_ERROR. */
enum { FC_EVENT_ERROR = 0, FC_EVENT_WARNING = 1, FC_EVENT_INFO = 2 };

/* How a field of the detail data is shown. */
typedef enum fc_detail_type {
    FC_DETAIL_HEX = 0,     /* hexadecimal digits, byte by byte */
    FC_DETAIL_TEXT = 1,    /* characters up to a NUL or the end of the field */
    FC_DETAIL_INT = 2,     /* a signed native integer of 1, 2, 4 or 8 bytes, in decimal */
    FC_DETAIL_UNSIGNED = 3 /* the same, unsigned */
} fc_detail_type_t;

/* One field of the detail data that goes with a failure. */
typedef struct fc_detail_field {
    const char *fc_field_name;
    fc_detail_type_t fc_field_type;
    unsigned fc_field_offset; /* bytes from the start of the detail data */
    unsigned fc_field_length; /* bytes */
} fc_detail_field_t;

/* A kind of failure, as a component's error table lists it. Strings may be null. */
typedef struct fc_err_tbl {
    int fc_error_id;                /* number of the failure within the component */
    const char *fc_label;           /* short name, in capitals by custom */
    int fc_desc_msg_set;            /* where the description is in the component's catalogue: message set */
    int fc_desc_msg_num;            /* and message number */
    const char *fc_desc_default;    /* the description where the catalogue has none; plain text, no inserts */
    unsigned fc_detail_field_count; /* fields in fc_detail_fields; 0: the detail data are shown whole, in
                                       hexadecimal */
    const fc_detail_field_t *fc_detail_fields; /* may be null when there is none */
} fc_err_tbl_t;

/*
 * Builds the system-log text of a failure: "DESCRIPTION [LABEL] detail ...", in one line.
 *
 *   entry            the kind of failure; null: only the detail data are shown
 *   detail_data      data captured at the failure, or null
 *   detail_data_len  their length in bytes; 0 and less mean none
 *   buffer           receives the text, cut if need be, always with a NUL
 *   buffer_size      bytes in buffer
 *   catalogue        open message catalogue for the description, (nl_catd)-1 for none
 *
 * The description is plain text, never used as a format; control characters become blanks. A field that reaches
 * beyond the detail data is left out.
 *
 * Returns the length of the text in buffer, or -1 when buffer is null or buffer_size is not positive.
 */
QN_EXPORT int fc_mk_syslog_msg_1(const fc_err_tbl_t *entry, const void *detail_data, int detail_data_len, char *buffer,
                                 int buffer_size, nl_catd catalogue);

/*
 * Files the report of a failure: makes its identifier, writes one line to the system log and, when the folder
 * /var/qn/ffdc exists, appends the record to /var/qn/ffdc/COMPONENT.log.
 *
 *   id                receives the identifier; may be null
 *   reserved0         0
 *   component         who reports, such as "trace"; also names the file, where characters other than letters, digits,
 *                     - and _ become _
 *   subsystem         part of the product, such as "OPAL"
 *   file, vers, line  where in which version of the source the failure was found
 *   reserved1         0
 *   log_event         FC_EVENT_ERROR, FC_EVENT_WARNING or FC_EVENT_INFO
 *   error_id          number of the failure within the component
 *   detail_data       data captured at the failure, or null; the first 4096 bytes are filed, in hexadecimal
 *   detail_data_len   their length in bytes; 0 and less mean none
 *   detail_data_file  path of a file with more data, or null; it is named in the record, not read
 *   syslog_text       text for the system log, as fc_mk_syslog_msg_1 makes it, or null
 *
 * Any pointer may be null; what it stands for is then missing from the record. The record is text, one "key:
 * value" per line with an empty line behind it, and reaches the file by one write: records of several processes
 * do not mix. Of a record for which the disk has no room a piece may be there; the next one begins behind an empty
 * line.
 * Only a regular file is written (ENXIO), and none beyond the process's file size limit (EFBIG). The file is created
 * with mode 0640. The identity that the application gave to openlog() stays.
 *
 * A fork waits until no thread writes to the system log, for a second at most; the child's reports are in the files
 * alone when one still does. So are those of a signal handler that interrupted the writing of a line.
 *
 * Returns 0, also without the folder; the errno value when the record could not be appended (identifier and
 * system log are there all the same); ENOMEM when there is no memory, with only the identifier made.
 */
QN_EXPORT int fc_log_error_1(fc_eid_t id, int reserved0, const char *component, const char *subsystem, const char *file,
                             const char *vers, int line, int reserved1, int log_event, int error_id,
                             const void *detail_data, int detail_data_len, const char *detail_data_file,
                             const char *syslog_text);

QN_END_DECLS

#endif /* QN_FFDC_H */
