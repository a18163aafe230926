#pragma once

// Plain render requests for the pipeline's tests.

#include "ML/RenderFrameRequest.h"

namespace vrtest
{

// Settings of a request for an inWidth x inHeight output in inFormat from
// inProducer, identifier inRequestID, at time inRequestID * 1000 ticks.
inline ML::RenderFrameRequestSettings
MakeSettings(std::uint32_t inRequestID, QRT::InterfaceRef<ML::IRenderableNodeProducer> inProducer,
             std::int32_t inWidth = 64, std::int32_t inHeight = 32,
             mvxmediatypes::PixelFormat inFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u,
             std::uint32_t inPriority = ML::kRenderPriority_Normal)
{
    ML::RenderFrameRequestSettings settings;
    settings.mTime = MF::FrameTime(mvxmediatypes::TickTime::TicksToTime(inRequestID * 1000));
    settings.mFrameRate = mvxmediatypes::kFrameRate_Video25;
    settings.mFullFrameRect = settings.mOutputRect = QRT::ParamRect(0, 0, inWidth, inHeight);
    settings.mFullFramePixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    settings.mOutputPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    settings.mRequestedFormats = {inFormat};
    settings.mPriority = inPriority;
    settings.mRequestID = inRequestID;
    settings.mProducer = std::move(inProducer);
    return settings;
}

inline ML::RenderFrameRequest MakeRequest(const ML::RenderFrameRequestSettings& inSettings)
{
    return ML::RenderFrameRequest(inSettings, true, false);
}

// A request that only waits for inPrefetch.
inline ML::RenderFrameRequest
PrefetchOnly(std::uint32_t inRequestID, QRT::InterfaceRef<ML::IRenderableNodePrefetch> inPrefetch)
{
    return ML::RenderFrameRequest(mvxmediatypes::TickTime::TicksToTime(inRequestID),
                                  ML::RenderableNodePrefetchList{std::move(inPrefetch)},
                                  inRequestID);
}

} // namespace vrtest
