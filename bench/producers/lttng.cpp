// LTTng-UST. Whoever starts this program has a session ready: bench/lttng_session.py.
#include "bench/producers/lttng_events.h"

#include <lttng/tracef.h>

#include "bench/producers/producer.h"

namespace
{
using namespace qn::bench;

class lttng_tracer
{
public:
    static void add_options(CLI::App &, options &) {}

    explicit lttng_tracer(const options &) {}

    template <kind K>
    void write(unsigned)
    {
        if constexpr (K == kind::disabled)
            lttng_ust_tracepoint(qn_bench, off, record_id);
        else if constexpr (K == kind::id)
            lttng_ust_tracepoint(qn_bench, id, record_id);
        else if constexpr (K == kind::values)
            lttng_ust_tracepoint(qn_bench, values, record_id, first_value, second_value);
        else if constexpr (K == kind::string)
            lttng_ust_tracepoint(qn_bench, string, record_id, string_of_32);
        else if constexpr (K == kind::formatted)
            lttng_ust_tracef(format, first_number, second_number);
        else
            lttng_ust_tracepoint(qn_bench, data, record_id, block.data());
    }
};
} // namespace

int main(int argc, char **argv) { return produce<lttng_tracer>(argc, argv); }
