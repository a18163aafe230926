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

// RenderableSourceFieldReverse: reverses the field order of the picture. It
// asks upstream for the frame at the swapped frame time and exchanges the
// two fields of the frame it gets, so each field lands in the slot whose time
// the caller asked for. Progressive requests pass through untouched.
// Immutable; called from render and prefetch threads at once.
class RenderableSourceFieldReverse : public QRT::Implements<IRenderableSource>
{
public:
    explicit RenderableSourceFieldReverse(const QRT::InterfaceRef<IRenderableSource>& inUpstream)
        : mUpstream(inUpstream)
    {
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams& inParams,
                          MF::FrameTime& outConformed) override
    {
        outConformed = ConformUpstream(mUpstream, inRequested, inParams).Swapped();
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
        FrameRef frame = RenderUpstream(mUpstream, inTime.Swapped(), inParams);
        if (!frame || inTime.IsProgressive())
        {
            outFrame = frame;
            return;
        }
        const FrameRef copy = MakeAddressableCopy(frame, inParams);
        FrameRef swapped = copy->CreateEmptyFrame(false);
        ThrowIfFailed(VF::VideoFrameManipulators::SwapFields(copy, swapped));
        swapped->SetFieldType(inTime.GetFieldOrder());
        outFrame = swapped;
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
FieldReverseSource(const QRT::InterfaceRef<IRenderableSource>& inSource)
{
    return QRT::Allocated<RenderableSourceFieldReverse>::Create<IRenderableSource>(inSource);
}

} // namespace ML
