#include "spooling/spool_support.h"

#include <algorithm>
#include <cerrno>
#include <condition_variable>
#include <cstring>
#include <filesystem>
#include <mutex>
#include <thread>

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>

#include <gtest/gtest.h>

#include "support/private_var.h"

namespace
{
int questions = 0;

std::vector<std::string> patterns_of(const std::vector<const trace_spool_spec_t *> &list)
{
    std::vector<std::string> patterns;
    for (const trace_spool_spec_t *spec : list) patterns.emplace_back(spec->pattern);
    return patterns;
}
} // namespace

namespace qn::test
{
trace_spool_spec_t *specifications::add(const std::string &pattern, const std::string &dest, qn_uint32_t pages,
                                        qn_int32_t onoff)
{
    EXPECT_EQ(addSpoolCfgElement(dest.c_str(), pattern.c_str(), pages, onoff, 60, &first, &last, 0, 262144), 0);
    return last;
}

std::vector<const trace_spool_spec_t *> specifications::all() const
{
    std::vector<const trace_spool_spec_t *> list;
    for (const trace_spool_spec_t *spec = first; spec != nullptr; spec = spec->pNext) list.push_back(spec);
    return list;
}

std::vector<std::string> specifications::patterns() const { return patterns_of(all()); }

std::vector<std::string> specifications::patterns_backwards() const
{
    std::vector<const trace_spool_spec_t *> list;
    for (const trace_spool_spec_t *spec = last; spec != nullptr; spec = spec->pPrev) list.push_back(spec);
    return patterns_of(list);
}

void install(specifications &list)
{
    anchors.pFirstSpoolSpec = list.first;
    anchors.pLastSpoolSpec = list.last;
    list.first = list.last = nullptr;
}

void be_in_cluster(const char *name, const char *identifier)
{
    questions = 0;
    calls().cluster_info = [=](cu_cluster_info_t *info) {
        ++questions;
        *info = {};
        std::strcpy(info->cu_cluster_name, name);
        std::strcpy(info->cu_cluster_ID, identifier);
        info->cu_node_number = 3;
        return 0;
    };
}

int cluster_questions() { return questions; }

void be_in_no_cluster()
{
    questions = 0;
    calls().cluster_info = [](cu_cluster_info_t *) {
        ++questions;
        return ENOENT;
    };
}

void be_on_a_known_node()
{
    be_in_cluster("c1", "id1");
    calls().node_id = [](qn_uint64_t *node) {
        *node = 0x2a;
        return 0;
    };
    calls().proc_args = [](pid_t, char *buffer, size_t) {
        std::strcpy(buffer, "/opt/bin/mydaemon");
        return 0;
    };
    spool_calls().host_name = [](char *name, size_t) {
        std::strcpy(name, "h1.example.org");
        return 0;
    };
}

void expect_in_private_var(const std::function<void()> &body)
{
    EXPECT_TRUE(in_private_var([&] {
        body();
        return !testing::Test::HasFailure();
    }));
}

void write_conf(const std::string &text, long modified)
{
    std::filesystem::create_directories(conf_folder);
    write_file(conf_file, text);
    const timespec times[2] = {{modified, 0}, {modified, 0}};
    EXPECT_EQ(utimensat(AT_FDCWD, conf_file, times, 0), 0);
}

std::string section(const std::string &name, const std::vector<std::string> &lines)
{
    std::string text = name + ":\n";
    for (const std::string &line : lines) text += line + "\n";
    return text;
}

no_spool_thread::no_spool_thread()
{
    spool_calls().thread_start = [this](void *(*body)(void *)) {
        if (body != cp_thread) return 0;
        ++attempts_;
        return EAGAIN;
    };
}

void guard_mappings()
{
    calls().mmap = [](size_t size, int protection, int flags, int fd, off_t offset) {
        constexpr size_t guard = 65536;
        void *place = __real_mmap(nullptr, size + guard, PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
        if (place == MAP_FAILED) return place;
        return __real_mmap(place, size, protection, flags | MAP_FIXED, fd, offset);
    };
}

std::string literal_pattern(const std::string &name)
{
    std::string pattern;
    for (const char character : name) {
        if (std::strchr(".[]()*+?{}|^$\\", character) != nullptr) pattern += '\\';
        pattern += character;
    }
    return pattern;
}

struct held_by_another::hold {
    std::mutex guard;
    std::condition_variable changed;
    bool held = false;
    bool wanted = true;
    std::thread thread;
};

held_by_another::held_by_another(pthread_mutex_t &mutex) : hold_(new hold)
{
    hold_->thread = std::thread([this, &mutex] {
        EXPECT_EQ(pthread_mutex_lock(&mutex), 0);
        std::unique_lock lock(hold_->guard);
        hold_->held = true;
        hold_->changed.notify_all();
        hold_->changed.wait(lock, [this] { return !hold_->wanted; });
        pthread_mutex_unlock(&mutex);
    });
    std::unique_lock lock(hold_->guard);
    hold_->changed.wait(lock, [this] { return hold_->held; });
}

held_by_another::~held_by_another()
{
    let_go();
    if (hold_->thread.joinable()) hold_->thread.join();
    delete hold_;
}

void held_by_another::let_go()
{
    const std::lock_guard lock(hold_->guard);
    hold_->wanted = false;
    hold_->changed.notify_all();
}

std::vector<std::string> entries_of(const std::string &folder)
{
    std::vector<std::string> names;
    for (const auto &entry : std::filesystem::directory_iterator(folder)) names.push_back(entry.path().filename());
    std::sort(names.begin(), names.end());
    return names;
}

bool system_log_has(int priority, const std::string &text)
{
    const auto caught = system_log();
    return std::any_of(caught.begin(), caught.end(),
                       [&](const log_line &line) { return line.priority == priority && line.text == text; });
}
} // namespace qn::test
