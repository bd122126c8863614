// A page set of the test's own: an anchor with a specification that is on, started.
#pragma once

#include <string>

#include <gtest/gtest.h>

#include "files/support_files.h"
#include "trace/spooling/spool_types.h"

namespace qn::test
{
class PageSet : public testing::Test
{
protected:
    PageSet()
    {
        spool.onoff = 1;
        anchors.bMultipageEnabled = 1;
    }
    ~PageSet() override
    {
        if (head == nullptr) return;
        stop(head);
        head->spool = nullptr;
    }

    // Binds the trace to the specification; nothing is started.
    void prepare(const std::string &name, qn_uint32_t pages, qn_uint32_t requested_size = 196608)
    {
        spool.pages = pages;
        head = anchor_for(folder / name, requested_size);
        head->spool = &spool;
        head->bSpoolProcessed = 1;
    }
    qn_int32_t start_set(const std::string &name, qn_uint32_t pages, qn_uint32_t requested_size = 196608)
    {
        prepare(name, pages, requested_size);
        return start(head);
    }

    // The pages by their numbers, the head is 1.
    trace_anchor_t *page(int number) const
    {
        trace_anchor_t *found = head;
        while (--number > 0) found = found->nextPage;
        return found;
    }

    scratch folder;
    trace_spool_spec_t spool{};
    trace_anchor_t *head = nullptr;
};
} // namespace qn::test
