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

// RenderableSourceFieldReverse: reverses the field order of the picture. It
// asks upstream for the frame at the swapped frame time and exchanges the
// two fields of the frame it gets, so each field lands in the slot whose time
// the caller asked for. Progressive requests pass through untouched.
// Immutable; called from render and prefetch threads at once.
class RenderableSourceFieldReverse : public FilterSourceBase
{
public:
    explicit RenderableSourceFieldReverse(const QRT::InterfaceRef<IRenderableSource>& inUpstream)
        : FilterSourceBase(inUpstream, Output::kFieldsAsUpstream)
    {
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams& inParams,
                          MF::FrameTime& outConformed) override
    {
        outConformed = ConformUpstream(mUpstream, inRequested, inParams).Swapped();
    }

private:
    MF::FrameTime UpstreamTime(const MF::FrameTime& inTime, const CutlistRenderParams&) override
    {
        return inTime.Swapped();
    }

    FrameRef Filter(const FrameRef& inFrame, const MF::FrameTime& inTime, const MF::FrameTime&,
                    const CutlistRenderParams& inParams) override
    {
        if (inTime.IsProgressive())
            return inFrame;
        const FrameRef copy = MakeAddressableCopy(inFrame, inParams);
        FrameRef swapped = copy->CreateEmptyFrame(false);
        ThrowIfFailed(VF::VideoFrameManipulators::SwapFields(copy, swapped));
        swapped->SetFieldType(inTime.GetFieldOrder());
        return swapped;
    }
};

} // namespace

QRT::InterfaceRef<IRenderableSource>
FieldReverseSource(const QRT::InterfaceRef<IRenderableSource>& inSource)
{
    return QRT::Allocated<RenderableSourceFieldReverse>::Create<IRenderableSource>(inSource);
}

} // namespace ML
