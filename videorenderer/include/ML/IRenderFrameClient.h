#pragma once

// ML::IRenderFrameClient: the receiver of one render's outcome.
//
// Every render request accepted by the render queue ends in exactly one of
// the three calls below (or, when the request has no live client, in the
// matching station message of "ML/RenderFrameMessages.h"). Calls arrive on
// any thread (render workers, the queue's housekeeping thread, accelerated
// renderer threads, the thread that cancels) and never while a queue lock is
// held. Requests hold their client weakly, so a client that went away is
// skipped; implementations are therefore weak-reference capable.

#include "MF/IVideoFrame.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "QRT/Result.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>

namespace ML
{

class IRenderFrameClient : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{2acaacc3-000f-4e80-9949-b7f58e3acc32}");

    // The frame is finished. inContext is the request's context, inTime its
    // frame time; inRenderMilliseconds the render duration (accelerated
    // renderers pass their own value).
    virtual void OnRenderFrameComplete(std::intptr_t inContext, std::uint32_t inRequestID,
                                       mvxmediatypes::TickTime inTime,
                                       QRT::InterfaceRef<MF::IVideoFrame> inFrame,
                                       std::int32_t inRenderMilliseconds) = 0;

    // The request was cancelled.
    virtual void OnRenderFrameCancelled(std::intptr_t inContext, std::uint32_t inRequestID,
                                        mvxmediatypes::TickTime inTime) = 0;

    // The render failed with inStatus.
    virtual void OnRenderFrameError(std::intptr_t inContext, std::uint32_t inRequestID,
                                    mvxmediatypes::TickTime inTime, QRT::Result inStatus) = 0;

protected:
    ~IRenderFrameClient() = default;
};

} // namespace ML
