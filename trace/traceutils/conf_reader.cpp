// Reads the configuration file into its raw form, a section at a time: a syntax error costs the section that it is in,
// and the lines behind it up to the next header, but never the file.
//
// No lock: a read has everything to itself, except the thread's error record.
#include <array>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>
#include <strings.h>

#include "platform/common/descriptors.h"
#include "trace/files/error_report.h"
#include "trace/files/releases.h"
#include "trace/files/text.h"
#include "trace/traceutils/c_locale.h"
#include "trace/traceutils/conf_line.h"
#include "trace/traceutils/raw_config.h"
#include "trace/traceutils/traceutils.h"

namespace qn::tr
{
namespace
{
using file_ptr = std::unique_ptr<FILE, releases<std::fclose>>;
using text_ptr = std::unique_ptr<char, releases<std::free>>;
using section_ptr = std::unique_ptr<trace_raw_section_t, releases<free_raw_section>>;
using config_ptr = std::unique_ptr<trace_raw_config_t, releases<tr_free_trace_raw_config_1>>;

// The keys of a kind of section; bit i of a set of keys stands for key i, and the required ones come first.
struct section_keys {
    const char *kind;
    std::array<const char *, 7> names;
    unsigned count;
    unsigned required;

    unsigned bit_of(std::string_view key) const // 0 when it is none of them
    {
        for (unsigned i = 0; i < count; ++i)
            if (key.size() == std::strlen(names[i]) && strncasecmp(key.data(), names[i], key.size()) == 0)
                return 1U << i;
        return 0;
    }
    bool has_required(unsigned seen) const { return (~seen & ((1U << required) - 1)) == 0; }
    bool has_all(unsigned seen) const { return seen == (1U << count) - 1; }
};

constexpr section_keys trace_keys = {
    "trace section", {"pat", "spooling", "pages", "dest", "size", "tracesize", "sync_interval"}, 7, 1};
constexpr section_keys spool_keys = {"spool section",
                                     {"spool_dir", "cleanup", "spool_cleanup_interval", "spool_retention_days",
                                      "spool_directory_max_size", "spool_startup_interval"},
                                     6,
                                     2};
constexpr section_keys default_keys = {"default section", {"spooling", "tracesize", "dest"}, 3, 0};

const section_keys &keys_of(section_type type)
{
    if (type == section_type::standard) return default_keys;
    return type == section_type::spool ? spool_keys : trace_keys;
}

class conf_parser
{
public:
    conf_parser(trace_raw_config_t *config, conf_findings *findings) : config_(config), findings_(findings) {}
    qn_int32_t take(const conf_line &line, unsigned number); // 0 or 14
    qn_int32_t finish();                                     // 0 or 14

private:
    qn_int32_t take_comment(const conf_line &line);
    qn_int32_t take_header(const conf_line &line);
    qn_int32_t take_pair(const conf_line &line);
    bool ends_section(const conf_line &line) const;
    qn_int32_t new_section();
    qn_int32_t close_section();
    void mark_error(const conf_line &line);
    std::string reason(const conf_line &line) const;
    std::string missing_keys() const;

    trace_raw_config_t *config_;
    conf_findings *findings_;            // may be null
    const section_keys *keys_ = nullptr; // null where a header is expected
    unsigned seen_ = 0;                  // which of the keys
    bool failed_ = false;                // the current section has
    section_ptr open_;                   // the current section until it becomes a chunk
    trace_raw_section_t *current_ = nullptr;
    raw_text_room text_;        // of the current section
    unsigned number_ = 0;       // of the line
    unsigned first_number_ = 0; // of the current section's first line
};

qn_int32_t conf_parser::take(const conf_line &line, unsigned number)
{
    number_ = number;
    if (line.type == conf_line_type::comment) return take_comment(line);
    qn_int32_t status = 0;
    if (keys_ != nullptr && ends_section(line)) status = close_section(); // and then the line is met where none is open
    if (status == 0) status = keys_ == nullptr ? take_header(line) : take_pair(line);
    if (status == 0 && keys_ != nullptr && keys_->has_all(seen_)) status = close_section();
    return status != 0 ? status : append_raw_text(current_, text_, line.text);
}

qn_int32_t conf_parser::take_comment(const conf_line &line)
{
    if (keys_ != nullptr) return 0;
    text_ptr copy(strdup(line.text));
    if (copy == nullptr) return set_error(QN_TR_ENOMEM, 14);
    const qn_int32_t status = addRawElement(config_, comment_chunk, copy.get());
    if (status == 0) (void)copy.release();
    return status;
}

// A section that is complete ends at the first line that is none of its own, the default section only at one that is no
// pair at all.
bool conf_parser::ends_section(const conf_line &line) const
{
    if (!keys_->has_required(seen_)) return false;
    if (line.type != conf_line_type::pair) return true;
    return keys_ != &default_keys && keys_->bit_of(line.key) == 0;
}

qn_int32_t conf_parser::take_header(const conf_line &line)
{
    qn_int32_t status = failed_ ? 0 : new_section();
    if (status != 0) return status;
    if (line.type != conf_line_type::header) {
        mark_error(line);
        return 0;
    }
    if (failed_) {
        status = close_section();
        if (status == 0) status = new_section();
        if (status != 0) return status;
    }
    failed_ = false;
    seen_ = 0;
    copy_cut(current_->sect_name, line.name);
    keys_ = &keys_of(type_of_section(current_->sect_name));
    return 0;
}

qn_int32_t conf_parser::take_pair(const conf_line &line)
{
    const unsigned bit = line.type == conf_line_type::pair ? keys_->bit_of(line.key) : 0;
    if (bit == 0 || (seen_ & bit) != 0) {
        mark_error(line);
        return 0;
    }
    seen_ |= bit;
    // No line is longer than these.
    char key[sizeof key_value_t::key];
    char value[sizeof key_value_t::key];
    copy_cut(key, line.key);
    copy_cut(value, line.value);
    return addKeyValue(current_, key, value);
}

qn_int32_t conf_parser::new_section()
{
    open_.reset(static_cast<trace_raw_section_t *>(std::calloc(1, sizeof(trace_raw_section_t))));
    if (open_ == nullptr) return set_error(QN_TR_ENOMEM, 14);
    current_ = open_.get();
    text_ = {};
    first_number_ = number_;
    return 0;
}

// The section becomes a chunk. It stays the current one: the line that completed it goes to its text.
qn_int32_t conf_parser::close_section()
{
    const qn_int32_t status = addRawElement(config_, section_chunk, open_.get());
    if (status != 0) return status;
    (void)open_.release();
    keys_ = nullptr;
    if (findings_ != nullptr) findings_->section_lines.push_back(first_number_);
    return 0;
}

// Whatever follows is faulty as well, and only the first fault is told.
void conf_parser::mark_error(const conf_line &line)
{
    if (findings_ != nullptr && !failed_) findings_->faults.push_back({number_, current_->sect_name, reason(line)});
    current_->bErr_flag = 1;
    failed_ = true;
    keys_ = nullptr;
}

std::string conf_parser::reason(const conf_line &line) const
{
    if (keys_ == nullptr) return "a section header (NAME:) is expected here";
    if (line.type == conf_line_type::header)
        return missing_keys() + " missing where the next header comes, which therefore opens no section";
    if (line.type != conf_line_type::pair) return "not of the form KEY = VALUE";
    const std::string key(line.key);
    if (keys_->bit_of(key) == 0) return std::string("a ") + keys_->kind + " has no key \"" + key + '"';
    return "a second \"" + key + '"';
}

std::string conf_parser::missing_keys() const
{
    std::string list;
    for (unsigned i = 0; i < keys_->required; ++i)
        if ((seen_ & 1U << i) == 0) list += (list.empty() ? "" : " and ") + ('"' + std::string(keys_->names[i]) + '"');
    return list + (list.find(" and ") == std::string::npos ? " is" : " are");
}

// What has failed or was not completed is dropped.
qn_int32_t conf_parser::finish()
{
    if (open_ == nullptr || keys_ == nullptr) return 0;
    if (keys_->has_required(seen_)) return close_section();
    if (findings_ != nullptr)
        findings_->faults.push_back(
            {first_number_, open_->sect_name, missing_keys() + " missing at the end of the file"});
    return 0;
}
} // namespace

qn_int32_t read_conf_file(const char *file_name, trace_raw_config_t **config, conf_findings *findings)
{
    const file_ptr file(platform::open_text(file_name));
    if (file == nullptr) return QN_TR_ECONFOPEN;
    const c_locale bytes_are_characters;
    const conf_patterns patterns;
    qn_int32_t status = patterns.status();
    if (status != 0) return status;
    config_ptr result(static_cast<trace_raw_config_t *>(std::calloc(1, sizeof(trace_raw_config_t))));
    if (result == nullptr) return set_error(QN_TR_ENOMEM, 14);

    conf_parser parser(result.get(), findings);
    conf_lines lines(file.get());
    while (lines.next()) {
        if (*lines.text() == '\0') continue;
        conf_line line;
        status = patterns.classify(lines.text(), line);
        if (status == 0) status = parser.take(line, lines.number());
        if (status != 0) return status;
    }
    // Half of a configuration would switch off whatever the other half asks for.
    if (std::ferror(file.get()) != 0) return QN_TR_ECONFOPEN;
    status = parser.finish();
    if (status == 0) *config = result.release();
    return status;
}
} // namespace qn::tr

qn_int32_t tr_read_conf_file_1(trace_raw_config_t **pTraceRawConfig)
{
    return qn::tr::read_conf_file(qn::tr::configuration_file_name, pTraceRawConfig, nullptr);
}
