#include "VF/SharedVideoFrameCache.h"

#include "ContractExpect.h"
#include "VF/VideoFrame.h"

#include <atomic>
#include <cstdlib>
#include <cstring>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

namespace mt = mvxmediatypes;
using mvxcore::utility::Guid;
using QRT::InterfaceRef;
using FrameRef = InterfaceRef<MF::IVideoFrame>;

// 64 x 16 BGRA 8u: 4096 bytes of pixel memory.
constexpr size_t kFrameBytes = 4096;

Guid KeyFor(uint32_t inIndex)
{
    return Guid(inIndex + 1, 0x1234, 0x5678, {1, 2, 3, 4, 5, 6, 7, uint8_t(inIndex)});
}

// A frame whose first byte tells which key it was made for.
FrameRef MakeFrame(uint8_t inTag)
{
    FrameRef frame = VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, 64, 16,
                                          mt::kPixelAspectRatio_Square, true, false);
    static_cast<uint8_t*>(frame->GetWritableBaseAddress())[0] = inTag;
    return frame;
}

uint8_t TagOf(const FrameRef& inFrame)
{
    return static_cast<const uint8_t*>(inFrame->GetBaseAddress())[0];
}

class SharedVideoFrameCacheTest : public ::testing::Test
{
protected:
    VF::VideoFrameCache mCache{3 * kFrameBytes, true};

    bool Holds(uint32_t inIndex) { return bool(mCache.RetrieveFromCache(KeyFor(inIndex))); }
};

TEST_F(SharedVideoFrameCacheTest, MissThenHitAndInsertionMarksShared)
{
    EXPECT_FALSE(mCache.RetrieveFromCache(KeyFor(0)));
    FrameRef frame = MakeFrame(7);
    ASSERT_EQ(frame->GetDataSize(), kFrameBytes);
    mCache.InsertIntoCache(frame, KeyFor(0), VF::kCachePriority_Low);
    EXPECT_TRUE(frame->IsShared());
    FrameRef found = mCache.RetrieveFromCache(KeyFor(0));
    EXPECT_EQ(found.Get(), frame.Get());
    const auto statistics = mCache.GetStatistics();
    EXPECT_EQ(statistics.mHits, 1u);
    EXPECT_EQ(statistics.mMisses, 1u);
    EXPECT_EQ(statistics.mInsertions, 1u);
    EXPECT_EQ(statistics.mBytes, kFrameBytes);
    EXPECT_EQ(statistics.mFrames, 1u);
}

TEST_F(SharedVideoFrameCacheTest, ReinsertionReplacesTheFrameAndKeepsBytesExact)
{
    mCache.InsertIntoCache(MakeFrame(1), KeyFor(0), 0);
    mCache.InsertIntoCache(MakeFrame(2), KeyFor(0), 10);
    EXPECT_EQ(TagOf(mCache.RetrieveFromCache(KeyFor(0))), 2);
    EXPECT_EQ(mCache.GetStatistics().mBytes, kFrameBytes);
    EXPECT_EQ(mCache.GetStatistics().mFrames, 1u);
}

TEST_F(SharedVideoFrameCacheTest, EvictsLowPriorityBeforeHighPriority)
{
    mCache.InsertIntoCache(MakeFrame(0), KeyFor(0), VF::kCachePriority_High);
    mCache.InsertIntoCache(MakeFrame(1), KeyFor(1), VF::kCachePriority_Low);
    mCache.InsertIntoCache(MakeFrame(2), KeyFor(2), VF::kCachePriority_High);
    mCache.InsertIntoCache(MakeFrame(3), KeyFor(3), VF::kCachePriority_High);
    EXPECT_FALSE(Holds(1)); // the only low-priority frame, though not the oldest
    EXPECT_TRUE(Holds(0));
    EXPECT_TRUE(Holds(2));
    EXPECT_TRUE(Holds(3));
    EXPECT_EQ(mCache.GetStatistics().mEvictions, 1u);
    // With only high-priority frames left, the least recently used goes:
    // 0, 2, 3 were just retrieved in that order, so 0 is the oldest.
    mCache.InsertIntoCache(MakeFrame(4), KeyFor(4), VF::kCachePriority_High);
    EXPECT_FALSE(Holds(0));
    EXPECT_TRUE(Holds(4));
}

TEST_F(SharedVideoFrameCacheTest, RetrieveRefreshesRecencyWithinAPriority)
{
    mCache.InsertIntoCache(MakeFrame(0), KeyFor(0), 0);
    mCache.InsertIntoCache(MakeFrame(1), KeyFor(1), 0);
    mCache.InsertIntoCache(MakeFrame(2), KeyFor(2), 0);
    ASSERT_TRUE(mCache.RetrieveFromCache(KeyFor(0))); // 0 is now the most recent
    mCache.InsertIntoCache(MakeFrame(3), KeyFor(3), 0);
    const auto after = mCache.GetStatistics();
    EXPECT_EQ(after.mEvictions, 1u);
    EXPECT_FALSE(Holds(1));
    EXPECT_TRUE(Holds(0));
    EXPECT_TRUE(Holds(2));
    EXPECT_TRUE(Holds(3));
}

TEST_F(SharedVideoFrameCacheTest, BudgetHoldsAfterEveryInsertion)
{
    VF::VideoFrameCache cache(10 * kFrameBytes + 100, true);
    for (uint32_t i = 0; i < 200; ++i)
    {
        // Frames of 1, 2 and 3 units (64 x 16, 32, 48 rows).
        const uint32_t rows = 16 * (1 + i % 3);
        FrameRef frame = VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, 64, rows,
                                              mt::kPixelAspectRatio_Square, false, false);
        cache.InsertIntoCache(frame, KeyFor(i), (i % 4 == 0) ? 10 : 0);
        const auto statistics = cache.GetStatistics();
        ASSERT_LE(statistics.mBytes, cache.GetByteBudget()) << i;
        ASSERT_TRUE(cache.RetrieveFromCache(KeyFor(i)) || i % 4 != 0) << i;
    }
    const auto statistics = cache.GetStatistics();
    EXPECT_EQ(statistics.mInsertions, 200u);
    EXPECT_GT(statistics.mEvictions, 150u);
    cache.SetByteBudget(2 * kFrameBytes);
    EXPECT_LE(cache.GetStatistics().mBytes, 2 * kFrameBytes);
}

TEST_F(SharedVideoFrameCacheTest, FrameHeldElsewhereSurvivesEviction)
{
    FrameRef held = MakeFrame(42);
    mCache.InsertIntoCache(held, KeyFor(0), 0);
    for (uint32_t i = 1; i <= 5; ++i)
        mCache.InsertIntoCache(MakeFrame(uint8_t(i)), KeyFor(i), 0);
    EXPECT_FALSE(Holds(0));
    // The cache dropped only its own reference: ours is the last one.
    EXPECT_EQ(held->AddRef(), 2u);
    held->Release();
    EXPECT_EQ(TagOf(held), 42);
    EXPECT_TRUE(held->IsShared());
    mCache.Clear();
    EXPECT_EQ(mCache.GetStatistics().mBytes, 0u);
    EXPECT_EQ(mCache.GetStatistics().mFrames, 0u);
    EXPECT_EQ(TagOf(held), 42);
}

TEST_F(SharedVideoFrameCacheTest, DependencyPinsAFrameUntilUnregistered)
{
    // Registered before the frame arrives, as a prefetch does.
    mCache.RegisterDependencyOnFrame(KeyFor(0));
    mCache.RegisterDependencyOnFrame(KeyFor(0));
    EXPECT_EQ(mCache.GetDependencyCount(KeyFor(0)), 2u);
    EXPECT_FALSE(mCache.RetrieveFromCache(KeyFor(0)));
    mCache.InsertIntoCache(MakeFrame(0), KeyFor(0), 0);
    for (uint32_t i = 1; i <= 6; ++i)
        mCache.InsertIntoCache(MakeFrame(uint8_t(i)), KeyFor(i), 10);
    EXPECT_TRUE(Holds(0)); // low priority and oldest, yet pinned
    mCache.UnregisterDependencyOnFrame(KeyFor(0));
    EXPECT_TRUE(Holds(0)); // still one dependency
    EXPECT_EQ(mCache.GetDependencyCount(KeyFor(0)), 1u);
    mCache.UnregisterDependencyOnFrame(KeyFor(0));
    EXPECT_EQ(mCache.GetDependencyCount(KeyFor(0)), 0u);
    mCache.InsertIntoCache(MakeFrame(7), KeyFor(7), 10);
    EXPECT_FALSE(Holds(0));
    EXPECT_LE(mCache.GetStatistics().mBytes, mCache.GetByteBudget());
}

TEST_F(SharedVideoFrameCacheTest, PinnedFramesMayExceedTheBudgetUntilUnpinned)
{
    for (uint32_t i = 0; i < 4; ++i)
    {
        mCache.RegisterDependencyOnFrame(KeyFor(i));
        mCache.InsertIntoCache(MakeFrame(uint8_t(i)), KeyFor(i), 0);
    }
    EXPECT_EQ(mCache.GetStatistics().mBytes, 4 * kFrameBytes);
    mCache.UnregisterDependencyOnFrame(KeyFor(2));
    // Unpinning restores the budget at once.
    EXPECT_EQ(mCache.GetStatistics().mBytes, 3 * kFrameBytes);
    EXPECT_FALSE(Holds(2));
    for (uint32_t i : {0u, 1u, 3u})
        mCache.UnregisterDependencyOnFrame(KeyFor(i));
}

TEST_F(SharedVideoFrameCacheTest, ClearKeepsRegisteredDependencies)
{
    mCache.RegisterDependencyOnFrame(KeyFor(0));
    mCache.InsertIntoCache(MakeFrame(0), KeyFor(0), 0);
    mCache.Clear();
    EXPECT_FALSE(Holds(0));
    EXPECT_EQ(mCache.GetDependencyCount(KeyFor(0)), 1u);
    mCache.UnregisterDependencyOnFrame(KeyFor(0));
}

TEST_F(SharedVideoFrameCacheTest, FrameLargerThanTheBudgetIsNotStoredButNotified)
{
    VF::VideoFrameCache cache(kFrameBytes, true);
    int notified = 0;
    cache.SetNotificationFunction(
        [&](const Guid& inKey)
        {
            EXPECT_EQ(inKey, KeyFor(9));
            ++notified;
        });
    FrameRef big = VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, 64, 17,
                                        mt::kPixelAspectRatio_Square, false, false);
    cache.InsertIntoCache(big, KeyFor(9), 10);
    EXPECT_EQ(notified, 1);
    EXPECT_FALSE(cache.RetrieveFromCache(KeyFor(9)));
    EXPECT_EQ(cache.GetStatistics().mRefused, 1u);
    EXPECT_EQ(cache.GetStatistics().mBytes, 0u);
}

TEST_F(SharedVideoFrameCacheTest, BadInputIsAContractError)
{
    EXPECT_INPUT_CONTRACT(mCache.InsertIntoCache(FrameRef(), KeyFor(0), 0), "inFrame != nullptr");
    EXPECT_INPUT_CONTRACT(mCache.InsertIntoCache(MakeFrame(0), Guid(), 0), "!inKey.IsNil()");
    EXPECT_INPUT_CONTRACT(mCache.InsertIntoCache(MakeFrame(0), KeyFor(0), -1), "inPriority >= 0");
    EXPECT_INPUT_CONTRACT(mCache.RetrieveFromCache(Guid()), "!inKey.IsNil()");
    EXPECT_INPUT_CONTRACT(mCache.RegisterDependencyOnFrame(Guid()), "!inKey.IsNil()");
    EXPECT_INPUT_CONTRACT(mCache.UnregisterDependencyOnFrame(KeyFor(3)), "registered");
    // Nothing was stored or lost.
    const auto statistics = mCache.GetStatistics();
    EXPECT_EQ(statistics.mInsertions, 0u);
    EXPECT_EQ(statistics.mBytes, 0u);
    EXPECT_EQ(mCache.GetDependencyCount(KeyFor(3)), 0u);
}

TEST_F(SharedVideoFrameCacheTest, NotificationRunsOncePerInsertionAndMayReenterTheCache)
{
    std::vector<Guid> keys;
    bool hitInsideNotification = false;
    mCache.SetNotificationFunction(
        [&](const Guid& inKey)
        {
            keys.push_back(inKey);
            // The frame is retrievable by the time the notification runs.
            hitInsideNotification = bool(mCache.RetrieveFromCache(inKey));
            if (inKey == KeyFor(0))
                mCache.InsertIntoCache(MakeFrame(1), KeyFor(1), 0);
        });
    mCache.InsertIntoCache(MakeFrame(0), KeyFor(0), 0);
    ASSERT_EQ(keys.size(), 2u);
    EXPECT_EQ(keys[0], KeyFor(0));
    EXPECT_EQ(keys[1], KeyFor(1));
    EXPECT_TRUE(hitInsideNotification);
    mCache.SetNotificationFunction(nullptr);
    mCache.InsertIntoCache(MakeFrame(2), KeyFor(2), 0);
    EXPECT_EQ(keys.size(), 2u);
}

TEST_F(SharedVideoFrameCacheTest, NotificationIsCalledOutsideEveryLock)
{
    // While the notification runs, another thread uses keys of every shard,
    // inserts past the budget (evicting) and replaces the notification. It
    // would block forever if the inserting thread still held any cache lock.
    std::atomic<int> calls{0};
    mCache.SetNotificationFunction(
        [&](const Guid&)
        {
            if (calls.fetch_add(1) != 0)
                return;
            std::thread other(
                [&]
                {
                    for (uint32_t i = 100; i < 164; ++i)
                    {
                        mCache.RetrieveFromCache(KeyFor(i));
                        mCache.InsertIntoCache(MakeFrame(uint8_t(i)), KeyFor(i), 0);
                        mCache.RegisterDependencyOnFrame(KeyFor(i));
                        mCache.UnregisterDependencyOnFrame(KeyFor(i));
                    }
                    mCache.SetNotificationFunction([&](const Guid&) { calls.fetch_add(1); });
                });
            other.join();
        });
    mCache.InsertIntoCache(MakeFrame(0), KeyFor(0), 0);
    EXPECT_EQ(calls.load(), 1 + 64);
    mCache.InsertIntoCache(MakeFrame(1), KeyFor(1), 0);
    EXPECT_EQ(calls.load(), 1 + 64 + 1);
}

TEST_F(SharedVideoFrameCacheTest, ConcurrentInsertAndRetrieveStayConsistent)
{
    VF::VideoFrameCache cache(40 * kFrameBytes, true);
    std::atomic<uint64_t> notifications{0};
    cache.SetNotificationFunction([&](const Guid&) { notifications.fetch_add(1); });
    constexpr int kThreads = 4;
    constexpr uint32_t kOperations = 3000;
    constexpr uint32_t kKeys = 120;
    std::atomic<uint64_t> retrieves{0};
    std::atomic<uint64_t> inserts{0};
    std::atomic<uint64_t> wrongFrames{0};
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t)
    {
        threads.emplace_back(
            [&, t]
            {
                uint32_t state = 12345u + uint32_t(t) * 7919u;
                for (uint32_t n = 0; n < kOperations; ++n)
                {
                    state = state * 1664525u + 1013904223u;
                    const uint32_t key = (state >> 8) % kKeys;
                    switch ((state >> 20) % 4)
                    {
                    case 0:
                        cache.InsertIntoCache(MakeFrame(uint8_t(key)), KeyFor(key), (key % 2) * 10);
                        inserts.fetch_add(1);
                        break;
                    case 1:
                        cache.RegisterDependencyOnFrame(KeyFor(key));
                        if (FrameRef frame = cache.RetrieveFromCache(KeyFor(key)))
                            wrongFrames += TagOf(frame) != uint8_t(key);
                        cache.UnregisterDependencyOnFrame(KeyFor(key));
                        retrieves.fetch_add(1);
                        break;
                    default:
                        if (FrameRef frame = cache.RetrieveFromCache(KeyFor(key)))
                            wrongFrames += TagOf(frame) != uint8_t(key);
                        retrieves.fetch_add(1);
                        break;
                    }
                }
            });
    }
    for (auto& thread : threads)
        thread.join();
    const auto statistics = cache.GetStatistics();
    EXPECT_EQ(wrongFrames.load(), 0u);
    EXPECT_EQ(statistics.mHits + statistics.mMisses, retrieves.load());
    EXPECT_EQ(statistics.mInsertions, inserts.load());
    EXPECT_EQ(notifications.load(), inserts.load());
    EXPECT_LE(statistics.mBytes, cache.GetByteBudget());
    EXPECT_EQ(statistics.mBytes, statistics.mFrames * kFrameBytes);
    EXPECT_GT(statistics.mEvictions, 0u);
    // Every dependency was balanced.
    for (uint32_t key = 0; key < kKeys; ++key)
        EXPECT_EQ(cache.GetDependencyCount(KeyFor(key)), 0u);
    uint64_t held = 0;
    for (uint32_t key = 0; key < kKeys; ++key)
        held += bool(cache.RetrieveFromCache(KeyFor(key)));
    EXPECT_EQ(held, statistics.mFrames);
}

TEST_F(SharedVideoFrameCacheTest, EnvironmentSwitchTurnsTheCacheOff)
{
    ASSERT_EQ(setenv("VF_DISABLE_FRAME_CACHE", "1", 1), 0);
    VF::VideoFrameCache disabled;
    ASSERT_EQ(setenv("VF_DISABLE_FRAME_CACHE", "0", 1), 0);
    VF::VideoFrameCache enabledByZero;
    ASSERT_EQ(unsetenv("VF_DISABLE_FRAME_CACHE"), 0);
    VF::VideoFrameCache enabled;
    EXPECT_FALSE(disabled.IsEnabled());
    EXPECT_TRUE(enabledByZero.IsEnabled());
    EXPECT_TRUE(enabled.IsEnabled());

    int notified = 0;
    disabled.SetNotificationFunction([&](const Guid&) { ++notified; });
    FrameRef frame = MakeFrame(5);
    disabled.InsertIntoCache(frame, KeyFor(5), 10);
    EXPECT_TRUE(frame->IsShared());
    EXPECT_EQ(notified, 1);
    EXPECT_FALSE(disabled.RetrieveFromCache(KeyFor(5)));
    const auto statistics = disabled.GetStatistics();
    EXPECT_EQ(statistics.mMisses, 1u);
    EXPECT_EQ(statistics.mRefused, 1u);
    EXPECT_EQ(statistics.mBytes, 0u);
}

TEST_F(SharedVideoFrameCacheTest, ProcessWideCacheServesTheStaticFunctions)
{
    VF::VideoFrameCache& instance = VF::SharedVideoFrameCache::GetInstance();
    EXPECT_EQ(&instance, &VF::SharedVideoFrameCache::GetInstance());
    EXPECT_GT(instance.GetByteBudget(), 0u);
    EXPECT_LE(instance.GetByteBudget(), size_t{4} << 30);
    const Guid key("{0f1e2d3c-4b5a-6978-8796-a5b4c3d2e1f0}");
    FrameRef frame = MakeFrame(3);
    VF::SharedVideoFrameCache::InsertIntoCache(frame, key, 10);
    EXPECT_EQ(VF::SharedVideoFrameCache::RetrieveFromCache(key).Get(), frame.Get());
    VF::SharedVideoFrameCache::Clear();
    EXPECT_FALSE(VF::SharedVideoFrameCache::RetrieveFromCache(key));
}

} // namespace
