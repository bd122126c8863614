// Bodies whose counts, lengths and offsets do not fit: the sound part is kept, the rest told.
#include <algorithm>

#include <gtest/gtest.h>

#include "reader/reading.h"
#include "reader/trace_builder.h"

namespace qn::test
{
namespace
{

struct single_record {
    std::string line;    // its body as text
    std::string problem; // empty when it is sound
};

// Reads a file that holds one record of this body.
single_record decode_alone(std::uint16_t function, const byte_string &body)
{
    trace_builder file(16384);
    file.add(function, body);
    file.close();
    single_record result;
    const auto text = text_of(file.bytes());
    const auto at = text.find("TEST  ");
    result.line = text.substr(at + 6 + 13);
    const auto mark = result.line.find(" [damaged: ");
    if (mark != std::string::npos) result.line.erase(mark, result.line.find('\n') - mark);
    for (const auto &record : read_all(file.bytes()).records) {
        if (record.kind != "free") result.problem = record.problem;
    }
    return result;
}

byte_string body() { return byte_string(); }

TEST(Decode, ARecordShorterThanItsFixedPartIsDamage)
{
    const struct {
        std::uint16_t function;
        std::size_t fixed_bytes;
    } kinds[] = {{1, 32}, {2, 29}, {3, 36}, {12, 36}, {13, 36}, {14, 72}, {15, 40}, {16, 52}, {17, 44}, {19, 52}};
    for (const auto &kind : kinds) {
        const auto fits = (kind.fixed_bytes - 1) / 4 * 4 - 28;
        EXPECT_EQ(decode_alone(kind.function, body().zeros(fits)).problem,
                  "record length " + std::to_string(28 + fits) + " is less than the " +
                      std::to_string(kind.fixed_bytes) + " bytes of this kind");
    }
}

TEST(Decode, AnnouncedValuesMustFit)
{
    auto read = decode_alone(12, body().u32(1).u32(3).u32(10).u32(11));
    EXPECT_EQ(read.line, "id=1 [10, 11]\n");
    EXPECT_EQ(read.problem, "3 values are announced, 2 fit");
    read = decode_alone(12, body().u32(1).u32(0xFFFFFFFF).u32(10));
    EXPECT_EQ(read.line, "id=1 [10]\n");
    EXPECT_EQ(read.problem, "4294967295 values are announced, 1 fit");
    read = decode_alone(13, body().u32(1).u32(0x20000001).u64(10).u32(11));
    EXPECT_EQ(read.line, "id=1 [10]\n");
    EXPECT_EQ(read.problem, "536870913 values are announced, 1 fit");
    read = decode_alone(12, body().u32(1).u32(0));
    EXPECT_EQ(read.line, "id=1 []\n");
    EXPECT_EQ(read.problem, "");
}

TEST(Decode, ARecordCutToTheLongestLengthMayLeaveAFewBytes)
{
    EXPECT_EQ(decode_alone(13, body().u32(1).u32(1).u64(10).u32(0)).problem, "");
    EXPECT_EQ(decode_alone(12, body().u32(1).u32(1).u32(10).zeros(28)).problem, "");
}

TEST(Decode, AnnouncedDataBlocksMustFit)
{
    auto read = decode_alone(3, body().u32(1).u32(3).u32(2).chars("ab").zeros(2).u32(0));
    EXPECT_EQ(read.problem, "3 data blocks are announced, 2 fit");
    EXPECT_EQ(read.line.substr(0, read.line.find('\n')), "id=1 2 blocks");
    read = decode_alone(3, body().u32(1).u32(0x7FFFFFFF).u32(4).chars("abcd"));
    EXPECT_EQ(read.problem, "2147483647 data blocks are announced, no writer gives more than 128");
    read = decode_alone(3, body().u32(1).u32(128).u32(4).chars("abcd"));
    EXPECT_EQ(read.problem, "128 data blocks are announced, 1 fit");
    read = decode_alone(3, body().u32(1).u32(1).u32(9).chars("abcdefgh"));
    EXPECT_EQ(read.problem, "the length 9 of data block 0 does not fit into the record");
    read = decode_alone(3, body().u32(1).u32(1).u32(0x7FFFFFFF).zeros(8));
    EXPECT_EQ(read.problem, "the length 2147483647 of data block 0 does not fit into the record");
    read = decode_alone(3, body().u32(1).u32(2).u32(0).u32(0xFFFFFFFF).zeros(8));
    EXPECT_EQ(read.problem, "the length -1 of data block 1 does not fit into the record");
    EXPECT_EQ(read.line, "id=1 1 block\n    block 0, 0 bytes\n");
}

TEST(Decode, ABlockWhosePaddingIsMissingAtTheEndIsTheLastOne)
{
    // The padding would lie behind the record; the block itself does not.
    const auto read = decode_alone(3, body().u32(1).u32(2).u32(4).chars("abcd"));
    EXPECT_EQ(read.problem, "2 data blocks are announced, 1 fit");
}

TEST(Decode, AnnouncedStringsMustBeThere)
{
    auto read = decode_alone(15, body().u32(1).u32(3).u32(4).text("a").text("b"));
    EXPECT_EQ(read.line, "id=1 \"a\" \"b\"\n");
    EXPECT_EQ(read.problem, "3 strings are announced, 2 are complete");
    read = decode_alone(15, body().u32(1).u32(1).u32(4).chars("abcd"));
    EXPECT_EQ(read.line, "id=1\n");
    EXPECT_EQ(read.problem, "1 strings are announced, 0 are complete");
    read = decode_alone(15, body().u32(1).u32(1).u32(0xFFFFFFFF).text("abc"));
    EXPECT_EQ(read.line, "id=1 \"abc\"\n");
    EXPECT_EQ(read.problem, "4294967295 bytes of strings are announced, 4 fit");
    read = decode_alone(15, body().u32(1).u32(0xFFFFFFFF).u32(4).text("abc"));
    EXPECT_EQ(read.line, "id=1 \"abc\"\n");
    EXPECT_EQ(read.problem, "4294967295 strings are announced, no writer gives more than 32");
    read = decode_alone(15, body().u32(1).u32(32).u32(4).text("abc"));
    EXPECT_EQ(read.problem, "32 strings are announced, 1 are complete");
    read = decode_alone(15, body().u32(1).u32(1).u32(6).text("abc").text("d"));
    EXPECT_EQ(read.line, "id=1 \"abc\"\n");
    EXPECT_EQ(read.problem, "2 bytes behind the last string belong to none");
    read = decode_alone(15, body().u32(1).u32(0).u32(0));
    EXPECT_EQ(read.line, "id=1\n");
    EXPECT_EQ(read.problem, "");
}

TEST(Decode, NoMoreStringsThanAWriterGivesAreDecoded)
{
    EXPECT_EQ(decode_alone(15, body().u32(1).u32(32).u32(32).zeros(32)).problem, "");
    const auto read = decode_alone(15, body().u32(1).u32(33).u32(33).zeros(33));
    EXPECT_EQ(read.problem, "33 strings are announced, no writer gives more than 32");
    EXPECT_EQ(std::count(read.line.begin(), read.line.end(), '"'), 2 * 32);
}

TEST(Decode, NoMoreDataBlocksThanAWriterGivesAreDecoded)
{
    EXPECT_EQ(decode_alone(3, body().u32(1).u32(128).zeros(128 * 4)).problem, "");
    const auto read = decode_alone(3, body().u32(1).u32(129).zeros(129 * 4));
    EXPECT_EQ(read.problem, "129 data blocks are announced, no writer gives more than 128");
    EXPECT_EQ(read.line.substr(0, read.line.find('\n')), "id=1 128 blocks");
}

TEST(Decode, TextsMustEndInsideTheirRecord)
{
    auto read = decode_alone(2, body().chars("abcd"));
    EXPECT_EQ(read.line, "\"abcd\"\n");
    EXPECT_EQ(read.problem, "the text at 28 of the record has no end");
    read = decode_alone(19, body().u32(0).u32(7).u64(1000).u64(5).chars("wxyz"));
    EXPECT_EQ(read.line, "pid=7 ticks/s=1000 \"wxyz\"\n");
    EXPECT_EQ(read.problem, "the text at 52 of the record has no end");
    EXPECT_EQ(decode_alone(19, body().u32(0).u32(7).u64(1000).u64(5)).problem,
              "record length 52 is less than the 53 bytes of this kind");
}

// An error record whose fields are all absent but those given; the strings begin at 72 + 16 * arguments.
byte_string error_with(std::uint32_t function_at, std::uint32_t arguments, const byte_string &rest)
{
    auto result =
        body().u32(31).u32(18).u32(0).u32(function_at).u32(0).u32(0).u32(2).u32(3).u32(0).u32(0).u32(arguments);
    for (const std::byte byte : rest.bytes()) {
        result.u8(std::to_integer<std::uint8_t>(byte));
    }
    return result;
}

TEST(Decode, AnErrorWithoutStringsOrArgumentsIsSound)
{
    const auto read = decode_alone(14, error_with(0, 0, body()));
    EXPECT_EQ(read.line, "id=31 error=18\n    catalogue set 2 message 3\n");
    EXPECT_EQ(read.problem, "");
}

TEST(Decode, AnErrorsStringsMustLieBehindItsArguments)
{
    for (const std::uint32_t offset : {1u, 28u, 71u, 80u, 0x7FFFFFFFu, 0xFFFFFFFFu}) {
        const auto read = decode_alone(14, error_with(offset, 0, body().text("open_it")));
        EXPECT_EQ(read.problem, "the string offset " + std::to_string(offset) + " lies outside 72 to 80");
        EXPECT_EQ(read.line, "id=31 error=18\n    catalogue set 2 message 3\n");
    }
    EXPECT_EQ(decode_alone(14, error_with(72, 0, body().text("open_it"))).problem, "");
    EXPECT_EQ(decode_alone(14, error_with(72, 0, body().chars("open_it!"))).problem,
              "the string at 72 of the record has no end");
    EXPECT_EQ(decode_alone(14, error_with(79, 0, body().text("open_it"))).problem, ""); // the empty rest of it
    EXPECT_EQ(decode_alone(14, error_with(72, 1, body().u32(0).u32(0).u64(5).text("abc"))).problem,
              "the string offset 72 lies outside 88 to 92");
}

TEST(Decode, AnErrorsAnnouncedArgumentsMustFit)
{
    for (const std::uint32_t count : {2u, 0x10000000u, 0xFFFFFFFFu}) {
        const auto read = decode_alone(14, error_with(0, count, body().u32(0).u32(0).u64(5)));
        EXPECT_EQ(read.problem, std::to_string(count) + " arguments are announced, 1 fit");
        EXPECT_EQ(read.line, "id=31 error=18\n    catalogue set 2 message 3\n");
    }
}

// An error of a file of its own, with that many integer arguments.
reader::decoded_record error_with_integers(std::uint32_t count)
{
    const std::uint32_t length = 72 + 16 * count;
    trace_builder file(200 + 3 * std::size_t{length});
    file.add(14, error_with(0, count, body().zeros(16 * std::size_t{count})));
    file.close();
    file.set_oldest(200);
    reader::memory_source source(file.bytes());
    reader::trace_reader trace(source, [](const reader::finding &) {});
    auto record = trace.next();
    return {std::move(record->body), std::move(record->problem)};
}

TEST(Decode, AnErrorsArgumentsAreBounded)
{
    EXPECT_EQ(error_with_integers(4096).problem, "");
    const auto read = error_with_integers(4097);
    EXPECT_EQ(read.problem, "4097 arguments are announced, no writer gives more than 4096");
    EXPECT_EQ(std::get<reader::error_body>(read.body).arguments.size(), 4096U);
}

TEST(Decode, AnErrorsStringsTakeNoMoreRoomThanTheRecordHas)
{
    byte_string rest = body();
    for (int i = 0; i < 3; ++i) rest.u32(5).u32(0).u64(72 + 3 * 16);
    const auto read = decode_alone(14, error_with(0, 3, rest.text("open_it")));
    EXPECT_EQ(read.problem, "the string at 120 of the record runs into another one");
    EXPECT_NE(read.line.find("    argument 1 string \"open_it\"\n    argument 2 string none\n"), std::string::npos)
        << read.line;
}

TEST(Decode, AnErrorsStringArgumentsAreChecked)
{
    auto read = decode_alone(14, error_with(0, 1, body().u32(5).u32(0).u64(0xFFFFFFFFFFFFFFFF).text("abc")));
    EXPECT_EQ(read.problem, "the string offset 18446744073709551615 lies outside 88 to 92");
    EXPECT_NE(read.line.find("    argument 1 string none\n"), std::string::npos);
    read = decode_alone(14, error_with(0, 1, body().u32(5).u32(0).u64(88).text("abc")));
    EXPECT_EQ(read.problem, "");
    EXPECT_NE(read.line.find("    argument 1 string \"abc\"\n"), std::string::npos);
    read = decode_alone(14, error_with(0, 1, body().u32(5).u32(0).u64(0)));
    EXPECT_EQ(read.problem, "");
}

TEST(Decode, AnErrorsArgumentOfAnUnknownTypeIsShownInHexadecimal)
{
    const auto read = decode_alone(14, error_with(0, 2, body().u32(77).u32(0).u64(0xABC).u32(4).u32(0).u64(0xDEF)));
    EXPECT_NE(read.line.find("    argument 1 unknown 0xabc\n    argument 2 reserved 0xdef\n"), std::string::npos);
}

TEST(Decode, ABaseWithoutTicksIsToldAndNotUsed)
{
    trace_builder file;
    file.add_start(1, 0, 0);
    file.add_id(5);
    file.close();
    const auto read = read_all(file.bytes());
    ASSERT_EQ(read.damage().size(), 1u);
    EXPECT_NE(read.damage()[0].find("the time base has 0 ticks a second"), std::string::npos);
    EXPECT_EQ(read.records.back().time_ns, std::to_string(trace_builder::epoch_ns + 1'123'457'789));
}

} // namespace
} // namespace qn::test
