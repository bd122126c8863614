// A program with one component and one default trace file, as most tests of the recording start.
#pragma once

#include <string>
#include <string_view>

#include <qn_tr.h>

#include "support/last_error.h"
#include "support/scratch.h"
#include "support/trace_image.h"

namespace qn::test
{
class one_trace
{
public:
    static constexpr uint32_t usual_bytes = 65536;

    // Starts the trace. Its ring then holds one start record of 52 bytes, at offset 200, sequence number 2.
    explicit one_trace(uint32_t file_bytes = usual_bytes);

    const std::string &file() const { return file_; }
    const scratch &folder() const { return folder_; }
    trace_image image() const { return trace_image::of_file(file_); }

    // The records that were written since the start record.
    std::vector<record_image> written() const;
    // The same, when there is to be just one.
    record_image only_record() const;

private:
    scratch folder_;
    std::string file_;
    client component_{"TEST"};
};

// Another trace file beside the default one, started: what a client has a token of.
tr_file_token_t start_another(const std::string &file, uint32_t file_bytes = one_trace::usual_bytes);

// Another process that reads the file, through a mapping of its own.
class tail_reader
{
public:
    explicit tail_reader(const std::string &file);
    tail_reader(const tail_reader &) = delete;
    tail_reader &operator=(const tail_reader &) = delete;
    ~tail_reader();

    // Header words, by their offsets in the file.
    static constexpr size_t flags = 4;
    static constexpr size_t seq_lock = 12;
    static constexpr size_t tail_request = 16;
    static constexpr size_t oldest_offset = 44;

    uint32_t u32(size_t at) const;
    uint16_t u16(size_t at) const;
    void set_u32(size_t at, uint32_t value);
    // The whole file, as it changes.
    std::string_view bytes() const { return {map_, size_}; }

private:
    char *map_ = nullptr;
    size_t size_ = 0;
};

// Brings a recursive mutex to the point where nobody can lock it once more: EAGAIN.
class unlockable
{
public:
    explicit unlockable(pthread_mutex_t &mutex);
    unlockable(const unlockable &) = delete;
    unlockable &operator=(const unlockable &) = delete;
    ~unlockable();

private:
    pthread_mutex_t &mutex_;
};

// Whether a thread that is not this one can lock it at once.
bool is_free(pthread_mutex_t &mutex);
} // namespace qn::test
