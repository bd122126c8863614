#include "tools/qntrace/follow/trace_follower.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <limits>
#include <utility>
#include <vector>

#include <fmt/format.h>

#include "tools/qntrace/traces/trace_set.h"
#include "trace/files/format.h"

namespace qn::dump
{
namespace
{

namespace format = qn::tr::format;
using namespace std::chrono_literals;

// How often it is looked for pages and for files that have taken another's place, while nothing happens.
constexpr auto scan_interval = 100ms;

void ignore(const reader::finding &) {}

std::optional<reader::file_header> header_of(followed_file &file)
{
    reader::window window(file, 4096);
    return reader::read_header(window, ignore);
}

// A file that a program has just made, and that it has not written to yet.
bool is_being_made(followed_file &file)
{
    std::array<std::byte, 1> first = {};
    return file.read_at(0, first) == 0 || first[0] == std::byte{0};
}

} // namespace

struct trace_follower::member {
    std::string path;
    std::uint32_t page = 0; // 0: the file of the trace's own name
    std::unique_ptr<followed_file> file;
    std::unique_ptr<writer_hold> hold;
    std::optional<reader::file_header> header; // as the last scan has found it
    std::unique_ptr<ring_follower> ring;       // of the life that was read last
    bool new_life = false;                     // the ring has begun a life that was not entered yet
    bool seen_empty = false;                   // so that its next life begins with the first record
    bool there_at_start = false;               // with records that were not begun to be read yet
    bool gone_told = false;
    bool cut_told = false;
};

trace_follower::trace_follower(std::string name, bool coordinate, trace_listener &to)
    : name_(std::move(name)), coordinate_(coordinate), to_(to)
{
}

trace_follower::~trace_follower() = default;

bool trace_follower::caught_up() const
{
    return started_ && (current_ == nullptr || current_->ring->caught_up()) &&
           std::none_of(members_.begin(), members_.end(), [](const auto &file) { return file.second->there_at_start; });
}

bool trace_follower::is_being_written() const
{
    if (current_ != nullptr) {
        if (current_->file->is_mapped_by(current_->ring->seen().pid)) return true;
        const auto started_by = current_->ring->started_by();
        if (started_by && current_->file->is_mapped_by(*started_by)) return true;
    }
    return std::any_of(members_.begin(), members_.end(), [](const auto &file) {
        return file.second->header && file.second->file->is_mapped_by(file.second->header->pid);
    });
}

bool trace_follower::advance()
{
    entered_ = false;
    if (current_ != nullptr && step()) return true;
    const auto now = std::chrono::steady_clock::now();
    const bool due = current_ == nullptr || current_->new_life || current_->ring->finished() || now >= next_scan_;
    if (!due) return false;
    next_scan_ = now + scan_interval;
    scan();
    const auto next = next_life();
    if (next.file == nullptr) {
        for (const auto &[path, file] : members_) file->there_at_start = false;
        return false;
    }
    if (next.file != current_ || next.unread) enter(next);
    return step();
}

// There may be no record to hand out in a file, and some in the next one. Each is entered once, or once more.
bool trace_follower::advance_to_the_end()
{
    for (std::size_t tries = 0;; ++tries) {
        next_scan_ = {};
        if (advance()) return true;
        if (!entered_ || tries > 2 * members_.size()) return false;
    }
}

bool trace_follower::step()
{
    if (current_->new_life) return false;
    const auto done = current_->ring->advance(to_);
    if (done == ring_follower::progress::new_life) current_->new_life = true;
    const auto last = current_->ring->last_seq();
    if (current_->hold != nullptr && last) current_->hold->hold(*last + 2, current_->ring->header().order);
    return done == ring_follower::progress::some;
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
    if (std::exchange(started_, true)) return;
    if (members_.empty()) throw reader::io_error(ENOENT, "cannot be opened");
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
    if (!file->header && !started_ && !is_being_made(*file->file)) throw not_a_trace();
    file->there_at_start = !started_ && has_unread_life(*file);
    file->seen_empty = !file->there_at_start;
    members_.emplace(path, std::move(file));
}

// Looks whether the name still stands for the file, and what is in it.
void trace_follower::renew(member &file)
{
    const auto there = file.file->is_at(file.path);
    if (!there) {
        if (!file.gone_told) to_.tell(file.path, "was removed; waiting for a new one");
        file.gone_told = true;
    } else if (!*there) {
        if (&file == current_) leave();
        to_.tell(file.path, "was replaced by a new file");
        const std::string path = file.path;
        const std::uint32_t page = file.page;
        members_.erase(path);
        open(path, page);
        return;
    }
    file.header = header_of(*file.file);
    const bool cut = file.header && file.file->size() < file.header->file_size;
    if (cut && !file.cut_told) to_.tell_loss(file.path, fmt::format("was cut to {} bytes", file.file->size()));
    file.cut_told = cut;
}

// A life that holds records, and of which none was handed out.
bool trace_follower::has_unread_life(const member &file) const
{
    const auto now = file.header ? look_at_ring(*file.file, *file.header) : std::nullopt;
    if (!now || now->is_empty()) return false;
    return file.ring == nullptr || file.new_life || (file.page != 0 && !same_lap(file.ring->seen().first, now->first));
}

// Records in the life that was read before, which nobody wrote to when it was left.
bool trace_follower::has_news(const member &file) const
{
    if (&file == current_ || file.ring == nullptr || !file.header) return false;
    const auto now = look_at_ring(*file.file, *file.header);
    return now && (now->oldest != file.ring->seen().oldest || !same_lap(file.ring->seen().first, now->first));
}

// When the first record of the file was written. One that is being written now comes behind all others.
trace_follower::moment trace_follower::beginning_of(const member &file)
{
    const auto first = record_header_at(*file.file, *file.header, file.header->ring.begin);
    if (!first || is_unfinished(*first)) return {std::numeric_limits<std::time_t>::max(), 0};
    const auto time = reader::current_time_base(file.header->time_info).time_of(first->counter).value_or(timespec{});
    return {time.tv_sec, time.tv_nsec};
}

trace_follower::life trace_follower::next_life() const
{
    life next;
    moment earliest;
    for (const auto &[path, file] : members_) {
        if (!has_unread_life(*file)) continue;
        const auto began = beginning_of(*file);
        if (next.file != nullptr && began >= earliest) continue;
        next = {file.get(), true};
        earliest = began;
    }
    if (next.file != nullptr) return next;
    for (const auto &[path, file] : members_)
        if (has_news(*file)) return {file.get(), false};
    return {};
}

void trace_follower::enter(const life &next)
{
    member &file = *next.file;
    member *before = current_;
    if (before != nullptr) leave();
    entered_ = true;
    if (next.unread) {
        if (before != nullptr) tell_pages_lost(*before, file);
        if (file.page == 0 && file.new_life) to_.tell(file.path, "was started anew");
        file.ring = std::make_unique<ring_follower>(*file.file, *file.header, file.seen_empty);
        file.new_life = false;
        file.seen_empty = true; // from now on no life begins unseen
        file.there_at_start = false;
    }
    current_ = &file;
    to_.entered(file.path, file.ring->header());
}

// Hands out what is left, of a file that is not written any more, or that somebody goes on writing without its name.
void trace_follower::leave()
{
    const auto &ring = current_->ring->header().ring;
    for (auto most = (ring.end - ring.begin) / format::record_header_bytes; most != 0 && step(); --most) {
    }
    current_->ring->finish(to_);
    current_ = nullptr;
}

// Pages are written in the order of their numbers, but for those that are being copied just then. So the next life is the
// first unread one in that order, unless pages were overwritten.
void trace_follower::tell_pages_lost(const member &before, const member &next)
{
    if (before.page == 0 || next.page == 0) return;
    if (before.new_life && !before.ring->finished()) {
        to_.tell_loss(before.path, "the page was overwritten before it was read to its end");
        return;
    }
    std::vector<const member *> pages;
    for (const auto &[path, file] : members_)
        if (file->page != 0) pages.push_back(file.get());
    std::sort(pages.begin(), pages.end(), [](const auto *left, const auto *right) { return left->page < right->page; });
    const auto here = std::find(pages.begin(), pages.end(), &before);
    std::rotate(pages.begin(), here + 1, pages.end());
    const auto behind = std::find(pages.begin(), pages.end(), &next);
    const auto overwritten =
        std::count_if(pages.begin(), behind, [this](const member *page) { return has_unread_life(*page); });
    if (overwritten == 0) return;
    to_.tell_loss(next.path,
                  fmt::format("at least {} {} overwritten before {} read", overwritten,
                              overwritten == 1 ? "page was" : "pages were", overwritten == 1 ? "it was" : "they were"));
}

void trace_follower::finish()
{
    if (current_ != nullptr) current_->ring->finish(to_);
    for (const auto &[path, file] : members_)
        if (file->ring == nullptr && file->header && !look_at_ring(*file->file, *file->header))
            to_.tell_loss(path, "cannot be followed: the oldest record, or the first one in the file, makes no sense");
}

} // namespace qn::dump
