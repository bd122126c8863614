// Files as the libraries open and read them: texts, and what is no regular file.
#include "platform/common/files.h"

#include <chrono>
#include <filesystem>
#include <memory>
#include <string>
#include <sys/stat.h>
#include <thread>

#include <gtest/gtest.h>

#include "support/scratch.h"

namespace
{
using qn::platform::open_text;
using qn::platform::read_file;
using qn::test::scratch;

constexpr unsigned most_seconds = 20; // then a test that hangs is ended

struct close_text {
    void operator()(FILE *text) const { std::fclose(text); }
};
using text_ptr = std::unique_ptr<FILE, close_text>;

// All lines; nothing where the reading fails.
std::string lines_of(FILE *text)
{
    std::string all;
    char piece[16];
    while (std::fgets(piece, sizeof piece, text) != nullptr) all += piece;
    return std::ferror(text) == 0 ? all : "";
}

std::string pipe_in(const scratch &files)
{
    alarm(most_seconds);
    const std::string name = files / "pipe";
    EXPECT_EQ(mkfifo(name.c_str(), 0600), 0);
    return name;
}

// An end of a pipe; O_RDWR finds the other end in itself and waits for nobody.
struct pipe_end {
    explicit pipe_end(const std::string &name) : fd(open(name.c_str(), O_RDWR | O_CLOEXEC)) {}
    pipe_end(const pipe_end &) = delete;
    pipe_end &operator=(const pipe_end &) = delete;
    ~pipe_end() { close(fd); }
    void write(const std::string &text) const
    {
        EXPECT_EQ(::write(fd, text.data(), text.size()), static_cast<ssize_t>(text.size()));
    }

    int fd;
};

TEST(Files, APipeWithoutAWriterReadsAsEmpty)
{
    const scratch files;
    char buffer[8];
    size_t length = 7;
    EXPECT_EQ(read_file(pipe_in(files).c_str(), buffer, &length), 0);
    EXPECT_EQ(length, 0U);
}

TEST(Files, APipeWithNothingInItIsAnErrorAndNotWaitedFor)
{
    const scratch files;
    const pipe_end writer(pipe_in(files));
    char buffer[8];
    size_t length = 7;
    EXPECT_EQ(read_file((files / "pipe").c_str(), buffer, &length), EAGAIN);
}

TEST(Texts, AreReadInLines)
{
    const scratch files;
    const std::string text = "one\ntwo and a line that is longer than a piece\n\nlast";
    qn::test::write_file(files / "text", text);
    const text_ptr opened(open_text((files / "text").c_str()));
    ASSERT_NE(opened, nullptr);
    EXPECT_EQ(lines_of(opened.get()), text);
}

TEST(Texts, ThatAreMissingGiveTheErrno)
{
    const scratch files;
    errno = 0;
    EXPECT_EQ(open_text((files / "none").c_str()), nullptr);
    EXPECT_EQ(errno, ENOENT);
}

TEST(Texts, AFolderCannotBeRead)
{
    const scratch files;
    const text_ptr opened(open_text(files.folder().c_str()));
    ASSERT_NE(opened, nullptr);
    char piece[16];
    EXPECT_EQ(std::fgets(piece, sizeof piece, opened.get()), nullptr);
    EXPECT_EQ(errno, EISDIR);
    EXPECT_NE(std::ferror(opened.get()), 0);
}

TEST(Texts, APipeWithoutAWriterReadsAsEmpty)
{
    const scratch files;
    const text_ptr opened(open_text(pipe_in(files).c_str()));
    ASSERT_NE(opened, nullptr);
    EXPECT_EQ(std::fgetc(opened.get()), EOF);
    EXPECT_EQ(std::ferror(opened.get()), 0);
}

TEST(Texts, APipesWriterIsGivenTime)
{
    const scratch files;
    const std::string name = pipe_in(files);
    auto writer = std::make_unique<pipe_end>(name);
    const text_ptr opened(open_text(name.c_str()));
    ASSERT_NE(opened, nullptr);
    std::thread late([&] {
        std::this_thread::sleep_for(std::chrono::milliseconds(200));
        writer->write("late\n");
        writer.reset();
    });
    EXPECT_EQ(lines_of(opened.get()), "late\n");
    late.join();
}

TEST(Texts, APipesWriterIsNotWaitedForForEver)
{
    const scratch files;
    const pipe_end writer(pipe_in(files));
    const text_ptr opened(open_text((files / "pipe").c_str()));
    ASSERT_NE(opened, nullptr);
    EXPECT_EQ(std::fgetc(opened.get()), EOF);
    EXPECT_NE(std::ferror(opened.get()), 0);
}

TEST(Texts, LeaveNoDescriptorBehind)
{
    const auto descriptors = [] {
        const std::filesystem::directory_iterator all("/proc/self/fd");
        return std::distance(begin(all), end(all));
    };
    const scratch files;
    qn::test::write_file(files / "text", "one\n");
    const auto before = descriptors();
    {
        const text_ptr opened(open_text((files / "text").c_str()));
        ASSERT_NE(opened, nullptr);
        EXPECT_EQ(descriptors(), before + 1);
    }
    EXPECT_EQ(descriptors(), before);
}

TEST(Texts, OpeningAndReadingAreNoCancellationPoints)
{
    const scratch files;
    qn::test::write_file(files / "text", "one\n");
    std::string read;
    std::thread([&] {
        pthread_cancel(pthread_self()); // pending from here on
        {
            const text_ptr opened(open_text((files / "text").c_str()));
            read = lines_of(opened.get());
        }
        pthread_setcancelstate(PTHREAD_CANCEL_DISABLE, nullptr); // let the thread object end in peace
    }).join();
    EXPECT_EQ(read, "one\n");
}
} // namespace
