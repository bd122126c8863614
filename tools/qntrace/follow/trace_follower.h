// A live trace by its name: the file of that name and the pages of its page set, whichever is written at the time,
// across page switches, restarts of the program and files that take each other's place.
//
// Every ring has lives: the records since it was last started empty. A page is read to its end before the next one is
// begun, and the next is the life that began first of those not read yet.
#pragma once

#include <chrono>
#include <ctime>
#include <map>
#include <memory>
#include <stdexcept>
#include <string>
#include <utility>

#include "tools/qntrace/follow/followed_file.h"
#include "tools/qntrace/follow/ring_follower.h"

namespace qn::dump
{

class trace_listener : public ring_listener
{
public:
    // The records that follow are of this file.
    virtual void entered(const std::string &path, const reader::file_header &header) = 0;
    // What becomes of the files.
    virtual void tell(const std::string &path, const std::string &what) = 0;
    // Records are missing, and nobody can say how many.
    virtual void tell_loss(const std::string &path, const std::string &what) = 0;
};

// The file is there, but it is of another kind.
class not_a_trace : public std::runtime_error
{
public:
    not_a_trace() : std::runtime_error("not a trace file: its header makes no sense") {}
};

class trace_follower
{
public:
    // The listener must outlive it. `coordinate`: writers wait for the reading of a single file.
    trace_follower(std::string name, bool coordinate, trace_listener &to);
    ~trace_follower();

    // Hands out what there is, as much as lies together; false when there is nothing at the moment. Throws io_error for
    // a file that cannot be read, or when there is none at first; not_a_trace when it is none at first.
    bool advance();
    // The same when nothing is written any more: false when nothing is left in any of the files.
    bool advance_to_the_end();
    // What there was at the beginning has been handed out.
    bool caught_up() const;
    // Whether the process that writes the trace has it mapped.
    bool is_being_written() const;
    // Tells what is not complete.
    void finish();

private:
    struct member;
    // What is to be read next.
    struct life {
        member *file = nullptr; // null: nothing
        bool unread = false;    // from its beginning; otherwise it was begun already
    };
    using moment = std::pair<std::time_t, long>;

    bool step();
    void scan();
    void open(const std::string &path, std::uint32_t page);
    void renew(member &file);
    bool has_unread_life(const member &file) const;
    bool has_news(const member &file) const;
    static moment beginning_of(const member &file);
    life next_life() const;
    void enter(const life &next);
    void leave();
    void tell_pages_lost(const member &before, const member &next);

    std::string name_;
    bool coordinate_;
    trace_listener &to_;
    std::map<std::string, std::unique_ptr<member>> members_;
    member *current_ = nullptr;
    bool started_ = false; // the first scan is done
    bool entered_ = false; // by the last advance()
    std::chrono::steady_clock::time_point next_scan_;
};

} // namespace qn::dump
