// The calling thread's error record. No lock: a thread touches only its own.
//
// The record hangs on a thread variable that needs no destructor, so that it can be used at any time: by
// destructors of other thread variables, by exit handlers, after main. A thread-specific key, set while a
// thread has a record, has the record released when the thread ends, cancelled or not; a record that is set
// later still in the end of a thread arms the key again, which the system honours PTHREAD_DESTRUCTOR_ITERATIONS
// times.
#include <cerrno>
#include <cstdlib>
#include <exception>
#include <pthread.h>
#include <utility>

#include <qn_cu.h>

#include "platform/cu/conversions.h"
#include "platform/cu/error_copy.h"
#include "platform/cu/inserts.h"

namespace qn::cu
{
namespace
{
struct thread_error {
    cu_error_t plain;   // the id and the message's numbers, all there is when memory is exhausted
    cu_error_t *record; // the whole record; null when plain says everything
    bool armed;         // this thread's value of the key is set
};

// Initial-exec: a thread has the place for it from its start. Otherwise, where the library came by dlopen(), the first
// use in a thread would allocate it, and the system ends a process that has no memory for that.
constinit thread_local thread_error thread_record __attribute__((tls_model("initial-exec"))){};

// Called by the system at the end of a thread.
void release_thread_record(void *ending)
{
    auto *mine = static_cast<thread_error *>(ending);
    mine->armed = false;
    mine->plain = {};
    std::free(std::exchange(mine->record, nullptr));
}

struct thread_end_key {
    pthread_key_t key{};
    bool usable = pthread_key_create(&key, release_thread_record) == 0;
};

// Without a key, or without memory for its value, the last record of a thread is lost memory and nothing worse.
void arm_thread_end()
{
    static const thread_end_key end;
    if (end.usable) thread_record.armed = pthread_setspecific(end.key, &thread_record) == 0;
}

void replace_record(const cu_error_t &plain, cu_error_t *record)
{
    thread_record.plain = plain;
    std::free(std::exchange(thread_record.record, record));
    if (record != nullptr && !thread_record.armed) arm_thread_end();
}

// The record with its strings and inserts; null when there is no memory for it.
cu_error_t *whole_record(const cu_error_t &plain, const char *ffdc_id, const char *msg_cat, const char *msg_default,
                         va_list arguments)
{
    try {
        insert_list inserts;
        if (msg_default != nullptr) read_inserts(find_conversions(msg_default).inserts, arguments, inserts);
        cu_error_t error = plain;
        error.cu_ffdc_id = const_cast<char *>(ffdc_id); // only copied from
        error.cu_msg_cat = const_cast<char *>(msg_cat);
        error.cu_msg_default = const_cast<char *>(msg_default);
        error.cu_arg_cnt = static_cast<unsigned>(inserts.args.size());
        error.cu_args = inserts.args.data();
        return copy_error(error);
    } catch (const std::exception &) {
        return nullptr;
    }
}
} // namespace
} // namespace qn::cu

int cu_set_error_1(int error_id, const char *ffdc_id, const char *msg_cat, int msg_set, int msg_num,
                   const char *msg_default, ...)
{
    cu_error_t plain{};
    plain.cu_error_id = error_id;
    plain.cu_msg_set = msg_set;
    plain.cu_msg_num = msg_num;
    va_list arguments;
    va_start(arguments, msg_default);
    cu_error_t *record = qn::cu::whole_record(plain, ffdc_id, msg_cat, msg_default, arguments);
    va_end(arguments);
    qn::cu::replace_record(plain, record);
    return error_id;
}

int cu_set_no_error_1(void)
{
    qn::cu::replace_record({}, nullptr);
    return 0;
}

int cu_get_error_1(cu_error_t **error)
{
    if (error == nullptr) return EINVAL;
    const auto &mine = qn::cu::thread_record;
    *error = qn::cu::copy_error(mine.record != nullptr ? *mine.record : mine.plain);
    return *error != nullptr ? 0 : ENOMEM;
}

void cu_rel_error_1(cu_error_t *error) { std::free(error); }
