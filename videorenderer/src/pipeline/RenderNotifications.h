#pragma once

// The delivery of a render request's outcome: completion, cancellation or
// error, to the request's client (held weakly), else as a message to its
// station, and then to its completion function; or, for a request with a
// waitable object, the signal of that object.
//
// Called by the render queue outside all of its locks, on whatever thread
// finished the request (render workers, the housekeeping thread, an
// accelerated renderer's thread, the thread of a cancel call). The queue
// guarantees that each request reaches exactly one of these once. An
// exception thrown by a completion function propagates to the caller.

#include "MF/IVideoFrame.h"
#include "ML/RenderFrameRequest.h"
#include "QRT/InterfaceRef.h"
#include "QRT/Result.h"

#include <cstdint>

namespace ML
{

// Client OnRenderFrameComplete (or a RenderFrameCompletionMessage), then the
// completion function with (frame, false, 0).
void DeliverCompletion(const RenderFrameRequest& inRequest,
                       const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
                       std::int32_t inRenderMilliseconds);

// Cancels the request's prefetches and its accelerated render, then client
// OnRenderFrameCancelled (or a RenderFrameCancelledMessage), then the
// completion function with (empty, true, 0). A waiting thread is woken last
// (it finds an empty result).
void DeliverCancellation(const RenderFrameRequest& inRequest);

// Client OnRenderFrameError (or a RenderFrameErrorMessage), then the
// completion function with (empty, false, inStatus).
void DeliverError(const RenderFrameRequest& inRequest, QRT::Result inStatus);

// The common end of a request: a non-negative status stores inFrame in the
// result slot; a waitable object is then signalled and nothing else happens;
// otherwise a non-negative status with a frame is a completion and anything
// else an error with the status.
void Finish(const RenderFrameRequest& inRequest, const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
            QRT::Result inStatus, std::int32_t inRenderMilliseconds);

// Wakes the thread waiting for a request that will not be delivered (a
// request dropped at shutdown); it finds an empty result. Does nothing for a
// request without a waitable object.
void WakeWaiter(const RenderFrameRequest& inRequest);

} // namespace ML
