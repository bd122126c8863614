// A program that traces to one page set, of any number and size of pages, whose pages are copied to a spool directory
// of its own.
#pragma once

#include <cstdint>
#include <string>
#include <thread>
#include <vector>

#include "spooling/soak_pages.h"
#include "support/last_error.h"
#include "support/scratch.h"

namespace qn::test
{
class soak_trace
{
public:
    static constexpr uint32_t usual_page_bytes = 65536;

    // Starts the trace. No configuration governs it but the one specification that is made here. An empty destination
    // stands for the folder `spool` beside the trace.
    explicit soak_trace(uint32_t pages, uint32_t page_bytes = usual_page_bytes, const std::string &destination = {});
    soak_trace(const soak_trace &) = delete;
    soak_trace &operator=(const soak_trace &) = delete;
    ~soak_trace(); // ends all tracing of the process

    const std::string &spool_folder() const { return spool_folder_; }
    std::string live_folder() const { return folder_ / "live"; }
    std::string file() const { return live_folder() + "/soak.trc"; }

    // What was written, when nothing waits in the queue.
    std::vector<page_file> pages() const { return pages_written(live_folder(), spool_folder_); }

private:
    scratch folder_;
    std::string spool_folder_;
    client component_{"SOAK"};
};

// Returns when at most so many pages wait for their copies, and none is being copied. A ring of N pages is never
// overwritten unspooled by writers that each wait for a queue of at most N - 2 pages before each record.
void wait_for_queue(int most);

// Runs body(0) to body(count - 1) in threads of their own and waits for them.
template <class Body>
void in_threads(uint32_t count, Body body)
{
    std::vector<std::thread> running;
    for (uint32_t i = 0; i < count; ++i) running.emplace_back(body, i);
    for (std::thread &thread : running) thread.join();
}
} // namespace qn::test
