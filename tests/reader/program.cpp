#include "reader/program.h"

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

namespace qn::test
{
namespace
{

std::vector<char *> pointers_to(const std::vector<std::string> &strings)
{
    std::vector<char *> result;
    result.reserve(strings.size() + 1);
    for (const auto &string : strings) {
        result.push_back(const_cast<char *>(string.c_str()));
    }
    result.push_back(nullptr);
    return result;
}

void open_as(int descriptor, const std::string &path)
{
    const int opened = open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0666);
    if (opened < 0 || dup2(opened, descriptor) < 0) _exit(126);
    close(opened);
}

[[noreturn]] void become(const std::string &program, std::vector<std::string> arguments, const surroundings &around,
                         const std::string &out, const std::string &err)
{
    arguments.insert(arguments.begin(), program);
    open_as(STDERR_FILENO, err);
    if (around.nobody_reads) {
        int ends[2];
        if (pipe(ends) != 0 || dup2(ends[1], STDOUT_FILENO) < 0) _exit(126);
        close(ends[0]);
        close(ends[1]);
    } else {
        open_as(STDOUT_FILENO, out);
    }
    if (around.ignore_sigpipe) std::signal(SIGPIPE, SIG_IGN);
    for (const int descriptor : around.closed) close(descriptor);
    if (around.as_nobody && geteuid() == 0 && (setgid(65534) != 0 || setuid(65534) != 0)) _exit(126);
    execve(program.c_str(), pointers_to(arguments).data(), pointers_to(around.environment).data());
    _exit(127);
}

} // namespace

outcome run_program(const std::string &program, const std::vector<std::string> &arguments, const surroundings &around)
{
    const scratch_folder folder;
    const auto out = around.out_file.empty() ? folder.path("out") : around.out_file;
    const auto err = around.err_file.empty() ? folder.path("err") : around.err_file;
    const pid_t child = fork();
    if (child < 0) throw std::runtime_error("fork() failed");
    if (child == 0) become(program, arguments, around, out, err);
    int status = 0;
    if (waitpid(child, &status, 0) != child) throw std::runtime_error("waitpid() failed");
    outcome result;
    if (WIFEXITED(status)) result.status = WEXITSTATUS(status);
    if (WIFSIGNALED(status)) result.signal = WTERMSIG(status);
    if (around.out_file.empty() && !around.nobody_reads) result.out = contents_of(out);
    if (around.err_file.empty()) result.err = contents_of(err);
    return result;
}

outcome run_qntrace(const std::vector<std::string> &arguments, const surroundings &around)
{
    return run_program(QNTRACE_PROGRAM, arguments, around);
}

scratch_folder::scratch_folder()
{
    path_ = (std::filesystem::temp_directory_path() / "qntrace-test-XXXXXX").string();
    if (mkdtemp(path_.data()) == nullptr) throw std::runtime_error("mkdtemp() failed");
    chmod(path_.c_str(), 0755);
}

scratch_folder::~scratch_folder()
{
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
}

std::string scratch_folder::file(std::string_view name, std::span<const std::byte> bytes) const
{
    std::ofstream out(path(name), std::ios::binary);
    out.write(reinterpret_cast<const char *>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
    out.close();
    if (!out) throw std::runtime_error("a scratch file cannot be written");
    return path(name);
}

std::string contents_of(const std::string &path)
{
    std::ifstream in(path, std::ios::binary);
    if (!in) throw std::runtime_error(path + " cannot be read");
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

bool is_ascii(std::string_view text)
{
    return std::all_of(text.begin(), text.end(), [](char c) { return static_cast<unsigned char>(c) < 0x80; });
}

} // namespace qn::test
