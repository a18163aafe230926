#pragma once

// ML::IRenderableNodePrefetch: a handle on one source frame that is being
// read ahead of rendering.
//
// Handles are collected from the node tree (IRenderableNodePrefetchProvider)
// or given by the creator of a render request. The request's StartPrefetches
// starts each handle once (InitiatePrefetch); the render queue then polls it
// (GetPrefetchedFrame, ContinueWaitingForPrefetch) from its housekeeping
// thread until the frame is there or the wait is given up; a cancelled
// request cancels its handles (CancelPrefetch). Implementations must accept
// calls from any thread (the queue's housekeeping thread, the thread that
// cancels, executor threads completing the read), one call at a time per
// handle from the queue's side.

#include "MF/IVideoFrame.h"
#include "QRT/Guid.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "QRT/Result.h"

#include <vector>

namespace ML
{

class IRenderableNodePrefetch : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{94b01ac4-a533-4d45-ae0e-ec252d347e41}");

    // Starts the read. Answers 0, or a negative status when the read could
    // not be started (the handle is then inert and reports itself complete
    // without a frame).
    virtual QRT::Result InitiatePrefetch() = 0;

    // The result query: 0 when the prefetch is over (outFrame holds the frame,
    // or is empty when the read failed or produced nothing), or the pending
    // status QRT::kResult_NotFound (0xA00F0001) while it is still running. A
    // handle without a frame key may hand out a frame with the pending status;
    // it keeps that frame and answers 0 with it on the next query.
    virtual QRT::Result GetPrefetchedFrame(QRT::InterfaceRef<MF::IVideoFrame>& outFrame) = 0;

    // Gives up the read when no other handle shares it. Answers 0.
    virtual QRT::Result CancelPrefetch() = 0;

    // The key of the frame being read (the shared frame cache's key).
    virtual void GetPrefetchKey(QRT::Guid& outKey) const = 0;

    // The wants-more-time query, asked with the seconds waited so far: true
    // while the caller should keep waiting.
    virtual bool ContinueWaitingForPrefetch(double inElapsedSeconds) = 0;

protected:
    ~IRenderableNodePrefetch() = default;
};

// The prefetch handles of one request, in collection order.
using RenderableNodePrefetchList = std::vector<QRT::InterfaceRef<IRenderableNodePrefetch>>;

} // namespace ML
