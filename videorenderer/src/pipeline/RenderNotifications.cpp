#include "pipeline/RenderNotifications.h"

#include "ML/RenderFrameMessages.h"
#include "QRT/StationUtils.h"

namespace ML
{

void DeliverCompletion(const RenderFrameRequest& inRequest,
                       const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
                       std::int32_t inRenderMilliseconds)
{
    if (const auto client = inRequest.mClient.Lock())
    {
        client->OnRenderFrameComplete(inRequest.mContext, inRequest.mRequestID, inRequest.mTime,
                                      inFrame, inRenderMilliseconds);
    }
    else if (!inRequest.mStationName.empty())
    {
        const RenderFrameCompletionMessage message(
            RenderFrameCompletionMessageData{inRequest.mContext, inRequest.mRequestID,
                                             inRequest.mTime, inFrame, inRenderMilliseconds});
        QRT::StationUtils::PostMessageToUIThread(inRequest.mStationName, message, false);
    }
    if (!inRequest.mCompletion.empty())
        inRequest.mCompletion(inFrame, false, 0);
}

void DeliverCancellation(const RenderFrameRequest& inRequest)
{
    inRequest.CancelPrefetches();
    if (inRequest.mAcceleratedRenderer && inRequest.mRequestID != 0)
        inRequest.mAcceleratedRenderer->CancelRender(inRequest.mRequestID);
    if (const auto client = inRequest.mClient.Lock())
    {
        client->OnRenderFrameCancelled(inRequest.mContext, inRequest.mRequestID, inRequest.mTime);
    }
    else if (!inRequest.mStationName.empty())
    {
        const RenderFrameCancelledMessage message(RenderFrameCancelledMessageData{
            inRequest.mContext, inRequest.mRequestID, inRequest.mTime});
        QRT::StationUtils::PostMessageToUIThread(inRequest.mStationName, message, false);
    }
    // The waiter is woken even if the completion function throws.
    struct WakeOnExit
    {
        const RenderFrameRequest& mRequest;
        ~WakeOnExit() { WakeWaiter(mRequest); }
    } wake{inRequest};
    if (!inRequest.mCompletion.empty())
        inRequest.mCompletion(QRT::InterfaceRef<MF::IVideoFrame>(), true, 0);
}

void DeliverError(const RenderFrameRequest& inRequest, QRT::Result inStatus)
{
    if (const auto client = inRequest.mClient.Lock())
    {
        client->OnRenderFrameError(inRequest.mContext, inRequest.mRequestID, inRequest.mTime,
                                   inStatus);
    }
    else if (!inRequest.mStationName.empty())
    {
        const RenderFrameErrorMessage message(RenderFrameErrorMessageData{
            inRequest.mContext, inRequest.mRequestID, inRequest.mTime, inStatus});
        QRT::StationUtils::PostMessageToUIThread(inRequest.mStationName, message, false);
    }
    if (!inRequest.mCompletion.empty())
        inRequest.mCompletion(QRT::InterfaceRef<MF::IVideoFrame>(), false, inStatus);
}

void Finish(const RenderFrameRequest& inRequest, const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
            QRT::Result inStatus, std::int32_t inRenderMilliseconds)
{
    if (QRT::Succeeded(inStatus))
        inRequest.StoreResult(inFrame);
    if (inRequest.mWaitable)
    {
        inRequest.mWaitable->Signal();
        return;
    }
    if (QRT::Succeeded(inStatus) && inFrame)
        DeliverCompletion(inRequest, inFrame, inRenderMilliseconds);
    else
        DeliverError(inRequest, inStatus);
}

void WakeWaiter(const RenderFrameRequest& inRequest)
{
    if (inRequest.mWaitable)
        inRequest.mWaitable->Signal();
}

} // namespace ML
