#include "PrefetchedRender.h"

#include "ML/RenderFrameQueue.h"
#include "ML/VideoRenderer.h"
#include "TestSource.h"
#include "Waiting.h"
#include "mvxcore/threads/ExecutorFactories.h"

#include <mutex>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using vrtest::TestPrefetch;
using vrtest::TestSource;

// What the task saw when it ran.
struct TaskRun
{
    std::thread::id mThread;
    bool mCancelled = false;
    int mStatus = -1;
    bool mPrefetchComplete = false;
    // The handle was still alive although only the request had held it.
    bool mHandleAlive = false;
};

// A prefetch handle that says when it is destroyed.
class TrackedPrefetch : public TestPrefetch
{
public:
    std::atomic<bool>* mDestroyed = nullptr;
    ~TrackedPrefetch() { *mDestroyed = true; }
};

struct Case
{
    const char* mName;
    bool mCancel;
    // The executor refuses tasks (shut down): the task runs where the queue delivered.
    bool mRefused;
};

TEST(PrefetchedRenderTest, TaskRunsOnceOnTheExecutorWithThePrefetchHeld)
{
    const Case cases[] = {
        {"completed", false, false}, {"cancelled", true, false}, {"refused", false, true}};
    ML::VideoRenderer::Initialize();
    for (const Case& test : cases)
    {
        SCOPED_TRACE(test.mName);
        const auto executor = mvxcore::threads::CreateThreadPoolExecutor(1);
        // The pool's one thread waits at the gate until the queue has
        // delivered and dropped its request.
        vrtest::Gate gate;
        std::thread::id poolThread;
        ASSERT_TRUE(executor->Post(
            [&]
            {
                poolThread = std::this_thread::get_id();
                gate.Wait();
            }));
        if (test.mRefused)
        {
            gate.Open();
            executor->BeginShutdown();
            executor->WaitForRunningTasks();
        }

        auto source = QRT::Allocated<TestSource>::CreateInstance();
        std::atomic<bool> destroyed{false};
        auto prefetch = QRT::Allocated<TrackedPrefetch>::CreateInstance();
        prefetch->mDestroyed = &destroyed;
        source->mPrefetch = prefetch;
        TrackedPrefetch* const handle = prefetch.Get();
        std::mutex mutex;
        std::vector<TaskRun> runs;
        ML::CutlistRenderParams params;
        params.mWidth = params.mHeight = 8;
        const unsigned int id = ML::GetNextRequestID();
        vrender::InitiatePrefetchedRender(source, MF::FrameTime(), params, id, executor,
                                          [&](bool inCancelled, int inStatus)
                                          {
                                              const bool alive = !destroyed.load();
                                              std::lock_guard lock(mutex);
                                              runs.push_back(
                                                  {std::this_thread::get_id(), inCancelled,
                                                   inStatus, alive && handle->IsComplete(), alive});
                                          });
        // From here on only the request holds the handle.
        source->mPrefetch.Reset();
        if (test.mCancel)
            ML::CancelRender(id);
        else
            prefetch->Complete(vrtest::MakeFrame(8, 8));
        prefetch.Reset();
        ASSERT_TRUE(vrtest::WaitUntil(
            [] { return ML::RenderFrameQueue::Create()->GetStatistics().mPrefetchWaiting == 0; }));
        gate.Open();
        ASSERT_TRUE(vrtest::WaitUntil(
            [&]
            {
                std::lock_guard lock(mutex);
                return !runs.empty();
            }));
        executor->BeginShutdown();
        executor->WaitForRunningTasks();
        std::lock_guard lock(mutex);
        ASSERT_EQ(runs.size(), 1u);
        EXPECT_EQ(runs[0].mThread == poolThread, !test.mRefused);
        EXPECT_EQ(runs[0].mCancelled, test.mCancel);
        EXPECT_EQ(runs[0].mStatus, 0);
        EXPECT_EQ(runs[0].mPrefetchComplete, !test.mCancel);
        EXPECT_TRUE(runs[0].mHandleAlive);
        // The task renders; the helper does not.
        EXPECT_EQ(source->mRenderCount.load(), 0);
        // Released once the task has run.
        EXPECT_TRUE(vrtest::WaitUntil([&] { return destroyed.load(); }));
    }
    ML::VideoRenderer::Shutdown();
}

} // namespace
