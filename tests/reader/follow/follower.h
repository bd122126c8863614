// The real command while it runs: what it has printed so far, and signals for it.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include <nlohmann/json.hpp>
#include <sys/types.h>

#include "reader/program.h"

namespace qn::test
{

class follower
{
public:
    // Of `qntrace` with these arguments; what it prints goes to a file unless said.
    explicit follower(const std::vector<std::string> &arguments, int out = -1);
    // Of `qntrace follow --json --utc` with these; comes back when it has caught up with what is there.
    static follower of(std::vector<std::string> arguments);
    ~follower(); // ends it when it runs
    follower(follower &&) noexcept;
    follower(const follower &) = delete;
    follower &operator=(const follower &) = delete;

    std::string out() const;
    std::string err() const;
    void wait_for_out(const std::string &text) const;
    void wait_for_err(const std::string &text) const;
    // Until the record of a live_writer with that value is printed.
    void wait_for_value(std::uint64_t value) const;
    void wait_until_open(const std::string &path) const;
    void wait_until_stopped() const;

    void send(int signal) const;
    // Waits for its end.
    outcome ended();
    // The same after SIGINT.
    outcome interrupted();
    // Of the records of live_writers.
    std::vector<std::uint64_t> values() const;

private:
    void wait_until(const std::string &what, const std::function<bool()> &holds) const;
    bool has_ended() const;

    std::unique_ptr<scratch_folder> folder_;
    pid_t child_ = -1;
};

// `first`, `first` + 1, ...
std::vector<std::uint64_t> counted(std::uint64_t first, std::uint64_t count);

} // namespace qn::test
