#pragma once

// Test doubles of the cutlist source's tests: a producer and a node that
// record what they are asked, a prefetch handle that only marks its node, a
// cutlist whose node lookup fails, and a provider without a description that
// records its getter calls.

#include "MF/RenderableCutlist.h"
#include "MF/RenderableCutlistProvider.h"
#include "ML/CutlistRenderParams.h"
#include "ML/IRenderableNodePrefetch.h"
#include "ML/IRenderableNodePrefetchProvider.h"
#include "ML/IRenderableNodeProducer.h"
#include "ML/IRenderableNodeProducerProvider.h"
#include "QRT/Allocated.h"
#include "VF/VideoFrame.h"

#include <atomic>
#include <mutex>
#include <string>
#include <vector>

namespace cstest
{

using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;
using CutlistRef = QRT::InterfaceRef<MF::IRenderableCutlist>;

// Makes a frame of the requested format, size and ratio (or fails with
// mFailureStatus) and records the parameters and node time it was given.
class RecordingProducer : public QRT::Implements<ML::IRenderableNodeProducer>
{
public:
    explicit RecordingProducer(const QRT::Guid& inHash)
        : mHash(inHash)
    {
    }

    QRT::Result mFailureStatus = QRT::kResult_Success;
    std::atomic<int> mProduceCount{0};

    QRT::Result ProduceFrame(const MF::FrameTime& inTime, const ML::CutlistRenderParams& inParams,
                             FrameRef& outFrame) override
    {
        ++mProduceCount;
        {
            std::lock_guard lock(mMutex);
            mLastTime = inTime;
            mLastParams = inParams;
            // The parameters' node may be the provider that owns this
            // producer's node: keeping it would make a cycle.
            mLastParams.mNode.Reset();
        }
        if (QRT::Failed(mFailureStatus))
            return mFailureStatus;
        outFrame = VF::CreateVideoFrame(inParams.mPixelFormat, inParams.mWidth, inParams.mHeight,
                                        inParams.mPixelAspectRatio, true, false);
        return QRT::kResult_Success;
    }

    void GetFrameHash(QRT::Guid& outHash, const MF::FrameTime&,
                      const ML::CutlistRenderParams&) override
    {
        outHash = mHash;
    }

    ML::CutlistRenderParams LastParams()
    {
        std::lock_guard lock(mMutex);
        return mLastParams;
    }
    MF::FrameTime LastTime()
    {
        std::lock_guard lock(mMutex);
        return mLastTime;
    }

private:
    const QRT::Guid mHash;
    // Guards mLastTime and mLastParams.
    std::mutex mMutex;
    MF::FrameTime mLastTime;
    ML::CutlistRenderParams mLastParams;
};

// A prefetch handle that only says which node made it.
class MarkerPrefetch : public QRT::Implements<ML::IRenderableNodePrefetch>
{
public:
    explicit MarkerPrefetch(std::string inOwner)
        : mOwner(std::move(inOwner))
    {
    }
    const std::string mOwner;

    QRT::Result InitiatePrefetch() override { return QRT::kResult_Success; }
    QRT::Result GetPrefetchedFrame(FrameRef&) override { return QRT::kResult_NotFound; }
    QRT::Result CancelPrefetch() override { return QRT::kResult_Success; }
    void GetPrefetchKey(QRT::Guid& outKey) const override { outKey = QRT::Guid(); }
    bool ContinueWaitingForPrefetch(double) override { return false; }
};

// A leaf node with one producer that records its prefetch ranges and appends
// a MarkerPrefetch named after itself.
class RecordingNode
    : public QRT::Implements<MF::IRenderableNode, ML::IRenderableNodeProducerProvider,
                             ML::IRenderableNodePrefetchProvider>
{
public:
    RecordingNode(std::string inName, const QRT::Guid& inHash)
        : mName(std::move(inName))
        , mHash(inHash)
        , mProducer(QRT::Allocated<RecordingProducer>::CreateInstance(inHash))
    {
    }

    const std::string mName;
    const QRT::Guid mHash;
    const QRT::InterfaceRef<RecordingProducer> mProducer;

    QRT::Guid GetNodeHash() const override { return mHash; }
    QRT::ImmutableString GetNodeType() const override
    {
        return QRT::ImmutableString::CreateStatic("RecordingNode");
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
                     const MF::FrameTime&, const ML::CutlistRenderParams&) const override
    {
        outProducer = QRT::InterfaceRef<ML::IRenderableNodeProducer>(mProducer);
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
        {
            std::lock_guard lock(mMutex);
            mPrefetchRanges.push_back(inRange);
        }
        ioPrefetches.push_back(
            QRT::Allocated<MarkerPrefetch>::Create<ML::IRenderableNodePrefetch>(mName));
    }

    std::vector<MF::TickTimeRange> PrefetchRanges() const
    {
        std::lock_guard lock(mMutex);
        return mPrefetchRanges;
    }

private:
    // Guards mPrefetchRanges.
    mutable std::mutex mMutex;
    mutable std::vector<MF::TickTimeRange> mPrefetchRanges;
};

// A cutlist whose node lookup fails with mStatus.
class FailingCutlist : public QRT::Implements<MF::IRenderableCutlist>
{
public:
    QRT::Result mStatus = static_cast<QRT::Result>(0xA0990042u);

    std::size_t GetSegmentCount() const override { return 0; }
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
    QRT::Result GetNodeAtTime(const MF::FrameTime&, QRT::InterfaceRef<MF::IRenderableNode>&,
                              MF::FrameTime&) const override
    {
        return mStatus;
    }
    QRT::Result GetSegmentAtTime(mvxmediatypes::TickTime, std::size_t&, mvxmediatypes::TickTime&,
                                 mvxmediatypes::TickTime&, mvxmediatypes::TickTime&,
                                 QRT::Guid&) const override
    {
        return QRT::kResult_NotFound;
    }
    QRT::ImmutableString GetName() const override { return QRT::ImmutableString(); }
};

// One getter call as a provider saw it.
struct GetterCall
{
    int mWhich = 0; // 0 main, 1 alternate, 2 third
    std::string mName;
    bool mFlag = false;
};

// A provider without the property interface that records its getter calls.
class BareProvider : public QRT::Implements<MF::IRenderableCutlistProvider>
{
public:
    CutlistRef mCutlists[3];
    std::vector<GetterCall> mCalls;

    CutlistRef GetMainCutlist(const QRT::ImmutableString& inName, bool inFlag) override
    {
        return Record(0, inName, inFlag);
    }
    CutlistRef GetAlternateCutlist(const QRT::ImmutableString& inName, bool inFlag) override
    {
        return Record(1, inName, inFlag);
    }
    CutlistRef GetThirdCutlist(const QRT::ImmutableString& inName, bool inFlag) override
    {
        return Record(2, inName, inFlag);
    }

private:
    CutlistRef Record(int inWhich, const QRT::ImmutableString& inName, bool inFlag)
    {
        mCalls.push_back({inWhich, inName.ToStdString(), inFlag});
        return mCutlists[inWhich];
    }
};

} // namespace cstest
