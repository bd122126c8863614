// Tracing through a table that somebody lends, or nobody.
#include <atomic>
#include <cstdio>
#include <string>
#include <thread>
#include <vector>

#include <cu_tr_proxy.h>
#include <gtest/gtest.h>

namespace
{
std::atomic<int> flushes{0};
std::string written;

qn_int32_t count_flush()
{
    ++flushes;
    return 32;
}

#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral" // it is somebody else's format
qn_int32_t keep_text(const qn_char_t *pCompId, qn_uint32_t traceId, const qn_char_t *pFormat, va_list arguments)
{
    char text[100];
    std::vsnprintf(text, sizeof text, pFormat, arguments);
    written = std::string(pCompId) + "/" + std::to_string(traceId) + "/" + text;
    return 33;
}
#pragma GCC diagnostic pop

constexpr tr_proxy_func_table_t both{.p_tr_flush = count_flush, .p_tr_record_vfmt_string = keep_text};
constexpr tr_proxy_func_table_t neither{.p_tr_flush = nullptr, .p_tr_record_vfmt_string = nullptr};

TEST(TraceProxy, DoesNothingWithoutATable)
{
    EXPECT_EQ(cu_trp_flush_1(), 0);
    EXPECT_EQ(cu_trp_printf_1("comp", 1, "%s %d", "text", 2), 0);
    EXPECT_EQ(flushes, 0);
    EXPECT_EQ(written, "");
}

TEST(TraceProxy, FlushesThroughTheTable)
{
    EXPECT_EQ(cu_trp_register(&both), 0);
    EXPECT_EQ(cu_trp_flush_1(), 32);
    EXPECT_EQ(flushes, 1);
}

TEST(TraceProxy, WritesThroughTheTableWithItsInserts)
{
    EXPECT_EQ(cu_trp_register(&both), 0);
    EXPECT_EQ(cu_trp_printf_1("comp", 42, "%s %d %.1f", "text", 2, 0.5), 33);
    EXPECT_EQ(written, "comp/42/text 2 0.5");
}

TEST(TraceProxy, DoesNothingAfterTheTableWasTakenAway)
{
    cu_trp_register(&both);
    EXPECT_EQ(cu_trp_register(nullptr), 0);
    EXPECT_EQ(cu_trp_flush_1(), 0);
    EXPECT_EQ(cu_trp_printf_1("comp", 1, "x"), 0);
    EXPECT_EQ(flushes, 0);
}

TEST(TraceProxy, PassesOverFunctionsThatTheTableDoesNotHave)
{
    cu_trp_register(&neither);
    EXPECT_EQ(cu_trp_flush_1(), 0);
    EXPECT_EQ(cu_trp_printf_1("comp", 1, "x"), 0);
}

TEST(TraceProxy, TablesChangeBesideCalls)
{
    std::atomic<bool> stop{false};
    std::vector<std::thread> callers;
    std::atomic<int> wrong{0};
    for (int t = 0; t < 3; ++t)
        callers.emplace_back([&] {
            while (!stop) {
                const qn_int32_t result = cu_trp_flush_1();
                if (result != 0 && result != 32) ++wrong;
            }
        });
    for (int i = 0; i < 2000; ++i) cu_trp_register(i % 3 == 0 ? &both : i % 3 == 1 ? &neither : nullptr);
    stop = true;
    for (std::thread &caller : callers) caller.join();
    EXPECT_EQ(wrong, 0);
}
} // namespace
