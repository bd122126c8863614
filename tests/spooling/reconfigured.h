// A process whose configuration is read again, in a /var of its own and without a spool thread.
#pragma once

#include <algorithm>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace qn::test
{
class Reconfigured : public testing::Test
{
protected:
    // The body begins with those patterns in the default anchor's list.
    void run(const std::vector<std::string> &patterns, const std::function<void()> &body)
    {
        expect_in_private_var([&] {
            pthread_once(&trace_global_data_once, initialize_trace_global_data);
            // The list is this one's from here on: the environment or the file is not read into it again.
            pthread_once(&sp_read_cfg, [] {});
            specifications before;
            for (const std::string &pattern : patterns) before.add(pattern);
            install(before);
            const no_spool_thread none;
            body();
            spool_calls() = {};
        });
    }

    // A configuration file with a section for each pattern, whose pages are recycled.
    static std::string traces(const std::vector<std::string> &patterns)
    {
        std::string text;
        for (const std::string &pattern : patterns)
            text += section("traces" + std::to_string(text.size()), {"pat = " + pattern, "spooling = ON"});
        return text;
    }

    static std::vector<std::string> list()
    {
        std::vector<std::string> patterns;
        for (const trace_spool_spec_t *spec = anchors.pFirstSpoolSpec; spec != nullptr; spec = spec->pNext)
            patterns.emplace_back(spec->pattern);
        return patterns;
    }
    static std::vector<std::string> ring_of(trace_anchor_t *head)
    {
        std::vector<std::string> names;
        qn::tr::for_each_page(head, [&](const trace_anchor_t *page) { names.emplace_back(page->fileName); });
        return names;
    }
};
} // namespace qn::test
