#include "ML/RenderableSourceFilters.h"
#include "QRT/Allocated.h"
#include "sources/FieldFilterSteps.h"
#include "sources/FilterSourceBase.h"

namespace ML
{

namespace
{

using namespace FieldFilterSteps;

// RenderableSourceDeinterlace: delivers progressive frames made from the one
// field of each upstream frame that lies at the requested time; a frame
// upstream already delivers progressive passes unchanged, and a frame two or
// four times the requested height gives its field at the requested size. Owned by whoever
// holds its reference (a media chain); immutable, called from render and
// prefetch threads at once.
class RenderableSourceDeinterlace : public FilterSourceBase
{
public:
    explicit RenderableSourceDeinterlace(const QRT::InterfaceRef<IRenderableSource>& inUpstream)
        : FilterSourceBase(inUpstream, Output::kProgressive)
    {
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams& inParams,
                          MF::FrameTime& outConformed) override
    {
        const MF::FrameTime upstream =
            ConformUpstream(mUpstream, MF::FrameTime(inRequested.GetTime()), inParams);
        outConformed = MF::FrameTime(upstream.GetTime());
    }

private:
    FrameRef Filter(const FrameRef& inFrame, const MF::FrameTime& inTime,
                    const MF::FrameTime& inUpstreamTime,
                    const CutlistRenderParams& inParams) override
    {
        if (inUpstreamTime.IsProgressive())
            return inFrame;
        // The field to keep is the one upstream delivered at the requested
        // second time; the other one belongs to another instant.
        const bool keepSecond = inUpstreamTime.GetSecondFieldTime() == inTime.GetSecondFieldTime();
        // A frame two or four times the requested height holds the requested
        // frame in each of its fields: the kept field is taken directly into a
        // frame of the requested size, with no field to rebuild.
        if (IsWholeFieldMultiple(*inFrame, inParams))
            return TakeFieldDirectly(inFrame, inParams, keepSecond);
        // Any other size is deinterlaced at the upstream frame's own size.
        CutlistRenderParams params = inParams;
        const QRT::ParamRect bounds = inFrame->GetBounds();
        params.mWidth = static_cast<std::uint32_t>(bounds.Width());
        params.mHeight = static_cast<std::uint32_t>(bounds.Height());
        params.mPixelAspectRatio = inFrame->GetPixelAspectRatio();
        return DeinterlaceKeepingField(inFrame, params, keepSecond);
    }
};

} // namespace

QRT::InterfaceRef<IRenderableSource>
DeinterlaceSource(const QRT::InterfaceRef<IRenderableSource>& inSource)
{
    return QRT::Allocated<RenderableSourceDeinterlace>::Create<IRenderableSource>(inSource);
}

} // namespace ML
