// Start records that are overwritten: the file's header takes over whose they were, so that what is left of that
// process's records can still be dated.
#include <unistd.h>

#include <gtest/gtest.h>

#include "recording/one_trace.h"
#include "recording/ring_layout.h"

using namespace qn::test;

namespace
{
constexpr uint32_t small_file = 4096;

void make_start_record(size_t at, uint32_t pid, uint64_t time_base)
{
    poke_u16(at + 4, 16);
    poke_u32(at + 32, pid);
    poke_u64(at + 36, time_base);
    poke_u64(at + 44, time_base + 1);
}

// The file's header describes nobody.
void clear_header_identity()
{
    poke_u64(24, 0);
    poke_u64(32, 0);
    poke_u32(48, 0);
}

void expect_header_identity(const one_trace &trace, uint32_t pid, uint64_t time_base)
{
    const trace_image image = trace.image();
    EXPECT_EQ(image.pid(), pid);
    EXPECT_EQ(image.u64(24), time_base);
    EXPECT_EQ(image.u64(32), pid == 0 ? 0 : time_base + 1);
}
} // namespace

TEST(OverwrittenStartRecord, GivesItsIdentityToTheHeader)
{
    const one_trace trace(small_file);
    lay_out({{52}, {3844}}, 0);
    make_start_record(200, 77, 0x1111222233334444);
    clear_header_identity();
    allocate(32);
    expect_header_identity(trace, 77, 0x1111222233334444);
}

TEST(OverwrittenStartRecord, DoesSoWhenItIsOnlyConsumedForTheRest)
{
    const one_trace trace(small_file);
    lay_out({{40}, {52}, {3804}}, 0);
    make_start_record(240, 77, 500);
    clear_header_identity();
    allocate(32);
    expect_header_identity(trace, 77, 500);
}

TEST(OverwrittenStartRecord, IsTheLastOfSeveral)
{
    const one_trace trace(small_file);
    lay_out({{52}, {52}, {52}, {3740}}, 0);
    make_start_record(200, 71, 100);
    make_start_record(252, 72, 200);
    make_start_record(304, 73, 300);
    clear_header_identity();
    allocate(100); // two of the three, and the third for the rest's header
    expect_header_identity(trace, 73, 300);
}

TEST(OverwrittenStartRecord, CountsInTheFillerOfAWrapToo)
{
    const one_trace trace(small_file);
    lay_out({{3844}, {52}}, 1);
    make_start_record(4044, 77, 500);
    clear_header_identity();
    EXPECT_EQ(allocate(100).offset, 200U);
    expect_header_identity(trace, 77, 500);
}

TEST(OverwrittenStartRecord, IsNotOneThatIsLeft)
{
    const one_trace trace(small_file);
    lay_out({{64}, {52}, {3780}}, 0);
    make_start_record(264, 77, 500);
    clear_header_identity();
    allocate(32);
    expect_header_identity(trace, 0, 0);
}

TEST(OverwrittenStartRecord, IsNoRestartRecord)
{
    const one_trace trace(small_file);
    lay_out({{64}, {3832}}, 0);
    make_start_record(200, 77, 500);
    poke_u16(204, 19);
    clear_header_identity();
    allocate(32);
    expect_header_identity(trace, 0, 0);
}

TEST(OverwrittenStartRecord, IsTheOneOfAnEarlierProcess)
{
    const one_trace trace(small_file);
    poke_u32(200 + 32, 4242); // as if another process had started the file first
    poke_u64(200 + 36, 1234);
    EXPECT_EQ(trace.image().pid(), static_cast<uint32_t>(getpid()));
    for (uint32_t i = 0; i < 3896 / 32; ++i) EXPECT_EQ(tr_record_id_1("TEST", i), 0);
    const trace_image image = trace.image();
    EXPECT_TRUE(image.records_of(16).empty());
    EXPECT_EQ(image.pid(), 4242U);
    EXPECT_EQ(image.u64(24), 1234U);
}
