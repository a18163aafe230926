// The image renderer's 8-bit kernels beside the libraries they could have
// been built on, on the same 1920x1080 BGRA frames in the same run:
// - premultiplied source-over: IR_Composite against pixman's OVER on
//   a8r8g8b8 (pixman works only on premultiplied pixels);
// - scaling 1920x1080 to 960x540, bilinear: IR_ScaleConvert and the
//   half-size IR_Motion against libswscale's SWS_BILINEAR on BGRA.
// Single-threaded, buffers allocated once and reused.

#include "IR/ImageRenderer.h"

#include <cstdint>
#include <cstring>
#include <random>
#include <vector>

#include <benchmark/benchmark.h>
#include <pixman.h>

extern "C"
{
#include <libswscale/swscale.h>
}

namespace
{

constexpr int kWidth = 1920;
constexpr int kHeight = 1080;
constexpr int kRowBytes = kWidth * 4;

// A premultiplied frame with varied alpha.
std::vector<std::uint32_t> MakePremultipliedFrame(unsigned inSeed)
{
    std::mt19937 random(inSeed);
    std::vector<std::uint32_t> pixels(static_cast<size_t>(kWidth) * kHeight);
    for (std::uint32_t& pixel : pixels)
    {
        const std::uint32_t a = random() & 0xFF;
        const std::uint32_t r = (random() & 0xFF) * a / 255;
        const std::uint32_t g = (random() & 0xFF) * a / 255;
        const std::uint32_t b = (random() & 0xFF) * a / 255;
        pixel = (a << 24) | (r << 16) | (g << 8) | b;
    }
    return pixels;
}

void BM_Memcpy1080p(benchmark::State& state)
{
    std::vector<std::uint32_t> source = MakePremultipliedFrame(1);
    std::vector<std::uint32_t> destination(source.size());
    for (auto _ : state)
    {
        std::memcpy(destination.data(), source.data(), source.size() * 4);
        benchmark::DoNotOptimize(destination.data());
    }
}
BENCHMARK(BM_Memcpy1080p);

void BM_OverPremultiplied_ImageRenderer(benchmark::State& state)
{
    const std::vector<std::uint32_t> source = MakePremultipliedFrame(1);
    std::vector<std::uint32_t> destination = MakePremultipliedFrame(2);
    for (auto _ : state)
    {
        IR_Composite(source.data(), kRowBytes, destination.data(), kRowBytes,
                     kIR_PixelFormat_BGRP_8u, kWidth, kHeight, 1.0f, 4);
        benchmark::DoNotOptimize(destination.data());
    }
}
BENCHMARK(BM_OverPremultiplied_ImageRenderer);

void BM_OverPremultiplied_Pixman(benchmark::State& state)
{
    std::vector<std::uint32_t> source = MakePremultipliedFrame(1);
    std::vector<std::uint32_t> destination = MakePremultipliedFrame(2);
    pixman_image_t* src =
        pixman_image_create_bits(PIXMAN_a8r8g8b8, kWidth, kHeight, source.data(), kRowBytes);
    pixman_image_t* dst =
        pixman_image_create_bits(PIXMAN_a8r8g8b8, kWidth, kHeight, destination.data(), kRowBytes);
    for (auto _ : state)
    {
        pixman_image_composite32(PIXMAN_OP_OVER, src, nullptr, dst, 0, 0, 0, 0, 0, 0, kWidth,
                                 kHeight);
        benchmark::DoNotOptimize(destination.data());
    }
    pixman_image_unref(src);
    pixman_image_unref(dst);
}
BENCHMARK(BM_OverPremultiplied_Pixman);

void BM_HalfSizeBilinear_ImageRendererScaleConvert(benchmark::State& state)
{
    const std::vector<std::uint32_t> source = MakePremultipliedFrame(1);
    std::vector<std::uint32_t> destination(static_cast<size_t>(kWidth / 2) * (kHeight / 2));
    for (auto _ : state)
    {
        IR_ScaleConvert(source.data(), kRowBytes, kIR_PixelFormat_BGRA_8u, kWidth, kHeight,
                        destination.data(), kRowBytes / 2, kIR_PixelFormat_BGRA_8u, kWidth / 2,
                        kHeight / 2, 3);
        benchmark::DoNotOptimize(destination.data());
    }
}
BENCHMARK(BM_HalfSizeBilinear_ImageRendererScaleConvert);

void BM_HalfSizeBilinear_ImageRendererMotion(benchmark::State& state)
{
    const std::vector<std::uint32_t> source = MakePremultipliedFrame(1);
    std::vector<std::uint32_t> destination(static_cast<size_t>(kWidth / 2) * (kHeight / 2));
    IR_MotionGeometry geometry;
    geometry.scaleX = 0.5f;
    geometry.scaleY = 0.5f;
    IR_AffineMatrix matrix;
    IR_BuildMotionMatrix(geometry, kWidth, kHeight, kWidth / 2, kHeight / 2, &matrix);
    for (auto _ : state)
    {
        IR_Motion(source.data(), kRowBytes, kIR_PixelFormat_BGRP_8u, kWidth, kHeight,
                  destination.data(), kRowBytes / 2, kIR_PixelFormat_BGRP_8u, kWidth / 2,
                  kHeight / 2, &matrix, 1.0f, 3, kIR_Field_All, false);
        benchmark::DoNotOptimize(destination.data());
    }
}
BENCHMARK(BM_HalfSizeBilinear_ImageRendererMotion);

void BM_HalfSizeBilinear_Swscale(benchmark::State& state)
{
    const std::vector<std::uint32_t> source = MakePremultipliedFrame(1);
    std::vector<std::uint32_t> destination(static_cast<size_t>(kWidth / 2) * (kHeight / 2));
    SwsContext* context = sws_getContext(kWidth, kHeight, AV_PIX_FMT_BGRA, kWidth / 2, kHeight / 2,
                                         AV_PIX_FMT_BGRA, SWS_BILINEAR, nullptr, nullptr, nullptr);
    const std::uint8_t* sourcePlanes[1] = {reinterpret_cast<const std::uint8_t*>(source.data())};
    const int sourceStrides[1] = {kRowBytes};
    std::uint8_t* destinationPlanes[1] = {reinterpret_cast<std::uint8_t*>(destination.data())};
    const int destinationStrides[1] = {kRowBytes / 2};
    for (auto _ : state)
    {
        sws_scale(context, sourcePlanes, sourceStrides, 0, kHeight, destinationPlanes,
                  destinationStrides);
        benchmark::DoNotOptimize(destination.data());
    }
    sws_freeContext(context);
}
BENCHMARK(BM_HalfSizeBilinear_Swscale);

} // namespace
