#include "ML/RenderableSourceFilters.h"
#include "QRT/Allocated.h"
#include "sources/FieldFilterSteps.h"
#include "sources/FilterSourceBase.h"

namespace ML
{

namespace
{

using namespace FieldFilterSteps;

// RenderableSourceReverseFields: reverses the field dominance of a source
// whose field order is labelled wrongly. Every frame time passed upstream has
// its two times swapped (and conformed times come back swapped); pixels are
// never touched. Immutable; called from render and prefetch threads at once.
class RenderableSourceReverseFields : public FilterSourceBase
{
public:
    explicit RenderableSourceReverseFields(const QRT::InterfaceRef<IRenderableSource>& inUpstream)
        : FilterSourceBase(inUpstream, Output::kFieldsAsUpstream)
    {
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams& inParams,
                          MF::FrameTime& outConformed) override
    {
        outConformed = ConformUpstream(mUpstream, inRequested.Swapped(), inParams).Swapped();
    }

private:
    MF::FrameTime UpstreamTime(const MF::FrameTime& inTime, const CutlistRenderParams&) override
    {
        return inTime.Swapped();
    }

    FrameRef Filter(const FrameRef& inFrame, const MF::FrameTime&, const MF::FrameTime&,
                    const CutlistRenderParams&) override
    {
        return inFrame;
    }
};

} // namespace

QRT::InterfaceRef<IRenderableSource>
ReverseFieldDominanceOfSource(const QRT::InterfaceRef<IRenderableSource>& inSource)
{
    return QRT::Allocated<RenderableSourceReverseFields>::Create<IRenderableSource>(inSource);
}

} // namespace ML
