#include "support/last_error.h"

#include <cstdlib>

namespace qn::test
{
error_seen last_error()
{
    error_seen seen;
    cu_error_t *error = nullptr;
    if (cu_get_error_1(&error) != 0 || error == nullptr) return seen;
    seen.code = error->cu_error_id;
    seen.message_number = error->cu_msg_num;
    char *text = nullptr;
    if (cu_get_errmsg_1(error, &text) == 0 && text != nullptr) seen.text = text;
    std::free(text);
    cu_rel_error_1(error);
    return seen;
}

void leave_marker() { cu_set_error_1(marker_code, nullptr, "none.cat", 1, 1, "marker"); }

bool marker_is_there() { return last_error().code == marker_code; }

client::client(const char *component, qn_uint32_t count, qn_uint32_t minimum) : id(component), levels(count, 0xEE)
{
    for (qn_uint32_t i = 0; i < count; ++i) names.push_back("c" + std::to_string(i));
    for (qn_uint32_t i = 0; i < count; ++i) categories.push_back({i, names[i].c_str(), 3, minimum});
}

qn_int32_t client::register_now()
{
    return tr_ms_register_component_1(id.c_str(), levels.data(), categories.data(),
                                      static_cast<qn_uint32_t>(categories.size()), &tokens);
}
} // namespace qn::test
