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

// A prefetch handle that says when it is destroyed.
class TrackedPrefetch : public vrtest::TestPrefetch
{
public:
    std::atomic<bool>* mDestroyed = nullptr;
    ~TrackedPrefetch() { *mDestroyed = true; }
};

TEST(PrefetchedRenderTest, TaskRunsOnceOnTheExecutorWithThePrefetchStillHeld)
{
    // {cancelled, the executor refuses tasks (the task then runs where the queue delivered)}
    const bool cases[][2] = {{false, false}, {true, false}, {false, true}};
    ML::VideoRenderer::Initialize();
    for (const auto& [cancel, refused] : cases)
    {
        SCOPED_TRACE(::testing::Message() << cancel << refused);
        const auto executor = mvxcore::threads::CreateThreadPoolExecutor(1);
        // The pool's thread waits at the gate until the queue is done with the request.
        vrtest::Gate gate;
        std::thread::id poolThread;
        ASSERT_TRUE(executor->Post([&] { poolThread = std::this_thread::get_id(), gate.Wait(); }));
        if (refused)
        {
            gate.Open();
            executor->BeginShutdown();
            executor->WaitForRunningTasks();
        }

        std::atomic<bool> destroyed{false};
        auto prefetch = QRT::Allocated<TrackedPrefetch>::CreateInstance();
        prefetch->mDestroyed = &destroyed;
        auto source = QRT::Allocated<vrtest::TestSource>::CreateInstance();
        source->mPrefetch = prefetch;
        TrackedPrefetch* const handle = prefetch.Get();
        // Written by the task, read once it has run: runs, thread, cancelled, status, complete.
        std::atomic<int> runs{0};
        std::thread::id thread;
        int seen[3] = {-1, -1, -1};
        ML::CutlistRenderParams params;
        params.mWidth = params.mHeight = 8;
        const unsigned int id = ML::GetNextRequestID();
        vrender::InitiatePrefetchedRender(source, MF::FrameTime(), params, id, executor,
                                          [&](bool inCancelled, int inStatus)
                                          {
                                              // Only the request held the handle.
                                              const bool alive = !destroyed.load();
                                              thread = std::this_thread::get_id();
                                              seen[0] = inCancelled;
                                              seen[1] = inStatus;
                                              seen[2] = alive && handle->IsComplete();
                                              ++runs;
                                          });
        source->mPrefetch.Reset();
        cancel ? ML::CancelRender(id) : prefetch->Complete(vrtest::MakeFrame(8, 8));
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
        EXPECT_EQ(thread == poolThread, !refused);
        EXPECT_EQ(seen[0], cancel);
        EXPECT_EQ(seen[1], 0);
        EXPECT_EQ(seen[2], !cancel) << "the prefetch was not complete, or no longer held";
        // The task renders, not the helper; the handle goes once the task has run.
        EXPECT_EQ(source->mRenderCount.load(), 0);
        EXPECT_TRUE(vrtest::WaitUntil([&] { return destroyed.load(); }));
    }
    ML::VideoRenderer::Shutdown();
}

} // namespace
