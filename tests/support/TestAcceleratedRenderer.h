#pragma once

// An accelerated sequence renderer that takes (or refuses, with mAnswer)
// every render and records it, so that the test answers through mClient.

#include "ML/IAcceleratedSequenceRenderer.h"
#include "QRT/Allocated.h"

#include <mutex>
#include <vector>

namespace vrtest
{

class TestAcceleratedRenderer : public QRT::Implements<ML::IAcceleratedSequenceRenderer>
{
public:
    QRT::Result mAnswer = QRT::kResult_Success;
    // Guards the records below.
    std::mutex mMutex;
    std::vector<std::uint32_t> mInitiated;
    std::vector<std::uint32_t> mCancelled;
    QRT::InterfaceRef<ML::IRenderFrameClient> mClient;
    bool mLastRenderBothFields = false;

    const ML::AcceleratedRendererSegmentTable& GetSegments() const override { return mSegments; }
    QRT::Result InitiateRender(mvxmediatypes::TickTime, std::uint32_t, std::uint32_t,
                               mvxmediatypes::PixelAspectRatio,
                               const std::vector<mvxmediatypes::PixelFormat>&, std::uint32_t, bool,
                               bool, bool inRenderBothFields,
                               QRT::InterfaceRef<ML::IRenderFrameClient> inClient, std::int64_t,
                               std::uint32_t inRequestID) override
    {
        std::lock_guard lock(mMutex);
        mInitiated.push_back(inRequestID);
        mClient = inClient;
        mLastRenderBothFields = inRenderBothFields;
        return mAnswer;
    }
    QRT::Result CancelRender(std::uint32_t inRequestID) override
    {
        std::lock_guard lock(mMutex);
        mCancelled.push_back(inRequestID);
        return QRT::kResult_Success;
    }

private:
    ML::AcceleratedRendererSegmentTable mSegments;
};

} // namespace vrtest
