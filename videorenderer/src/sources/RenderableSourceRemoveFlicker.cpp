#include "ML/RenderableSourceFilters.h"
#include "QRT/Allocated.h"
#include "QRT/QRTUnknown.h"
#include "VF/VideoFrameManipulators.h"
#include "sources/FieldFilterSteps.h"

namespace ML
{

namespace
{

using namespace FieldFilterSteps;

// RenderableSourceRemoveFlicker: delivers progressive frames whose rows are
// filtered vertically (1, 2, 1) so that thin horizontal detail does not
// flicker on an interlaced display. Immutable; called from render and
// prefetch threads at once.
class RenderableSourceRemoveFlicker : public QRT::Implements<IRenderableSource>
{
public:
    explicit RenderableSourceRemoveFlicker(const QRT::InterfaceRef<IRenderableSource>& inUpstream)
        : mUpstream(inUpstream)
    {
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams& inParams,
                          MF::FrameTime& outConformed) override
    {
        outConformed = MF::FrameTime(ConformUpstream(mUpstream, inRequested, inParams).GetTime());
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
        const FrameRef frame =
            RenderUpstream(mUpstream, ConformUpstream(mUpstream, inTime, inParams), inParams);
        if (!frame)
            return;
        const FrameRef copy = MakeAddressableCopy(frame, inParams);
        FrameRef filtered = copy->CreateEmptyFrame(false);
        ThrowIfFailed(VF::VideoFrameManipulators::VerticalConvolve(copy, filtered));
        // The filtered rows mix both fields: the frame no longer has two instants.
        filtered->SetFieldType(mvxmediatypes::kFieldType_Progressive);
        outFrame = filtered;
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
RemoveFlickerFromSource(const QRT::InterfaceRef<IRenderableSource>& inSource)
{
    return QRT::Allocated<RenderableSourceRemoveFlicker>::Create<IRenderableSource>(inSource);
}

} // namespace ML
