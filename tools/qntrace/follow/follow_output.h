// What following a trace prints: the selected records to standard output, what is missing to standard error.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <variant>

#include "tools/qntrace/follow/trace_follower.h"
#include "tools/qntrace/format/json.h"
#include "tools/qntrace/format/text.h"
#include "tools/qntrace/select/last.h"
#include "tools/qntrace/select/selection.h"

namespace qn::dump
{

struct follow_output_options {
    bool json = false;
    bool utc = false;
    bool colored = false;
    // Of the records that were there before; nothing: all of them.
    std::optional<std::size_t> last = 0;
    std::shared_ptr<const selection> selected;
};

class follow_output final : public trace_listener
{
public:
    explicit follow_output(const follow_output_options &options);

    void record(const reader::trace_record &record) override;
    void lost(const lost_records &lost) override;
    void found(const reader::finding &finding) override;
    void entered(const std::string &path, const reader::file_header &header) override;
    void tell(const std::string &path, const std::string &what) override;
    void tell_loss(const std::string &path, const std::string &what) override;

    // What comes from here on is new.
    void caught_up();
    int status() const { return status_; }

private:
    void print_header();
    void print(const reader::trace_record &record);
    std::string time_text(const std::optional<timespec> &time);

    follow_output_options options_;
    std::variant<text_dump, json_dump> format_;
    timestamps timestamps_;
    std::string path_;
    std::optional<reader::file_header> header_;
    bool header_due_ = false;
    bool any_header_ = false;
    std::optional<last_records> before_; // while the records that were there before are read
    std::string line_;
    int status_ = 0;
};

} // namespace qn::dump
