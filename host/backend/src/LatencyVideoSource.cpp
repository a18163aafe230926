// Slowed-down sources for prefetch tests and benchmarks.
//
// LatencyVideoSource: a synchronous wrapper; a frame its inner source does
// not hold yet costs a sleep before it is read, as a slow decoder would.
//
// AsyncVideoSource: the same, plus the asynchronous-read interface. Started
// reads are queued in start order and run one at a time on the wrapper's
// own worker thread, which the wrapper starts on creation and joins on
// destruction. A read's state lives in a table by frame key (queued,
// running, done, failed) until its frame is taken with
// kFrameRequestFlag_NoBlock or its last start is cancelled; a cancel cuts a
// running read's sleep short and its result is discarded. One mutex guards
// the table and the queue; the worker never holds it while it sleeps or
// reads, and nobody calls the inner source while holding it.

#include "BE/MediaStatus.h"
#include "BE/VideoSources.h"
#include "QRT/Allocated.h"
#include "VF/VideoFrameManipulators.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <condition_variable>
#include <deque>
#include <map>
#include <mutex>
#include <thread>

namespace BE
{

using mvxcore::utility::Guid;
using mvxmediatypes::TickTime;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

namespace
{

// The longest a single wait blocks, so that pollers stay responsive.
constexpr std::chrono::milliseconds kWaitSlice{50};

// Forwards every query and read to the wrapped source, and answers
// IMediaInfo and IMedia for the wrapper (their source is the wrapper itself).
template <class... Extra>
class ForwardingVideoSource
    : public QRT::Implements<Deprecated::IVideoSource, Deprecated::IMediaInfo, Deprecated::IMedia,
                             Extra...>
{
public:
    mvxmediatypes::FrameRate GetFrameRate() const noexcept override
    {
        return mInner->GetFrameRate();
    }
    bool IsStill() const noexcept override { return mInner->IsStill(); }
    bool IsImage() const noexcept override { return mInner->IsImage(); }
    mvxmediatypes::FieldType GetFieldType() const noexcept override
    {
        return mInner->GetFieldType();
    }
    QRT::ParamRect GetBounds() const noexcept override { return mInner->GetBounds(); }
    mvxmediatypes::PixelAspectRatio GetPixelAspectRatio() const noexcept override
    {
        return mInner->GetPixelAspectRatio();
    }
    mvxmediatypes::AlphaChannel GetAlphaChannel() const noexcept override
    {
        return mInner->GetAlphaChannel();
    }
    QRT::ParamColor GetMatteColor() const noexcept override { return mInner->GetMatteColor(); }
    ColorProfile GetColorProfile() const override { return mInner->GetColorProfile(); }
    std::vector<mvxmediatypes::PixelFormat> GetPixelFormats() const override
    {
        return mInner->GetPixelFormats();
    }
    void PrefetchVideoFrame(TickTime inTime, const VideoFrameRequest& inRequest,
                            const MF::BinaryData& inBinaryData) override
    {
        mInner->PrefetchVideoFrame(inTime, inRequest, inBinaryData);
    }
    QRT::Result DrawVideoFrame(TickTime inTime, const MF::BinaryData& inBinaryData,
                               TickTime /*inFrameGridOrigin*/, TickTime /*inSecondTime*/,
                               const FrameRef& ioDestination,
                               mvxmediatypes::RenderQuality inQuality,
                               mvxmediatypes::FieldType inFieldType, bool inProgressive,
                               bool /*inIgnoreAlpha*/, bool /*inInvertAlpha*/, bool /*inThirdFlag*/,
                               double /*inValue*/) override
    {
        // Read through this wrapper, so that drawing pays the latency too.
        MVX_INPUT_CONTRACT(ioDestination);
        MVX_INPUT_CONTRACT(!ioDestination->IsShared());
        const QRT::ParamRect bounds = ioDestination->GetBounds();
        VideoFrameRequest request;
        request.mWidth = static_cast<std::uint32_t>(bounds.Width());
        request.mHeight = static_cast<std::uint32_t>(bounds.Height());
        request.mPixelAspectRatio = ioDestination->GetPixelAspectRatio();
        request.mPixelFormat = ioDestination->GetPixelFormat();
        request.mFieldType = inProgressive ? mvxmediatypes::kFieldType_Progressive : inFieldType;
        request.mQuality = inQuality;
        FrameRef frame;
        const QRT::Result status =
            this->GetVideoFrame(inTime, request, inBinaryData, mInner->GetColorProfile(),
                                Deprecated::kFrameRequestFlag_Read, frame);
        if (QRT::Failed(status))
            return status;
        return VF::VideoFrameManipulators::CopyFrame(frame, ioDestination, inQuality);
    }
    bool IsPrefetchWanted(TickTime inTime) const override
    {
        return mInner->IsPrefetchWanted(inTime);
    }
    Guid GetFrameKey(TickTime inTime, const VideoFrameRequest& inRequest,
                     const MF::BinaryData& inBinaryData,
                     const ColorProfile& inColorProfile) const override
    {
        return mInner->GetFrameKey(inTime, inRequest, inBinaryData, inColorProfile);
    }
    Deprecated::PrefetchHold GetPrefetchHold() override { return mInner->GetPrefetchHold(); }

    // IMediaInfo.
    std::int32_t GetKind() const noexcept override
    {
        return mInnerInfo ? mInnerInfo->GetKind() : Deprecated::kMediaInfoKind_Clip;
    }
    std::u16string GetName() const override
    {
        return mInnerInfo ? mInnerInfo->GetName() : std::u16string();
    }
    std::uint32_t GetStreamCount(std::int32_t inType) const override
    {
        MVX_INPUT_CONTRACT(inType == Deprecated::kMediaType_Video ||
                           inType == Deprecated::kMediaType_Audio);
        return inType == Deprecated::kMediaType_Video ? 1 : 0;
    }
    QRT::InterfaceRef<Deprecated::IVideoSource> GetVideoSource(std::int32_t inType,
                                                               std::int32_t inIndex) override
    {
        MVX_INPUT_CONTRACT(inType == Deprecated::kMediaType_Video);
        MVX_INPUT_CONTRACT(inIndex == 0);
        return QRT::InterfaceRef<Deprecated::IVideoSource>(this);
    }
    TickTime GetDuration() const noexcept override
    {
        return mInnerInfo ? mInnerInfo->GetDuration() : mvxmediatypes::kTime_Max;
    }
    QRT::InterfaceRef<Deprecated::IMediaInfo> Copy() const override
    {
        if (!mInnerInfo)
            return {};
        const QRT::InterfaceRef<Deprecated::IMediaInfo> innerCopy = mInnerInfo->Copy();
        if (!innerCopy)
            return {};
        return Rewrap(innerCopy->GetVideoSource(Deprecated::kMediaType_Video, 0));
    }

    // IMedia.
    std::string GetMediaPath() const override
    {
        const auto media = QRT::QueryRef<Deprecated::IMedia>(mInner);
        return media ? media->GetMediaPath() : std::string();
    }
    QRT::InterfaceRef<Deprecated::IMediaInfo> GetMediaInfo() override
    {
        return QRT::InterfaceRef<Deprecated::IMediaInfo>(this);
    }

protected:
    explicit ForwardingVideoSource(VideoSourceRef inInner)
        : mInner(std::move(inInner))
        , mInnerInfo(QRT::QueryRef<Deprecated::IMediaInfo>(mInner))
    {
    }
    ~ForwardingVideoSource() = default;

    // The same wrapper over another inner source.
    virtual QRT::InterfaceRef<Deprecated::IMediaInfo>
    Rewrap(const VideoSourceRef& inInner) const = 0;

    const VideoSourceRef mInner;
    const QRT::InterfaceRef<Deprecated::IMediaInfo> mInnerInfo;
};

class LatencyVideoSource : public ForwardingVideoSource<>
{
public:
    LatencyVideoSource(VideoSourceRef inInner, std::chrono::microseconds inLatency)
        : ForwardingVideoSource(std::move(inInner))
        , mLatency(inLatency)
    {
    }

    QRT::Result GetVideoFrame(TickTime inTime, const VideoFrameRequest& inRequest,
                              const MF::BinaryData& inBinaryData,
                              const ColorProfile& inColorProfile, std::int32_t inFlags,
                              FrameRef& outFrame) override
    {
        const QRT::Result held =
            mInner->GetVideoFrame(inTime, inRequest, inBinaryData, inColorProfile,
                                  Deprecated::kFrameRequestFlag_NoBlock, outFrame);
        if (QRT::Succeeded(held) || inFlags == Deprecated::kFrameRequestFlag_NoBlock)
            return held;
        std::this_thread::sleep_for(mLatency);
        return mInner->GetVideoFrame(inTime, inRequest, inBinaryData, inColorProfile,
                                     Deprecated::kFrameRequestFlag_Read, outFrame);
    }

protected:
    QRT::InterfaceRef<Deprecated::IMediaInfo> Rewrap(const VideoSourceRef& inInner) const override
    {
        return CreateLatencyVideoSource(inInner, mLatency);
    }

private:
    const std::chrono::microseconds mLatency;
};

class AsyncVideoSource : public ForwardingVideoSource<Deprecated::IAsyncVideoSource>
{
public:
    AsyncVideoSource(VideoSourceRef inInner, std::chrono::microseconds inLatency,
                     std::chrono::milliseconds inTimeout, bool inAsyncEnabled)
        : ForwardingVideoSource(std::move(inInner))
        , mLatency(inLatency)
        , mTimeout(inTimeout)
        , mAsyncEnabled(inAsyncEnabled)
        , mWorker([this] { RunWorker(); })
    {
    }

    ~AsyncVideoSource()
    {
        {
            std::lock_guard lock(mMutex);
            mStopping = true;
        }
        mChanged.notify_all();
        mWorker.join();
    }

    QRT::Result GetVideoFrame(TickTime inTime, const VideoFrameRequest& inRequest,
                              const MF::BinaryData& inBinaryData,
                              const ColorProfile& inColorProfile, std::int32_t inFlags,
                              FrameRef& outFrame) override
    {
        outFrame.Reset();
        MVX_INPUT_CONTRACT(inFlags == Deprecated::kFrameRequestFlag_Read ||
                           inFlags == Deprecated::kFrameRequestFlag_NoBlock);
        const Guid key = mInner->GetFrameKey(inTime, inRequest, inBinaryData, inColorProfile);
        {
            std::lock_guard lock(mMutex);
            const auto found = mReads.find(key);
            if (found != mReads.end() && found->second.mState == ReadState::kDone)
            {
                // Taking the frame ends the read.
                outFrame = std::move(found->second.mFrame);
                mReads.erase(found);
                return QRT::kResult_Success;
            }
        }
        const QRT::Result held =
            mInner->GetVideoFrame(inTime, inRequest, inBinaryData, inColorProfile,
                                  Deprecated::kFrameRequestFlag_NoBlock, outFrame);
        if (QRT::Succeeded(held) || inFlags == Deprecated::kFrameRequestFlag_NoBlock)
            return held;
        std::this_thread::sleep_for(mLatency);
        return mInner->GetVideoFrame(inTime, inRequest, inBinaryData, inColorProfile,
                                     Deprecated::kFrameRequestFlag_Read, outFrame);
    }

    // IAsyncVideoSource.
    bool IsAsyncEnabled() const noexcept override { return mAsyncEnabled; }

    QRT::Result StartAsyncRead(TickTime inTime, const VideoFrameRequest& inRequest,
                               const MF::BinaryData& inBinaryData,
                               const ColorProfile& inColorProfile) override
    {
        if (!inTime.IsValid())
            return kResult_FrameOutOfRange;
        const Guid key = mInner->GetFrameKey(inTime, inRequest, inBinaryData, inColorProfile);
        // A frame the inner source already holds needs no read.
        FrameRef held;
        const bool isHeld =
            QRT::Succeeded(mInner->GetVideoFrame(inTime, inRequest, inBinaryData, inColorProfile,
                                                 Deprecated::kFrameRequestFlag_NoBlock, held));
        bool wake = false;
        {
            std::lock_guard lock(mMutex);
            auto [entry, inserted] = mReads.try_emplace(key);
            Read& read = entry->second;
            ++read.mStarts;
            if (inserted)
            {
                read.mTime = inTime;
                read.mRequest = inRequest;
                read.mBinaryData = inBinaryData;
                read.mColorProfile = inColorProfile;
                if (isHeld)
                {
                    read.mState = ReadState::kDone;
                    read.mFrame = std::move(held);
                }
                else
                {
                    mQueue.push_back(key);
                    wake = true;
                }
            }
        }
        if (wake)
            mChanged.notify_all();
        return QRT::kResult_Success;
    }

    bool WaitForAsyncRead(TickTime inTime, const VideoFrameRequest& inRequest,
                          const MF::BinaryData& inBinaryData, const ColorProfile& inColorProfile,
                          double inElapsedSeconds) override
    {
        const Guid key = mInner->GetFrameKey(inTime, inRequest, inBinaryData, inColorProfile);
        const auto elapsed = std::chrono::duration_cast<std::chrono::milliseconds>(
            std::chrono::duration<double>(std::max(inElapsedSeconds, 0.0)));
        const auto remaining = mTimeout - elapsed;
        std::unique_lock lock(mMutex);
        auto pending = [&]
        {
            const auto found = mReads.find(key);
            return found != mReads.end() && (found->second.mState == ReadState::kQueued ||
                                             found->second.mState == ReadState::kRunning);
        };
        if (pending() && remaining > std::chrono::milliseconds::zero())
            mChanged.wait_for(lock, std::min(remaining, std::chrono::milliseconds(kWaitSlice)),
                              [&] { return !pending() || mStopping; });
        const auto found = mReads.find(key);
        if (found == mReads.end())
            return false;
        switch (found->second.mState)
        {
        case ReadState::kDone:
            return true;
        case ReadState::kFailed:
            return false;
        default:
            // Still pending: worth waiting while the time-out has not passed.
            return remaining > std::chrono::milliseconds::zero();
        }
    }

    void CancelAsyncRead(TickTime inTime, const VideoFrameRequest& inRequest,
                         const MF::BinaryData& inBinaryData,
                         const ColorProfile& inColorProfile) override
    {
        const Guid key = mInner->GetFrameKey(inTime, inRequest, inBinaryData, inColorProfile);
        FrameRef dropped;
        {
            std::lock_guard lock(mMutex);
            const auto found = mReads.find(key);
            if (found == mReads.end() || --found->second.mStarts > 0)
                return;
            // The frame is released after the lock, so its last release never
            // runs under the table's lock.
            dropped = std::move(found->second.mFrame);
            mReads.erase(found);
        }
        mChanged.notify_all();
    }

protected:
    QRT::InterfaceRef<Deprecated::IMediaInfo> Rewrap(const VideoSourceRef& inInner) const override
    {
        return CreateAsyncVideoSource(inInner, mLatency, mTimeout, mAsyncEnabled);
    }

private:
    enum class ReadState
    {
        kQueued,
        kRunning,
        kDone,
        kFailed,
    };

    struct Read
    {
        TickTime mTime;
        VideoFrameRequest mRequest;
        MF::BinaryData mBinaryData;
        ColorProfile mColorProfile;
        int mStarts = 0;
        ReadState mState = ReadState::kQueued;
        FrameRef mFrame;
        QRT::Result mStatus = QRT::kResult_Success;
    };

    void RunWorker()
    {
        std::unique_lock lock(mMutex);
        while (true)
        {
            mChanged.wait(lock, [&] { return mStopping || !mQueue.empty(); });
            if (mStopping)
                return;
            const Guid key = mQueue.front();
            mQueue.pop_front();
            auto found = mReads.find(key);
            // Cancelled, or already done by an earlier queue entry of the same key.
            if (found == mReads.end() || found->second.mState != ReadState::kQueued)
                continue;
            found->second.mState = ReadState::kRunning;
            const Read arguments = found->second;

            // The decoding delay; a cancel or shutdown ends it early.
            const auto abandoned = [&]
            {
                const auto current = mReads.find(key);
                return mStopping || current == mReads.end() ||
                       current->second.mState != ReadState::kRunning;
            };
            if (mChanged.wait_for(lock, mLatency, abandoned))
                continue;

            lock.unlock();
            FrameRef frame;
            const QRT::Result status = mInner->GetVideoFrame(
                arguments.mTime, arguments.mRequest, arguments.mBinaryData, arguments.mColorProfile,
                Deprecated::kFrameRequestFlag_Read, frame);
            lock.lock();

            found = mReads.find(key);
            if (found == mReads.end() || found->second.mState != ReadState::kRunning)
            {
                // Cancelled while reading: the frame is released outside the lock.
                lock.unlock();
                frame.Reset();
                lock.lock();
                continue;
            }
            found->second.mStatus = status;
            found->second.mState = QRT::Succeeded(status) ? ReadState::kDone : ReadState::kFailed;
            found->second.mFrame = std::move(frame);
            mChanged.notify_all();
        }
    }

    const std::chrono::microseconds mLatency;
    const std::chrono::milliseconds mTimeout;
    const bool mAsyncEnabled;
    // Guards mReads, mQueue and mStopping.
    std::mutex mMutex;
    // Signalled on every change of the table or queue and on shutdown.
    std::condition_variable mChanged;
    std::map<Guid, Read> mReads;
    std::deque<Guid> mQueue;
    bool mStopping = false;
    // Declared last: started once every member above is constructed.
    std::thread mWorker;
};

} // namespace

VideoSourceRef CreateLatencyVideoSource(const VideoSourceRef& inSource,
                                        std::chrono::microseconds inLatency)
{
    MVX_INPUT_CONTRACT(inSource != nullptr);
    return QRT::Allocated<LatencyVideoSource>::Create<Deprecated::IVideoSource>(inSource,
                                                                                inLatency);
}

VideoSourceRef CreateAsyncVideoSource(const VideoSourceRef& inSource,
                                      std::chrono::microseconds inLatency,
                                      std::chrono::milliseconds inTimeout, bool inAsyncEnabled)
{
    MVX_INPUT_CONTRACT(inSource != nullptr);
    return QRT::Allocated<AsyncVideoSource>::Create<Deprecated::IVideoSource>(
        inSource, inLatency, inTimeout, inAsyncEnabled);
}

} // namespace BE
