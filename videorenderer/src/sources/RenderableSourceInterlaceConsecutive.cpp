#include "ML/RenderableSourceFilters.h"
#include "QRT/Allocated.h"
#include "QRT/QRTUnknown.h"
#include "sources/FieldFilterSteps.h"

namespace ML
{

namespace
{

using namespace FieldFilterSteps;

// RenderableSourceInterlaceConsecutive: makes interlaced material out of
// progressive material by reading upstream time at double speed: the output
// field at time f comes from the upstream frame at time 2f, so the two fields
// of output frame n come from upstream frames 2n and 2n + 1. Immutable;
// called from render and prefetch threads at once.
class RenderableSourceInterlaceConsecutive : public QRT::Implements<IRenderableSource>
{
public:
    explicit RenderableSourceInterlaceConsecutive(
        const QRT::InterfaceRef<IRenderableSource>& inUpstream)
        : mUpstream(inUpstream)
    {
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams& /*inParams*/,
                          MF::FrameTime& outConformed) override
    {
        mvxmediatypes::FrameRate frameRate;
        GetFrameRate(frameRate);
        mvxmediatypes::FrameRate fieldRate;
        GetFieldRate(fieldRate);
        const mvxmediatypes::TickTime t = inRequested.GetTime();
        if (frameRate.IsZero())
        {
            outConformed = MF::FrameTime(t);
            return;
        }
        if (inRequested.IsProgressive())
        {
            outConformed = MF::FrameTime(t.AlignToFrame(fieldRate));
            return;
        }
        outConformed = MF::FrameTime::Make(t.AlignToFrame(frameRate), inRequested.GetFieldOrder(),
                                           fieldRate.GetFrameDuration());
    }

    void CollectPrefetches(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                           RenderableNodePrefetchList& ioPrefetches) override
    {
        const MF::FrameTime doubled = Doubled(inTime);
        const MF::FrameTime a = UpstreamFrameAt(doubled.GetFirstFieldTime(), inParams);
        const MF::FrameTime b = UpstreamFrameAt(doubled.GetSecondFieldTime(), inParams);
        mUpstream->CollectPrefetches(a, inParams, ioPrefetches);
        if (b != a)
            mUpstream->CollectPrefetches(b, inParams, ioPrefetches);
    }

    void RenderFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                     QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override
    {
        outFrame = nullptr;
        const MF::FrameTime doubled = Doubled(inTime);
        const MF::FrameTime a = UpstreamFrameAt(doubled.GetFirstFieldTime(), inParams);
        const MF::FrameTime b = UpstreamFrameAt(doubled.GetSecondFieldTime(), inParams);
        const FrameRef first = RenderUpstream(mUpstream, a, inParams);
        if (a == b && inTime.IsProgressive() && a.IsProgressive())
        {
            outFrame = first;
            return;
        }
        const FrameRef second = b != a ? RenderUpstream(mUpstream, b, inParams) : first;
        if (!first && !second)
            return;
        outFrame = AssembleFields(doubled, first, a, second, b, inParams);
    }

    void GetFrameRate(mvxmediatypes::FrameRate& outRate) override
    {
        mUpstream->GetFrameRate(outRate);
    }

    void GetFieldRate(mvxmediatypes::FrameRate& outRate) override
    {
        mUpstream->GetFrameRate(outRate);
        if (!outRate.IsZero())
            outRate = outRate * 2;
    }

private:
    static MF::FrameTime Doubled(const MF::FrameTime& inTime)
    {
        return MF::FrameTime(inTime.GetFirstFieldTime() * 2, inTime.GetSecondFieldTime() * 2);
    }

    // Upstream's frame time for the progressive frame at inTime.
    MF::FrameTime UpstreamFrameAt(mvxmediatypes::TickTime inTime,
                                  const CutlistRenderParams& inParams)
    {
        return ConformUpstream(mUpstream, MF::FrameTime(inTime), inParams);
    }

    const QRT::InterfaceRef<IRenderableSource> mUpstream;
};

} // namespace

QRT::InterfaceRef<IRenderableSource>
InterlaceConsecutiveFramesFromSource(const QRT::InterfaceRef<IRenderableSource>& inSource)
{
    return QRT::Allocated<RenderableSourceInterlaceConsecutive>::Create<IRenderableSource>(
        inSource);
}

} // namespace ML
