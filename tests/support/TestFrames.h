#pragma once

// Small frames and render parameters for tests: BGRA_4444_8u frames filled
// with one colour (bytes in memory order blue, green, red, alpha), a check
// that every pixel has given bytes, and the parameters of a small render.

#include "ML/CutlistRenderParams.h"
#include "VF/VideoFrame.h"

#include <array>
#include <cstdint>
#include <cstring>

#include <gtest/gtest.h>

namespace vrtest
{

using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;
using Bgra = std::array<std::uint8_t, 4>;

inline FrameRef
MakeFrame(std::uint32_t inWidth, std::uint32_t inHeight,
          mvxmediatypes::PixelFormat inFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u)
{
    return VF::CreateVideoFrame(inFormat, inWidth, inHeight,
                                mvxmediatypes::kPixelAspectRatio_Square, true, false);
}

inline void Fill(MF::IVideoFrame& ioFrame, const Bgra& inColor)
{
    auto* base = static_cast<std::uint8_t*>(ioFrame.GetWritableBaseAddress());
    const QRT::ParamRect bounds = ioFrame.GetBounds();
    for (std::int32_t y = 0; y < bounds.Height(); ++y)
        for (std::int32_t x = 0; x < bounds.Width(); ++x)
            std::memcpy(base + static_cast<std::size_t>(y) * ioFrame.GetRowBytes() + 4 * x,
                        inColor.data(), 4);
}

// True when inFrame is BGRA_4444_8u or VUYA_4444_8u and every pixel has the
// four bytes inColor; otherwise reports the first differing pixel.
inline bool IsFilledWith(const FrameRef& inFrame, const Bgra& inColor)
{
    if (!inFrame || (inFrame->GetPixelFormat() != mvxmediatypes::kPixelFormat_BGRA_4444_8u &&
                     inFrame->GetPixelFormat() != mvxmediatypes::kPixelFormat_VUYA_4444_8u))
    {
        ADD_FAILURE() << "no BGRA_4444_8u or VUYA_4444_8u frame";
        return false;
    }
    const QRT::ParamRect bounds = inFrame->GetBounds();
    const auto* base = static_cast<const std::uint8_t*>(inFrame->GetBaseAddress());
    for (std::int32_t y = 0; y < bounds.Height(); ++y)
        for (std::int32_t x = 0; x < bounds.Width(); ++x)
        {
            const std::uint8_t* pixel =
                base + static_cast<std::size_t>(y) * inFrame->GetRowBytes() + 4 * x;
            if (std::memcmp(pixel, inColor.data(), 4) != 0)
            {
                ADD_FAILURE() << "pixel " << x << "," << y << " is " << int(pixel[0]) << " "
                              << int(pixel[1]) << " " << int(pixel[2]) << " " << int(pixel[3]);
                return false;
            }
        }
    return true;
}

// Parameters of an inWidth x inHeight BGRA_4444_8u render at inTime, the full
// frame as large, square pixels, 25 fps.
inline ML::CutlistRenderParams MakeParams(std::uint32_t inWidth, std::uint32_t inHeight,
                                          const MF::FrameTime& inTime = MF::FrameTime())
{
    ML::CutlistRenderParams params;
    params.SetFrameTime(inTime);
    params.mWidth = params.mFullFrameWidth = inWidth;
    params.mHeight = params.mFullFrameHeight = inHeight;
    params.mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    params.mFullFramePixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    params.mPixelFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
    params.mFrameRate = mvxmediatypes::kFrameRate_Video25;
    return params;
}

} // namespace vrtest
