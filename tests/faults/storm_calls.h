// Every exported call, as a thread makes it among others that make any of them at the same time.
#pragma once

#include <functional>
#include <random>
#include <string>
#include <vector>

#include "support/last_error.h"

namespace qn::test
{
// Where a storm's files are.
struct storm_files {
    explicit storm_files(const std::string &folder);

    std::string page_set; // the default trace under this name is a page set that is copied
    std::string single;
    std::string mapped;
    std::string copied;
    std::string copies; // a folder, for pages and files
    std::string configuration;
};

// A thread of the storm: a component of its own, a query of its own, and its own chance.
class storm_thread
{
public:
    storm_thread(const storm_files &files, unsigned number, uint64_t seed);
    storm_thread(const storm_thread &) = delete;
    storm_thread &operator=(const storm_thread &) = delete;
    ~storm_thread();

    const storm_files &files() const { return files_; }
    unsigned any(unsigned below) { return static_cast<unsigned>(random_() % below); }
    tr_file_token_t any_token() { return tokens_[any(static_cast<unsigned>(tokens_.size()))]; }
    std::string any_component() { return component.id.substr(0, 3) + static_cast<char>('0' + any(8)); }
    void keep_tokens();

    client component;
    tr_query_handle_t query = nullptr;

private:
    const storm_files &files_;
    std::mt19937_64 random_;
    std::vector<tr_file_token_t> tokens_{nullptr}; // they stay valid when their component is gone
};

struct storm_call {
    std::vector<std::string> names; // of the exported functions that it calls
    std::function<qn_int32_t(storm_thread &)> make;
    std::vector<qn_int32_t> codes; // what it may return, besides 0
};

// All but tr_term, which is the end.
const std::vector<storm_call> &storm_calls();
void end_tracing();
} // namespace qn::test
