#pragma once

// Pixel work on whole frames that the render pipeline needs around the node
// graph: the image renderer's reading of a frame's format, and converting
// (and scaling) one frame into another for conforming. Thin adaptors from
// frames to the image renderer's IR_* calls.
//
// Plain functions; callable from any thread at once on different frames. A
// destination is never a shared frame.

#include "MF/IVideoFrame.h"
#include "QRT/InterfaceRef.h"
#include "QRT/Result.h"
#include "mvxmediatypes/PixelFormat.h"

#include <cstdint>

namespace ML
{

// The image renderer's format for frames of inFormat with alpha kind
// inAlpha (invalid when the image renderer cannot address it).
std::uint32_t GetImageRendererFormat(mvxmediatypes::PixelFormat inFormat,
                                     mvxmediatypes::AlphaChannel inAlpha);

// Converts and scales all of inSource onto all of inDestination (not
// shared). Answers a negative status when the pair cannot be converted.
QRT::Result ConvertFramePixels(const QRT::InterfaceRef<MF::IVideoFrame>& inSource,
                               const QRT::InterfaceRef<MF::IVideoFrame>& inDestination,
                               std::uint32_t inQuality);

} // namespace ML
