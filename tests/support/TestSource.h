#pragma once

// A renderable source whose frames are BGRA_4444_8u of one colour at the size
// the parameters ask for, with an optional prefetch handle, that can be made
// to fail. It records its calls; the records are read after the render ended.

#include "ML/IRenderableSource.h"
#include "ML/RenderRequestException.h"
#include "TestFrames.h"
#include "TestPrefetch.h"

#include <atomic>
#include <stdexcept>

namespace vrtest
{

enum class SourceFailure
{
    kNone,
    kRenderRequestException,
    kStdException,
};

class TestSource : public QRT::Implements<ML::IRenderableSource>
{
public:
    Bgra mColor = {0x20, 0x40, 0x80, 0xFF};
    QRT::InterfaceRef<TestPrefetch> mPrefetch;
    SourceFailure mFailure = SourceFailure::kNone;

    std::atomic<int> mRenderCount{0};
    MF::FrameTime mRenderTime;
    bool mPrefetchCompleteBeforeRender = false;

    void ConformFrameTime(const MF::FrameTime& inRequested, const ML::CutlistRenderParams&,
                          MF::FrameTime& outConformed) override
    {
        outConformed = inRequested;
    }
    void CollectPrefetches(const MF::FrameTime&, const ML::CutlistRenderParams&,
                           ML::RenderableNodePrefetchList& ioPrefetches) override
    {
        if (mPrefetch)
            ioPrefetches.push_back(mPrefetch);
    }
    void RenderFrame(const MF::FrameTime& inTime, const ML::CutlistRenderParams& inParams,
                     FrameRef& outFrame) override
    {
        outFrame.Reset();
        ++mRenderCount;
        mRenderTime = inTime;
        mPrefetchCompleteBeforeRender = mPrefetch && mPrefetch->IsComplete();
        if (mFailure == SourceFailure::kRenderRequestException)
            throw ML::RenderRequestException(static_cast<QRT::Result>(0xA0990002u));
        if (mFailure == SourceFailure::kStdException)
            throw std::runtime_error("source failed");
        outFrame = MakeFrame(inParams.mWidth, inParams.mHeight);
        Fill(*outFrame, mColor);
    }
    void GetFrameRate(mvxmediatypes::FrameRate& outRate) override
    {
        outRate = mvxmediatypes::kFrameRate_Video25;
    }
    void GetFieldRate(mvxmediatypes::FrameRate& outRate) override
    {
        outRate = mvxmediatypes::kFrameRate_Video25;
    }
};

} // namespace vrtest
