// Benchmarks of the render pipeline: the overhead of one request from
// AddRenderRequest to its completion delivery, and the throughput of many
// requests, both with a producer that does no pixel work.

#include "ML/IRenderableNodeProducer.h"
#include "ML/RenderExecutors.h"
#include "ML/RenderFrameQueue.h"
#include "ML/RenderFrameRequest.h"
#include "QRT/Allocated.h"
#include "VF/SharedVideoFrameCache.h"
#include "VF/VideoFrame.h"
#include "mvxcore/threads/ExecutorFactories.h"

#include <algorithm>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <mutex>
#include <vector>

#include <benchmark/benchmark.h>

namespace
{

// Answers one prepared frame without touching pixels.
class IdleProducer : public QRT::Implements<ML::IRenderableNodeProducer>
{
public:
    IdleProducer()
        : mFrame(VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, 8, 8,
                                      mvxmediatypes::kPixelAspectRatio_Square, true, false))
    {
    }
    QRT::Result ProduceFrame(const MF::FrameTime&, const ML::CutlistRenderParams&,
                             QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override
    {
        outFrame = mFrame;
        return QRT::kResult_Success;
    }
    void GetFrameHash(QRT::Guid& outHash, const MF::FrameTime& inTime,
                      const ML::CutlistRenderParams&) override
    {
        outHash = QRT::Guid(static_cast<std::uint32_t>(inTime.GetTime().GetTicks()), 1, 1,
                            {1, 2, 3, 4, 5, 6, 7, 8});
    }

private:
    QRT::InterfaceRef<MF::IVideoFrame> mFrame;
};

// Counts deliveries and wakes the benchmark thread when a target is reached.
struct DeliveryCounter
{
    std::mutex mMutex;
    std::condition_variable mCondition;
    std::uint64_t mCount = 0;

    void Add()
    {
        std::lock_guard<std::mutex> lock(mMutex);
        ++mCount;
        mCondition.notify_all();
    }
    void WaitFor(std::uint64_t inCount)
    {
        std::unique_lock<std::mutex> lock(mMutex);
        mCondition.wait(lock, [&] { return mCount >= inCount; });
    }
};

ML::RenderFrameRequest MakeRequest(std::uint32_t inID,
                                   const QRT::InterfaceRef<ML::IRenderableNodeProducer>& inProducer,
                                   DeliveryCounter& ioCounter)
{
    ML::RenderFrameRequestSettings settings;
    settings.mTime = MF::FrameTime(mvxmediatypes::TickTime::TicksToTime(inID));
    settings.mFrameRate = mvxmediatypes::kFrameRate_Video25;
    settings.mFullFrameRect = QRT::ParamRect(0, 0, 8, 8);
    settings.mOutputRect = QRT::ParamRect(0, 0, 8, 8);
    settings.mRequestedFormats = {mvxmediatypes::kPixelFormat_BGRA_4444_8u};
    settings.mPriority = ML::kRenderPriority_Normal;
    settings.mRequestID = inID;
    settings.mProducer = inProducer;
    settings.mCompletion = [&ioCounter](QRT::InterfaceRef<MF::IVideoFrame>, bool, int)
    { ioCounter.Add(); };
    return ML::RenderFrameRequest(settings, true, false);
}

void BM_RequestOverhead(benchmark::State& ioState)
{
    ML::Foundation::StartUp();
    VF::SharedVideoFrameCache::Clear();
    auto queue = ML::RenderFrameQueue::Create();
    const auto producer = QRT::Allocated<IdleProducer>::Create<ML::IRenderableNodeProducer>();
    DeliveryCounter counter;
    std::vector<double> microseconds;
    std::uint32_t id = 1;
    for (auto _ : ioState)
    {
        const ML::RenderFrameRequest request = MakeRequest(id, producer, counter);
        const auto start = std::chrono::steady_clock::now();
        queue->AddRenderRequest(request);
        counter.WaitFor(id);
        const auto elapsed = std::chrono::steady_clock::now() - start;
        const double seconds = std::chrono::duration<double>(elapsed).count();
        ioState.SetIterationTime(seconds);
        microseconds.push_back(seconds * 1e6);
        ++id;
    }
    std::sort(microseconds.begin(), microseconds.end());
    if (!microseconds.empty())
        ioState.counters["median_us"] = microseconds[microseconds.size() / 2];
    queue->Shutdown();
    queue.Reset();
    ML::Foundation::ShutDown();
}
BENCHMARK(BM_RequestOverhead)->UseManualTime()->Unit(benchmark::kMicrosecond)->Iterations(3000);

void BM_RequestThroughput(benchmark::State& ioState)
{
    constexpr std::uint32_t kRequests = 10'000;
    ML::Foundation::StartUp();
    VF::SharedVideoFrameCache::Clear();
    auto queue = ML::RenderFrameQueue::Create();
    const auto producer = QRT::Allocated<IdleProducer>::Create<ML::IRenderableNodeProducer>();
    DeliveryCounter counter;
    std::uint32_t id = 1;
    double totalSeconds = 0.0;
    std::uint64_t totalRequests = 0;
    for (auto _ : ioState)
    {
        std::vector<ML::RenderFrameRequest> requests;
        requests.reserve(kRequests);
        for (std::uint32_t i = 0; i < kRequests; ++i)
            requests.push_back(MakeRequest(id + i, producer, counter));
        const auto start = std::chrono::steady_clock::now();
        for (const auto& request : requests)
            queue->AddRenderRequest(request);
        counter.WaitFor(id + kRequests - 1);
        const double seconds =
            std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
        ioState.SetIterationTime(seconds);
        totalSeconds += seconds;
        totalRequests += kRequests;
        id += kRequests;
    }
    if (totalSeconds > 0.0)
        ioState.counters["requests_per_second"] = static_cast<double>(totalRequests) / totalSeconds;
    ioState.counters["render_threads"] = mvxcore::threads::GetCPUCoreCount();
    queue->Shutdown();
    queue.Reset();
    ML::Foundation::ShutDown();
}
BENCHMARK(BM_RequestThroughput)->UseManualTime()->Unit(benchmark::kMillisecond)->Iterations(5);

} // namespace
