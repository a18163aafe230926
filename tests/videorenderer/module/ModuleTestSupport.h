#pragma once

// Test doubles of the library frame's tests: a renderable source that fills
// frames with one colour, a prefetch handle that completes on a real executor
// thread after a delay (or never), and a recorder of InitiateRender
// callbacks.

#include "ML/IRenderableNodePrefetch.h"
#include "ML/IRenderableSource.h"
#include "ML/VideoRenderer.h"
#include "QRT/Allocated.h"
#include "mvxcore/threads/AsyncThreadedExecutor.h"

#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <mutex>
#include <vector>

#include <boost/shared_ptr.hpp>

namespace modtest
{

using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;
using SourceRef = QRT::InterfaceRef<ML::IRenderableSource>;

// Waits, bounded so that a fault shows as a failure instead of a hang, until
// inCondition holds.
bool WaitUntil(const std::function<bool()>& inCondition,
               std::chrono::milliseconds inLimit = std::chrono::seconds(20));

// A prefetch handle whose frame arrives on inExecutor's thread inDelay after
// InitiatePrefetch (never when inDelay is negative).
class DelayedPrefetch : public QRT::Implements<ML::IRenderableNodePrefetch>
{
public:
    DelayedPrefetch(boost::shared_ptr<mvxcore::threads::AsyncThreadedExecutor> inExecutor,
                    std::chrono::milliseconds inDelay);

    QRT::Result InitiatePrefetch() override;
    QRT::Result GetPrefetchedFrame(FrameRef& outFrame) override;
    QRT::Result CancelPrefetch() override;
    void GetPrefetchKey(QRT::Guid& outKey) const override;
    bool ContinueWaitingForPrefetch(double inElapsedSeconds) override;

    bool IsComplete() const { return mComplete.load(); }

    std::atomic<int> mInitiateCount{0};
    std::atomic<int> mCancelCount{0};
    // Raised by the executor task right after the frame is in place.
    std::atomic<bool> mArrived{false};

private:
    void Arrive();

    boost::shared_ptr<mvxcore::threads::AsyncThreadedExecutor> mExecutor;
    std::chrono::milliseconds mDelay;
    // Guards mFrame.
    std::mutex mMutex;
    FrameRef mFrame;
    std::atomic<bool> mComplete{false};
};

enum class SourceFailure
{
    kNone,
    kRenderRequestException,
    kStdException,
};

// A source whose frames are inWidth x inHeight BGRA_4444_8u of one colour (the
// size the parameters ask for), with an optional prefetch handle.
class ColorSource : public QRT::Implements<ML::IRenderableSource>
{
public:
    // Bytes in memory order: blue, green, red, alpha.
    std::uint8_t mColor[4] = {0x20, 0x40, 0x80, 0xFF};
    QRT::InterfaceRef<ML::IRenderableNodePrefetch> mPrefetch;
    SourceFailure mFailure = SourceFailure::kNone;
    QRT::Result mFailureStatus = static_cast<QRT::Result>(0xA0990002u);

    std::atomic<int> mCollectCount{0};
    std::atomic<int> mRenderCount{0};
    // Written by the render or collection call, read after the callback.
    MF::FrameTime mCollectTime;
    MF::FrameTime mRenderTime;
    std::uint32_t mRenderWidth = 0;
    bool mPrefetchArrivedBeforeRender = false;

    void ConformFrameTime(const MF::FrameTime& inRequested, const ML::CutlistRenderParams&,
                          MF::FrameTime& outConformed) override;
    void CollectPrefetches(const MF::FrameTime& inTime, const ML::CutlistRenderParams& inParams,
                           ML::RenderableNodePrefetchList& ioPrefetches) override;
    void RenderFrame(const MF::FrameTime& inTime, const ML::CutlistRenderParams& inParams,
                     FrameRef& outFrame) override;
    void GetFrameRate(mvxmediatypes::FrameRate& outRate) override;
    void GetFieldRate(mvxmediatypes::FrameRate& outRate) override;
};

// True when every pixel of inFrame (BGRA_4444_8u) has the bytes inColor.
bool IsFilledWith(const FrameRef& inFrame, const std::uint8_t (&inColor)[4]);

// One InitiateRender callback as it arrived.
struct CallbackCall
{
    FrameRef mFrame;
    unsigned int mRequestID = 0;
    SourceRef mSource;
    bool mCancelled = false;
    int mStatus = 0;
};

// Records InitiateRender callbacks from any thread.
class CallbackRecorder
{
public:
    ML::InitiateRenderCallback Callback();
    std::vector<CallbackCall> Get();
    std::size_t Count();
    bool WaitForCount(std::size_t inCount);
    // The calls with identifier inRequestID.
    std::vector<CallbackCall> For(unsigned int inRequestID);

private:
    // Guards mCalls.
    std::mutex mMutex;
    std::vector<CallbackCall> mCalls;
};

// Render parameters for an inWidth x inHeight BGRA frame at inTime.
ML::CutlistRenderParams MakeParams(const MF::FrameTime& inTime, std::uint32_t inWidth,
                                   std::uint32_t inHeight);

} // namespace modtest
