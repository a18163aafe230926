#include "sources/FilterSourceBase.h"

#include "sources/FieldFilterSteps.h"

namespace ML
{

FilterSourceBase::FilterSourceBase(const QRT::InterfaceRef<IRenderableSource>& inUpstream,
                                   Output inOutput)
    : mUpstream(inUpstream)
    , mOutput(inOutput)
{
}

MF::FrameTime FilterSourceBase::UpstreamTime(const MF::FrameTime& inTime,
                                             const CutlistRenderParams& inParams)
{
    return FieldFilterSteps::ConformUpstream(mUpstream, inTime, inParams);
}

void FilterSourceBase::CollectPrefetches(const MF::FrameTime& inTime,
                                         const CutlistRenderParams& inParams,
                                         RenderableNodePrefetchList& ioPrefetches)
{
    mUpstream->CollectPrefetches(UpstreamTime(inTime, inParams), inParams, ioPrefetches);
}

void FilterSourceBase::RenderFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                                   QRT::InterfaceRef<MF::IVideoFrame>& outFrame)
{
    outFrame = nullptr;
    const MF::FrameTime upstreamTime = UpstreamTime(inTime, inParams);
    const FrameRef frame = FieldFilterSteps::RenderUpstream(mUpstream, upstreamTime, inParams);
    if (frame)
        outFrame = Filter(frame, inTime, upstreamTime, inParams);
}

void FilterSourceBase::GetFrameRate(mvxmediatypes::FrameRate& outRate)
{
    mUpstream->GetFrameRate(outRate);
}

void FilterSourceBase::GetFieldRate(mvxmediatypes::FrameRate& outRate)
{
    if (mOutput == Output::kProgressive)
        mUpstream->GetFrameRate(outRate);
    else
        mUpstream->GetFieldRate(outRate);
}

} // namespace ML
