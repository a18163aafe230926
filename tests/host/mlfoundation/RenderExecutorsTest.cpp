#include "ML/RenderExecutors.h"

#include "ExecutorTestSupport.h"
#include "mvxcore/threads/ExecutorFactories.h"

#include <array>
#include <atomic>
#include <thread>

#include <gtest/gtest.h>

namespace
{

using mvxcore::testing::CountingSignal;
using mvxcore::testing::Gate;
using mvxcore::testing::Rendezvous;
using mvxcore::testing::Tracked;

std::array<ML::ExecutorRef, 4> CurrentExecutors()
{
    return {ML::sNormalPriorityRenderQueue, ML::sLowPriorityRenderQueue,
            ML::sVideoSourcePrefetcherQueue, ML::sImageSourcePrefetcherQueue};
}

// Every case starts from a host whose executors are down and leaves it so.
class RenderExecutorsTest : public ::testing::Test
{
protected:
    void SetUp() override { ML::Foundation::ShutDown(); }
    void TearDown() override { ML::Foundation::ShutDown(); }

    // Posts to each executor a task that reports whether it runs on that
    // executor's own thread; answers how many did.
    static int RunOneTaskOnEach()
    {
        std::atomic<int> onOwnThread{0};
        CountingSignal done;
        for (const ML::ExecutorRef& executor : CurrentExecutors())
        {
            mvxcore::threads::AsyncThreadedExecutor* raw = executor.get();
            EXPECT_TRUE(executor->Post(
                [&, raw]
                {
                    if (raw->IsCurrentThreadOrShutDown())
                        ++onOwnThread;
                    done.Notify();
                }));
        }
        EXPECT_TRUE(done.WaitFor(4));
        return onOwnThread.load();
    }

    // True when inExecutor can run inCount tasks at once.
    static bool RunsAtOnce(const ML::ExecutorRef& inExecutor, int inCount)
    {
        Rendezvous meeting(inCount);
        std::atomic<int> met{0};
        CountingSignal done;
        for (int i = 0; i < inCount; ++i)
        {
            inExecutor->Post(
                [&]
                {
                    if (meeting.Arrive())
                        ++met;
                    done.Notify();
                });
        }
        return done.WaitFor(inCount) && met.load() == inCount;
    }
};

TEST_F(RenderExecutorsTest, NoExecutorExistsBeforeStartUp)
{
    for (const ML::ExecutorRef& executor : CurrentExecutors())
        EXPECT_FALSE(executor);
}

TEST_F(RenderExecutorsTest, StartUpCreatesFourDistinctWorkingExecutors)
{
    ML::Foundation::StartUp();
    const auto executors = CurrentExecutors();
    for (size_t i = 0; i < executors.size(); ++i)
    {
        ASSERT_TRUE(executors[i]) << "executor " << i;
        EXPECT_FALSE(executors[i]->IsShutDown());
        for (size_t j = 0; j < i; ++j)
            EXPECT_NE(executors[i], executors[j]);
    }
    EXPECT_EQ(RunOneTaskOnEach(), 4);
}

TEST_F(RenderExecutorsTest, ExecutorsRunTheirDocumentedNumberOfTasksAtOnce)
{
    ML::Foundation::StartUp();
    EXPECT_TRUE(RunsAtOnce(ML::sNormalPriorityRenderQueue,
                           static_cast<int>(mvxcore::threads::GetCPUCoreCount())));
    EXPECT_TRUE(RunsAtOnce(ML::sLowPriorityRenderQueue,
                           static_cast<int>(ML::Foundation::GetLowPriorityRenderThreadCount())));
    EXPECT_TRUE(RunsAtOnce(ML::sVideoSourcePrefetcherQueue, ML::kSourcePrefetcherThreadCount));
    EXPECT_TRUE(RunsAtOnce(ML::sImageSourcePrefetcherQueue, ML::kSourcePrefetcherThreadCount));
}

TEST_F(RenderExecutorsTest, StartUpTwiceKeepsTheRunningExecutors)
{
    ML::Foundation::StartUp();
    const auto first = CurrentExecutors();
    ML::Foundation::StartUp();
    EXPECT_EQ(CurrentExecutors(), first);
}

TEST_F(RenderExecutorsTest, ShutDownStopsAndResetsAllFourAndDropsTheirPendingTasks)
{
    ML::Foundation::StartUp();
    const auto executors = CurrentExecutors();
    Gate gate;
    CountingSignal blockersStarted;
    std::atomic<int> live{0};
    std::atomic<int> ran{0};
    // The two-thread prefetch queues are filled up so that work stays queued.
    for (const ML::ExecutorRef& executor : {executors[2], executors[3]})
    {
        for (unsigned i = 0; i < ML::kSourcePrefetcherThreadCount; ++i)
        {
            executor->Post(
                [&]
                {
                    blockersStarted.Notify();
                    gate.Pass();
                });
        }
    }
    ASSERT_TRUE(blockersStarted.WaitFor(2 * ML::kSourcePrefetcherThreadCount));
    for (const ML::ExecutorRef& executor : executors)
        executor->Post([&ran, held = Tracked::Make(live)] { ++ran; }, 60000);
    executors[2]->Post([&ran, held = Tracked::Make(live)] { ++ran; });
    EXPECT_EQ(live.load(), 5);

    // ShutDown waits for the blockers, so they are released from elsewhere
    // once the pending tasks are gone.
    std::thread opener(
        [&]
        {
            while (live.load() != 0)
                std::this_thread::yield();
            gate.Open();
        });
    ML::Foundation::ShutDown();
    opener.join();

    for (const ML::ExecutorRef& executor : CurrentExecutors())
        EXPECT_FALSE(executor);
    for (const ML::ExecutorRef& executor : executors)
    {
        EXPECT_TRUE(executor->IsShutDown());
        EXPECT_TRUE(executor->IsCurrentThreadOrShutDown());
        EXPECT_FALSE(executor->Post([] {}));
    }
    EXPECT_EQ(live.load(), 0);
    EXPECT_EQ(ran.load(), 0);
}

TEST_F(RenderExecutorsTest, StartUpAfterShutDownCreatesNewWorkingExecutors)
{
    ML::Foundation::StartUp();
    const auto before = CurrentExecutors();
    ML::Foundation::ShutDown();
    ML::Foundation::StartUp();
    const auto after = CurrentExecutors();
    for (size_t i = 0; i < after.size(); ++i)
    {
        ASSERT_TRUE(after[i]);
        EXPECT_NE(after[i], before[i]);
        EXPECT_FALSE(after[i]->IsShutDown());
    }
    EXPECT_EQ(RunOneTaskOnEach(), 4);
}

TEST_F(RenderExecutorsTest, StartUpReplacesOnlyTheExecutorsThatWereShutDown)
{
    ML::Foundation::StartUp();
    const auto before = CurrentExecutors();
    // The render queue's own shutdown stops the two render executors only.
    for (const ML::ExecutorRef& executor : {before[0], before[1]})
    {
        executor->BeginShutdown();
        executor->DiscardPendingTasks();
        executor->WaitForRunningTasks();
    }
    ML::Foundation::StartUp();
    const auto after = CurrentExecutors();
    EXPECT_NE(after[0], before[0]);
    EXPECT_NE(after[1], before[1]);
    EXPECT_EQ(after[2], before[2]);
    EXPECT_EQ(after[3], before[3]);
    EXPECT_EQ(RunOneTaskOnEach(), 4);
}

TEST_F(RenderExecutorsTest, ShutDownFromARenderTaskDoesNotDeadlock)
{
    ML::Foundation::StartUp();
    CountingSignal done;
    std::atomic<bool> resetSeen{false};
    ML::sNormalPriorityRenderQueue->Post(
        [&]
        {
            ML::Foundation::ShutDown();
            resetSeen = !boost::atomic_load(&ML::sNormalPriorityRenderQueue);
            done.Notify();
        });
    ASSERT_TRUE(done.WaitFor());
    EXPECT_TRUE(resetSeen.load());
}

} // namespace
