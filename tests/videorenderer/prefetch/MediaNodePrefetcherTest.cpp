#include "prefetch/MediaNodePrefetcher.h"

#include "BE/VideoSources.h"
#include "ML/RenderStatus.h"
#include "PrefetchTestSupport.h"
#include "prefetch/VideoSourcePrefetcher.h"

#include <atomic>
#include <random>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using namespace prefetch_test;
using PrefetchRef = QRT::InterfaceRef<ML::IRenderableNodePrefetch>;

constexpr const char* kTimeoutAssert =
    "false|We have timed out on an async source. This probably shouldn't happen and will result "
    "in performance problems.";

TickTime At(int64_t inTicks)
{
    return TickTime::TicksToTime(inTicks);
}

class MediaNodePrefetcherTest : public PrefetchExecutorFixture
{
protected:
    void SetUp() override
    {
        PrefetchExecutorFixture::SetUp();
        ML::SilenceMediaNodePrefetchTimeoutAssertion(false);
        mSource = QRT::Allocated<TestVideoSource>::CreateInstance();
    }

    void TearDown() override
    {
        PrefetchExecutorFixture::TearDown();
        ML::SilenceMediaNodePrefetchTimeoutAssertion(false);
    }

    PrefetchRef Make(const SourceRef& inSource, int64_t inTicks)
    {
        return ML::CreateMediaNodePrefetcher(inSource, At(inTicks), {}, {}, {});
    }
    PrefetchRef Make(int64_t inTicks) { return Make(SourceRef(mSource), inTicks); }

    std::shared_ptr<Gate> BlockVideoExecutor()
    {
        auto gate = std::make_shared<Gate>();
        EXPECT_TRUE(mVideo->Post([gate] { gate->Wait(); }));
        return gate;
    }

    QRT::InterfaceRef<TestVideoSource> mSource;
};

TEST_F(MediaNodePrefetcherTest, NoHandleWhenTheSourceNeedsNoPrefetch)
{
    mSource->mPrefetchWanted = false;
    EXPECT_FALSE(Make(1));

    mSource->mPrefetchWanted = true;
    const PrefetchRef handle = Make(1);
    ASSERT_TRUE(handle);
    QRT::Guid key;
    handle->GetPrefetchKey(key);
    EXPECT_EQ(key, mSource->KeyFor(At(1)));

    // An enabled asynchronous source gets a handle even when it wants no prefetch.
    const auto async = QRT::Allocated<TestAsyncVideoSource>::CreateInstance();
    EXPECT_TRUE(Make(SourceRef(async), 1));
    async->mEnabled = false;
    EXPECT_FALSE(Make(SourceRef(async), 1));
}

TEST_F(MediaNodePrefetcherTest, QueuedReadDeliversTheFrameThroughTheCache)
{
    const PrefetchRef handle = Make(3);
    const Guid key = mSource->KeyFor(At(3));
    EXPECT_EQ(handle->InitiatePrefetch(), QRT::kResult_Success);
    EXPECT_EQ(VF::SharedVideoFrameCache::GetInstance().GetDependencyCount(key), 1u);
    EXPECT_EQ(ML::GetMediaNodePrefetchReferenceCount(key), 1u);
    Drain(mVideo);

    EXPECT_FALSE(handle->ContinueWaitingForPrefetch(0.0));
    FrameRef frame;
    EXPECT_EQ(handle->GetPrefetchedFrame(frame), QRT::kResult_Success);
    ASSERT_TRUE(frame);
    EXPECT_EQ(frame.Get(), VF::SharedVideoFrameCache::RetrieveFromCache(key).Get());
    EXPECT_EQ(mSource->ReadTicks(), (std::vector<int64_t>{3}));
    EXPECT_EQ(ML::GetMediaNodePrefetchReferenceCount(key), 0u);

    handle->CancelPrefetch();
    EXPECT_EQ(VF::SharedVideoFrameCache::GetInstance().GetDependencyCount(key), 0u);
}

TEST_F(MediaNodePrefetcherTest, PendingUntilTheReadRuns)
{
    const auto gate = BlockVideoExecutor();
    const PrefetchRef handle = Make(2);
    handle->InitiatePrefetch();
    FrameRef frame;
    EXPECT_EQ(handle->GetPrefetchedFrame(frame), ML::kResult_PrefetchIncomplete);
    EXPECT_FALSE(frame);
    EXPECT_TRUE(handle->ContinueWaitingForPrefetch(1.0));
    gate->Open();
    Drain(mVideo);
    EXPECT_FALSE(handle->ContinueWaitingForPrefetch(1.0));
    EXPECT_EQ(handle->GetPrefetchedFrame(frame), QRT::kResult_Success);
    EXPECT_TRUE(frame);
}

TEST_F(MediaNodePrefetcherTest, TwoHandlesForOneKeyShareOneRead)
{
    const auto gate = BlockVideoExecutor();
    const Guid key = mSource->KeyFor(At(5));
    PrefetchRef first = Make(5);
    const PrefetchRef second = Make(5);
    first->InitiatePrefetch();
    second->InitiatePrefetch();
    EXPECT_EQ(ML::GetMediaNodePrefetchReferenceCount(key), 2u);
    EXPECT_EQ(ML::GetQueuedVideoSourcePrefetchCount(), 1u);

    // Cancelling the first leaves the read to the second.
    first->CancelPrefetch();
    first.Reset();
    EXPECT_EQ(ML::GetMediaNodePrefetchReferenceCount(key), 1u);
    EXPECT_EQ(ML::GetQueuedVideoSourcePrefetchCount(), 1u);

    gate->Open();
    Drain(mVideo);
    FrameRef frame;
    EXPECT_EQ(second->GetPrefetchedFrame(frame), QRT::kResult_Success);
    EXPECT_TRUE(frame);
    EXPECT_EQ(mSource->ReadTicks(), (std::vector<int64_t>{5}));
    EXPECT_EQ(ML::GetMediaNodePrefetchReferenceCount(key), 0u);
}

TEST_F(MediaNodePrefetcherTest, CancellingTheLastHandleCancelsTheQueuedRead)
{
    const auto gate = BlockVideoExecutor();
    const Guid key = mSource->KeyFor(At(6));
    const PrefetchRef first = Make(6);
    const PrefetchRef second = Make(6);
    first->InitiatePrefetch();
    second->InitiatePrefetch();
    first->CancelPrefetch();
    second->CancelPrefetch();
    EXPECT_EQ(ML::GetQueuedVideoSourcePrefetchCount(), 0u);
    EXPECT_EQ(ML::GetMediaNodePrefetchReferenceCount(key), 0u);
    EXPECT_EQ(VF::SharedVideoFrameCache::GetInstance().GetDependencyCount(key), 0u);
    gate->Open();
    Drain(mVideo);
    EXPECT_TRUE(mSource->ReadTicks().empty());
}

TEST_F(MediaNodePrefetcherTest, DestroyingAStartedHandleCancelsItsRead)
{
    const auto gate = BlockVideoExecutor();
    const Guid key = mSource->KeyFor(At(8));
    {
        const PrefetchRef handle = Make(8);
        handle->InitiatePrefetch();
        EXPECT_EQ(ML::GetQueuedVideoSourcePrefetchCount(), 1u);
    }
    EXPECT_EQ(ML::GetQueuedVideoSourcePrefetchCount(), 0u);
    EXPECT_EQ(ML::GetMediaNodePrefetchReferenceCount(key), 0u);
    EXPECT_EQ(VF::SharedVideoFrameCache::GetInstance().GetDependencyCount(key), 0u);
    gate->Open();
}

TEST_F(MediaNodePrefetcherTest, CachedFrameIsTakenAtOnce)
{
    const Guid key = mSource->KeyFor(At(9));
    const FrameRef cached = MakeFrame(6);
    VF::SharedVideoFrameCache::InsertIntoCache(cached, key, VF::kCachePriority_High);

    const PrefetchRef handle = Make(9);
    EXPECT_EQ(handle->InitiatePrefetch(), QRT::kResult_Success);
    EXPECT_EQ(ML::GetQueuedVideoSourcePrefetchCount(), 0u);
    EXPECT_EQ(mSource->HoldCount(), 0);
    EXPECT_EQ(ML::GetMediaNodePrefetchReferenceCount(key), 0u);
    EXPECT_FALSE(handle->ContinueWaitingForPrefetch(0.0));
    FrameRef frame;
    EXPECT_EQ(handle->GetPrefetchedFrame(frame), QRT::kResult_Success);
    EXPECT_EQ(frame.Get(), cached.Get());
    Drain(mVideo);
    EXPECT_TRUE(mSource->ReadTicks().empty());
}

TEST_F(MediaNodePrefetcherTest, FailedReadEndsTheWaitWithoutAFrame)
{
    mSource->mReadStatus = static_cast<QRT::Result>(0xA0100003u);
    const Guid key = mSource->KeyFor(At(4));
    const PrefetchRef first = Make(4);
    const PrefetchRef second = Make(4);
    first->InitiatePrefetch();
    second->InitiatePrefetch();
    Drain(mVideo);

    // Both handles learn of the failure, also the one that did not start the read.
    EXPECT_FALSE(first->ContinueWaitingForPrefetch(0.5));
    EXPECT_FALSE(second->ContinueWaitingForPrefetch(0.5));
    FrameRef frame;
    EXPECT_EQ(first->GetPrefetchedFrame(frame), QRT::kResult_Success);
    EXPECT_FALSE(frame);
    EXPECT_EQ(second->GetPrefetchedFrame(frame), QRT::kResult_Success);
    EXPECT_FALSE(frame);
    EXPECT_EQ(ML::GetMediaNodePrefetchReferenceCount(key), 0u);
    EXPECT_FALSE(VF::SharedVideoFrameCache::RetrieveFromCache(key));
}

TEST_F(MediaNodePrefetcherTest, NullKeyHandleReadsForItselfWithoutCaching)
{
    mSource->mNullKeys = true;
    const auto insertions = [] { return VF::SharedVideoFrameCache::GetStatistics().mInsertions; };
    const uint64_t before = insertions();
    const auto gate = BlockVideoExecutor();
    const PrefetchRef first = Make(11);
    const PrefetchRef second = Make(11);
    ASSERT_TRUE(first);
    QRT::Guid key = MakeKey();
    first->GetPrefetchKey(key);
    EXPECT_TRUE(key.IsNil());
    EXPECT_EQ(first->InitiatePrefetch(), QRT::kResult_Success);
    EXPECT_EQ(second->InitiatePrefetch(), QRT::kResult_Success);
    // Without a key nothing is shared: each handle queued a read of its own.
    EXPECT_EQ(ML::GetQueuedVideoSourcePrefetchCount(), 2u);
    EXPECT_TRUE(first->ContinueWaitingForPrefetch(0.0));
    gate->Open();
    Drain(mVideo);

    // The source holds the frame it read; the handle takes it without the cache.
    EXPECT_FALSE(first->ContinueWaitingForPrefetch(0.0));
    FrameRef frame;
    EXPECT_EQ(first->GetPrefetchedFrame(frame), QRT::kResult_Success);
    EXPECT_TRUE(frame);
    EXPECT_EQ(mSource->ReadTicks(), (std::vector<int64_t>{11, 11}));
    EXPECT_EQ(insertions(), before);
}

TEST_F(MediaNodePrefetcherTest, NullKeyHandleWhoseSourceKeepsNothingStillFinishes)
{
    mSource->mNullKeys = true;
    mSource->mHoldsReadFrames = false;
    const PrefetchRef handle = Make(12);
    handle->InitiatePrefetch();
    Drain(mVideo);
    EXPECT_FALSE(handle->ContinueWaitingForPrefetch(0.0));
    FrameRef frame;
    EXPECT_EQ(handle->GetPrefetchedFrame(frame), QRT::kResult_Success);
    EXPECT_FALSE(frame);
}

TEST_F(MediaNodePrefetcherTest, AsyncSourceIsStartedWaitedForAndTaken)
{
    const auto async = QRT::Allocated<TestAsyncVideoSource>::CreateInstance();
    const Guid key = async->Inner().KeyFor(At(2));
    const PrefetchRef first = Make(SourceRef(async), 2);
    const PrefetchRef second = Make(SourceRef(async), 2);
    EXPECT_EQ(first->InitiatePrefetch(), QRT::kResult_Success);
    EXPECT_EQ(second->InitiatePrefetch(), QRT::kResult_Success);
    EXPECT_EQ(async->mStarts.load(), 1);
    EXPECT_EQ(ML::GetQueuedVideoSourcePrefetchCount(), 0u);
    EXPECT_TRUE(first->ContinueWaitingForPrefetch(0.1));
    EXPECT_GE(async->mWaits.load(), 1);

    async->CompleteRead(At(2));
    EXPECT_FALSE(first->ContinueWaitingForPrefetch(0.2));
    EXPECT_FALSE(second->ContinueWaitingForPrefetch(0.2));
    FrameRef a;
    FrameRef b;
    first->GetPrefetchedFrame(a);
    second->GetPrefetchedFrame(b);
    ASSERT_TRUE(a);
    EXPECT_EQ(a.Get(), b.Get());
    EXPECT_EQ(VF::SharedVideoFrameCache::RetrieveFromCache(key).Get(), a.Get());
    EXPECT_EQ(async->mCancels.load(), 0);
    EXPECT_TRUE(Asserts().empty());
}

TEST_F(MediaNodePrefetcherTest, CancellingAnAsyncReadWithdrawsItsStartOnce)
{
    const auto async = QRT::Allocated<TestAsyncVideoSource>::CreateInstance();
    const PrefetchRef first = Make(SourceRef(async), 2);
    const PrefetchRef second = Make(SourceRef(async), 2);
    first->InitiatePrefetch();
    second->InitiatePrefetch();
    first->CancelPrefetch();
    EXPECT_EQ(async->mCancels.load(), 0);
    second->CancelPrefetch();
    EXPECT_EQ(async->mCancels.load(), 1);
}

TEST_F(MediaNodePrefetcherTest, FailedAsyncStartLeavesTheHandleInert)
{
    const auto async = QRT::Allocated<TestAsyncVideoSource>::CreateInstance();
    const QRT::Result failure = static_cast<QRT::Result>(0xA0100004u);
    async->mStartStatus = failure;
    const Guid key = async->Inner().KeyFor(At(3));
    const PrefetchRef handle = Make(SourceRef(async), 3);
    EXPECT_EQ(handle->InitiatePrefetch(), failure);

    QRT::Guid handleKey;
    handle->GetPrefetchKey(handleKey);
    EXPECT_TRUE(handleKey.IsNil());
    EXPECT_EQ(ML::GetMediaNodePrefetchReferenceCount(key), 0u);
    EXPECT_EQ(VF::SharedVideoFrameCache::GetInstance().GetDependencyCount(key), 0u);
    EXPECT_FALSE(handle->ContinueWaitingForPrefetch(0.0));
    FrameRef frame;
    EXPECT_EQ(handle->GetPrefetchedFrame(frame), QRT::kResult_Success);
    EXPECT_FALSE(frame);
    EXPECT_EQ(handle->CancelPrefetch(), QRT::kResult_Success);
    EXPECT_EQ(async->mCancels.load(), 0);
}

TEST_F(MediaNodePrefetcherTest, AsyncTimeoutAssertsOnceAndFallsBackToTheQueuedRead)
{
    const auto async = QRT::Allocated<TestAsyncVideoSource>::CreateInstance();
    async->mWaitAnswer = false;
    const Guid key = async->Inner().KeyFor(At(4));
    const PrefetchRef first = Make(SourceRef(async), 4);
    const PrefetchRef second = Make(SourceRef(async), 4);
    const auto gate = BlockVideoExecutor();
    first->InitiatePrefetch();
    second->InitiatePrefetch();

    EXPECT_TRUE(first->ContinueWaitingForPrefetch(20.0));
    EXPECT_TRUE(second->ContinueWaitingForPrefetch(20.0));
    EXPECT_TRUE(first->ContinueWaitingForPrefetch(21.0));
    // One report for the read, its start withdrawn, one queued read instead.
    EXPECT_EQ(Asserts(), (std::vector<std::string>{kTimeoutAssert}));
    EXPECT_EQ(async->mCancels.load(), 1);
    EXPECT_EQ(ML::GetQueuedVideoSourcePrefetchCount(), 1u);

    gate->Open();
    Drain(mVideo);
    EXPECT_FALSE(first->ContinueWaitingForPrefetch(22.0));
    EXPECT_FALSE(second->ContinueWaitingForPrefetch(22.0));
    FrameRef frame;
    EXPECT_EQ(second->GetPrefetchedFrame(frame), QRT::kResult_Success);
    ASSERT_TRUE(frame);
    EXPECT_EQ(frame.Get(), VF::SharedVideoFrameCache::RetrieveFromCache(key).Get());
    EXPECT_EQ(async->Inner().ReadTicks(), (std::vector<int64_t>{4}));
    EXPECT_EQ(Asserts().size(), 1u);
}

TEST_F(MediaNodePrefetcherTest, SilencedTimeoutAssertionStillFallsBack)
{
    ML::SilenceMediaNodePrefetchTimeoutAssertion(true);
    const auto async = QRT::Allocated<TestAsyncVideoSource>::CreateInstance();
    async->mWaitAnswer = false;
    const PrefetchRef handle = Make(SourceRef(async), 4);
    handle->InitiatePrefetch();
    EXPECT_TRUE(handle->ContinueWaitingForPrefetch(20.0));
    Drain(mVideo);
    EXPECT_FALSE(handle->ContinueWaitingForPrefetch(20.0));
    EXPECT_TRUE(Asserts().empty());
    EXPECT_EQ(async->Inner().ReadTicks().size(), 1u);
}

TEST_F(MediaNodePrefetcherTest, BackendAsyncSourceTimesOutThenIsReadThroughTheQueue)
{
    SourceRef pattern;
    ASSERT_TRUE(BE::OpenVideoSource("pattern:moving?size=16x8&rate=25", pattern).Succeeded());
    // Pattern frames have the same key in every run: start from an empty cache.
    VF::SharedVideoFrameCache::Clear();
    const SourceRef slow = BE::CreateAsyncVideoSource(pattern, std::chrono::milliseconds(300),
                                                      std::chrono::milliseconds(10));
    const TickTime time = At(0);
    const Guid key = slow->GetFrameKey(time, {}, {}, {});
    const PrefetchRef handle = ML::CreateMediaNodePrefetcher(slow, time, {}, {}, {});
    ASSERT_TRUE(handle);
    EXPECT_EQ(handle->InitiatePrefetch(), QRT::kResult_Success);
    // Waited 1 s already, well past the source's 10 ms time-out.
    EXPECT_TRUE(handle->ContinueWaitingForPrefetch(1.0));
    EXPECT_EQ(Asserts(), (std::vector<std::string>{kTimeoutAssert}));

    Drain(mVideo);
    EXPECT_FALSE(handle->ContinueWaitingForPrefetch(2.0));
    FrameRef frame;
    EXPECT_EQ(handle->GetPrefetchedFrame(frame), QRT::kResult_Success);
    ASSERT_TRUE(frame);
    EXPECT_EQ(frame->GetBounds().Width(), 16);
    EXPECT_EQ(VF::SharedVideoFrameCache::RetrieveFromCache(key).Get(), frame.Get());
}

TEST_F(MediaNodePrefetcherTest, BackendAsyncSourceDeliversWithinItsTimeout)
{
    SourceRef pattern;
    ASSERT_TRUE(BE::OpenVideoSource("pattern:moving?size=16x8&rate=25", pattern).Succeeded());
    const SourceRef slow =
        BE::CreateAsyncVideoSource(pattern, std::chrono::milliseconds(5), std::chrono::seconds(30));
    const TickTime time = At(mvxmediatypes::kFrameRate_Video1000.GetTicksPerFrame() * 0);
    const PrefetchRef handle = ML::CreateMediaNodePrefetcher(slow, time, {}, {}, {});
    ASSERT_TRUE(handle);
    handle->InitiatePrefetch();
    // Each wait blocks for at most a slice of the source's; the loop ends when
    // the frame is there.
    double elapsed = 0.0;
    while (handle->ContinueWaitingForPrefetch(elapsed))
        elapsed += 0.001;
    FrameRef frame;
    EXPECT_EQ(handle->GetPrefetchedFrame(frame), QRT::kResult_Success);
    EXPECT_TRUE(frame);
    EXPECT_TRUE(Asserts().empty());
    EXPECT_EQ(ML::GetQueuedVideoSourcePrefetchCount(), 0u);
}

TEST_F(MediaNodePrefetcherTest, FlushedRegistryEndsEveryWait)
{
    const auto gate = BlockVideoExecutor();
    const Guid key = mSource->KeyFor(At(13));
    const PrefetchRef first = Make(13);
    const PrefetchRef second = Make(13);
    first->InitiatePrefetch();
    second->InitiatePrefetch();
    const auto async = QRT::Allocated<TestAsyncVideoSource>::CreateInstance();
    const PrefetchRef asyncHandle = Make(SourceRef(async), 13);
    asyncHandle->InitiatePrefetch();

    ML::FlushMediaNodePrefetchRegistry();
    EXPECT_EQ(ML::GetMediaNodePrefetchReferenceCount(key), 0u);
    EXPECT_EQ(async->mCancels.load(), 1);
    EXPECT_FALSE(first->ContinueWaitingForPrefetch(0.0));
    EXPECT_FALSE(second->ContinueWaitingForPrefetch(0.0));
    EXPECT_FALSE(asyncHandle->ContinueWaitingForPrefetch(0.0));
    // Cancels after the flush start and cancel nothing more.
    first->CancelPrefetch();
    asyncHandle->CancelPrefetch();
    EXPECT_EQ(async->mCancels.load(), 1);
    gate->Open();
}

// Threads create, start, poll and cancel handles over a few shared keys while
// the reads run on two executor threads. Afterwards nothing is left registered,
// pinned or queued.
TEST_F(MediaNodePrefetcherTest, ConcurrentHandlesLeaveNothingBehind)
{
    boost::atomic_store(&ML::sVideoSourcePrefetcherQueue,
                        mvxcore::threads::CreateThreadPoolExecutor(2));
    constexpr int kThreads = 4;
    constexpr int kRounds = 150;
    constexpr int kKeys = 5;
    std::atomic<int> framesTaken{0};
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t)
        threads.emplace_back(
            [&, t]
            {
                std::mt19937 random(t + 17);
                for (int round = 0; round < kRounds; ++round)
                {
                    const PrefetchRef handle = Make(random() % kKeys);
                    handle->InitiatePrefetch();
                    if (random() % 3 == 0)
                    {
                        handle->CancelPrefetch();
                        continue;
                    }
                    while (handle->ContinueWaitingForPrefetch(0.0))
                        std::this_thread::yield();
                    FrameRef frame;
                    EXPECT_EQ(handle->GetPrefetchedFrame(frame), QRT::kResult_Success);
                    if (frame)
                        framesTaken.fetch_add(1);
                }
            });
    for (std::thread& thread : threads)
        thread.join();
    const ML::ExecutorRef video = boost::atomic_load(&ML::sVideoSourcePrefetcherQueue);
    video->BeginShutdown();
    video->WaitForRunningTasks();

    EXPECT_GT(framesTaken.load(), 0);
    for (int k = 0; k < kKeys; ++k)
    {
        const Guid key = mSource->KeyFor(At(k));
        EXPECT_EQ(ML::GetMediaNodePrefetchReferenceCount(key), 0u);
        EXPECT_EQ(VF::SharedVideoFrameCache::GetInstance().GetDependencyCount(key), 0u);
    }
    EXPECT_EQ(ML::GetQueuedVideoSourcePrefetchCount(), 0u);
}

} // namespace
