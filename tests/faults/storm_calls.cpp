#include "faults/storm_calls.h"

#include <atomic>
#include <cstdlib>
#include <filesystem>
#include <mutex>
#include <shared_mutex>

#include "faults/program.h"
#include "recording/writers.h"
#include "support/scratch.h"
#include "trace/files/shared_words.h"
#include "trace/traceutils/traceutils.h"

namespace
{
using namespace qn::test;

constexpr unsigned categories = 4;

std::vector<storm_call> writing_calls()
{
    std::vector<storm_call> calls;
    for (const writer_call &writer : all_writers())
        calls.push_back({{writer.name},
                         [&writer](storm_thread &thread) {
                             return writer.write(thread.component.id.c_str(),
                                                 writer.takes_token ? thread.any_token() : nullptr);
                         },
                         {}});
    return calls;
}

// A component's tokens are gone with the end of tracing.
std::shared_mutex tokens_are_there;

qn_int32_t register_component(storm_thread &thread)
{
    const std::shared_lock<std::shared_mutex> guard(tokens_are_there);
    const qn_int32_t status = thread.component.register_now();
    if (status == 0) thread.keep_tokens();
    return status;
}

// The registration without tokens; the levels are the same component's.
qn_int32_t register_without_tokens(storm_thread &thread)
{
    const client &component = thread.component;
    return tr_register_component_1(component.id.c_str(), const_cast<tr_detail_level_t *>(component.levels.data()),
                                   component.categories.data(), static_cast<qn_uint32_t>(component.categories.size()));
}

// The library keeps specifications for the components to come, and each registration takes longer by them: so they get
// rarer. One without a separator is refused.
bool is_to_be_kept(storm_thread &thread)
{
    static std::atomic<unsigned> kept{0};
    const unsigned before = kept;
    if (thread.any(1 + before * before / 8) != 0) return false;
    ++kept;
    return true;
}

std::string any_levels(storm_thread &thread)
{
    if (!is_to_be_kept(thread)) return "STM";
    const std::string component = thread.any(4) == 0 ? ".*" : thread.any_component();
    return component + ":c" + std::to_string(thread.any(categories)) + "=" + std::to_string(thread.any(4));
}

qn_int32_t set_file_map(storm_thread &thread)
{
    std::string specification = thread.any_component();
    if (is_to_be_kept(thread)) specification += ":c" + std::to_string(thread.any(categories));
    return tr_set_file_map_1(thread.files().mapped.c_str(), specification.c_str());
}

qn_int32_t name_file(storm_thread &thread)
{
    const std::string names[] = {thread.files().page_set, thread.files().single, ""};
    return tr_set_filename_1(names[thread.any(3)].c_str());
}

qn_uint32_t any_size(storm_thread &thread) { return (1 + thread.any(3)) * program_file_bytes; }

std::vector<storm_call> component_calls()
{
    return {
        {{"tr_ms_register_component_1"}, register_component, {QN_TR_EINUSE}},
        {{"tr_register_component_1"}, register_without_tokens, {QN_TR_EINUSE}},
        {{"tr_unregister_component_1"},
         [](storm_thread &thread) { return tr_unregister_component_1(thread.component.id.c_str()); },
         {QN_TR_ENOTREGISTERED, QN_TR_ELOCK}}, // that when tracing is over
        {{"tr_set_trace_levels_1"},
         [](storm_thread &thread) { return tr_set_trace_levels_1(any_levels(thread).c_str()); },
         {QN_TR_ESPECSEP}},
        {{"tr_get_current_trace_levels_1", "tr_release_comp_info_1"},
         [](storm_thread &) {
             int count = 0;
             tr_mini_component_anchor_t *components = nullptr;
             const int status = tr_get_current_trace_levels_1(&count, &components);
             tr_release_comp_info_1(count, components);
             if (count == 0) std::free(components); // which the release leaves alone
             return status;
         },
         {}},
    };
}

std::vector<storm_call> file_calls()
{
    return {
        {{"tr_set_filename_1"}, name_file, {}},
        {{"tr_get_filename_1"},
         [](storm_thread &) {
             char name[4096];
             return tr_get_filename_1(name);
         },
         {}},
        {{"tr_set_file_map_1"}, set_file_map, {QN_TR_ESPECSEP}},
        {{"tr_set_size_1"}, [](storm_thread &thread) { return tr_set_size_1(any_size(thread)); }, {}},
        {{"tr_get_size_1"},
         [](storm_thread &) {
             qn_uint32_t size = 0;
             return tr_get_size_1(&size);
         },
         {QN_TR_WINACTIVE}},
        {{"tr_set_file_size_1"},
         [](storm_thread &thread) { return tr_set_file_size_1(thread.files().mapped.c_str(), any_size(thread)); },
         {}},
        {{"tr_get_file_size_1"},
         [](storm_thread &thread) {
             qn_uint32_t size = 0;
             return tr_get_file_size_1(thread.files().mapped.c_str(), &size);
         },
         {QN_TR_WINACTIVE, QN_TR_EFILENAME}},
        {{"tr_set_multipage_1"},
         [](storm_thread &thread) { return tr_set_multipage_1(static_cast<int>(thread.any(2))); },
         {}},
        {{"tr_flush_1"}, [](storm_thread &) { return tr_flush_1(); }, {}},
        {{"tr_pin_pages_1"}, [](storm_thread &thread) { return tr_pin_pages_1(static_cast<int>(thread.any(2))); }, {}},
    };
}

// A core event may be announced by one thread at a time.
qn_int32_t announce_core_event(storm_thread &thread)
{
    static std::mutex one_thread;
    const std::lock_guard<std::mutex> guard(one_thread);
    return tr_core_event_1(thread.files().single.c_str(), "storm");
}

std::vector<storm_call> spooling_calls()
{
    return {
        {{"tr_copy_file_1"},
         [](storm_thread &thread) {
             return tr_copy_file_1(thread.files().copies.c_str(), thread.files().copied.c_str(), 0);
         },
         {}},
        {{"tr_core_event_1"}, announce_core_event, {}},
        {{"tr_get_spool_dir_1"},
         [](storm_thread &thread) {
             tr_get_spool_dir_1(thread.files().page_set.c_str());
             return 0;
         },
         {}},
        {{"tr_configure_1"},
         [](storm_thread &) {
             tr_configure_1();
             return 0;
         },
         {}},
        {{"tr_get_current_spooling_status_1", "tr_release_spool_info_1"},
         [](storm_thread &) {
             qn_int32_t count = 0;
             tr_mini_spooling_anchor_t *records = nullptr;
             const qn_int32_t status = tr_get_current_spooling_status_1(&count, &records);
             tr_release_spool_info_1(count, records);
             return status;
         },
         {}},
    };
}

// The configuration may be read by one thread at a time. The machine's may be there or not.
qn_int32_t read_configuration(storm_thread &thread)
{
    static std::mutex one_thread;
    const std::lock_guard<std::mutex> guard(one_thread);
    trace_raw_config_t *of_machine = nullptr;
    tr_read_conf_file_1(&of_machine);
    tr_free_trace_raw_config_1(of_machine);
    trace_raw_config_t *sections = nullptr;
    trace_conf_data_t *elements = nullptr;
    qn_int32_t status = qn::tr::read_conf_file(thread.files().configuration.c_str(), &sections, nullptr);
    if (status == 0) status = tr_parse_all_sections_1(sections, &elements, 0);
    tr_free_trace_raw_config_1(sections);
    tr_free_trace_conf_data_1(elements);
    return status;
}

qn_int32_t ask_for_program(storm_thread &thread)
{
    char *program = nullptr;
    const qn_int32_t status = tr_query_prog_1(thread.query, &program);
    std::free(program);
    return status;
}

std::vector<storm_call> reading_calls()
{
    return {
        {{"tr_read_conf_file_1", "tr_free_trace_raw_config_1", "tr_parse_all_sections_1", "tr_free_trace_conf_data_1"},
         read_configuration,
         {}},
        {{"tr_open_query_1"},
         [](storm_thread &thread) {
             if (thread.query != nullptr) return 0;
             return tr_open_query_1(thread.files().single.c_str(), &thread.query);
         },
         {QN_TR_EOPEN, QN_TR_ENOTTRACE}},
        {{"tr_close_query_1"},
         [](storm_thread &thread) {
             const qn_int32_t status = tr_close_query_1(thread.query);
             thread.query = nullptr;
             return status;
         },
         {QN_TR_EHANDLE}},
        {{"tr_query_pid_1"},
         [](storm_thread &thread) {
             pid_t pid = 0;
             return tr_query_pid_1(thread.query, &pid);
         },
         {QN_TR_EHANDLE}},
        {{"tr_query_prog_1"}, ask_for_program, {QN_TR_EHANDLE}},
        {{"tr_query_platform_1"},
         [](storm_thread &thread) {
             qn_uint32_t platform = 0;
             return tr_query_platform_1(thread.query, &platform);
         },
         {QN_TR_EHANDLE}},
    };
}
} // namespace

namespace qn::test
{
storm_files::storm_files(const std::string &folder)
    : page_set(folder + "/pages.trc"), single(folder + "/single.trc"), mapped(folder + "/mapped.trc"),
      copied(folder + "/copied"), copies(folder + "/copies"), configuration(folder + "/configuration")
{
    std::filesystem::create_directory(copies);
    write_file(copied, std::string(1000, 'x'));
    write_file(configuration, "# note\ndefault:\ndest = /d\nt:\npat = /x\nspooling = ON\npages = 4\n");
}

storm_thread::~storm_thread()
{
    if (query != nullptr) tr_close_query_1(query);
}

storm_thread::storm_thread(const storm_files &files, unsigned number, uint64_t seed)
    : component(("STM" + std::to_string(number)).c_str(), categories), files_(files), random_(seed + number)
{
}

void storm_thread::keep_tokens()
{
    tokens_ = {nullptr};
    for (unsigned i = 0; i < categories; ++i) tokens_.push_back(qn::tr::load_relaxed(component.tokens[i]));
}

void end_tracing()
{
    const std::unique_lock<std::shared_mutex> guard(tokens_are_there);
    tr_term();
}

const std::vector<storm_call> &storm_calls()
{
    static const std::vector<storm_call> all = [] {
        std::vector<storm_call> calls;
        for (const auto &some : {writing_calls(), component_calls(), file_calls(), spooling_calls(), reading_calls()})
            calls.insert(calls.end(), some.begin(), some.end());
        return calls;
    }();
    return all;
}
} // namespace qn::test
