#include "VF/FrameMemoryPool.h"

#include "ContractExpect.h"
#include "FrameTestSupport.h"
#include "VF/SharedVideoFrameCache.h"

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

TEST_F(FrameMemoryPoolTest, ReleasedFrameBufferServesTheNextFrameOfItsSizeWithoutAFill)
{
    // Whoever lets the frame go last (its holder; the cache, evicting it from an allowance of
    // 0 once unpinned, or clearing), its buffer returns to the shared pool and the next frame
    // of its size takes it as it was left; asked for, a clear zeroes it.
    VF::VideoFrameCache cache(size_t{1} << 20, true, 0);
    const mvxcore::utility::Guid key(7, 7, 7, {7, 7, 7, 7, 7, 7, 7, 7});
    for (const int release : {0, 1, 2})
    {
        SCOPED_TRACE(release);
        Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 90, 50, false);
        const uint64_t reuses = VF::FrameMemoryPool::GetShared().GetStatistics().mReuses;
        FillBytes(*frame, uint8_t(0xA0 + release));
        const void* const memory = frame->GetBaseAddress();
        cache.RegisterDependencyOnFrame(key);
        if (release != 0)
            cache.InsertIntoCache(frame, key, release == 1 ? 0 : 10);
        frame.Reset();
        EXPECT_EQ(bool(cache.RetrieveFromCache(key)), release != 0); // pinned, it stays
        cache.UnregisterDependencyOnFrame(key);
        if (release == 2)
            cache.Clear();
        Frame next = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 90, 50, release == 2);
        EXPECT_EQ(std::tuple(next->GetBaseAddress(),
                             AllBytesAre(*next, release == 2 ? 0 : 0xA0 + release),
                             VF::FrameMemoryPool::GetShared().GetStatistics().mReuses),
                  std::tuple(memory, true, reuses + 1));
    }
}

} // namespace
