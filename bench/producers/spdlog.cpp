// spdlog: a file written through stdio's buffer; a file that is flushed after every record; or its asynchronous logger,
// a queue that a thread in the background writes out, where the oldest records give way when it is full.
#include "bench/producers/producer.h"

#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string_view>

#include <spdlog/async.h>
#include <spdlog/sinks/basic_file_sink.h>
#include <spdlog/spdlog.h>

namespace
{
using namespace qn::bench;

class spdlog_logger
{
public:
    static void add_options(CLI::App &app, options &all)
    {
        app.add_option("--sink", all.sink, "how records reach the file")
            ->check(CLI::IsMember({"file", "flush", "async"}));
    }

    explicit spdlog_logger(const options &all)
    {
        const std::string file = all.folder + "/spdlog";
        if (all.sink == "async") {
            spdlog::init_thread_pool(8192, 1);
            logger_ = spdlog::basic_logger_mt<spdlog::async_factory_nonblock>("bench", file);
        } else {
            logger_ = spdlog::basic_logger_mt("bench", file);
        }
        if (all.sink == "flush") logger_->flush_on(spdlog::level::info);
    }

    template <kind K>
    void write(unsigned)
    {
        if constexpr (K == kind::disabled)
            logger_->debug("{}", record_id);
        else if constexpr (K == kind::id)
            logger_->info("{}", record_id);
        else if constexpr (K == kind::values)
            logger_->info("{} {} {}", record_id, first_value, second_value);
        else if constexpr (K == kind::string)
            logger_->info("{} {}", record_id, string_of_32);
        else if constexpr (K == kind::formatted)
            logger_->info("{} {} of {}", record_id, first_number, second_number);
        else
            logger_->info("{} {}", record_id, std::string_view(block.data(), block.size()));
    }

private:
    std::shared_ptr<spdlog::logger> logger_;
};
} // namespace

int main(int argc, char **argv) { return produce<spdlog_logger>(argc, argv); }
