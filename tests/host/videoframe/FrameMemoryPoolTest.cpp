#include "VF/FrameMemoryPool.h"

#include "ContractExpect.h"
#include "VF/VideoFrame.h"

#include <cstring>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

namespace mt = mvxmediatypes;

class FrameMemoryPoolTest : public ::testing::Test
{
};

TEST_F(FrameMemoryPoolTest, SizeClassesRoundUpWithBoundedWaste)
{
    EXPECT_EQ(VF::FrameMemoryPool::SizeClassFor(1), 4096u);
    EXPECT_EQ(VF::FrameMemoryPool::SizeClassFor(4096), 4096u);
    EXPECT_EQ(VF::FrameMemoryPool::SizeClassFor(4097), 8192u);
    EXPECT_EQ(VF::FrameMemoryPool::SizeClassFor(32768), 32768u);
    EXPECT_EQ(VF::FrameMemoryPool::SizeClassFor(33000), 36864u); // 32 KiB + 4 KiB steps
    EXPECT_EQ(VF::FrameMemoryPool::SizeClassFor(1920 * 4 * 1080), 8388608u);
    for (size_t bytes = 40000; bytes < 100'000'000; bytes = bytes * 3 / 2 + 7)
    {
        const size_t sizeClass = VF::FrameMemoryPool::SizeClassFor(bytes);
        EXPECT_GE(sizeClass, bytes);
        EXPECT_LE(sizeClass - bytes, bytes / 8);
    }
}

TEST_F(FrameMemoryPoolTest, ReturnedBufferIsReusedForTheSameClass)
{
    VF::FrameMemoryPool pool(size_t{64} << 20);
    VF::PoolBuffer first = pool.Acquire(100'000);
    ASSERT_NE(first.mData, nullptr);
    EXPECT_EQ(reinterpret_cast<uintptr_t>(first.mData) % 64, 0u);
    EXPECT_EQ(first.mCapacity, VF::FrameMemoryPool::SizeClassFor(100'000));
    pool.Return(first);
    auto statistics = pool.GetStatistics();
    EXPECT_EQ(statistics.mBuffersPooled, 1u);
    EXPECT_EQ(statistics.mBytesPooled, first.mCapacity);
    EXPECT_EQ(statistics.mBytesInUse, 0u);

    // Another size of the same class gets the same buffer.
    VF::PoolBuffer second = pool.Acquire(99'000);
    EXPECT_EQ(second.mData, first.mData);
    statistics = pool.GetStatistics();
    EXPECT_EQ(statistics.mSystemAllocations, 1u);
    EXPECT_EQ(statistics.mReuses, 1u);
    EXPECT_EQ(statistics.mBuffersPooled, 0u);
    EXPECT_EQ(statistics.mBytesInUse, second.mCapacity);

    // A different class does not.
    VF::PoolBuffer other = pool.Acquire(10'000);
    EXPECT_NE(other.mData, second.mData);
    EXPECT_EQ(pool.GetStatistics().mSystemAllocations, 2u);
    pool.Return(second);
    pool.Return(other);
}

TEST_F(FrameMemoryPoolTest, CapTrimsLeastRecentlyReturnedFirst)
{
    VF::FrameMemoryPool pool(8192);
    VF::PoolBuffer a = pool.Acquire(4096);
    VF::PoolBuffer b = pool.Acquire(4096);
    VF::PoolBuffer c = pool.Acquire(4096);
    void* const bData = b.mData;
    void* const cData = c.mData;
    pool.Return(a);
    pool.Return(b);
    pool.Return(c); // a, the oldest, goes back to the system
    auto statistics = pool.GetStatistics();
    EXPECT_EQ(statistics.mBytesPooled, 8192u);
    EXPECT_EQ(statistics.mSystemReleases, 1u);
    // The most recent return is handed out first, then the next.
    EXPECT_EQ(pool.Acquire(4096).mData, cData);
    VF::PoolBuffer next = pool.Acquire(4096);
    EXPECT_EQ(next.mData, bData);
    EXPECT_EQ(pool.GetStatistics().mReuses, 2u);
    pool.Return(VF::PoolBuffer{cData, 4096});
    pool.Return(next);
}

TEST_F(FrameMemoryPoolTest, BufferLargerThanCapIsNotKeptAndLoweringTheCapTrims)
{
    VF::FrameMemoryPool pool(16384);
    pool.Return(pool.Acquire(40000));
    EXPECT_EQ(pool.GetStatistics().mBuffersPooled, 0u);
    EXPECT_EQ(pool.GetStatistics().mSystemReleases, 1u);
    VF::PoolBuffer a = pool.Acquire(4096);
    VF::PoolBuffer b = pool.Acquire(8192);
    pool.Return(a);
    pool.Return(b);
    EXPECT_EQ(pool.GetStatistics().mBytesPooled, 12288u);
    pool.SetByteCap(8192);
    EXPECT_EQ(pool.GetStatistics().mBytesPooled, 8192u); // a (older) left
    pool.Trim();
    EXPECT_EQ(pool.GetStatistics().mBytesPooled, 0u);
    EXPECT_EQ(pool.GetStatistics().mBuffersPooled, 0u);
}

TEST_F(FrameMemoryPoolTest, ZeroBytesIsAContractErrorAndEmptyReturnIsIgnored)
{
    VF::FrameMemoryPool pool(8192);
    EXPECT_INPUT_CONTRACT(pool.Acquire(0), "inBytes > 0");
    pool.Return(VF::PoolBuffer{});
    EXPECT_EQ(pool.GetStatistics().mBuffersPooled, 0u);
}

TEST_F(FrameMemoryPoolTest, ConcurrentAcquireAndReturnKeepExactCounts)
{
    VF::FrameMemoryPool pool(size_t{256} << 20);
    constexpr int kThreads = 4;
    constexpr int kRounds = 2000;
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t)
    {
        threads.emplace_back(
            [&pool, t]
            {
                for (int round = 0; round < kRounds; ++round)
                {
                    const size_t bytes = size_t(4096) * (1 + (round + t) % 5);
                    VF::PoolBuffer buffer = pool.Acquire(bytes);
                    ASSERT_NE(buffer.mData, nullptr);
                    // Writing the whole buffer catches two owners of one buffer
                    // under the sanitizers and through the check below.
                    std::memset(buffer.mData, t, buffer.mCapacity);
                    const auto* bytesOut = static_cast<const unsigned char*>(buffer.mData);
                    ASSERT_EQ(bytesOut[buffer.mCapacity - 1], t);
                    pool.Return(buffer);
                }
            });
    }
    for (auto& thread : threads)
        thread.join();
    const auto statistics = pool.GetStatistics();
    EXPECT_EQ(statistics.mSystemAllocations + statistics.mReuses, uint64_t(kThreads) * kRounds);
    EXPECT_LE(statistics.mSystemAllocations, uint64_t(kThreads) * 5);
    EXPECT_EQ(statistics.mBytesInUse, 0u);
    EXPECT_EQ(statistics.mBuffersPooled, statistics.mSystemAllocations);
}

TEST_F(FrameMemoryPoolTest, SecondFrameOfTheSameSizeGetsTheRecycledBuffer)
{
    VF::FrameMemoryPool& pool = VF::FrameMemoryPool::GetShared();
    const void* address = nullptr;
    {
        auto frame = VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, 1920, 1080,
                                          mt::kPixelAspectRatio_Square, false, false);
        ASSERT_TRUE(frame);
        address = frame->GetBaseAddress();
    }
    const auto before = pool.GetStatistics();
    auto frame = VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, 1920, 1080,
                                      mt::kPixelAspectRatio_Square, false, false);
    const auto after = pool.GetStatistics();
    EXPECT_EQ(frame->GetBaseAddress(), address);
    EXPECT_EQ(after.mSystemAllocations, before.mSystemAllocations);
    EXPECT_EQ(after.mReuses, before.mReuses + 1);
}

} // namespace
