// The bytes of a trace file: header, record header, every record kind, page states.
//
// The one definition of the layout. The recorder, the query interface and the reader tool include it; docs/format.md
// draws it. Every offset and size is checked by the compiler, so a change here that moves a byte does not build.
//
//   0            200 = uOffset                                        uActualFileSize
//   | header     | record | record | ... | filler | oldest record | ... |
//                                        ^ uOldestRecordOffset points behind the newest record
//
// Integers are in the byte order of the machine that wrote the file. Records begin at multiples of 4 and their fields
// may be misaligned, so the records are packed; the header's words that other processes read are naturally aligned.
// Nothing here may be trusted when it comes from a file: the readers check before they follow a length or an offset.
#pragma once

#include <cstddef>
#include <cstdint>

#include <qn.h>
#include <qn_cu.h>

static_assert(sizeof(cu_timeinfo_t) == 16);

// ------------------------------------------------------------------------------------------------------- file header

#pragma pack(push, 4)
typedef struct trace_file_header {
    qn_uint8_t uProperties;          // properties::...
    qn_uint8_t uPlatform;            // platform_linux, or another library's code
    qn_uint16_t uVersion;            // format_version
    qn_uint16_t uFlags;              // 0, or flag_writer_waits
    qn_uint16_t uNodeNumber;         // cluster node number, 0 when unknown
    qn_uint32_t uOffset;             // start of the ring
    qn_uint32_t uSeqLock;            // sequence number of the record that a reader holds; seq_lock_none: none
    qn_uint32_t uTailReq;            // non-zero while a reader asks the writers to wait
    qn_uint32_t uActualFileSize;     // bytes of the file and of its mapping
    cu_timeinfo_t timeInfo;          // time base of the oldest records: relates counter values to wall-clock time
    qn_uint32_t machineId;           // 0
    qn_uint32_t uOldestRecordOffset; // where the ring is read from
    qn_uint32_t uPid;                // process that last started the file, or that of the oldest overwritten start
    char program[48];                // its command as invoked, at most 47 characters
    char buildName[32];              // build identifier of the library
    char baseProgName[48];           // the command's last path component, at most 47 characters
    qn_uint64_t uNode_ID;            // node identifier, 0 when unknown
    qn_uint32_t sp_reuse_tm;         // seconds since the epoch when the page was taken over unspooled; 0: never
    qn_uint8_t sp_flags;             // page_state::..., 0 in a single-file trace
    qn_uint8_t padding[3];           // left as it is
    qn_int32_t tz_offset;            // minutes from local time to UTC, positive west of Greenwich
} trace_file_header_t;
#pragma pack(pop)

static_assert(offsetof(trace_file_header_t, uProperties) == 0);
static_assert(offsetof(trace_file_header_t, uPlatform) == 1);
static_assert(offsetof(trace_file_header_t, uVersion) == 2);
static_assert(offsetof(trace_file_header_t, uFlags) == 4);
static_assert(offsetof(trace_file_header_t, uNodeNumber) == 6);
static_assert(offsetof(trace_file_header_t, uOffset) == 8);
static_assert(offsetof(trace_file_header_t, uSeqLock) == 12);
static_assert(offsetof(trace_file_header_t, uTailReq) == 16);
static_assert(offsetof(trace_file_header_t, uActualFileSize) == 20);
static_assert(offsetof(trace_file_header_t, timeInfo) == 24);
static_assert(offsetof(trace_file_header_t, machineId) == 40);
static_assert(offsetof(trace_file_header_t, uOldestRecordOffset) == 44);
static_assert(offsetof(trace_file_header_t, uPid) == 48);
static_assert(offsetof(trace_file_header_t, program) == 52);
static_assert(offsetof(trace_file_header_t, buildName) == 100);
static_assert(offsetof(trace_file_header_t, baseProgName) == 132);
static_assert(offsetof(trace_file_header_t, uNode_ID) == 180);
static_assert(offsetof(trace_file_header_t, sp_reuse_tm) == 188);
static_assert(offsetof(trace_file_header_t, sp_flags) == 192);
static_assert(offsetof(trace_file_header_t, padding) == 193);
static_assert(offsetof(trace_file_header_t, tz_offset) == 196);
static_assert(sizeof(trace_file_header_t) == 200);

namespace qn::tr::format
{
inline constexpr qn_uint32_t header_bytes = sizeof(trace_file_header_t);
inline constexpr qn_uint16_t format_version = 6;
inline constexpr qn_uint8_t platform_linux = 2;
inline constexpr qn_uint16_t flag_writer_waits = 0x8000;
inline constexpr qn_uint32_t seq_lock_none = 1; // no record has an odd sequence number

namespace properties
{
inline constexpr qn_uint8_t little_endian = 0x80;
inline constexpr qn_uint8_t always = 0x40; // a file without it is not continued
} // namespace properties

// Who moves a page from state to state: the writer sets active and full, the spool thread being_spooled and ready.
//
//   ready -> active -> full -> being_spooled -> ready        active or full -> active when a page is overwritten
namespace page_state
{
inline constexpr qn_uint8_t active = 1;
inline constexpr qn_uint8_t full = 2;
inline constexpr qn_uint8_t ready = 4;
inline constexpr qn_uint8_t being_spooled = 8;
} // namespace page_state

// Value of a record's `function`.
enum class kind : qn_uint16_t {
    free_space = 0, // a filler, or the free rest of the ring: no data
    identifier = 1,
    page_note = 2,
    data_blocks = 3,
    values_32 = 12,
    values_64 = 13,
    error = 14,
    strings = 15,
    start = 16,
    time_calibration = 17,
    restart = 19,
    being_written = 0xFFFF, // reserved and not completed, or never to be completed
};

inline constexpr qn_uint32_t seq_filler = 0xFFF; // the only odd sequence number of a sound ring
inline constexpr char library_component[4] = {'_', '_', '_', '_'};

// Rounds up to the multiple of 4 that every record length is.
constexpr qn_uint32_t round_up_4(qn_uint32_t bytes) { return (bytes + 3) & ~qn_uint32_t{3}; }
} // namespace qn::tr::format

// ----------------------------------------------------------------------------------------------------------- records

#pragma pack(push, 1)
typedef struct trace_record_header {
    qn_uint32_t length;    // of the whole record, a multiple of 4
    qn_uint16_t function;  // format::kind
    qn_uint16_t reserved;  // not written
    qn_uint32_t seqNumber; // even; format::seq_filler for a filler
    char compId[4];        // not NUL-terminated
    qn_uint32_t threadId;  // low 32 bits of pthread_self()
    qn_uint64_t timeStamp; // of cu_get_ctr_1
} trace_record_header_t;

// kind::identifier
typedef struct trace_record_id {
    trace_record_header_t header;
    qn_uint32_t id;
} trace_record_id_t;

// kind::page_note: the text follows, with its NUL
typedef struct trace_record_string {
    trace_record_header_t header;
} trace_record_string_t;

// kind::data_blocks: n_blocks blocks follow
typedef struct trace_record_data {
    trace_record_header_t header;
    qn_uint32_t trace_id;
    qn_uint32_t n_blocks;
} trace_record_data_t;

// One block; its bytes follow, padded to a multiple of 4
typedef struct trace_data_block {
    qn_int32_t length;
} trace_data_block_t;

// kind::values_32 and kind::values_64: `number` values of that width follow
typedef struct trace_record_values {
    trace_record_header_t header;
    qn_uint32_t id;
    qn_uint32_t number;
} trace_record_values_t;

// kind::strings: `number` strings follow, each with its NUL, back to back, len_strings bytes in all
typedef struct trace_record_strings {
    trace_record_header_t header;
    qn_uint32_t id;
    qn_uint32_t number;
    qn_uint32_t len_strings;
} trace_record_strings_t;

// kind::error: argCount trace_error_arg_t follow, then the strings. An ...Offset counts from the start of the record;
// 0 means that there is no such string.
typedef struct trace_record_error {
    trace_record_header_t header;
    qn_uint32_t traceId;
    qn_uint32_t errorId;
    qn_uint32_t lineNumber;
    qn_uint32_t funcNameOffset;
    qn_uint32_t fileNameOffset;
    qn_uint32_t ffdcIdOffset;
    qn_uint32_t msgSetNumber;
    qn_uint32_t msgNumber;
    qn_uint32_t msgCatNameOffset;
    qn_uint32_t defMsgOffset;
    qn_uint32_t argCount;
} trace_record_error_t;

// One argument of an error: the value, or for a string its offset from the start of the record
typedef struct trace_error_arg {
    qn_uint32_t type; // cu_error_arg_type_t
    qn_uint32_t padding;
    qn_uint64_t value;
} trace_error_arg_t;

// kind::start, and the head of kind::restart, whose text follows with its NUL
typedef struct trace_record_start {
    trace_record_header_t header;
    qn_uint32_t traceId; // not written
    qn_uint32_t pid;
    cu_timeinfo_t timeInfo;
} trace_record_start_t;

// kind::time_calibration
typedef struct time_calibration {
    trace_record_header_t header;
    cu_timeinfo_t reBase;
} time_calibration_t;
#pragma pack(pop)

static_assert(offsetof(trace_record_header_t, length) == 0);
static_assert(offsetof(trace_record_header_t, function) == 4);
static_assert(offsetof(trace_record_header_t, reserved) == 6);
static_assert(offsetof(trace_record_header_t, seqNumber) == 8);
static_assert(offsetof(trace_record_header_t, compId) == 12);
static_assert(offsetof(trace_record_header_t, threadId) == 16);
static_assert(offsetof(trace_record_header_t, timeStamp) == 20);
static_assert(sizeof(trace_record_header_t) == 28);

static_assert(offsetof(trace_record_id_t, id) == 28);
static_assert(sizeof(trace_record_id_t) == 32);

static_assert(sizeof(trace_record_string_t) == 28);

static_assert(offsetof(trace_record_data_t, trace_id) == 28);
static_assert(offsetof(trace_record_data_t, n_blocks) == 32);
static_assert(sizeof(trace_record_data_t) == 36);
static_assert(sizeof(trace_data_block_t) == 4);

static_assert(offsetof(trace_record_values_t, id) == 28);
static_assert(offsetof(trace_record_values_t, number) == 32);
static_assert(sizeof(trace_record_values_t) == 36);

static_assert(offsetof(trace_record_strings_t, id) == 28);
static_assert(offsetof(trace_record_strings_t, number) == 32);
static_assert(offsetof(trace_record_strings_t, len_strings) == 36);
static_assert(sizeof(trace_record_strings_t) == 40);

static_assert(offsetof(trace_record_error_t, traceId) == 28);
static_assert(offsetof(trace_record_error_t, errorId) == 32);
static_assert(offsetof(trace_record_error_t, lineNumber) == 36);
static_assert(offsetof(trace_record_error_t, funcNameOffset) == 40);
static_assert(offsetof(trace_record_error_t, fileNameOffset) == 44);
static_assert(offsetof(trace_record_error_t, ffdcIdOffset) == 48);
static_assert(offsetof(trace_record_error_t, msgSetNumber) == 52);
static_assert(offsetof(trace_record_error_t, msgNumber) == 56);
static_assert(offsetof(trace_record_error_t, msgCatNameOffset) == 60);
static_assert(offsetof(trace_record_error_t, defMsgOffset) == 64);
static_assert(offsetof(trace_record_error_t, argCount) == 68);
static_assert(sizeof(trace_record_error_t) == 72);
static_assert(offsetof(trace_error_arg_t, type) == 0);
static_assert(offsetof(trace_error_arg_t, value) == 8);
static_assert(sizeof(trace_error_arg_t) == 16);

static_assert(offsetof(trace_record_start_t, traceId) == 28);
static_assert(offsetof(trace_record_start_t, pid) == 32);
static_assert(offsetof(trace_record_start_t, timeInfo) == 36);
static_assert(sizeof(trace_record_start_t) == 52);

static_assert(offsetof(time_calibration_t, reBase) == 28);
static_assert(sizeof(time_calibration_t) == 44);

namespace qn::tr::format
{
inline constexpr qn_uint32_t record_header_bytes = sizeof(trace_record_header_t);

// Bytes that a data block takes: its length word and its bytes, padded.
constexpr qn_uint32_t block_bytes(qn_uint32_t length) { return (length + 7) & ~qn_uint32_t{3}; }
// Length of a strings record that holds len_strings bytes of strings.
constexpr qn_uint32_t strings_record_bytes(qn_uint32_t len_strings)
{
    return round_up_4(static_cast<qn_uint32_t>(sizeof(trace_record_strings_t)) + len_strings);
}
} // namespace qn::tr::format
