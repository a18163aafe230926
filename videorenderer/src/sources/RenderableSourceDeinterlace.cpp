#include "ML/RenderableSourceFilters.h"
#include "QRT/Allocated.h"
#include "QRT/QRTUnknown.h"
#include "sources/FieldFilterSteps.h"

namespace ML
{

namespace
{

using namespace FieldFilterSteps;

// RenderableSourceDeinterlace: delivers progressive frames made from the one
// field of each upstream frame that lies at the requested time; a frame
// upstream already delivers progressive passes unchanged. Owned by whoever
// holds its reference (a media chain); immutable, called from render and
// prefetch threads at once.
class RenderableSourceDeinterlace : public QRT::Implements<IRenderableSource>
{
public:
    explicit RenderableSourceDeinterlace(const QRT::InterfaceRef<IRenderableSource>& inUpstream)
        : mUpstream(inUpstream)
    {
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams& inParams,
                          MF::FrameTime& outConformed) override
    {
        const MF::FrameTime upstream =
            ConformUpstream(mUpstream, MF::FrameTime(inRequested.GetTime()), inParams);
        outConformed = MF::FrameTime(upstream.GetTime());
    }

    void CollectPrefetches(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                           RenderableNodePrefetchList& ioPrefetches) override
    {
        mUpstream->CollectPrefetches(ConformUpstream(mUpstream, inTime, inParams), inParams,
                                     ioPrefetches);
    }

    void RenderFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                     QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override
    {
        outFrame = nullptr;
        const MF::FrameTime conformed = ConformUpstream(mUpstream, inTime, inParams);
        FrameRef frame = RenderUpstream(mUpstream, conformed, inParams);
        if (!frame || conformed.IsProgressive())
        {
            outFrame = frame;
            return;
        }
        // The field to keep is the one upstream delivered at the requested
        // second time; the other one belongs to another instant.
        const bool keepSecond = conformed.GetSecondFieldTime() == inTime.GetSecondFieldTime();
        CutlistRenderParams params = inParams;
        const QRT::ParamRect bounds = frame->GetBounds();
        params.mWidth = static_cast<std::uint32_t>(bounds.Width());
        params.mHeight = static_cast<std::uint32_t>(bounds.Height());
        params.mPixelAspectRatio = frame->GetPixelAspectRatio();
        outFrame = DeinterlaceKeepingField(frame, params, keepSecond);
    }

    void GetFrameRate(mvxmediatypes::FrameRate& outRate) override
    {
        mUpstream->GetFrameRate(outRate);
    }

    void GetFieldRate(mvxmediatypes::FrameRate& outRate) override { GetFrameRate(outRate); }

private:
    const QRT::InterfaceRef<IRenderableSource> mUpstream;
};

} // namespace

QRT::InterfaceRef<IRenderableSource>
DeinterlaceSource(const QRT::InterfaceRef<IRenderableSource>& inSource)
{
    return QRT::Allocated<RenderableSourceDeinterlace>::Create<IRenderableSource>(inSource);
}

} // namespace ML
