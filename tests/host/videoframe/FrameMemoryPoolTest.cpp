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

TEST_F(FrameMemoryPoolTest, SizeClassesRoundUpWithBoundedWaste)
{
    // Whole pages up to 32 KiB, then 4 KiB steps, then bounded steps.
    const std::pair<size_t, size_t> classes[] = {{1, 4096},      {4096, 4096},
                                                 {4097, 8192},   {32768, 32768},
                                                 {33000, 36864}, {1920 * 4 * 1080, 8388608}};
    for (const auto& [bytes, sizeClass] : classes)
        EXPECT_EQ(VF::FrameMemoryPool::SizeClassFor(bytes), sizeClass) << bytes;
}

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
    // Whoever lets the frame go last (its holder, the cache evicting it once unpinned, the
    // cache's Clear), its buffer returns to the shared pool and the next frame of its size
    // takes it as it was left, unless a clear is asked for.
    enum Release
    {
        kHolder,
        kEviction,
        kClear
    };
    VF::VideoFrameCache cache(size_t{1} << 20, true, 0);
    const mvxcore::utility::Guid key(7, 7, 7, {7, 7, 7, 7, 7, 7, 7, 7});
    for (const Release release : {kHolder, kEviction, kClear})
    {
        SCOPED_TRACE(int(release));
        Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 90, 50, false);
        const uint64_t reuses = VF::FrameMemoryPool::GetShared().GetStatistics().mReuses;
        FillBytes(*frame, uint8_t(0xA0 + release));
        const void* const memory = frame->GetBaseAddress();
        if (release == kEviction)
            cache.RegisterDependencyOnFrame(key);
        if (release != kHolder)
            cache.InsertIntoCache(frame, key,
                                  release == kEviction ? VF::kCachePriority_Low
                                                       : VF::kCachePriority_High);
        frame.Reset();
        // Pinned, the low frame outlives the allowance of 0 until its dependency goes.
        if (release == kEviction)
        {
            EXPECT_TRUE(cache.RetrieveFromCache(key));
            cache.UnregisterDependencyOnFrame(key);
        }
        if (release == kClear)
            cache.Clear();
        Frame next = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 90, 50, false);
        EXPECT_EQ(next->GetBaseAddress(), memory);
        EXPECT_TRUE(AllBytesAre(*next, uint8_t(0xA0 + release)));
        EXPECT_EQ(VF::FrameMemoryPool::GetShared().GetStatistics().mReuses, reuses + 1);
        if (release != kClear)
            continue;
        const void* const recycled = next->GetBaseAddress();
        next.Reset();
        const Frame cleared = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 90, 50, true);
        EXPECT_EQ(std::pair(cleared->GetBaseAddress(), AllBytesAre(*cleared, 0)),
                  std::pair(recycled, true));
    }
}

} // namespace
