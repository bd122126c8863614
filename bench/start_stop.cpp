// What it takes to start and stop a large trace, beside what the machine takes for the bytes: writing as many into a new
// file and to the disk, and reading the memory that holds them. One line of JSON for each step.
//
//   start_stop FOLDER [BYTES]
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include <fcntl.h>
#include <nlohmann/json.hpp>
#include <qn_tr.h>
#include <sys/mman.h>
#include <unistd.h>

namespace
{
constexpr const char *component = "BNCH";

void want(bool done, const char *what)
{
    if (done) return;
    std::perror(what);
    std::exit(1);
}

template <class Step>
void report(const char *name, Step step)
{
    const auto begin = std::chrono::steady_clock::now();
    step();
    const double ms = std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - begin).count();
    std::printf("%s\n", nlohmann::ordered_json{{"step", name}, {"ms", ms}}.dump().c_str());
}

void write_file(const std::string &name, std::size_t bytes)
{
    const int fd = open(name.c_str(), O_RDWR | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
    want(fd != -1, name.c_str());
    const std::vector<char> block(1 << 20);
    for (std::size_t done = 0; done < bytes; done += block.size())
        want(pwrite(fd, block.data(), block.size(), static_cast<off_t>(done)) == static_cast<ssize_t>(block.size()),
             "pwrite");
    want(fsync(fd) == 0, "fsync");
    close(fd);
}

// Every cache line once, as a walk over records of that size does at least.
std::uint64_t read_memory(const std::string &name, std::size_t bytes)
{
    const int fd = open(name.c_str(), O_RDONLY | O_CLOEXEC);
    want(fd != -1, name.c_str());
    void *map = mmap(nullptr, bytes, PROT_READ, MAP_SHARED | MAP_POPULATE, fd, 0);
    want(map != MAP_FAILED, "mmap");
    close(fd);
    std::uint64_t sum = 0;
    for (std::size_t at = 0; at < bytes; at += 64) {
        std::uint64_t word;
        std::memcpy(&word, static_cast<const char *>(map) + at, sizeof word);
        sum += word;
    }
    munmap(map, bytes);
    return sum;
}
} // namespace

int main(int argc, char **argv)
{
    if (argc != 2 && argc != 3) {
        std::fprintf(stderr, "usage: start_stop FOLDER [BYTES]\n");
        return 2;
    }
    const std::string trace = std::string(argv[1]) + "/trace";
    const std::string plain = std::string(argv[1]) + "/plain";
    const std::size_t bytes = argc == 3 ? std::strtoull(argv[2], nullptr, 10) : std::size_t{1} << 30;
    setenv("QN_TR_SPOOL", "none", 1);
    setenv("QN_TR_SIZE", std::to_string(bytes).c_str(), 1);
    tr_detail_level_t levels[1];
    const tr_category_description_t categories[] = {{0, "Bench", 1, 1}};
    want(tr_register_component_1(component, levels, categories, 1) == 0, "tr_register_component_1");
    const auto start = [&] { want(tr_set_filename_1(trace.c_str()) == 0, "tr_set_filename_1"); };
    const auto stop = [] { want(tr_set_filename_1("") == 0, "tr_set_filename_1"); };

    report("write the bytes", [&] { write_file(plain, bytes); });
    report("start a new trace", start);
    for (std::size_t i = 0; i < bytes / 52; ++i) tr_record_uint64_2_1(component, 1, i, i);
    report("stop a full trace", stop);
    std::uint64_t sum = 0;
    report("map and read the bytes", [&] { sum = read_memory(trace, bytes); });
    report("start the full trace again", start);
    stop();
    unlink(plain.c_str());
    unlink(trace.c_str());
    return sum == 0; // the sum was needed
}
