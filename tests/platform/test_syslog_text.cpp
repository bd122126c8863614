// The text that the system log shows of a failure.
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <qn_ffdc.h>

#include "support/scratch.h"

namespace
{
const nl_catd no_catalogue = reinterpret_cast<nl_catd>(-1);

constexpr fc_err_tbl_t plain{.fc_error_id = 0,
                             .fc_label = "TR_SP_ERR_ER",
                             .fc_desc_msg_set = 2,
                             .fc_desc_msg_num = 1,
                             .fc_desc_default = "A syntax error.",
                             .fc_detail_field_count = 0,
                             .fc_detail_fields = nullptr};

std::string text_of(const fc_err_tbl_t *entry, const void *data = nullptr, int length = 0,
                    nl_catd catalogue = no_catalogue)
{
    char buffer[946];
    const int result = fc_mk_syslog_msg_1(entry, data, length, buffer, sizeof buffer, catalogue);
    EXPECT_EQ(result, static_cast<int>(std::strlen(buffer)));
    return buffer;
}

TEST(SyslogText, ShowsDescriptionAndLabel) { EXPECT_EQ(text_of(&plain), "A syntax error. [TR_SP_ERR_ER]"); }

TEST(SyslogText, ShowsTheDetailDataInHexadecimal)
{
    const unsigned char data[] = {0x00, 0x1f, 0xff};
    EXPECT_EQ(text_of(&plain, data, 3), "A syntax error. [TR_SP_ERR_ER] 0x001fff");
}

TEST(SyslogText, TakesTheDescriptionFromTheCatalogue)
{
    const qn::test::scratch folder;
    qn::test::write_file(folder / "ffdc.msg", "$set 2\n1 Ein Syntaxfehler, 100%% %s%n\\n\n");
    ASSERT_EQ(std::system(("gencat " + folder / "ffdc.cat" + " " + folder / "ffdc.msg").c_str()), 0);
    const nl_catd catalogue = catopen((folder / "ffdc.cat").c_str(), NL_CAT_LOCALE);
    ASSERT_NE(catalogue, no_catalogue);
    EXPECT_EQ(text_of(&plain, nullptr, 0, catalogue), "Ein Syntaxfehler, 100%% %s%n [TR_SP_ERR_ER]");
    fc_err_tbl_t missing = plain;
    missing.fc_desc_msg_num = 9;
    EXPECT_EQ(text_of(&missing, nullptr, 0, catalogue), "A syntax error. [TR_SP_ERR_ER]");
    catclose(catalogue);
}

TEST(SyslogText, IsCutToTheBuffer)
{
    for (int size = 1; size < 40; ++size) {
        std::vector<char> buffer(static_cast<size_t>(size) + 1, '#');
        const std::string whole = "A syntax error. [TR_SP_ERR_ER]";
        const std::string expected = whole.substr(0, static_cast<size_t>(size) - 1);
        EXPECT_EQ(fc_mk_syslog_msg_1(&plain, nullptr, 0, buffer.data(), size, no_catalogue),
                  static_cast<int>(expected.size()));
        EXPECT_STREQ(buffer.data(), expected.c_str());
        EXPECT_EQ(buffer.back(), '#') << "wrote beyond the buffer";
    }
}

TEST(SyslogText, CutsMoreDetailDataThanFit)
{
    const std::vector<unsigned char> data(100'000, 0xab);
    const std::string text = text_of(&plain, data.data(), static_cast<int>(data.size()));
    EXPECT_EQ(text.size(), 945U);
    EXPECT_EQ(text.substr(text.size() - 4), "abab");
}

TEST(SyslogText, NeedsABuffer)
{
    char buffer[2] = {'x', 'y'};
    EXPECT_EQ(fc_mk_syslog_msg_1(&plain, nullptr, 0, nullptr, 10, no_catalogue), -1);
    EXPECT_EQ(fc_mk_syslog_msg_1(&plain, nullptr, 0, buffer, 0, no_catalogue), -1);
    EXPECT_EQ(fc_mk_syslog_msg_1(&plain, nullptr, 0, buffer, -5, no_catalogue), -1);
    EXPECT_EQ(buffer[0], 'x');
}

TEST(SyslogText, WithoutAnEntryShowsJustTheDetailData)
{
    EXPECT_EQ(text_of(nullptr, "\x01\x02", 2), "0x0102");
    EXPECT_EQ(text_of(nullptr), "");
}

TEST(SyslogText, NegativeAndMissingDetailDataAreNone)
{
    EXPECT_EQ(text_of(&plain, "data", -1), "A syntax error. [TR_SP_ERR_ER]");
    EXPECT_EQ(text_of(&plain, nullptr, 50), "A syntax error. [TR_SP_ERR_ER]");
}

TEST(SyslogText, IsOneLineWhateverTheDescription)
{
    fc_err_tbl_t entry{};
    entry.fc_desc_default = "first\nsecond\tthird\x7f!\n\n";
    EXPECT_EQ(text_of(&entry), "first second third !");
}

TEST(SyslogText, ShowsTheFieldsOfTheDetailData)
{
    struct {
        qn_int32_t code;
        qn_uint16_t port;
        char name[6];
        unsigned char raw[2];
    } data{.code = -3, .port = 65535, .name = {'d', 'i', 's', 'k'}, .raw = {0xca, 0xfe}};
    const fc_detail_field_t fields[] = {{"code", FC_DETAIL_INT, 0, 4},
                                        {"port", FC_DETAIL_UNSIGNED, 4, 2},
                                        {"name", FC_DETAIL_TEXT, 6, 6},
                                        {"raw", FC_DETAIL_HEX, 12, 2}};
    fc_err_tbl_t entry = plain;
    entry.fc_detail_field_count = 4;
    entry.fc_detail_fields = fields;
    EXPECT_EQ(text_of(&entry, &data, sizeof data),
              "A syntax error. [TR_SP_ERR_ER] code=-3 port=65535 name=disk raw=0xcafe");
}

TEST(SyslogText, LeavesOutAFieldBeyondTheDetailData)
{
    const fc_detail_field_t fields[] = {
        {"inside", FC_DETAIL_HEX, 0, 2}, {"reaching", FC_DETAIL_HEX, 1, 2}, {"outside", FC_DETAIL_INT, 0xffffffff, 4}};
    fc_err_tbl_t entry{};
    entry.fc_detail_field_count = 3;
    entry.fc_detail_fields = fields;
    EXPECT_EQ(text_of(&entry, "\x01\x02", 2), "inside=0x0102");
}

TEST(SyslogText, ShowsAnIntegerOfAnOddSizeInHexadecimal)
{
    const fc_detail_field_t fields[] = {{"odd", FC_DETAIL_INT, 0, 3}};
    fc_err_tbl_t entry{};
    entry.fc_detail_field_count = 1;
    entry.fc_detail_fields = fields;
    EXPECT_EQ(text_of(&entry, "\x01\x02\x03", 3), "odd=0x010203");
}
} // namespace
