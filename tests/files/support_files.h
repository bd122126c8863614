// What the tests of trace files share: anchors started and stopped with their lock held, bytes changed in a file at
// rest, locks and descriptors looked at from outside. The library's environment variables are unset before main.
#pragma once

#include <cstdint>
#include <cstring>
#include <fstream>
#include <functional>
#include <string>
#include <vector>

#include <pthread.h>

#include "support/last_error.h"
#include "support/scratch.h"
#include "support/system_log.h"
#include "support/trace_image.h"
#include "trace/trace.h"

namespace qn::test
{
inline constexpr const char *file_name_variable = "QN_TR_FILENAME";

// An anchor of its own for the file; it has no file yet.
trace_anchor_t *anchor_for(const std::string &file, qn_uint32_t requested_size = 65536);

// start_trace and stop_trace with the anchor set lock held.
qn_int32_t start(trace_anchor_t *anchor);
void stop(trace_anchor_t *anchor);

// An empty ring on the disk, without a start record, as a program leaves it that was stopped at once. Stops tracing for
// good in this process, and leaves the anchor mapped.
trace_anchor_t *start_without_record(const std::string &file, qn_uint32_t requested_size = 65536);

// Writes `count` id records 1, 2, ... to the file.
void write_ids(trace_anchor_t *anchor, qn_uint32_t count);

// The ids of the id records of a file, oldest first.
std::vector<uint32_t> ids_in(const std::string &file);

// Changes bytes of a file that nobody has mapped.
void put_bytes(const std::string &file, size_t offset, const std::string &bytes);
template <class T>
void put(const std::string &file, size_t offset, T value)
{
    put_bytes(file, offset, std::string(reinterpret_cast<const char *>(&value), sizeof value));
}

// Writes the fields of a record header into an image: length, function, sequence number.
void put_record(std::string &image, size_t offset, uint32_t length, uint16_t function, uint32_t sequence);

bool exists(const std::string &file);

// Turns the debug lines on.
void debug_on();
// The texts of the lines so far.
std::vector<std::string> debug_lines();

// The command as this program was invoked, cut to what a header holds.
std::string program_in_header();
std::string base_name_in_header();

// True when another thread can take the mutex.
bool is_free(pthread_mutex_t &mutex);

int open_descriptors();

// A recursive mutex that this thread holds so often that it cannot take it once more: locking fails with EAGAIN.
class exhausted_mutex
{
public:
    explicit exhausted_mutex(pthread_mutex_t &mutex);
    exhausted_mutex(const exhausted_mutex &) = delete;
    exhausted_mutex &operator=(const exhausted_mutex &) = delete;
    ~exhausted_mutex();

private:
    pthread_mutex_t &mutex_;
};

// Runs the body in a thread that is cancelled as soon as it waits in block(), and joined. True when it was cancelled.
class cancelled_thread
{
public:
    // The body calls this, from a hook as a rule: tells that it is there, and waits for the cancellation.
    void block();
    bool run(const std::function<void()> &body);

private:
    pthread_mutex_t mutex_ = PTHREAD_MUTEX_INITIALIZER;
    pthread_cond_t reached_ = PTHREAD_COND_INITIALIZER;
    bool waits_ = false;
    bool ended_ = false;
};

// Runs the body in a forked child that ends with exit() or, without `exit_handlers`, with _exit(); true when the body
// returned true and the child ended by itself.
bool in_child(const std::function<bool()> &body, bool exit_handlers = false);
} // namespace qn::test
