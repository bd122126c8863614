#include "recording/writers.h"

namespace
{
using namespace qn::test;

constexpr uint16_t identifier = 1;
constexpr uint16_t data_blocks = 3;
constexpr uint16_t values_32 = 12;
constexpr uint16_t values_64 = 13;
constexpr uint16_t error = 14;
constexpr uint16_t strings = 15;

constexpr qn_uint32_t id = 0x01020304;
constexpr qn_uint32_t no_id = 0xFFFFFFFF;
const qn_int64_t long_value = -0x123456789ABCDEF0;

void add_ids(std::vector<writer_call> &all)
{
    const expected_bytes body = expected_bytes().u32(id);
    all.push_back({"tr_ms_record_id_1", identifier, true,
                   [](const char *c, tr_file_token_t token) { return tr_ms_record_id_1(c, id, token); }, body});
    all.push_back({"tr_record_id_1", identifier, false,
                   [](const char *c, tr_file_token_t) { return tr_record_id_1(c, id); }, body});
}

void add_strings(std::vector<writer_call> &all)
{
    const expected_bytes body = expected_bytes().u32(id).u32(2).u32(12).string("abc").string("defghij");
    all.push_back({"tr_ms_record_strings_v_1", strings, true,
                   [](const char *c, tr_file_token_t token) {
                       return with_list([=](va_list args) { return tr_ms_record_strings_v_1(c, id, token, 2, args); },
                                        0, "abc", "defghij");
                   },
                   body});
    all.push_back({"tr_record_strings_v_1", strings, false,
                   [](const char *c, tr_file_token_t) {
                       return with_list([=](va_list args) { return tr_record_strings_v_1(c, id, 2, args); }, 0, "abc",
                                        "defghij");
                   },
                   body});
    all.push_back(
        {"tr_ms_record_strings_1", strings, true,
         [](const char *c, tr_file_token_t token) { return tr_ms_record_strings_1(c, id, token, 2, "abc", "defghij"); },
         body});
    all.push_back({"tr_record_strings_1", strings, false,
                   [](const char *c, tr_file_token_t) { return tr_record_strings_1(c, id, 2, "abc", "defghij"); },
                   body});
    all.push_back({"tr_record_string_1", strings, false,
                   [](const char *c, tr_file_token_t) { return tr_record_string_1(c, "abc"); },
                   expected_bytes().u32(no_id).u32(1).u32(4).string("abc")});
}

void add_formatted(std::vector<writer_call> &all)
{
    const expected_bytes body = expected_bytes().u32(id).u32(1).u32(8).string("-5 text");
    const expected_bytes body_without_id = expected_bytes().u32(no_id).u32(1).u32(8).string("-5 text");
    all.push_back({"tr_ms_record_vfmt_string_1", strings, true,
                   [](const char *c, tr_file_token_t token) {
                       return with_list(
                           [=](va_list args) { return tr_ms_record_vfmt_string_1(c, id, token, "%d %s", args); }, 0, -5,
                           "text");
                   },
                   body});
    all.push_back({"tr_record_vfmt_string_1", strings, false,
                   [](const char *c, tr_file_token_t) {
                       return with_list([=](va_list args) { return tr_record_vfmt_string_1(c, id, "%d %s", args); }, 0,
                                        -5, "text");
                   },
                   body});
    all.push_back({"tr_ms_record_fmt_string_1", strings, true,
                   [](const char *c, tr_file_token_t token) {
                       return tr_ms_record_fmt_string_1(c, id, token, "%d %s", -5, "text");
                   },
                   body});
    all.push_back({"tr_record_fmt_string_1", strings, false,
                   [](const char *c, tr_file_token_t) { return tr_record_fmt_string_1(c, id, "%d %s", -5, "text"); },
                   body});
    all.push_back({"tr_record_vprintf_1", strings, false,
                   [](const char *c, tr_file_token_t) {
                       return with_list([=](va_list args) { return tr_record_vprintf_1(c, "%d %s", args); }, 0, -5,
                                        "text");
                   },
                   body_without_id});
    all.push_back({"tr_record_printf_1", strings, false,
                   [](const char *c, tr_file_token_t) { return tr_record_printf_1(c, "%d %s", -5, "text"); },
                   body_without_id});
}

void add_data(std::vector<writer_call> &all)
{
    const expected_bytes body = expected_bytes().u32(id).u32(2).u32(4).raw("WXYZ").u32(8).raw("12345678");
    all.push_back({"tr_ms_record_data_v_1", data_blocks, true,
                   [](const char *c, tr_file_token_t token) {
                       return with_list([=](va_list args) { return tr_ms_record_data_v_1(c, id, token, 2, args); }, 0,
                                        "WXYZ", 4, "12345678", 8);
                   },
                   body});
    all.push_back({"tr_record_data_v_1", data_blocks, false,
                   [](const char *c, tr_file_token_t) {
                       return with_list([=](va_list args) { return tr_record_data_v_1(c, id, 2, args); }, 0, "WXYZ", 4,
                                        "12345678", 8);
                   },
                   body});
    all.push_back({"tr_ms_record_data_1", data_blocks, true,
                   [](const char *c, tr_file_token_t token) {
                       return tr_ms_record_data_1(c, id, token, 2, "WXYZ", 4, "12345678", 8);
                   },
                   body});
    all.push_back({"tr_record_data_1", data_blocks, false,
                   [](const char *c, tr_file_token_t) { return tr_record_data_1(c, id, 2, "WXYZ", 4, "12345678", 8); },
                   body});
}

void add_values_32(std::vector<writer_call> &all)
{
    const expected_bytes body = expected_bytes().u32(id).u32(3).u32(7).u32(0xFFFFFFF8).u32(9);
    all.push_back({"tr_ms_record_values_32_v_1", values_32, true,
                   [](const char *c, tr_file_token_t token) {
                       return with_list([=](va_list args) { return tr_ms_record_values_32_v_1(c, id, token, 3, args); },
                                        0, 7, -8, 9);
                   },
                   body});
    all.push_back({"tr_record_values_32_v_1", values_32, false,
                   [](const char *c, tr_file_token_t) {
                       return with_list([=](va_list args) { return tr_record_values_32_v_1(c, id, 3, args); }, 0, 7, -8,
                                        9);
                   },
                   body});
    all.push_back(
        {"tr_ms_record_values_32_1", values_32, true,
         [](const char *c, tr_file_token_t token) { return tr_ms_record_values_32_1(c, id, token, 3, 7, -8, 9); },
         body});
    all.push_back({"tr_record_values_32_1", values_32, false,
                   [](const char *c, tr_file_token_t) { return tr_record_values_32_1(c, id, 3, 7, -8, 9); }, body});
    all.push_back({"tr_record_int32_1", values_32, false,
                   [](const char *c, tr_file_token_t) { return tr_record_int32_1(c, id, -2); },
                   expected_bytes().u32(id).u32(1).u32(0xFFFFFFFE)});
    all.push_back({"tr_record_uint32_1", values_32, false,
                   [](const char *c, tr_file_token_t) { return tr_record_uint32_1(c, id, 0xFFFFFFFD); },
                   expected_bytes().u32(id).u32(1).u32(0xFFFFFFFD)});
    all.push_back({"tr_record_int32_2_1", values_32, false,
                   [](const char *c, tr_file_token_t) { return tr_record_int32_2_1(c, id, -2, 3); },
                   expected_bytes().u32(id).u32(2).u32(0xFFFFFFFE).u32(3)});
    all.push_back({"tr_record_uint32_2_1", values_32, false,
                   [](const char *c, tr_file_token_t) { return tr_record_uint32_2_1(c, id, 0x80000000, 3); },
                   expected_bytes().u32(id).u32(2).u32(0x80000000).u32(3)});
}

void add_values_64(std::vector<writer_call> &all)
{
    const qn_uint64_t bits = static_cast<qn_uint64_t>(long_value);
    const expected_bytes body = expected_bytes().u32(id).u32(2).u64(bits).u64(5);
    all.push_back({"tr_ms_record_values_64_v_1", values_64, true,
                   [](const char *c, tr_file_token_t token) {
                       return with_list([=](va_list args) { return tr_ms_record_values_64_v_1(c, id, token, 2, args); },
                                        0, long_value, qn_int64_t{5});
                   },
                   body});
    all.push_back({"tr_record_values_64_v_1", values_64, false,
                   [](const char *c, tr_file_token_t) {
                       return with_list([=](va_list args) { return tr_record_values_64_v_1(c, id, 2, args); }, 0,
                                        long_value, qn_int64_t{5});
                   },
                   body});
    all.push_back({"tr_ms_record_values_64_1", values_64, true,
                   [](const char *c, tr_file_token_t token) {
                       return tr_ms_record_values_64_1(c, id, token, 2, long_value, qn_int64_t{5});
                   },
                   body});
    all.push_back(
        {"tr_record_values_64_1", values_64, false,
         [](const char *c, tr_file_token_t) { return tr_record_values_64_1(c, id, 2, long_value, qn_int64_t{5}); },
         body});
    all.push_back({"tr_record_int64_1", values_64, false,
                   [](const char *c, tr_file_token_t) { return tr_record_int64_1(c, id, long_value); },
                   expected_bytes().u32(id).u32(1).u64(bits)});
    all.push_back({"tr_record_uint64_1", values_64, false,
                   [](const char *c, tr_file_token_t) { return tr_record_uint64_1(c, id, ~0ULL - 1); },
                   expected_bytes().u32(id).u32(1).u64(~0ULL - 1)});
    all.push_back({"tr_record_int64_2_1", values_64, false,
                   [](const char *c, tr_file_token_t) { return tr_record_int64_2_1(c, id, long_value, 5); }, body});
    all.push_back({"tr_record_uint64_2_1", values_64, false,
                   [](const char *c, tr_file_token_t) { return tr_record_uint64_2_1(c, id, ~0ULL, 5); },
                   expected_bytes().u32(id).u32(2).u64(~0ULL).u64(5)});
}

void add_errors(std::vector<writer_call> &all)
{
    expected_bytes body;
    body.u32(id).u32(18).u32(123);                               // trace id, error id, line
    body.u32(72).u32(80).u32(88).u32(5).u32(6).u32(96).u32(104); // where the strings are; message set and number
    body.u32(0).string("do_this").string("file.cc").string("ffdc-id").string("app.cat").string("Failed.");
    all.push_back({"tr_ms_record_error_1", error, true,
                   [](const char *c, tr_file_token_t token) {
                       cu_error_t *given = sample_error();
                       return tr_ms_record_error_1(c, id, token, "do_this", 123, "file.cc", &given);
                   },
                   body});
    all.push_back({"tr_record_error_1", error, false,
                   [](const char *c, tr_file_token_t) {
                       cu_error_t *given = sample_error();
                       return tr_record_error_1(c, id, "do_this", 123, "file.cc", &given);
                   },
                   body});
}
} // namespace

namespace qn::test
{
const std::vector<writer_call> &all_writers()
{
    static const std::vector<writer_call> writers = [] {
        std::vector<writer_call> all;
        add_ids(all);
        add_strings(all);
        add_formatted(all);
        add_data(all);
        add_values_32(all);
        add_values_64(all);
        add_errors(all);
        return all;
    }();
    return writers;
}

cu_error_t *sample_error()
{
    static char ffdc_id[] = "ffdc-id";
    static char catalogue[] = "app.cat";
    static char text[] = "Failed.";
    static thread_local cu_error_t sample{};
    sample.cu_error_id = 18;
    sample.cu_ffdc_id = ffdc_id;
    sample.cu_msg_cat = catalogue;
    sample.cu_msg_set = 5;
    sample.cu_msg_num = 6;
    sample.cu_msg_default = text;
    return &sample;
}
} // namespace qn::test
