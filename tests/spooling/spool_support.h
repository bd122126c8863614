// What the tests of spooling share: lists of specifications, a node of a cluster as its directories name it, the fixed
// paths under /var, and a spool thread that does not run.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "files/support_files.h"
#include "spooling/spool_calls.h"

namespace qn::test
{
// A list of specifications; frees what it holds.
class specifications
{
public:
    specifications() = default;
    specifications(const specifications &) = delete;
    specifications &operator=(const specifications &) = delete;
    ~specifications() { free_spool_spec_linked_list(first); }

    // Appends one that is on, without a twin for the cluster, and gives it.
    trace_spool_spec_t *add(const std::string &pattern, const std::string &dest = "/dev/null", qn_uint32_t pages = 8,
                            qn_int32_t onoff = 1);
    std::vector<const trace_spool_spec_t *> all() const;
    std::vector<std::string> patterns() const;
    // The same from the tail on, by the links back.
    std::vector<std::string> patterns_backwards() const;

    trace_spool_spec_t *first = nullptr;
    trace_spool_spec_t *last = nullptr;
};

// Gives the default anchor the list, as if it had been read. The anchor owns it from here on.
void install(specifications &list);

// This process becomes the program mydaemon on node 0x2a, host h1, of the cluster c1 with the identifier id1. Its spool
// directories end in node_path.
void be_on_a_known_node();
inline const std::string node_path = "c1/id1/h1/000000000000002a/mydaemon";

// The cluster alone: its facts, or a failure to get them.
void be_in_cluster(const char *name, const char *identifier);
int cluster_questions(); // how often somebody asked, since then
void be_in_no_cluster();

// Runs the body with an empty /var of its own; its failures are the test's.
void expect_in_private_var(const std::function<void()> &body);

inline constexpr const char *conf_folder = "/var/qn/cfg";
inline constexpr const char *conf_file = "/var/qn/cfg/trace.conf";

// Writes the configuration file, with a modification time of so many seconds since the epoch.
void write_conf(const std::string &text, long modified = 1'700'000'000);

// One section of a configuration file, with the lines given.
std::string section(const std::string &name, const std::vector<std::string> &lines);

// The creation of the spool thread fails from here on and is counted.
class no_spool_thread
{
public:
    no_spool_thread();
    int attempts() const { return attempts_; }

private:
    int attempts_ = 0;
};

// Behind every file that is mapped from here on comes memory that nobody may touch.
void guard_mappings();

// Names that a regular expression takes as they stand.
std::string literal_pattern(const std::string &name);

// A new thread holds the mutex until it is told, or this object ends.
class held_by_another
{
public:
    explicit held_by_another(pthread_mutex_t &mutex);
    held_by_another(const held_by_another &) = delete;
    held_by_another &operator=(const held_by_another &) = delete;
    ~held_by_another();
    void let_go();

private:
    struct hold;
    hold *hold_;
};

// The names of a folder's entries, sorted.
std::vector<std::string> entries_of(const std::string &folder);

// A line that is exactly that, written with that priority.
bool system_log_has(int priority, const std::string &text);
} // namespace qn::test
