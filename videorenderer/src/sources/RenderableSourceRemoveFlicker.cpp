#include "ML/RenderableSourceFilters.h"
#include "QRT/Allocated.h"
#include "VF/VideoFrameManipulators.h"
#include "sources/FieldFilterSteps.h"
#include "sources/FilterSourceBase.h"

namespace ML
{

namespace
{

using namespace FieldFilterSteps;

// RenderableSourceRemoveFlicker: delivers progressive frames whose rows are
// filtered vertically (1, 2, 1) so that thin horizontal detail does not
// flicker on an interlaced display. Immutable; called from render and
// prefetch threads at once.
class RenderableSourceRemoveFlicker : public FilterSourceBase
{
public:
    explicit RenderableSourceRemoveFlicker(const QRT::InterfaceRef<IRenderableSource>& inUpstream)
        : FilterSourceBase(inUpstream, Output::kProgressive)
    {
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams& inParams,
                          MF::FrameTime& outConformed) override
    {
        outConformed = MF::FrameTime(ConformUpstream(mUpstream, inRequested, inParams).GetTime());
    }

private:
    FrameRef Filter(const FrameRef& inFrame, const MF::FrameTime&, const MF::FrameTime&,
                    const CutlistRenderParams& inParams) override
    {
        const FrameRef copy = MakeAddressableCopy(inFrame, inParams);
        FrameRef filtered = copy->CreateEmptyFrame(false);
        ThrowIfFailed(VF::VideoFrameManipulators::VerticalConvolve(copy, filtered));
        // The filtered rows mix both fields: the frame no longer has two instants.
        filtered->SetFieldType(mvxmediatypes::kFieldType_Progressive);
        return filtered;
    }
};

} // namespace

QRT::InterfaceRef<IRenderableSource>
RemoveFlickerFromSource(const QRT::InterfaceRef<IRenderableSource>& inSource)
{
    return QRT::Allocated<RenderableSourceRemoveFlicker>::Create<IRenderableSource>(inSource);
}

} // namespace ML
