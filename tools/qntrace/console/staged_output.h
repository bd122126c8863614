// Where a command writes, so that what has the name that the user gave is always whole.
//
// The output is made beside its place under another name, NAME.partial-XXXXXX, and gets its own name when it is
// complete. What was begun and given up is removed.
#pragma once

#include <string>

namespace qn::dump
{

enum class output_kind {
    file,
    stream, // a file; a device, FIFO or link that is there already is written to as it is
    folder, // with the file `marker` in it, by which an export knows that it may replace it
};

class staged_output
{
public:
    static constexpr const char *marker = ".qntrace-export";

    // Throws std::invalid_argument when something has the name that may not be replaced, and output_error when the
    // output cannot be made. Folders are replaced when they are empty or made by an export.
    staged_output(std::string path, output_kind kind, bool replace);
    ~staged_output();
    staged_output(const staged_output &) = delete;
    staged_output &operator=(const staged_output &) = delete;

    // Where to write.
    const std::string &path() const { return work_path_; }
    // Gives the output its name. Throws output_error.
    void publish();

private:
    void look_at_what_is_there(bool replace);
    void make();
    void make_durable();
    void replace_folder();
    [[noreturn]] void fail(const char *what, int error) const;

    std::string path_;
    output_kind kind_;
    std::string work_path_;
    bool direct_ = false; // to a device
    bool there_ = false;  // something to be replaced
    bool published_ = false;
};

} // namespace qn::dump
