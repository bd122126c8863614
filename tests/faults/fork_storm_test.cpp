// Fork storms: eight threads trace, others call the rest of the library, and children come into being in every way there
// is. None of them writes to a file of the parent's, hangs on a lock or ends otherwise than it wants to.
#include <atomic>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <shared_mutex>
#include <thread>

#include <fcntl.h>
#include <spawn.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "faults/campaign.h"
#include "faults/program.h"
#include "recording/numbered_records.h"
#include "recording/one_trace.h"
#include "trace/trace.h"

extern char **environ;

namespace
{
using namespace qn::test;

constexpr uint32_t writers = 8;
constexpr record_author child_author = {675, 9};
constexpr const char *item = "Fork storms";

pid_t wait_for(pid_t child, int &status)
{
    pid_t waited = -1;
    do {
        waited = waitpid(child, &status, 0);
    } while (waited == -1 && errno == EINTR);
    return waited;
}

bool ends_well(pid_t child)
{
    int status = 0;
    const bool ended = child > 0 && wait_for(child, status) == child;
    if (!ended || status != 0) std::fprintf(stderr, "child %d ended with the status 0x%x\n", child, status);
    return ended && status == 0;
}

// From here on a store into a trace file that was mapped at the fork is the end of the child.
void forbid_writing_to_files()
{
    for (trace_anchor_t *anchor = &anchors; anchor != nullptr; anchor = qn::tr::load_acquire(anchor->next))
        qn::tr::for_each_page(anchor, [](const trace_anchor_t *page) {
            if (page->pMap != nullptr && mprotect(page->pMap, page->uActualFileSize, PROT_READ) != 0) _exit(10);
        });
}

class ForkStorm : public testing::Test
{
protected:
    void SetUp() override
    {
        setenv("QN_TR_SIZE", "65536", 1);
        setenv("QN_TR_SPOOL", ("paged.trc:ON:4:" + folder / "spool").c_str(), 1);
        ASSERT_EQ(tr_set_filename_1(single.c_str()), 0);
        ASSERT_EQ(program.register_now(), 0);
        other = start_another(folder / "other.trc");
        paged = start_another(folder / "paged.trc");
        ASSERT_NE(paged->nextPage, nullptr);
        tokens = {nullptr, other, paged};
        for (uint32_t thread = 0; thread < writers; ++thread) threads.emplace_back([this, thread] { write(thread); });
        threads.emplace_back([this] { control(); });
        while (written < 10000) std::this_thread::yield();
    }
    void TearDown() override
    {
        enough = true;
        for (std::thread &thread : threads) thread.join();
        EXPECT_EQ(failures, 0U) << "calls of the parent";
        EXPECT_EQ(master_override_off(), 0) << "the parent goes on tracing";
        EXPECT_EQ(tr_set_filename_1(nullptr), 0);
        tr_term();
        for (const std::string &name : files()) expect_parents_records_only(name);
    }

    // What a child does before it ends: everything.
    void use_the_library() const
    {
        alarm(60);
        forbid_writing_to_files();
        // Stays registered in the child, and in its own children.
        auto *late = new client(("L" + std::to_string(getpid() % 1000)).c_str());
        char text[4096];
        qn_uint32_t size = 0;
        int status = 0;
        for (uint32_t number = 0; number < 70; ++number)
            status |= write_numbered(child_author, number, tokens[number % 3]);
        status |= late->register_now() | tr_get_filename_1(text) | tr_get_size_1(&size) | tr_flush_1();
        status |= tr_set_trace_levels_1("*:*=3") | tr_pin_pages_1(1) | tr_pin_pages_1(0);
        status |= tr_set_filename_1("") | tr_set_filename_1(single.c_str()) | tr_set_filename_1(nullptr);
        status |= tr_copy_file_1(folder.folder().c_str(), single.c_str(), 0);
        tr_configure_1();
        int count = 0;
        tr_mini_component_anchor_t *levels = nullptr;
        status |= tr_get_current_trace_levels_1(&count, &levels);
        tr_release_comp_info_1(count, levels);
        for (uint32_t number = 0; number < 70; ++number)
            status |= write_numbered(child_author, number, tokens[number % 3]);
        if (status == 0) return;
        std::fprintf(stderr, "the library's calls gave 0x%x\n", status);
        _exit(11);
    }

    pid_t child_that(const std::function<void()> &body) const
    {
        const pid_t child = fork();
        if (child != 0) return child;
        use_the_library();
        body();
        _exit(12);
    }

    // Children of every kind, one after the other; false when one did not end well.
    bool make_children() const
    {
        ++children;
        bool well = ends_well(child_that([] { _exit(0); }));
        well = well && ends_well(child_that([] { std::exit(0); }));
        well = well && ends_well(child_that([] { std::quick_exit(0); }));
        well = well && ends_well(child_that([] { execl("/bin/true", "true", nullptr); }));
        well = well && ends_well(child_that([this] {
                   for (int i = 0; i < 3; ++i)
                       if (!ends_well(child_that([] { std::exit(0); }))) _exit(13);
                   std::exit(0);
               }));
        well = well && ends_well(child_that([] {
                   tr_term();
                   tr_term();
                   _exit(0);
               }));
        return well && have_daemon() && vfork_and_execute() && spawn();
    }

    bool have_daemon() const
    {
        int told[2];
        if (pipe2(told, O_CLOEXEC) != 0) return false;
        const pid_t child = fork();
        if (child == 0) {
            if (daemon(1, 1) != 0) _exit(14);
            use_the_library();
            if (::write(told[1], "+", 1) == 1) std::exit(0);
            _exit(15);
        }
        close(told[1]);
        char answer = 0;
        const bool alive = ends_well(child) && read(told[0], &answer, 1) == 1;
        close(told[0]);
        return alive && answer == '+';
    }

    static bool vfork_and_execute()
    {
        const pid_t child = vfork();
        if (child == 0) {
            execl("/bin/true", "true", nullptr);
            _exit(127);
        }
        return ends_well(child);
    }

    static bool spawn()
    {
        char name[] = "true";
        char *arguments[] = {name, nullptr};
        pid_t child = -1;
        return posix_spawn(&child, "/bin/true", nullptr, nullptr, arguments, environ) == 0 && ends_well(child);
    }

    std::vector<std::string> files() const
    {
        std::vector<std::string> names;
        for (const auto &entry : std::filesystem::directory_iterator(folder.folder()))
            if (entry.is_regular_file() && entry.path().string().find(".trc.2") == std::string::npos)
                names.push_back(entry.path());
        return names;
    }

    // Holds every writer and the spool thread still.
    void in_silence(const std::function<void()> &body)
    {
        silence = true;
        const std::unique_lock still(gate);
        silence = false;
        wait_for_queue();
        body();
    }

    uint64_t made() const { return children * 13; } // processes

    scratch folder;
    std::string single = folder / "single.trc";
    client program{"FORK"};
    trace_anchor_t *other = nullptr;
    trace_anchor_t *paged = nullptr;
    std::vector<tr_file_token_t> tokens;
    mutable std::atomic<uint64_t> children{0};

private:
    std::shared_lock<std::shared_mutex> pass_gate()
    {
        while (silence) std::this_thread::yield();
        return std::shared_lock(gate);
    }

    void write(uint32_t thread)
    {
        for (uint32_t number = 0; !enough; ++number) {
            const auto may_go_on = pass_gate();
            failures += write_numbered({1, thread}, number, tokens[thread % 3]) != 0;
            ++written;
        }
    }

    void control()
    {
        client component("CTRL", 4);
        while (!enough) {
            const auto may_go_on = pass_gate();
            failures += component.register_now() != 0;
            failures += tr_set_trace_levels_1("CTRL:*=3") != 0;
            failures += tr_flush_1() != 0;
            failures += tr_unregister_component_1("CTRL") != 0;
        }
    }

    static void expect_parents_records_only(const std::string &name)
    {
        SCOPED_TRACE(name);
        for (const auto &[author, numbers] : numbers_in(trace_image::of_file(name).ring())) {
            EXPECT_EQ(author.run, 1U);
            for (size_t i = 1; i < numbers.size(); ++i) ASSERT_EQ(numbers[i], numbers[i - 1] + 1);
        }
    }

    std::shared_mutex gate;
    std::atomic<bool> silence{false}; // is waited for
    std::atomic<bool> enough{false};
    std::atomic<uint64_t> written{0};
    std::atomic<uint64_t> failures{0};
    std::vector<std::thread> threads;
};

TEST_F(ForkStorm, OfSeveralThreadsHarmsNeitherChildrenNorParent)
{
    const uint32_t storms = rounds(2, 150);
    std::atomic<uint32_t> well{0};
    std::vector<std::thread> forking;
    for (int i = 0; i < 3; ++i)
        forking.emplace_back([&] {
            for (uint32_t storm = 0; storm < storms; ++storm) well += make_children();
        });
    for (std::thread &thread : forking) thread.join();
    EXPECT_EQ(well, 3 * storms);
    count(item, "rounds", 3 * storms);
    count(item, "executions", made());
}

TEST_F(ForkStorm, LeavesEveryByteOfTheParentsFilesAsItIs)
{
    const uint32_t storms = rounds(2, 100);
    for (uint32_t storm = 0; storm < storms; ++storm)
        in_silence([this] {
            std::vector<std::string> before;
            for (const std::string &name : files()) before.push_back(file_bytes(name));
            EXPECT_TRUE(make_children());
            std::vector<std::string> behind;
            for (const std::string &name : files()) behind.push_back(file_bytes(name));
            EXPECT_EQ(before, behind);
        });
    count(item, "rounds", storms);
    count(item, "executions", made());
}

// The library takes locks before it is initialised: for a writer that comes first, for copies, for levels.
TEST(ForkBeforeTheFirstTrace, LeavesTheChildAllLocksAndASpoolThreadOfItsOwn)
{
    const scratch folder;
    const std::string copies = folder / "copies";
    std::filesystem::create_directory(copies);
    write_file(folder / "file", "text");
    ASSERT_EQ(tr_copy_file_1(copies.c_str(), (folder / "file").c_str(), 0), 0); // the parent has a spool thread
    while (std::filesystem::is_empty(copies)) std::this_thread::yield();

    std::atomic<int> stage{0};
    std::thread holder([&] {
        const qn::tr::global_lock global;
        const qn::tr::mutex_lock queue(spq.mutex);
        stage = 1;
        while (stage != 2) std::this_thread::yield();
    });
    while (stage != 1) std::this_thread::yield();
    const pid_t child = fork();
    if (child == 0) {
        alarm(60);
        std::filesystem::remove_all(copies);
        std::filesystem::create_directory(copies);
        client program("KIDS");
        int status = tr_record_id_1("KIDS", 1) | tr_set_filename_1((folder / "kids.trc").c_str());
        status |= program.register_now() | tr_record_id_1("KIDS", 2);
        status |= trace_image::of_file(folder / "kids.trc").records_of(1).size() == 1 ? 0 : 1;
#ifndef __SANITIZE_THREAD__ // it does not follow a forked child that makes threads
        status |= tr_copy_file_1(copies.c_str(), (folder / "file").c_str(), 0);
        while (std::filesystem::is_empty(copies)) std::this_thread::yield();
#endif
        _exit(status == 0 ? 0 : 1);
    }
    stage = 2;
    holder.join();
    EXPECT_TRUE(ends_well(child));
}
} // namespace
