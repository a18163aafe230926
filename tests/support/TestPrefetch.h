#pragma once

// A prefetch handle whose frame the test hands over (Complete), that
// completes by itself after a number of polls, or whose frame arrives on an
// executor's thread a delay after InitiatePrefetch. Until then it never
// completes. Every call may come from any thread.

#include "ML/IRenderableNodePrefetch.h"
#include "QRT/Allocated.h"
#include "VF/VideoFrame.h"
#include "mvxcore/threads/AsyncThreadedExecutor.h"

#include <atomic>
#include <chrono>
#include <mutex>

#include <boost/shared_ptr.hpp>

namespace vrtest
{

class TestPrefetch : public QRT::Implements<ML::IRenderableNodePrefetch>
{
public:
    using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

    TestPrefetch() = default;
    // The frame arrives on inExecutor's thread inDelay after InitiatePrefetch.
    TestPrefetch(boost::shared_ptr<mvxcore::threads::AsyncThreadedExecutor> inExecutor,
                 std::chrono::milliseconds inDelay)
        : mExecutor(std::move(inExecutor))
        , mDelay(inDelay)
    {
    }

    // When positive, the handle completes by itself after this many polls.
    std::atomic<int> mPollsUntilComplete{0};
    // Whether an incomplete handle asks for more time once the queue's wait is up.
    std::atomic<bool> mWantMoreTime{false};
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
    FrameRef Frame()
    {
        std::lock_guard lock(mMutex);
        return mFrame;
    }

    QRT::Result InitiatePrefetch() override
    {
        ++mInitiateCount;
        if (mExecutor)
        {
            QRT::InterfaceRef<TestPrefetch> self(this);
            mExecutor->Post(
                [self]
                {
                    self->Complete(VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, 4,
                                                        4, mvxmediatypes::kPixelAspectRatio_Square,
                                                        true, false));
                },
                static_cast<int>(mDelay.count()));
        }
        return QRT::kResult_Success;
    }
    QRT::Result GetPrefetchedFrame(FrameRef& outFrame) override
    {
        if (mPollsUntilComplete.load() > 0 && --mPollsUntilComplete == 0)
            mComplete = true;
        if (!mComplete.load())
            return QRT::kResult_NotFound;
        outFrame = Frame();
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
        return !mComplete.load() && mWantMoreTime.load();
    }

private:
    const boost::shared_ptr<mvxcore::threads::AsyncThreadedExecutor> mExecutor;
    const std::chrono::milliseconds mDelay{0};
    std::atomic<bool> mComplete{false};
    // Guards mFrame.
    std::mutex mMutex;
    FrameRef mFrame;
};

} // namespace vrtest
