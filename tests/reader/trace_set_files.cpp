#include "reader/trace_set_files.h"

#include <cstdlib>

#include <gtest/gtest.h>
#include <sched.h>
#include <sys/wait.h>
#include <unistd.h>

#include "reader/spool_directory.h"
#include "support/last_error.h"
#include "trace/trace.h"

namespace qn::test
{
namespace
{

// Nothing waits for its copy, and nothing is being copied.
void wait_for_copies()
{
    for (;; sched_yield()) {
        const qn::tr::mutex_lock queue(spq.mutex);
        if (spq.cnt == 0) return;
    }
}

bool write_all(const std::string &file, const std::string &spool_directory, std::uint64_t first, std::uint64_t count)
{
    // Its presence keeps the library from the configuration file of the machine.
    const auto specification = spool_directory.empty() ? "none" : ".*:ON:8:" + spool_directory;
    setenv("QN_TR_SPOOL", specification.c_str(), 1);
    client component("WRIT");
    if (tr_set_filename_1(file.c_str()) != 0 || component.register_now() != 0) return false;
    for (std::uint64_t value = first; value < first + count; ++value)
        if (tr_record_values_64_1("WRIT", 1, 1, value) != 0) return false;
    wait_for_copies();
    tr_term();
    return true;
}

} // namespace

trace_builder ids_from(std::uint64_t ms, const std::vector<std::uint32_t> &ids, std::uint64_t node_id)
{
    trace_builder file(16384);
    file.put_u64(180, node_id);
    file.counter = ms * 1'000'000;
    for (const auto id : ids) {
        file.add_id(id);
        file.counter += 1'000'000 - 1'000;
    }
    file.close();
    return file;
}

std::vector<nlohmann::json> sound_objects(const std::string &command, const strings &arguments)
{
    strings all = {command, "--json", "--utc"};
    all.insert(all.end(), arguments.begin(), arguments.end());
    const auto shown = run_qntrace(all);
    EXPECT_EQ(shown.status, 0) << shown.err;
    return rows(shown);
}

std::vector<std::uint32_t> ids_in(const outcome &merged)
{
    std::vector<std::uint32_t> ids;
    for (const auto &object : rows(merged)) ids.push_back(object.at("id"));
    return ids;
}

std::vector<std::uint32_t> merged_ids(const strings &arguments)
{
    std::vector<std::uint32_t> ids;
    for (const auto &object : sound_objects("merge", arguments)) ids.push_back(object.at("id"));
    return ids;
}

strings texts_of(const std::vector<nlohmann::json> &objects, const std::string &member)
{
    strings texts;
    for (const auto &object : objects) texts.push_back(object.at(member));
    return texts;
}

writing_program::writing_program(const std::string &file, const std::string &spool_directory, std::uint64_t first,
                                 std::uint64_t count)
    : child_(fork())
{
    if (child_ == 0) _exit(write_all(file, spool_directory, first, count) ? 0 : 1);
    EXPECT_GT(child_, 0);
}

writing_program::~writing_program()
{
    int status = 0;
    EXPECT_EQ(waitpid(child_, &status, 0), child_);
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << status;
}

std::vector<std::uint64_t> written_values(const std::vector<nlohmann::json> &objects)
{
    std::vector<std::uint64_t> values;
    for (const auto &object : objects)
        if (object.at("comp") == "WRIT") values.push_back(std::stoull(object.at("values").at(0).get<std::string>()));
    return values;
}

} // namespace qn::test
