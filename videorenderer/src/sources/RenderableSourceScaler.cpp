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

// The field of the interlaced frame time inTime nearest to inTarget: 0 for a
// progressive frame time; 1 or 2 by distance; on a tie the field before
// inTarget.
std::int32_t NearestField(const MF::FrameTime& inTime, mvxmediatypes::TickTime inTarget)
{
    if (inTime.IsProgressive())
        return 0;
    const auto distance = [inTarget](mvxmediatypes::TickTime inField)
    {
        const std::int64_t ticks = (inField - inTarget).GetTicks();
        return ticks < 0 ? -ticks : ticks;
    };
    const std::int64_t first = distance(inTime.GetFirstFieldTime());
    const std::int64_t second = distance(inTime.GetSecondFieldTime());
    if (first != second)
        return first > second ? kSecondSlot : kFirstSlot;
    return inTime.GetSecondFieldTime() < inTarget ? kSecondSlot : kFirstSlot;
}

// RenderableSourceScaler: delivers the upstream frame at exactly the
// requested size and pixel aspect ratio. Interlaced material is scaled field
// by field so no row of one instant lands in a row of the other; a
// progressive request reducing interlaced material takes the single field
// nearest to the requested time. Frames that already fit pass unchanged.
// Immutable; called from render and prefetch threads at once.
class RenderableSourceScaler : public QRT::Implements<IRenderableSource>
{
public:
    explicit RenderableSourceScaler(const QRT::InterfaceRef<IRenderableSource>& inUpstream)
        : mUpstream(inUpstream)
    {
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams& inParams,
                          MF::FrameTime& outConformed) override
    {
        const MF::FrameTime delivered = ConformUpstream(mUpstream, inRequested, inParams);
        outConformed = delivered;
        if (!(inParams.mVerticalScale < 1.0))
            return;
        if (inRequested.IsInterlaced() && delivered.IsInterlaced())
        {
            if (inRequested.GetFieldOrder() != delivered.GetFieldOrder())
                outConformed = delivered.Swapped();
            return;
        }
        if (inRequested.IsInterlaced() || delivered.IsProgressive())
            return;
        const std::int32_t field = NearestField(delivered, inRequested.GetTime());
        outConformed = MF::FrameTime(delivered.GetFieldTime(field));
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
        const MF::FrameTime delivered = ConformUpstream(mUpstream, inTime, inParams);
        FrameRef frame = RenderUpstream(mUpstream, delivered, inParams);
        if (!frame)
            return;

        std::uint32_t targetHeight = inParams.mHeight;
        // Two fields of equal height need an even number of rows.
        if (inTime.IsInterlaced() && delivered.IsInterlaced() && targetHeight % 2 != 0)
            ++targetHeight;

        const QRT::ParamRect target(0, 0, static_cast<std::int32_t>(inParams.mWidth),
                                    static_cast<std::int32_t>(targetHeight));
        if (frame->GetBounds() == target &&
            frame->GetPixelAspectRatio() == inParams.mPixelAspectRatio &&
            (delivered.IsProgressive() || delivered.GetFieldOrder() == inTime.GetFieldOrder()))
        {
            outFrame = frame;
            return;
        }
        // Draft renders keep a full-frame rendering whole; the consumer
        // reduces it together with the rest of the layer.
        if (inParams.mQuality < mvxmediatypes::kRenderQuality_Medium &&
            IsFullFrameRendering(*frame, inParams) && delivered == inTime)
        {
            outFrame = frame;
            return;
        }

        CutlistRenderParams params = inParams;
        params.mHeight = targetHeight;
        FrameRef scaled = CreateFrameForParams(params, frame);
        scaled->SetFieldType(inTime.GetFieldOrder());
        std::int32_t selection = delivered.GetFieldOrder();
        if (inTime.IsProgressive() && delivered.IsInterlaced())
        {
            // CopyFrameWithFields counts fields by time (1 the earlier one):
            // translate the nearest slot into that numbering.
            const std::int32_t slot = NearestField(delivered, inTime.GetSecondFieldTime());
            const bool slotIsEarlier = delivered.GetFieldTime(slot) == delivered.GetTime();
            selection = slotIsEarlier ? VF::kFieldSelection_First : VF::kFieldSelection_Second;
        }
        const QRT::Result status = VF::VideoFrameManipulators::CopyFrameWithFields(
            frame, scaled, static_cast<mvxmediatypes::RenderQuality>(inParams.mQuality), selection);
        if (status < 0)
            return;
        outFrame = scaled;
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
ScaleAndPARCorrectSource(const QRT::InterfaceRef<IRenderableSource>& inSource)
{
    return QRT::Allocated<RenderableSourceScaler>::Create<IRenderableSource>(inSource);
}

} // namespace ML
