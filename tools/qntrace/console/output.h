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

} // namespace qn::dump
