#include "files/support_files.h"

#include <climits>
#include <cstdlib>
#include <filesystem>
#include <thread>

#include <sched.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

namespace
{
[[maybe_unused]] const bool environment_is_clean = [] {
    for (const char *name :
         {"QN_TR_FILENAME", "QN_TR_SIZE", "QN_TR_DEBUG_LEVEL", "QN_TR_USE_MSYNC", "QN_TR_TRACE_LEVELS",
          "QN_TR_FILE_MAP", "QN_TR_FILE_SIZE", "QN_TR_SPOOL", "QN_TR_DISABLE_DEFAULT_MULTIPAGE", "NLSPATH"})
        unsetenv(name);
    return true;
}();

std::string command_line()
{
    std::ifstream file("/proc/self/cmdline", std::ios::binary);
    std::string command;
    std::getline(file, command, '\0');
    return command;
}
} // namespace

namespace
{
int is_child = 0;
}

// A child that ends through its exit handlers has no leak check of its own: the sanitizer's allocator may have been locked
// by another thread at the fork, for good.
extern "C" __attribute__((visibility("default"))) int __lsan_is_turned_off() { return is_child; }

namespace qn::test
{
trace_anchor_t *anchor_for(const std::string &file, qn_uint32_t requested_size)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    trace_anchor_t *anchor = findOrCreateAnchorForFile(file.c_str(), 1);
    anchor->uRequestedFileSize = requested_size;
    return anchor;
}

qn_int32_t start(trace_anchor_t *anchor) { return qn::tr::start_trace_locked(anchor); }

void stop(trace_anchor_t *anchor) { EXPECT_EQ(qn::tr::stop_trace_locked(anchor), 0); }

trace_anchor_t *start_without_record(const std::string &file, qn_uint32_t requested_size)
{
    trace_anchor_t *anchor = anchor_for(file, requested_size);
    global_stop_trace();
    EXPECT_EQ(start(anchor), 0);
    return anchor;
}

void write_ids(trace_anchor_t *anchor, qn_uint32_t count)
{
    for (qn_uint32_t id = 1; id <= count; ++id) EXPECT_EQ(tr_ms_record_id_1("TEST", id, anchor), 0);
}

std::vector<uint32_t> ids_in(const std::string &file)
{
    std::vector<uint32_t> ids;
    for (const record_image &record : trace_image::of_file(file).records_of(1)) ids.push_back(record.u32(28));
    return ids;
}

void put_bytes(const std::string &file, size_t offset, const std::string &bytes)
{
    std::fstream stream(file, std::ios::binary | std::ios::in | std::ios::out);
    stream.seekp(static_cast<std::streamoff>(offset));
    stream.write(bytes.data(), static_cast<std::streamsize>(bytes.size()));
    EXPECT_TRUE(stream.good()) << file;
}

void put_record(std::string &image, size_t offset, uint32_t length, uint16_t function, uint32_t sequence)
{
    ASSERT_LE(offset + 28, image.size());
    std::memcpy(&image[offset], &length, sizeof length);
    std::memcpy(&image[offset + 4], &function, sizeof function);
    std::memcpy(&image[offset + 8], &sequence, sizeof sequence);
}

bool exists(const std::string &file) { return std::filesystem::exists(std::filesystem::symlink_status(file)); }

void debug_on() { global_debug_level = 8; }

std::vector<std::string> debug_lines()
{
    std::vector<std::string> texts;
    for (const log_line &line : system_log()) texts.push_back(line.text);
    return texts;
}

std::string program_in_header() { return command_line().substr(0, 47); }

std::string base_name_in_header()
{
    const std::string command = command_line();
    return command.substr(command.rfind('/') + 1).substr(0, 47);
}

bool is_free(pthread_mutex_t &mutex)
{
    bool taken = false;
    std::thread([&] {
        taken = pthread_mutex_trylock(&mutex) == 0;
        if (taken) pthread_mutex_unlock(&mutex);
    }).join();
    return taken;
}

int open_descriptors()
{
    int count = 0;
    for ([[maybe_unused]] const auto &entry : std::filesystem::directory_iterator("/proc/self/fd")) ++count;
    return count;
}

exhausted_mutex::exhausted_mutex(pthread_mutex_t &mutex) : mutex_(mutex)
{
    EXPECT_EQ(pthread_mutex_lock(&mutex_), 0);
    mutex_.__data.__count = UINT_MAX;
}

exhausted_mutex::~exhausted_mutex()
{
    mutex_.__data.__count = 1;
    pthread_mutex_unlock(&mutex_);
}

void cancelled_thread::block()
{
    pthread_mutex_lock(&mutex_);
    waits_ = true;
    pthread_cond_signal(&reached_);
    pthread_mutex_unlock(&mutex_);
    // A call that blocks would be left without its end, which a race detector that watches it could not follow.
    for (;;) {
        pthread_testcancel();
        sched_yield();
    }
}

bool cancelled_thread::run(const std::function<void()> &body)
{
    struct work {
        const std::function<void()> *body;
        cancelled_thread *owner;
    } what{&body, this};
    pthread_t thread;
    const auto thread_body = [](void *argument) -> void * {
        const work *given = static_cast<work *>(argument);
        (*given->body)();
        pthread_mutex_lock(&given->owner->mutex_);
        given->owner->ended_ = true;
        pthread_cond_signal(&given->owner->reached_);
        pthread_mutex_unlock(&given->owner->mutex_);
        return nullptr;
    };
    if (pthread_create(&thread, nullptr, thread_body, &what) != 0) return false;

    pthread_mutex_lock(&mutex_);
    while (!waits_ && !ended_) pthread_cond_wait(&reached_, &mutex_);
    pthread_mutex_unlock(&mutex_);
    pthread_cancel(thread);
    void *result = nullptr;
    pthread_join(thread, &result);
    return result == PTHREAD_CANCELED;
}

bool in_child(const std::function<bool()> &body, bool exit_handlers)
{
    const pid_t child = fork();
    if (child == 0) {
        is_child = 1;
        alarm(120);
        const int status = body() && !::testing::Test::HasFailure() ? 0 : 1;
        std::fflush(nullptr);
        if (exit_handlers) std::exit(status);
        _exit(status);
    }
    int status = 0;
    return child > 0 && waitpid(child, &status, 0) == child && WIFEXITED(status) && WEXITSTATUS(status) == 0;
}
} // namespace qn::test
