// The message texts, one by one, as they were agreed with those who translate them.
#include <gtest/gtest.h>

#include "files/message_texts.h"
#include "files/support_files.h"

namespace
{
using namespace qn::test;

class MessageNumber : public testing::TestWithParam<int>
{
};

TEST_P(MessageNumber, HasItsDefaultText)
{
    EXPECT_STREQ(cu_mesgtbl_trapi_set[GetParam()], message_texts[static_cast<size_t>(GetParam())]);
}

INSTANTIATE_TEST_SUITE_P(All, MessageNumber, testing::Range(0, 41));

TEST(MessageTable, HasFortyOneTexts)
{
    EXPECT_EQ(sizeof cu_mesgtbl_trapi_set / sizeof cu_mesgtbl_trapi_set[0], 41U);
    EXPECT_EQ(message_texts.size(), 41U);
}

TEST(MessageTable, HasATextForNumbersOutsideOfIt)
{
    EXPECT_STREQ(cu_badid_trapi_set, "Bad message id for message set trapi_set");
}

TEST(FailureTable, HasTheOneEntryForSpoolingErrors)
{
    ASSERT_EQ(sizeof fc_errtbl_trace / sizeof fc_errtbl_trace[0], 1U);
    const fc_err_tbl_t &entry = fc_errtbl_trace[0];
    EXPECT_EQ(entry.fc_error_id, 0);
    EXPECT_STREQ(entry.fc_label, "TR_SP_ERR_ER");
    EXPECT_EQ(entry.fc_desc_msg_set, 2);
    EXPECT_EQ(entry.fc_desc_msg_num, 1);
    EXPECT_STREQ(entry.fc_desc_default, "A syntax error in the spooling configuration has occurred.");
    EXPECT_EQ(entry.fc_detail_field_count, 0U);
}
} // namespace
