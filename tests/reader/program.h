// Runs the real command, or another program, and catches what it does.
#pragma once

#include <cstddef>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace qn::test
{

struct outcome {
    int status = -1; // exit status, or -1 when a signal ended it
    int signal = 0;
    std::string out;
    std::string err;
};

struct surroundings {
    std::vector<std::string> environment = {"LC_ALL=C", "TZ=UTC"};
    bool as_nobody = false;      // gives up root's rights, if the test has them
    bool ignore_sigpipe = false; // as a careless parent leaves it
    std::string out_file;        // instead of catching standard output
    std::string err_file;        // instead of catching standard error
    bool nobody_reads = false;   // standard output is a pipe without a reader
    std::vector<int> closed;     // descriptors that are not open when the program starts
};

outcome run_program(const std::string &program, const std::vector<std::string> &arguments,
                    const surroundings &around = {});
outcome run_qntrace(const std::vector<std::string> &arguments, const surroundings &around = {});

// A folder of its own that goes with it.
class scratch_folder
{
public:
    scratch_folder();
    ~scratch_folder();
    scratch_folder(const scratch_folder &) = delete;
    scratch_folder &operator=(const scratch_folder &) = delete;

    std::string path(std::string_view name) const { return path_ + "/" + std::string(name); }
    // Writes a file and gives its path.
    std::string file(std::string_view name, std::span<const std::byte> bytes) const;

private:
    std::string path_;
};

std::string contents_of(const std::string &path);
bool is_ascii(std::string_view text);

} // namespace qn::test
