#include "prefetch/MediaNodePrefetcher.h"

#include "ML/RenderStatus.h"
#include "PrefetchFixture.h"

#include <random>

namespace ML::Test
{
namespace
{

using PrefetchRef = QRT::InterfaceRef<IRenderableNodePrefetch>;

class MediaNodePrefetcherTest : public PrefetchFixture
{
protected:
    static PrefetchRef Make(const VideoSourceRef& inSource, std::int64_t inTicks,
                            std::int32_t inCachePriority = VF::kCachePriority_High)
    {
        return CreateMediaNodePrefetcher(inSource, Ticks(inTicks), {}, {}, {}, inCachePriority);
    }
    PrefetchRef Make(std::int64_t inTicks) const { return Make(VideoSourceRef(mSource), inTicks); }
    // Two started handles for one time of inSource.
    static std::pair<PrefetchRef, PrefetchRef> StartTwo(const ScriptedSourceRef& inSource,
                                                        std::int64_t inTicks)
    {
        std::pair handles{Make(VideoSourceRef(inSource), inTicks),
                          Make(VideoSourceRef(inSource), inTicks)};
        EXPECT_EQ(handles.first->InitiatePrefetch(), QRT::kResult_Success);
        EXPECT_EQ(handles.second->InitiatePrefetch(), QRT::kResult_Success);
        return handles;
    }
    // A source with enabled asynchronous reads that wants no prefetch.
    static ScriptedSourceRef MakeAsync()
    {
        const ScriptedSourceRef async = MakeScriptedSource();
        async->mAsyncEnabled = async->mNewFrames = true;
        return async;
    }
    // The frame the handle delivers (the call must succeed).
    static FrameRef Taken(const PrefetchRef& inHandle)
    {
        FrameRef frame;
        EXPECT_EQ(inHandle->GetPrefetchedFrame(frame), QRT::kResult_Success);
        return frame;
    }
    static std::uint32_t Dependencies(const Guid& inKey)
    {
        return VF::SharedVideoFrameCache::GetInstance().GetDependencyCount(inKey);
    }
};

// A frame that reaches the cache by another road while the key's read is still
// queued: the last handle, taking it, withdraws the read instead of leaving it
// counted and running for nobody.
TEST_F(MediaNodePrefetcherTest, FrameCachedWhileTheReadIsQueuedWithdrawsTheRead)
{
    const Guid key = mSource->KeyFor(Ticks(5));
    {
        const auto gate = BlockVideoExecutor();
        const PrefetchRef handle = Make(5);
        EXPECT_EQ(handle->InitiatePrefetch(), QRT::kResult_Success);
        EXPECT_EQ(GetQueuedVideoSourcePrefetchCount(), 1u);
        const FrameRef cached = MakeFilledFrame(6, 2, Pixel{});
        VF::SharedVideoFrameCache::InsertIntoCache(cached, key, VF::kCachePriority_High);
        EXPECT_EQ(Taken(handle).Get(), cached.Get());
        EXPECT_EQ(GetQueuedVideoSourcePrefetchCount(), 0u);
        EXPECT_EQ(GetMediaNodePrefetchReferenceCount(key), 0u);
        gate->Open();
    }
    // A frame already cached when the handle starts is taken at once.
    const PrefetchRef handle = Make(5);
    EXPECT_EQ(handle->InitiatePrefetch(), QRT::kResult_Success);
    EXPECT_EQ(GetQueuedVideoSourcePrefetchCount(), 0u);
    EXPECT_EQ(GetMediaNodePrefetchReferenceCount(key), 0u);
    EXPECT_FALSE(handle->ContinueWaitingForPrefetch(0.0));
    EXPECT_TRUE(Taken(handle));
    Drain(mVideo);
    EXPECT_TRUE(mSource->ReadTicks().empty());
}

// A null key starts nothing and registers nothing, so it keeps nobody waiting.
// Asked for its frame, the handle asks the source for what it holds: a frame
// got so is handed out, uncached, with the pending answer, and is the kept
// frame of every later query, which answers 0.
TEST_F(MediaNodePrefetcherTest, NullKeyHandleStartsNothingAndTakesWhatTheSourceHolds)
{
    mSource->mNullKeys = true;
    for (const bool holds : {true, false})
    {
        SCOPED_TRACE(holds ? "source holds the frame" : "source holds nothing");
        const std::int64_t ticks = holds ? 11 : 12;
        if (holds)
            mSource->CompleteRead(Ticks(ticks));
        const std::size_t readsBefore = mSource->ReadTicks().size();
        const std::uint64_t insertions = VF::SharedVideoFrameCache::GetStatistics().mInsertions;
        const PrefetchRef handle = Make(ticks);
        EXPECT_EQ(handle->InitiatePrefetch(), QRT::kResult_Success);
        EXPECT_EQ(GetQueuedVideoSourcePrefetchCount(), 0u);
        EXPECT_FALSE(handle->ContinueWaitingForPrefetch(0.0));
        Drain(mVideo);
        EXPECT_EQ(mSource->ReadTicks().size(), readsBefore);

        FrameRef first;
        EXPECT_EQ(handle->GetPrefetchedFrame(first), kResult_PrefetchIncomplete);
        EXPECT_EQ(first != nullptr, holds);
        FrameRef again;
        EXPECT_EQ(handle->GetPrefetchedFrame(again),
                  holds ? QRT::kResult_Success : kResult_PrefetchIncomplete);
        EXPECT_EQ(again.Get(), first.Get());
        EXPECT_FALSE(handle->ContinueWaitingForPrefetch(0.0));
        EXPECT_EQ(VF::SharedVideoFrameCache::GetStatistics().mInsertions, insertions);
    }
}

// A failed queued read (or one that answers success without a frame) is the
// read's, not the starter's: every handle waiting on its key stops waiting,
// without a frame, and nothing stays registered.
TEST_F(MediaNodePrefetcherTest, FailedReadEndsTheWaitOfEveryHandleOnItsKey)
{
    mSource->mNewFrames = false;
    for (const QRT::Result status : {static_cast<QRT::Result>(0xA0100006u), QRT::kResult_Success})
    {
        SCOPED_TRACE(status);
        mSource->mFrameStatus = status;
        const std::int64_t ticks = QRT::Failed(status) ? 6 : 7;
        const auto gate = BlockVideoExecutor();
        const auto [first, second] = StartTwo(mSource, ticks);
        EXPECT_TRUE(second->ContinueWaitingForPrefetch(0.0));
        gate->Open();
        Drain(mVideo);
        for (const PrefetchRef& handle : {second, first})
        {
            EXPECT_FALSE(handle->ContinueWaitingForPrefetch(0.0));
            EXPECT_FALSE(Taken(handle));
        }
        EXPECT_EQ(GetMediaNodePrefetchReferenceCount(mSource->KeyFor(Ticks(ticks))), 0u);
    }
    EXPECT_EQ(mSource->ReadTicks(), (std::vector<std::int64_t>{6, 7}));
}

TEST_F(MediaNodePrefetcherTest, AsyncReadIsStartedOnceTakenAndWithdrawnByTheLastCancelOrFailure)
{
    const ScriptedSourceRef async = MakeAsync();
    const Guid key = async->KeyFor(Ticks(2));
    const auto [first, second] = StartTwo(async, 2);
    EXPECT_EQ(async->mStarts.load(), 1);
    EXPECT_TRUE(first->ContinueWaitingForPrefetch(0.1));

    async->CompleteRead(Ticks(2));
    EXPECT_FALSE(first->ContinueWaitingForPrefetch(0.2));
    EXPECT_FALSE(second->ContinueWaitingForPrefetch(0.2));
    const FrameRef frame = Taken(first);
    ASSERT_TRUE(frame);
    EXPECT_EQ(Taken(second).Get(), frame.Get());
    EXPECT_EQ(VF::SharedVideoFrameCache::RetrieveFromCache(key).Get(), frame.Get());
    EXPECT_EQ(async->mCancels.load(), 0);

    const ScriptedSourceRef cancelled = MakeAsync();
    const auto [a, b] = StartTwo(cancelled, 2);
    a->CancelPrefetch();
    EXPECT_EQ(cancelled->mCancels.load(), 0);
    b->CancelPrefetch();
    EXPECT_EQ(cancelled->mCancels.load(), 1);

    // A failed start leaves the handle inert.
    const ScriptedSourceRef failing = MakeAsync();
    const QRT::Result failure = static_cast<QRT::Result>(0xA0100004u);
    failing->mStartStatus = failure;
    const PrefetchRef handle = Make(VideoSourceRef(failing), 3);
    EXPECT_EQ(handle->InitiatePrefetch(), failure);
    EXPECT_EQ(GetMediaNodePrefetchReferenceCount(failing->KeyFor(Ticks(3))), 0u);
    EXPECT_FALSE(handle->ContinueWaitingForPrefetch(0.0));
    EXPECT_FALSE(Taken(handle));
    EXPECT_EQ(handle->CancelPrefetch(), QRT::kResult_Success);
    EXPECT_EQ(failing->mCancels.load(), 0);
}

TEST_F(MediaNodePrefetcherTest, AsyncTimeoutAssertsOnceUnlessSilencedAndFallsBackToTheQueue)
{
    for (const bool silenced : {false, true})
    {
        SCOPED_TRACE(silenced ? "silenced" : "asserting");
        SilenceMediaNodePrefetchTimeoutAssertion(silenced);
        const std::size_t assertsBefore = Asserts().size();
        const ScriptedSourceRef async = MakeAsync();
        async->mWaitAnswer = false;
        const std::int64_t ticks = silenced ? 5 : 4;
        const auto gate = BlockVideoExecutor();
        const auto [first, second] = StartTwo(async, ticks);
        EXPECT_TRUE(first->ContinueWaitingForPrefetch(20.0));
        EXPECT_TRUE(second->ContinueWaitingForPrefetch(20.0));
        EXPECT_TRUE(first->ContinueWaitingForPrefetch(21.0));
        // One report for the read, its start withdrawn, one queued read instead.
        EXPECT_EQ(Asserts().size() - assertsBefore, silenced ? 0u : 1u);
        EXPECT_EQ(async->mCancels.load(), 1);
        EXPECT_EQ(GetQueuedVideoSourcePrefetchCount(), 1u);

        gate->Open();
        Drain(mVideo);
        EXPECT_FALSE(first->ContinueWaitingForPrefetch(22.0));
        EXPECT_FALSE(second->ContinueWaitingForPrefetch(22.0));
        const FrameRef frame = Taken(second);
        ASSERT_TRUE(frame);
        EXPECT_EQ(frame.Get(),
                  VF::SharedVideoFrameCache::RetrieveFromCache(async->KeyFor(Ticks(ticks))).Get());
        EXPECT_EQ(async->ReadTicks(), std::vector<std::int64_t>{ticks});
    }
    EXPECT_EQ(Asserts(), std::vector<std::string>{
                             "false|We have timed out on an async source. This probably shouldn't "
                             "happen and will result in performance problems."});
}

TEST_F(MediaNodePrefetcherTest, FlushedRegistryEndsEveryWait)
{
    const auto gate = BlockVideoExecutor();
    const Guid key = mSource->KeyFor(Ticks(13));
    const auto [first, second] = StartTwo(mSource, 13);
    const ScriptedSourceRef async = MakeAsync();
    const PrefetchRef asyncHandle = Make(VideoSourceRef(async), 13);
    asyncHandle->InitiatePrefetch();

    FlushMediaNodePrefetchRegistry();
    EXPECT_EQ(GetMediaNodePrefetchReferenceCount(key), 0u);
    EXPECT_EQ(async->mCancels.load(), 1);
    for (const PrefetchRef& handle : {first, second, asyncHandle})
        EXPECT_FALSE(handle->ContinueWaitingForPrefetch(0.0));
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
    const ExecutorRef video = UseTwoVideoThreads();
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
                    if (Taken(handle))
                        framesTaken.fetch_add(1);
                }
            });
    for (std::thread& thread : threads)
        thread.join();
    video->BeginShutdown();
    video->WaitForRunningTasks();

    EXPECT_GT(framesTaken.load(), 0);
    for (int k = 0; k < kKeys; ++k)
    {
        EXPECT_EQ(GetMediaNodePrefetchReferenceCount(mSource->KeyFor(Ticks(k))), 0u);
        EXPECT_EQ(Dependencies(mSource->KeyFor(Ticks(k))), 0u);
    }
    EXPECT_EQ(GetQueuedVideoSourcePrefetchCount(), 0u);
}

} // namespace
} // namespace ML::Test
