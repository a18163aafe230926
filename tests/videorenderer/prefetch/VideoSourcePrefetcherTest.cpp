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
                                   VF::kCachePriority_High, ioLog.Callback());
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

// Flush stops each executor (what is queued is destroyed unrun) and then waits
// for what is in flight; reads enqueued afterwards are cancelled at once.
TEST_F(VideoSourcePrefetcherTest, FlushDropsQueuedWorkWaitsForWorkInFlightAndCancelsLaterJobs)
{
    std::mutex eventsMutex; // guards events
    std::vector<std::string> events;
    const auto note = [&](const char* inEvent)
    {
        std::lock_guard lock(eventsMutex);
        events.emplace_back(inEvent);
    };
    const auto started = std::make_shared<Gate>();
    const auto gate = std::make_shared<Gate>();
    ASSERT_TRUE(mVideo->Post(
        [started, gate, note]
        {
            started->Open();
            gate->Wait();
            note("task in flight ended");
        }));
    started->Wait();
    Enqueue(1, mLog);
    Enqueue(2, mLog);
    const auto token = std::make_shared<int>(0);
    ASSERT_TRUE(mVideo->Post([token, note] { note("queued task ran"); }));
    // Flush waits for the task in flight, so it runs on a thread of its own.
    std::thread flusher(
        [note]
        {
            FlushVideoSourcePrefetcher();
            note("flush returned");
        });
    while (!mVideo->IsShutDown())
        std::this_thread::yield();
    gate->Open();
    flusher.join();
    EXPECT_EQ(events, (std::vector<std::string>{"task in flight ended", "flush returned"}));
    EXPECT_EQ(token.use_count(), 1);
    EXPECT_TRUE(mLog.Get().empty());
    EXPECT_TRUE(mSource->ReadTicks().empty());
    EXPECT_TRUE(mImage->IsShutDown());

    Enqueue(3, mLog);
    EXPECT_EQ(mLog.Get(), Statuses{kResult_Cancelled});
    EXPECT_EQ(GetQueuedVideoSourcePrefetchCount(), 0u);
}

} // namespace
} // namespace ML::Test
