// A page, or a file, that is copied into a folder, at a time of the test's choosing.
#pragma once

#include <cstring>
#include <ctime>
#include <filesystem>
#include <string>

#include "files/page_set.h"
#include "spooling/spool_support.h"

namespace qn::test
{
class Copying : public PageSet
{
protected:
    void SetUp() override
    {
        std::filesystem::create_directory(copies);
        std::strcpy(spool.dest, copies.c_str());
        ASSERT_EQ(start_set("app.trc", 3), 0);
    }

    // From now on it is that time, local time being three hours east of Greenwich.
    static void be_at(int hour, int minute, int second, int microseconds)
    {
        setenv("TZ", "TEST-3", 1);
        tzset();
        tm local{};
        local.tm_year = 2024 - 1900;
        local.tm_mon = 4;
        local.tm_mday = 1;
        local.tm_hour = hour - 3;
        local.tm_min = minute;
        local.tm_sec = second;
        const time_t seconds = timegm(&local);
        spool_calls().time_of_day = [=](timeval *now) {
            *now = {seconds, microseconds};
            return 0;
        };
    }

    qn_int32_t copy_page(int number)
    {
        element = {};
        element.pAnchor = page(number);
        return copy();
    }
    qn_int32_t copy_file(const std::string &name, const std::string &dest)
    {
        element = {};
        std::strcpy(element.fileName, name.c_str());
        dest_ = dest;
        element.dest = dest_.c_str();
        return copy();
    }
    qn_int32_t copy()
    {
        const qn::tr::mutex_lock inside(spq.mutex);
        return do_spool(&element);
    }

    std::vector<std::string> copied() const { return entries_of(copies); }
    std::string only_copy() const
    {
        const auto names = copied();
        EXPECT_EQ(names.size(), 1U);
        return names.empty() ? "" : names[0];
    }

    std::string copies = folder / "copies";
    sp_q_element_t element{};

private:
    std::string dest_;
};
} // namespace qn::test
