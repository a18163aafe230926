#pragma once

// ML::CutlistRenderParams: what to render, handed down from a render request
// through cutlists, nodes, producers and sources.
//
// A plain value: copying it adds a reference to its node. It begins with its
// frame time (it derives from MF::FrameTime), so the parameters may be passed
// wherever a frame time is asked for (for example to
// MF::IRenderableCutlist::GetNodeAtTime). Safe to copy between threads; a
// copy is used by one thread at a time.

#include "MF/FrameTime.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "VF/FrameCachePriority.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/PixelAspectRatio.h"
#include "mvxmediatypes/PixelFormat.h"

#include <cstdint>

namespace ML
{

struct CutlistRenderParams : public MF::FrameTime
{
    // The two field times of the frame to render.
    const MF::FrameTime& GetFrameTime() const { return *this; }
    void SetFrameTime(const MF::FrameTime& inTime) { static_cast<MF::FrameTime&>(*this) = inTime; }

    // Size of the frame to deliver.
    std::uint32_t mWidth = 0;
    std::uint32_t mHeight = 0;
    // Pixel aspect ratio of the frame to deliver.
    mvxmediatypes::PixelAspectRatio mPixelAspectRatio;
    // The format to render in.
    mvxmediatypes::PixelFormat mPixelFormat;
    // 0 the whole frame; 1 only the first field is needed; 2 only the second.
    // Non-zero also lets an interlaced frame stand for a progressive request.
    std::uint32_t mSingleField = 0;
    // The request's secondary quality (its quality when that was 0xFFFFFFFF).
    std::uint32_t mSecondaryQuality = 0;
    // Scale from the full frame to the delivered frame.
    double mHorizontalScale = 1.0;
    double mVerticalScale = 1.0;
    // RenderQuality numbering.
    std::uint32_t mQuality = 0;
    // Carried unchanged from the request.
    std::int64_t mCutlistParameter = -1;
    // Size and pixel aspect ratio of the full (sequence) frame.
    std::uint32_t mFullFrameWidth = 0;
    std::uint32_t mFullFrameHeight = 0;
    mvxmediatypes::PixelAspectRatio mFullFramePixelAspectRatio;
    // Sequence frame rate and field order (0 progressive, 1, 2).
    mvxmediatypes::FrameRate mFrameRate;
    std::uint32_t mFieldType = 0;
    // The video segments object (cutlist provider) of the request.
    QRT::InterfaceRef<QRT::QRTUnknown> mNode;
    // The request's cutlist choice and 1.
    std::uint32_t mCutlistChoiceBit = 0;
    // The request's render flags (8: always cache; 16: cache when the cache
    // range is not empty).
    std::uint32_t mRenderFlags = 0;
    // The shared frame cache's priority for the frames this render reads ahead
    // and renders: high for playback, scrubbing and the renders of the render
    // queue's normal class, which come back to their frames; low for a render
    // that passes over its frames once (an export), so that its frames are
    // evicted first and held only within the cache's low-priority allowance.
    // Not part of any frame or request hash: it changes what is kept, not
    // what is made.
    std::int32_t mCachePriority = VF::kCachePriority_High;
};

} // namespace ML
