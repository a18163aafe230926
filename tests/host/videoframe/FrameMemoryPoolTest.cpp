#include "VF/FrameMemoryPool.h"

#include "ContractExpect.h"
#include "FrameTestSupport.h"

#include <gtest/gtest.h>

namespace
{

using namespace vftest;

// System allocations, reuses, system releases, buffers pooled, bytes pooled, bytes in use.
auto Counts(const VF::FrameMemoryPool& inPool)
{
    const VF::FrameMemoryPoolStatistics s = inPool.GetStatistics();
    return std::tuple(s.mSystemAllocations, s.mReuses, s.mSystemReleases, s.mBuffersPooled,
                      s.mBytesPooled, s.mBytesInUse);
}
using Expected = std::tuple<uint64_t, uint64_t, uint64_t, uint64_t, uint64_t, uint64_t>;

using FrameMemoryPoolTest = ::testing::Test;

TEST_F(FrameMemoryPoolTest, CapTrimsLeastRecentlyReturnedFirstAndRefusesLargerBuffers)
{
    VF::FrameMemoryPool pool(8192);
    const VF::PoolBuffer a = pool.Acquire(4096), b = pool.Acquire(4096), c = pool.Acquire(4096);
    pool.Return(a);
    pool.Return(b);
    pool.Return(c); // a, the oldest, goes back to the system
    EXPECT_EQ(Counts(pool), (Expected{3, 0, 1, 2, 8192, 0}));
    // The most recent return is handed out first, then the next.
    EXPECT_EQ(pool.Acquire(4096).mData, c.mData);
    EXPECT_EQ(pool.Acquire(4096).mData, b.mData);
    EXPECT_EQ(std::get<1>(Counts(pool)), 2u);
    pool.Return(c);
    pool.Return(b);
    // A buffer larger than the cap is not kept; lowering the cap trims c, returned first.
    pool.Return(pool.Acquire(40000));
    EXPECT_EQ(Counts(pool), (Expected{4, 2, 2, 2, 8192, 0}));
    pool.SetByteCap(4096);
    EXPECT_EQ(std::get<4>(Counts(pool)), 4096u);
    pool.Trim();
    EXPECT_EQ(Counts(pool), (Expected{4, 2, 4, 0, 0, 0}));
    // Zero bytes is a contract error; returning an empty buffer is ignored.
    EXPECT_INPUT_CONTRACT(pool.Acquire(0), "inBytes > 0");
    pool.Return(VF::PoolBuffer{});
}

} // namespace
