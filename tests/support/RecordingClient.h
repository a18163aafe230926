#pragma once

// Recorders of finished renders as each way of hearing of them reports them:
// a render-frame client, a request's completion function and an
// InitiateRender callback. All record from any thread.

#include "ML/IRenderFrameClient.h"
#include "ML/RenderFrameRequest.h"
#include "ML/VideoRenderer.h"
#include "QRT/Allocated.h"
#include "Waiting.h"

#include <mutex>
#include <vector>

namespace vrtest
{

// One delivery as it was reported.
struct Delivery
{
    enum Kind
    {
        kComplete,
        kCancelled,
        kError
    } mKind = kError;
    std::uint32_t mRequestID = 0;
    std::intptr_t mContext = 0;
    QRT::InterfaceRef<MF::IVideoFrame> mFrame;
    int mStatus = 0;
    QRT::InterfaceRef<ML::IRenderableSource> mSource;
};

class DeliveryRecorder
{
public:
    using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

    // A completion function of request inRequestID.
    ML::RenderCompletionFunction For(std::uint32_t inRequestID)
    {
        return [this, inRequestID](FrameRef inFrame, bool inCancelled, int inStatus) {
            Add({KindOf(inFrame, inCancelled), inRequestID, 0, inFrame, inStatus, {}});
        };
    }
    ML::InitiateRenderCallback Callback()
    {
        return [this](FrameRef inFrame, unsigned int inRequestID,
                      QRT::InterfaceRef<ML::IRenderableSource> inSource, bool inCancelled,
                      int inStatus) {
            Add({KindOf(inFrame, inCancelled), inRequestID, 0, inFrame, inStatus, inSource});
        };
    }

    void Add(Delivery inDelivery)
    {
        std::lock_guard lock(mMutex);
        mDeliveries.push_back(std::move(inDelivery));
    }
    std::vector<Delivery> Get()
    {
        std::lock_guard lock(mMutex);
        return mDeliveries;
    }
    // The deliveries of request inRequestID.
    std::vector<Delivery> Of(std::uint32_t inRequestID)
    {
        std::vector<Delivery> found;
        for (const Delivery& delivery : Get())
            if (delivery.mRequestID == inRequestID)
                found.push_back(delivery);
        return found;
    }
    std::size_t Count() { return Get().size(); }
    bool WaitForCount(std::size_t inCount,
                      std::chrono::milliseconds inLimit = std::chrono::seconds(20))
    {
        return WaitUntil([&] { return Count() >= inCount; }, inLimit);
    }

private:
    static Delivery::Kind KindOf(const FrameRef& inFrame, bool inCancelled)
    {
        return inCancelled ? Delivery::kCancelled
               : inFrame   ? Delivery::kComplete
                           : Delivery::kError;
    }

    // Guards mDeliveries.
    std::mutex mMutex;
    std::vector<Delivery> mDeliveries;
};

class TestClient : public QRT::Implements<ML::IRenderFrameClient, QRT::IWeakReferenceCapable>
{
public:
    DeliveryRecorder mRecorder;

    void OnRenderFrameComplete(std::intptr_t inContext, std::uint32_t inRequestID,
                               mvxmediatypes::TickTime, QRT::InterfaceRef<MF::IVideoFrame> inFrame,
                               std::int32_t) override
    {
        mRecorder.Add({Delivery::kComplete, inRequestID, inContext, inFrame, 0, {}});
    }
    void OnRenderFrameCancelled(std::intptr_t inContext, std::uint32_t inRequestID,
                                mvxmediatypes::TickTime) override
    {
        mRecorder.Add({Delivery::kCancelled, inRequestID, inContext, {}, 0, {}});
    }
    void OnRenderFrameError(std::intptr_t inContext, std::uint32_t inRequestID,
                            mvxmediatypes::TickTime, QRT::Result inStatus) override
    {
        mRecorder.Add({Delivery::kError, inRequestID, inContext, {}, inStatus, {}});
    }
};

} // namespace vrtest
