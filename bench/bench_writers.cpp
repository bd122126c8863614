// What a record costs its writer, single-threaded and with 2 and 4 threads, for every kind of record; and the floor for
// a record of the same length. At its end the program prints each writer's ratio to its floor, within this run.
//
//   bench_writers [--benchmark_filter=...] [--benchmark_repetitions=N]
#include <algorithm>
#include <array>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include <benchmark/benchmark.h>
#include <qn_tr.h>

#include "bench/floor.h"

namespace
{
constexpr size_t ring_bytes = 1 << 20;
constexpr const char *component = "BNCH";

std::unique_ptr<qn::bench::floor_ring> floor_of_this_run;

// Disabled by its level: what stays is the test.
tr_detail_level_t levels[1];
const tr_category_description_t categories[1] = {{0, "Bench", 1, 1}};

const std::array<char, 64> block{};
const char *const string_32 = "0123456789abcdef0123456789abcde";

cu_error_t *bench_error()
{
    static char text[] = "bench";
    static cu_error_t error = {17, nullptr, nullptr, 1, 1, text, 0, nullptr};
    return &error;
}

// Called directly, as a client calls it.
template <auto write>
void run_writer(benchmark::State &state)
{
    for (auto _ : state) write();
    state.SetItemsProcessed(state.iterations());
}

struct writer {
    const char *name;
    size_t record_bytes; // of the floor's record
    void (*run)(benchmark::State &);
};

const writer writers[] = {
    {"id", 32, run_writer<[] { tr_record_id_1(component, 7); }>},
    {"values_32", 44, run_writer<[] { tr_record_uint32_2_1(component, 7, 1, 2); }>},
    {"values_64", 52, run_writer<[] { tr_record_uint64_2_1(component, 7, 1, 2); }>},
    {"string", 72, run_writer<[] { tr_record_strings_1(component, 7, 1, string_32); }>},
    {"formatted", 52, run_writer<[] { tr_record_fmt_string_1(component, 7, "%d of %d", 12, 345); }>},
    {"data", 104, run_writer<[] { tr_record_data_1(component, 7, 1, block.data(), static_cast<int>(block.size())); }>},
    {"error", 88, run_writer<[] {
         cu_error_t *error = bench_error();
         tr_record_error_1(component, 7, "function", 12, nullptr, &error);
     }>},
};

void run_floor(benchmark::State &state, size_t bytes)
{
    alignas(8) unsigned char record[256] = {};
    for (auto _ : state) {
        floor_of_this_run->write(record, bytes);
        benchmark::ClobberMemory();
    }
    state.SetItemsProcessed(state.iterations());
}

void run_disabled(benchmark::State &state)
{
    for (auto _ : state) {
        QN_TR_IF(levels, 0, 255, tr_record_id_1(component, 7));
        benchmark::ClobberMemory();
    }
}

// Keeps each figure for the table of ratios while the console shows it.
class ratio_reporter : public benchmark::ConsoleReporter
{
public:
    void ReportRuns(const std::vector<Run> &runs) override
    {
        for (const Run &run : runs)
            if (run.run_type == Run::RT_Iteration)
                figures_[run.benchmark_name()].push_back(run.GetAdjustedRealTime() * static_cast<double>(run.threads));
        ConsoleReporter::ReportRuns(runs);
    }

    void print_ratios()
    {
        std::printf("\n%-12s %8s %12s %12s %7s   (ns per record and thread, medians)\n", "writer", "threads", "writer",
                    "floor", "ratio");
        for (const writer &each : writers)
            for (const char *threads : {"", "/threads:2", "/threads:4"}) {
                const double mine = median(std::string("writer/") + each.name + "/real_time" + threads);
                const double least = median(std::string("floor/") + each.name + "/real_time" + threads);
                if (mine > 0 && least > 0)
                    std::printf("%-12s %8s %12.1f %12.1f %7.2f\n", each.name, threads[0] != '\0' ? threads + 9 : "1",
                                mine, least, mine / least);
            }
    }

private:
    double median(const std::string &name)
    {
        std::vector<double> &values = figures_[name];
        if (values.empty()) return 0;
        std::sort(values.begin(), values.end());
        return values[values.size() / 2];
    }

    std::map<std::string, std::vector<double>> figures_;
};

// A writer and its floor take turns, so that a change of the machine's mood meets both.
void register_benchmarks()
{
    for (const int threads : {1, 2, 4})
        for (const writer &each : writers) {
            auto *writing = benchmark::RegisterBenchmark((std::string("writer/") + each.name).c_str(), each.run);
            auto *floor =
                benchmark::RegisterBenchmark((std::string("floor/") + each.name).c_str(), run_floor, each.record_bytes);
            for (auto *one : {writing, floor}) {
                one->UseRealTime();
                if (threads > 1) one->Threads(threads);
            }
        }
    benchmark::RegisterBenchmark("disabled", run_disabled);
}
} // namespace

int main(int argc, char **argv)
{
    std::string folder = (std::filesystem::temp_directory_path() / "qn_tr_bench.XXXXXX").string();
    if (mkdtemp(folder.data()) == nullptr) return 1;
    setenv("QN_TR_SIZE", std::to_string(ring_bytes).c_str(), 1);
    floor_of_this_run = std::make_unique<qn::bench::floor_ring>((folder + "/floor").c_str(), ring_bytes);
    if (tr_set_filename_1((folder + "/trace").c_str()) != 0) return 1;
    if (tr_register_component_1(component, levels, categories, 1) != 0) return 1;

    std::vector<char *> arguments(argv, argv + argc);
    std::string repetitions = "--benchmark_repetitions=5";
    std::string interleaved = "--benchmark_enable_random_interleaving=true";
    std::string min_time = "--benchmark_min_time=0.05";
    arguments.insert(arguments.begin() + 1, {repetitions.data(), interleaved.data(), min_time.data()});
    int count = static_cast<int>(arguments.size());
    benchmark::Initialize(&count, arguments.data());
    register_benchmarks();
    ratio_reporter reporter;
    benchmark::RunSpecifiedBenchmarks(&reporter);
    reporter.print_ratios();
    tr_term();
    std::filesystem::remove_all(folder);
    return 0;
}
