// Frame manipulators at 1920x1080, single-threaded, beside a plain memcpy of
// the same frame (the memory-bandwidth floor).

#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"

#include <cstring>

#include <benchmark/benchmark.h>

namespace
{

namespace mt = mvxmediatypes;
using Frame = QRT::InterfaceRef<MF::IVideoFrame>;

Frame MakePatternFrame(mt::PixelFormat inFormat, uint32_t inWidth, uint32_t inHeight)
{
    Frame frame = VF::CreateVideoFrame(inFormat, inWidth, inHeight, mt::kPixelAspectRatio_Square,
                                       true, false);
    auto* bytes = static_cast<uint8_t*>(frame->GetWritableBaseAddress());
    for (size_t i = 0; i < frame->GetDataSize(); ++i)
        bytes[i] = static_cast<uint8_t>(i * 7);
    return frame;
}

void BM_MemcpyFrame1080(benchmark::State& ioState)
{
    const Frame source = MakePatternFrame(mt::kPixelFormat_BGRA_4444_8u, 1920, 1080);
    const Frame destination = MakePatternFrame(mt::kPixelFormat_BGRA_4444_8u, 1920, 1080);
    for (auto _ : ioState)
    {
        std::memcpy(destination->GetWritableBaseAddress(), source->GetBaseAddress(),
                    source->GetDataSize());
        benchmark::ClobberMemory();
    }
    ioState.SetBytesProcessed(static_cast<int64_t>(ioState.iterations()) *
                              static_cast<int64_t>(source->GetDataSize()));
}
BENCHMARK(BM_MemcpyFrame1080)->Unit(benchmark::kMillisecond);

void BM_CopyFrame8uToFloat1080(benchmark::State& ioState)
{
    const Frame source = MakePatternFrame(mt::kPixelFormat_BGRA_4444_8u, 1920, 1080);
    const Frame destination = MakePatternFrame(mt::kPixelFormat_BGRA_4444_32f, 1920, 1080);
    for (auto _ : ioState)
        benchmark::DoNotOptimize(VF::VideoFrameManipulators::CopyFrame(
            source, destination, static_cast<mt::RenderQuality>(ioState.range(0))));
}
BENCHMARK(BM_CopyFrame8uToFloat1080)->Arg(mt::kRenderQuality_High)->Unit(benchmark::kMillisecond);

// 1920x1080 to 960x540.
void BM_CopyFrameHalve1080(benchmark::State& ioState)
{
    const Frame source = MakePatternFrame(mt::kPixelFormat_BGRA_4444_8u, 1920, 1080);
    const Frame destination = MakePatternFrame(mt::kPixelFormat_BGRA_4444_8u, 960, 540);
    for (auto _ : ioState)
        benchmark::DoNotOptimize(VF::VideoFrameManipulators::CopyFrame(
            source, destination, static_cast<mt::RenderQuality>(ioState.range(0))));
}
BENCHMARK(BM_CopyFrameHalve1080)
    ->Arg(mt::kRenderQuality_Low)
    ->Arg(mt::kRenderQuality_High)
    ->Arg(mt::kRenderQuality_Max)
    ->Unit(benchmark::kMillisecond);

// Interlaced 1920x1080 to 960x540, each field on its own.
void BM_CopyFrameWithFieldsHalve1080(benchmark::State& ioState)
{
    const Frame source = MakePatternFrame(mt::kPixelFormat_BGRA_4444_8u, 1920, 1080);
    source->SetFieldType(mt::kFieldType_UpperFirst);
    const Frame destination = MakePatternFrame(mt::kPixelFormat_BGRA_4444_8u, 960, 540);
    destination->SetFieldType(mt::kFieldType_UpperFirst);
    for (auto _ : ioState)
        benchmark::DoNotOptimize(VF::VideoFrameManipulators::CopyFrameWithFields(
            source, destination, mt::kRenderQuality_High, VF::kFieldSelection_First));
}
BENCHMARK(BM_CopyFrameWithFieldsHalve1080)->Unit(benchmark::kMillisecond);

void BM_VerticalConvolve1080(benchmark::State& ioState)
{
    const Frame source = MakePatternFrame(mt::kPixelFormat_BGRA_4444_8u, 1920, 1080);
    const Frame destination = MakePatternFrame(mt::kPixelFormat_BGRA_4444_8u, 1920, 1080);
    for (auto _ : ioState)
        benchmark::DoNotOptimize(VF::VideoFrameManipulators::VerticalConvolve(source, destination));
}
BENCHMARK(BM_VerticalConvolve1080)->Unit(benchmark::kMillisecond);

} // namespace
