// Image renderer kernels on 1920x1080 frames, single-threaded, each beside a memcpy
// of the same frame size in the same run. Buffers come from the transient memory
// pool and are reused across iterations, so page faults are not measured.

#include "IR/ImageRenderer.h"

#include <cstring>
#include <random>

#include <benchmark/benchmark.h>

namespace
{

constexpr std::int32_t kW = 1920;
constexpr std::int32_t kH = 1080;

// A frame-sized scratch buffer filled with reproducible noise.
class Frame
{
public:
    Frame(IR_PixelFormat inFormat, std::int32_t inW = kW, std::int32_t inH = kH)
        : mFormat(inFormat)
        , mRowBytes(static_cast<std::int32_t>(IR_MinimumRowBytes(inFormat, inW)))
        , mBytes(static_cast<std::size_t>(mRowBytes) * inH *
                 (inFormat == kIR_PixelFormat_YUV_420_Planar_8u ? 2 : 1))
        , mData(static_cast<std::uint8_t*>(IR_AllocateTransientMemoryBlock(mBytes)))
    {
        std::mt19937 random(42);
        for (std::size_t i = 0; i < mBytes; ++i)
            mData[i] = static_cast<std::uint8_t>(random());
        if (inFormat & kIR_FormatBit_Float)
        {
            auto* f = reinterpret_cast<float*>(mData);
            for (std::size_t i = 0; i < mBytes / 4; ++i)
                f[i] = static_cast<float>(i % 251) / 251.0f;
        }
    }
    ~Frame() { IR_FreeTransientMemoryBlock(mData); }
    Frame(const Frame&) = delete;
    Frame& operator=(const Frame&) = delete;

    std::uint8_t* Data() const { return mData; }
    std::int32_t RowBytes() const { return mRowBytes; }
    std::size_t Bytes() const { return mBytes; }
    IR_PixelFormat Format() const { return mFormat; }

private:
    IR_PixelFormat mFormat;
    std::int32_t mRowBytes;
    std::size_t mBytes;
    std::uint8_t* mData;
};

void BM_Memcpy1080p8u(benchmark::State& ioState)
{
    Frame a(kIR_PixelFormat_BGRA_8u), b(kIR_PixelFormat_BGRA_8u);
    for (auto _ : ioState)
    {
        std::memcpy(b.Data(), a.Data(), a.Bytes());
        benchmark::ClobberMemory();
    }
    ioState.SetBytesProcessed(static_cast<std::int64_t>(ioState.iterations() * a.Bytes()));
}
BENCHMARK(BM_Memcpy1080p8u)->Unit(benchmark::kMillisecond);

void BM_Memcpy1080p32f(benchmark::State& ioState)
{
    Frame a(kIR_PixelFormat_BGRA_32f), b(kIR_PixelFormat_BGRA_32f);
    for (auto _ : ioState)
    {
        std::memcpy(b.Data(), a.Data(), a.Bytes());
        benchmark::ClobberMemory();
    }
}
BENCHMARK(BM_Memcpy1080p32f)->Unit(benchmark::kMillisecond);

void BM_Composite(benchmark::State& ioState, IR_PixelFormat inFormat, float inOpacity)
{
    Frame src(inFormat), dst(inFormat);
    for (auto _ : ioState)
        benchmark::DoNotOptimize(IR_Composite(src.Data(), src.RowBytes(), dst.Data(),
                                              dst.RowBytes(), inFormat, kW, kH, inOpacity, 4));
}
BENCHMARK_CAPTURE(BM_Composite, BGRP_8u, kIR_PixelFormat_BGRP_8u, 1.0f)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Composite, BGRP_8u_Opacity50, kIR_PixelFormat_BGRP_8u, 0.5f)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Composite, BGRA_8u, kIR_PixelFormat_BGRA_8u, 1.0f)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Composite, BGRP_32f, kIR_PixelFormat_BGRP_32f, 1.0f)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Composite, BGRA_32f, kIR_PixelFormat_BGRA_32f, 1.0f)
    ->Unit(benchmark::kMillisecond);

void BM_Motion(benchmark::State& ioState, IR_MotionGeometry inGeometry, std::int32_t inQuality,
               bool inLower)
{
    Frame src(kIR_PixelFormat_BGRP_8u), dst(kIR_PixelFormat_BGRP_8u);
    IR_AffineMatrix matrix;
    IR_BuildMotionMatrix(inGeometry, kW, kH, kW, kH, &matrix);
    for (auto _ : ioState)
        benchmark::DoNotOptimize(IR_Motion(src.Data(), src.RowBytes(), src.Format(), kW, kH,
                                           dst.Data(), dst.RowBytes(), dst.Format(), kW, kH,
                                           &matrix, 1.0f, inQuality, kIR_Field_All, inLower));
}

IR_MotionGeometry HalfSize()
{
    IR_MotionGeometry g;
    g.scaleX = g.scaleY = 0.5f;
    g.positionX = 0.37f;
    g.positionY = 0.41f;
    return g;
}

IR_MotionGeometry Rotated()
{
    IR_MotionGeometry g;
    g.rotationDegrees = 10.0;
    g.scaleX = g.scaleY = 0.8f;
    return g;
}

BENCHMARK_CAPTURE(BM_Motion, Identity_Bilinear_NoLower, IR_MotionGeometry{}, 4, false)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Motion, Identity_Bilinear_OntoLower, IR_MotionGeometry{}, 4, true)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Motion, HalfSize_Bilinear_OntoLower, HalfSize(), 4, true)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Motion, HalfSize_Nearest_OntoLower, HalfSize(), 0, true)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Motion, Rotated_Bilinear_OntoLower, Rotated(), 4, true)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Motion, HalfSize_Best_OntoLower, HalfSize(), 5, true)
    ->Unit(benchmark::kMillisecond);

void BM_CrossDissolve(benchmark::State& ioState, IR_PixelFormat inFormat)
{
    Frame a(inFormat), b(inFormat), d(inFormat);
    for (auto _ : ioState)
        benchmark::DoNotOptimize(IR_CrossDissolve(a.Data(), a.RowBytes(), b.Data(), b.RowBytes(),
                                                  d.Data(), d.RowBytes(), inFormat, kW, kH, 0.3f,
                                                  4));
}
BENCHMARK_CAPTURE(BM_CrossDissolve, BGRA_8u, kIR_PixelFormat_BGRA_8u)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_CrossDissolve, BGRA_32f, kIR_PixelFormat_BGRA_32f)
    ->Unit(benchmark::kMillisecond);

void BM_Convert(benchmark::State& ioState, IR_PixelFormat inSrc, IR_PixelFormat inDst)
{
    Frame src(inSrc), dst(inDst);
    for (auto _ : ioState)
        benchmark::DoNotOptimize(IR_Convert(src.Data(), src.RowBytes(), inSrc, dst.Data(),
                                            dst.RowBytes(), inDst, kW, kH, 4));
}
BENCHMARK_CAPTURE(BM_Convert, BGRA_8u_To_32f, kIR_PixelFormat_BGRA_8u, kIR_PixelFormat_BGRA_32f)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Convert, YUV420_To_BGRA_8u, kIR_PixelFormat_YUV_420_Planar_8u,
                  kIR_PixelFormat_BGRA_8u)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Convert, BGRP_8u_To_BGRA_8u, kIR_PixelFormat_BGRP_8u, kIR_PixelFormat_BGRA_8u)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_Convert, BGRA_8u_To_32f_Linear, kIR_PixelFormat_BGRA_8u,
                  kIR_PixelFormat_BGRP_32f_Linear)
    ->Unit(benchmark::kMillisecond);

// 1080p scaled to inW x inH in one format; inOpaque sets every 8-bit alpha to 255 (video
// frames), else alphas are noise and straight colour is premultiplied and divided again.
void BM_ScaleConvert(benchmark::State& ioState, IR_PixelFormat inFormat, std::int32_t inW,
                     std::int32_t inH, std::int32_t inQuality, bool inOpaque)
{
    Frame src(inFormat), dst(inFormat, inW, inH);
    if (inOpaque && !(inFormat & kIR_FormatBit_Float))
        for (std::size_t i = 3; i < src.Bytes(); i += 4)
            src.Data()[i] = 255;
    for (auto _ : ioState)
        benchmark::DoNotOptimize(IR_ScaleConvert(src.Data(), src.RowBytes(), src.Format(), kW, kH,
                                                 dst.Data(), dst.RowBytes(), dst.Format(), inW, inH,
                                                 inQuality));
}
constexpr IR_PixelFormat k8u = kIR_PixelFormat_BGRA_8u;
constexpr IR_PixelFormat k32f = kIR_PixelFormat_BGRA_32f;
BENCHMARK_CAPTURE(BM_ScaleConvert, To540_Nearest_8u, k8u, 960, 540, 0, true)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_ScaleConvert, To540_Bilinear_8u, k8u, 960, 540, 4, true)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_ScaleConvert, To540_Area_8u, k8u, 960, 540, 5, true)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_ScaleConvert, To540_Area_8u_Alpha, k8u, 960, 540, 5, false)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_ScaleConvert, To810_Bilinear_8u, k8u, 1440, 810, 4, true)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_ScaleConvert, To810_Area_8u, k8u, 1440, 810, 5, true)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_ScaleConvert, To540_Bilinear_32f, k32f, 960, 540, 4, false)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_ScaleConvert, To540_Area_32f, k32f, 960, 540, 5, false)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_ScaleConvert, To810_Bilinear_32f, k32f, 1440, 810, 4, false)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_ScaleConvert, To810_Area_32f, k32f, 1440, 810, 5, false)
    ->Unit(benchmark::kMillisecond);

} // namespace
