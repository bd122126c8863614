#include "reader/follow/live_writer.h"

#include <csignal>
#include <cstdlib>

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include "support/last_error.h"
#include "trace/trace.h"

namespace qn::test
{
namespace
{

bool tell_done(int channel) { return write(channel, "", 1) == 1; }

bool write_as_told(int channel, const std::string &file, std::uint64_t value, const std::string &spool_directory)
{
    // Its presence keeps the library from the configuration file of the machine.
    const auto specification = spool_directory.empty() ? "none" : ".*:ON:8:" + spool_directory;
    setenv("QN_TR_SPOOL", specification.c_str(), 1);
    client component("WRIT");
    if (tr_set_filename_1(file.c_str()) != 0 || component.register_now() != 0 || !tell_done(channel)) return false;
    for (std::uint64_t count = 0; read(channel, &count, sizeof count) == ssize_t{sizeof count};) {
        for (; count != 0; --count)
            if (tr_record_values_64_1("WRIT", 1, 1, value++) != 0) return false;
        if (!tell_done(channel)) return false;
    }
    tr_term();
    return true;
}

} // namespace

live_writer::live_writer(const std::string &file, std::uint64_t first, const std::string &spool_directory)
{
    int ends[2];
    if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0) std::abort();
    child_ = fork();
    if (child_ == 0) {
        close(ends[0]);
        _exit(write_as_told(ends[1], file, first, spool_directory) ? 0 : 1);
    }
    close(ends[1]);
    channel_ = ends[0];
    wait_until_done();
}

live_writer::~live_writer()
{
    if (child_ > 0) end();
}

void live_writer::begin_to_write(std::uint64_t count)
{
    EXPECT_EQ(::write(channel_, &count, sizeof count), ssize_t{sizeof count});
}

void live_writer::write(std::uint64_t count)
{
    begin_to_write(count);
    wait_until_done();
}

void live_writer::wait_until_done()
{
    char done = 0;
    EXPECT_EQ(read(channel_, &done, 1), 1) << "the writer has ended";
}

void live_writer::end()
{
    close(channel_);
    int status = 0;
    EXPECT_EQ(waitpid(std::exchange(child_, -1), &status, 0) > 0, true);
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << status;
}

void live_writer::kill()
{
    ::kill(child_, SIGKILL);
    int status = 0;
    waitpid(std::exchange(child_, -1), &status, 0);
    close(channel_);
    EXPECT_TRUE(WIFSIGNALED(status));
}

} // namespace qn::test
