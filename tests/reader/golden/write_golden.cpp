// Writes the golden trace: a small file into which the real library puts every record kind that it can write, the ring
// wrapped, the last record left unfinished as by a writer that was killed.
//
//     write_golden FILE
//
// README.md beside this file says how golden.trc was made, and when to make a new one.
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <thread>

#include <qn_tr.h>

#include "trace/trace.h"

namespace
{

constexpr qn_uint32_t file_bytes = 4096;

// More than half the ring: what follows reaches its end and goes on at its beginning.
void write_ids()
{
    for (qn_uint32_t id = 1; id <= 110; ++id) {
        tr_record_id_1("IDX", id);
    }
}

void write_values()
{
    tr_record_values_32_1("IDX", 201, 3, 0, 16, -1);
    tr_record_values_64_1("IDX", 202, 2, qn_int64_t{-70000}, INT64_MIN);
    tr_record_int32_1("IDX", 203, -5);
    tr_record_uint64_2_1("IDX", 204, 1, UINT64_MAX);
}

void write_texts()
{
    tr_record_strings_1("TEXT", 211, 3, "plain", "tab\there \"quoted\" back\\slash", "\x1b[31mred\a");
    tr_record_strings_1("TEXT", 212, 1, "caf\xc3\xa9");
    tr_record_strings_1("TEXT", 213, 1, "not \xff UTF-8");
    tr_record_string_1("TEXT", "without an id");
    tr_record_fmt_string_1("TEXT", 214, "%s %d", "formatted", 42);
}

void write_data()
{
    const unsigned char bytes[] = {0x00, 0x0A, 0x1B, 0x7F, 0x80, 0xFF};
    tr_record_data_1("AB", 221, 3, "hello", 5, "", 0, bytes, static_cast<int>(sizeof(bytes)));
    tr_record_data_1("AB", 222, static_cast<qn_uint32_t>(-1)); // a negative count is stored as it is
}

void write_errors()
{
    cu_set_error_1(18, "FF1", "treeindex.cat", 1, 7,
                   "Cannot read \"%s\": error %d after %ld of %lld bytes, %.1f %% at %p.", "/tmp/\x1b[1m", 13, 100L,
                   1LL << 40, 12.5, reinterpret_cast<void *>(0x7fff1000));
    tr_record_error_1("IDX", 231, "read_file", 120, "treeindex.c", nullptr);
    cu_set_error_1(19, nullptr, nullptr, 2, 3, nullptr);
    tr_record_error_1("IDX", 232, nullptr, 0, nullptr, nullptr);
}

// Ends the trace and starts it again, as after a crash that was announced.
void restart(char *name)
{
    static char message[] = "signal 11 in worker 3";
    gCoreMessage = message;
    gCoreTrcFile = name;
    tr_set_filename_1("");
    tr_set_filename_1(name);
    gCoreMessage = nullptr;
    gCoreTrcFile = nullptr;
}

void leave_one_unfinished()
{
    unsigned length = 32;
    auto *record = allocate_space(&anchors, &length);
    if (record != nullptr) std::memcpy(record->compId, "IDX", 4);
}

} // namespace

int main(int argc, char **argv)
{
    if (argc != 2) {
        std::fprintf(stderr, "usage: write_golden FILE\n");
        return 2;
    }
    tr_detail_level_t levels[1];
    const tr_category_description_t categories[1] = {{0, "All", 1, 1}};
    tr_set_multipage_1(0);
    if (tr_set_size_1(file_bytes) != 0 || tr_set_filename_1(argv[1]) != 0 ||
        tr_register_component_1("IDX", levels, categories, 1) != 0) {
        std::fprintf(stderr, "write_golden: the trace cannot be started\n");
        return 1;
    }
    write_ids();
    write_values();
    restart(argv[1]);
    std::thread(write_texts).join();
    __time_calibration(&anchors);
    write_data();
    // A second start of the program.
    tr_set_filename_1("");
    tr_set_filename_1(argv[1]);
    write_errors();
    leave_one_unfinished();
    tr_term();
    return 0;
}
