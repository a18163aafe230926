#pragma once

// Helpers of the source tests: render parameters, pixel reads of small 8-bit
// frames, opening pattern sources.

#include "BE/MediaStatus.h"
#include "BE/VideoSources.h"
#include "ML/CutlistRenderParams.h"
#include "ML/IRenderableSource.h"
#include "VF/VideoFrame.h"

#include <array>
#include <cstdint>
#include <string>
#include <utility>

#include <gtest/gtest.h>

namespace ML::Test
{

using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;
using SourceRef = QRT::InterfaceRef<IRenderableSource>;
using mvxmediatypes::FrameRate;
using mvxmediatypes::TickTime;

inline TickTime Ticks(std::int64_t inTicks)
{
    return TickTime::TicksToTime(inTicks);
}

// 25 frames per second: 28,224,000 ticks a frame, 14,112,000 a field.
inline constexpr std::int64_t kFrame25 = 28'224'000;
inline constexpr std::int64_t kField25 = kFrame25 / 2;

inline CutlistRenderParams
MakeParams(std::uint32_t inWidth, std::uint32_t inHeight,
           mvxmediatypes::PixelFormat inFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u,
           std::uint32_t inQuality = mvxmediatypes::kRenderQuality_Max)
{
    CutlistRenderParams params;
    params.mWidth = inWidth;
    params.mHeight = inHeight;
    params.mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    params.mPixelFormat = inFormat;
    params.mQuality = inQuality;
    return params;
}

// B, G, R, A of pixel (x, y) of an 8-bit 4:4:4 frame.
inline std::array<int, 4> Pixel(const FrameRef& inFrame, int inX, int inY)
{
    const auto* base = static_cast<const std::uint8_t*>(inFrame->GetBaseAddress());
    const std::uint8_t* pixel = base + std::size_t(inY) * inFrame->GetRowBytes() + inX * 4;
    return {pixel[0], pixel[1], pixel[2], pixel[3]};
}

inline std::array<int, 4> Bgra(int inBlue, int inGreen, int inRed, int inAlpha)
{
    return {inBlue, inGreen, inRed, inAlpha};
}

// True when every pixel of the frame equals inExpected.
inline ::testing::AssertionResult AllPixelsAre(const FrameRef& inFrame,
                                               const std::array<int, 4>& inExpected)
{
    const QRT::ParamRect bounds = inFrame->GetBounds();
    for (int y = 0; y < bounds.Height(); ++y)
        for (int x = 0; x < bounds.Width(); ++x)
        {
            const std::array<int, 4> found = Pixel(inFrame, x, y);
            if (found != inExpected)
                return ::testing::AssertionFailure()
                       << "pixel (" << x << ", " << y << ") is " << found[0] << "," << found[1]
                       << "," << found[2] << "," << found[3] << "; expected " << inExpected[0]
                       << "," << inExpected[1] << "," << inExpected[2] << "," << inExpected[3];
        }
    return ::testing::AssertionSuccess();
}

inline BE::VideoSourceRef OpenPattern(const std::string& inMedia)
{
    BE::VideoSourceRef source;
    const BE::OpenStatus status = BE::OpenVideoSource(inMedia, source);
    EXPECT_TRUE(status.Succeeded()) << status.mMessage;
    return source;
}

// A BGRA_4444_8u frame of the given size filled with 0xAARRGGBB, straight.
inline FrameRef
MakeFilledFrame(std::uint32_t inWidth, std::uint32_t inHeight, std::uint32_t inColor,
                mvxmediatypes::PixelAspectRatio inRatio = mvxmediatypes::kPixelAspectRatio_Square)
{
    FrameRef frame = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, inWidth,
                                          inHeight, inRatio, false, false);
    EXPECT_TRUE(frame);
    const QRT::ParamRect bounds = frame->GetBounds();
    auto* base = static_cast<std::uint8_t*>(frame->GetWritableBaseAddress());
    for (int y = 0; y < bounds.Height(); ++y)
        for (int x = 0; x < bounds.Width(); ++x)
        {
            std::uint8_t* pixel = base + std::size_t(y) * frame->GetRowBytes() + x * 4;
            pixel[0] = static_cast<std::uint8_t>(inColor);
            pixel[1] = static_cast<std::uint8_t>(inColor >> 8);
            pixel[2] = static_cast<std::uint8_t>(inColor >> 16);
            pixel[3] = static_cast<std::uint8_t>(inColor >> 24);
        }
    return frame;
}

inline FrameRate RateOf(IRenderableSource& inSource)
{
    FrameRate rate;
    inSource.GetFrameRate(rate);
    return rate;
}

inline FrameRate FieldRateOf(IRenderableSource& inSource)
{
    FrameRate rate;
    inSource.GetFieldRate(rate);
    return rate;
}

inline MF::FrameTime Conform(IRenderableSource& inSource, const MF::FrameTime& inRequested)
{
    MF::FrameTime conformed(Ticks(-1));
    inSource.ConformFrameTime(inRequested, CutlistRenderParams(), conformed);
    return conformed;
}

} // namespace ML::Test

namespace ML::Test
{

using TickPair = std::pair<std::int64_t, std::int64_t>;

inline TickPair Pair(std::int64_t inFirst, std::int64_t inSecond)
{
    return {inFirst, inSecond};
}

// The two field times in ticks, for readable comparisons.
inline std::pair<std::int64_t, std::int64_t> TicksOf(const MF::FrameTime& inTime)
{
    return {inTime.GetFirstFieldTime().GetTicks(), inTime.GetSecondFieldTime().GetTicks()};
}

} // namespace ML::Test
