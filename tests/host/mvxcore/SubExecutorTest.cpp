#include "ExecutorTestSupport.h"
#include "mvxcore/config/Error.h"
#include "mvxcore/debug/Contract.h"
#include "mvxcore/threads/ExecutorFactories.h"

#include <atomic>
#include <chrono>
#include <mutex>
#include <stdexcept>
#include <thread>
#include <vector>

#include <boost/weak_ptr.hpp>
#include <gtest/gtest.h>

namespace
{

using mvxcore::testing::CountingSignal;
using mvxcore::testing::Gate;
using mvxcore::testing::kHangGuard;
using mvxcore::testing::Rendezvous;
using mvxcore::testing::Tracked;
using mvxcore::threads::AsyncThreadedExecutor;
using mvxcore::threads::CreateCPUBoundExecutor;
using mvxcore::threads::CreateSubExecutor;
using mvxcore::threads::CreateThreadPoolExecutor;
using ExecutorRef = boost::shared_ptr<AsyncThreadedExecutor>;
using Clock = std::chrono::steady_clock;

class SubExecutorTest : public ::testing::Test
{
protected:
    void TearDown() override { mvxcore::debug::SetAssertHook({}); }

    // Raises the concurrency high-water mark while a task runs.
    static void RunCounted(std::atomic<int>& inRunning, std::atomic<int>& inMost)
    {
        const int now = ++inRunning;
        int seen = inMost.load();
        while (now > seen && !inMost.compare_exchange_weak(seen, now))
        {
        }
        std::this_thread::sleep_for(std::chrono::microseconds(50));
        --inRunning;
    }
};

TEST_F(SubExecutorTest, SerialExecutorKeepsPostOrderUnderLoadFromSeveralThreads)
{
    const ExecutorRef parent = CreateThreadPoolExecutor(4);
    const ExecutorRef serial = CreateSubExecutor(parent, 1);
    constexpr int kThreads = 4;
    constexpr int kPostsPerThread = 2000;

    // Posting under one mutex fixes the post order as the ticket order; the
    // serial executor must run the tasks in exactly that order, one at a time.
    std::mutex postMutex;
    int nextTicket = 0;
    std::vector<int> order;
    std::atomic<int> running{0};
    std::atomic<int> overlaps{0};
    CountingSignal done;
    std::vector<std::thread> posters;
    for (int t = 0; t < kThreads; ++t)
    {
        posters.emplace_back(
            [&]
            {
                for (int i = 0; i < kPostsPerThread; ++i)
                {
                    std::lock_guard lock(postMutex);
                    const int ticket = nextTicket++;
                    serial->Post(
                        [&, ticket]
                        {
                            if (++running != 1)
                                ++overlaps;
                            order.push_back(ticket);
                            // Widens the window in which a second task would overlap.
                            std::this_thread::yield();
                            --running;
                            done.Notify();
                        });
                }
            });
    }
    for (std::thread& poster : posters)
        poster.join();
    ASSERT_TRUE(done.WaitFor(kThreads * kPostsPerThread));
    EXPECT_EQ(overlaps.load(), 0);
    ASSERT_EQ(order.size(), static_cast<size_t>(kThreads * kPostsPerThread));
    for (int i = 0; i < kThreads * kPostsPerThread; ++i)
        ASSERT_EQ(order[i], i) << "task " << i << " ran out of post order";
}

TEST_F(SubExecutorTest, TasksPostedFromItsOwnTasksRunAfterTheQueuedOnes)
{
    const ExecutorRef serial = CreateSubExecutor(CreateCPUBoundExecutor(), 1);
    std::vector<int> order;
    CountingSignal done;
    // Held until all three are queued, so the task posted from inside comes
    // after them in post order.
    Gate gate;
    serial->Post([&] { gate.Pass(); });
    serial->Post(
        [&]
        {
            order.push_back(0);
            serial->Post(
                [&]
                {
                    order.push_back(3);
                    done.Notify();
                });
        });
    serial->Post([&] { order.push_back(1); });
    serial->Post([&] { order.push_back(2); });
    gate.Open();
    ASSERT_TRUE(done.WaitFor());
    EXPECT_EQ(order, (std::vector<int>{0, 1, 2, 3}));
}

TEST_F(SubExecutorTest, NeverRunsMoreThanItsLimitAtOnce)
{
    const ExecutorRef parent = CreateThreadPoolExecutor(4);
    const ExecutorRef sub = CreateSubExecutor(parent, 2);
    std::atomic<int> running{0};
    std::atomic<int> most{0};
    CountingSignal done;
    for (int i = 0; i < 300; ++i)
    {
        sub->Post(
            [&]
            {
                RunCounted(running, most);
                done.Notify();
            });
    }
    ASSERT_TRUE(done.WaitFor(300));
    EXPECT_LE(most.load(), 2);
}

TEST_F(SubExecutorTest, RunsUpToItsLimitAtOnce)
{
    const ExecutorRef sub = CreateSubExecutor(CreateThreadPoolExecutor(4), 2);
    Rendezvous meeting(2);
    std::atomic<int> met{0};
    CountingSignal done;
    for (int i = 0; i < 2; ++i)
    {
        sub->Post(
            [&]
            {
                if (meeting.Arrive())
                    ++met;
                done.Notify();
            });
    }
    ASSERT_TRUE(done.WaitFor(2));
    EXPECT_EQ(met.load(), 2);
}

TEST_F(SubExecutorTest, DelayedTaskDoesNotRunBeforeItsDelay)
{
    const ExecutorRef serial = CreateSubExecutor(CreateCPUBoundExecutor(), 1);
    CountingSignal done;
    Clock::duration elapsed{};
    const Clock::time_point posted = Clock::now();
    ASSERT_TRUE(serial->Post(
        [&]
        {
            elapsed = Clock::now() - posted;
            done.Notify();
        },
        mvxcore::threads::kPollingDelayMilliseconds));
    ASSERT_TRUE(done.WaitFor());
    EXPECT_GE(elapsed, std::chrono::milliseconds(5));
}

TEST_F(SubExecutorTest, StateQueryIsTrueWhileRunningItsTasksOnly)
{
    const ExecutorRef parent = CreateCPUBoundExecutor();
    const ExecutorRef sub = CreateSubExecutor(parent, 2);
    const ExecutorRef nested = CreateSubExecutor(sub, 1);
    std::atomic<bool> subInSub{false};
    std::atomic<bool> parentInSub{false};
    std::atomic<bool> subInParentTask{true};
    std::atomic<bool> parentInParentTask{false};
    std::atomic<bool> allInNested{false};
    std::atomic<bool> nestedInSub{true};
    CountingSignal done;
    sub->Post(
        [&]
        {
            subInSub = sub->IsCurrentThreadOrShutDown();
            parentInSub = parent->IsCurrentThreadOrShutDown();
            nestedInSub = nested->IsCurrentThreadOrShutDown();
            done.Notify();
        });
    parent->Post(
        [&]
        {
            subInParentTask = sub->IsCurrentThreadOrShutDown();
            parentInParentTask = parent->IsCurrentThread();
            done.Notify();
        });
    nested->Post(
        [&]
        {
            allInNested =
                nested->IsCurrentThread() && sub->IsCurrentThread() && parent->IsCurrentThread();
            done.Notify();
        });
    ASSERT_TRUE(done.WaitFor(3));
    EXPECT_TRUE(subInSub.load());
    EXPECT_TRUE(parentInSub.load());
    EXPECT_FALSE(nestedInSub.load());
    EXPECT_FALSE(subInParentTask.load());
    EXPECT_TRUE(parentInParentTask.load());
    EXPECT_TRUE(allInNested.load());
    EXPECT_FALSE(sub->IsCurrentThreadOrShutDown());

    sub->BeginShutdown();
    EXPECT_TRUE(sub->IsShutDown());
    EXPECT_TRUE(sub->IsCurrentThreadOrShutDown());
    // The parent goes on.
    EXPECT_FALSE(parent->IsCurrentThreadOrShutDown());
    CountingSignal parentRan;
    EXPECT_TRUE(parent->Post([&] { parentRan.Notify(); }));
    EXPECT_TRUE(parentRan.WaitFor());
}

TEST_F(SubExecutorTest, ShutdownDropsPendingTasksAndRefusesNewOnes)
{
    const ExecutorRef parent = CreateCPUBoundExecutor();
    const ExecutorRef serial = CreateSubExecutor(parent, 1);
    Gate gate;
    CountingSignal blockerStarted;
    std::atomic<int> live{0};
    std::atomic<int> ran{0};
    serial->Post(
        [&]
        {
            blockerStarted.Notify();
            gate.Pass();
        });
    ASSERT_TRUE(blockerStarted.WaitFor());
    for (int i = 0; i < 10; ++i)
    {
        serial->Post([&ran, held = Tracked::Make(live)] { ++ran; });
        serial->Post([&ran, held = Tracked::Make(live)] { ++ran; }, 5);
    }
    EXPECT_EQ(live.load(), 20);

    serial->BeginShutdown();
    EXPECT_FALSE(serial->Post([&ran, held = Tracked::Make(live)] { ++ran; }));
    EXPECT_FALSE(serial->Post([&ran, held = Tracked::Make(live)] { ++ran; }, 5));
    EXPECT_EQ(live.load(), 20);

    serial->DiscardPendingTasks();
    EXPECT_EQ(live.load(), 0);
    gate.Open();
    serial->WaitForRunningTasks();
    std::this_thread::sleep_for(std::chrono::milliseconds(20));
    EXPECT_EQ(ran.load(), 0);

    EXPECT_FALSE(parent->IsShutDown());
    CountingSignal parentRan;
    EXPECT_TRUE(parent->Post([&] { parentRan.Notify(); }));
    EXPECT_TRUE(parentRan.WaitFor());
}

TEST_F(SubExecutorTest, WaitForRunningTasksFromItsOwnTaskDoesNotDeadlock)
{
    const ExecutorRef sub = CreateSubExecutor(CreateCPUBoundExecutor(), 2);
    Gate gate;
    CountingSignal otherStarted;
    CountingSignal done;
    std::atomic<bool> otherFinished{false};
    std::atomic<bool> otherFinishedAtReturn{false};
    sub->Post(
        [&]
        {
            otherStarted.Notify();
            gate.Pass();
            otherFinished = true;
        });
    ASSERT_TRUE(otherStarted.WaitFor());
    sub->Post(
        [&]
        {
            sub->BeginShutdown();
            sub->DiscardPendingTasks();
            gate.Open();
            sub->WaitForRunningTasks();
            otherFinishedAtReturn = otherFinished.load();
            done.Notify();
        });
    ASSERT_TRUE(done.WaitFor());
    EXPECT_TRUE(otherFinishedAtReturn.load());
}

TEST_F(SubExecutorTest, ParentShutdownShutsTheSubExecutorDownAndReleasesItsTasks)
{
    const ExecutorRef parent = CreateThreadPoolExecutor(1);
    const ExecutorRef sub = CreateSubExecutor(parent, 1);
    Gate gate;
    CountingSignal blockerStarted;
    std::atomic<int> live{0};
    std::atomic<int> ran{0};
    parent->Post(
        [&]
        {
            blockerStarted.Notify();
            gate.Pass();
        });
    ASSERT_TRUE(blockerStarted.WaitFor());
    for (int i = 0; i < 5; ++i)
        sub->Post([&ran, held = Tracked::Make(live)] { ++ran; });
    sub->Post([&ran, held = Tracked::Make(live)] { ++ran; }, 5);
    EXPECT_EQ(live.load(), 6);

    parent->BeginShutdown();
    parent->DiscardPendingTasks();
    EXPECT_EQ(live.load(), 0);
    EXPECT_TRUE(sub->IsShutDown());
    EXPECT_FALSE(sub->Post([&ran] { ++ran; }));
    gate.Open();
    parent->WaitForRunningTasks();
    EXPECT_EQ(ran.load(), 0);
}

TEST_F(SubExecutorTest, ThrowingTaskIsReportedAndTheSerialOrderGoesOn)
{
    std::atomic<int> reports{0};
    mvxcore::debug::SetAssertHook([&](const mvxcore::debug::AssertFailure&) { ++reports; });
    const ExecutorRef serial = CreateSubExecutor(CreateCPUBoundExecutor(), 1);
    std::vector<int> order;
    CountingSignal done;
    serial->Post([&] { order.push_back(0); });
    serial->Post([] { throw std::logic_error("bad"); });
    serial->Post(
        [&]
        {
            order.push_back(2);
            done.Notify();
        });
    ASSERT_TRUE(done.WaitFor());
    EXPECT_EQ(order, (std::vector<int>{0, 2}));
    EXPECT_EQ(reports.load(), 1);
}

TEST_F(SubExecutorTest, KeepsItsParentAliveUntilItGoes)
{
    ExecutorRef parent = CreateCPUBoundExecutor();
    const boost::weak_ptr<AsyncThreadedExecutor> watch = parent;
    ExecutorRef sub = CreateSubExecutor(parent, 1);
    parent.reset();
    EXPECT_FALSE(watch.expired());
    CountingSignal ran;
    ASSERT_TRUE(sub->Post([&] { ran.Notify(); }));
    ASSERT_TRUE(ran.WaitFor());

    sub.reset();
    // The parent goes once the sub-executor's last run slot has been released
    // by the worker that ran it.
    const Clock::time_point deadline = Clock::now() + kHangGuard;
    while (!watch.expired() && Clock::now() < deadline)
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    EXPECT_TRUE(watch.expired());
}

TEST_F(SubExecutorTest, DroppingTheLastReferenceInsideItsOwnTaskEndsItAndItsParent)
{
    struct Holder
    {
        ExecutorRef executor;
        CountingSignal* released = nullptr;
        ~Holder()
        {
            executor.reset();
            released->Notify();
        }
    };
    ExecutorRef parent = CreateCPUBoundExecutor();
    const boost::weak_ptr<AsyncThreadedExecutor> watchParent = parent;
    ExecutorRef serial = CreateSubExecutor(std::move(parent), 1);
    const boost::weak_ptr<AsyncThreadedExecutor> watchSerial = serial;
    AsyncThreadedExecutor* raw = serial.get();
    CountingSignal released;
    auto holder = std::make_shared<Holder>();
    holder->executor = std::move(serial);
    holder->released = &released;
    ASSERT_TRUE(raw->Post([holder = std::move(holder)]() mutable { holder.reset(); }));
    ASSERT_TRUE(released.WaitFor());
    EXPECT_TRUE(watchSerial.expired());
    const Clock::time_point deadline = Clock::now() + kHangGuard;
    while (!watchParent.expired() && Clock::now() < deadline)
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    EXPECT_TRUE(watchParent.expired());
}

TEST_F(SubExecutorTest, BadArgumentsAreInputContractErrors)
{
    try
    {
        CreateSubExecutor(ExecutorRef(), 1);
        FAIL() << "a sub-executor without parent was made";
    }
    catch (const mvxcore::config::Error& inError)
    {
        EXPECT_EQ(inError.GetExpression(), "inParent != nullptr");
    }
    try
    {
        CreateSubExecutor(CreateThreadPoolExecutor(1), 0);
        FAIL() << "a sub-executor that can run nothing was made";
    }
    catch (const mvxcore::config::Error& inError)
    {
        EXPECT_EQ(inError.GetExpression(), "inMaxConcurrency > 0");
    }
    const ExecutorRef serial = CreateSubExecutor(CreateThreadPoolExecutor(1), 1);
    EXPECT_THROW(serial->Post(mvxcore::threads::Task()), mvxcore::config::Error);
    EXPECT_THROW(serial->Post([] {}, -5), mvxcore::config::Error);
}

} // namespace
