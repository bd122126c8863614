// Existing trace files: whatever bytes one holds, a start takes it over or begins it afresh, and records go on. What is in
// the file when the ring has gone round once is sound, and the last records are the newest in it.
//
// The first byte of an input says what it is: bit 0, that the file names this program and its own size, as a start asks
// before it looks further; bit 1, that it is the first page of a set, and the second one too. The file follows, up to
// its last byte that is not 0.
#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <vector>

#include <unistd.h>

#include "fuzz/fuzz_input.h"
#include "tools/qntrace/check/file_check.h"
#include "trace/trace.h"

namespace
{
using namespace qn;

constexpr qn_uint32_t file_bytes = 4096;
constexpr uint8_t of_this_program = 1;
constexpr uint8_t page_set = 2;

// A folder in memory for the files of one run.
class folder
{
public:
    folder() : path_(std::filesystem::exists("/dev/shm") ? "/dev/shm/qn_tr_fuzz_XXXXXX" : "/tmp/qn_tr_fuzz_XXXXXX")
    {
        fuzz::require(mkdtemp(path_.data()) != nullptr, "a folder for the files", path_);
    }
    folder(const folder &) = delete;
    folder &operator=(const folder &) = delete;
    ~folder()
    {
        std::error_code ignored;
        std::filesystem::remove_all(path_, ignored);
    }
    std::string operator/(const char *name) const { return path_ + "/" + name; }

private:
    std::string path_;
};

void write(const std::string &name, const std::vector<char> &bytes)
{
    std::ofstream(name, std::ios::binary | std::ios::trunc)
        .write(bytes.data(), static_cast<std::streamsize>(bytes.size()));
}

std::vector<char> read(const std::string &name)
{
    std::ifstream file(name, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

// The two traces, a single file and a page set, which are started and stopped for each input.
class traces
{
public:
    traces()
    {
        setenv("QN_TR_SPOOL", "none", 1); // nothing of the machine's configuration
        char name[4096];
        fuzz::require(tr_get_filename_1(name) == 0, "the library", "");
        single = anchor_for(files_ / "single.trc");
        {
            const tr::global_lock global;
            addSpoolCfgElement("/dev/null", "/pages\\.trc", 2, 1, 60, &anchors.pFirstSpoolSpec, &anchors.pLastSpoolSpec,
                               0, file_bytes);
        }
        pages = anchor_for(files_ / "pages.trc");
        start(single);
        header_ = read(single->fileName);
        stop(single);
        start(pages);
        stop(pages);
        fuzz::require(pages->nextPage != nullptr && pages->nextPage->nextPage == pages, "the page set", "");
    }

    // Puts into a file what a start asks for before it looks at the ring.
    void make_own(std::vector<char> &file) const
    {
        const auto copy = [&](size_t at, size_t bytes) { std::copy_n(&header_[at], bytes, &file[at]); };
        copy(offsetof(trace_file_header_t, uActualFileSize), sizeof(trace_file_header_t::uActualFileSize));
        copy(offsetof(trace_file_header_t, program), sizeof(trace_file_header_t::program));
        file[0] = static_cast<char>(file[0] | header_[0]);
        // The record that a reader holds is the reader's word, which a start leaves alone. An odd one is none.
        constexpr size_t seq_lock = offsetof(trace_file_header_t, uSeqLock);
        if (file[seq_lock] % 2 != 0) copy(seq_lock, sizeof(trace_file_header_t::uSeqLock));
    }

    static void start(trace_anchor_t *anchor)
    {
        const tr::anchor_set_lock set(anchor);
        fuzz::require(start_trace(anchor) == 0, "the start", anchor->fileName);
    }
    static void stop(trace_anchor_t *anchor)
    {
        const tr::anchor_set_lock set(anchor);
        stop_trace(anchor, 0);
    }

    trace_anchor_t *single;
    trace_anchor_t *pages;

private:
    static trace_anchor_t *anchor_for(const std::string &name)
    {
        trace_anchor_t *anchor = findOrCreateAnchorForFile(name.c_str(), 1);
        fuzz::require(anchor != nullptr, "an anchor", name);
        anchor->uRequestedFileSize = file_bytes;
        return anchor;
    }

    const folder files_;
    std::vector<char> header_; // of a file of this program
};

bool has_room(trace_anchor_t *anchor)
{
    bool any = false;
    tr::for_each_page(anchor,
                      [&](const trace_anchor_t *page) { any = any || page->uMaxSize >= sizeof(trace_record_id_t); });
    return any;
}

// More records than all pages hold.
qn_uint32_t go_round(trace_anchor_t *anchor)
{
    constexpr qn_uint32_t enough = 3 * file_bytes / sizeof(trace_record_id_t);
    for (qn_uint32_t id = 1; id <= enough; ++id)
        fuzz::require(tr_ms_record_id_1("FUZZ", id, anchor) == 0, "a record", anchor->fileName);
    return enough;
}

void require_sound(const char *name)
{
    reader::file_source source(name);
    const dump::file_check seen = dump::check_file(source);
    fuzz::require(seen.readable && seen.sound(), seen.findings.empty() ? "?" : seen.findings[0].what.text.c_str(),
                  name);
}

// The newest of the records that go_round() wrote.
qn_uint32_t newest_id(const char *name)
{
    reader::file_source source(name);
    reader::trace_reader trace(source, [](const reader::finding &) {});
    qn_uint32_t newest = 0;
    while (const auto record = trace.next())
        if (const auto *id = std::get_if<reader::identifier_body>(&record->body)) newest = std::max(newest, id->id);
    return newest;
}
} // namespace

// A reader that the file claims to have is not waited for.
extern "C" int usleep(useconds_t) { return 0; }

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    static traces all;
    const uint8_t what = size != 0 ? data[0] : uint8_t{0};
    std::vector<char> file(data + (size != 0), data + size);
    file.resize(file_bytes);
    if ((what & of_this_program) != 0) all.make_own(file);

    trace_anchor_t *anchor = (what & page_set) != 0 ? all.pages : all.single;
    tr::for_each_page(anchor, [&](const trace_anchor_t *page) { write(page->fileName, file); });
    traces::start(anchor);
    const bool records = has_room(anchor);
    const qn_uint32_t written = go_round(anchor);
    traces::stop(anchor);
    if (!records) return 0; // a ring that is too small for any record

    qn_uint32_t newest = 0;
    tr::for_each_page(anchor, [&](const trace_anchor_t *page) {
        require_sound(page->fileName);
        newest = std::max(newest, newest_id(page->fileName));
    });
    fuzz::require(newest == written, "the newest record", anchor->fileName);
    return 0;
}
