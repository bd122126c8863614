// Writes a spool tree with a little of everything that a report shows: two nodes, three programs, threads that say much
// and little, bursts, errors, records that are missing, a page that was overwritten, an unfinished record, and texts
// that would be markup if anybody took them for it. The same for the same arguments.
#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "reader/errors/error_records.h"
#include "reader/trace_builder.h"

namespace
{

using namespace qn::test;

constexpr double span_seconds = 60;

struct program {
    std::string host;
    std::uint64_t node;
    std::string name;
    std::vector<std::string> components;
    std::vector<std::uint32_t> threads;
};

// Numbers that look like chance.
class numbers
{
public:
    explicit numbers(std::uint64_t seed) : state_(seed) {}
    std::uint32_t below(std::uint32_t limit)
    {
        state_ = state_ * 6364136223846793005U + 1442695040888963407U;
        return static_cast<std::uint32_t>((state_ >> 33) % limit);
    }

private:
    std::uint64_t state_;
};

void write(const std::filesystem::path &folder, const program &from, const trace_builder &file)
{
    char id[17] = {};
    std::snprintf(id, sizeof id, "%016llx", static_cast<unsigned long long>(from.node));
    const auto place = folder / "prod" / "0001" / from.host / id / from.name;
    std::filesystem::create_directories(place);
    std::ofstream out(place / "app.trc.1.sp.2026_11_21_05_13_00.000001", std::ios::binary);
    out.write(reinterpret_cast<const char *>(file.bytes().data()), static_cast<std::streamsize>(file.bytes().size()));
}

void add_usual(trace_builder &file, numbers &chance, std::uint32_t i)
{
    switch (chance.below(4)) {
    case 0: file.add_id(100 + chance.below(9)); break;
    case 1: file.add_strings(200 + chance.below(5), {"document " + std::to_string(chance.below(90'000))}); break;
    case 2: file.add(13, file.body().u32(300).u32(2).u64(i).u64(chance.below(1'000'000))); break;
    default: file.add(12, file.body().u32(301).u32(1).u32(chance.below(4096)));
    }
}

void add_failure(trace_builder &file, numbers &chance)
{
    error_record error;
    if (chance.below(3) != 0) {
        error.name = "/var/spool/in/" + std::to_string(chance.below(900)) + ".eml";
        error.code = chance.below(2) == 0 ? 2 : 13;
    } else {
        error.error_id = 40;
        error.number = 12;
        error.default_message = "<img src=x onerror=\"document.title='taken'\"> %2$s</script><script>alert(1)</script>";
        error.name = "<b>bold</b>";
        error.catalogue = "mail.cat";
        error.ffdc_id = "FF:" + std::to_string(1000 + chance.below(9));
        error.file = "deliver.c";
        error.function = "put_away";
        error.line = 77;
    }
    add_error(file, error);
}

trace_builder records_of(const program &from, std::uint32_t records, bool burst)
{
    numbers chance(from.node * 31 + from.name.size());
    trace_builder file(std::size_t{records} * 64 + 16'384);
    file.put_text(132, from.name);
    file.put_u64(180, from.node);
    file.component = "____";
    file.seq = static_cast<std::uint32_t>(-2);
    file.counter = 1'000'000'000 + from.name.size(); // two programs do not begin at the same moment
    file.add(2, file.body().text("SPOOL: /tmp/app.trc.1.sp not spooled 2 consecutive times"));
    file.add_start(4711, trace_builder::ticks_per_second, trace_builder::epoch_ns);
    double time = 1;
    const double pace = span_seconds / records;
    for (std::uint32_t i = 0; i < records; ++i) {
        const double wave = 1.0 + 0.7 * std::sin(time / 6) + 0.25 * std::sin(time * 1.7);
        const bool busy = burst && time > 31 && time < 36;
        time += pace / std::max(wave * (busy ? 4 : 1), 0.15) * (0.5 + chance.below(1000) / 1000.0);
        file.counter = static_cast<std::uint64_t>(time * 1e9);
        const auto component =
            std::min(chance.below(3), chance.below(static_cast<std::uint32_t>(from.components.size())));
        file.component = from.components[component % from.components.size()];
        file.thread =
            from.threads[std::min<std::size_t>(chance.below(2) == 0 ? 0 : chance.below(9), from.threads.size() - 1)];
        if (i == records / 3) file.seq += 2 * 40; // forty are missing
        if (chance.below(busy ? 60 : 900) == 0)
            add_failure(file, chance);
        else
            add_usual(file, chance, i);
    }
    file.add_strings(7, {"</script><script>document.title='taken'</script>", "\x1b[31m", "caf\xc3\xa9"});
    file.add(0xFFFF, file.body().u32(1));
    file.close();
    return file;
}

} // namespace

int main(int argc, char **argv)
{
    if (argc != 3) return 2;
    const auto records = static_cast<std::uint32_t>(std::atoi(argv[2]));
    const std::vector<program> programs = {
        {"host1", 0xa1, "indexer", {"IDX", "WALK", "IO", "NET"}, {0x7f3a1c00, 0x7f3a2c80, 0x7f3a3d00, 0x7f3a4d80}},
        {"host2", 0xa2, "indexer", {"IDX", "WALK", "IO", "NET"}, {0x7f81aa40, 0x7f81bac0}},
        {"host2", 0xa2, "mailer", {"SMTP", "QUE", "<b>", "IO"}, {0x7fc01100, 0x7fc02180, 0x7fc03200}},
    };
    for (std::size_t i = 0; i < programs.size(); ++i)
        write(argv[1], programs[i], records_of(programs[i], i == 0 ? records / 2 : records / 4, i == 2));
    return 0;
}
