#pragma once

// A leaf node with one producer and one prefetch handle, both set by the
// test, that records the ranges it is asked to prefetch. The node is shared
// between threads; the ranges are kept under a lock.

#include "ML/IRenderableNodePrefetchProvider.h"
#include "ML/IRenderableNodeProducerProvider.h"
#include "QRT/Allocated.h"

#include <mutex>
#include <set>
#include <vector>

namespace vrtest
{

class TestNode : public QRT::Implements<MF::IRenderableNode, ML::IRenderableNodeProducerProvider,
                                        ML::IRenderableNodePrefetchProvider>
{
public:
    QRT::Guid mHash;
    QRT::InterfaceRef<ML::IRenderableNodeProducer> mProducer;
    QRT::InterfaceRef<ML::IRenderableNodePrefetch> mPrefetch;

    std::vector<MF::TickTimeRange> PrefetchRanges() const
    {
        std::lock_guard lock(mMutex);
        return mPrefetchRanges;
    }

    QRT::Guid GetNodeHash() const override { return mHash; }
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
                     const MF::FrameTime&, const ML::CutlistRenderParams&) const override
    {
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
        {
            std::lock_guard lock(mMutex);
            mPrefetchRanges.push_back(inRange);
        }
        if (mPrefetch)
            ioPrefetches.push_back(mPrefetch);
    }

private:
    // Guards mPrefetchRanges.
    mutable std::mutex mMutex;
    mutable std::vector<MF::TickTimeRange> mPrefetchRanges;
};

} // namespace vrtest
