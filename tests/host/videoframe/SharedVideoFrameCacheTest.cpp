#include "VF/SharedVideoFrameCache.h"

#include "ContractExpect.h"
#include "FrameTestSupport.h"

#include <atomic>
#include <cstdlib>
#include <optional>
#include <thread>

#include <gtest/gtest.h>

namespace
{

using namespace vftest;
using mvxcore::utility::Guid;
using Keys = std::vector<uint32_t>;

// 64 x 16 BGRA 8u: 4096 bytes of pixel memory.
constexpr size_t kFrameBytes = 4096;

Guid KeyFor(uint32_t inIndex)
{
    return Guid(inIndex + 1, 0x1234, 0x5678, {1, 2, 3, 4, 5, 6, 7, uint8_t(inIndex)});
}

// A frame of inUnits * 4096 bytes whose first byte tells which key it was made for.
Frame MakeTagged(uint8_t inTag, uint32_t inUnits = 1)
{
    const Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 64, 16 * inUnits);
    Row(frame, 0)[0] = inTag;
    return frame;
}

uint8_t TagOf(const Frame& inFrame)
{
    return static_cast<const uint8_t*>(inFrame->GetBaseAddress())[0];
}

// Hits, misses, insertions, refused, evictions, bytes, frames.
auto Counts(const VF::VideoFrameCache& inCache)
{
    const VF::FrameCacheStatistics s = inCache.GetStatistics();
    return std::tuple(s.mHits, s.mMisses, s.mInsertions, s.mRefused, s.mEvictions, s.mBytes,
                      s.mFrames);
}
using Expected = std::tuple<uint64_t, uint64_t, uint64_t, uint64_t, uint64_t, uint64_t, uint64_t>;

class SharedVideoFrameCacheTest : public ::testing::Test
{
protected:
    VF::VideoFrameCache mCache{3 * kFrameBytes, true};

    void Insert(uint32_t inIndex, int32_t inPriority)
    {
        mCache.InsertIntoCache(MakeTagged(uint8_t(inIndex)), KeyFor(inIndex), inPriority);
    }
    // The keys of [0, inCount) held now, in order (retrieving refreshes their recency).
    Keys Held(uint32_t inCount)
    {
        Keys held;
        for (uint32_t i = 0; i < inCount; ++i)
            if (const Frame frame = mCache.RetrieveFromCache(KeyFor(i)))
            {
                EXPECT_EQ(TagOf(frame), i);
                held.push_back(i);
            }
        return held;
    }
};

TEST_F(SharedVideoFrameCacheTest,
       RefusesBadInputAndEvictsPriorityZeroBeforeTenThenTheLeastRecentlyUsed)
{
    // Bad input is a contract error and changes nothing.
    EXPECT_INPUT_CONTRACT(mCache.InsertIntoCache(Frame(), KeyFor(0), 0), "inFrame != nullptr");
    EXPECT_INPUT_CONTRACT(mCache.InsertIntoCache(MakeTagged(0), Guid(), 0), "!inKey.IsNil()");
    EXPECT_INPUT_CONTRACT(mCache.InsertIntoCache(MakeTagged(0), KeyFor(0), -1), "inPriority >= 0");
    EXPECT_INPUT_CONTRACT(mCache.UnregisterDependencyOnFrame(KeyFor(3)), "registered");
    EXPECT_EQ(Counts(mCache), (Expected{0, 0, 0, 0, 0, 0, 0}));
    Insert(0, VF::kCachePriority_High);
    Insert(1, VF::kCachePriority_Low);
    Insert(2, VF::kCachePriority_High);
    Insert(3, VF::kCachePriority_High);
    // The only low-priority frame goes, though not the oldest; retrieving 0, 2, 3 in that
    // order leaves 0 the least recently used, so it goes next.
    EXPECT_EQ(Held(4), (Keys{0, 2, 3}));
    EXPECT_EQ(std::get<4>(Counts(mCache)), 1u);
    Insert(4, VF::kCachePriority_High);
    EXPECT_EQ(Held(5), (Keys{2, 3, 4}));
    // A retrieval refreshes recency: 2 is retrieved again now, so 3 goes.
    ASSERT_TRUE(mCache.RetrieveFromCache(KeyFor(2)));
    Insert(5, VF::kCachePriority_High);
    EXPECT_EQ(Held(6), (Keys{2, 4, 5}));
}

TEST_F(SharedVideoFrameCacheTest, LowClassKeepsToItsAllowanceByRecencyAndPinsHoldAgainstBoth)
{
    // Budget four frames, low-priority allowance two. Each step: an operation on a key (H, L:
    // insert at the high or the low priority; P, U: pin, unpin; R: retrieve), then the keys held
    // (looked up without touching recency).
    const std::tuple<char, uint32_t, Keys> steps[] = {
        {'H', 0, {0}},
        {'L', 1, {0, 1}},
        {'L', 2, {0, 1, 2}},
        {'L', 3, {0, 2, 3}}, // the oldest low frame goes; the older high one stays
        {'R', 2, {0, 2, 3}},
        {'L', 4, {0, 2, 4}}, // 3 is now the least recently used
        {'P', 5, {0, 2, 4}},
        {'L', 5, {0, 4, 5}}, // a pinned frame counts, others make room
        {'P', 4, {0, 4, 5}},
        {'L', 6, {0, 4, 5}},    // the others pinned: the newcomer goes
        {'H', 7, {0, 4, 5, 7}}, // the allowance does not limit the high class
        {'H', 8, {4, 5, 7, 8}}, // over the budget, the low class pinned: the oldest high goes
        {'U', 5, {4, 5, 7, 8}},
        {'U', 4, {4, 5, 7, 8}},
        {'L', 9, {5, 7, 8, 9}}, // over both: the least recently used low frame goes
    };
    VF::VideoFrameCache cache(4 * kFrameBytes, true, 2 * kFrameBytes);
    for (const auto& [op, index, expected] : steps)
    {
        SCOPED_TRACE(index);
        const Guid key = KeyFor(index);
        if (op == 'P')
            cache.RegisterDependencyOnFrame(key);
        if (op == 'U')
            cache.UnregisterDependencyOnFrame(key);
        if (op == 'R' && !cache.RetrieveFromCache(key))
            ADD_FAILURE() << "not held";
        if (op == 'H' || op == 'L')
            cache.InsertIntoCache(MakeTagged(uint8_t(index)), key, op == 'H' ? 10 : 0);
        Keys held;
        for (uint32_t i = 0; i < 10; ++i)
            if (cache.GetCachedPriority(KeyFor(i)))
                held.push_back(i);
        EXPECT_EQ(held, expected);
    }
    EXPECT_EQ(std::tuple(cache.GetCachedPriority(KeyFor(9)), cache.GetCachedPriority(KeyFor(8)),
                         cache.GetStatistics().mLowPriorityBytes),
              std::tuple(std::optional<int32_t>(0), std::optional<int32_t>(10), 2 * kFrameBytes));
    // Lowering the allowance evicts at once; the shared cache's default is a few HD frames.
    cache.SetLowPriorityByteBudget(kFrameBytes);
    EXPECT_FALSE(cache.GetCachedPriority(KeyFor(5)));
    EXPECT_EQ(VF::VideoFrameCache::GetDefaultLowPriorityByteBudget(size_t{4} << 30), 32u << 20);
    EXPECT_EQ(VF::SharedVideoFrameCache::GetInstance().GetLowPriorityByteBudget(),
              VF::VideoFrameCache::GetDefaultLowPriorityByteBudget(
                  VF::SharedVideoFrameCache::GetInstance().GetByteBudget()));
}

TEST_F(SharedVideoFrameCacheTest, ConcurrentUseKeepsTheClassesAccountedAndWithinBounds)
{
    // Four threads insert both classes over shared keys, pinning some; afterwards the byte
    // counts match the frames held and both limits hold.
    VF::VideoFrameCache cache(12 * kFrameBytes, true, 3 * kFrameBytes);
    std::vector<std::thread> threads;
    for (uint32_t t = 0; t < 4; ++t)
        threads.emplace_back(
            [&cache, t]
            {
                for (uint32_t i = 0; i < 2000; ++i)
                {
                    const Guid key = KeyFor((i * 7 + t) % 40);
                    cache.RegisterDependencyOnFrame(key);
                    cache.InsertIntoCache(MakeTagged(0), key, (i + t) % 3 == 0 ? 10 : 0);
                    cache.RetrieveFromCache(KeyFor(i % 40));
                    cache.UnregisterDependencyOnFrame(key);
                }
            });
    for (std::thread& thread : threads)
        thread.join();
    uint64_t low = 0, all = 0;
    for (uint32_t i = 0; i < 40; ++i)
        if (const std::optional<int32_t> priority = cache.GetCachedPriority(KeyFor(i)))
            (*priority < 10 ? low : all) += kFrameBytes;
    const VF::FrameCacheStatistics s = cache.GetStatistics();
    EXPECT_EQ(std::tuple(s.mBytes, s.mLowPriorityBytes), std::tuple(all + low, low));
    EXPECT_TRUE(s.mBytes <= 12 * kFrameBytes && low <= 3 * kFrameBytes) << s.mBytes << " " << low;
}

TEST_F(SharedVideoFrameCacheTest, BudgetHoldsAfterEveryInsertion)
{
    VF::VideoFrameCache cache(10 * kFrameBytes + 100, true);
    for (uint32_t i = 0; i < 200; ++i)
    {
        // Frames of 1, 2 and 3 units; every fourth of priority 10 and so never evicted first.
        cache.InsertIntoCache(MakeTagged(0, 1 + i % 3), KeyFor(i), (i % 4 == 0) ? 10 : 0);
        ASSERT_LE(cache.GetStatistics().mBytes, cache.GetByteBudget()) << i;
        ASSERT_TRUE(cache.RetrieveFromCache(KeyFor(i)) || i % 4 != 0) << i;
    }
    EXPECT_GT(cache.GetStatistics().mEvictions, 150u);
    cache.SetByteBudget(2 * kFrameBytes);
    EXPECT_LE(cache.GetStatistics().mBytes, 2 * kFrameBytes);
}

TEST_F(SharedVideoFrameCacheTest, DependencyPinsAFrameUntilUnregisteredAndSurvivesClear)
{
    // Registered before the frames arrive, as a prefetch does; pinned frames may exceed the
    // budget until unpinned.
    mCache.RegisterDependencyOnFrame(KeyFor(0));
    for (uint32_t i = 0; i < 4; ++i)
    {
        mCache.RegisterDependencyOnFrame(KeyFor(i));
        Insert(i, 0);
    }
    EXPECT_EQ(std::get<5>(Counts(mCache)), 4 * kFrameBytes);
    mCache.UnregisterDependencyOnFrame(KeyFor(2));
    EXPECT_EQ(Held(4), (Keys{0, 1, 3}));
    Insert(4, 10);
    EXPECT_EQ(Held(5), (Keys{0, 1, 3})); // all pinned; the newcomer goes
    mCache.UnregisterDependencyOnFrame(KeyFor(0));
    EXPECT_EQ(mCache.GetDependencyCount(KeyFor(0)), 1u);
    // Clear drops the frames but keeps the registered dependencies.
    mCache.Clear();
    EXPECT_EQ(Counts(mCache), (Expected{6, 3, 5, 0, 2, 0, 0}));
    for (uint32_t i : {0u, 1u, 3u})
    {
        EXPECT_EQ(mCache.GetDependencyCount(KeyFor(i)), 1u);
        mCache.UnregisterDependencyOnFrame(KeyFor(i));
    }
}

TEST_F(SharedVideoFrameCacheTest, NotificationIsCalledOutsideEveryLock)
{
    // While the notification runs, another thread uses keys of every shard, inserts past the
    // budget (evicting) and replaces the notification. It would block forever if the
    // inserting thread still held any cache lock.
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
                        Insert(i, 0);
                        mCache.RegisterDependencyOnFrame(KeyFor(i));
                        mCache.UnregisterDependencyOnFrame(KeyFor(i));
                    }
                    mCache.SetNotificationFunction([&](const Guid&) { calls.fetch_add(1); });
                });
            other.join();
        });
    Insert(0, 0);
    Insert(1, 0);
    EXPECT_EQ(calls.load(), 1 + 64 + 1);
}

TEST_F(SharedVideoFrameCacheTest, DisabledCacheOrTooLargeFrameIsMarkedAndNotifiedButNotStored)
{
    ASSERT_EQ(setenv("VF_DISABLE_FRAME_CACHE", "1", 1), 0);
    VF::VideoFrameCache disabled, small(kFrameBytes, true);
    ASSERT_EQ(unsetenv("VF_DISABLE_FRAME_CACHE"), 0);
    EXPECT_EQ(std::pair(disabled.IsEnabled(), small.IsEnabled()), std::pair(false, true));
    const Frame frame = MakeTagged(5);
    for (const auto& [cache, inserted] :
         {std::pair{&disabled, frame}, std::pair{&small, MakeTagged(5, 2)}})
    {
        std::vector<Guid> notified;
        cache->SetNotificationFunction([&](const Guid& inKey) { notified.push_back(inKey); });
        cache->InsertIntoCache(inserted, KeyFor(5), 10);
        EXPECT_EQ(
            std::tuple(inserted->IsShared(), notified, bool(cache->RetrieveFromCache(KeyFor(5)))),
            std::tuple(true, std::vector<Guid>{KeyFor(5)}, false));
        EXPECT_EQ(Counts(*cache), (Expected{0, 1, 0, 1, 0, 0, 0}));
        cache->SetNotificationFunction(nullptr);
    }
    // The process-wide cache serves the static functions.
    VF::SharedVideoFrameCache::InsertIntoCache(frame, KeyFor(5), 10);
    EXPECT_EQ(VF::SharedVideoFrameCache::RetrieveFromCache(KeyFor(5)).Get(), frame.Get());
    VF::SharedVideoFrameCache::Clear();
    EXPECT_FALSE(VF::SharedVideoFrameCache::RetrieveFromCache(KeyFor(5)));
}

} // namespace
