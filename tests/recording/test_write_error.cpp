// Error records: every field and argument, which error is recorded, and whose it is afterwards.
#include <cstring>

#include <gtest/gtest.h>

#include "recording/expected_bytes.h"
#include "recording/one_trace.h"
#include "recording/writers.h"
#include "trace/trace.h"

using namespace qn::test;

namespace
{
constexpr uint16_t error_kind = 14;
constexpr uint32_t small_file = 4096; // its longest record has 1948 bytes

// The twelve words between the record header and the arguments.
struct fixed_part {
    uint32_t function_name = 0, file_name = 0, ffdc_id = 0, catalogue = 0, text = 0; // offsets
    uint32_t arguments = 0;

    expected_bytes bytes() const
    {
        expected_bytes fixed;
        fixed.u32(7).u32(18).u32(99).u32(function_name).u32(file_name).u32(ffdc_id).u32(5).u32(6);
        return fixed.u32(catalogue).u32(text).u32(arguments);
    }
};

qn_int32_t write(cu_error_t *error, const char *function_name = nullptr, const char *file_name = nullptr)
{
    return tr_record_error_1("COMP", 7, function_name, 99, file_name, &error);
}

// An error without any string.
cu_error_t bare_error()
{
    cu_error_t error{};
    error.cu_error_id = 18;
    error.cu_msg_set = 5;
    error.cu_msg_num = 6;
    return error;
}

cu_error_arg_t string_argument(char *text)
{
    cu_error_arg_t argument{};
    argument.cu_arg_type = CU_ERROR_ARG_CHAR_STR;
    argument.cu_arg_value.cu_char_str = text;
    return argument;
}

template <class Value>
cu_error_arg_t argument_of(cu_error_arg_type_t type, Value value)
{
    cu_error_arg_t argument{};
    argument.cu_arg_type = type;
    std::memcpy(&argument.cu_arg_value, &value, sizeof value);
    return argument;
}
} // namespace

TEST(ErrorWriter, WritesEveryString)
{
    const one_trace trace;
    EXPECT_EQ(write(sample_error(), "function", "file.c"), 0);
    expected_bytes body = fixed_part{72, 81, 88, 96, 104, 0}.bytes();
    body.string("function").string("file.c").string("ffdc-id").string("app.cat").string("Failed.");
    expect_record(trace.only_record(), error_kind, "COMP", body.pad_to_4());
}

TEST(ErrorWriter, WritesTheFixedPartAloneWithoutStrings)
{
    const one_trace trace;
    cu_error_t error = bare_error();
    EXPECT_EQ(write(&error), 0);
    EXPECT_EQ(trace.only_record().length(), 72U);
    expect_record(trace.only_record(), error_kind, "COMP", fixed_part{}.bytes());
}

TEST(ErrorWriter, StartsWithTheFileNameWithoutAFunctionName)
{
    const one_trace trace;
    cu_error_t error = bare_error();
    EXPECT_EQ(write(&error, nullptr, "file.c"), 0);
    fixed_part fixed;
    fixed.file_name = 72;
    expect_record(trace.only_record(), error_kind, "COMP", fixed.bytes().string("file.c").pad_to_4());
}

TEST(ErrorWriter, LeavesOutEachStringThatIsAbsent)
{
    const one_trace trace;
    char catalogue[] = "c";
    cu_error_t error = bare_error();
    error.cu_msg_cat = catalogue;
    EXPECT_EQ(write(&error, "f", nullptr), 0);
    fixed_part fixed;
    fixed.function_name = 72;
    fixed.catalogue = 74;
    expect_record(trace.only_record(), error_kind, "COMP", fixed.bytes().string("f").string("c"));
}

TEST(ErrorWriter, GivesAnEmptyStringAPlace)
{
    const one_trace trace;
    cu_error_t error = bare_error();
    EXPECT_EQ(write(&error, "", "f"), 0);
    fixed_part fixed;
    fixed.function_name = 72;
    fixed.file_name = 73;
    expect_record(trace.only_record(), error_kind, "COMP", fixed.bytes().string("").string("f").pad_to_4());
}

TEST(ErrorWriter, WritesArgumentsOfEveryType)
{
    const one_trace trace;
    char text[] = "inserted";
    int place = 0;
    cu_error_arg_t arguments[] = {
        argument_of(CU_ERROR_ARG_INT, -3),
        argument_of(CU_ERROR_ARG_LONG, long{-4}),
        argument_of(CU_ERROR_ARG_LONG_LONG, 0x123456789ABCDEFLL),
        argument_of(CU_ERROR_ARG_DOUBLE, 2.5),
        argument_of(CU_ERROR_ARG_RESERVED, 0x1122334455667788LL),
        string_argument(text),
        argument_of(CU_ERROR_ARG_VOID_PTR, static_cast<void *>(&place)),
    };
    cu_error_t error = bare_error();
    error.cu_arg_cnt = 7;
    error.cu_args = arguments;
    EXPECT_EQ(write(&error, "function"), 0);

    fixed_part fixed;
    fixed.arguments = 7;
    fixed.function_name = 72 + 7 * 16;
    expected_bytes body = fixed.bytes();
    body.u32(0).anything(4).u32(0xFFFFFFFD).anything(4); // an int has no more bits of its own
    body.u32(1).anything(4).u64(static_cast<uint64_t>(-4));
    body.u32(2).anything(4).u64(0x123456789ABCDEF);
    body.u32(3).anything(4).u64(0x4004000000000000); // 2.5
    body.u32(4).anything(4).u64(0x1122334455667788);
    body.u32(5).anything(4).u64(72 + 7 * 16 + 9); // behind "function" and its NUL
    body.u32(6).anything(4).u64(reinterpret_cast<uintptr_t>(&place));
    body.string("function").string("inserted").pad_to_4();
    expect_record(trace.only_record(), error_kind, "COMP", body);
}

TEST(ErrorWriter, WritesStringArgumentsBehindTheOtherStringsInTheirOrder)
{
    const one_trace trace;
    char first[] = "one";
    char second[] = "three";
    cu_error_arg_t arguments[] = {string_argument(first), argument_of(CU_ERROR_ARG_LONG, long{2}),
                                  string_argument(second)};
    cu_error_t error = *sample_error();
    error.cu_arg_cnt = 3;
    error.cu_args = arguments;
    EXPECT_EQ(write(&error, "fn", "file"), 0);

    const uint32_t names = 72 + 3 * 16;
    expected_bytes body = fixed_part{names, names + 3, names + 8, names + 16, names + 24, 3}.bytes();
    body.u32(5).anything(4).u64(names + 32);
    body.u32(1).anything(4).u64(2);
    body.u32(5).anything(4).u64(names + 36);
    body.string("fn").string("file").string("ffdc-id").string("app.cat").string("Failed.");
    body.string("one").string("three").pad_to_4();
    expect_record(trace.only_record(), error_kind, "COMP", body);
}

TEST(ErrorWriter, LeavesTheBytesBesideTheArgumentsTypeUnwritten)
{
    const one_trace trace;
    cu_error_arg_t argument = argument_of(CU_ERROR_ARG_LONG, long{1});
    cu_error_t error = bare_error();
    error.cu_arg_cnt = 1;
    error.cu_args = &argument;
    const std::string before = trace.image().bytes();
    EXPECT_EQ(write(&error), 0);
    const record_image record = trace.only_record();
    EXPECT_EQ(record.bytes.substr(76, 4), before.substr(record.offset + 76, 4));
}

TEST(ErrorWriter, IsNotDeceivedByANullStringArgument)
{
    const one_trace trace;
    cu_error_arg_t argument = string_argument(nullptr);
    cu_error_t error = bare_error();
    error.cu_arg_cnt = 1;
    error.cu_args = &argument;
    EXPECT_EQ(write(&error, "fn"), 0);
    fixed_part fixed;
    fixed.function_name = 88;
    fixed.arguments = 1;
    expect_record(trace.only_record(), error_kind, "COMP",
                  fixed.bytes().u32(5).anything(4).u64(0).string("fn").pad_to_4());
}

TEST(ErrorWriter, WritesNothingWithoutAnError)
{
    const one_trace trace;
    cu_error_t error = bare_error();
    error.cu_error_id = 0;
    EXPECT_EQ(write(&error, "function"), 0);
    EXPECT_TRUE(trace.written().empty());
}

TEST(ErrorWriter, WritesNothingWhenTheThreadHasNoError)
{
    const one_trace trace;
    cu_set_no_error_1();
    EXPECT_EQ(tr_record_error_1("COMP", 7, "function", 99, "file.c", nullptr), 0);
    EXPECT_TRUE(trace.written().empty());
}

TEST(ErrorWriter, RecordsTheThreadsErrorWhenItIsGivenNone)
{
    const one_trace trace;
    leave_marker();
    EXPECT_EQ(tr_record_error_1("COMP", 7, nullptr, 99, nullptr, nullptr), 0);
    EXPECT_EQ(trace.only_record().u32(32), static_cast<uint32_t>(marker_code));
    EXPECT_TRUE(marker_is_there());
}

TEST(ErrorWriter, GivesTheErrorThatItFetchedToTheCaller)
{
    const one_trace trace;
    leave_marker();
    cu_error_t *error = nullptr;
    EXPECT_EQ(tr_record_error_1("COMP", 7, nullptr, 99, nullptr, &error), 0);
    ASSERT_NE(error, nullptr);
    EXPECT_EQ(error->cu_error_id, marker_code);
    EXPECT_EQ(trace.only_record().u32(32), static_cast<uint32_t>(marker_code));
    cu_rel_error_1(error);
}

TEST(ErrorWriter, GivesTheCallerWhatItFetchedEvenWhenThatIsNoError)
{
    const one_trace trace;
    cu_set_no_error_1();
    cu_error_t *error = nullptr;
    EXPECT_EQ(tr_record_error_1("COMP", 7, nullptr, 99, nullptr, &error), 0);
    ASSERT_NE(error, nullptr);
    EXPECT_EQ(error->cu_error_id, 0);
    cu_rel_error_1(error);
}

TEST(ErrorWriter, LeavesAnErrorThatItWasGivenAlone)
{
    const one_trace trace;
    leave_marker();
    cu_error_t *error = sample_error();
    EXPECT_EQ(tr_record_error_1("COMP", 7, nullptr, 99, nullptr, &error), 0);
    EXPECT_EQ(error, sample_error());
    EXPECT_EQ(error->cu_error_id, 18);
    EXPECT_STREQ(error->cu_msg_default, "Failed.");
    EXPECT_EQ(trace.only_record().u32(32), 18U);
}

TEST(ErrorWriter, FetchesNothingWhenTracingIsStoppedOrTheComponentMissing)
{
    const one_trace trace;
    leave_marker();
    cu_error_t *error = nullptr;
    EXPECT_EQ(tr_record_error_1("", 7, nullptr, 99, nullptr, &error), 2);
    EXPECT_EQ(error, nullptr);
    global_stop_trace();
    EXPECT_EQ(tr_record_error_1("COMP", 7, nullptr, 99, nullptr, &error), 0);
    EXPECT_EQ(error, nullptr);
}

TEST(ErrorWriter, WritesARecordOfTheLongestLength)
{
    const one_trace trace(small_file);
    cu_error_t error = bare_error();
    const std::string name(1948 - 72 - 1, 'f');
    EXPECT_EQ(write(&error, name.c_str()), 0);
    EXPECT_EQ(trace.only_record().length(), 1948U);
}

TEST(ErrorWriter, DropsALongerRecordWhole)
{
    const one_trace trace(small_file);
    const std::string before = trace.image().bytes();
    cu_error_t error = bare_error();
    const std::string name(1948 - 72, 'f');
    EXPECT_EQ(write(&error, name.c_str()), 0);
    EXPECT_EQ(trace.image().bytes(), before);
}

TEST(ErrorWriter, DropsARecordWhoseArgumentsAreTooMany)
{
    const one_trace trace(small_file);
    std::vector<cu_error_arg_t> arguments(118, argument_of(CU_ERROR_ARG_LONG, long{1}));
    cu_error_t error = bare_error();
    error.cu_args = arguments.data();
    error.cu_arg_cnt = 118; // 72 + 16 * 118 = 1960
    EXPECT_EQ(write(&error), 0);
    EXPECT_TRUE(trace.written().empty());
    error.cu_arg_cnt = 117;
    EXPECT_EQ(write(&error), 0);
    EXPECT_EQ(trace.only_record().length(), 72U + 16 * 117);
}
