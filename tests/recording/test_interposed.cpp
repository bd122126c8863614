// An application's own writers, in a program that is linked against the shared library: the forms that forward to a
// writer come to the application's. Here these take a note and go on to the library's.
#include <cstdarg>
#include <cstdlib>
#include <dlfcn.h>
#include <map>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include <cu_tr_proxy.h>

#include "recording/writers.h"
#include "support/scratch.h"

using namespace qn::test;

namespace
{
using calls = std::vector<std::string>;
calls passed; // the application's writers, in the order of their calls

// Takes the note, and gives the library's function of that name.
template <class Function>
Function *pass_on_to(Function *, const char *name)
{
    passed.emplace_back(name);
    return reinterpret_cast<Function *>(dlsym(RTLD_NEXT, name));
}
} // namespace

#define QN_TEST_LIBRARY_S(FUNCTION) pass_on_to(&FUNCTION, #FUNCTION)

qn_int32_t tr_ms_record_id_1(const qn_char_t *comp, qn_uint32_t id, tr_file_token_t token)
{
    return QN_TEST_LIBRARY_S(tr_ms_record_id_1)(comp, id, token);
}

qn_int32_t tr_ms_record_strings_v_1(const qn_char_t *comp, qn_uint32_t id, tr_file_token_t token, qn_uint32_t count,
                                    va_list args)
{
    return QN_TEST_LIBRARY_S(tr_ms_record_strings_v_1)(comp, id, token, count, args);
}

qn_int32_t tr_record_strings_v_1(const qn_char_t *comp, qn_uint32_t id, qn_uint32_t count, va_list args)
{
    return QN_TEST_LIBRARY_S(tr_record_strings_v_1)(comp, id, count, args);
}

qn_int32_t tr_record_strings_1(const qn_char_t *comp, qn_uint32_t id, qn_uint32_t count, ...)
{
    const auto library_s = QN_TEST_LIBRARY_S(tr_record_strings_1);
    va_list args;
    va_start(args, count);
    const char *first = va_arg(args, const char *);
    const char *second = count > 1 ? va_arg(args, const char *) : nullptr;
    va_end(args);
    return library_s(comp, id, count, first, second);
}

#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
qn_int32_t tr_ms_record_vfmt_string_1(const qn_char_t *comp, qn_uint32_t id, tr_file_token_t token,
                                      const qn_char_t *format, va_list args)
{
    return QN_TEST_LIBRARY_S(tr_ms_record_vfmt_string_1)(comp, id, token, format, args);
}

qn_int32_t tr_record_vfmt_string_1(const qn_char_t *comp, qn_uint32_t id, const qn_char_t *format, va_list args)
{
    return QN_TEST_LIBRARY_S(tr_record_vfmt_string_1)(comp, id, format, args);
}
#pragma GCC diagnostic pop

qn_int32_t tr_ms_record_data_v_1(const qn_char_t *comp, qn_uint32_t id, tr_file_token_t token, qn_uint32_t count,
                                 va_list args)
{
    return QN_TEST_LIBRARY_S(tr_ms_record_data_v_1)(comp, id, token, count, args);
}

qn_int32_t tr_record_data_v_1(const qn_char_t *comp, qn_uint32_t id, qn_uint32_t count, va_list args)
{
    return QN_TEST_LIBRARY_S(tr_record_data_v_1)(comp, id, count, args);
}

qn_int32_t tr_ms_record_values_32_v_1(const qn_char_t *comp, qn_uint32_t id, tr_file_token_t token, qn_uint32_t count,
                                      va_list args)
{
    return QN_TEST_LIBRARY_S(tr_ms_record_values_32_v_1)(comp, id, token, count, args);
}

qn_int32_t tr_record_values_32_v_1(const qn_char_t *comp, qn_uint32_t id, qn_uint32_t count, va_list args)
{
    return QN_TEST_LIBRARY_S(tr_record_values_32_v_1)(comp, id, count, args);
}

qn_int32_t tr_record_values_32_1(const qn_char_t *comp, qn_uint32_t id, qn_uint32_t count, ...)
{
    const auto library_s = QN_TEST_LIBRARY_S(tr_record_values_32_1);
    qn_int32_t values[3] = {};
    va_list args;
    va_start(args, count);
    for (qn_uint32_t i = 0; i < count && i < 3; ++i) values[i] = va_arg(args, qn_int32_t);
    va_end(args);
    return library_s(comp, id, count, values[0], values[1], values[2]);
}

qn_int32_t tr_ms_record_values_64_v_1(const qn_char_t *comp, qn_uint32_t id, tr_file_token_t token, qn_uint32_t count,
                                      va_list args)
{
    return QN_TEST_LIBRARY_S(tr_ms_record_values_64_v_1)(comp, id, token, count, args);
}

qn_int32_t tr_record_values_64_v_1(const qn_char_t *comp, qn_uint32_t id, qn_uint32_t count, va_list args)
{
    return QN_TEST_LIBRARY_S(tr_record_values_64_v_1)(comp, id, count, args);
}

qn_int32_t tr_record_values_64_1(const qn_char_t *comp, qn_uint32_t id, qn_uint32_t count, ...)
{
    const auto library_s = QN_TEST_LIBRARY_S(tr_record_values_64_1);
    qn_int64_t values[2] = {};
    va_list args;
    va_start(args, count);
    for (qn_uint32_t i = 0; i < count && i < 2; ++i) values[i] = va_arg(args, qn_int64_t);
    va_end(args);
    return library_s(comp, id, count, values[0], values[1]);
}

qn_int32_t tr_ms_record_error_1(const qn_char_t *comp, qn_uint32_t id, tr_file_token_t token, const qn_char_t *function,
                                qn_uint32_t line, const qn_char_t *file, cu_error_t **error)
{
    return QN_TEST_LIBRARY_S(tr_ms_record_error_1)(comp, id, token, function, line, file, error);
}

namespace
{
const calls string_forms{"tr_record_strings_1", "tr_record_strings_v_1", "tr_ms_record_strings_v_1"};
const calls format_forms{"tr_record_vfmt_string_1", "tr_ms_record_vfmt_string_1"};
const calls data_forms{"tr_record_data_v_1", "tr_ms_record_data_v_1"};
const calls forms_32{"tr_record_values_32_1", "tr_record_values_32_v_1", "tr_ms_record_values_32_v_1"};
const calls forms_64{"tr_record_values_64_1", "tr_record_values_64_v_1", "tr_ms_record_values_64_v_1"};

calls without_first(const calls &all) { return {all.begin() + 1, all.end()}; }
calls last_of(const calls &all) { return {all.back()}; }

// What a call of each exported writer comes through: itself, where the application has it, then what it forwards to.
const std::map<std::string, calls> expected_calls{
    {"tr_ms_record_id_1", {"tr_ms_record_id_1"}},
    {"tr_record_id_1", {"tr_ms_record_id_1"}},
    {"tr_ms_record_strings_v_1", last_of(string_forms)},
    {"tr_record_strings_v_1", without_first(string_forms)},
    {"tr_ms_record_strings_1", last_of(string_forms)},
    {"tr_record_strings_1", string_forms},
    {"tr_record_string_1", string_forms},
    {"tr_ms_record_vfmt_string_1", last_of(format_forms)},
    {"tr_record_vfmt_string_1", format_forms},
    {"tr_ms_record_fmt_string_1", last_of(format_forms)},
    {"tr_record_fmt_string_1", format_forms},
    {"tr_record_vprintf_1", format_forms},
    {"tr_record_printf_1", format_forms},
    {"tr_ms_record_data_v_1", last_of(data_forms)},
    {"tr_record_data_v_1", data_forms},
    {"tr_ms_record_data_1", last_of(data_forms)},
    {"tr_record_data_1", data_forms},
    {"tr_ms_record_values_32_v_1", last_of(forms_32)},
    {"tr_record_values_32_v_1", without_first(forms_32)},
    {"tr_ms_record_values_32_1", last_of(forms_32)},
    {"tr_record_values_32_1", forms_32},
    {"tr_record_int32_1", forms_32},
    {"tr_record_uint32_1", forms_32},
    {"tr_record_int32_2_1", forms_32},
    {"tr_record_uint32_2_1", forms_32},
    {"tr_ms_record_values_64_v_1", last_of(forms_64)},
    {"tr_record_values_64_v_1", without_first(forms_64)},
    {"tr_ms_record_values_64_1", last_of(forms_64)},
    {"tr_record_values_64_1", forms_64},
    {"tr_record_int64_1", forms_64},
    {"tr_record_uint64_1", forms_64},
    {"tr_record_int64_2_1", forms_64},
    {"tr_record_uint64_2_1", forms_64},
    {"tr_ms_record_error_1", {"tr_ms_record_error_1"}},
    {"tr_record_error_1", {"tr_ms_record_error_1"}},
};

class InterposedWriter : public testing::TestWithParam<writer_call>
{
};

std::string name_of(const testing::TestParamInfo<writer_call> &info) { return info.param.name; }
} // namespace

TEST(InterposedFormatWriter, IsWhatTheCommonUtilitiesWriteThrough)
{
    const scratch folder;
    ASSERT_EQ(tr_set_filename_1((folder / "app.trc").c_str()), 0); // initialises the library
    EXPECT_EQ(cu_trp_printf_1("COMP", 7, "%d", 5), 0);
    EXPECT_EQ(passed, format_forms);
}

INSTANTIATE_TEST_SUITE_P(BelowEvery, InterposedWriter, testing::ValuesIn(all_writers()), name_of);

TEST_P(InterposedWriter, IsWhatTheFormsForwardTo)
{
    const scratch folder;
    tr_detail_level_t level = 0;
    const tr_category_description_t category{0, "c", 1, 1};
    ASSERT_EQ(tr_set_filename_1((folder / "app.trc").c_str()), 0);
    ASSERT_EQ(tr_register_component_1("TEST", &level, &category, 1), 0);

    EXPECT_EQ(GetParam().write("COMP", nullptr), 0);
    EXPECT_EQ(passed, expected_calls.at(GetParam().name));
    const auto records = trace_image::of_file(folder / "app.trc").records();
    ASSERT_EQ(records.size(), 2U);
    expect_record(records[1], GetParam().function, "COMP", GetParam().body);
    EXPECT_EQ(tr_unregister_component_1("TEST"), 0);
}
