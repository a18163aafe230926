#pragma once

// A prefetch handle whose frame the test hands over (Complete), or that
// completes by itself after a number of polls. Until then it never
// completes. Every call may come from any thread.

#include "ML/IRenderableNodePrefetch.h"
#include "QRT/Allocated.h"

#include <atomic>
#include <mutex>

namespace vrtest
{

class TestPrefetch : public QRT::Implements<ML::IRenderableNodePrefetch>
{
public:
    using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

    // When positive, the handle completes by itself after this many polls.
    std::atomic<int> mPollsUntilComplete{0};
    // Whether an incomplete handle asks for more time once the queue's wait is up.
    std::atomic<bool> mWantMoreTime{false};
    // Whether the handle finishes (without a frame) while the queue asks it
    // for more time, as a read ending between the queue's two questions does.
    std::atomic<bool> mCompleteWhenAsked{false};
    std::atomic<int> mInitiateCount{0};
    std::atomic<int> mCancelCount{0};
    std::atomic<double> mLastElapsed{-1.0};

    void Complete(FrameRef inFrame)
    {
        {
            std::lock_guard lock(mMutex);
            mFrame = std::move(inFrame);
        }
        mComplete = true;
    }
    bool IsComplete() const { return mComplete.load(); }

    QRT::Result InitiatePrefetch() override
    {
        ++mInitiateCount;
        return QRT::kResult_Success;
    }
    QRT::Result GetPrefetchedFrame(FrameRef& outFrame) override
    {
        if (mPollsUntilComplete.load() > 0 && --mPollsUntilComplete == 0)
            mComplete = true;
        if (!mComplete.load())
            return QRT::kResult_NotFound;
        std::lock_guard lock(mMutex);
        outFrame = mFrame;
        return QRT::kResult_Success;
    }
    QRT::Result CancelPrefetch() override
    {
        ++mCancelCount;
        return QRT::kResult_Success;
    }
    void GetPrefetchKey(QRT::Guid& outKey) const override { outKey = QRT::Guid(); }
    bool ContinueWaitingForPrefetch(double inElapsedSeconds) override
    {
        mLastElapsed.store(inElapsedSeconds);
        if (mCompleteWhenAsked.load())
            mComplete = true;
        return !mComplete.load() && mWantMoreTime.load();
    }

private:
    std::atomic<bool> mComplete{false};
    // Guards mFrame.
    std::mutex mMutex;
    FrameRef mFrame;
};

} // namespace vrtest
