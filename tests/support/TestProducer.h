#pragma once

// A node producer whose hash, frame, latency and failure a test sets, and
// that records what it is asked. Producing may be called from any thread.

#include "ML/IRenderableNodeProducer.h"
#include "ML/RenderRequestException.h"
#include "QRT/Allocated.h"
#include "VF/VideoFrame.h"
#include "Waiting.h"

#include <atomic>
#include <chrono>
#include <functional>
#include <memory>
#include <mutex>
#include <new>
#include <stdexcept>
#include <thread>

namespace vrtest
{

enum class ProducerFailure
{
    kNone,
    kStatus,
    kBadAlloc,
    kRenderRequestException,
    kStdException,
};

class TestProducer : public QRT::Implements<ML::IRenderableNodeProducer>
{
public:
    using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

    QRT::Guid mHash{"{11111111-2222-3333-4444-555555555555}"};
    // The frame made: kPixelFormat_Invalid takes the parameters' format, a
    // width of 0 the parameters' size.
    mvxmediatypes::PixelFormat mFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
    std::uint32_t mWidth = 8;
    std::uint32_t mHeight = 4;
    // Called on every frame made, before it is answered.
    std::function<void(MF::IVideoFrame&)> mPaint;
    std::shared_ptr<Gate> mGate;
    std::chrono::microseconds mLatency{0};
    ProducerFailure mFailure = ProducerFailure::kNone;
    QRT::Result mFailureStatus = static_cast<QRT::Result>(0xA0990001u);
    // Called at the start of ProduceFrame, and with the opposite flag at its
    // end unless it throws.
    std::function<void(bool inStarting)> mObserver;
    std::atomic<int> mProduceCount{0};
    std::atomic<int> mHashCount{0};

    QRT::Result ProduceFrame(const MF::FrameTime&, const ML::CutlistRenderParams& inParams,
                             FrameRef& outFrame) override
    {
        ++mProduceCount;
        {
            std::lock_guard lock(mMutex);
            mLastParams = inParams;
            // The node may be the provider that owns this producer: keeping it
            // would make a cycle.
            mLastParams.mNode.Reset();
        }
        if (mObserver)
            mObserver(true);
        const QRT::Result result = Produce(inParams, outFrame);
        if (mObserver)
            mObserver(false);
        return result;
    }

    void GetFrameHash(QRT::Guid& outHash, const MF::FrameTime& inTime,
                      const ML::CutlistRenderParams&) override
    {
        ++mHashCount;
        {
            std::lock_guard lock(mMutex);
            mLastHashTime = inTime;
        }
        outHash = mHash;
    }

    ML::CutlistRenderParams LastParams()
    {
        std::lock_guard lock(mMutex);
        return mLastParams;
    }

    MF::FrameTime LastHashTime()
    {
        std::lock_guard lock(mMutex);
        return mLastHashTime;
    }

private:
    QRT::Result Produce(const ML::CutlistRenderParams& inParams, FrameRef& outFrame)
    {
        if (mGate)
            mGate->Wait();
        std::this_thread::sleep_for(mLatency);
        switch (mFailure)
        {
        case ProducerFailure::kStatus:
            return mFailureStatus;
        case ProducerFailure::kBadAlloc:
            throw std::bad_alloc();
        case ProducerFailure::kRenderRequestException:
            throw ML::RenderRequestException(mFailureStatus);
        case ProducerFailure::kStdException:
            throw std::runtime_error("producer failed");
        case ProducerFailure::kNone:
            break;
        }
        const bool sized = mWidth != 0;
        outFrame = VF::CreateVideoFrame(
            mFormat == mvxmediatypes::kPixelFormat_Invalid ? inParams.mPixelFormat : mFormat,
            sized ? mWidth : inParams.mWidth, sized ? mHeight : inParams.mHeight,
            inParams.mPixelAspectRatio, true, false);
        if (outFrame && mPaint)
            mPaint(*outFrame);
        return QRT::kResult_Success;
    }

    // Guards mLastParams and mLastHashTime.
    std::mutex mMutex;
    ML::CutlistRenderParams mLastParams;
    MF::FrameTime mLastHashTime;
};

} // namespace vrtest
