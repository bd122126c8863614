// Whatever a program calls, in whatever order: every queued page is full, and queued once.
#include <filesystem>
#include <map>
#include <random>

#include <gtest/gtest.h>

#include "spooling/reconfigured.h"

namespace
{
using namespace qn::test;

// A program with a default trace and another one, both page sets, whose spool thread makes a pass when it is told to.
class Program
{
public:
    explicit Program(unsigned seed) : random_(seed)
    {
        configure(8);
        EXPECT_EQ(tr_set_filename_1("/var/t/default.trc"), 0);
        EXPECT_EQ(tr_set_file_map_1("/var/t/other.trc", "OTHR:c0"), 0);
        register_both();
    }

    void do_something()
    {
        switch (below(24)) {
        case 0: return change_configuration();
        case 1: return remove_configuration();
        case 2: return tr_configure_1();
        case 3: return resize();
        case 4: return stop_and_start();
        case 5: return rename_default();
        case 6: return register_again();
        case 7: return copy_a_file();
        case 8: tr_flush_1(); return;
        case 9: tr_pin_pages_1(static_cast<int>(below(2))); return;
        case 10:
        case 11: return spool_thread_pass();
        default: return fill_pages();
        }
    }

    // What the spool thread might look at next.
    static void expect_queue_in_order()
    {
        std::map<const trace_anchor_t *, int> pages;
        for (const sp_q_element_t *element = spq.pFirst; element != nullptr; element = element->pNext) {
            if (element->pAnchor == nullptr) continue;
            EXPECT_EQ(++pages[element->pAnchor], 1) << element->pAnchor->fileName << " is queued twice";
            ASSERT_NE(element->pAnchor->pMap, nullptr) << element->pAnchor->fileName;
            EXPECT_EQ(element->pAnchor->pMap[192], 2) << element->pAnchor->fileName;
        }
    }
    static size_t queued() { return static_cast<size_t>(spq.cnt); }

private:
    unsigned below(unsigned limit) { return static_cast<unsigned>(random_() % limit); }

    void register_both()
    {
        EXPECT_EQ(default_.register_now(), 0);
        EXPECT_EQ(other_.register_now(), 0);
    }
    void fill_pages()
    {
        const bool to_default = below(2) == 0;
        for (unsigned records = below(60000); records > 0; --records)
            EXPECT_EQ(
                to_default ? tr_record_id_1("DFLT", records) : tr_ms_record_id_1("OTHR", records, other_.tokens[0]), 0);
    }
    // 0: no section for the traces.
    void configure(unsigned pages)
    {
        const std::string lines = "pages = " + std::to_string(pages);
        write_conf(pages == 0 ? "" : section("traces", {"pat = .*.trc", lines, "size = 262144", "spooling = ON"}),
                   ++modified_);
        configure_if_necessary();
    }
    void change_configuration() { configure(below(8) == 0 ? 0 : 8 + below(4)); }
    void remove_configuration()
    {
        std::filesystem::remove(conf_file);
        configure_if_necessary();
    }
    void resize()
    {
        const qn_uint32_t size = 65536 * (1 + below(4));
        below(2) == 0 ? tr_set_size_1(size) : tr_set_file_size_1("/var/t/other.trc", size);
    }
    void stop_and_start()
    {
        if (below(2) == 0)
            tr_set_filename_1(nullptr);
        else
            tr_set_trace_levels_1("*:*=0");
        tr_set_trace_levels_1("*:*=5");
    }
    void rename_default() { tr_set_filename_1(below(2) == 0 ? "/var/t/renamed.trc" : "/var/t/default.trc"); }
    void register_again()
    {
        for (client *component : {&default_, &other_}) EXPECT_EQ(tr_unregister_component_1(component->id.c_str()), 0);
        register_both();
    }
    void copy_a_file()
    {
        write_file("/var/t/file", "contents");
        EXPECT_EQ(tr_copy_file_1("/dev/null", "/var/t/file", static_cast<int>(below(2))), 0);
    }
    static void spool_thread_pass()
    {
        configure_if_necessary();
        const qn::tr::mutex_lock queue(spq.mutex);
        spool_dequeue_last_and_spool_inside_spq(&spq);
    }

    std::mt19937 random_;
    long modified_ = 1000;
    client default_{"DFLT"};
    client other_{"OTHR"};
};

class AnySequenceOfCalls : public testing::TestWithParam<unsigned>
{
};

TEST_P(AnySequenceOfCalls, HasOnlyFullPagesInTheQueue)
{
    expect_in_private_var([] {
        const no_spool_thread none;
        guard_mappings();
        std::filesystem::create_directory("/var/t");
        Program program(GetParam());
        size_t most_queued = 0;
        for (int step = 0; step < 400 && !testing::Test::HasFailure(); ++step) {
            program.do_something();
            Program::expect_queue_in_order();
            most_queued = std::max(most_queued, Program::queued());
        }
        EXPECT_GE(most_queued, 3U) << "there was something to be seen";
        spool_calls() = {};
        tr_term();
    });
}

INSTANTIATE_TEST_SUITE_P(Seeds, AnySequenceOfCalls, testing::Range(1U, 9U));
} // namespace
