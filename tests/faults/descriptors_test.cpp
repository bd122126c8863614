// Descriptors are the program's: it closes them all and uses the numbers again while the library is at work, it runs
// without the standard ones and prints all the same, it executes other programs.
#include <atomic>
#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <functional>
#include <optional>
#include <set>
#include <string>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

#include "faults/attacked_calls.h"
#include "faults/campaign.h"
#include "faults/program.h"
#include "faults/system_calls.h"
#include "support/scratch.h"
#include "trace/trace.h"

namespace
{
using namespace qn::test;

constexpr const char *reused = "Descriptors closed and used again";
constexpr const char *no_standard = "No standard descriptors";
constexpr int first_number = 3;

void close_standard_descriptors()
{
    for (const int number : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) close(number);
}

// The flags of the file that a system call made a descriptor of, or nothing when it made none.
std::optional<uint64_t> flags_of_opened(const returned_call &call)
{
    if (call.result < 0) return std::nullopt;
    switch (call.number) {
    case SYS_open: return call.arguments[1];
    case SYS_openat: return call.arguments[2];
    case SYS_socket: return (call.arguments[1] & SOCK_CLOEXEC) != 0 ? O_CLOEXEC : 0;
    case SYS_fcntl:
        if (call.arguments[1] == F_DUPFD_CLOEXEC) return O_CLOEXEC;
        return call.arguments[1] == F_DUPFD ? std::optional<uint64_t>(0) : std::nullopt;
    case SYS_dup:
    case SYS_dup2:
    case SYS_dup3:
    case SYS_pipe2:
    case SYS_memfd_create:
    case SYS_eventfd2:
    case SYS_inotify_init1:
    case SYS_epoll_create1:
    case SYS_timerfd_create:
    case SYS_signalfd4:
    case SYS_accept4: return 0; // the library has no use for them
    default: return std::nullopt;
    }
}

struct openings {
    uint64_t all = 0;
    uint64_t printed_into = 0;      // what can be read or written and has the number 1 or 2
    uint64_t left_for_programs = 0; // stay open in an executed program
};

openings openings_of(const watched &process)
{
    openings seen;
    for (const returned_call &call : process.returned) {
        const auto flags = flags_of_opened(call);
        if (!flags) continue;
        ++seen.all;
        const bool standard = call.result == STDOUT_FILENO || call.result == STDERR_FILENO;
        seen.printed_into += standard && (*flags & O_PATH) == 0;
        seen.left_for_programs += (*flags & O_CLOEXEC) == 0;
    }
    return seen;
}

// The body is watched, in a process without standard descriptors.
openings openings_without_standard_descriptors(const std::function<void()> &prepare, const std::function<void()> &body,
                                               watched &process)
{
    process = watch(
        [&] {
            alarm(most_seconds);
            // A thread with a table of descriptors of its own has standard numbers of its own.
            setenv("QN_TR_DEBUG_LEVEL", "0", 1);
            setenv("TZ", ":/etc/passwd", 1); // a file that is there, for the C library to look for a time zone in
            prepare();
            close_standard_descriptors();
            begin_watching();
            body();
            end_watching();
        },
        {});
    return openings_of(process);
}

TEST(ProgramWithoutStandardDescriptors, GetsNoFileOfTheLibraryInTheirPlace)
{
    uint64_t opened = 0;
    for (const attacked_call &call : attacked_calls()) {
        SCOPED_TRACE(call.name);
        const scratch folder(memory_folder());
        watched process;
        const openings seen = openings_without_standard_descriptors([&] { call.prepare(folder.folder()); },
                                                                    [&] { call.call(folder.folder()); }, process);
        if (!process.possible) GTEST_SKIP() << "no process may be traced here";
        EXPECT_EQ(process.ended_by, 0);
        EXPECT_EQ(seen.printed_into, 0U);
        EXPECT_EQ(seen.left_for_programs, 0U);
        opened += seen.all;
        count(no_standard, "executions", 1);
    }
    EXPECT_GT(opened, attacked_calls().size());
    count(no_standard, "faults", opened);
}

TEST(PlantedOpening, IsFound)
{
    watched process;
    const openings seen = openings_without_standard_descriptors([] {},
                                                                [] {
                                                                    open("/dev/null", O_RDONLY | O_CLOEXEC); // 0
                                                                    open("/dev/null", O_WRONLY | O_CLOEXEC); // 1
                                                                    open("/dev/null", O_PATH);               // 2
                                                                },
                                                                process);
    if (!process.possible) GTEST_SKIP() << "no process may be traced here";
    EXPECT_EQ(seen.all, 3U);
    EXPECT_EQ(seen.printed_into, 1U);
    EXPECT_EQ(seen.left_for_programs, 1U);
    count("Planted harm is found", "rounds", 1);
}

// Prints to descriptors that are not there for as long as it lives.
class printing_thread
{
public:
    ~printing_thread() { join(); }
    // How often something was printed somewhere.
    uint64_t join()
    {
        end_ = true;
        if (thread_.joinable()) thread_.join();
        return arrived_;
    }

private:
    std::atomic<bool> end_{false};
    std::atomic<uint64_t> arrived_{0};
    std::thread thread_{[this] {
        while (!end_)
            for (const int number : {STDOUT_FILENO, STDERR_FILENO}) arrived_ += write(number, "printed\n", 8) != -1;
    }};
};

TEST(ProgramWithoutStandardDescriptors, PrintsIntoNoFileOfTheLibrary)
{
    const uint32_t turns = rounds(20, 1000);
    const scratch folder(memory_folder());
    EXPECT_TRUE(in_process([&] {
        close_standard_descriptors();
        printing_thread printing;
        with_page_set(folder.folder());
        write_file(files().copied, std::string(copied_bytes, 'x'));
        std::filesystem::create_directory(files().destination);
        qn_int32_t status = 0;
        for (uint32_t turn = 0; turn < turns; ++turn) {
            status |= name_it("") | write_ids(0, 500);
            status |= tr_copy_file_1(files().destination.c_str(), files().copied.c_str(), 0);
            wait_for_queue();
            unname_it("");
            tr_query_handle_t query = nullptr;
            status |= tr_open_query_1((files().trace + ".1.sp").c_str(), &query) | tr_close_query_1(query);
            for (const auto &copy : std::filesystem::directory_iterator(files().destination))
                if (file_bytes(copy.path()).find_first_not_of('x') != std::string::npos) _exit(2);
            std::filesystem::remove_all(files().spool);
            for (const auto &copy : std::filesystem::directory_iterator(files().destination))
                std::filesystem::remove(copy.path());
        }
        return printing.join() == 0 && status == 0;
    }));
    count(no_standard, "rounds", turns);
}

// Files and a socket of a program, under all numbers from the first one on.
class client_files
{
public:
    explicit client_files(const std::string &folder) : folder_(folder)
    {
        for (int i = 0; i < files; ++i) write_file(name(i), contents(i));
    }

    // Closes whatever is open, and opens its own.
    bool open_all() const
    {
        close_range(first_number, ~0U, 0);
        for (int i = 0; i < files; ++i)
            if (open(name(i).c_str(), O_RDWR | O_CLOEXEC) != first_number + i) return false;
        int ends[2];
        return socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0, ends) == 0 && ends[0] == socket;
    }

    // Whether they are as they were left: open, whole, not read, not locked, nothing sent.
    bool are_untouched() const
    {
        for (int i = 0; i < files; ++i) {
            const int fd = first_number + i;
            char bytes[64];
            struct flock lock = {.l_type = F_WRLCK, .l_whence = SEEK_SET, .l_start = 0, .l_len = 0, .l_pid = 0};
            const std::string expected = contents(i);
            if (lseek(fd, 0, SEEK_CUR) != 0 || fcntl(fd, F_GETLK, &lock) == -1 || lock.l_type != F_UNLCK) return false;
            const ssize_t length = pread(fd, bytes, sizeof bytes, 0);
            if (length == -1 || expected != std::string(bytes, static_cast<size_t>(length))) return false;
        }
        char byte;
        return recv(socket, &byte, 1, 0) == -1 && recv(socket + 1, &byte, 1, 0) == -1 && errno == EAGAIN;
    }

    void close_all() const { close_range(first_number, ~0U, 0); }

private:
    static constexpr int files = 12;
    static constexpr int socket = first_number + files;

    std::string name(int i) const { return folder_ + "/client" + std::to_string(i); }
    static std::string contents(int i) { return "this is the client's own file " + std::to_string(i); }

    std::string folder_;
};

// A program whose threads record into a page set that is copied, while files are copied as well, closes all descriptors
// again and again; false when something of its own was touched, or a copy is not whole.
bool close_and_use_again(const std::string &folder, uint32_t turns)
{
    with_page_set(folder);
    write_file(files().copied, std::string(copied_bytes, 'x'));
    std::filesystem::create_directory(files().destination);
    const client_files own(folder);
    if (name_it(folder) != 0) return false;

    std::atomic<bool> end{false};
    std::atomic<qn_int32_t> status{0};
    std::vector<std::thread> threads;
    for (int i = 0; i < 2; ++i)
        threads.emplace_back([&] {
            while (!end) status |= write_ids(0, 100);
        });
    bool untouched = true;
    for (uint32_t turn = 0; untouched && turn < turns; ++turn) {
        tr_copy_file_1(files().destination.c_str(), files().copied.c_str(), 0);
        untouched = own.open_all();
        wait_for_queue();
        untouched = untouched && own.are_untouched();
    }
    end = true;
    for (std::thread &thread : threads) thread.join();
    unname_it(folder);
    untouched = untouched && own.are_untouched();
    own.close_all();
    if (!untouched || status != 0) return false;

    const std::pair<std::string, uintmax_t> copies[] = {{files().destination, copied_bytes},
                                                        {files().spool, program_file_bytes}};
    for (const auto &[place, bytes] : copies)
        for (const auto &copy : std::filesystem::recursive_directory_iterator(place))
            if (copy.is_regular_file() && copy.file_size() != bytes) return false;
    return name_it(folder) == 0 && write_ids(0, 1) == 0;
}

TEST(ProgramThatClosesAllDescriptors, HasItsOwnFilesUnderTheirNumbersUntouched)
{
    const uint32_t turns = rounds(100, 5000);
    const scratch folder(memory_folder());
    EXPECT_TRUE(in_process([&] { return close_and_use_again(folder.folder(), turns); }));
    count(reused, "faults", turns);
    count(reused, "rounds", 1);
}

// A spool thread with the program's own descriptors is what it has where the system log is asked for.
TEST(PlantedSharingOfDescriptors, IsFound)
{
    const scratch folder(memory_folder());
    EXPECT_FALSE(in_process([&] {
        setenv("QN_TR_DEBUG_LEVEL", "0", 1);
        return close_and_use_again(folder.folder(), 1000000);
    }));
    count("Planted harm is found", "rounds", 1);
}

std::set<std::string> open_files()
{
    std::set<std::string> found;
    for (const auto &entry : std::filesystem::directory_iterator("/proc/self/fd")) {
        std::error_code closed; // that of the listing itself
        const auto target = std::filesystem::read_symlink(entry.path(), closed);
        if (!closed) found.insert(entry.path().filename().string() + " " + target.string());
    }
    return found;
}

TEST(Library, KeepsNoDescriptorBetweenCalls)
{
    for (const attacked_call &call : attacked_calls()) {
        const scratch folder(memory_folder());
        EXPECT_TRUE(in_process([&] {
            const auto before = open_files();
            call.prepare(folder.folder());
            call.call(folder.folder());
            return open_files() == before;
        })) << call.name;
        count(reused, "executions", 1);
    }
}
} // namespace
