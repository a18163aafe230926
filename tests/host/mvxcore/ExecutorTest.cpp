#include "ContractExpect.h"
#include "ExecutorTestSupport.h"
#include "mvxcore/config/Error.h"
#include "mvxcore/debug/Contract.h"
#include "mvxcore/threads/ExecutorFactories.h"

#include <atomic>
#include <chrono>
#include <mutex>
#include <numeric>
#include <stdexcept>
#include <string>
#include <thread>
#include <tuple>
#include <vector>

#include <boost/weak_ptr.hpp>
#include <gtest/gtest.h>

namespace
{

using namespace mvxcore::threads;
using mvxcore::testing::CountingSignal;
using mvxcore::testing::kHangGuard;
using mvxcore::testing::Tracked;
using ExecutorRef = boost::shared_ptr<AsyncThreadedExecutor>;
using WeakExecutor = boost::weak_ptr<AsyncThreadedExecutor>;
using Clock = std::chrono::steady_clock;

enum class Kind
{
    kThreadPool,
    kSubExecutor
};

// Polls until inWatch expires or the hang guard passes: a released executor
// may go on the worker that ran its last task, a moment after that task.
bool Expires(const WeakExecutor& inWatch)
{
    const Clock::time_point deadline = Clock::now() + kHangGuard;
    while (!inWatch.expired() && Clock::now() < deadline)
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    return inWatch.expired();
}

bool RunsAndAnswers(const ExecutorRef& inExecutor)
{
    CountingSignal ran;
    return inExecutor->Post([&] { ran.Notify(); }) && ran.WaitFor();
}

// Captures failure reports and holds executors' threads at a gate.
class ExecutorFixture : public ::testing::Test
{
protected:
    void SetUp() override
    {
        mvxcore::debug::SetAssertHook(
            [this](const mvxcore::debug::AssertFailure& inFailure)
            {
                std::lock_guard lock(mAssertMutex);
                mAssertMessages.emplace_back(inFailure.message);
            });
    }
    void TearDown() override { mvxcore::debug::SetAssertHook({}); }

    // Holds one of inExecutor's threads until mGate opens.
    void Occupy(const ExecutorRef& inExecutor)
    {
        CountingSignal started;
        ASSERT_TRUE(inExecutor->Post(
            [&]
            {
                started.Notify();
                mGate.WaitFor();
            }));
        ASSERT_TRUE(started.WaitFor());
    }

    // Posts a task that ++inRan, holding a tracked capture.
    static bool PostTracked(const ExecutorRef& inExecutor, std::atomic<int>& inLive,
                            std::atomic<int>& inRan, int inDelay = kRunAsSoonAsPossible)
    {
        return inExecutor->Post([&inRan, held = Tracked(inLive)] { ++inRan; }, inDelay);
    }

    // A sub-executor's shutdown leaves its parent running.
    void ExpectParentStillRuns()
    {
        const ExecutorRef parent = mParent.lock();
        EXPECT_TRUE(!parent || (!parent->IsShutDown() && RunsAndAnswers(parent)));
    }

    std::vector<std::string> AssertMessages()
    {
        std::lock_guard lock(mAssertMutex);
        return mAssertMessages;
    }

    CountingSignal mGate;
    WeakExecutor mParent;

private:
    std::mutex mAssertMutex; // guards mAssertMessages
    std::vector<std::string> mAssertMessages;
};

// The behaviour both kinds of executor share, run over a pool of n workers
// and over a sub-executor limited to n on a pool with two workers to spare.
class ExecutorTest : public ExecutorFixture, public ::testing::WithParamInterface<Kind>
{
protected:
    ExecutorRef Make(unsigned inCount)
    {
        if (GetParam() == Kind::kThreadPool)
            return CreateThreadPoolExecutor(inCount);
        const ExecutorRef parent = CreateThreadPoolExecutor(inCount + 2);
        mParent = parent;
        return CreateSubExecutor(parent, inCount);
    }
};

TEST_P(ExecutorTest, AtOneRunsReadyTasksOneByOneInPostOrder)
{
    const ExecutorRef executor = Make(1);
    constexpr int kTotal = 2000;
    std::vector<int> order;
    std::atomic<int> running{0}, overlaps{0};
    CountingSignal done;
    for (int i = 0; i < kTotal; ++i)
        executor->Post(
            [&, i]
            {
                overlaps += ++running != 1;
                order.push_back(i);
                // Widens the window in which a second task would overlap.
                std::this_thread::yield();
                --running;
                done.Notify();
            });
    ASSERT_TRUE(done.WaitFor(kTotal));
    EXPECT_EQ(overlaps.load(), 0);
    std::vector<int> expected(kTotal);
    std::iota(expected.begin(), expected.end(), 0);
    EXPECT_EQ(order, expected);
}

TEST_P(ExecutorTest, RunsUpToItsLimitAtOnceAndNeverMore)
{
    constexpr int kLimit = 3;
    const ExecutorRef executor = Make(kLimit);
    CountingSignal meeting, done;
    std::atomic<int> met{0}, running{0}, over{0};
    for (int i = 0; i < 300; ++i)
        executor->Post(
            [&, meets = i < kLimit]
            {
                over += ++running > kLimit;
                // The first kLimit tasks can only all pass together.
                if (meets && meeting.Meet(kLimit))
                    ++met;
                std::this_thread::sleep_for(std::chrono::microseconds(50));
                --running;
                done.Notify();
            });
    ASSERT_TRUE(done.WaitFor(300));
    EXPECT_EQ(met.load(), kLimit);
    EXPECT_EQ(over.load(), 0);
}

TEST_P(ExecutorTest, ShutdownRefusesNewTasksStartsNoQueuedOneAndDiscardReleasesThem)
{
    const ExecutorRef executor = Make(1);
    Occupy(executor);
    std::atomic<int> live{0}, ran{0};
    for (int i = 0; i < 10; ++i)
    {
        PostTracked(executor, live, ran);
        PostTracked(executor, live, ran, 5);
    }
    EXPECT_EQ(live.load(), 20);
    EXPECT_FALSE(executor->IsCurrentThreadOrShutDown() || executor->IsShutDown());

    executor->BeginShutdown();
    EXPECT_TRUE(executor->IsShutDown() && executor->IsCurrentThreadOrShutDown());
    EXPECT_FALSE(executor->IsCurrentThread());
    // A refused task is destroyed at once, never queued.
    EXPECT_FALSE(PostTracked(executor, live, ran));
    EXPECT_FALSE(PostTracked(executor, live, ran, 5));
    EXPECT_EQ(live.load(), 20);

    mGate.Notify();
    executor->WaitForRunningTasks();
    // The thread is free and the delays have fallen due; had shutdown let it,
    // the executor would start the queue now.
    std::this_thread::sleep_for(std::chrono::milliseconds(20));
    executor->DiscardPendingTasks();
    EXPECT_EQ(live.load(), 0);
    EXPECT_EQ(ran.load(), 0);
    ExpectParentStillRuns();
}

TEST_P(ExecutorTest, ThrowingTaskIsReportedAndTheNextTasksStillRun)
{
    const ExecutorRef executor = Make(1);
    CountingSignal done;
    executor->Post([] { throw std::runtime_error("boom"); });
    executor->Post([] { throw 42; });
    executor->Post([&] { done.Notify(); }, 1);
    ASSERT_TRUE(done.WaitFor());
    EXPECT_EQ(AssertMessages(),
              (std::vector<std::string>{"An executor task threw: boom",
                                        "An executor task threw a non-standard exception."}));
}

TEST_P(ExecutorTest, DroppingTheLastReferenceInsideItsOwnTaskEndsItAndItsParent)
{
    // The task holds the only reference; releasing it on the executor's own
    // thread must neither join that thread nor crash.
    ExecutorRef executor = Make(1);
    const WeakExecutor watch = executor;
    AsyncThreadedExecutor* raw = executor.get();
    ASSERT_TRUE(raw->Post([held = std::move(executor)]() mutable { held.reset(); }));
    EXPECT_TRUE(Expires(watch));
    EXPECT_TRUE(Expires(mParent));
}

TEST_P(ExecutorTest, BadTasksAndFactoryArgumentsAreInputContractErrors)
{
    const ExecutorRef executor = Make(1);
    EXPECT_INPUT_CONTRACT(executor->Post(Task()), "!inTask.empty()");
    EXPECT_INPUT_CONTRACT(executor->Post([] {}, -1), "inScheduling >= 0");
    EXPECT_INPUT_CONTRACT(CreateThreadPoolExecutor(0), "inThreadCount > 0");
    EXPECT_INPUT_CONTRACT(CreateSubExecutor(ExecutorRef(), 1), "inParent != nullptr");
    EXPECT_INPUT_CONTRACT(CreateSubExecutor(executor, 0), "inMaxConcurrency > 0");
}

INSTANTIATE_TEST_SUITE_P(Kinds, ExecutorTest,
                         ::testing::Values(Kind::kThreadPool, Kind::kSubExecutor),
                         [](const ::testing::TestParamInfo<Kind>& inInfo) {
                             return inInfo.param == Kind::kThreadPool ? "ThreadPool"
                                                                      : "SubExecutor";
                         });

using SubExecutorTest = ExecutorFixture;

TEST_F(SubExecutorTest, StateQueryFollowsTheNestingAndASubKeepsItsParentAlive)
{
    ExecutorRef parent = CreateCPUBoundExecutor();
    const WeakExecutor watch = parent;
    ExecutorRef sub = CreateSubExecutor(parent, 2);
    ExecutorRef levels[3] = {parent, sub, CreateSubExecutor(sub, 1)};
    // Bit i: levels[i] answers IsCurrentThreadOrShutDown inside a task of
    // that level (none is shut down).
    std::atomic<int> seen[3] = {-1, -1, -1};
    CountingSignal done;
    for (int level = 0; level < 3; ++level)
        levels[level]->Post(
            [&, level]
            {
                int bits = 0;
                for (int i = 0; i < 3; ++i)
                    bits |= levels[i]->IsCurrentThreadOrShutDown() ? 1 << i : 0;
                seen[level] = bits;
                done.Notify();
            });
    ASSERT_TRUE(done.WaitFor(3));
    EXPECT_EQ(std::tuple(seen[0].load(), seen[1].load(), seen[2].load()),
              std::tuple(0b001, 0b011, 0b111));
    parent.reset();
    levels[0].reset();
    levels[1].reset();
    EXPECT_FALSE(watch.expired());
    ASSERT_TRUE(RunsAndAnswers(sub));
    sub.reset();
    EXPECT_FALSE(watch.expired()); // the innermost level still holds both
    levels[2].reset();
    EXPECT_TRUE(Expires(watch));
}

TEST_F(SubExecutorTest, ParentShutdownShutsItDownAndReleasesItsTasks)
{
    const ExecutorRef parent = CreateThreadPoolExecutor(1);
    const ExecutorRef sub = CreateSubExecutor(parent, 1);
    std::atomic<int> live{0}, ran{0};
    Occupy(parent);
    for (int i = 0; i < 5; ++i)
        PostTracked(sub, live, ran);
    PostTracked(sub, live, ran, 5);
    EXPECT_EQ(live.load(), 6);

    parent->BeginShutdown();
    parent->DiscardPendingTasks();
    EXPECT_EQ(live.load(), 0);
    EXPECT_TRUE(sub->IsShutDown());
    EXPECT_FALSE(PostTracked(sub, live, ran));
    mGate.Notify();
    parent->WaitForRunningTasks();
    EXPECT_EQ(ran.load(), 0);
}

} // namespace
