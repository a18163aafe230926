#pragma once

// Compositing of frames: one layer drawn through its motion onto an optional
// lower frame (the step of compositors, clips, transitions and adjustment
// layers), the same with no lower frame for a layer alone, and a plain
// composite at an integer pixel offset.
//
// Layers are drawn in the compositing format of the request: 32-bit float
// linear premultiplied at quality 5, otherwise the requested format, or
// straight 32-bit float when the image renderer cannot draw in that one
// (Y'CbCr, 16-bit). Frames in another format, or whose alpha kind makes them
// read differently, are converted first; the cutlist renderer conforms the
// result to the output.
//
// Plain functions; callable from any number of render threads at once. Frames
// handed in are only read, except a lower frame that is not shared, which is
// drawn into in place (its owner hands it over). Every other frame written is
// one these functions made.

#include "MF/IVideoFrame.h"
#include "ML/CutlistRenderParams.h"
#include "ML/MotionRecord.h"
#include "QRT/InterfaceRef.h"
#include "QRT/Result.h"
#include "mvxmediatypes/PixelFormat.h"

#include <cstdint>

namespace ML
{

// The format layers of a request are drawn in (see above).
mvxmediatypes::PixelFormat GetCompositingFormat(const CutlistRenderParams& inParams);

// inFrame drawn with inFirstFieldMotion and inSecondFieldMotion onto
// inLowerFrame (may be empty). The lower frame itself when the layer's
// visible content is empty; an empty frame when drawing fails. Input
// contracts "inFrame" and
// "!inLowerFrame || FrameAlreadyConformsToOutput(inLowerFrame, inRenderParams)".
QRT::InterfaceRef<MF::IVideoFrame>
CompositeLayer(const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
               const MotionRecord& inFirstFieldMotion, const MotionRecord& inSecondFieldMotion,
               const QRT::InterfaceRef<MF::IVideoFrame>& inLowerFrame,
               const CutlistRenderParams& inRenderParams);

// inFrame drawn through the geometry of the two records alone (normal blend,
// full opacity) into a new frame of the request; inFrame itself when both
// records are the identity and the frame already conforms to the output.
QRT::InterfaceRef<MF::IVideoFrame> ApplyMotion(const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
                                               const MotionRecord& inFirstFieldMotion,
                                               const MotionRecord& inSecondFieldMotion,
                                               const CutlistRenderParams& inRenderParams);

// Composites all of inSourceFrame over inDestinationFrame (not shared) with
// its top-left corner at (inX, inY), clipped to the destination, at full
// opacity. A destination that tracks its visible content grows by the
// source's. Input contracts "inSourceFrame != NULL" and
// "inDestinationFrame != NULL". Answers the pixel work's status.
QRT::Result CompositeFrameAtOffset(const QRT::InterfaceRef<MF::IVideoFrame>& inSourceFrame,
                                   const QRT::InterfaceRef<MF::IVideoFrame>& inDestinationFrame,
                                   std::int32_t inX, std::int32_t inY);

} // namespace ML
