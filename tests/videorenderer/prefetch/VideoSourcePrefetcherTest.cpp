#include "prefetch/VideoSourcePrefetcher.h"

#include "BE/VideoSources.h"
#include "ML/RenderStatus.h"
#include "PrefetchTestSupport.h"
#include "mvxcore/config/Error.h"

#include <atomic>
#include <mutex>
#include <random>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using namespace prefetch_test;

TickTime At(int64_t inTicks)
{
    return TickTime::TicksToTime(inTicks);
}

// Collects the statuses handed to callbacks.
struct CallbackLog
{
    std::mutex mMutex;
    std::vector<QRT::Result> mStatuses;

    ML::VideoSourcePrefetchCallback Callback()
    {
        return [this](QRT::Result inStatus)
        {
            std::lock_guard lock(mMutex);
            mStatuses.push_back(inStatus);
        };
    }
    std::vector<QRT::Result> Statuses()
    {
        std::lock_guard lock(mMutex);
        return mStatuses;
    }
};

class VideoSourcePrefetcherTest : public PrefetchExecutorFixture
{
protected:
    void SetUp() override
    {
        PrefetchExecutorFixture::SetUp();
        mSource = QRT::Allocated<TestVideoSource>::CreateInstance();
    }

    // Holds the video executor's only thread until the gate opens, so that
    // everything enqueued meanwhile is queued before any task runs.
    std::shared_ptr<Gate> BlockVideoExecutor()
    {
        auto gate = std::make_shared<Gate>();
        EXPECT_TRUE(mVideo->Post([gate] { gate->Wait(); }));
        return gate;
    }

    void Enqueue(int64_t inTicks, const Guid& inKey, ML::VideoSourcePrefetchCallback inCallback)
    {
        ML::EnqueueVideoSourcePrefetch(At(inTicks), SourceRef(mSource), {}, {}, {}, inKey,
                                       std::move(inCallback));
    }

    QRT::InterfaceRef<TestVideoSource> mSource;
    CallbackLog mLog;
};

TEST_F(VideoSourcePrefetcherTest, ReadsOfOneSourceRunEarliestTimeFirst)
{
    const auto gate = BlockVideoExecutor();
    Enqueue(3, mSource->KeyFor(At(3)), mLog.Callback());
    Enqueue(1, mSource->KeyFor(At(1)), mLog.Callback());
    Enqueue(2, mSource->KeyFor(At(2)), mLog.Callback());
    EXPECT_EQ(ML::GetQueuedVideoSourcePrefetchCount(), 3u);
    gate->Open();
    Drain(mVideo);

    EXPECT_EQ(mSource->ReadTicks(), (std::vector<int64_t>{1, 2, 3}));
    EXPECT_EQ(mLog.Statuses(), (std::vector<QRT::Result>{0, 0, 0}));
    EXPECT_EQ(ML::GetQueuedVideoSourcePrefetchCount(), 0u);
}

TEST_F(VideoSourcePrefetcherTest, SuccessfulReadIsCachedUnderItsKey)
{
    const Guid key = mSource->KeyFor(At(7));
    Enqueue(7, key, mLog.Callback());
    Drain(mVideo);

    const FrameRef cached = VF::SharedVideoFrameCache::RetrieveFromCache(key);
    ASSERT_TRUE(cached);
    EXPECT_EQ(cached->GetBounds().Width(), 4);
    EXPECT_EQ(mLog.Statuses(), (std::vector<QRT::Result>{QRT::kResult_Success}));
}

TEST_F(VideoSourcePrefetcherTest, NullKeyReadIsDeliveredButNotCached)
{
    const uint64_t before = VF::SharedVideoFrameCache::GetStatistics().mInsertions +
                            VF::SharedVideoFrameCache::GetStatistics().mRefused;
    Enqueue(5, Guid(), mLog.Callback());
    Drain(mVideo);

    EXPECT_EQ(mSource->ReadTicks(), (std::vector<int64_t>{5}));
    EXPECT_EQ(mLog.Statuses(), (std::vector<QRT::Result>{QRT::kResult_Success}));
    const uint64_t after = VF::SharedVideoFrameCache::GetStatistics().mInsertions +
                           VF::SharedVideoFrameCache::GetStatistics().mRefused;
    EXPECT_EQ(after, before);
}

TEST_F(VideoSourcePrefetcherTest, FailedReadIsNotCachedAndReportsItsStatus)
{
    const QRT::Result failure = static_cast<QRT::Result>(0xA0100003u);
    mSource->mReadStatus = failure;
    const Guid key = mSource->KeyFor(At(4));
    Enqueue(4, key, mLog.Callback());
    Drain(mVideo);

    EXPECT_EQ(mLog.Statuses(), (std::vector<QRT::Result>{failure}));
    EXPECT_FALSE(VF::SharedVideoFrameCache::RetrieveFromCache(key));
}

TEST_F(VideoSourcePrefetcherTest, CancelCallsTheCallbackOnceAndItsTaskRunsTheNextJob)
{
    const auto gate = BlockVideoExecutor();
    CallbackLog cancelled;
    Enqueue(1, mSource->KeyFor(At(1)), cancelled.Callback());
    Enqueue(2, mSource->KeyFor(At(2)), mLog.Callback());

    ML::CancelVideoSourcePrefetch(SourceRef(mSource), mSource->KeyFor(At(1)));
    EXPECT_EQ(cancelled.Statuses(), (std::vector<QRT::Result>{ML::kResult_Cancelled}));
    EXPECT_EQ(ML::GetQueuedVideoSourcePrefetchCount(), 1u);
    // A second cancel finds nothing and calls nothing.
    ML::CancelVideoSourcePrefetch(SourceRef(mSource), mSource->KeyFor(At(1)));

    gate->Open();
    Drain(mVideo);
    // Two tasks were posted; the first ran the job at 2, the second found none.
    EXPECT_EQ(mSource->ReadTicks(), (std::vector<int64_t>{2}));
    EXPECT_EQ(cancelled.Statuses().size(), 1u);
    EXPECT_EQ(mLog.Statuses(), (std::vector<QRT::Result>{QRT::kResult_Success}));
}

TEST_F(VideoSourcePrefetcherTest, CancelWithTheNullKeyDoesNothing)
{
    const auto gate = BlockVideoExecutor();
    Enqueue(1, Guid(), mLog.Callback());
    ML::CancelVideoSourcePrefetch(SourceRef(mSource), Guid());
    EXPECT_TRUE(mLog.Statuses().empty());
    EXPECT_EQ(ML::GetQueuedVideoSourcePrefetchCount(), 1u);
    gate->Open();
    Drain(mVideo);
    EXPECT_EQ(mLog.Statuses(), (std::vector<QRT::Result>{QRT::kResult_Success}));
}

TEST_F(VideoSourcePrefetcherTest, CancelOnlyTouchesTheGivenSource)
{
    const auto gate = BlockVideoExecutor();
    const auto other = QRT::Allocated<TestVideoSource>::CreateInstance();
    other->mKeySalt = mSource->mKeySalt; // the same keys on another source
    CallbackLog otherLog;
    Enqueue(1, mSource->KeyFor(At(1)), mLog.Callback());
    ML::EnqueueVideoSourcePrefetch(At(1), SourceRef(other), {}, {}, {}, other->KeyFor(At(1)),
                                   otherLog.Callback());
    ML::CancelVideoSourcePrefetch(SourceRef(other), other->KeyFor(At(1)));
    EXPECT_EQ(otherLog.Statuses(), (std::vector<QRT::Result>{ML::kResult_Cancelled}));
    gate->Open();
    Drain(mVideo);
    EXPECT_EQ(mLog.Statuses(), (std::vector<QRT::Result>{QRT::kResult_Success}));
    EXPECT_TRUE(other->ReadTicks().empty());
}

TEST_F(VideoSourcePrefetcherTest, ImageSourcesAreReadOnTheImageExecutor)
{
    const auto image = QRT::Allocated<TestVideoSource>::CreateInstance();
    image->mImage = true;
    ML::EnqueueVideoSourcePrefetch(At(1), SourceRef(image), {}, {}, {}, Guid(), {});
    Enqueue(1, Guid(), {});
    Drain(mImage);
    Drain(mVideo);
    EXPECT_EQ(image->ReadOnImageExecutor(), (std::vector<bool>{true}));
    EXPECT_EQ(mSource->ReadOnImageExecutor(), (std::vector<bool>{false}));
}

TEST_F(VideoSourcePrefetcherTest, FlushDropsQueuedJobsWithoutCallbacks)
{
    const auto gate = BlockVideoExecutor();
    Enqueue(1, mSource->KeyFor(At(1)), mLog.Callback());
    Enqueue(2, mSource->KeyFor(At(2)), mLog.Callback());
    // Flush waits for the running (gate) task, so it runs on a thread of its own.
    std::thread flusher([] { ML::FlushVideoSourcePrefetcher(); });
    while (ML::GetQueuedVideoSourcePrefetchCount() != 0)
        std::this_thread::yield();
    gate->Open();
    flusher.join();

    EXPECT_TRUE(mLog.Statuses().empty());
    EXPECT_TRUE(mSource->ReadTicks().empty());
    EXPECT_TRUE(mVideo->IsShutDown());
    EXPECT_TRUE(mImage->IsShutDown());
}

TEST_F(VideoSourcePrefetcherTest, EnqueueAfterFlushReportsCancelledInsteadOfWaitingForever)
{
    ML::FlushVideoSourcePrefetcher();
    Enqueue(1, mSource->KeyFor(At(1)), mLog.Callback());
    EXPECT_EQ(mLog.Statuses(), (std::vector<QRT::Result>{ML::kResult_Cancelled}));
    EXPECT_EQ(ML::GetQueuedVideoSourcePrefetchCount(), 0u);
}

TEST_F(VideoSourcePrefetcherTest, EnqueueWithoutExecutorsViolatesItsInputContract)
{
    std::string expression;
    const auto savedHook = mvxcore::debug::SetContractDialogHook(
        [&expression](const mvxcore::debug::ContractFailure& inFailure)
        {
            expression = std::string(inFailure.expression);
            return false;
        });
    boost::atomic_store(&ML::sImageSourcePrefetcherQueue, ML::ExecutorRef());
    EXPECT_THROW(Enqueue(1, mSource->KeyFor(At(1)), mLog.Callback()), mvxcore::config::Error);
    mvxcore::debug::SetContractDialogHook(savedHook);
    boost::atomic_store(&ML::sImageSourcePrefetcherQueue, mImage);

    EXPECT_EQ(expression,
              "sVideoSourcePrefetcherQueue != NULL && sImageSourcePrefetcherQueue != NULL");
    EXPECT_EQ(ML::GetQueuedVideoSourcePrefetchCount(), 0u);
    EXPECT_TRUE(mLog.Statuses().empty());
}

TEST_F(VideoSourcePrefetcherTest, ReadsThroughTheBackendLatencySource)
{
    SourceRef pattern;
    ASSERT_TRUE(BE::OpenVideoSource("pattern:moving?size=16x8&rate=25", pattern).Succeeded());
    const SourceRef slow = BE::CreateLatencyVideoSource(pattern, std::chrono::milliseconds(2));
    const TickTime time = At(0);
    const Guid key = slow->GetFrameKey(time, {}, {}, {});
    ASSERT_FALSE(key.IsNil());
    VF::SharedVideoFrameCache::Clear();
    ML::EnqueueVideoSourcePrefetch(time, slow, {}, {}, {}, key, mLog.Callback());
    Drain(mVideo);

    EXPECT_EQ(mLog.Statuses(), (std::vector<QRT::Result>{QRT::kResult_Success}));
    const FrameRef cached = VF::SharedVideoFrameCache::RetrieveFromCache(key);
    ASSERT_TRUE(cached);
    EXPECT_EQ(cached->GetBounds().Width(), 16);
    EXPECT_EQ(cached->GetBounds().Height(), 8);
}

// Many threads enqueue and cancel reads of a few sources while two executor
// threads run them: every job ends exactly once, as a read or a cancellation.
TEST_F(VideoSourcePrefetcherTest, ConcurrentEnqueueAndCancelEndEveryJobExactlyOnce)
{
    boost::atomic_store(&ML::sVideoSourcePrefetcherQueue,
                        mvxcore::threads::CreateThreadPoolExecutor(2));
    std::vector<QRT::InterfaceRef<TestVideoSource>> sources;
    for (int i = 0; i < 3; ++i)
        sources.push_back(QRT::Allocated<TestVideoSource>::CreateInstance());

    constexpr int kThreads = 4;
    constexpr int kJobsPerThread = 200;
    std::atomic<int> completed{0};
    std::atomic<int> cancelled{0};
    std::atomic<int> other{0};
    auto callback = [&](QRT::Result inStatus)
    {
        if (inStatus == QRT::kResult_Success)
            completed.fetch_add(1);
        else if (inStatus == ML::kResult_Cancelled)
            cancelled.fetch_add(1);
        else
            other.fetch_add(1);
    };
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t)
        threads.emplace_back(
            [&, t]
            {
                std::mt19937 random(t);
                for (int j = 0; j < kJobsPerThread; ++j)
                {
                    const auto& source = sources[random() % sources.size()];
                    const int64_t ticks = t * 100000 + j;
                    ML::EnqueueVideoSourcePrefetch(At(ticks), SourceRef(source), {}, {}, {},
                                                   source->KeyFor(At(ticks)), callback);
                    if (random() % 2)
                        ML::CancelVideoSourcePrefetch(SourceRef(source), source->KeyFor(At(ticks)));
                }
            });
    for (std::thread& thread : threads)
        thread.join();
    const ML::ExecutorRef video = boost::atomic_load(&ML::sVideoSourcePrefetcherQueue);
    while (ML::GetQueuedVideoSourcePrefetchCount() != 0)
        std::this_thread::yield();
    video->BeginShutdown();
    video->WaitForRunningTasks();

    size_t reads = 0;
    for (const auto& source : sources)
        reads += source->ReadTicks().size();
    EXPECT_EQ(completed.load() + cancelled.load(), kThreads * kJobsPerThread);
    EXPECT_EQ(other.load(), 0);
    EXPECT_EQ(reads, static_cast<size_t>(completed.load()));
}

} // namespace
