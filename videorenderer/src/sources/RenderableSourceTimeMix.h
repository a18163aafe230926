#pragma once

// RenderableSourceTimeMix: delivers frames at times off the upstream frame
// grid (clips played at another speed or frame rate) by building each output
// field from the nearest earlier upstream field: fields of different upstream
// frames are mixed into one frame, no pixels are blended. A request upstream
// delivers exactly passes upstream's frame object through.
//
// Created by TimeMixSource, and by the time blend filter as its fallback.
// Immutable; called from render and prefetch threads at once.

#include "ML/IRenderableSource.h"
#include "QRT/Allocated.h"
#include "QRT/InterfaceRef.h"

namespace ML
{

class RenderableSourceTimeMix : public QRT::Implements<IRenderableSource>
{
public:
    explicit RenderableSourceTimeMix(const QRT::InterfaceRef<IRenderableSource>& inUpstream);

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams& inParams,
                          MF::FrameTime& outConformed) override;
    void CollectPrefetches(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                           RenderableNodePrefetchList& ioPrefetches) override;
    void RenderFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                     QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override;
    void GetFrameRate(mvxmediatypes::FrameRate& outRate) override;
    void GetFieldRate(mvxmediatypes::FrameRate& outRate) override;

private:
    // The upstream frame times that make the request: A gives the output's
    // second field, B its first.
    struct UpstreamTimes
    {
        MF::FrameTime mDelivered;
        MF::FrameTime mA;
        MF::FrameTime mB;
    };
    UpstreamTimes GetUpstreamTimes(const MF::FrameTime& inTime,
                                   const CutlistRenderParams& inParams);

    const QRT::InterfaceRef<IRenderableSource> mUpstream;
};

} // namespace ML
