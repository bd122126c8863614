// An error record in one piece of memory. Pure functions, no state.
#include "platform/cu/error_copy.h"

#include <cstdlib>
#include <cstring>

namespace qn::cu
{
namespace
{
static_assert(sizeof(cu_error_t) % alignof(cu_error_arg_t) == 0, "the inserts follow the structure without a gap");

size_t bytes_of(const char *text) { return text != nullptr ? std::strlen(text) + 1 : 0; }

bool is_string(const cu_error_arg_t &arg) { return arg.cu_arg_type == CU_ERROR_ARG_CHAR_STR; }

unsigned insert_count(const cu_error_t &error) { return error.cu_args != nullptr ? error.cu_arg_cnt : 0; }

size_t total_bytes(const cu_error_t &error)
{
    size_t bytes = sizeof error + insert_count(error) * sizeof(cu_error_arg_t);
    bytes += bytes_of(error.cu_ffdc_id) + bytes_of(error.cu_msg_cat) + bytes_of(error.cu_msg_default);
    for (unsigned i = 0; i < insert_count(error); ++i)
        if (is_string(error.cu_args[i])) bytes += bytes_of(error.cu_args[i].cu_arg_value.cu_char_str);
    return bytes;
}

// Moves `text` to the place `free`, which goes on behind it.
void settle(char *&text, char *&free)
{
    if (text == nullptr) return;
    const size_t bytes = bytes_of(text);
    std::memcpy(free, text, bytes);
    text = free;
    free += bytes;
}
} // namespace

cu_error_t *copy_error(const cu_error_t &error)
{
    char *memory = static_cast<char *>(std::malloc(total_bytes(error)));
    if (memory == nullptr) return nullptr;
    auto *copy = reinterpret_cast<cu_error_t *>(memory);
    *copy = error;
    copy->cu_arg_cnt = insert_count(error);
    copy->cu_args = copy->cu_arg_cnt > 0 ? reinterpret_cast<cu_error_arg_t *>(memory + sizeof *copy) : nullptr;
    if (copy->cu_args != nullptr) std::memcpy(copy->cu_args, error.cu_args, copy->cu_arg_cnt * sizeof *copy->cu_args);

    char *free = memory + sizeof *copy + copy->cu_arg_cnt * sizeof *copy->cu_args;
    settle(copy->cu_ffdc_id, free);
    settle(copy->cu_msg_cat, free);
    settle(copy->cu_msg_default, free);
    for (unsigned i = 0; i < copy->cu_arg_cnt; ++i)
        if (is_string(copy->cu_args[i])) settle(copy->cu_args[i].cu_arg_value.cu_char_str, free);
    return copy;
}
} // namespace qn::cu
