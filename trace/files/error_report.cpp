// Error records, the line on standard error, first-failure records. No lock: the error record is the thread's own.
#include "trace/files/error_report.h"

#include <cstdio>
#include <cstring>
#include <ctime>
#include <nl_types.h>

#include <qn_cu.h>
#include <qn_ffdc.h>

#include "platform/common/descriptors.h"
#include "trace/trace_etbl.h"
#include "trace/trapi_set.h"

namespace
{
constexpr const char *catalogue = "qn_tr.cat";
constexpr int message_set = 1;

const char *default_text(int msg_code)
{
    const bool known = msg_code >= 1 && msg_code < trapi_set_messages;
    return known ? cu_mesgtbl_trapi_set[msg_code] : cu_badid_trapi_set;
}

// The one way out: passes just the insert that the text asks for, since a text may be raised without its insert.
int record_error(int error_code, int msg_code, int number, const char *string)
{
    const char *text = default_text(msg_code);
    if (std::strstr(text, "%s") != nullptr)
        return cu_set_error_1(error_code, nullptr, catalogue, message_set, msg_code, text, string);
    if (std::strstr(text, "%d") != nullptr)
        return cu_set_error_1(error_code, nullptr, catalogue, message_set, msg_code, text, number);
    return cu_set_error_1(error_code, nullptr, catalogue, message_set, msg_code, text);
}

// Closes a message catalogue when it goes out of scope, cancelled or not.
class open_catalogue
{
public:
    explicit open_catalogue(const char *name) : catd_(qn::platform::open_messages(name)) {}
    open_catalogue(const open_catalogue &) = delete;
    open_catalogue &operator=(const open_catalogue &) = delete;
    ~open_catalogue()
    {
        if (catd_ != reinterpret_cast<nl_catd>(-1)) catclose(catd_);
    }
    nl_catd get() const { return catd_; }

private:
    nl_catd catd_;
};
} // namespace

int set_error(int error_code, int msg_code) { return record_error(error_code, msg_code, 0, ""); }

int set_error_int(int error_code, int msg_code, int insert) { return record_error(error_code, msg_code, insert, ""); }

int set_error_str(int error_code, int msg_code, const char *insert)
{
    return record_error(error_code, msg_code, 0, insert != nullptr ? insert : "");
}

void log_trc_error(const char *err_str, char opt)
{
    const time_t now = time(nullptr);
    char text[64];
    const qn::platform::standard_numbers_taken other_numbers; // than that of the time zone's file
    if (ctime_r(&now, text) == nullptr) text[0] = '\0';
    std::fprintf(stderr, "%s%c:%s", text, opt, err_str);
}

void log_error(int err_idx, char *file, int line, char *vers, int log_event, void *detail_data, int detail_data_len,
               char *detail_data_file)
{
    if (err_idx < 0 || err_idx >= trace_failures) return;
    const fc_err_tbl_t &entry = fc_errtbl_trace[err_idx];

    const open_catalogue messages(catalogue);
    char text[946];
    fc_mk_syslog_msg_1(&entry, detail_data, detail_data_len, text, sizeof text, messages.get());

    fc_eid_t id;
    char component[] = "trace";
    char subsystem[] = "OPAL";
    fc_log_error_1(id, 0, component, subsystem, file, vers, line, 0, log_event, entry.fc_error_id, detail_data,
                   detail_data_len, detail_data_file, text);
}
