#pragma once

// ML::IAcceleratedSequenceRenderer: an accelerated renderer plug-in opened on
// one sequence. The render queue offers requests that carry one to it first
// (InitiateRender) and cancels them through it (CancelRender); the renderer
// answers through the IRenderFrameClient it was given, from any thread.
// Implementations accept calls from any thread.

#include "ML/IRenderFrameClient.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "QRT/Result.h"
#include "mvxmediatypes/PixelAspectRatio.h"
#include "mvxmediatypes/PixelFormat.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>
#include <map>
#include <vector>

namespace ML
{

// One segment of the sequence as the plug-in described it at creation.
struct AcceleratedRendererSegment
{
    mvxmediatypes::TickTime mStart;
    // Exclusive.
    mvxmediatypes::TickTime mEnd;
    // 0: the plug-in does not accelerate this segment.
    std::int32_t mStatus = 0;
    // The formats the plug-in renders the segment in, in the plug-in's order.
    std::vector<mvxmediatypes::PixelFormat> mPixelFormats;
};

// Segments by start time; filled once when the renderer is created.
using AcceleratedRendererSegmentTable =
    std::map<mvxmediatypes::TickTime, AcceleratedRendererSegment>;

class IAcceleratedSequenceRenderer : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{500adfbf-ddd3-4a21-a750-c276a246c4f3}");

    // The segment table (never changes after creation).
    virtual const AcceleratedRendererSegmentTable& GetSegments() const = 0;

    // Starts rendering the frame at inTime. Answers 0 when the plug-in took
    // the render (the outcome then reaches inClient exactly once, unless
    // CancelRender takes it first), QRT::kResult_NotFound otherwise.
    virtual QRT::Result InitiateRender(mvxmediatypes::TickTime inTime, std::uint32_t inWidth,
                                       std::uint32_t inHeight,
                                       mvxmediatypes::PixelAspectRatio inPixelAspectRatio,
                                       const std::vector<mvxmediatypes::PixelFormat>& inFormats,
                                       std::uint32_t inQuality, bool inPrefetchOnly,
                                       bool inCompositeOnBlack, bool inRenderBothFields,
                                       QRT::InterfaceRef<IRenderFrameClient> inClient,
                                       std::int64_t inClientContext, std::uint32_t inRequestID) = 0;

    // Cancels a pending render. Answers 0 when it was pending,
    // QRT::kResult_NotFound otherwise.
    virtual QRT::Result CancelRender(std::uint32_t inRequestID) = 0;

protected:
    ~IAcceleratedSequenceRenderer() = default;
};

} // namespace ML
