#pragma once

// A leaf node of the module's own node kind with one producer and one
// prefetch handle, both set by the test, that records the ranges it is asked
// to prefetch. NewNode seals it; the ranges are kept under a lock.

#include "ML/IRenderableNodeProducerProvider.h"
#include "ML/RenderableNodeCommonImpl.h"
#include "QRT/Allocated.h"

#include <mutex>
#include <set>
#include <vector>

namespace vrtest
{

class TestNodeKind : public ML::RenderableNodeCommonImpl
{
public:
    QRT::InterfaceRef<ML::IRenderableNodeProducer> mProducer;
    QRT::InterfaceRef<ML::IRenderableNodePrefetch> mPrefetch;

    std::vector<MF::TickTimeRange> PrefetchRanges() const
    {
        std::lock_guard lock(mMutex);
        return mPrefetchRanges;
    }
    QRT::ImmutableString GetNodeType() const override
    {
        return QRT::ImmutableString::CreateStatic("TestNode");
    }
    void PrefetchSelf(const MF::TickTimeRange& inRange, const ML::CutlistRenderParams&,
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

class TestNode
    : public ML::RenderableNodeWithInterfaces<TestNodeKind, ML::IRenderableNodeProducerProvider>
{
public:
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
};

// A sealed test node answering inProducer.
inline QRT::InterfaceRef<TestNode>
NewNode(QRT::InterfaceRef<ML::IRenderableNodeProducer> inProducer = {})
{
    auto node = QRT::Allocated<TestNode>::CreateInstance();
    node->mProducer = std::move(inProducer);
    node->MakeImmutable();
    return node;
}

} // namespace vrtest
