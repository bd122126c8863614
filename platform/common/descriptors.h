// Opening and closing files in a program whose descriptors are its own business. No state, no lock.
//
// The numbers 1 and 2 are written to by threads that do not look what is behind them. In a program that has closed
// them, the next file that is opened gets such a number, and then has what was printed in it. So the closed ones are
// taken for as long as a file is being opened, by descriptors that can neither be read nor written: who prints gets
// EBADF, as before.
#pragma once

#include <cerrno>
#include <csignal>
#include <cstdint>
#include <cstdio>
#include <ctime>
#include <fcntl.h>
#include <iterator>
#include <nl_types.h>
#include <poll.h>
#include <pthread.h>
#include <unistd.h>

namespace qn::platform
{
class no_cancel
{
public:
    no_cancel() { pthread_setcancelstate(PTHREAD_CANCEL_DISABLE, &before_); }
    no_cancel(const no_cancel &) = delete;
    no_cancel &operator=(const no_cancel &) = delete;
    ~no_cancel() { pthread_setcancelstate(before_, nullptr); }

private:
    int before_ = PTHREAD_CANCEL_ENABLE;
};

// close() that is no cancellation point. A thread that is cancelled there does not know whether the descriptor is still
// its own: it would leak, or be closed a second time when it is another thread's already. And no destructor may throw,
// which is how cancellation unwinds.
inline void close_for_sure(int fd)
{
    const no_cancel whole;
    close(fd);
}

inline constexpr int standard_input = 0;
inline constexpr int standard_output = 1;
inline constexpr int standard_error = 2;

// What is opened in its scope gets no number from `first` to 2. Costs one system call where these are open.
class standard_numbers_taken
{
public:
    explicit standard_numbers_taken(int first = standard_input)
    {
        const no_cancel whole;
        if (all_are_open()) return;
        int fd = standard_input;
        while ((fd = open("/", O_PATH | O_CLOEXEC)) != -1 && fd <= standard_error) taken_[fd] = true;
        if (fd != -1) close(fd);
        for (int number = standard_input; number < first; ++number) give_back(number);
    }
    standard_numbers_taken(const standard_numbers_taken &) = delete;
    standard_numbers_taken &operator=(const standard_numbers_taken &) = delete;
    ~standard_numbers_taken()
    {
        const int error = errno;
        for (int number = standard_input; number <= standard_error; ++number) give_back(number);
        errno = error;
    }

private:
    static bool all_are_open()
    {
        pollfd numbers[] = {{standard_input, 0, 0}, {standard_output, 0, 0}, {standard_error, 0, 0}};
        if (poll(numbers, std::size(numbers), 0) == -1) return false;
        return ((numbers[0].revents | numbers[1].revents | numbers[2].revents) & POLLNVAL) == 0;
    }
    void give_back(int number)
    {
        if (taken_[number]) close_for_sure(number);
        taken_[number] = false;
    }

    bool taken_[standard_error + 1] = {};
};

// open() for every file of the libraries: closed when another program is executed, never a controlling terminal, begun
// again after a signal, and with no number from `first` to 2, even where another thread closes that one just now.
inline int open_file(const char *path, int flags, mode_t mode = 0, int first = standard_input)
{
    int fd = -1;
    {
        const standard_numbers_taken other_numbers(first);
        do fd = open(path, flags | O_CLOEXEC | O_NOCTTY, mode);
        while (fd == -1 && errno == EINTR);
    }
    if (fd < first || fd > standard_error) return fd;
    const int moved = fcntl(fd, F_DUPFD_CLOEXEC, standard_error + 1);
    const int error = errno;
    close_for_sure(fd);
    errno = error;
    return moved;
}

// Gives a pipe's writer two seconds, which signals do not prolong. True when reading may have come to something.
inline bool writer_has_written(int fd)
{
    pollfd pipe{fd, POLLIN, 0};
    const timespec most{2, 0};
    sigset_t all;
    sigfillset(&all);
    return ppoll(&pipe, 1, &most, &all) > 0;
}

// The descriptor of a text is its stream's cookie.
inline int text_number(const void *cookie) { return static_cast<int>(reinterpret_cast<intptr_t>(cookie)); }

inline ssize_t read_text(void *cookie, char *buffer, size_t size)
{
    const no_cancel whole;
    const int fd = text_number(cookie);
    ssize_t got = -1;
    do got = read(fd, buffer, size);
    while (got == -1 && (errno == EINTR || (errno == EAGAIN && writer_has_written(fd))));
    return got;
}

inline int close_text(void *cookie)
{
    close_for_sure(text_number(cookie));
    return 0;
}

// fopen() of a text to be read. Neither this nor the reading is a cancellation point, so that a cancelled thread leaves
// no stream behind; and neither waits for ever: a pipe without a writer is empty, and a writer that is there gets a little
// time.
inline FILE *open_text(const char *path)
{
    const no_cancel whole;
    const int fd = open_file(path, O_RDONLY | O_NONBLOCK);
    if (fd == -1) return nullptr;
    FILE *text = fopencookie(reinterpret_cast<void *>(intptr_t{fd}), "r", {read_text, nullptr, nullptr, close_text});
    if (text == nullptr) close_for_sure(fd);
    return text;
}

// catopen() of a message catalogue, in the language of the locale.
inline nl_catd open_messages(const char *name)
{
    const standard_numbers_taken other_numbers;
    return catopen(name, NL_CAT_LOCALE);
}

// localtime_r(), which reads the file of the time zone.
inline bool local_time(time_t seconds, tm &parts)
{
    const standard_numbers_taken other_numbers;
    return localtime_r(&seconds, &parts) != nullptr;
}
} // namespace qn::platform
