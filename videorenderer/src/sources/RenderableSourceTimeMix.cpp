#include "sources/RenderableSourceTimeMix.h"

#include "ML/RenderableSourceFilters.h"
#include "sources/FieldFilterSteps.h"

namespace ML
{

using namespace FieldFilterSteps;

RenderableSourceTimeMix::RenderableSourceTimeMix(
    const QRT::InterfaceRef<IRenderableSource>& inUpstream)
    : mUpstream(inUpstream)
{
}

void RenderableSourceTimeMix::ConformFrameTime(const MF::FrameTime& inRequested,
                                               const CutlistRenderParams& inParams,
                                               MF::FrameTime& outConformed)
{
    // A draft render that needs one field only may take the progressive frame
    // at that field's time instead of mixing two.
    if (inParams.mQuality < mvxmediatypes::kRenderQuality_Medium && inParams.mSingleField != 0 &&
        inRequested.IsInterlaced())
    {
        const mvxmediatypes::TickTime t =
            inParams.mSingleField == 1 ? inRequested.GetTime() : inRequested.GetLaterTime();
        outConformed = ConformUpstream(mUpstream, MF::FrameTime(t), inParams);
        return;
    }
    const MF::FrameTime delivered = ConformUpstream(mUpstream, inRequested, inParams);
    if (delivered == inRequested)
    {
        outConformed = delivered;
        return;
    }
    outConformed = inRequested;
    mvxmediatypes::FrameRate frameRate;
    mUpstream->GetFrameRate(frameRate);
    mvxmediatypes::FrameRate fieldRate;
    mUpstream->GetFieldRate(fieldRate);
    if (frameRate < mvxmediatypes::kFrameRate_Video1000 && !fieldRate.IsZero())
        outConformed = MF::FrameTime(inRequested.GetFirstFieldTime().AlignToFrame(fieldRate),
                                     inRequested.GetSecondFieldTime().AlignToFrame(fieldRate));
}

RenderableSourceTimeMix::UpstreamTimes
RenderableSourceTimeMix::GetUpstreamTimes(const MF::FrameTime& inTime,
                                          const CutlistRenderParams& inParams)
{
    UpstreamTimes times;
    times.mDelivered = ConformUpstream(mUpstream, inTime, inParams);
    if (times.mDelivered == inTime)
    {
        times.mA = times.mDelivered;
        times.mB = times.mDelivered;
        return times;
    }
    times.mA = ConformUpstream(mUpstream, MF::FrameTime(inTime.GetSecondFieldTime()), inParams);
    times.mB = ConformUpstream(mUpstream, MF::FrameTime(inTime.GetFirstFieldTime()), inParams);
    return times;
}

void RenderableSourceTimeMix::CollectPrefetches(const MF::FrameTime& inTime,
                                                const CutlistRenderParams& inParams,
                                                RenderableNodePrefetchList& ioPrefetches)
{
    const UpstreamTimes times = GetUpstreamTimes(inTime, inParams);
    mUpstream->CollectPrefetches(times.mA, inParams, ioPrefetches);
    if (times.mB != times.mA)
        mUpstream->CollectPrefetches(times.mB, inParams, ioPrefetches);
}

void RenderableSourceTimeMix::RenderFrame(const MF::FrameTime& inTime,
                                          const CutlistRenderParams& inParams,
                                          QRT::InterfaceRef<MF::IVideoFrame>& outFrame)
{
    outFrame = nullptr;
    const UpstreamTimes times = GetUpstreamTimes(inTime, inParams);
    const FrameRef second = RenderUpstream(mUpstream, times.mA, inParams);
    if (times.mA == inTime && times.mA == times.mB)
    {
        outFrame = second;
        return;
    }
    const FrameRef first =
        times.mB != times.mA ? RenderUpstream(mUpstream, times.mB, inParams) : second;
    if (!first && !second)
        return;
    outFrame = AssembleFields(inTime, first, times.mB, second, times.mA, inParams);
}

void RenderableSourceTimeMix::GetFrameRate(mvxmediatypes::FrameRate& outRate)
{
    mUpstream->GetFieldRate(outRate);
}

void RenderableSourceTimeMix::GetFieldRate(mvxmediatypes::FrameRate& outRate)
{
    mUpstream->GetFieldRate(outRate);
}

QRT::InterfaceRef<IRenderableSource>
TimeMixSource(const QRT::InterfaceRef<IRenderableSource>& inSource)
{
    return QRT::Allocated<RenderableSourceTimeMix>::Create<IRenderableSource>(inSource);
}

} // namespace ML
