#include "PrefetchedRender.h"

#include "ML/RenderFrameQueue.h"
#include "ML/VideoRenderer.h"
#include "TestSource.h"
#include "Waiting.h"
#include "mvxcore/threads/ExecutorFactories.h"

#include <atomic>
#include <thread>

#include <gtest/gtest.h>

namespace
{

using vrtest::SourceFailure;

// A prefetch handle that says when it is destroyed.
class TrackedPrefetch : public vrtest::TestPrefetch
{
public:
    std::atomic<bool>* mDestroyed = nullptr;
    ~TrackedPrefetch() { *mDestroyed = true; }
};

// Notes whether its prefetch handle is still alive and complete when it renders.
class ProbeSource : public vrtest::TestSource
{
public:
    std::atomic<bool>* mDestroyed = nullptr;
    vrtest::TestPrefetch* mHandle = nullptr;
    std::atomic<bool> mHeldWhileRendering{false};

    void RenderFrame(const MF::FrameTime& inTime, const ML::CutlistRenderParams& inParams,
                     vrtest::FrameRef& outFrame) override
    {
        mHeldWhileRendering = !mDestroyed->load() && mHandle->IsComplete();
        TestSource::RenderFrame(inTime, inParams, outFrame);
    }
};

struct Case
{
    bool mCancel;
    // The executor refuses tasks: the render runs where the queue delivered.
    bool mRefused;
    SourceFailure mFailure;
};

TEST(PrefetchedRenderTest, RendersOnceOnTheExecutorWithThePrefetchHeld)
{
    const Case cases[] = {{false, false, SourceFailure::kNone},
                          {true, false, SourceFailure::kNone},
                          {false, true, SourceFailure::kNone},
                          {false, false, SourceFailure::kRenderRequestException},
                          {false, false, SourceFailure::kStdException}};
    ML::VideoRenderer::Initialize();
    for (const Case& test : cases)
    {
        SCOPED_TRACE(::testing::Message() << test.mCancel << test.mRefused << int(test.mFailure));
        const auto executor = mvxcore::threads::CreateThreadPoolExecutor(1);
        // The pool's thread waits at the gate until the queue is done with the request.
        vrtest::Gate gate;
        std::thread::id poolThread;
        ASSERT_TRUE(executor->Post([&] { poolThread = std::this_thread::get_id(), gate.Wait(); }));
        if (test.mRefused)
        {
            gate.Open();
            executor->BeginShutdown();
            executor->WaitForRunningTasks();
        }

        std::atomic<bool> destroyed{false};
        auto prefetch = QRT::Allocated<TrackedPrefetch>::CreateInstance();
        prefetch->mDestroyed = &destroyed;
        auto source = QRT::Allocated<ProbeSource>::CreateInstance();
        source->mPrefetch = prefetch;
        source->mHandle = prefetch.Get();
        source->mDestroyed = &destroyed;
        source->mFailure = test.mFailure;
        // Written by inDone, read once it has run.
        std::atomic<int> runs{0};
        std::thread::id thread;
        bool framed = false, cancelled = false, failed = false, released = false;
        int status = -1;
        ML::CutlistRenderParams params;
        params.mWidth = params.mHeight = 8;
        const unsigned int id = ML::GetNextRequestID();
        vrender::InitiatePrefetchedRender(
            source, MF::FrameTime(), params, id, executor,
            [&](QRT::InterfaceRef<MF::IVideoFrame> inFrame, bool inCancelled, int inStatus,
                std::exception_ptr inFailure)
            {
                thread = std::this_thread::get_id();
                framed = inFrame && vrtest::IsFilledWith(inFrame, source->mColor);
                cancelled = inCancelled;
                status = inStatus;
                failed = inFailure != nullptr;
                released = destroyed.load();
                ++runs;
            });
        // From here on only the request holds the handle.
        source->mPrefetch.Reset();
        test.mCancel ? ML::CancelRender(id) : prefetch->Complete(vrtest::MakeFrame(8, 8));
        prefetch.Reset();
        ASSERT_TRUE(vrtest::WaitUntil(
            []
            {
                const auto queued = ML::RenderFrameQueue::Create()->GetStatistics();
                return queued.mIncoming + queued.mPending + queued.mPrefetchWaiting == 0;
            }));
        // The queue takes up a later request only once it is done with this one.
        std::atomic<bool> fenced{false};
        ML::InitiateRender(QRT::Allocated<vrtest::TestSource>::CreateInstance(), MF::FrameTime(),
                           params, ML::GetNextRequestID(), [&](auto&&...) { fenced = true; });
        ASSERT_TRUE(vrtest::WaitUntil([&] { return fenced.load(); }));
        gate.Open();
        ASSERT_TRUE(vrtest::WaitUntil([&] { return runs.load() > 0; }));
        executor->BeginShutdown();
        executor->WaitForRunningTasks();
        EXPECT_EQ(runs.load(), 1);
        EXPECT_EQ(thread == poolThread, !test.mRefused);
        EXPECT_EQ(cancelled, test.mCancel);
        EXPECT_EQ(status, 0);
        EXPECT_EQ(source->mRenderCount.load(), test.mCancel ? 0 : 1);
        EXPECT_EQ(source->mHeldWhileRendering.load(), !test.mCancel);
        EXPECT_EQ(framed, !test.mCancel && test.mFailure == SourceFailure::kNone);
        EXPECT_EQ(failed, test.mFailure == SourceFailure::kStdException);
        // Let go before inDone when the render ran on the pool (the queue
        // itself still holds the request while it delivers inline).
        EXPECT_TRUE(released || test.mRefused);
    }
    ML::VideoRenderer::Shutdown();
}

} // namespace
