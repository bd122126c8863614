// What a page set has written, read from its files: the copies, and the live pages that were not copied. Offsets and
// states are the numbers of the file format.
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "recording/numbered_records.h"
#include "support/trace_image.h"

namespace qn::test
{
// One life of a page: what was written into it between two switches.
struct page_file {
    std::string path;
    std::string page; // the name of the page file
    bool is_copy;
    uint64_t first_stamp; // of its first record

    trace_image image() const { return trace_image::of_file(path); }
};

// Header fields of a page.
inline constexpr size_t offset_of_reuse_time = 188;
inline constexpr size_t offset_of_page_state = 192;

// The lives of all pages in the order in which they were written. A live page in the state "ready" (4) was copied, or
// never written, and is left out.
std::vector<page_file> pages_written(const std::string &live_folder, const std::string &spool_folder);

// Every copy below the folder.
std::vector<std::string> copies_in(const std::string &spool_folder);

// How often in a row the page was overwritten unspooled before this life, by the notice at its start; 0 without one.
// Fails the test when the notice is not worded as it must be.
uint32_t overwritten_before(const page_file &page, const trace_image &image);

// The numbers of every author's records, over all pages. Fails the test for a ring that is not sound, or a record that
// is not byte for byte what its author wrote.
std::map<record_author, std::vector<uint32_t>> numbers_in_pages(const std::vector<page_file> &pages);
} // namespace qn::test
