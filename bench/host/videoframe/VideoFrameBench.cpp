// Frame creation, the frame cache's hit and insert paths, and a plain copy of
// the same 1080p BGRA frame for scale.

#include "VF/FrameMemoryPool.h"
#include "VF/SharedVideoFrameCache.h"
#include "VF/VideoFrame.h"

#include <cstring>
#include <sys/resource.h>
#include <vector>

#include <benchmark/benchmark.h>

namespace
{

namespace mt = mvxmediatypes;
using mvxcore::utility::Guid;

constexpr uint32_t kWidth = 1920;
constexpr uint32_t kHeight = 1080;

long MinorFaults()
{
    rusage usage{};
    getrusage(RUSAGE_SELF, &usage);
    return usage.ru_minflt;
}

QRT::InterfaceRef<MF::IVideoFrame> MakeHdFrame(bool inClear)
{
    return VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, kWidth, kHeight,
                                mt::kPixelAspectRatio_Square, inClear, false);
}

Guid KeyFor(uint32_t inIndex)
{
    return Guid(inIndex + 1, 0xBEEF, 0x0001, {9, 8, 7, 6, 5, 4, 3, uint8_t(inIndex)});
}

// Create and release in a loop. After the warm-up frame the pool serves every
// frame: the counters show system allocations and page faults during the
// timed loop (both should be 0).
void BM_CreateVideoFrameSteadyState(benchmark::State& ioState)
{
    const bool clear = ioState.range(0) != 0;
    MakeHdFrame(clear); // warm-up: the one system allocation
    const auto poolBefore = VF::FrameMemoryPool::GetShared().GetStatistics();
    const long faultsBefore = MinorFaults();
    for (auto _ : ioState)
    {
        auto frame = MakeHdFrame(clear);
        benchmark::DoNotOptimize(frame->GetBaseAddress());
    }
    const long faultsAfter = MinorFaults();
    const auto poolAfter = VF::FrameMemoryPool::GetShared().GetStatistics();
    ioState.counters["system_allocs"] =
        double(poolAfter.mSystemAllocations - poolBefore.mSystemAllocations);
    ioState.counters["reuses"] = double(poolAfter.mReuses - poolBefore.mReuses);
    ioState.counters["minor_faults"] = double(faultsAfter - faultsBefore);
}
BENCHMARK(BM_CreateVideoFrameSteadyState)->Arg(0)->Arg(1)->ArgName("clear");

// The plain copy of one 1080p BGRA frame, for scale.
void BM_Memcpy1080pFrame(benchmark::State& ioState)
{
    auto source = MakeHdFrame(true);
    auto destination = MakeHdFrame(true);
    const size_t bytes = source->GetDataSize();
    for (auto _ : ioState)
    {
        std::memcpy(destination->GetWritableBaseAddress(), source->GetBaseAddress(), bytes);
        benchmark::ClobberMemory();
    }
    ioState.SetBytesProcessed(int64_t(ioState.iterations()) * int64_t(bytes));
}
BENCHMARK(BM_Memcpy1080pFrame);

// Copy on write of a shared 1080p frame (allocation from the pool plus copy).
void BM_MakeWriteableSharedFrame(benchmark::State& ioState)
{
    auto frame = MakeHdFrame(true);
    frame->MarkShared(1);
    for (auto _ : ioState)
    {
        auto copy = VF::MakeWriteableVideoFrame(frame, mt::kRenderQuality_High);
        benchmark::DoNotOptimize(copy->GetBaseAddress());
    }
}
BENCHMARK(BM_MakeWriteableSharedFrame);

// RetrieveFromCache of a present key, with 64 frames cached.
void BM_CacheHit(benchmark::State& ioState)
{
    VF::VideoFrameCache cache(size_t{1} << 30, true);
    auto frame = MakeHdFrame(false);
    for (uint32_t i = 0; i < 64; ++i)
        cache.InsertIntoCache(frame, KeyFor(i), 10);
    uint32_t index = 0;
    for (auto _ : ioState)
    {
        auto found = cache.RetrieveFromCache(KeyFor(index++ & 63));
        benchmark::DoNotOptimize(found.Get());
    }
    ioState.counters["hits"] = double(cache.GetStatistics().mHits);
}
BENCHMARK(BM_CacheHit);

// InsertIntoCache into a full cache of 1080p frames: every insertion evicts
// the least recently used frame. Frames come from a ring so that the loop
// measures the cache, not the pool.
void BM_CacheInsertWithEviction(benchmark::State& ioState)
{
    std::vector<QRT::InterfaceRef<MF::IVideoFrame>> frames;
    for (int i = 0; i < 24; ++i)
        frames.push_back(MakeHdFrame(false));
    const size_t frameBytes = frames[0]->GetDataSize();
    VF::VideoFrameCache cache(16 * frameBytes, true);
    uint32_t index = 0;
    for (auto _ : ioState)
    {
        cache.InsertIntoCache(frames[index % frames.size()], KeyFor(index), (index & 1) * 10);
        ++index;
    }
    const auto statistics = cache.GetStatistics();
    ioState.counters["evictions"] = double(statistics.mEvictions);
    ioState.counters["cached_frames"] = double(statistics.mFrames);
}
BENCHMARK(BM_CacheInsertWithEviction);

} // namespace
