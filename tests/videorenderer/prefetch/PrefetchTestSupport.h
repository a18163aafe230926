#pragma once

// Test doubles and fixtures shared by the prefetcher tests: a video source
// whose reads the test controls exactly (status, key, blocking, what it holds),
// its asynchronous variant, a gate that holds an executor thread, and a
// fixture that installs private prefetch executors for the length of a test
// and restores the host's afterwards.

#include "BE/IVideoSource.h"
#include "ML/RenderExecutors.h"
#include "QRT/Allocated.h"
#include "QRT/QRTUnknown.h"
#include "VF/SharedVideoFrameCache.h"
#include "VF/VideoFrame.h"
#include "mvxcore/debug/Contract.h"
#include "mvxcore/threads/ExecutorFactories.h"
#include "prefetch/MediaNodePrefetcher.h"
#include "prefetch/VideoSourcePrefetcher.h"

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include <boost/shared_ptr.hpp>
#include <gtest/gtest.h>

namespace prefetch_test
{

using mvxcore::utility::Guid;
using mvxmediatypes::TickTime;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;
using SourceRef = QRT::InterfaceRef<BE::Deprecated::IVideoSource>;

// A distinct frame key per call, so that tests never meet each other's frames
// in the process-wide cache.
inline Guid MakeKey(uint32_t inSalt = 0)
{
    static std::atomic<uint32_t> sNext{1};
    Guid key;
    key.Data1 = 0x7e57c0de;
    key.Data2 = static_cast<uint16_t>(inSalt);
    key.Data3 = 0x1234;
    const uint32_t serial = sNext.fetch_add(1);
    key.Data4[4] = static_cast<uint8_t>(serial >> 24);
    key.Data4[5] = static_cast<uint8_t>(serial >> 16);
    key.Data4[6] = static_cast<uint8_t>(serial >> 8);
    key.Data4[7] = static_cast<uint8_t>(serial);
    return key;
}

inline FrameRef MakeFrame(uint32_t inWidth = 4)
{
    return VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, inWidth, 2,
                                mvxmediatypes::kPixelAspectRatio_Square, true, false);
}

// A one-shot latch: Wait blocks until Open.
class Gate
{
public:
    void Open()
    {
        {
            std::lock_guard lock(mMutex);
            mOpen = true;
        }
        mChanged.notify_all();
    }
    void Wait()
    {
        std::unique_lock lock(mMutex);
        mChanged.wait(lock, [this] { return mOpen; });
    }

private:
    std::mutex mMutex;
    std::condition_variable mChanged;
    bool mOpen = false;
};

// Blocks until every task posted to inExecutor before this call has run (the
// executor must run its tasks in post order on one thread).
inline void Drain(const boost::shared_ptr<mvxcore::threads::AsyncThreadedExecutor>& inExecutor)
{
    auto done = std::make_shared<Gate>();
    ASSERT_TRUE(inExecutor->Post([done] { done->Open(); }));
    done->Wait();
}

// A video source whose behaviour the test sets: the status of reads, the key
// per time (null keys included), whether reads wait for a gate, whether it is
// an image, whether it wants prefetching, and whether it holds what it read
// (answering kFrameRequestFlag_NoBlock with it). It records the times it read.
class TestVideoSource : public QRT::Implements<BE::Deprecated::IVideoSource>
{
public:
    // Settings: written by the test before use.
    bool mImage = false;
    bool mPrefetchWanted = true;
    bool mNullKeys = false;
    bool mHoldsReadFrames = true;
    std::atomic<QRT::Result> mReadStatus{QRT::kResult_Success};
    std::shared_ptr<Gate> mReadGate;
    Guid mKeySalt = MakeKey();

    // Observations.
    std::vector<int64_t> ReadTicks() const
    {
        std::lock_guard lock(mMutex);
        return mReadTicks;
    }
    int HoldCount() const { return mHolds.load(); }
    std::vector<bool> ReadOnImageExecutor() const
    {
        std::lock_guard lock(mMutex);
        return mOnImageExecutor;
    }

    Guid KeyFor(TickTime inTime) const
    {
        if (mNullKeys)
            return Guid();
        Guid key = mKeySalt;
        key.Data3 = static_cast<uint16_t>(inTime.GetTicks());
        return key;
    }

    mvxmediatypes::FrameRate GetFrameRate() const noexcept override
    {
        return mvxmediatypes::kFrameRate_Video1000;
    }
    bool IsStill() const noexcept override { return false; }
    bool IsImage() const noexcept override { return mImage; }
    mvxmediatypes::FieldType GetFieldType() const noexcept override
    {
        return mvxmediatypes::kFieldType_Progressive;
    }
    QRT::ParamRect GetBounds() const noexcept override { return QRT::ParamRect{0, 0, 4, 2}; }
    mvxmediatypes::PixelAspectRatio GetPixelAspectRatio() const noexcept override
    {
        return mvxmediatypes::kPixelAspectRatio_Square;
    }
    mvxmediatypes::AlphaChannel GetAlphaChannel() const noexcept override { return {}; }
    QRT::ParamColor GetMatteColor() const noexcept override { return {}; }
    BE::ColorProfile GetColorProfile() const override { return {}; }
    std::vector<mvxmediatypes::PixelFormat> GetPixelFormats() const override
    {
        return {mvxmediatypes::kPixelFormat_BGRA_4444_8u};
    }

    QRT::Result GetVideoFrame(TickTime inTime, const BE::VideoFrameRequest&, const MF::BinaryData&,
                              const BE::ColorProfile&, std::int32_t inFlags,
                              FrameRef& outFrame) override
    {
        outFrame.Reset();
        if (inFlags == BE::Deprecated::kFrameRequestFlag_NoBlock)
        {
            std::lock_guard lock(mMutex);
            const auto found = mHeld.find(inTime.GetTicks());
            if (found == mHeld.end())
                return static_cast<QRT::Result>(0xA0100005u);
            outFrame = found->second;
            return QRT::kResult_Success;
        }
        const ML::ExecutorRef imageQueue = boost::atomic_load(&ML::sImageSourcePrefetcherQueue);
        const bool onImage = imageQueue && imageQueue->IsCurrentThread();
        if (mReadGate)
            mReadGate->Wait();
        const QRT::Result status = mReadStatus.load();
        FrameRef frame = QRT::Succeeded(status) ? MakeFrame() : FrameRef();
        {
            std::lock_guard lock(mMutex);
            mReadTicks.push_back(inTime.GetTicks());
            mOnImageExecutor.push_back(onImage);
            if (frame && mHoldsReadFrames)
                mHeld[inTime.GetTicks()] = frame;
        }
        outFrame = frame;
        return status;
    }
    void PrefetchVideoFrame(TickTime, const BE::VideoFrameRequest&, const MF::BinaryData&) override
    {
    }
    QRT::Result DrawVideoFrame(TickTime, const MF::BinaryData&, TickTime, TickTime, const FrameRef&,
                               mvxmediatypes::RenderQuality, mvxmediatypes::FieldType, bool, bool,
                               bool, bool, double) override
    {
        return QRT::kResult_NotFound;
    }
    bool IsPrefetchWanted(TickTime) const override { return mPrefetchWanted; }
    Guid GetFrameKey(TickTime inTime, const BE::VideoFrameRequest&, const MF::BinaryData&,
                     const BE::ColorProfile&) const override
    {
        return KeyFor(inTime);
    }
    BE::Deprecated::PrefetchHold GetPrefetchHold() override
    {
        mHolds.fetch_add(1);
        return std::make_shared<int>(0);
    }

private:
    mutable std::mutex mMutex;
    std::vector<int64_t> mReadTicks;
    std::vector<bool> mOnImageExecutor;
    std::map<int64_t, FrameRef> mHeld;
    std::atomic<int> mHolds{0};
};

// The asynchronous variant: counts starts, waits and cancels, and answers
// waits and starts as the test says. A wait answers true once the test has
// completed the read (the frame is then held for kFrameRequestFlag_NoBlock).
class TestAsyncVideoSource
    : public QRT::Implements<BE::Deprecated::IVideoSource, BE::Deprecated::IAsyncVideoSource>
{
public:
    TestVideoSource& Inner() { return *mInner; }

    std::atomic<bool> mEnabled{true};
    std::atomic<QRT::Result> mStartStatus{QRT::kResult_Success};
    // What a wait on a read that is not completed answers.
    std::atomic<bool> mWaitAnswer{true};
    std::atomic<int> mStarts{0};
    std::atomic<int> mWaits{0};
    std::atomic<int> mCancels{0};

    // Completes the started read: the frame becomes held.
    void CompleteRead(TickTime inTime)
    {
        FrameRef frame;
        mInner->GetVideoFrame(inTime, {}, {}, {}, BE::Deprecated::kFrameRequestFlag_Read, frame);
        mCompleted.store(true);
    }

    mvxmediatypes::FrameRate GetFrameRate() const noexcept override
    {
        return mInner->GetFrameRate();
    }
    bool IsStill() const noexcept override { return false; }
    bool IsImage() const noexcept override { return false; }
    mvxmediatypes::FieldType GetFieldType() const noexcept override
    {
        return mInner->GetFieldType();
    }
    QRT::ParamRect GetBounds() const noexcept override { return mInner->GetBounds(); }
    mvxmediatypes::PixelAspectRatio GetPixelAspectRatio() const noexcept override
    {
        return mInner->GetPixelAspectRatio();
    }
    mvxmediatypes::AlphaChannel GetAlphaChannel() const noexcept override { return {}; }
    QRT::ParamColor GetMatteColor() const noexcept override { return {}; }
    BE::ColorProfile GetColorProfile() const override { return {}; }
    std::vector<mvxmediatypes::PixelFormat> GetPixelFormats() const override
    {
        return mInner->GetPixelFormats();
    }
    QRT::Result GetVideoFrame(TickTime inTime, const BE::VideoFrameRequest& inRequest,
                              const MF::BinaryData& inBinaryData,
                              const BE::ColorProfile& inColorProfile, std::int32_t inFlags,
                              FrameRef& outFrame) override
    {
        return mInner->GetVideoFrame(inTime, inRequest, inBinaryData, inColorProfile, inFlags,
                                     outFrame);
    }
    void PrefetchVideoFrame(TickTime, const BE::VideoFrameRequest&, const MF::BinaryData&) override
    {
    }
    QRT::Result DrawVideoFrame(TickTime, const MF::BinaryData&, TickTime, TickTime, const FrameRef&,
                               mvxmediatypes::RenderQuality, mvxmediatypes::FieldType, bool, bool,
                               bool, bool, double) override
    {
        return QRT::kResult_NotFound;
    }
    bool IsPrefetchWanted(TickTime) const override { return false; }
    Guid GetFrameKey(TickTime inTime, const BE::VideoFrameRequest& inRequest,
                     const MF::BinaryData& inBinaryData,
                     const BE::ColorProfile& inColorProfile) const override
    {
        return mInner->GetFrameKey(inTime, inRequest, inBinaryData, inColorProfile);
    }
    BE::Deprecated::PrefetchHold GetPrefetchHold() override { return mInner->GetPrefetchHold(); }

    bool IsAsyncEnabled() const noexcept override { return mEnabled.load(); }
    QRT::Result StartAsyncRead(TickTime, const BE::VideoFrameRequest&, const MF::BinaryData&,
                               const BE::ColorProfile&) override
    {
        mStarts.fetch_add(1);
        return mStartStatus.load();
    }
    bool WaitForAsyncRead(TickTime, const BE::VideoFrameRequest&, const MF::BinaryData&,
                          const BE::ColorProfile&, double) override
    {
        mWaits.fetch_add(1);
        return mCompleted.load() || mWaitAnswer.load();
    }
    void CancelAsyncRead(TickTime, const BE::VideoFrameRequest&, const MF::BinaryData&,
                         const BE::ColorProfile&) override
    {
        mCancels.fetch_add(1);
    }

private:
    QRT::InterfaceRef<TestVideoSource> mInner = QRT::Allocated<TestVideoSource>::CreateInstance();
    std::atomic<bool> mCompleted{false};
};

// Installs private prefetch executors (one thread each, so that tasks run one
// by one in post order) for the length of a test, and restores the host's
// executors afterwards. Also records the debug assertions raised meanwhile.
class PrefetchExecutorFixture : public ::testing::Test
{
protected:
    void SetUp() override
    {
        mSavedVideo = boost::atomic_load(&ML::sVideoSourcePrefetcherQueue);
        mSavedImage = boost::atomic_load(&ML::sImageSourcePrefetcherQueue);
        mVideo = mvxcore::threads::CreateThreadPoolExecutor(1);
        mImage = mvxcore::threads::CreateThreadPoolExecutor(1);
        boost::atomic_store(&ML::sVideoSourcePrefetcherQueue, mVideo);
        boost::atomic_store(&ML::sImageSourcePrefetcherQueue, mImage);
        mSavedAssertHook = mvxcore::debug::SetAssertHook(
            [this](const mvxcore::debug::AssertFailure& inFailure)
            {
                std::lock_guard lock(mAssertMutex);
                mAsserts.push_back(std::string(inFailure.condition) + "|" +
                                   std::string(inFailure.message));
            });
    }

    void TearDown() override
    {
        // What a test left queued or registered goes, as at module shutdown.
        ML::FlushMediaNodePrefetchRegistry();
        ML::FlushVideoSourcePrefetcher();
        for (const ML::ExecutorRef& executor : {mVideo, mImage})
        {
            executor->BeginShutdown();
            executor->DiscardPendingTasks();
            executor->WaitForRunningTasks();
        }
        boost::atomic_store(&ML::sVideoSourcePrefetcherQueue, mSavedVideo);
        boost::atomic_store(&ML::sImageSourcePrefetcherQueue, mSavedImage);
        mvxcore::debug::SetAssertHook(mSavedAssertHook);
    }

    std::vector<std::string> Asserts()
    {
        std::lock_guard lock(mAssertMutex);
        return mAsserts;
    }

    ML::ExecutorRef mVideo;
    ML::ExecutorRef mImage;

private:
    ML::ExecutorRef mSavedVideo;
    ML::ExecutorRef mSavedImage;
    mvxcore::debug::AssertHook mSavedAssertHook;
    std::mutex mAssertMutex;
    std::vector<std::string> mAsserts;
};

} // namespace prefetch_test
