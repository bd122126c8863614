// glog, to a file: every record is formatted and goes through stdio's buffer; nothing is flushed for half a minute.
#include "bench/producers/producer.h"

#include <string_view>

#include <glog/logging.h>

namespace
{
using namespace qn::bench;

class glog_logger
{
public:
    static void add_options(CLI::App &, options &) {}

    explicit glog_logger(const options &all)
    {
        FLAGS_logtostderr = false;
        google::InitGoogleLogging("bench");
        google::SetLogDestination(google::INFO, (all.folder + "/glog.").c_str());
    }
    ~glog_logger() { google::ShutdownGoogleLogging(); }

    template <kind K>
    void write(unsigned)
    {
        if constexpr (K == kind::disabled)
            VLOG(9) << record_id;
        else if constexpr (K == kind::id)
            LOG(INFO) << record_id;
        else if constexpr (K == kind::values)
            LOG(INFO) << record_id << ' ' << first_value << ' ' << second_value;
        else if constexpr (K == kind::string)
            LOG(INFO) << record_id << ' ' << string_of_32;
        else if constexpr (K == kind::formatted)
            LOG(INFO) << record_id << ' ' << first_number << " of " << second_number;
        else
            LOG(INFO) << record_id << ' ' << std::string_view(block.data(), block.size());
    }
};
} // namespace

int main(int argc, char **argv) { return produce<glog_logger>(argc, argv); }
