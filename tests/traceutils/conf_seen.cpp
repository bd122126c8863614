#include "traceutils/conf_seen.h"

#include <iomanip>
#include <sstream>
#include <stdexcept>

#include <sys/mman.h>
#include <unistd.h>

namespace qn::test
{
namespace
{
std::string quoted(const std::string &text)
{
    std::ostringstream out;
    for (const unsigned char c : text)
        if (c >= ' ' && c < 0x7F)
            out << c;
        else
            out << "\\x" << std::hex << std::setw(2) << std::setfill('0') << int{c};
    return '"' + out.str() + '"';
}

// Not the testing framework's way, because the fuzz target has none.
void require(bool holds, const char *what)
{
    if (!holds) throw std::logic_error(what);
}
} // namespace

std::ostream &operator<<(std::ostream &out, const chunk_seen &chunk)
{
    if (chunk.comment) return out << "comment " << quoted(chunk.text);
    out << (chunk.failed ? "failed section " : "section ") << quoted(chunk.name) << " {";
    for (const auto &[key, value] : chunk.pairs) out << ' ' << quoted(key) << '=' << quoted(value);
    return out << " } of " << quoted(chunk.text);
}

std::ostream &operator<<(std::ostream &out, const fault_seen &fault)
{
    return out << "fault in line " << fault.line << " of section " << quoted(fault.section);
}

std::vector<chunk_seen> conf_seen::sections() const
{
    std::vector<chunk_seen> found;
    for (const chunk_seen &chunk : chunks)
        if (!chunk.comment) found.push_back(chunk);
    return found;
}

chunk_seen comment(const std::string &text) { return {.comment = true, .text = text}; }

chunk_seen good(const std::string &name, const pairs &list, const std::string &text)
{
    return {.name = name, .pairs = list, .text = text};
}

chunk_seen failed(const std::string &name, const pairs &list, const std::string &text)
{
    return {.failed = true, .name = name, .pairs = list, .text = text};
}

std::vector<chunk_seen> chunks_of(const trace_raw_config_t &config)
{
    std::vector<chunk_seen> seen;
    for (int i = 0; i < config.num_element; ++i) {
        const trace_chunk_t &chunk = *config.ppChunkLst[i];
        if (chunk.chunk_type == 2) {
            seen.push_back(comment(static_cast<const char *>(chunk.pChunk)));
            continue;
        }
        require(chunk.chunk_type == 1, "a chunk is a comment or a section");
        const auto &section = *static_cast<const trace_raw_section_t *>(chunk.pChunk);
        require(section.bErr_flag == 0 || section.bErr_flag == 1, "a section has failed or not");
        chunk_seen &one = seen.emplace_back();
        one.failed = section.bErr_flag == 1;
        one.name = section.sect_name;
        for (int k = 0; k < section.num_element; ++k)
            one.pairs.emplace_back(section.kv_list[k].key, section.kv_list[k].pValue);
        if (section.pUntokenized_data != nullptr) one.text = section.pUntokenized_data;
    }
    return seen;
}

conf_seen read_conf_of(const std::string &file_name)
{
    conf_seen seen;
    trace_raw_config_t *config = nullptr;
    tr::conf_findings findings;
    seen.status = tr::read_conf_file(file_name.c_str(), &config, &findings);
    require((config != nullptr) == (seen.status == 0), "there is a configuration when the status says so");
    if (config != nullptr) seen.chunks = chunks_of(*config);
    seen.section_lines = findings.section_lines;
    for (const tr::conf_fault &fault : findings.faults) {
        seen.faults.push_back({fault.line, fault.section});
        seen.reasons.push_back(fault.text);
    }
    tr_free_trace_raw_config_1(config);
    return seen;
}

text_file::text_file(const std::string &text) : fd_(memfd_create("trace.conf", MFD_CLOEXEC))
{
    size_t written = 0;
    while (written < text.size()) {
        const ssize_t more = write(fd_, text.data() + written, text.size() - written);
        require(more > 0, "memory for the text");
        written += static_cast<size_t>(more);
    }
}

text_file::~text_file() { close(fd_); }

std::string text_file::name() const { return "/proc/self/fd/" + std::to_string(fd_); }

conf_seen read_conf(const std::string &text) { return read_conf_of(text_file(text).name()); }

conf_of::conf_of(const std::string &text)
{
    const text_file file(text);
    require(tr::read_conf_file(file.name().c_str(), &config_, nullptr) == 0, "the text can be read");
}

conf_of::~conf_of() { tr_free_trace_raw_config_1(config_); }
} // namespace qn::test
