// The Y'CbCr conversions of the Y4M path beside libswscale on the same
// 1920x1080 frames in the same run, single-threaded, buffers made once:
// - BGRA to planar 4:2:0 and 4:4:4 (the Y4M writer): IR_PackYUVPlanes
//   against sws_scale to YUV420P / YUV444P;
// - planar 4:2:0 to BGRA (the Y4M source): IR_ConvertYUV420Planes against
//   sws_scale from YUV420P.

#include "IR/ImageRenderer.h"
#include "IR/YUVPlanes.h"

#include <cstdint>
#include <random>
#include <vector>

#include <benchmark/benchmark.h>

extern "C"
{
#include <libswscale/swscale.h>
}

namespace
{

constexpr int kWidth = 1920;
constexpr int kHeight = 1080;

std::vector<std::uint8_t> RandomBytes(std::size_t inCount)
{
    std::mt19937 random(3);
    std::vector<std::uint8_t> bytes(inCount);
    for (std::uint8_t& byte : bytes)
        byte = static_cast<std::uint8_t>(random());
    return bytes;
}

// Planes of one frame, chroma halved in both directions or not.
struct Planes
{
    explicit Planes(bool inSubsampled)
        : mChromaWidth(inSubsampled ? kWidth / 2 : kWidth)
        , mChromaHeight(inSubsampled ? kHeight / 2 : kHeight)
        , mY(RandomBytes(std::size_t{kWidth} * kHeight))
        , mCb(RandomBytes(std::size_t(mChromaWidth) * mChromaHeight))
        , mCr(RandomBytes(std::size_t(mChromaWidth) * mChromaHeight))
    {
    }
    std::uint8_t* const* Pointers() { return mPointers; }
    const int* Strides() const { return mStrides; }

    int mChromaWidth, mChromaHeight;
    std::vector<std::uint8_t> mY, mCb, mCr;
    std::uint8_t* mPointers[3] = {mY.data(), mCb.data(), mCr.data()};
    int mStrides[3] = {kWidth, mChromaWidth, mChromaWidth};
};

void BM_BGRAToPlanes_ImageRenderer(benchmark::State& state)
{
    const bool subsampled = state.range(0) != 0;
    const std::vector<std::uint8_t> bgra = RandomBytes(std::size_t{kWidth} * kHeight * 4);
    Planes planes(subsampled);
    for (auto _ : state)
    {
        IR_PackYUVPlanes(bgra.data(), kWidth * 4, kIR_PixelFormat_BGRA_8u, false, planes.mY.data(),
                         kWidth, planes.mCb.data(), planes.mChromaWidth, planes.mCr.data(),
                         planes.mChromaWidth, subsampled, kWidth, kHeight);
        benchmark::DoNotOptimize(planes.mCr.data());
    }
}
BENCHMARK(BM_BGRAToPlanes_ImageRenderer)->Arg(1)->Arg(0);

void BM_BGRAToPlanes_Swscale(benchmark::State& state)
{
    const bool subsampled = state.range(0) != 0;
    const std::vector<std::uint8_t> bgra = RandomBytes(std::size_t{kWidth} * kHeight * 4);
    Planes planes(subsampled);
    SwsContext* context = sws_getContext(kWidth, kHeight, AV_PIX_FMT_BGRA, kWidth, kHeight,
                                         subsampled ? AV_PIX_FMT_YUV420P : AV_PIX_FMT_YUV444P,
                                         SWS_BILINEAR, nullptr, nullptr, nullptr);
    const std::uint8_t* source[1] = {bgra.data()};
    const int sourceStride[1] = {kWidth * 4};
    for (auto _ : state)
    {
        sws_scale(context, source, sourceStride, 0, kHeight, planes.Pointers(), planes.Strides());
        benchmark::DoNotOptimize(planes.mCr.data());
    }
    sws_freeContext(context);
}
BENCHMARK(BM_BGRAToPlanes_Swscale)->Arg(1)->Arg(0);

void BM_420ToBGRA_ImageRenderer(benchmark::State& state)
{
    Planes planes(true);
    std::vector<std::uint8_t> bgra(std::size_t{kWidth} * kHeight * 4);
    for (auto _ : state)
    {
        IR_ConvertYUV420Planes(planes.mY.data(), kWidth, planes.mCb.data(), kWidth / 2,
                               planes.mCr.data(), kWidth / 2, false, bgra.data(), kWidth * 4,
                               kIR_PixelFormat_BGRA_8u, kWidth, kHeight);
        benchmark::DoNotOptimize(bgra.data());
    }
}
BENCHMARK(BM_420ToBGRA_ImageRenderer);

void BM_420ToBGRA_Swscale(benchmark::State& state)
{
    Planes planes(true);
    std::vector<std::uint8_t> bgra(std::size_t{kWidth} * kHeight * 4);
    SwsContext* context = sws_getContext(kWidth, kHeight, AV_PIX_FMT_YUV420P, kWidth, kHeight,
                                         AV_PIX_FMT_BGRA, SWS_BILINEAR, nullptr, nullptr, nullptr);
    std::uint8_t* destination[1] = {bgra.data()};
    const int destinationStride[1] = {kWidth * 4};
    for (auto _ : state)
    {
        sws_scale(context, planes.Pointers(), planes.Strides(), 0, kHeight, destination,
                  destinationStride);
        benchmark::DoNotOptimize(bgra.data());
    }
    sws_freeContext(context);
}
BENCHMARK(BM_420ToBGRA_Swscale);

} // namespace
