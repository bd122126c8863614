// Filing the report of a failure: identifier, system log, and the record in a private /var.
#include <cerrno>
#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <filesystem>
#include <string>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <gtest/gtest.h>
#include <qn_ffdc.h>

#include "support/private_var.h"
#include "support/scratch.h"
#include "support/system_log.h"

namespace
{
using qn::test::file_bytes;
using qn::test::in_private_var;

constexpr const char *record_folder = "/var/qn/ffdc";

int file_report(fc_eid_t id, const char *component = "trace", int log_event = FC_EVENT_ERROR)
{
    return fc_log_error_1(id, 0, component, "OPAL", "spool.cpp", "1.2", 77, 0, log_event, 5, "\x0a\xff", 2, "/tmp/more",
                          "The spool is broken.");
}

size_t count(const std::string &text, const std::string &part)
{
    size_t found = 0;
    for (size_t at = text.find(part); at != std::string::npos; at = text.find(part, at + 1)) ++found;
    return found;
}

TEST(LogError, WritesOneLineToTheSystemLog)
{
    EXPECT_TRUE(in_private_var([] {
        fc_eid_t id;
        EXPECT_EQ(file_report(id), 0);
        EXPECT_EQ(qn::test::system_log().size(), 1U);
        EXPECT_TRUE(
            qn::test::system_log_has(std::string("trace: error 5: The spool is broken. (failure id ") + id + ")"));
        return true;
    }));
}

TEST(LogError, TheEventDecidesThePriority)
{
    EXPECT_TRUE(in_private_var([] {
        fc_eid_t id;
        for (const int event : {int{FC_EVENT_ERROR}, int{FC_EVENT_WARNING}, int{FC_EVENT_INFO}, 99})
            file_report(id, "trace", event);
        const auto lines = qn::test::system_log();
        EXPECT_EQ(lines.size(), 4U);
        if (lines.size() != 4) return false;
        EXPECT_EQ(lines[0].priority, LOG_ERR);
        EXPECT_EQ(lines[1].priority, LOG_WARNING);
        EXPECT_EQ(lines[2].priority, LOG_INFO);
        EXPECT_EQ(lines[3].priority, LOG_ERR);
        return true;
    }));
}

TEST(LogError, TheTextIsNotTakenForAFormat)
{
    EXPECT_TRUE(in_private_var([] {
        fc_eid_t id;
        EXPECT_EQ(fc_log_error_1(id, 0, "%s%n", nullptr, nullptr, nullptr, 0, 0, 0, 1, nullptr, 0, nullptr, "%d\n%s"),
                  0);
        EXPECT_TRUE(qn::test::system_log_has(std::string("%s%n: error 1: %d %s (failure id ") + id + ")"));
        return true;
    }));
}

TEST(LogError, TheApplicationsIdentityInTheSystemLogStays)
{
    EXPECT_TRUE(in_private_var([] {
        fc_eid_t id;
        file_report(id);
        EXPECT_TRUE(qn::test::system_log_openings().empty());
        return true;
    }));
}

TEST(LogError, WithoutTheFolderNothingIsFiledAndNothingFails)
{
    EXPECT_TRUE(in_private_var([] {
        fc_eid_t id;
        EXPECT_EQ(file_report(id), 0);
        EXPECT_FALSE(std::filesystem::exists("/var/qn"));
        return true;
    }));
}

TEST(LogError, FilesTheWholeRecord)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories(record_folder);
        fc_eid_t id;
        EXPECT_EQ(file_report(id), 0);
        const std::string record = file_bytes("/var/qn/ffdc/trace.log");
        EXPECT_EQ(record.find(std::string("id: ") + id + "\ntime: 2"), 0U);
        for (const char *line :
             {"component: trace", "subsystem: OPAL", "source: spool.cpp:77", "version: 1.2", "severity: error",
              "error: 5", "text: The spool is broken.", "detail_length: 2", "detail: 0aff", "detail_file: /tmp/more"})
            EXPECT_EQ(count(record, std::string("\n") + line + "\n"), 1U) << line;
        EXPECT_EQ(count(record, "\nprocess: " + std::to_string(getpid()) + "\n"), 1U);
        EXPECT_EQ(record.substr(record.size() - 2), "\n\n");
        return true;
    }));
}

TEST(LogError, AppendsToEarlierRecords)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories(record_folder);
        fc_eid_t first, second;
        file_report(first);
        file_report(second);
        const std::string records = file_bytes("/var/qn/ffdc/trace.log");
        EXPECT_LT(records.find(first), records.find(second));
        EXPECT_EQ(count(records, "\n\n"), 2U);
        return true;
    }));
}

TEST(LogError, ProcessesDoNotMixTheirRecords)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories(record_folder);
        for (int i = 0; i < 4; ++i)
            if (fork() == 0) {
                fc_eid_t id;
                for (int n = 0; n < 50; ++n) file_report(id);
                _exit(0);
            }
        while (wait(nullptr) > 0) {
        }
        const std::string records = file_bytes("/var/qn/ffdc/trace.log");
        EXPECT_EQ(count(records, "\n\nid: "), 199U);
        EXPECT_EQ(count(records, "detail_file: /tmp/more\n\n"), 200U);
        return true;
    }));
}

TEST(LogError, TheFileIsNamedAfterTheComponentAndStaysInItsFolder)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories(record_folder);
        fc_eid_t id;
        file_report(id, "../../etc/x y");
        file_report(id, nullptr);
        EXPECT_TRUE(std::filesystem::exists("/var/qn/ffdc/______etc_x_y.log"));
        EXPECT_TRUE(std::filesystem::exists("/var/qn/ffdc/unknown.log"));
        return true;
    }));
}

TEST(LogError, TheFileIsNotForEverybody)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories(record_folder);
        umask(0);
        fc_eid_t id;
        file_report(id);
        struct stat status;
        EXPECT_EQ(stat("/var/qn/ffdc/trace.log", &status), 0);
        EXPECT_EQ(status.st_mode & 07777, 0640U);
        return true;
    }));
}

TEST(LogError, DoesNotFollowALink)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories(record_folder);
        qn::test::write_file("/var/precious", "mine");
        std::filesystem::create_symlink("/var/precious", "/var/qn/ffdc/trace.log");
        fc_eid_t id;
        EXPECT_EQ(file_report(id), ELOOP);
        EXPECT_EQ(file_bytes("/var/precious"), "mine");
        EXPECT_EQ(qn::test::system_log().size(), 1U);
        return true;
    }));
}

TEST(LogError, DoesNotWriteIntoAPipe)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories(record_folder);
        EXPECT_EQ(mkfifo("/var/qn/ffdc/trace.log", 0600), 0);
        const int reader = open("/var/qn/ffdc/trace.log", O_RDONLY | O_NONBLOCK);
        fc_eid_t id;
        EXPECT_EQ(file_report(id), ENXIO);
        char byte;
        EXPECT_EQ(read(reader, &byte, 1), 0);
        close(reader);
        EXPECT_EQ(file_report(id), ENXIO);
        return true;
    }));
}

TEST(LogError, LeavesOutARecordBeyondTheFileSizeLimit)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories(record_folder);
        fc_eid_t id;
        EXPECT_EQ(file_report(id), 0);
        const std::string first = file_bytes("/var/qn/ffdc/trace.log");
        const rlimit limit = {first.size() + 100, first.size() + 100};
        EXPECT_EQ(setrlimit(RLIMIT_FSIZE, &limit), 0);
        EXPECT_EQ(file_report(id), EFBIG);
        EXPECT_EQ(file_bytes("/var/qn/ffdc/trace.log"), first);
        return true;
    }));
}

TEST(LogError, ARecordThatWasCutEndsWhereTheNextBegins)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories(record_folder);
        for (const std::string piece : {"i", "id: cut", "id: cut\n", "id: cut\n\n"}) {
            qn::test::write_file("/var/qn/ffdc/trace.log", piece);
            fc_eid_t id;
            EXPECT_EQ(file_report(id), 0);
            const std::string text = piece.substr(0, piece.find('\n'));
            EXPECT_EQ(file_bytes("/var/qn/ffdc/trace.log").find(text + "\n\nid: " + id + "\n"), 0U) << piece;
        }
        return true;
    }));
}

TEST(LogError, TellsWhatADiskThatFillsUpHasCut)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories(record_folder);
        EXPECT_EQ(mount("none", record_folder, "tmpfs", 0, "size=16k"), 0);
        const std::string data(4000, 'a');
        fc_eid_t id;
        int status = 0;
        while (status == 0)
            status = fc_log_error_1(id, 0, "trace", nullptr, nullptr, nullptr, 0, 0, 0, 1, data.data(), 4000, nullptr,
                                    nullptr);
        EXPECT_EQ(status, ENOSPC);
        const auto cut = static_cast<off_t>(std::filesystem::file_size("/var/qn/ffdc/trace.log"));
        EXPECT_EQ(cut, 16384) << "a piece of the last record is there";
        EXPECT_EQ(mount("none", record_folder, "tmpfs", MS_REMOUNT, "size=64k"), 0);
        EXPECT_EQ(file_report(id), 0);
        EXPECT_EQ(file_bytes("/var/qn/ffdc/trace.log").find(std::string("\n\nid: ") + id + "\n"),
                  static_cast<size_t>(cut));
        return true;
    }));
}

TEST(LogError, TheTimeIsThatOfTheClockInUtc)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories(record_folder);
        setenv("TZ", "EAST-5", 1);
        const time_t before = std::time(nullptr);
        fc_eid_t id;
        file_report(id);
        const time_t after = std::time(nullptr);
        const std::string record = file_bytes("/var/qn/ffdc/trace.log");
        tm parts{};
        const char *end = strptime(record.c_str() + record.find("\ntime: ") + 7, "%Y-%m-%dT%H:%M:%SZ\n", &parts);
        if (end == nullptr) return false;
        const time_t told = timegm(&parts);
        EXPECT_LE(before, told);
        EXPECT_LE(told, after);
        return true;
    }));
}

TEST(LogError, NullPointersAreTolerated)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories(record_folder);
        EXPECT_EQ(
            fc_log_error_1(nullptr, 0, nullptr, nullptr, nullptr, nullptr, 0, 0, 0, 0, nullptr, 10, nullptr, nullptr),
            0);
        const std::string record = file_bytes("/var/qn/ffdc/unknown.log");
        EXPECT_EQ(count(record, "detail"), 0U);
        EXPECT_EQ(count(record, "source"), 0U);
        EXPECT_EQ(count(record, "error: 0"), 1U);
        return true;
    }));
}

TEST(LogError, ALineBreakInATextDoesNotForgeALine)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories(record_folder);
        fc_eid_t id;
        fc_log_error_1(id, 0, "trace", "A\nerror: 99", nullptr, nullptr, 0, 0, 0, 1, nullptr, 0, nullptr, "x\n\nid: y");
        const std::string record = file_bytes("/var/qn/ffdc/trace.log");
        EXPECT_EQ(count(record, "\nerror: "), 1U);
        EXPECT_EQ(count(record, "\n\n"), 1U);
        return true;
    }));
}

TEST(LogError, LongDetailDataAreCut)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories(record_folder);
        const std::string data(5000, 'a');
        fc_eid_t id;
        fc_log_error_1(id, 0, "trace", nullptr, nullptr, nullptr, 0, 0, 0, 1, data.data(), 5000, nullptr, nullptr);
        const std::string record = file_bytes("/var/qn/ffdc/trace.log");
        EXPECT_EQ(count(record, "\ndetail_length: 5000\n"), 1U);
        std::string digits;
        for (int i = 0; i < 4096; ++i) digits += "61";
        EXPECT_EQ(count(record, "\ndetail: " + digits + "\n"), 1U);
        return true;
    }));
}
} // namespace
