// How the library reports what went wrong: to the caller, to standard error, to first-failure data capture.
#pragma once

// Record an error for the calling thread in the common-utilities library, with a message of "qn_tr.cat", and return
// error_code for the caller to return. A message number outside 1 to 40 selects a text that says so.
int set_error(int error_code, int msg_code);
int set_error_int(int error_code, int msg_code, int insert);
int set_error_str(int error_code, int msg_code, const char *insert);

// Reports a ring that cannot be written any more, which no caller can be told: one line on standard error.
void log_trc_error(const char *err_str, char opt);

// Files a first-failure record for entry err_idx of fc_errtbl_trace.
void log_error(int err_idx, char *file, int line, char *vers, int log_event, void *detail_data, int detail_data_len,
               char *detail_data_file);
