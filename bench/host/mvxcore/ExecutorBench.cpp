// Executor costs: the round trip from posting a task to its run being seen by
// the poster (a worker wakes, runs, signals back), for the CPU-bound pool and
// for a serial sub-executor on it, and the throughput of many small tasks.

#include "mvxcore/threads/ExecutorFactories.h"

#include <atomic>
#include <condition_variable>
#include <mutex>

#include <benchmark/benchmark.h>

namespace
{

using mvxcore::threads::AsyncThreadedExecutor;
using ExecutorRef = boost::shared_ptr<AsyncThreadedExecutor>;

// One-shot handshake reused for every round trip.
class Handshake
{
public:
    void Signal()
    {
        std::lock_guard lock(mMutex);
        mDone = true;
        mCondition.notify_one();
    }

    void WaitAndReset()
    {
        std::unique_lock lock(mMutex);
        mCondition.wait(lock, [this] { return mDone; });
        mDone = false;
    }

private:
    std::mutex mMutex; // guards mDone
    std::condition_variable mCondition;
    bool mDone = false;
};

void MeasureRoundTrip(benchmark::State& ioState, const ExecutorRef& inExecutor)
{
    Handshake handshake;
    for (auto _ : ioState)
    {
        inExecutor->Post([&handshake] { handshake.Signal(); });
        handshake.WaitAndReset();
    }
}

void BM_PostToRunRoundTrip_CPUBoundPool(benchmark::State& ioState)
{
    const ExecutorRef pool = mvxcore::threads::CreateCPUBoundExecutor();
    MeasureRoundTrip(ioState, pool);
}
BENCHMARK(BM_PostToRunRoundTrip_CPUBoundPool)->UseRealTime();

void BM_PostToRunRoundTrip_SerialSubExecutor(benchmark::State& ioState)
{
    const ExecutorRef serial =
        mvxcore::threads::CreateSubExecutor(mvxcore::threads::CreateCPUBoundExecutor(), 1);
    MeasureRoundTrip(ioState, serial);
}
BENCHMARK(BM_PostToRunRoundTrip_SerialSubExecutor)->UseRealTime();

// Posts a batch of small tasks and waits until all have run.
void MeasureThroughput(benchmark::State& ioState, const ExecutorRef& inExecutor)
{
    const int batch = static_cast<int>(ioState.range(0));
    std::atomic<int> remaining{0};
    Handshake handshake;
    for (auto _ : ioState)
    {
        remaining.store(batch);
        for (int i = 0; i < batch; ++i)
        {
            inExecutor->Post(
                [&remaining, &handshake]
                {
                    if (remaining.fetch_sub(1) == 1)
                        handshake.Signal();
                });
        }
        handshake.WaitAndReset();
    }
    ioState.SetItemsProcessed(ioState.iterations() * batch);
}

void BM_Throughput_CPUBoundPool(benchmark::State& ioState)
{
    const ExecutorRef pool = mvxcore::threads::CreateCPUBoundExecutor();
    MeasureThroughput(ioState, pool);
}
BENCHMARK(BM_Throughput_CPUBoundPool)->Arg(10000)->UseRealTime()->Unit(benchmark::kMillisecond);

void BM_Throughput_SerialSubExecutor(benchmark::State& ioState)
{
    const ExecutorRef serial =
        mvxcore::threads::CreateSubExecutor(mvxcore::threads::CreateCPUBoundExecutor(), 1);
    MeasureThroughput(ioState, serial);
}
BENCHMARK(BM_Throughput_SerialSubExecutor)
    ->Arg(10000)
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);

} // namespace
