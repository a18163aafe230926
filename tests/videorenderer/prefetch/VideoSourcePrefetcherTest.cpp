#include "prefetch/VideoSourcePrefetcher.h"

#include "ML/RenderStatus.h"
#include "PrefetchFixture.h"

namespace ML::Test
{
namespace
{

using Statuses = std::vector<QRT::Result>;

// Collects the statuses handed to callbacks.
struct CallbackLog
{
    std::mutex mMutex; // guards mStatuses
    Statuses mStatuses;

    VideoSourcePrefetchCallback Callback()
    {
        return [this](QRT::Result inStatus)
        {
            std::lock_guard lock(mMutex);
            mStatuses.push_back(inStatus);
        };
    }
    Statuses Get() { return Locked(mMutex, mStatuses); }
};

class VideoSourcePrefetcherTest : public PrefetchFixture
{
protected:
    void Enqueue(std::int64_t inTicks, CallbackLog& ioLog, const ScriptedSourceRef& inSource = {},
                 bool inNullKey = false)
    {
        const ScriptedSourceRef& source = inSource ? inSource : mSource;
        EnqueueVideoSourcePrefetch(Ticks(inTicks), VideoSourceRef(source), {}, {}, {},
                                   inNullKey ? Guid() : source->KeyFor(Ticks(inTicks)),
                                   ioLog.Callback());
    }

    CallbackLog mLog;
};

TEST_F(VideoSourcePrefetcherTest, ReadsOfOneSourceRunEarliestTimeFirst)
{
    const auto gate = BlockVideoExecutor();
    for (const std::int64_t ticks : {3, 1, 2})
        Enqueue(ticks, mLog);
    EXPECT_EQ(GetQueuedVideoSourcePrefetchCount(), 3u);
    gate->Open();
    Drain(mVideo);
    EXPECT_EQ(mSource->ReadTicks(), (std::vector<std::int64_t>{1, 2, 3}));
    EXPECT_EQ(mLog.Get(), (Statuses{0, 0, 0}));
    EXPECT_EQ(GetQueuedVideoSourcePrefetchCount(), 0u);
}

TEST_F(VideoSourcePrefetcherTest, CancelCallsTheCallbackOnceAndItsTaskRunsTheNextJob)
{
    const auto gate = BlockVideoExecutor();
    CallbackLog cancelled;
    Enqueue(1, cancelled);
    Enqueue(2, mLog);
    // The same key on another source, and a null-key job: neither is cancelled.
    const ScriptedSourceRef other = MakeScriptedSource();
    other->mKeySalt = mSource->mKeySalt;
    CallbackLog otherLog;
    Enqueue(1, otherLog, other);
    Enqueue(3, mLog, {}, true);
    CancelVideoSourcePrefetch(VideoSourceRef(mSource), mSource->KeyFor(Ticks(1)));
    CancelVideoSourcePrefetch(VideoSourceRef(mSource), Guid());
    EXPECT_EQ(cancelled.Get(), Statuses{kResult_Cancelled});
    EXPECT_EQ(GetQueuedVideoSourcePrefetchCount(), 3u);
    // A second cancel finds nothing and calls nothing, nor does one for a source without jobs.
    CancelVideoSourcePrefetch(VideoSourceRef(mSource), mSource->KeyFor(Ticks(1)));
    CancelVideoSourcePrefetch(VideoSourceRef(MakeScriptedSource()), mSource->KeyFor(Ticks(2)));

    gate->Open();
    Drain(mVideo);
    // Four tasks were posted; the first three ran the jobs left, the last found none.
    EXPECT_EQ(mSource->ReadTicks(), (std::vector<std::int64_t>{2, 3}));
    EXPECT_EQ(other->ReadTicks(), (std::vector<std::int64_t>{1}));
    EXPECT_EQ(cancelled.Get().size(), 1u);
    EXPECT_EQ(mLog.Get(), (Statuses{0, 0}));
    EXPECT_EQ(otherLog.Get(), Statuses{0});
}

TEST_F(VideoSourcePrefetcherTest, FlushDropsQueuedJobsWithoutCallbacksAndLaterJobsAreCancelled)
{
    const auto gate = BlockVideoExecutor();
    Enqueue(1, mLog);
    Enqueue(2, mLog);
    // Flush waits for the running (gate) task, so it runs on a thread of its own.
    std::thread flusher([] { FlushVideoSourcePrefetcher(); });
    while (GetQueuedVideoSourcePrefetchCount() != 0)
        std::this_thread::yield();
    gate->Open();
    flusher.join();
    EXPECT_TRUE(mLog.Get().empty());
    EXPECT_TRUE(mSource->ReadTicks().empty());
    EXPECT_TRUE(mVideo->IsShutDown() && mImage->IsShutDown());

    // Enqueued after the flush: cancelled at once instead of waiting forever.
    Enqueue(3, mLog);
    EXPECT_EQ(mLog.Get(), Statuses{kResult_Cancelled});
    EXPECT_EQ(GetQueuedVideoSourcePrefetchCount(), 0u);
}

} // namespace
} // namespace ML::Test
