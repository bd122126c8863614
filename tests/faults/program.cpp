#include "faults/program.h"

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <thread>

#include <sys/wait.h>
#include <unistd.h>

#include "support/scratch.h"
#include "trace/trace.h"

namespace
{
qn::test::program_files names;
}

namespace qn::test
{
const program_files &files() { return names; }

void small_files(const std::string &folder)
{
    names = {folder + "/app.trc", folder + "/map.trc", folder + "/from", folder + "/to", folder + "/spool"};
    setenv("QN_TR_SIZE", std::to_string(program_file_bytes).c_str(), 1);
    setenv("QN_TR_SPOOL", "none", 1);
}

client &component()
{
    static client program("COMP", 3);
    return program;
}

void prepared(const std::string &folder)
{
    small_files(folder);
    component();
}

void registered(const std::string &folder)
{
    prepared(folder);
    if (component().register_now() != 0) _exit(1);
}

void running(const std::string &folder)
{
    registered(folder);
    if (name_it(folder) != 0) _exit(1);
}

void with_page_set(const std::string &folder)
{
    registered(folder);
    const qn::tr::global_lock global;
    if (addSpoolCfgElement(names.spool.c_str(), "app\\.trc", 4, 1, 60, &anchors.pFirstSpoolSpec,
                           &anchors.pLastSpoolSpec, 0, program_file_bytes) != 0)
        _exit(1);
}

void with_file_to_copy(const std::string &folder)
{
    registered(folder);
    pthread_once(&sp_thread_once, mk_sp_thread);
    write_file(names.copied, std::string(copied_bytes, 'x'));
    std::filesystem::create_directory(names.destination);
}

qn_int32_t name_it(const std::string &) { return tr_set_filename_1(names.trace.c_str()); }
void unname_it(const std::string &) { tr_set_filename_1(""); }

qn_int32_t write_ids(qn_uint32_t first, qn_uint32_t count)
{
    qn_int32_t status = 0;
    for (qn_uint32_t i = 0; i < count; ++i) status |= tr_record_id_1("COMP", first + i);
    return status;
}

bool queue_is_empty()
{
    const qn::tr::mutex_lock queue(spq.mutex);
    return spq.cnt == 0;
}

void wait_for_queue()
{
    // Not usleep(): a thread is cancelled at each of its calls, and how long a copy takes is no matter for that.
    while (!queue_is_empty()) std::this_thread::sleep_for(std::chrono::microseconds(100));
}

bool in_process(const std::function<bool()> &body)
{
    const pid_t child = fork();
    if (child == 0) {
        alarm(most_seconds);
        _exit(body() ? 0 : 1);
    }
    int status = 0;
    return waitpid(child, &status, 0) == child && status == 0;
}
} // namespace qn::test
