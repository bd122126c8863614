// The failures that the library can file. The description is message 1 of set 2 of the catalogue.
#include "trace/trace_etbl.h"

const fc_err_tbl_t fc_errtbl_trace[trace_failures] = {
    {.fc_error_id = 0,
     .fc_label = "TR_SP_ERR_ER",
     .fc_desc_msg_set = 2,
     .fc_desc_msg_num = 1,
     .fc_desc_default = "A syntax error in the spooling configuration has occurred.",
     .fc_detail_field_count = 0,
     .fc_detail_fields = nullptr},
};
