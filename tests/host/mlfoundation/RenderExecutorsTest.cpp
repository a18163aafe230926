#include "ML/RenderExecutors.h"

#include "ExecutorTestSupport.h"
#include "mvxcore/threads/ExecutorFactories.h"

#include <algorithm>
#include <array>
#include <atomic>

#include <gtest/gtest.h>

namespace
{

using mvxcore::testing::CountingSignal;
using Executors = std::array<ML::ExecutorRef, 4>;

Executors CurrentExecutors()
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

    // Each executor runs its documented number of tasks at once, each on the
    // executor's own thread.
    static void ExpectWorking(const Executors& inExecutors)
    {
        const unsigned cores = mvxcore::threads::GetCPUCoreCount();
        EXPECT_EQ(ML::Foundation::GetLowPriorityRenderThreadCount(), std::max(1u, cores / 2));
        const unsigned counts[4] = {cores, ML::Foundation::GetLowPriorityRenderThreadCount(),
                                    ML::kSourcePrefetcherThreadCount,
                                    ML::kSourcePrefetcherThreadCount};
        for (size_t i = 0; i < inExecutors.size(); ++i)
        {
            SCOPED_TRACE(i);
            ASSERT_TRUE(inExecutors[i]);
            const int count = static_cast<int>(counts[i]);
            mvxcore::threads::AsyncThreadedExecutor* raw = inExecutors[i].get();
            CountingSignal meeting;
            CountingSignal done;
            std::atomic<int> metOnOwnThread{0};
            for (int task = 0; task < count; ++task)
            {
                raw->Post(
                    [&, raw]
                    {
                        if (meeting.Meet(count) && raw->IsCurrentThread())
                            ++metOnOwnThread;
                        done.Notify();
                    });
            }
            EXPECT_TRUE(done.WaitFor(count));
            EXPECT_EQ(metOnOwnThread.load(), count);
        }
    }
};

TEST_F(RenderExecutorsTest, StartUpCreatesFourDistinctWorkingExecutorsOnce)
{
    ML::Foundation::StartUp();
    const Executors executors = CurrentExecutors();
    for (size_t i = 0; i < executors.size(); ++i)
        for (size_t j = 0; j < i; ++j)
            EXPECT_NE(executors[i], executors[j]);
    ExpectWorking(executors);
    ML::Foundation::StartUp();
    EXPECT_EQ(CurrentExecutors(), executors);
}

} // namespace
