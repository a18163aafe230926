#pragma once

// Pixel aspect ratio arithmetic of the media model.
//
// Pure functions; safe from any thread.

#include "mvxmediatypes/PixelAspectRatio.h"

#include <cstdint>

namespace MF
{

// The pixel aspect ratio of a frame that was asked for at inRequestedWidth x
// inRequestedHeight with ratio inPixelAspectRatio but delivered at
// inFrameWidth x inFrameHeight, the same picture scaled by different factors
// horizontally and vertically:
//
//     ratio * (requested width / frame width) / (requested height / frame height)
//
// computed exactly in integers and answered in lowest terms. Example: 10:11
// asked at 720x480 and delivered at 360x480 (half the columns) gives 20:11; a
// uniform reduction (360x240) keeps 10:11. A result whose lowest terms do not
// fit 32 bits is the nearest fraction that does.
//
// kPixelAspectRatio_Any is answered unchanged (it fits every frame). Input
// contracts: every size is positive; the ratio is valid or Any.
mvxmediatypes::PixelAspectRatio AdjustPixelAspectRatioForNonUniformDownsample(
    const mvxmediatypes::PixelAspectRatio& inPixelAspectRatio, std::int32_t inRequestedWidth,
    std::int32_t inRequestedHeight, std::int32_t inFrameWidth, std::int32_t inFrameHeight);

} // namespace MF
