#include "tools/qntrace/follow/trace_follower.h"

#include <algorithm>
#include <cerrno>
#include <utility>
#include <vector>

#include <fmt/format.h>

#include "tools/qntrace/traces/trace_set.h"

namespace qn::dump
{
namespace
{

using namespace std::chrono_literals;

// How often it is looked for pages and for files that have taken another's place, while nothing happens.
constexpr auto scan_interval = 100ms;

void ignore(const reader::finding &) {}

std::optional<reader::file_header> header_of(followed_file &file)
{
    reader::window window(file, 4096);
    return reader::read_header(window, ignore);
}

} // namespace

struct trace_follower::member {
    std::string path;
    std::uint32_t page = 0; // 0: the file of the trace's own name
    std::unique_ptr<followed_file> file;
    std::optional<reader::file_header> header; // as it was found when the file was opened
    std::unique_ptr<ring_follower> ring;       // of the life that was read last
    std::unique_ptr<writer_hold> hold;
    bool new_life = false;  // the ring has begun a life that was not entered yet
    bool was_empty = false; // when it was looked at first
    bool gone_told = false;
    bool cut_told = false;
    std::optional<timespec> life_began;
};

trace_follower::trace_follower(std::string name, bool coordinate, trace_listener &to)
    : name_(std::move(name)), coordinate_(coordinate), to_(to)
{
}

trace_follower::~trace_follower() = default;

bool trace_follower::caught_up() const
{
    return started_ && to_catch_up_ == 0 && (current_ == nullptr || current_->ring->caught_up());
}

bool trace_follower::is_being_written() const
{
    return current_ != nullptr && current_->file->is_mapped_by(current_->ring->seen().pid);
}

bool trace_follower::advance()
{
    if (current_ != nullptr && step()) return true;
    const auto now = std::chrono::steady_clock::now();
    const bool due = current_ == nullptr || current_->new_life || current_->ring->finished() || now >= next_scan_;
    if (!due) return false;
    next_scan_ = now + scan_interval;
    scan();
    member *next = next_member();
    if (next == nullptr) return false;
    if (next != current_ || next->new_life) enter(*next);
    return step();
}

bool trace_follower::step()
{
    if (current_->new_life) return false;
    const auto done = current_->ring->advance(to_);
    if (done == ring_follower::progress::new_life) current_->new_life = true;
    keep_writers_waiting();
    return done == ring_follower::progress::some;
}

void trace_follower::keep_writers_waiting()
{
    const auto last = current_->ring->last_seq();
    if (current_->hold != nullptr && last) current_->hold->hold(*last + 2, current_->ring->header().order);
}

void trace_follower::scan()
{
    std::map<std::string, std::uint32_t> paths;
    paths.emplace(name_, 0);
    for (const auto &[number, path] : pages_of(name_)) paths.emplace(path, number);
    for (const auto &[path, page] : paths) {
        const auto known = members_.find(path);
        if (known == members_.end())
            open(path, page);
        else
            renew(*known->second);
    }
    if (!started_) {
        for (const auto &[path, file] : members_) to_catch_up_ += has_unread_life(*file) ? 1 : 0;
        started_ = true;
    }
    if (members_.empty() && !waiting_told_) {
        waiting_told_ = true;
        to_.tell(name_, "there is no such trace; waiting for it");
    }
}

void trace_follower::open(const std::string &path, std::uint32_t page)
{
    auto file = std::make_unique<member>();
    file->path = path;
    file->page = page;
    try {
        file->file = std::make_unique<followed_file>(path);
        if (coordinate_ && page == 0) file->hold = std::make_unique<writer_hold>(path);
    } catch (const reader::io_error &error) {
        if (error.code().value() == ENOENT) return;
        throw;
    }
    file->header = header_of(*file->file);
    file->was_empty = started_ || !file->header || !has_unread_life(*file);
    if (!file->header && !started_) to_.tell(path, "is no trace file; waiting until it is one");
    members_.emplace(path, std::move(file));
}

// Looks whether the name still stands for the file, and whether the file is a trace file by now.
void trace_follower::renew(member &file)
{
    const auto there = file.file->is_at(file.path);
    if (!there) {
        if (!file.gone_told) to_.tell(file.path, "was removed; waiting for a new one");
        file.gone_told = true;
    } else if (!*there) {
        to_.tell(file.path, "was replaced by a new file");
        if (&file == current_) {
            file.ring->finish(to_);
            current_ = nullptr;
        }
        const std::string path = file.path;
        const std::uint32_t page = file.page;
        members_.erase(path);
        open(path, page);
        return;
    }
    if (!file.header) file.header = header_of(*file.file);
    if (!file.header) return;
    const bool cut = file.file->size() < file.header->ring.end;
    if (cut && !file.cut_told) to_.tell_loss(file.path, fmt::format("was cut to {} bytes", file.file->size()));
    file.cut_told = cut;
}

// A life that holds records, and of which none was handed out.
bool trace_follower::has_unread_life(member &file) const
{
    if (!file.header) return false;
    const auto now = look_at_ring(*file.file, *file.header);
    if (!now || (is_free(now->first) && !reader::is_numbered(now->first))) return false;
    const reader::current_time_base base(now->time_info);
    file.life_began = base.time_of(now->first.counter);
    return file.ring == nullptr || file.new_life || (file.page != 0 && !same_lap(file.ring->seen().first, now->first));
}

// Records in the life that was read before, which nobody wrote to when it was left.
bool trace_follower::has_news(member &file) const
{
    if (&file == current_ || file.ring == nullptr || !file.header) return false;
    const auto now = look_at_ring(*file.file, *file.header);
    return now && (now->oldest != file.ring->seen().oldest || !same_lap(file.ring->seen().first, now->first));
}

trace_follower::member *trace_follower::next_member()
{
    member *first = nullptr;
    for (const auto &[path, file] : members_) {
        if (!has_unread_life(*file)) continue;
        const auto time = [](const member &of) {
            const timespec began = of.life_began.value_or(timespec{});
            return std::pair(began.tv_sec, began.tv_nsec);
        };
        if (first == nullptr || time(*file) < time(*first)) first = file.get();
    }
    if (first != nullptr) return first;
    for (const auto &[path, file] : members_)
        if (has_news(*file)) return file.get();
    return nullptr;
}

void trace_follower::enter(member &file)
{
    const bool unread_life = has_unread_life(file);
    if (current_ != nullptr && current_->ring != nullptr) {
        current_->ring->finish(to_);
        if (unread_life) tell_pages_lost(file);
    }
    if (unread_life) {
        const auto header = header_of(*file.file);
        if (!header) return;
        if (file.page == 0 && file.new_life) to_.tell(file.path, "was started anew");
        file.header = header;
        file.ring = std::make_unique<ring_follower>(*file.file, *header, file.was_empty || file.new_life);
        file.new_life = false;
        file.was_empty = true; // from now on no life begins unseen
        if (to_catch_up_ != 0) --to_catch_up_;
    }
    current_ = &file;
    to_.entered(file.path, file.ring->header());
}

// Pages are written in the order of their numbers, but for those that are being copied just then. So the next life is the
// first unread one in that order, unless pages were overwritten.
void trace_follower::tell_pages_lost(const member &next)
{
    if (current_->page == 0 || next.page == 0) return;
    if (current_->new_life && !current_->ring->finished()) {
        to_.tell_loss(current_->path, "the page was overwritten before it was read to its end");
        return;
    }
    std::vector<member *> pages;
    for (const auto &[path, file] : members_)
        if (file->page != 0) pages.push_back(file.get());
    std::sort(pages.begin(), pages.end(), [](const auto *left, const auto *right) { return left->page < right->page; });
    const auto here = std::find(pages.begin(), pages.end(), current_);
    std::rotate(pages.begin(), here + 1, pages.end());
    std::size_t overwritten = 0;
    for (member *page : pages) {
        if (page == &next) break;
        overwritten += has_unread_life(*page) ? 1 : 0;
    }
    if (overwritten == 0) return;
    to_.tell_loss(next.path,
                  fmt::format("at least {} {} overwritten before {} read", overwritten,
                              overwritten == 1 ? "page was" : "pages were", overwritten == 1 ? "it was" : "they were"));
}

void trace_follower::finish()
{
    if (current_ != nullptr) current_->ring->finish(to_);
}

} // namespace qn::dump
