#include "faults/attacked_calls.h"

#include <cstdlib>
#include <filesystem>

#include <gtest/gtest.h>
#include <unistd.h>

#include "faults/program.h"
#include "support/scratch.h"
#include "trace/trace.h"
#include "trace/traceutils/traceutils.h"

namespace
{
using namespace qn::test;

// What a trace file's start may return: the file could not be started.
const std::vector<qn_int32_t> start_codes = {9, 14, 17, 18, 19, 20, 21, 22, 23, 35};
// The same, and a page that there was no memory for.
const std::vector<qn_int32_t> page_set_codes = {-1, 9, 14, 17, 18, 19, 20, 21, 22, 23, 35};
// The codes of a start, and a pattern that did not compile.
const std::vector<qn_int32_t> pattern_codes = {9, 14, 15, 16, 17, 18, 19, 20, 21, 22, 23, 35};

void nothing(const std::string &) {}

tr_query_handle_t query = nullptr;

void remove_files(const std::string &folder)
{
    for (const auto &entry : std::filesystem::directory_iterator(folder)) std::filesystem::remove_all(entry.path());
}

// The name of a file below the folder that has another size, or nothing.
std::string file_not_of_size(const std::string &folder, uintmax_t bytes)
{
    std::error_code no_folder;
    for (const auto &entry : std::filesystem::recursive_directory_iterator(folder, no_folder))
        if (entry.is_regular_file() && entry.file_size() != bytes) return entry.path().string();
    return "";
}

std::vector<attacked_call> starting_calls()
{
    return {
        {"Register",
         prepared,
         [](const std::string &) { return component().register_now(); },
         [](const std::string &) { tr_unregister_component_1("COMP"); },
         {14}},
        {"RegisterAndStart",
         [](const std::string &folder) {
             prepared(folder);
             setenv("QN_TR_FILENAME", files().trace.c_str(), 1);
             setenv("QN_TR_TRACE_LEVELS", "COMP:c0=4,X.*:.*=2", 1);
             setenv("QN_TR_FILE_MAP", (files().mapped + ",COMP:c1").c_str(), 1);
             setenv("QN_TR_FILE_SIZE", (files().mapped + ",4096").c_str(), 1);
             setenv("QN_TR_SPOOL", ".*none:ON:4:/nonexistent:2097152", 1);
         },
         [](const std::string &) { return component().register_now(); },
         [](const std::string &) { tr_unregister_component_1("COMP"); }, start_codes},
        {"SetFileName", registered, name_it, unname_it, start_codes},
        {"SetFileNameOfExistingFile",
         [](const std::string &folder) {
             running(folder);
             write_ids(0, 500);
             unname_it(folder);
         },
         name_it, unname_it, start_codes},
        {"SetFileNameToNull",
         running,
         [](const std::string &) { return tr_set_filename_1(nullptr); },
         [](const std::string &folder) {
             unname_it(folder);
             name_it(folder);
         },
         {}},
        {"SetTraceLevels",
         [](const std::string &folder) {
             prepared(folder);
             component() = client("COMP", 3, 0);
             if (component().register_now() != 0 || name_it(folder) != 0) _exit(1);
         },
         [](const std::string &) { return tr_set_trace_levels_1("COMP:c.=3,[A-Z]+:*=1"); },
         [](const std::string &folder) {
             tr_set_trace_levels_1("*:*=0");
             unname_it(folder);
             name_it(folder);
         },
         pattern_codes},
        {"SetFileMap", registered,
         [](const std::string &) { return tr_set_file_map_1(files().mapped.c_str(), "COMP:c[12]"); },
         [](const std::string &) { tr_set_filename_1(nullptr); }, pattern_codes},
        {"SetFileSize", running, [](const std::string &) { return tr_set_file_size_1("", large_file_bytes); },
         [](const std::string &folder) {
             unname_it(folder);
             remove_files(folder);
             tr_set_file_size_1("", program_file_bytes);
             name_it(folder);
         },
         start_codes},
        {"StartPageSet", with_page_set, name_it, unname_it, page_set_codes},
    };
}

std::vector<attacked_call> spooling_calls()
{
    return {
        {"FillPages",
         [](const std::string &folder) {
             with_page_set(folder);
             if (name_it(folder) != 0) _exit(1);
         },
         [](const std::string &) {
             const qn_int32_t status = write_ids(0, 500);
             wait_for_queue();
             return status;
         },
         nothing,
         {},
         false,
         false,
         1,
         false,
         [](const std::string &) { return file_not_of_size(files().spool, program_file_bytes); }},
        {"CopyFile",
         with_file_to_copy,
         [](const std::string &) {
             const qn_int32_t status = tr_copy_file_1(files().destination.c_str(), files().copied.c_str(), 0);
             wait_for_queue();
             return status;
         },
         nothing,
         {},
         false,
         false,
         1,
         false,
         [](const std::string &) { return file_not_of_size(files().destination, copied_bytes); }},
        {"GetSpoolDirectory",
         [](const std::string &folder) { with_page_set(folder); },
         [](const std::string &) { return tr_get_spool_dir_1(files().trace.c_str()) != nullptr ? 0 : -1; },
         nothing,
         {-1},
         false,
         false,
         0,
         true},
        {"CoreEvent",
         running,
         [](const std::string &) { return tr_core_event_1(files().trace.c_str(), "the end"); },
         nothing,
         {14},
         false},
        {"Configure",
         running,
         [](const std::string &) {
             tr_configure_1();
             return 0;
         },
         nothing,
         {},
         false},
        {"SpoolingStatus",
         running,
         [](const std::string &) {
             qn_int32_t count = 0;
             tr_mini_spooling_anchor_t *records = nullptr;
             const qn_int32_t status = tr_get_current_spooling_status_1(&count, &records);
             tr_release_spool_info_1(count, records);
             return status;
         },
         nothing,
         {-1},
         false,
         true},
    };
}

std::vector<attacked_call> other_calls()
{
    return {
        {"TraceLevels",
         running,
         [](const std::string &) {
             int count = 0;
             tr_mini_component_anchor_t *records = nullptr;
             const int status = tr_get_current_trace_levels_1(&count, &records);
             tr_release_comp_info_1(status == 0 ? count : 0, records);
             return status;
         },
         nothing,
         {-1},
         false,
         true},
        {"Flush", running, [](const std::string &) { return tr_flush_1(); }, nothing, {32}},
        {"PinPages",
         running,
         [](const std::string &) { return tr_pin_pages_1(1); },
         [](const std::string &) { tr_pin_pages_1(0); },
         {}},
        {"SetMultipage", registered, [](const std::string &) { return tr_set_multipage_1(0); }, nothing, {}, false},
        {"GetNamesAndSizes",
         running,
         [](const std::string &) {
             char name[4096];
             qn_uint32_t size = 0;
             const qn_int32_t status = tr_get_filename_1(name);
             return status != 0 ? status : tr_get_size_1(&size);
         },
         nothing,
         {}},
        {"Unregister",
         running,
         [](const std::string &) { return tr_unregister_component_1("COMP"); },
         [](const std::string &) { component().register_now(); },
         {}},
        {"OpenQuery",
         [](const std::string &folder) {
             running(folder);
             unname_it(folder);
         },
         [](const std::string &) { return tr_open_query_1(files().trace.c_str(), &query); },
         [](const std::string &) {
             tr_close_query_1(query);
             query = nullptr;
         },
         {14, 17, 18, 19, 20, 21, 36}},
        {"QueryProgram",
         [](const std::string &folder) {
             running(folder);
             if (tr_open_query_1(files().trace.c_str(), &query) != 0) _exit(1);
         },
         [](const std::string &) {
             char *program = nullptr;
             const qn_int32_t status = tr_query_prog_1(query, &program);
             std::free(program);
             return status;
         },
         nothing,
         {14}},
        {"ReadConfiguration",
         [](const std::string &folder) {
             small_files(folder);
             write_file(files().copied, "# note\ndefault:\ndest = /d\nt:\npat = /x\nspooling = ON\npages = 4\n");
         },
         [](const std::string &) {
             trace_raw_config_t *sections = nullptr;
             trace_conf_data_t *elements = nullptr;
             qn_int32_t status = qn::tr::read_conf_file(files().copied.c_str(), &sections, nullptr);
             if (status == 0) status = tr_parse_all_sections_1(sections, &elements, 0);
             if (status == 0 && elements->num_elements != 2) status = -1; // a section was left out
             tr_free_trace_raw_config_1(sections);
             tr_free_trace_conf_data_1(elements);
             return status;
         },
         nothing,
         {-1, 14, 42, 43, 44, 48},
         false},
        {"EveryWriter",
         running,
         [](const std::string &) {
             qn_int32_t status = write_ids(0, 500);
             status |= tr_record_string_1("COMP", "text");
             status |= tr_record_fmt_string_1("COMP", 1, "%d %s", 1, "text");
             status |= tr_record_data_1("COMP", 2, 1, "data", 4);
             status |= tr_record_values_64_1("COMP", 3, 1, qn_int64_t{4});
             status |= tr_record_error_1("COMP", 4, "function", 5, "file", nullptr);
             return status;
         },
         nothing,
         {},
         false},
        {"Terminate",
         running,
         [](const std::string &) {
             tr_term();
             return 0;
         },
         nothing,
         {},
         false},
    };
}
} // namespace

namespace qn::test
{
const std::vector<attacked_call> &attacked_calls()
{
    static const std::vector<attacked_call> all = [] {
        std::vector<attacked_call> calls;
        for (const auto &some : {starting_calls(), spooling_calls(), other_calls()})
            calls.insert(calls.end(), some.begin(), some.end());
        return calls;
    }();
    return all;
}

const attacked_call &attacked_call_named(std::string_view name)
{
    for (const attacked_call &call : attacked_calls())
        if (call.name == name) return call;
    ADD_FAILURE() << "no attacked call is named " << name;
    return attacked_calls().front();
}
} // namespace qn::test
