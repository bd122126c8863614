// Four threads that write numbered records to the default trace, beside whatever a test does meanwhile, and what must
// be true of the records that are found.
#pragma once

#include <array>
#include <atomic>
#include <cstdint>
#include <optional>
#include <thread>
#include <vector>

#include "spooling/soak_pages.h"

namespace qn::test
{
class live_writers
{
public:
    static constexpr uint32_t count = 4;

    // Where `longest_queue` is given, each writer waits for a queue of at most so many pages before each record.
    explicit live_writers(std::optional<int> longest_queue = std::nullopt);
    live_writers(const live_writers &) = delete;
    live_writers &operator=(const live_writers &) = delete;
    ~live_writers(); // ends them

    // From now on they write at most so many more records, together, until they are let write again.
    void let_write(uint64_t records);
    // Returns when so many more records were written by all of them together, or as many as they may write.
    void wait_for(uint64_t records) const;
    // Ends them; the number of records of each.
    std::array<uint32_t, count> end();

private:
    void write(uint32_t thread);

    std::optional<int> longest_queue_;
    std::atomic<bool> ended_{false};
    std::atomic<uint64_t> most_{UINT64_MAX}; // records of all of them
    std::array<std::atomic<uint32_t>, count> written_{};
    std::vector<std::thread> threads_;
};

// Every record that is found is as it was written; each thread's numbers grow: none is there twice or out of order.
void expect_sound(const std::vector<page_file> &pages);

// The same, and none is missing.
void expect_all(const std::vector<page_file> &pages, const std::array<uint32_t, live_writers::count> &written);

// Has another batch written by the threads, each going on at its number, by writers that wait for a queue of at most
// `longest_queue` pages; and finds all of it in the copies and live pages.
void expect_next_batch(std::array<uint32_t, live_writers::count> written, int longest_queue,
                       const std::string &live_folder, const std::string &spool_folder);
} // namespace qn::test
