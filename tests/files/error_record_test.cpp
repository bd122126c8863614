// Errors recorded for the caller: which text, which insert, and who leaves the record alone.
#include <gtest/gtest.h>

#include "files/message_texts.h"
#include "files/support_files.h"

namespace
{
using namespace qn::test;

// The calling thread's record; released with it.
struct recorded {
    recorded() { EXPECT_EQ(cu_get_error_1(&error), 0); }
    recorded(const recorded &) = delete;
    recorded &operator=(const recorded &) = delete;
    ~recorded() { cu_rel_error_1(error); }
    cu_error_t *operator->() const { return error; }
    cu_error_t *error = nullptr;
};

constexpr const char *bad_id = "Bad message id for message set trapi_set";

TEST(SetError, RecordsCodeCatalogueAndText)
{
    EXPECT_EQ(set_error(4, 3), 4);
    const recorded record;
    EXPECT_EQ(record->cu_error_id, 4);
    EXPECT_EQ(record->cu_ffdc_id, nullptr);
    EXPECT_STREQ(record->cu_msg_cat, "qn_tr.cat");
    EXPECT_EQ(record->cu_msg_set, 1);
    EXPECT_EQ(record->cu_msg_num, 3);
    EXPECT_STREQ(record->cu_msg_default, "2625-002 Category list pointer is NULL.\n");
    EXPECT_EQ(record->cu_arg_cnt, 0U);
}

TEST(SetErrorInt, RecordsTheNumberAsItsInsert)
{
    EXPECT_EQ(set_error_int(18, 18, -7), 18);
    const recorded record;
    EXPECT_EQ(record->cu_error_id, 18);
    EXPECT_EQ(record->cu_ffdc_id, nullptr);
    EXPECT_STREQ(record->cu_msg_cat, "qn_tr.cat");
    EXPECT_EQ(record->cu_msg_set, 1);
    EXPECT_EQ(record->cu_msg_num, 18);
    EXPECT_STREQ(record->cu_msg_default, "2625-017 Error %d opening trace file.\n");
    ASSERT_EQ(record->cu_arg_cnt, 1U);
    EXPECT_EQ(record->cu_args[0].cu_arg_type, CU_ERROR_ARG_INT);
    EXPECT_EQ(record->cu_args[0].cu_arg_value.cu_int, -7);
}

TEST(SetErrorStr, RecordsTheStringAsItsInsert)
{
    EXPECT_EQ(set_error_str(36, 37, "/tmp/x"), 36);
    const recorded record;
    EXPECT_EQ(record->cu_error_id, 36);
    EXPECT_EQ(record->cu_msg_num, 37);
    EXPECT_STREQ(record->cu_msg_default, "2625-036 The specified file \"%s\" is not a valid trace file.\n");
    ASSERT_EQ(record->cu_arg_cnt, 1U);
    EXPECT_EQ(record->cu_args[0].cu_arg_type, CU_ERROR_ARG_CHAR_STR);
    EXPECT_STREQ(record->cu_args[0].cu_arg_value.cu_char_str, "/tmp/x");
}

TEST(SetErrorStr, DoesNotTakeThePercentSignsOfAFileNameForConversions)
{
    set_error_str(17, 17, "/tmp/%s%n%d");
    EXPECT_EQ(last_error().text, "2625-016 Trace filename \"/tmp/%s%n%d\" is invalid.\n");
}

class SetErrorWithNumber : public testing::TestWithParam<int>
{
};

TEST_P(SetErrorWithNumber, RecordsItsDefaultText)
{
    EXPECT_EQ(set_error(77, GetParam()), 77);
    const recorded record;
    EXPECT_EQ(record->cu_msg_num, GetParam());
    EXPECT_STREQ(record->cu_msg_default, message_texts[static_cast<size_t>(GetParam())]);
}

INSTANTIATE_TEST_SUITE_P(InTheTable, SetErrorWithNumber, testing::Range(1, 41));

class SetErrorOutsideOfTheTable : public testing::TestWithParam<int>
{
};

TEST_P(SetErrorOutsideOfTheTable, SaysThatTheNumberIsBad)
{
    EXPECT_EQ(set_error(5, GetParam()), 5);
    EXPECT_EQ(last_error().text, bad_id);
    EXPECT_EQ(last_error().message_number, GetParam());
    EXPECT_EQ(set_error_int(5, GetParam(), 3), 5);
    EXPECT_EQ(last_error().text, bad_id);
    EXPECT_EQ(set_error_str(5, GetParam(), "x"), 5);
    EXPECT_EQ(last_error().text, bad_id);
}

INSTANTIATE_TEST_SUITE_P(Numbers, SetErrorOutsideOfTheTable, testing::Values(0, 41, -1, 1000));

TEST(SetError, GivesAnEmptyStringToATextThatWantsOne)
{
    EXPECT_EQ(set_error(17, 17), 17);
    EXPECT_EQ(last_error().text, "2625-016 Trace filename \"\" is invalid.\n");
}

TEST(SetError, GivesZeroToATextThatWantsANumber)
{
    EXPECT_EQ(set_error(18, 18), 18);
    EXPECT_EQ(last_error().text, "2625-017 Error 0 opening trace file.\n");
}

TEST(SetErrorInt, DropsAnInsertThatTheTextDoesNotShow)
{
    EXPECT_EQ(set_error_int(35, 36, 28), 35);
    EXPECT_EQ(last_error().text, message_texts[36]);
}

TEST(RecordWriter, LeavesTheErrorRecordAloneWhenTheComponentIsMissing)
{
    leave_marker();
    EXPECT_EQ(tr_record_id_1("", 1), 2);
    EXPECT_EQ(tr_record_id_1(nullptr, 1), 2);
    EXPECT_TRUE(marker_is_there());
}

TEST(ControlCall, ClearsTheErrorRecordOnSuccess)
{
    const scratch folder;
    leave_marker();
    EXPECT_EQ(tr_set_filename_1((folder / "f").c_str()), 0);
    EXPECT_EQ(last_error().code, 0);
    leave_marker();
    char name[4096];
    EXPECT_EQ(tr_get_filename_1(name), 0);
    EXPECT_EQ(last_error().code, 0);
}
} // namespace
