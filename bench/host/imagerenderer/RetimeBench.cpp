// Re-timing and field kernels of the image renderer on 1920x1080 frames, single-threaded:
// accumulation of two and three frames (linear light at quality 5, as stored below), the
// weighted sum of the planes of two and three 4:2:0 frames, and
// deinterlacing in place and by field copy. Buffers come from the transient memory pool
// and are reused across iterations, so page faults are not measured.

#include "IR/ImageRenderer.h"
#include "IR/PlaneAccumulate.h"

#include <memory>
#include <random>
#include <vector>

#include <benchmark/benchmark.h>

namespace
{

constexpr std::int32_t kW = 1920;
constexpr std::int32_t kH = 1080;

// A 1080p buffer of reproducible noise (floats in 0..1 for float formats), or inRows
// rows of it.
class NoiseFrame
{
public:
    explicit NoiseFrame(IR_PixelFormat inFormat, std::uint32_t inSeed = 7, std::int32_t inRows = kH)
        : mRowBytes(static_cast<std::int32_t>(IR_MinimumRowBytes(inFormat, kW)))
        , mBytes(static_cast<std::size_t>(mRowBytes) * static_cast<std::size_t>(inRows))
        , mData(static_cast<std::uint8_t*>(IR_AllocateTransientMemoryBlock(mBytes)))
    {
        std::mt19937 random(inSeed);
        if (inFormat & kIR_FormatBit_Float)
        {
            auto* f = reinterpret_cast<float*>(mData);
            for (std::size_t i = 0; i < mBytes / 4; ++i)
                f[i] = static_cast<float>(random() % 1001) / 1000.0f;
            return;
        }
        for (std::size_t i = 0; i < mBytes; ++i)
            mData[i] = static_cast<std::uint8_t>(random());
        // Premultiplied pixels keep colour at or below alpha.
        if (inFormat & kIR_FormatBit_PremultipliedAlpha)
            for (std::size_t i = 0; i < mBytes; i += 4)
                for (int c = 0; c < 3; ++c)
                    mData[i + c] = static_cast<std::uint8_t>(mData[i + c] * mData[i + 3] / 255);
    }
    ~NoiseFrame() { IR_FreeTransientMemoryBlock(mData); }
    NoiseFrame(const NoiseFrame&) = delete;
    NoiseFrame& operator=(const NoiseFrame&) = delete;

    std::uint8_t* Data() const { return mData; }
    std::int32_t RowBytes() const { return mRowBytes; }

private:
    std::int32_t mRowBytes;
    std::size_t mBytes;
    std::uint8_t* mData;
};

void BM_Accumulate(benchmark::State& ioState, IR_PixelFormat inFormat, std::int32_t inSources,
                   std::int32_t inQuality)
{
    std::vector<std::unique_ptr<NoiseFrame>> frames;
    std::vector<const void*> bases;
    std::vector<std::int32_t> rowBytes;
    std::vector<double> weights;
    for (std::int32_t i = 0; i < inSources; ++i)
    {
        frames.push_back(
            std::make_unique<NoiseFrame>(inFormat, 11u + static_cast<std::uint32_t>(i)));
        bases.push_back(frames.back()->Data());
        rowBytes.push_back(frames.back()->RowBytes());
        weights.push_back(1.0 / inSources);
    }
    NoiseFrame out(inFormat);
    for (auto _ : ioState)
        benchmark::DoNotOptimize(IR_Accumulate(bases.data(), rowBytes.data(), weights.data(),
                                               inSources, out.Data(), out.RowBytes(), inFormat, kW,
                                               kH, inQuality));
}
BENCHMARK_CAPTURE(BM_Accumulate, BGRA_8u_Two_Linear, kIR_PixelFormat_BGRA_8u, 2, 5)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Accumulate, BGRA_8u_Three_Linear, kIR_PixelFormat_BGRA_8u, 3, 5)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Accumulate, BGRP_8u_Two_Linear, kIR_PixelFormat_BGRP_8u, 2, 5)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Accumulate, BGRA_8u_Two_AsStored, kIR_PixelFormat_BGRA_8u, 2, 4)
    ->Unit(benchmark::kMillisecond);

// The three planes of 1080p 4:2:0 frames are 1.5 times 1080 rows of 1920 samples.
void BM_AccumulatePlanes(benchmark::State& ioState, std::int32_t inSources)
{
    constexpr IR_PixelFormat kFormat = kIR_PixelFormat_YUV_420_Planar_8u;
    constexpr std::int32_t kRows = kH * 3 / 2;
    std::vector<std::unique_ptr<NoiseFrame>> frames;
    std::vector<const std::uint8_t*> bases;
    std::vector<std::int32_t> rowBytes;
    std::vector<double> weights;
    for (std::int32_t i = 0; i < inSources; ++i)
    {
        frames.push_back(
            std::make_unique<NoiseFrame>(kFormat, 11u + static_cast<std::uint32_t>(i), kRows));
        bases.push_back(frames.back()->Data());
        rowBytes.push_back(frames.back()->RowBytes());
        weights.push_back(1.0 / inSources);
    }
    NoiseFrame out(kFormat, 7, kRows);
    for (auto _ : ioState)
        benchmark::DoNotOptimize(IR_AccumulatePlane8(bases.data(), rowBytes.data(), weights.data(),
                                                     inSources, out.Data(), out.RowBytes(), kW,
                                                     kRows));
}
BENCHMARK_CAPTURE(BM_AccumulatePlanes, YUV420_Two, 2)->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_AccumulatePlanes, YUV420_Three, 3)->Unit(benchmark::kMillisecond);

void BM_Deinterlace(benchmark::State& ioState, IR_PixelFormat inFormat, std::int32_t inQuality)
{
    NoiseFrame frame(inFormat);
    for (auto _ : ioState)
        benchmark::DoNotOptimize(
            IR_Deinterlace(frame.Data(), frame.RowBytes(), inFormat, kW, kH, false, inQuality));
}
BENCHMARK_CAPTURE(BM_Deinterlace, BGRA_8u_Average, kIR_PixelFormat_BGRA_8u, 5)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Deinterlace, BGRA_8u_Repeat, kIR_PixelFormat_BGRA_8u, 0)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Deinterlace, BGRA_32f_Average, kIR_PixelFormat_BGRA_32f, 5)
    ->Unit(benchmark::kMillisecond);

void BM_DeinterlaceCopyQuarter(benchmark::State& ioState)
{
    constexpr IR_PixelFormat kFormat = kIR_PixelFormat_BGRA_8u;
    NoiseFrame src(kFormat);
    NoiseFrame dst(kFormat);
    for (auto _ : ioState)
        benchmark::DoNotOptimize(IR_DeinterlaceCopy(src.Data(), src.RowBytes(), kH, dst.Data(),
                                                    dst.RowBytes(), kH / 4, kFormat, kW, false, 5));
}
BENCHMARK(BM_DeinterlaceCopyQuarter)->Unit(benchmark::kMillisecond);

} // namespace

BENCHMARK_MAIN();
