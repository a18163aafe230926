#pragma once

// Test doubles of the render pipeline: producers whose frames, hashes,
// latencies and failures a test sets; prefetch handles a test completes;
// clients, accelerated renderers, cutlists, nodes and providers that record
// what they are asked; and a recorder of completion-function calls.

#include "MF/RenderableCutlist.h"
#include "MF/RenderableCutlistProvider.h"
#include "ML/IAcceleratedSequenceRenderer.h"
#include "ML/IRenderFrameClient.h"
#include "ML/IRenderableNodePrefetch.h"
#include "ML/IRenderableNodePrefetchProvider.h"
#include "ML/IRenderableNodeProducer.h"
#include "ML/IRenderableNodeProducerProvider.h"
#include "ML/RenderFrameRequest.h"
#include "ML/RenderRequestException.h"
#include "QRT/Allocated.h"
#include "VF/VideoFrame.h"

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <new>
#include <set>
#include <stdexcept>
#include <thread>
#include <vector>

namespace pltest
{

using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

// Waits (bounded, so a fault shows as a failure instead of a hang) until
// inCondition holds.
inline bool WaitUntil(const std::function<bool()>& inCondition,
                      std::chrono::milliseconds inLimit = std::chrono::seconds(20))
{
    const auto end = std::chrono::steady_clock::now() + inLimit;
    while (!inCondition())
    {
        if (std::chrono::steady_clock::now() > end)
            return false;
        std::this_thread::sleep_for(std::chrono::microseconds(200));
    }
    return true;
}

// A gate that producers wait at until the test opens it.
class Gate
{
public:
    void Open()
    {
        std::lock_guard<std::mutex> lock(mMutex);
        mOpen = true;
        mCondition.notify_all();
    }
    void Wait()
    {
        std::unique_lock<std::mutex> lock(mMutex);
        mCondition.wait(lock, [this] { return mOpen; });
    }

private:
    std::mutex mMutex;
    std::condition_variable mCondition;
    bool mOpen = false;
};

enum class ProducerFailure
{
    kNone,
    kStatus,
    kBadAlloc,
    kRenderRequestException,
    kStdException,
};

// A producer that answers a fixed hash and makes a small frame of a fixed
// format (whatever size is requested), optionally after waiting at a gate,
// sleeping, or failing.
class TestProducer : public QRT::Implements<ML::IRenderableNodeProducer>
{
public:
    QRT::Guid mHash{"{11111111-2222-3333-4444-555555555555}"};
    mvxmediatypes::PixelFormat mFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
    std::uint32_t mWidth = 8;
    std::uint32_t mHeight = 4;
    std::shared_ptr<Gate> mGate;
    std::chrono::microseconds mLatency{0};
    ProducerFailure mFailure = ProducerFailure::kNone;
    QRT::Result mFailureStatus = static_cast<QRT::Result>(0xA0990001u);
    // Called at the start of ProduceFrame, and at its end with the opposite flag.
    std::function<void(bool inStarting)> mObserver;
    std::atomic<int> mProduceCount{0};
    std::atomic<int> mHashCount{0};
    MF::FrameTime mLastTime;
    ML::CutlistRenderParams mLastParams;

    QRT::Result ProduceFrame(const MF::FrameTime& inTime, const ML::CutlistRenderParams& inParams,
                             FrameRef& outFrame) override
    {
        ++mProduceCount;
        mLastTime = inTime;
        mLastParams = inParams;
        // The node is the provider that owns this producer: keeping it would
        // make a cycle.
        mLastParams.mNode.Reset();
        if (mObserver)
            mObserver(true);
        struct End
        {
            TestProducer& mProducer;
            ~End()
            {
                if (mProducer.mObserver)
                    mProducer.mObserver(false);
            }
        } end{*this};
        if (mGate)
            mGate->Wait();
        if (mLatency.count() > 0)
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
        outFrame =
            VF::CreateVideoFrame(mFormat, mWidth, mHeight, inParams.mPixelAspectRatio, true, false);
        return QRT::kResult_Success;
    }

    void GetFrameHash(QRT::Guid& outHash, const MF::FrameTime&,
                      const ML::CutlistRenderParams&) override
    {
        ++mHashCount;
        outHash = mHash;
    }
};

// A prefetch handle whose result the test sets.
class TestPrefetch : public QRT::Implements<ML::IRenderableNodePrefetch>
{
public:
    std::atomic<bool> mComplete{false};
    // When positive, the handle completes by itself after this many polls.
    std::atomic<int> mPollsUntilComplete{0};
    std::atomic<bool> mWantMoreTime{false};
    std::atomic<int> mInitiateCount{0};
    std::atomic<int> mCancelCount{0};
    std::atomic<double> mLastElapsed{-1.0};
    FrameRef mFrame; // set before mComplete

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
        return !mComplete.load() && mWantMoreTime.load();
    }
};

// One delivery as a client, a message or a completion function saw it.
struct Delivery
{
    enum Kind
    {
        kComplete,
        kCancelled,
        kError
    } mKind;
    std::uint32_t mRequestID = 0;
    std::intptr_t mContext = 0;
    FrameRef mFrame;
    QRT::Result mStatus = 0;
    std::int32_t mMilliseconds = 0;
};

class TestClient : public QRT::Implements<ML::IRenderFrameClient, QRT::IWeakReferenceCapable>
{
public:
    void OnRenderFrameComplete(std::intptr_t inContext, std::uint32_t inRequestID,
                               mvxmediatypes::TickTime, FrameRef inFrame,
                               std::int32_t inMilliseconds) override
    {
        Add({Delivery::kComplete, inRequestID, inContext, inFrame, 0, inMilliseconds});
    }
    void OnRenderFrameCancelled(std::intptr_t inContext, std::uint32_t inRequestID,
                                mvxmediatypes::TickTime) override
    {
        Add({Delivery::kCancelled, inRequestID, inContext, {}, 0, 0});
    }
    void OnRenderFrameError(std::intptr_t inContext, std::uint32_t inRequestID,
                            mvxmediatypes::TickTime, QRT::Result inStatus) override
    {
        Add({Delivery::kError, inRequestID, inContext, {}, inStatus, 0});
    }

    std::vector<Delivery> Get()
    {
        std::lock_guard<std::mutex> lock(mMutex);
        return mDeliveries;
    }

private:
    void Add(Delivery inDelivery)
    {
        std::lock_guard<std::mutex> lock(mMutex);
        mDeliveries.push_back(std::move(inDelivery));
    }

    std::mutex mMutex;
    std::vector<Delivery> mDeliveries;
};

// Records completion-function calls of many requests.
class CompletionRecorder
{
public:
    ML::RenderCompletionFunction For(std::uint32_t inRequestID)
    {
        return [this, inRequestID](FrameRef inFrame, bool inCancelled, int inStatus)
        {
            std::lock_guard<std::mutex> lock(mMutex);
            mDeliveries.push_back({inCancelled ? Delivery::kCancelled
                                               : (inFrame ? Delivery::kComplete : Delivery::kError),
                                   inRequestID, 0, inFrame, inStatus, 0});
            mCancelledFlags.push_back(inCancelled);
        };
    }
    std::vector<Delivery> Get()
    {
        std::lock_guard<std::mutex> lock(mMutex);
        return mDeliveries;
    }
    std::vector<bool> GetCancelledFlags()
    {
        std::lock_guard<std::mutex> lock(mMutex);
        return mCancelledFlags;
    }
    std::size_t Count()
    {
        std::lock_guard<std::mutex> lock(mMutex);
        return mDeliveries.size();
    }
    bool WaitForCount(std::size_t inCount)
    {
        return WaitUntil([&] { return Count() >= inCount; });
    }

private:
    std::mutex mMutex;
    std::vector<Delivery> mDeliveries;
    std::vector<bool> mCancelledFlags;
};

// An accelerated renderer that takes (or refuses) renders and lets the test
// answer them.
class TestAcceleratedRenderer : public QRT::Implements<ML::IAcceleratedSequenceRenderer>
{
public:
    QRT::Result mAnswer = QRT::kResult_Success;
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
        std::lock_guard<std::mutex> lock(mMutex);
        mInitiated.push_back(inRequestID);
        mClient = inClient;
        mLastRenderBothFields = inRenderBothFields;
        return mAnswer;
    }
    QRT::Result CancelRender(std::uint32_t inRequestID) override
    {
        std::lock_guard<std::mutex> lock(mMutex);
        mCancelled.push_back(inRequestID);
        return QRT::kResult_Success;
    }

private:
    ML::AcceleratedRendererSegmentTable mSegments;
};

// A node that makes a given producer and records prefetch ranges.
class TestNode : public QRT::Implements<MF::IRenderableNode, ML::IRenderableNodeProducerProvider,
                                        ML::IRenderableNodePrefetchProvider>
{
public:
    QRT::InterfaceRef<ML::IRenderableNodeProducer> mProducer;
    QRT::InterfaceRef<ML::IRenderableNodePrefetch> mPrefetch;
    mutable std::vector<MF::TickTimeRange> mPrefetchRanges;
    mutable std::vector<MF::FrameTime> mProducerTimes;

    QRT::Guid GetNodeHash() const override { return QRT::Guid(); }
    QRT::ImmutableString GetNodeType() const override
    {
        return QRT::ImmutableString::CreateStatic("TestNode");
    }
    std::uint32_t GetRenderFlags() const override { return 0; }
    void GetProperties(MF::RenderablePropertyMap&) const override {}
    QRT::Result GetProperty(const QRT::ImmutableString&,
                            MF::RenderablePropertyValue&) const override
    {
        return QRT::kResult_NotFound;
    }
    std::uint32_t GetInputCount() const override { return 0; }
    QRT::Result GetInput(std::uint32_t, mvxmediatypes::TickTime&,
                         QRT::InterfaceRef<MF::IRenderableNode>&) const override
    {
        return QRT::kResult_NotFound;
    }
    std::uint32_t GetOperatorCount() const override { return 0; }
    QRT::Result GetOperator(std::uint32_t, QRT::InterfaceRef<MF::IRenderableNode>&) const override
    {
        return QRT::kResult_NotFound;
    }
    void GetProducer(QRT::InterfaceRef<ML::IRenderableNodeProducer>& outProducer,
                     const MF::FrameTime& inTime, const ML::CutlistRenderParams&) const override
    {
        mProducerTimes.push_back(inTime);
        outProducer = mProducer;
    }
    void GetStillRanges(mvxmediatypes::TickTime, mvxmediatypes::TickTime,
                        MF::TickTimeRangeList&) const override
    {
    }
    void GetSmartRenderTimes(mvxmediatypes::TickTime, mvxmediatypes::TickTime,
                             const mvxmediatypes::FrameRate&, bool,
                             std::set<mvxmediatypes::TickTime>&) const override
    {
    }
    void Prefetch(const MF::TickTimeRange& inRange, const ML::CutlistRenderParams&,
                  ML::RenderableNodePrefetchList& ioPrefetches) const override
    {
        mPrefetchRanges.push_back(inRange);
        if (mPrefetch)
            ioPrefetches.push_back(mPrefetch);
    }
};

// One segment [mStart, mEnd) mapped onto a node; node time = t + mOffset - mStart.
class TestCutlist : public QRT::Implements<MF::IRenderableCutlist>
{
public:
    mvxmediatypes::TickTime mStart = mvxmediatypes::kTime_Zero;
    mvxmediatypes::TickTime mEnd = mvxmediatypes::TickTime::TicksToTime(1'000'000'000'000);
    mvxmediatypes::TickTime mOffset = mvxmediatypes::kTime_Zero;
    QRT::InterfaceRef<MF::IRenderableNode> mNode;
    QRT::Result mLookupStatus = QRT::kResult_Success;
    QRT::ImmutableString mName;

    std::size_t GetSegmentCount() const override { return 1; }
    QRT::Guid GetCutlistHash() const override { return QRT::Guid(); }
    QRT::Result GetSegment(std::size_t, mvxmediatypes::TickTime&, mvxmediatypes::TickTime&,
                           mvxmediatypes::TickTime&, QRT::Guid&) const override
    {
        return QRT::kResult_NotFound;
    }
    QRT::Result GetNodeByHash(const QRT::Guid&,
                              QRT::InterfaceRef<MF::IRenderableNode>&) const override
    {
        return QRT::kResult_NotFound;
    }
    QRT::Result GetNodeAtTime(const MF::FrameTime& inTime,
                              QRT::InterfaceRef<MF::IRenderableNode>& outNode,
                              MF::FrameTime& outLocalTime) const override
    {
        if (QRT::Failed(mLookupStatus))
            return mLookupStatus;
        const mvxmediatypes::TickTime time = inTime.GetTime();
        if (time < mStart || time >= mEnd)
        {
            outNode.Reset();
            return QRT::kResult_Success;
        }
        outNode = mNode;
        const mvxmediatypes::TickTime shift = mOffset - mStart;
        outLocalTime =
            MF::FrameTime(inTime.GetFirstFieldTime() + shift, inTime.GetSecondFieldTime() + shift);
        return QRT::kResult_Success;
    }
    QRT::Result GetSegmentAtTime(mvxmediatypes::TickTime, std::size_t&, mvxmediatypes::TickTime&,
                                 mvxmediatypes::TickTime&, mvxmediatypes::TickTime&,
                                 QRT::Guid&) const override
    {
        return QRT::kResult_NotFound;
    }
    QRT::ImmutableString GetName() const override { return mName; }
};

// A provider that hands out one of three cutlists and reports a field type.
class TestCutlistProvider : public QRT::Implements<MF::IRenderableCutlistProvider,
                                                   MF::IRenderableCutlistProviderProperties>
{
public:
    QRT::InterfaceRef<MF::IRenderableCutlist> mCutlists[3];
    mvxmediatypes::FieldType mFieldType = mvxmediatypes::kFieldType_AsSource;
    std::atomic<int> mCalls[3] = {0, 0, 0};

    QRT::InterfaceRef<MF::IRenderableCutlist> GetMainCutlist(const QRT::ImmutableString&,
                                                             bool) override
    {
        ++mCalls[0];
        return mCutlists[0];
    }
    QRT::InterfaceRef<MF::IRenderableCutlist> GetAlternateCutlist(const QRT::ImmutableString&,
                                                                  bool) override
    {
        ++mCalls[1];
        return mCutlists[1];
    }
    QRT::InterfaceRef<MF::IRenderableCutlist> GetThirdCutlist(const QRT::ImmutableString&,
                                                              bool) override
    {
        ++mCalls[2];
        return mCutlists[2];
    }
    void GetBounds(std::int32_t& outLeft, std::int32_t& outTop, std::int32_t& outRight,
                   std::int32_t& outBottom) const override
    {
        outLeft = outTop = 0;
        outRight = 64;
        outBottom = 32;
    }
    mvxmediatypes::PixelAspectRatio GetPixelAspectRatio() const override
    {
        return mvxmediatypes::kPixelAspectRatio_Square;
    }
    mvxmediatypes::FieldType GetFieldType() const override { return mFieldType; }
    mvxmediatypes::FrameRate GetFrameRate() const override
    {
        return mvxmediatypes::kFrameRate_Video25;
    }
};

// Settings of a plain request: inWidth x inHeight output in inFormat, the
// producer inProducer, identifier inRequestID.
inline ML::RenderFrameRequestSettings
MakeSettings(std::uint32_t inRequestID, QRT::InterfaceRef<ML::IRenderableNodeProducer> inProducer,
             std::int32_t inWidth = 64, std::int32_t inHeight = 32,
             mvxmediatypes::PixelFormat inFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u,
             std::uint32_t inPriority = ML::kRenderPriority_Normal)
{
    ML::RenderFrameRequestSettings settings;
    settings.mTime = MF::FrameTime(mvxmediatypes::TickTime::TicksToTime(inRequestID * 1000));
    settings.mFrameRate = mvxmediatypes::kFrameRate_Video25;
    settings.mFullFrameRect = QRT::ParamRect(0, 0, inWidth, inHeight);
    settings.mFullFramePixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    settings.mOutputRect = QRT::ParamRect(0, 0, inWidth, inHeight);
    settings.mOutputPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    settings.mRequestedFormats = {inFormat};
    settings.mPriority = inPriority;
    settings.mRequestID = inRequestID;
    settings.mProducer = std::move(inProducer);
    return settings;
}

inline ML::RenderFrameRequest MakeRequest(const ML::RenderFrameRequestSettings& inSettings)
{
    return ML::RenderFrameRequest(inSettings, true, false);
}

} // namespace pltest
