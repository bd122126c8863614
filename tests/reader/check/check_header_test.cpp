// The header's fields, each against its rule.
#include <gtest/gtest.h>

#include <functional>

#include "reader/trace_builder.h"
#include "tools/qntrace/check/file_check.h"

namespace qn::test
{
namespace
{

using severity = reader::finding::severity;

struct header_case {
    const char *name;
    std::function<void(trace_builder &)> change;
    std::string text; // of the one finding; empty: none
    severity level = severity::damage;
    std::uint64_t offset = 0;
};

class CheckHeader : public testing::TestWithParam<header_case>
{
};

TEST_P(CheckHeader, Field)
{
    const auto &field = GetParam();
    trace_builder file;
    file.add_id(1);
    file.close();
    field.change(file);
    reader::memory_source source(file.bytes());
    const auto checked = dump::check_file(source);
    EXPECT_EQ(checked.records, 1U);
    if (field.text.empty()) {
        EXPECT_TRUE(checked.findings.empty());
        return;
    }
    ASSERT_EQ(checked.findings.size(), 1U);
    EXPECT_EQ(checked.findings[0].what.text, field.text);
    EXPECT_EQ(checked.findings[0].what.level, field.level);
    EXPECT_EQ(checked.findings[0].what.offset, field.offset);
    EXPECT_EQ(checked.sound(), field.level != severity::damage);
}

std::string no_end(std::size_t size) { return std::string(size, 'x'); }

const header_case cases[] = {
    {"WithoutTheLastingBit", [](auto &file) { file.put_u8(0, 0x80); },
     "the property bit 0x40, which every trace file has, is not set"},
    {"WithAnUnknownProperty", [](auto &file) { file.put_u8(0, 0xC1); },
     "the properties 0xc1 have bits that mean nothing"},
    {"OfAnotherPlatform", [](auto &file) { file.put_u8(1, 4); }, "the file is of platform 4, Linux is 2",
     severity::note, 1},
    {"WithAWriterThatWaits", [](auto &file) { file.put_u16(4, 0x8000); }, ""},
    {"WithAnUnknownFlag", [](auto &file) { file.put_u16(4, 0x8001); }, "the flags 0x8001 have bits that mean nothing",
     severity::damage, 4},
    {"WithAnotherRingOffset", [](auto &file) { file.put_u32(8, 204); },
     "the header gives 204 as the offset of the first record; 200 is used", severity::damage, 8},
    {"WithAReader", [](auto &file) { file.put_u32(12, 2); }, ""},
    {"WithAReaderOfNoRecord", [](auto &file) { file.put_u32(12, 3); },
     "a reader holds the record 3, which no record can be", severity::damage, 12},
    {"WithATailRequest", [](auto &file) { file.put_u32(16, 1); }, "a reader asks the writers to wait", severity::note,
     16},
    {"WithoutATimeBase", [](auto &file) { file.put_u64(24, 0); },
     "the header's time base has 0 ticks a second; the time of the oldest records is not known", severity::damage, 24},
    {"WithAMachine", [](auto &file) { file.put_u32(40, 7); }, "the machine identifier is 7, and always 0",
     severity::damage, 40},
    {"WithoutAProcess", [](auto &file) { file.put_u32(48, 0); }, "the header names no process", severity::note, 48},
    {"WithAProgramWithoutAnEnd", [](auto &file) { file.put(52, file.body().chars(no_end(48))); },
     "the program has no end within its 48 bytes", severity::damage, 52},
    {"WithABuildWithoutAnEnd", [](auto &file) { file.put(100, file.body().chars(no_end(32))); },
     "the build identifier has no end within its 32 bytes", severity::damage, 100},
    {"WithABaseNameWithoutAnEnd", [](auto &file) { file.put(132, file.body().chars(no_end(48))); },
     "the base name of the program has no end within its 48 bytes", severity::damage, 132},
    {"OfAnActivePage", [](auto &file) { file.put_u8(192, 1); }, ""},
    {"OfAPageInTwoStates", [](auto &file) { file.put_u8(192, 3); }, "no page has the state 3", severity::damage, 192},
    {"WithAFarZone", [](auto &file) { file.put_u32(196, 1U << 20); }, "no time zone is 1048576 minutes from UTC",
     severity::damage, 196},
    {"OfVersion4WithoutPages",
     [](auto &file) {
         file.put_u16(2, 4);
         file.put_u8(192, 77);
     },
     ""},
};

INSTANTIATE_TEST_SUITE_P(Sound, CheckHeader, testing::ValuesIn(cases),
                         [](const auto &info) { return std::string(info.param.name); });

} // namespace
} // namespace qn::test
