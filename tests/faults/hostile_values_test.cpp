// Values that nobody means well with, in every environment variable, every name and every key of the configuration:
// each in a process of its own with bounds on time and memory, which lives, is told a documented code, and traces
// afterwards. All debug lines are asked for, so that every name goes through them.
#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <functional>
#include <set>
#include <string>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

#include <gtest/gtest.h>

#include "faults/campaign.h"
#include "faults/hostile_values.h"
#include "support/last_error.h"
#include "support/private_var.h"
#include "support/scratch.h"
#include "support/system_log.h"
#include "support/trace_image.h"
#include "trace/trace.h"

namespace
{
using namespace qn::test;

constexpr const char *item = "Hostile values";
constexpr const char *disk = "/var/disk";
constexpr const char *configuration_folder = "/var/qn/cfg";
constexpr qn_uint32_t sane_bytes = 8192;

const std::set<qn_int32_t> start_codes = {0, 17, 18, 19, 20, 21, 22, 23, 35};
const std::set<qn_int32_t> specification_codes = {0, 10, 11, 12, 13, 15, 16, 17, 18, 19, 20, 21, 22, 23, 35};
const std::set<qn_int32_t> size_codes = {0, 17, 18, 19, 20, 21, 22, 23, 25, 35};

// The codes of calls that tell in the error record what was wrong.
const std::set<qn_int32_t> with_message = {10, 11, 12, 13, 15, 16, 17, 18, 19, 20, 21, 22, 23, 35, 36};

// What a child tells by its exit status.
enum story : int { well = 0, undocumented_code = 10, untold_code, no_trace_afterwards };

void limit(__rlimit_resource what, rlim_t most)
{
    const rlimit both = {most, most};
    setrlimit(what, &both);
}

void guard_process()
{
    alarm(60);
    limit(RLIMIT_CPU, 30);
    limit(RLIMIT_FSIZE, 16 << 20);
#if !defined(__SANITIZE_ADDRESS__)
    limit(RLIMIT_AS, 2UL << 30);
#endif
}

bool is_recorded(const std::string &folder, const std::string &trace, const std::string &text)
{
    for (const auto &entry : std::filesystem::directory_iterator(folder))
        if (entry.path().filename().string().starts_with(trace) && entry.is_regular_file() &&
            file_bytes(entry.path()).find(text) != std::string::npos)
            return true;
    return false;
}

// The same process traces with values that make sense. Other traces of it, which have no file yet, may go on having
// none: the calls tell so.
bool traces_afterwards(const std::string &folder)
{
    static client component("SANE");
    const bool possible = start_codes.contains(tr_set_file_size_1("", sane_bytes)) &&
                          tr_set_filename_1((folder + "/sane.trc").c_str()) == 0 &&
                          start_codes.contains(component.register_now()) &&
                          start_codes.contains(tr_set_trace_levels_1("SANE:c0=5")) && component.levels[0] == 5;
    return possible && tr_record_string_1("SANE", "all is well") == 0 && tr_flush_1() == 0 &&
           is_recorded(folder, "sane.trc", "all is well");
}

using call_with = std::function<qn_int32_t(const std::string &folder, const std::string &value)>;

// Makes the call in a process of its own, somewhere in a new folder in `parent`; what became of it.
int story_of(const call_with &call, const std::set<qn_int32_t> &codes, const std::string &value,
             const std::string &parent)
{
    const scratch folder(parent);
    const scratch sane_folder(memory_folder());
    const std::string place = folder / "a/b/c/d";
    std::filesystem::create_directories(place);
    const pid_t child = fork();
    if (child == 0) {
        guard_process();
        if (chdir(place.c_str()) != 0) _exit(1);
        setenv("QN_TR_DEBUG_LEVEL", "9", 0);
        leave_marker();
        const qn_int32_t status = call(place, value);
        if (!codes.contains(status)) _exit(undocumented_code);
        if (with_message.contains(status) && last_error().text.empty()) _exit(untold_code);
        _exit(traces_afterwards(sane_folder.folder()) ? well : no_trace_afterwards);
    }
    int status = 0;
    waitpid(child, &status, 0);
    return status;
}

struct hostile_call {
    const char *name;
    call_with call;
    std::set<qn_int32_t> codes;
};

// In the test suite every call gets some of the values, another one the others.
void expect_to_live(const std::vector<hostile_call> &calls, const std::string &parent = memory_folder())
{
    const size_t step = rounds(11, 1);
    uint64_t executions = 0;
    for (size_t i = 0; i < calls.size(); ++i)
        for (size_t j = i % step; j < hostile_values().size(); j += step) {
            const hostile_call &each = calls[i];
            const std::string &value = hostile_values()[j];
            const int status = story_of(each.call, each.codes, value, parent);
            EXPECT_EQ(status, 0) << each.name << " with " << value.size() << " bytes \"" << value.substr(0, 60)
                                 << "\": " << (WIFSIGNALED(status) ? strsignal(WTERMSIG(status)) : "exit status ")
                                 << (WIFEXITED(status) ? std::to_string(WEXITSTATUS(status)) : "");
            ++executions;
        }
    count(item, "faults", executions);
    count(item, "executions", executions);
}

// A program that is started with that variable.
hostile_call variable(const char *name, const std::string &before = "", const std::string &behind = "")
{
    return {name,
            [=](const std::string &folder, const std::string &value) {
                setenv("QN_TR_SIZE", std::to_string(sane_bytes).c_str(), 1);
                setenv("QN_TR_SPOOL", "none", 1);
                setenv("QN_TR_FILENAME", (folder + "/app.trc").c_str(), 1);
                setenv(name, (before + value + behind).c_str(), 1);
                static client component("COMP", 2);
                return component.register_now();
            },
            start_codes};
}

TEST(HostileEnvironment, OfNamesAndSizesIsSurvived)
{
    expect_to_live({variable("QN_TR_FILENAME"), variable("QN_TR_SIZE"), variable("QN_TR_DEBUG_LEVEL"),
                    variable("QN_TR_USE_MSYNC"), variable("QN_TR_DISABLE_DEFAULT_MULTIPAGE"),
                    variable("QN_TR_FILE_SIZE"), variable("QN_TR_FILE_SIZE", "app.trc,")});
}

TEST(HostileEnvironment, OfSpecificationsIsSurvived)
{
    expect_to_live({variable("QN_TR_TRACE_LEVELS"), variable("QN_TR_TRACE_LEVELS", "COMP:"),
                    variable("QN_TR_TRACE_LEVELS", "", ":*=3"), variable("QN_TR_TRACE_LEVELS", "COMP:*="),
                    variable("QN_TR_FILE_MAP"), variable("QN_TR_FILE_MAP", "map.trc,COMP:"),
                    variable("QN_TR_FILE_MAP", "", ",COMP:c0")});
}

TEST(HostileEnvironment, OfSpoolingIsSurvived)
{
    expect_to_live({variable("QN_TR_SPOOL"), variable("QN_TR_SPOOL", "", ":ON:4:spool"),
                    variable("QN_TR_SPOOL", "none:", ":4:spool"), variable("QN_TR_SPOOL", "none:ON:", ":spool"),
                    variable("QN_TR_SPOOL", ".*trc:ON:4:"), variable("QN_TR_SPOOL", "none:ON:4:spool:")});
}

// A call with a hostile string, of a program that has begun to trace.
hostile_call named(const char *name, std::function<qn_int32_t(const char *)> call, std::set<qn_int32_t> codes)
{
    return {name,
            [call = std::move(call)](const std::string &folder, const std::string &value) {
                setenv("QN_TR_SIZE", std::to_string(sane_bytes).c_str(), 1);
                setenv("QN_TR_SPOOL", "none", 1);
                static client component("COMP", 2);
                if (tr_set_filename_1((folder + "/app.trc").c_str()) != 0 || component.register_now() != 0) _exit(1);
                return call(value.c_str());
            },
            std::move(codes)};
}

TEST(HostileNames, OfFilesAreSurvived)
{
    expect_to_live(
        {named("tr_set_filename_1", tr_set_filename_1, start_codes),
         named(
             "tr_set_file_map_1, file", [](const char *v) { return tr_set_file_map_1(v, "COMP:c0"); },
             specification_codes),
         named(
             "tr_set_file_size_1", [](const char *v) { return tr_set_file_size_1(v, sane_bytes); }, size_codes),
         named(
             "tr_get_file_size_1",
             [](const char *v) {
                 qn_uint32_t size = 0;
                 return tr_get_file_size_1(v, &size);
             },
             size_codes),
         named("tr_open_query_1",
               [](const char *v) {
                   tr_query_handle_t query = nullptr;
                   const qn_int32_t status = tr_open_query_1(v, &query);
                   if (status == 0) tr_close_query_1(query);
                   return status;
               },
               {0, 17, 18, 19, 20, 21, 36}),
         named("tr_get_spool_dir_1", [](const char *v) { return tr_get_spool_dir_1(v) == nullptr ? 0 : 1; }, {0, 1}),
         named("tr_copy_file_1, to", [](const char *v) { return tr_copy_file_1(v, "/proc/self/status", 0); }, {0}),
         named("tr_copy_file_1, from", [](const char *v) { return tr_copy_file_1(".", v, 0); }, {0}),
         named("tr_core_event_1", [](const char *v) { return tr_core_event_1(v, v); }, {0})});
}

TEST(HostileNames, InSpecificationsAreSurvived)
{
    const auto levels = [](const std::string &before, const std::string &behind) {
        return [=](const char *v) { return tr_set_trace_levels_1((before + v + behind).c_str()); };
    };
    expect_to_live(
        {named("tr_set_trace_levels_1", levels("", ""), specification_codes),
         named("tr_set_trace_levels_1, component", levels("", ":*=3"), specification_codes),
         named("tr_set_trace_levels_1, category", levels("COMP:", "=3"), specification_codes),
         named("tr_set_trace_levels_1, level", levels("COMP:*=", ""), specification_codes),
         named(
             "tr_set_file_map_1", [](const char *v) { return tr_set_file_map_1("map.trc", v); }, specification_codes),
         named(
             "tr_set_file_map_1, category",
             [](const char *v) { return tr_set_file_map_1("map.trc", (std::string("COMP:") + v).c_str()); },
             specification_codes)});
}

TEST(HostileNames, OfComponentsAndInRecordsAreSurvived)
{
    const auto padded = [](const char *v) { return std::string(v) + std::string(4, '\0'); };
    expect_to_live(
        {named("tr_register_component_1",
               [=](const char *v) {
                   static client other(padded(v).c_str(), 2);
                   other.names[0] = v;
                   other.categories[0].category_name = other.names[0].c_str();
                   return other.register_now();
               },
               {0, 2, 5}),
         named("tr_unregister_component_1", tr_unregister_component_1, {0, 2, 26}),
         named("tr_record_id_1", [=](const char *v) { return tr_record_id_1(padded(v).c_str(), 1); }, {0, 2}),
         named("tr_record_string_1", [](const char *v) { return tr_record_string_1("COMP", v); }, {0, 27}),
         named("tr_record_printf_1", [](const char *v) { return tr_record_printf_1("COMP", "%s", v); }, {0}),
         named("tr_record_error_1",
               [](const char *v) {
                   cu_set_error_1(5, v, v, 1, 1, "%s", v);
                   return tr_record_error_1("COMP", 1, v, 2, v, nullptr);
               },
               {0})});
}

// For traces of any size that a number can ask for.
bool mount_small_disk() { return mkdir(disk, 0755) == 0 && mount("tmpfs", disk, "tmpfs", 0, "size=8m") == 0; }

std::vector<hostile_call> configuration_keys()
{
    std::vector<hostile_call> calls;
    for (const char *key : {"", "pat", "spooling", "pages", "dest", "size", "tracesize", "sync_interval"}) {
        calls.push_back({key,
                         [=](const std::string &folder, const std::string &value) {
                             std::string text = "app:\n";
                             if (std::strcmp(key, "pat") != 0) text += "pat = app.trc\n";
                             if (std::strcmp(key, "spooling") != 0) text += "spooling = OFF\n";
                             text += (*key != '\0' ? std::string(key) + " = " : "") + value + "\n";
                             std::filesystem::create_directories(configuration_folder);
                             write_file(std::string(configuration_folder) + "/trace.conf", text);
                             setenv("QN_TR_SIZE", std::to_string(sane_bytes).c_str(), 1);
                             setenv("QN_TR_FILENAME", (folder + "/app.trc").c_str(), 1);
                             static client component("COMP", 2);
                             return component.register_now();
                         },
                         start_codes});
    }
    return calls;
}

TEST(HostileConfiguration, IsSurvived)
{
    EXPECT_TRUE(in_private_var([] {
        if (!mount_small_disk()) return false;
        expect_to_live(configuration_keys(), disk);
        return true;
    }));
}

TEST(HostileEnvironment, OfSpooledSizesIsSurvived)
{
    EXPECT_TRUE(in_private_var([] {
        if (!mount_small_disk()) return false;
        expect_to_live(
            {variable("QN_TR_SPOOL", ".*app.trc:ON:", ":spool"), variable("QN_TR_SPOOL", ".*app.trc:ON:4:spool:")},
            disk);
        return true;
    }));
}

// What a name holds is never taken for a format: it is in the lines and messages as it stands.
TEST(HostileNames, StandInMessagesAsTheyAre)
{
    const std::string name = "%n%s%5$n%n%s";
    const scratch folder(memory_folder());
    setenv("QN_TR_DEBUG_LEVEL", "9", 1);
    setenv("QN_TR_SPOOL", "none", 1);
    setenv("QN_TR_SIZE", std::to_string(sane_bytes).c_str(), 1);
    client component(name.c_str());
    EXPECT_EQ(component.register_now(), 0);
    EXPECT_EQ(tr_set_filename_1((folder / name).c_str()), 0);
    const std::vector<log_line> lines = system_log();
    EXPECT_TRUE(std::any_of(lines.begin(), lines.end(),
                            [&](const log_line &line) { return line.text.find(name) != std::string::npos; }));

    EXPECT_EQ(mkdir((folder / (name + ".d")).c_str(), 0700), 0);
    tr_query_handle_t query = nullptr;
    EXPECT_EQ(tr_open_query_1((folder / (name + ".d")).c_str(), &query), 20);
    EXPECT_NE(last_error().text.find(name + ".d"), std::string::npos) << last_error().text;
}

// Not a test by itself: the program of the test below.
TEST(HostileProgramName, IsPlayed)
{
    const char *trace = std::getenv("QN_PLAY_TRACE");
    if (trace == nullptr) GTEST_SKIP() << "played by HostileProgramName.IsCutIntoTheHeader";
    guard_process();
    client component("COMP");
    EXPECT_EQ(tr_set_filename_1(trace) | component.register_now() | tr_record_id_1("COMP", 1), 0);
    tr_term();
}

TEST(HostileProgramName, IsCutIntoTheHeader)
{
    const scratch folder(memory_folder());
    uint64_t executions = 0;
    for (size_t i = 0; i < hostile_values().size(); i += rounds(5, 1), ++executions) {
        const std::string &name = hostile_values()[i];
        const std::string trace = folder / "app.trc";
        const pid_t child = fork();
        if (child == 0) {
            setenv("QN_PLAY_TRACE", trace.c_str(), 1);
            setenv("QN_TR_DEBUG_LEVEL", "9", 1);
            setenv("QN_TR_SPOOL", "none", 1);
            setenv("QN_TR_SIZE", std::to_string(sane_bytes).c_str(), 1);
            if (freopen("/dev/null", "w", stdout) == nullptr) _exit(1);
            execl("/proc/self/exe", name.c_str(), "--gtest_filter=HostileProgramName.IsPlayed", nullptr);
            _exit(1);
        }
        int status = 0;
        ASSERT_EQ(waitpid(child, &status, 0), child);
        EXPECT_EQ(status, 0) << name.substr(0, 60);
        if (status == 0) {
            EXPECT_EQ(trace_image::of_file(trace).text(52, 48), name.substr(0, 47));
        }
        std::filesystem::remove(trace);
    }
    count(item, "executions", executions);
}

// The judge itself: a process that dies, a code that nobody knows, a process that does not trace any more.
TEST(PlantedHarm, OfHostileValuesIsFound)
{
    const auto judged = [](const call_with &call) { return story_of(call, {0}, "x", memory_folder()); };
    EXPECT_TRUE(WIFSIGNALED(judged([](const auto &, const auto &) { return raise(SIGKILL); })));
    EXPECT_EQ(WEXITSTATUS(judged([](const auto &, const auto &) { return 5; })), undocumented_code);
    EXPECT_EQ(WEXITSTATUS(judged([](const auto &, const auto &) {
                  tr_term();
                  return 0;
              })),
              no_trace_afterwards);
    count("Planted harm is found", "rounds", 1);
}
} // namespace
