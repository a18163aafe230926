#pragma once

// BE::VideoFrameRequest: the frame request record a renderer hands to a video
// source with every frame, prefetch and frame-key request: the size, pixel
// aspect ratio, pixel format, field type and quality of the frame it wants.
//
// Sources treat it as a wish: a width or height of 0 asks for the source's
// own size, kPixelFormat_Any or kPixelFormat_Invalid for its own format; any
// other format is answered with the nearest one the source can deliver. The
// delivered frame keeps the source's own pixel aspect ratio and field type.
// A plain value; its bytes have no padding, so it can be hashed field by field.

#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/PixelAspectRatio.h"
#include "mvxmediatypes/PixelFormat.h"

#include <cstdint>

namespace BE
{

struct VideoFrameRequest
{
    std::uint32_t mWidth = 0;
    std::uint32_t mHeight = 0;
    mvxmediatypes::PixelAspectRatio mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Any;
    mvxmediatypes::PixelFormat mPixelFormat = mvxmediatypes::kPixelFormat_Any;
    // 0 progressive, 1 or 2 the field order of the requested frame time.
    mvxmediatypes::FieldType mFieldType = mvxmediatypes::kFieldType_Progressive;
    // mvxmediatypes::RenderQuality numbering.
    std::uint32_t mQuality = mvxmediatypes::kRenderQuality_Max;

    friend bool operator==(const VideoFrameRequest&, const VideoFrameRequest&) = default;
};

} // namespace BE
