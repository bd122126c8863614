// The calling thread's error record, as a client sees it, and the usual client.
#pragma once

#include <string>
#include <vector>

#include <qn_tr.h>

namespace qn::test
{
struct error_seen {
    int code = 0;
    int message_number = 0;
    std::string text; // the default text with its inserts, as cu_get_errmsg_1 gives it
};

error_seen last_error();

// Leaves a marker error, so that a test sees whether a call touched the record.
inline constexpr int marker_code = 4711;
void leave_marker();
bool marker_is_there();

// A component with `count` categories named c0, c1, ...: ids 0, 1, ..., default level 3, minimum level 1 unless said.
struct client {
    explicit client(const char *id, qn_uint32_t count = 1, qn_uint32_t minimum = 1);
    qn_int32_t register_now(); // what the registration returned

    std::string id;
    std::vector<tr_detail_level_t> levels;
    std::vector<std::string> names;
    std::vector<tr_category_description_t> categories;
    tr_file_token_t *tokens = nullptr;
};
} // namespace qn::test
