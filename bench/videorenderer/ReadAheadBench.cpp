// Read-ahead through InitiateRender: 50 frames of a Y4M clip whose every
// read costs 10 ms, rendered (a) by reading the frames one after another and
// (b) through InitiateRender, which reads them ahead on the prefetch
// executors while earlier frames are delivered. Compare the two wall times:
// (b) should take at most 0.6 of (a).

#include "BE/VideoSources.h"
#include "ML/RenderableVideoSources.h"
#include "ML/VideoRenderer.h"
#include "VF/SharedVideoFrameCache.h"

#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <mutex>
#include <string>
#include <vector>

#include <benchmark/benchmark.h>

namespace
{

using mvxmediatypes::TickTime;

constexpr int kFrames = 50;
constexpr int kWidth = 320;
constexpr int kHeight = 180;
constexpr auto kReadLatency = std::chrono::milliseconds(10);
const mvxmediatypes::FrameRate kRate = mvxmediatypes::kFrameRate_Video25;

// A 4:2:0 clip of kFrames frames in the temporary folder, written once.
const std::string& ClipPath()
{
    static const std::string sPath = []
    {
        const std::string path = "/tmp/vr_readahead_bench.y4m";
        std::FILE* file = std::fopen(path.c_str(), "wb");
        std::fprintf(file, "YUV4MPEG2 W%d H%d F25:1 Ip A1:1 C420jpeg\n", kWidth, kHeight);
        std::vector<unsigned char> frame(kWidth * kHeight * 3 / 2);
        for (int n = 0; n < kFrames; ++n)
        {
            for (size_t i = 0; i < frame.size(); ++i)
                frame[i] = static_cast<unsigned char>((i + 7 * n) & 0xFF);
            std::fprintf(file, "FRAME\n");
            std::fwrite(frame.data(), 1, frame.size(), file);
        }
        std::fclose(file);
        return path;
    }();
    return sPath;
}

// A fresh source (no frame held yet) whose reads each cost kReadLatency.
BE::VideoSourceRef OpenSlowClip()
{
    BE::VideoSourceRef clip;
    BE::OpenY4MSource(ClipPath(), clip);
    return BE::CreateLatencyVideoSource(clip, kReadLatency);
}

ML::CutlistRenderParams ParamsAt(const MF::FrameTime& inTime)
{
    ML::CutlistRenderParams params;
    params.SetFrameTime(inTime);
    params.mWidth = kWidth;
    params.mHeight = kHeight;
    params.mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    params.mPixelFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
    params.mQuality = mvxmediatypes::kRenderQuality_High;
    params.mFrameRate = kRate;
    return params;
}

void BM_ReadOneAfterAnother(benchmark::State& state)
{
    for (auto _ : state)
    {
        VF::SharedVideoFrameCache::Clear();
        BE::VideoSourceRef source = OpenSlowClip();
        BE::VideoFrameRequest request;
        request.mWidth = kWidth;
        request.mHeight = kHeight;
        request.mPixelFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
        for (int n = 0; n < kFrames; ++n)
        {
            QRT::InterfaceRef<MF::IVideoFrame> frame;
            source->GetVideoFrame(TickTime::FromFrame(n, kRate), request, MF::BinaryData(),
                                  source->GetColorProfile(), BE::Deprecated::kFrameRequestFlag_Read,
                                  frame);
            benchmark::DoNotOptimize(frame.Get());
        }
    }
    state.counters["frames"] = kFrames;
}
BENCHMARK(BM_ReadOneAfterAnother)->Unit(benchmark::kMillisecond)->UseRealTime()->Iterations(3);

void BM_InitiateRenderWithReadAhead(benchmark::State& state)
{
    ML::VideoRenderer::Initialize();
    int rendered = 0;
    for (auto _ : state)
    {
        VF::SharedVideoFrameCache::Clear();
        BE::VideoSourceRef clip = OpenSlowClip();
        QRT::InterfaceRef<ML::IRenderableSource> source = ML::CreateRenderableSource(
            clip, MF::BinaryData(), clip->GetAlphaChannel(), clip->GetMatteColor(), false, false,
            kRate, clip->GetFieldType(), clip->GetPixelAspectRatio(), clip->GetColorProfile());

        std::mutex mutex; // guards remaining and rendered
        std::condition_variable done;
        int remaining = kFrames;
        for (int n = 0; n < kFrames; ++n)
        {
            const MF::FrameTime time(TickTime::FromFrame(n, kRate));
            ML::InitiateRender(source, time, ParamsAt(time), ML::GetNextRequestID(),
                               [&](QRT::InterfaceRef<MF::IVideoFrame> inFrame, unsigned int,
                                   QRT::InterfaceRef<ML::IRenderableSource>, bool, int)
                               {
                                   std::lock_guard lock(mutex);
                                   rendered += inFrame ? 1 : 0;
                                   if (--remaining == 0)
                                       done.notify_all();
                               });
        }
        std::unique_lock lock(mutex);
        done.wait(lock, [&] { return remaining == 0; });
    }
    ML::VideoRenderer::Shutdown();
    state.counters["frames"] = kFrames;
    state.counters["rendered_per_run"] =
        static_cast<double>(rendered) / static_cast<double>(state.iterations());
}
BENCHMARK(BM_InitiateRenderWithReadAhead)
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime()
    ->Iterations(3);

} // namespace
