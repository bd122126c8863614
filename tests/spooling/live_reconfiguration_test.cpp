// The configuration file replaced hundreds of times while four threads write: rings grow, shrink, are switched off and
// lose their specification under the writers.
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <functional>

#include <gtest/gtest.h>
#include <sched.h>

#include "spooling/live_writers.h"
#include "spooling/soak_trace.h"
#include "support/last_error.h"
#include "support/private_var.h"
#include "support/scratch.h"
#include "trace/trace.h"

namespace
{
using namespace qn::test;
namespace fs = std::filesystem;

constexpr const char *configuration = "/var/qn/cfg/trace.conf";
constexpr const char *live_folder = "/var/live";
constexpr const char *spool_folder = "/var/spool";
constexpr int longest_queue = 2;          // pages; every ring has at least 8
constexpr uint64_t records_a_turn = 4000; // a page and a bit

std::string section(uint32_t pages, const std::string &spooling = "ON", const std::string &pattern = ".*/live.trc")
{
    return "live:\n  pat = " + pattern + "\n  spooling = " + spooling + "\n  dest = " + spool_folder +
           "\n  pages = " + std::to_string(pages) + "\n  size = 262144\n";
}

// Puts a new file in the place of the old one, in one step; the empty text stands for no file.
void replace_configuration(const std::string &text)
{
    const std::string fresh = std::string(configuration) + ".new";
    if (text.empty()) {
        fs::remove(configuration);
    } else {
        write_file(fresh, text);
        fs::rename(fresh, configuration);
    }
}

// Has the configuration read again, and waits until the spool thread has begun to.
void reconfigure_now()
{
    tr_configure_1();
    while (qn::tr::configuration_is_forced()) sched_yield();
}

// Pages of the default trace's ring.
uint32_t ring_pages()
{
    const qn::tr::global_lock global;
    const qn::tr::anchor_set_lock set(&anchors);
    uint32_t pages = 0;
    qn::tr::for_each_page(&anchors, [&](const trace_anchor_t *) { ++pages; });
    return pages;
}

void reconfigure_to(uint32_t pages)
{
    replace_configuration(section(pages));
    reconfigure_now();
    while (ring_pages() != pages) sched_yield();
}

// The body finds the default trace started with 8 pages, in a /var of its own.
void in_configured_var(const std::function<void()> &body)
{
    EXPECT_TRUE(in_private_var([&] {
        unsetenv("QN_TR_SPOOL");
        fs::create_directories(fs::path(configuration).parent_path());
        fs::create_directory(live_folder);
        replace_configuration(section(8));
        EXPECT_EQ(tr_set_filename_1((std::string(live_folder) + "/live.trc").c_str()), 0);
        client component("LIVE");
        EXPECT_EQ(component.register_now(), 0);
        EXPECT_EQ(ring_pages(), 8U);
        body();
        tr_term();
        return !testing::Test::HasFailure();
    }));
}

TEST(Reconfiguration, ThatGrowsAndShrinksTheRingLosesNothing)
{
    in_configured_var([] {
        live_writers writers(longest_queue);
        for (uint32_t turn = 0; turn < RECONFIGURATIONS; ++turn) {
            writers.let_write(records_a_turn);
            replace_configuration(section(8 + turn * 7 % 13));
            reconfigure_now();
            writers.wait_for(turn % 4 * 1000);
        }
        const auto written = writers.end();
        wait_for_queue(0);
        const auto pages = pages_written(live_folder, spool_folder);
        for (const page_file &page : pages) ASSERT_EQ(overwritten_before(page, page.image()), 0U) << page.path;
        expect_all(pages, written);
    });
}

TEST(Reconfiguration, OfEveryKindHarmsNoWriter)
{
    const std::vector<std::string> texts = {
        section(8),
        section(20),
        section(9),
        section(12, "OFF"),
        {},
        section(30),
        "pat = \x7f\n?:=\n",
        section(10),
        section(16, "ON", ".*/other.trc"), // the running trace loses its specification
        section(11),
        section(8, "OFF"),
        "\n",
    };
    in_configured_var([&] {
        live_writers writers;
        for (uint32_t turn = 0; turn < RECONFIGURATIONS; ++turn) {
            writers.let_write(records_a_turn);
            replace_configuration(texts[turn * 5 % texts.size()]);
            reconfigure_now();
            writers.wait_for(turn % 4 * 1000);
        }
        const auto written = writers.end();
        reconfigure_to(13);
        wait_for_queue(0);
        expect_sound(pages_written(live_folder, spool_folder));
        expect_next_batch(written, longest_queue, live_folder, spool_folder);
    });
}

// Several replacements may come between two looks at the file.
TEST(Reconfiguration, AskedForByEverybodyAtOnceHarmsNobody)
{
    in_configured_var([] {
        live_writers writers(longest_queue);
        in_threads(3, [](uint32_t thread) {
            for (uint32_t turn = 0; turn < RECONFIGURATIONS; ++turn) {
                if (thread == 0) replace_configuration(section(8 + turn % 9));
                tr_configure_1();
                qn_int32_t count = 0;
                tr_mini_spooling_anchor_t *status = nullptr;
                EXPECT_EQ(tr_get_current_spooling_status_1(&count, &status), 0);
                EXPECT_EQ(count, 1);
                tr_release_spool_info_1(count, status);
            }
        });
        const auto written = writers.end();
        reconfigure_to(10);
        wait_for_queue(0);
        expect_all(pages_written(live_folder, spool_folder), written);
    });
}
} // namespace
