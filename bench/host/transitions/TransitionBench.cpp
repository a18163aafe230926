// Each host transition at progress 0.5 on 1920x1080 BGRA 8-bit frames, one
// thread, beside a memcpy of one frame. The frames are made once and reused,
// so page faults are not measured. bench/compare/transitions-vs-ffmpeg.sh
// puts these beside ffmpeg's xfade.

#include "TX/TransitionCatalogue.h"
#include "VF/VideoFrame.h"
#include "mvxmediatypes/PixelFormat.h"

#include <cstring>
#include <map>
#include <random>
#include <string>

#include <benchmark/benchmark.h>

namespace
{

namespace mt = mvxmediatypes;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

constexpr std::uint32_t kW = 1920;
constexpr std::uint32_t kH = 1080;

FrameRef NoiseFrame(unsigned inSeed)
{
    FrameRef frame = VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, kW, kH,
                                          mt::kPixelAspectRatio_Square, false, false);
    auto* bytes = static_cast<std::uint8_t*>(frame->GetWritableBaseAddress());
    std::mt19937 random(inSeed);
    for (std::size_t i = 0; i < frame->GetDataSize(); ++i)
        bytes[i] = static_cast<std::uint8_t>(random());
    return frame;
}

void BM_Transition(benchmark::State& ioState, std::string inMatch,
                   std::map<std::string, std::string> inParams)
{
    BE::TransitionSettings settings;
    settings.mMatchName = std::move(inMatch);
    settings.mEnd = mt::TickTime::FromFrame(25, mt::kFrameRate_Video25);
    settings.mParams = std::move(inParams);
    const TX::TransitionCreation made = TX::CreateTransition(settings);
    if (!made.mTransition)
    {
        ioState.SkipWithError(made.mError.c_str());
        return;
    }
    const FrameRef a = NoiseFrame(1);
    const FrameRef b = NoiseFrame(2);
    FrameRef out = VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, kW, kH,
                                        mt::kPixelAspectRatio_Square, true, false);
    for (auto _ : ioState)
    {
        made.mTransition->Render(a.Get(), b.Get(), *out, 0.5f, made.mTransition->GetParameters(),
                                 {}, 4);
        benchmark::DoNotOptimize(out->GetBaseAddress());
    }
    ioState.SetBytesProcessed(std::int64_t(ioState.iterations()) * kW * kH * 4 * 3);
}

void BM_Memcpy1080p8u(benchmark::State& ioState)
{
    const FrameRef a = NoiseFrame(1);
    FrameRef out = NoiseFrame(2);
    for (auto _ : ioState)
    {
        std::memcpy(out->GetWritableBaseAddress(), a->GetBaseAddress(), a->GetDataSize());
        benchmark::DoNotOptimize(out->GetBaseAddress());
    }
}

BENCHMARK(BM_Memcpy1080p8u)->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Transition, CrossDissolve, "TX.CrossDissolve", {})
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Transition, DipToBlack, "TX.DipToBlack", {})->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Transition, DipToWhite, "TX.DipToWhite", {})->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Transition, WipeLeft, "TX.Wipe", {})->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Transition, WipeTop, "TX.Wipe", {{"direction", "top"}})
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Transition, WipeBorderSoft, "TX.Wipe",
                  {{"border", "8"}, {"borderColor", "#FFFFFF"}, {"softness", "16"}})
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Transition, PushLeft, "TX.Push", {})->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Transition, SlideLeft, "TX.Slide", {})->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Transition, Iris, "TX.Iris", {})->Unit(benchmark::kMillisecond);

} // namespace
