// The whole output of both formats, for a file that has every record kind.
#include <gtest/gtest.h>

#include "reader/every_kind.h"
#include "reader/reading.h"

namespace qn::test
{
namespace
{

// Lines of `text` that contain `part`.
std::string lines_with(const std::string &text, std::string_view part)
{
    std::string result;
    for (std::size_t at = 0; at < text.size();) {
        const auto end = text.find('\n', at) + 1;
        const auto line = text.substr(at, end - at);
        if (line.find(part) != std::string::npos) result += line;
        at = end;
    }
    return result;
}

TEST(Formats, TextShowsTheHeaderAndEveryKindOldestFirst)
{
    EXPECT_EQ(text_of(every_kind().bytes(), {.with_header = true}), R"(file     test.trc
format   version 6, little-endian, platform 2, written by "builder 1"
ring     200 to 4096, oldest record at 1204
process  pid 4711, "app", invoked as "/opt/app/bin/app -v"
node     number 0, id 0x000000000000abcd
time     1000000000 ticks/s, zone UTC+00:00
TIME                                 SEQ  THREAD      COMP  KIND         BODY
2026-11-21T05:12:01.123456789Z         0  0x00007f01  ____  note         "SPOOL: app.1.sp not spooled 2 consecutive times"
2026-11-21T05:12:01.123457789Z         2  0x00007f01  ____  start        pid=4711 ticks/s=1000000000
2026-11-21T05:12:01.123458789Z         4  0x00007f01  IDX   id           id=17
2026-11-21T05:12:01.123459789Z         6  0x00007f01  IDX   id           id=none
2026-11-21T05:12:01.123460789Z         8  0x00007f01  IDX   data         id=21 3 blocks
    block 0, 5 bytes
        0000  68 65 6c 6c 6f                                    |hello|
    block 1, 0 bytes
    block 2, 20 bytes
        0000  30 31 32 33 34 35 36 37  38 39 61 62 63 64 65 66  |0123456789abcdef|
        0010  ff 00 0a 1b                                       |....|
2026-11-21T05:12:01.123461789Z        10  0x00007f01  IDX   values32     id=22 [3, 16, -1, 305419896 (0x12345678)]
2026-11-21T05:12:01.123462789Z        12  0x00007f01  IDX   values64     id=23 [7, -70000 (0xfffffffffffeee90), -9223372036854775808 (0x8000000000000000)]
2026-11-21T05:12:01.123463789Z        14  0x00007f01  IDX   error        id=31 error=18 at app.c:120 in open_it
    message "Error -13 opening \"/tmp/\x1b[1m\": -5 1099511627776 0.5"
    default message "Error %1$d opening \"%5$s\": %2$ld %3$lld %4$g"
    catalogue "app.cat" set 1 message 17
    ffdc id "FF1"
    argument 1 int -13
    argument 2 long -5
    argument 3 long long 1099511627776
    argument 4 double 0.5
    argument 5 string "/tmp/\x1b[1m"
    argument 6 pointer 0x7fff1000
2026-11-21T05:12:01.123464789Z        16  0x00007f01  AB    strings      id=24 "plain" "tab\there" "quote\"back\\slash" "\x1b[31mred\x07" "caf\xc3\xa9" ""
2026-11-21T05:12:01.123465789Z        18  0x00007f01  AB    strings      id=none "formatted text"
2026-11-21T05:12:01.123466789Z        20  0x00007f01  AB    strings      id=25 "not \xff UTF-8"
2026-11-21T05:12:02.123467789Z        22  0x00007f01  ____  restart      pid=4712 ticks/s=1000000000 "core event"
2026-11-21T05:12:00.561734394Z        24  0x00007f01  ____  calibration  ticks/s=2000000000
2026-11-21T05:12:00.561735394Z        28  0x00007f01  IDX2  id           id=99
)");
}

TEST(Formats, JsonShowsTheHeaderAndEveryKindOldestFirst)
{
    EXPECT_EQ(
        json_of(every_kind().bytes(), {.with_header = true}),
        R"({"type":"header","file":"test.trc","version":6,"byte_order":"little","platform":2,"build":"builder 1","pid":4711,"program":"/opt/app/bin/app -v","base_program":"app","node_number":0,"node_id":"000000000000abcd","file_size":4096,"time_base":{"ticks_per_second":"1000000000","epoch_ns":"1795237920000000000"},"tz_offset_minutes":0,"page_state":0,"page_reuse_time":0}
{"type":"record","time":"2026-11-21T05:12:01.123456789Z","time_ns":"1795237921123456789","seq":0,"thread":32513,"comp":"____","kind":"note","text":"SPOOL: app.1.sp not spooled 2 consecutive times"}
{"type":"record","time":"2026-11-21T05:12:01.123457789Z","time_ns":"1795237921123457789","seq":2,"thread":32513,"comp":"____","kind":"start","pid":4711,"time_base":{"ticks_per_second":"1000000000","epoch_ns":"1795237920000000000"}}
{"type":"record","time":"2026-11-21T05:12:01.123458789Z","time_ns":"1795237921123458789","seq":4,"thread":32513,"comp":"IDX","kind":"id","id":17}
{"type":"record","time":"2026-11-21T05:12:01.123459789Z","time_ns":"1795237921123459789","seq":6,"thread":32513,"comp":"IDX","kind":"id","id":4294967295}
{"type":"record","time":"2026-11-21T05:12:01.123460789Z","time_ns":"1795237921123460789","seq":8,"thread":32513,"comp":"IDX","kind":"data","id":21,"count":3,"blocks":["68656c6c6f","","30313233343536373839616263646566ff000a1b"]}
{"type":"record","time":"2026-11-21T05:12:01.123461789Z","time_ns":"1795237921123461789","seq":10,"thread":32513,"comp":"IDX","kind":"values32","id":22,"values":[3,16,4294967295,305419896]}
{"type":"record","time":"2026-11-21T05:12:01.123462789Z","time_ns":"1795237921123462789","seq":12,"thread":32513,"comp":"IDX","kind":"values64","id":23,"values":["7","18446744073709481616","9223372036854775808"]}
{"type":"record","time":"2026-11-21T05:12:01.123463789Z","time_ns":"1795237921123463789","seq":14,"thread":32513,"comp":"IDX","kind":"error","id":31,"error_id":18,"line":120,"function":"open_it","file":"app.c","ffdc_id":"FF1","catalogue":"app.cat","message_set":1,"message_number":17,"default_message":"Error %1$d opening \"%5$s\": %2$ld %3$lld %4$g","message":"Error -13 opening \"/tmp/\u001b[1m\": -5 1099511627776 0.5","arguments":[{"type":"int","value":"-13"},{"type":"long","value":"-5"},{"type":"long long","value":"1099511627776"},{"type":"double","value":"0.5"},{"type":"string","value":"/tmp/\u001b[1m"},{"type":"pointer","value":"0x7fff1000"}]}
{"type":"record","time":"2026-11-21T05:12:01.123464789Z","time_ns":"1795237921123464789","seq":16,"thread":32513,"comp":"AB","kind":"strings","id":24,"strings":["plain","tab\there","quote\"back\\slash","\u001b[31mred\u0007","caf\u00e9",""]}
{"type":"record","time":"2026-11-21T05:12:01.123465789Z","time_ns":"1795237921123465789","seq":18,"thread":32513,"comp":"AB","kind":"strings","id":4294967295,"strings":["formatted text"]}
{"type":"record","time":"2026-11-21T05:12:01.123466789Z","time_ns":"1795237921123466789","seq":20,"thread":32513,"comp":"AB","kind":"strings","id":25,"strings":["not \u00ff UTF-8"],"encoding":"latin-1"}
{"type":"record","time":"2026-11-21T05:12:02.123467789Z","time_ns":"1795237922123467789","seq":22,"thread":32513,"comp":"____","kind":"restart","pid":4712,"time_base":{"ticks_per_second":"1000000000","epoch_ns":"1795237921000000000"},"text":"core event"}
{"type":"record","time":"2026-11-21T05:12:00.561734394Z","time_ns":"1795237920561734394","seq":24,"thread":32513,"comp":"____","kind":"calibration","time_base":{"ticks_per_second":"2000000000","epoch_ns":"1795237920000000000"}}
{"type":"record","time":"2026-11-21T05:12:00.561735394Z","time_ns":"1795237920561735394","seq":28,"thread":32513,"comp":"IDX2","kind":"id","id":99}
)");
}

TEST(Formats, RawTextAddsHeaderFieldsFillersAndUnfinishedRecords)
{
    const auto text = text_of(every_kind().bytes(), {.raw = true, .with_header = true});
    EXPECT_EQ(text.substr(0, text.find("      1204")), R"(file     test.trc
format   version 6, little-endian, platform 2, written by "builder 1"
ring     200 to 4096, oldest record at 1204
process  pid 4711, "app", invoked as "/opt/app/bin/app -v"
node     number 0, id 0x000000000000abcd
time     1000000000 ticks/s, zone UTC+00:00
fields   uProperties=0xc0 uPlatform=2 uVersion=6 uFlags=0x0000 uNodeNumber=0
         uOffset=200 uSeqLock=1 uTailReq=0 uActualFileSize=4096
         timeInfo=0x000000003b9aca00,0x18e9f7606ce94000 machineId=0x0
         uOldestRecordOffset=1204 uPid=4711 uNode_ID=0x000000000000abcd
         sp_reuse_tm=0 sp_flags=0x00 tz_offset=0
    OFFSET      LENGTH    CODE    RESV               COUNTER  TIME                                 SEQ  THREAD      COMP  KIND         BODY
)");
    EXPECT_EQ(
        lines_with(text, "free"),
        R"(      1204        2892       0  0x0000            1123471789  -                                   4095  0x00007f01  IDX2  free
)");
    EXPECT_EQ(
        lines_with(text, "unfinished"),
        R"(      1140          32   65535  0x0000            1123469789  2026-11-21T05:12:00.561734894Z        26  0x00007f01  IDX2  unfinished
)");
    EXPECT_EQ(
        lines_with(text, "start"),
        R"(       276          52      16  0x0000            1123457789  2026-11-21T05:12:01.123457789Z         2  0x00007f01  ____  start        pid=4711 ticks/s=1000000000 epoch=0x18e9f7606ce94000
      1032          64      19  0x0000            1123467789  2026-11-21T05:12:02.123467789Z        22  0x00007f01  ____  restart      pid=4712 ticks/s=1000000000 epoch=0x18e9f760a8840a00 "core event"
)");
    EXPECT_EQ(
        lines_with(text, "id=17"),
        R"(       328          32       1  0x0000            1123458789  2026-11-21T05:12:01.123458789Z         4  0x00007f01  IDX\x00  id           id=17
)");
}

TEST(Formats, RawJsonAddsHeaderFieldsFillersAndUnfinishedRecords)
{
    const auto json = json_of(every_kind().bytes(), {.raw = true, .with_header = true});
    EXPECT_EQ(
        json.substr(0, json.find('\n') + 1),
        R"({"type":"header","file":"test.trc","version":6,"byte_order":"little","platform":2,"build":"builder 1","pid":4711,"program":"/opt/app/bin/app -v","base_program":"app","node_number":0,"node_id":"000000000000abcd","file_size":4096,"time_base":{"ticks_per_second":"1000000000","epoch_ns":"1795237920000000000"},"tz_offset_minutes":0,"page_state":0,"page_reuse_time":0,"properties":192,"flags":0,"ring_offset":200,"oldest_record_offset":1204,"seq_lock":1,"tail_request":0,"machine_id":0}
)");
    EXPECT_EQ(
        lines_with(json, "\"kind\":\"free\""),
        R"({"type":"record","time":null,"time_ns":null,"seq":4095,"thread":32513,"comp":"IDX2","kind":"free","offset":1204,"length":2892,"code":0,"reserved":0,"comp_bytes":"49445832","counter":"1123471789"}
)");
    EXPECT_EQ(
        lines_with(json, "\"kind\":\"unfinished\""),
        R"({"type":"record","time":"2026-11-21T05:12:00.561734894Z","time_ns":"1795237920561734894","seq":26,"thread":32513,"comp":"IDX2","kind":"unfinished","offset":1140,"length":32,"code":65535,"reserved":0,"comp_bytes":"49445832","counter":"1123469789","problem":"this record is being written, or its writer died before it was complete"}
)");
    EXPECT_EQ(
        lines_with(json, "\"kind\":\"error\""),
        R"({"type":"record","time":"2026-11-21T05:12:01.123463789Z","time_ns":"1795237921123463789","seq":14,"thread":32513,"comp":"IDX","kind":"error","id":31,"error_id":18,"line":120,"function":"open_it","file":"app.c","ffdc_id":"FF1","catalogue":"app.cat","message_set":1,"message_number":17,"default_message":"Error %1$d opening \"%5$s\": %2$ld %3$lld %4$g","message":"Error -13 opening \"/tmp/\u001b[1m\": -5 1099511627776 0.5","arguments":[{"type":"int","value":"-13"},{"type":"long","value":"-5"},{"type":"long long","value":"1099511627776"},{"type":"double","value":"0.5"},{"type":"string","value":"/tmp/\u001b[1m"},{"type":"pointer","value":"0x7fff1000"}],"offset":580,"length":252,"code":14,"reserved":0,"comp_bytes":"49445800","counter":"1123463789"}
)");
}

TEST(Formats, TextPassesPrintableUtf8WhereTheLocaleCanShowIt)
{
    trace_builder file;
    file.add_strings(1, {"caf\xc3\xa9 \xe2\x82\xac \xf0\x9f\x90\xa7"});
    file.close();
    EXPECT_NE(text_of(file.bytes(), {.utf_8 = true}).find("\"caf\xc3\xa9 \xe2\x82\xac \xf0\x9f\x90\xa7\""),
              std::string::npos);
    EXPECT_NE(text_of(file.bytes()).find(R"("caf\xc3\xa9 \xe2\x82\xac \xf0\x9f\x90\xa7")"), std::string::npos);
}

TEST(Formats, NoByteOfAFileReachesTheTerminalUnescaped)
{
    std::string all;
    for (int byte = 1; byte < 256; ++byte) {
        all += static_cast<char>(byte);
    }
    trace_builder file;
    file.put_text(52, all.substr(0, 47));
    file.put_text(132, all.substr(140, 47));
    file.component = "\x1b[2J";
    file.add_strings(1, {all});
    file.add(3, file.body().u32(1).u32(1).u32(255).chars(all));
    file.add(2, file.body().text(all));
    file.close();
    for (const auto &out : {text_of(file.bytes(), {.raw = true, .with_header = true}),
                            json_of(file.bytes(), {.raw = true, .with_header = true})}) {
        for (const char c : out) {
            EXPECT_TRUE(c == '\n' || (c >= 0x20 && c < 0x7F)) << static_cast<int>(c);
        }
    }
}

TEST(Formats, AComponentIdentifierEndsAtItsNulUnlessRawIsAskedFor)
{
    trace_builder file;
    file.component = std::string("A\0\x01z", 4);
    file.add_id(5);
    file.close();
    EXPECT_NE(text_of(file.bytes()).find("0x00007f01  A     id           id=5\n"), std::string::npos);
    EXPECT_NE(text_of(file.bytes(), {.raw = true}).find(R"(  A\x00\x01z  id )"), std::string::npos);
    EXPECT_NE(json_of(file.bytes()).find(R"("comp":"A","kind":"id","id":5})"), std::string::npos);
    EXPECT_NE(json_of(file.bytes(), {.raw = true}).find(R"("comp_bytes":"4100017a")"), std::string::npos);
}

TEST(Formats, APageFilesStateIsShown)
{
    trace_builder file;
    file.put_u8(192, 2);
    file.put_u32(188, 1'795'237'921);
    file.put_u32(196, static_cast<std::uint32_t>(-90));
    file.close();
    const auto text = text_of(file.bytes(), {.with_header = true});
    EXPECT_NE(text.find("page     full, last taken over unspooled at 2026-11-21T05:12:01.000000000Z\n"),
              std::string::npos);
    EXPECT_NE(text.find("zone UTC+01:30\n"), std::string::npos);
    EXPECT_NE(json_of(file.bytes(), {.with_header = true})
                  .find(R"("tz_offset_minutes":-90,"page_state":2,"page_reuse_time":1795237921})"),
              std::string::npos);
}

TEST(Formats, AnOlderVersionsHeaderHasNoFieldsThatCameLater)
{
    trace_builder file;
    file.put_u16(2, 3);
    file.close();
    const auto json = json_of(file.bytes(), {.with_header = true});
    EXPECT_NE(json.find(R"("version":3,)"), std::string::npos);
    EXPECT_NE(json.find(R"("node_id":null,)"), std::string::npos);
    EXPECT_NE(json.find(R"("tz_offset_minutes":null,"page_state":null,"page_reuse_time":null})"), std::string::npos);
}

TEST(Formats, ABigEndianFileReadsAsItsLittleEndianTwin)
{
    std::string texts[2];
    for (const auto order : {endian::little, endian::big}) {
        trace_builder file(4096, order);
        file.add_start(4711, trace_builder::ticks_per_second, trace_builder::epoch_ns);
        file.add_id(17);
        file.add(12, file.body().u32(22).u32(2).u32(3).u32(0xFFFFFFFE));
        file.add(13, file.body().u32(23).u32(1).u64(0x123456789ABC));
        file.add(3, file.body().u32(3).u32(1).u32(2).chars("hi"));
        file.add_strings(24, {"a", "b"});
        file.close();
        texts[order == endian::big] = text_of(file.bytes());
        EXPECT_TRUE(read_all(file.bytes()).damage().empty());
    }
    EXPECT_NE(texts[0], "");
    EXPECT_EQ(texts[0], texts[1]);
}

TEST(Formats, ATimeThatCannotBeWrittenLeavesTheCounter)
{
    trace_builder file;
    file.put_u64(24, 0);
    const auto record = file.add_id(1);
    file.close();
    EXPECT_EQ(text_of(file.bytes()), "counter 1123456789                     2  0x00007f01  TEST  id           id=1\n");
    EXPECT_NE(json_of(file.bytes()).find(R"({"type":"record","time":null,"time_ns":null,"seq":2,)"), std::string::npos);
    EXPECT_NE(json_of(file.bytes()).find(R"("counter":"1123456789")"), std::string::npos);

    // A tick a second: a year that has more than four digits.
    file.put_u64(24, 1);
    file.put_u64(record + 20, 1'000'000'000'000);
    EXPECT_EQ(text_of(file.bytes()).substr(0, 30), "counter 1000000000000         ");
    EXPECT_NE(json_of(file.bytes()).find(R"("time":null,"time_ns":"1001795237920000000000",)"), std::string::npos);
    EXPECT_NE(json_of(file.bytes()).find(R"("counter":"1000000000000"})"), std::string::npos);
}

TEST(Formats, ADamagedBodyIsMarkedInBothFormats)
{
    trace_builder file;
    file.add(12, file.body().u32(22).u32(9).u32(1).u32(2));
    file.close();
    EXPECT_NE(text_of(file.bytes()).find("id=22 [1, 2] [damaged: 9 values are announced, 2 fit]\n"), std::string::npos);
    EXPECT_NE(json_of(file.bytes()).find(R"("values":[1,2],"problem":"9 values are announced, 2 fit"})"),
              std::string::npos);
}

TEST(Formats, ANegativeBlockCountIsShownAsTheWriterStoredIt)
{
    trace_builder file;
    file.add(3, file.body().u32(6).u32(0xFFFFFFFF));
    file.close();
    EXPECT_NE(text_of(file.bytes()).find("data         id=6 count -1\n"), std::string::npos);
    EXPECT_NE(json_of(file.bytes()).find(R"("kind":"data","id":6,"count":-1,"blocks":[]})"), std::string::npos);
    EXPECT_TRUE(read_all(file.bytes()).damage().empty());
}

TEST(Formats, AnUnknownKindIsShownByItsCodeAndRawByItsBytes)
{
    trace_builder file;
    file.add(18, file.body().chars("what"));
    file.close();
    EXPECT_NE(text_of(file.bytes()).find("unknown      code=18 [damaged: no record is of kind 18]\n"),
              std::string::npos);
    const auto raw = text_of(file.bytes(), {.raw = true});
    EXPECT_NE(raw.find("        0000  77 68 61 74                                       |what|\n"), std::string::npos);
    EXPECT_NE(json_of(file.bytes(), {.raw = true}).find(R"("code":18,"bytes":"77686174")"), std::string::npos);
}

} // namespace
} // namespace qn::test
