#include "ML/RenderableSourceFilters.h"
#include "QRT/Allocated.h"
#include "QRT/QRTUnknown.h"
#include "sources/FieldFilterSteps.h"

namespace ML
{

namespace
{

using namespace FieldFilterSteps;

// RenderableSourceReverseFields: reverses the field dominance of a source
// whose field order is labelled wrongly. Every frame time passed upstream has
// its two times swapped (and conformed times come back swapped); pixels are
// never touched. Immutable; called from render and prefetch threads at once.
class RenderableSourceReverseFields : public QRT::Implements<IRenderableSource>
{
public:
    explicit RenderableSourceReverseFields(const QRT::InterfaceRef<IRenderableSource>& inUpstream)
        : mUpstream(inUpstream)
    {
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams& inParams,
                          MF::FrameTime& outConformed) override
    {
        outConformed = ConformUpstream(mUpstream, inRequested.Swapped(), inParams).Swapped();
    }

    void CollectPrefetches(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                           RenderableNodePrefetchList& ioPrefetches) override
    {
        mUpstream->CollectPrefetches(inTime.Swapped(), inParams, ioPrefetches);
    }

    void RenderFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                     QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override
    {
        outFrame = nullptr;
        outFrame = RenderUpstream(mUpstream, inTime.Swapped(), inParams);
    }

    void GetFrameRate(mvxmediatypes::FrameRate& outRate) override
    {
        mUpstream->GetFrameRate(outRate);
    }

    void GetFieldRate(mvxmediatypes::FrameRate& outRate) override
    {
        mUpstream->GetFieldRate(outRate);
    }

private:
    const QRT::InterfaceRef<IRenderableSource> mUpstream;
};

} // namespace

QRT::InterfaceRef<IRenderableSource>
ReverseFieldDominanceOfSource(const QRT::InterfaceRef<IRenderableSource>& inSource)
{
    return QRT::Allocated<RenderableSourceReverseFields>::Create<IRenderableSource>(inSource);
}

} // namespace ML
