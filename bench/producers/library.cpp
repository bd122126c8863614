// This library, as a client uses it. Beside what is recorded there may be idle trace files, components and level
// specifications; several trace files that the threads are spread over; or a page set whose pages are copied.
#include "bench/producers/producer.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <vector>

#include <qn_tr.h>

namespace
{
using namespace qn::bench;

constexpr const char *component = "BNCH";

void want(qn_int32_t status, const char *what)
{
    if (status == 0) return;
    std::fprintf(stderr, "%s: %d\n", what, static_cast<int>(status));
    std::exit(1);
}

class library
{
public:
    static void add_options(CLI::App &app, options &all)
    {
        app.add_option("--files", all.files, "trace files that the threads are spread over");
        app.add_option("--anchors", all.anchors, "other trace files");
        app.add_option("--components", all.components, "other components");
        app.add_option("--specifications", all.specifications, "level specifications that match nothing here");
        app.add_option("--pages", all.pages,
                       "pages of 256 KiB that the trace has; they are copied while records are written");
    }

    explicit library(const options &all)
        : levels_(all.files), other_levels_(std::max(all.components, all.anchors)), several_files_(all.files > 1)
    {
        const std::string trace = all.folder + "/trace";
        const std::string bytes = std::to_string(all.ring);
        setenv("QN_TR_SIZE", bytes.c_str(), 1);
        setenv("QN_TR_SPOOL", spool_specification(all, trace).c_str(), 1);
        for (unsigned i = 1; i < all.files; ++i) {
            const std::string file = trace + std::to_string(i);
            want(tr_set_file_map_1(file.c_str(), ("BNCH:File" + std::to_string(i)).c_str()), "tr_set_file_map_1");
            want(tr_set_file_size_1(file.c_str(), static_cast<qn_uint32_t>(all.ring)), "tr_set_file_size_1");
        }
        for (unsigned i = 0; i < all.anchors; ++i) {
            const std::string file = trace + "_idle" + std::to_string(i);
            want(tr_set_file_map_1(file.c_str(), (other_component(i) + ":Other").c_str()), "tr_set_file_map_1");
            want(tr_set_file_size_1(file.c_str(), 65536), "tr_set_file_size_1");
        }
        for (unsigned i = 0; i < all.specifications; ++i)
            want(tr_set_trace_levels_1(("NONE" + std::to_string(i) + ":None=1").c_str()), "tr_set_trace_levels_1");
        want(tr_set_filename_1(trace.c_str()), "tr_set_filename_1");
        register_components(all.files);
    }
    library(const library &) = delete;
    library &operator=(const library &) = delete;
    ~library() { tr_term(); }

    template <kind K>
    void write(unsigned thread)
    {
        if constexpr (K == kind::disabled) {
            QN_TR_IF(levels_.data(), 0, 255, tr_record_id_1(component, record_id));
            asm volatile("" ::: "memory");
        } else if (several_files_) {
            tr_ms_record_values_64_1(component, record_id, tokens_[thread % levels_.size()], 2, first_value,
                                     second_value);
        } else if constexpr (K == kind::id) {
            tr_record_id_1(component, record_id);
        } else if constexpr (K == kind::values) {
            tr_record_uint64_2_1(component, record_id, first_value, second_value);
        } else if constexpr (K == kind::string) {
            tr_record_strings_1(component, record_id, 1, string_of_32);
        } else if constexpr (K == kind::formatted) {
            tr_record_fmt_string_1(component, record_id, format, first_number, second_number);
        } else {
            tr_record_data_1(component, record_id, 1, block.data(), static_cast<int>(block.size()));
        }
    }

private:
    static std::string spool_specification(const options &all, const std::string &trace)
    {
        if (all.pages == 0) return "none";
        return trace + ":ON:" + std::to_string(all.pages) + ":" + all.folder + "/spool";
    }

    static std::string other_component(unsigned number) { return std::to_string(1000 + number); }

    // Category i is mapped to file i.
    void register_components(unsigned files)
    {
        std::vector<std::string> names;
        std::vector<tr_category_description_t> categories;
        for (unsigned i = 0; i < files; ++i) names.push_back("File" + std::to_string(i));
        for (unsigned i = 0; i < files; ++i) categories.push_back({i, names[i].c_str(), 1, 1});
        want(tr_ms_register_component_1(component, levels_.data(), categories.data(), files, &tokens_),
             "tr_ms_register_component_1");
        static const tr_category_description_t other[] = {{0, "Other", 1, 1}};
        for (unsigned i = 0; i < other_levels_.size(); ++i)
            want(tr_register_component_1(other_component(i).c_str(), &other_levels_[i], other, 1),
                 "tr_register_component_1");
    }

    std::vector<tr_detail_level_t> levels_, other_levels_;
    tr_file_token_t *tokens_ = nullptr;
    bool several_files_;
};
} // namespace

int main(int argc, char **argv) { return produce<library>(argc, argv); }
