// The machine, or the process's limits, leave nothing: a full disk, one without room for another file, a read-only one, no
// bytes, no descriptors, no address space. Each exported call is made in that state, and again when it is over.
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <fstream>

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include "faults/attacked_calls.h"
#include "faults/campaign.h"
#include "faults/program.h"
#include "support/private_var.h"

namespace
{
using namespace qn::test;

constexpr const char *disk = "/var/disk";
constexpr const char *filler = "/var/disk/filler";

constexpr qn_int32_t any_code = -1;

// Attacks every call, and looks whether that is felt: the start of a trace file ends with that code. How often the attack
// took place.
uint64_t attack_all_calls(const attack &with, const std::string &parent, qn_int32_t code_of_start)
{
    const attack none = {[] {}, [] { return uint64_t{0}; }};
    uint64_t faults = 0;
    uint64_t executions = 0;
    for (const attacked_call &call : attacked_calls()) {
        SCOPED_TRACE(call.name);
        const aftermath undisturbed = play_in_child(call, none, parent);
        EXPECT_EQ(undisturbed.stage, aftermath::ended) << undisturbed.how_it_ended();
        const aftermath told = play_in_child(call, with, parent);
        expect_no_harm(call, told, undisturbed);
        if (std::string_view(call.name) == "SetFileName" && code_of_start != any_code) {
            EXPECT_EQ(told.status, code_of_start) << told.message;
        }
        faults += told.faults;
        executions += 1;
    }
    count("Full disks and limits", "rounds", 1);
    count("Full disks and limits", "faults", faults);
    count("Full disks and limits", "executions", executions);
    return faults;
}

// The process's limit is `soft` during the call.
attack limit_to(__rlimit_resource what, const std::function<rlim_t()> &soft)
{
    static rlimit before;
    return {[=] {
                getrlimit(what, &before);
                const rlimit limit = {soft(), before.rlim_max};
                setrlimit(what, &limit);
            },
            [=] {
                setrlimit(what, &before);
                return uint64_t{1};
            }};
}

// Attacks every call with its files on a small disk of their own.
void attack_on_disk(const char *options, const attack &with, qn_int32_t code_of_start)
{
    EXPECT_TRUE(in_private_var([&] {
        mkdir(disk, 0755);
        if (mount("tmpfs", disk, "tmpfs", 0, options) != 0) return false;
        EXPECT_GT(attack_all_calls(with, disk, code_of_start), 0U);
        return true;
    }));
}

TEST(FullDisk, DoesNoHarm)
{
    attack_on_disk("size=4m",
                   {[] {
                        const int fd = open(filler, O_WRONLY | O_CREAT | O_CLOEXEC, 0600);
                        static const char bytes[4096] = {};
                        while (write(fd, bytes, sizeof bytes) > 0) continue;
                        close(fd);
                    },
                    [] {
                        unlink(filler);
                        return uint64_t{1};
                    }},
                   35);
}

TEST(DiskWithoutInodes, DoesNoHarm)
{
    attack_on_disk("size=4m,nr_inodes=100",
                   {[] {
                        mkdir(filler, 0700);
                        for (int i = 0;; ++i) {
                            const std::string name = std::string(filler) + "/" + std::to_string(i);
                            const int fd = open(name.c_str(), O_CREAT | O_CLOEXEC | O_RDWR, 0600);
                            if (fd == -1) break;
                            close(fd);
                        }
                    },
                    [] {
                        std::filesystem::remove_all(filler);
                        return uint64_t{1};
                    }},
                   35);
}

// A disk with a file that is mapped for writing cannot become read-only: those calls are not attacked.
TEST(ReadOnlyDisk, DoesNoHarm)
{
    static bool read_only = false;
    attack_on_disk("size=4m",
                   {[] { read_only = mount(nullptr, disk, nullptr, MS_REMOUNT | MS_RDONLY, "size=4m") == 0; },
                    [] {
                        mount(nullptr, disk, nullptr, MS_REMOUNT, "size=4m");
                        return uint64_t{read_only};
                    }},
                   18);
}

// The signal that a write beyond the limit raises is not handled here: its default is the end of the process.
TEST(FileSizeLimitOfTheProcess, DoesNoHarm)
{
    ASSERT_EQ(signal(SIGXFSZ, SIG_DFL), SIG_DFL);
    for (const rlim_t bytes : {0, 1000, 4096, 10000})
        attack_all_calls(limit_to(RLIMIT_FSIZE, [=] { return bytes; }), memory_folder(),
                         bytes < program_file_bytes ? 23 : 0);
}

TEST(DescriptorLimitOfTheProcess, DoesNoHarm)
{
    attack_all_calls(limit_to(RLIMIT_NOFILE, [] { return rlim_t{0}; }), memory_folder(), 18);
}

// With some room on the heap: the C library's compiler of patterns frees memory twice when it gets none half-way.
[[maybe_unused]] rlim_t address_space_in_use()
{
    void *volatile room = std::malloc(100000);
    std::free(room);
    std::ifstream statm("/proc/self/statm");
    rlim_t pages = 0;
    statm >> pages;
    return pages * static_cast<rlim_t>(sysconf(_SC_PAGESIZE));
}

TEST(AddressSpaceLimitOfTheProcess, DoesNoHarm)
{
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
    GTEST_SKIP() << "a sanitizer ends the process when it gets no memory";
#else
    // What is used, and a little more.
    for (const rlim_t more : {0, 4096, 65536, 262144, 1048576})
        attack_all_calls(limit_to(RLIMIT_AS, [=] { return address_space_in_use() + more; }), memory_folder(),
                         more == 0 ? 21 : any_code);
#endif
}
} // namespace
