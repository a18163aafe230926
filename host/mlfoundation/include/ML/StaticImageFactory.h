#pragma once

// ML::StaticImageFactory: the stock and placeholder pictures of the host,
// drawn procedurally at any size and delivered in any raster pixel format.
//
// Image numbers (the numbering the renderer and the stock image suite use):
//   1 kStaticImage_MediaOffline  "MEDIA OFFLINE" slate: white text on dark red
//   2 kStaticImage_MediaPending  "MEDIA PENDING" slate: white text on dark blue
//   3 kStaticImage_ColorBars     75 % colour bars: white, yellow, cyan, green,
//                                magenta, red, blue, bar i covering columns
//                                [i * width / 7, (i + 1) * width / 7)
//   4 kStaticImage_Black         opaque black
//   5 kStaticImage_White         opaque white
//   6 kStaticImage_MidGrey       opaque grey 128 of 255
// Colours are 8-bit gamma-encoded values, opaque; the slates' text comes from
// a built-in 5x7 bitmap font, scaled up to about four fifths of the width and
// centred (left out when the picture is too small to hold it).
//
// Threads: LoadImageW may be called from any thread; it keeps no state and
// every call answers a new, unshared frame that belongs to the caller.

#include "MF/IVideoFrame.h"
#include "QRT/InterfaceRef.h"
#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/PixelAspectRatio.h"
#include "mvxmediatypes/PixelFormat.h"

#include <cstdint>

namespace ML
{

inline constexpr int32_t kStaticImage_MediaOffline = 1;
inline constexpr int32_t kStaticImage_MediaPending = 2;
inline constexpr int32_t kStaticImage_ColorBars = 3;
inline constexpr int32_t kStaticImage_Black = 4;
inline constexpr int32_t kStaticImage_White = 5;
inline constexpr int32_t kStaticImage_MidGrey = 6;

class StaticImageFactory
{
public:
    // The picture inImageNumber at inWidth x inHeight in inFormat with the
    // pixel aspect ratio inRatio (the drawing itself ignores the ratio).
    // Empty for an unknown number, a width or height below 1 or above the
    // frame size limit, or a format a frame cannot be made in.
    static QRT::InterfaceRef<MF::IVideoFrame> LoadImageW(int32_t inImageNumber, int32_t inWidth,
                                                         int32_t inHeight,
                                                         mvxmediatypes::PixelFormat inFormat,
                                                         mvxmediatypes::PixelAspectRatio inRatio,
                                                         mvxmediatypes::RenderQuality inQuality);
};

} // namespace ML
