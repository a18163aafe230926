// Requests that carry an accelerated renderer: offered to it first, kept in
// the accelerated map while it works, and finished by its answer.

#include "ML/IAcceleratedSequenceRenderer.h"
#include "ML/RenderStatus.h"
#include "pipeline/RenderFrameQueueImpl.h"
#include "pipeline/RenderNotifications.h"

#include <optional>
#include <utility>

namespace ML::RenderQueueInternals
{

void RenderFrameQueueImpl::OnRenderFrameComplete(std::intptr_t /*inContext*/,
                                                 std::uint32_t inRequestID,
                                                 mvxmediatypes::TickTime /*inTime*/,
                                                 QRT::InterfaceRef<MF::IVideoFrame> inFrame,
                                                 std::int32_t inRenderMilliseconds)
{
    OnAcceleratedRenderCompletion(inRequestID, std::move(inFrame), QRT::kResult_Success,
                                  inRenderMilliseconds);
}

void RenderFrameQueueImpl::OnRenderFrameCancelled(std::intptr_t, std::uint32_t,
                                                  mvxmediatypes::TickTime)
{
}

void RenderFrameQueueImpl::OnRenderFrameError(std::intptr_t /*inContext*/,
                                              std::uint32_t inRequestID,
                                              mvxmediatypes::TickTime /*inTime*/,
                                              QRT::Result inStatus)
{
    OnAcceleratedRenderCompletion(inRequestID, {}, inStatus, 0);
}

bool RenderFrameQueueImpl::OfferToAcceleratedRenderer(QueueEntry& ioEntry)
{
    const OrderKey key = KeyOf(ioEntry);
    {
        QRT::CriticalSectionLock lock(mAcceleratedLock, "RenderFrameQueue::AddRenderRequest1");
        mAccelerated.emplace(key, ioEntry);
    }
    const RenderFrameRequest& request = ioEntry.mRequest;
    QRT::Result status = kResult_RenderFailed;
    try
    {
        status = request.mAcceleratedRenderer->InitiateRender(
            request.mTime, static_cast<std::uint32_t>(request.GetOutputWidth()),
            static_cast<std::uint32_t>(request.GetOutputHeight()), request.mOutputPixelAspectRatio,
            request.mRequestedFormats, request.mQuality, request.mPrefetchOnly,
            request.mCompositeOnBlack, !request.mRenderSingleField,
            QRT::InterfaceRef<IRenderFrameClient>(this), 0, request.mRequestID);
    }
    catch (...)
    {
        status = StatusOfCurrentException();
    }
    if (QRT::Succeeded(status))
        return false;

    ioEntry.mRequest.mAcceleratedRenderer.Reset();
    QRT::CriticalSectionLock lock(mAcceleratedLock, "RenderFrameQueue::AddRenderRequest2");
    // An entry that is gone was answered or cancelled while the renderer
    // was being asked: it has had its one delivery.
    return mAccelerated.erase(key) != 0;
}

void RenderFrameQueueImpl::OnAcceleratedRenderCompletion(RenderRequestID inRequestID,
                                                         QRT::InterfaceRef<MF::IVideoFrame> inFrame,
                                                         QRT::Result inStatus,
                                                         std::int32_t inRenderMilliseconds)
{
    std::optional<QueueEntry> found;
    {
        QRT::CriticalSectionLock lock(mAcceleratedLock,
                                      "RenderFrameQueue::OnAcceleratedRenderCompletion");
        found = TakeByID(mAccelerated, inRequestID);
    }
    if (found)
        Finish(found->mRequest, inFrame, inStatus, inRenderMilliseconds);
}

} // namespace ML::RenderQueueInternals
