// The two streams of the command: data to standard output, everything else to standard error.
#pragma once

#include <stdexcept>
#include <string>
#include <string_view>

namespace qn::dump
{

// Standard output cannot be written (a full disk, a closed descriptor).
class output_error : public std::runtime_error
{
public:
    using std::runtime_error::runtime_error;
};

// Exit statuses, in the order in which the worse one wins over several files.
enum exit_status : int {
    status_sound = 0,
    status_damaged = 1,
    status_usage = 2,
    status_io_error = 3,
};

// Writes to standard output, in large pieces. Throws output_error.
void write_data(std::string_view data);
void flush_data();

// Writes "qntrace: MESSAGE" to standard error, behind the data written so far. The message is printed as it is.
void write_message(std::string_view message);

// Writes to standard error. Whether that can be written is ignored: there is nowhere left to tell it, and the exit
// status is about the files.
void write_error_text(std::string_view text);

// Puts something that can be neither read nor written in the place of those of the descriptors 0, 1 and 2 that are
// closed. Otherwise the next file that is opened would become standard output or standard error.
void occupy_standard_descriptors();

} // namespace qn::dump
