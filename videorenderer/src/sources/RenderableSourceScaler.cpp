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
class RenderableSourceScaler : public FilterSourceBase
{
public:
    explicit RenderableSourceScaler(const QRT::InterfaceRef<IRenderableSource>& inUpstream)
        : FilterSourceBase(inUpstream, Output::kFieldsAsUpstream)
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

private:
    FrameRef Filter(const FrameRef& inFrame, const MF::FrameTime& inTime,
                    const MF::FrameTime& inDelivered, const CutlistRenderParams& inParams) override
    {
        std::uint32_t targetHeight = inParams.mHeight;
        // Two fields of equal height need an even number of rows.
        if (inTime.IsInterlaced() && inDelivered.IsInterlaced() && targetHeight % 2 != 0)
            ++targetHeight;

        const QRT::ParamRect target(0, 0, static_cast<std::int32_t>(inParams.mWidth),
                                    static_cast<std::int32_t>(targetHeight));
        if (inFrame->GetBounds() == target &&
            inFrame->GetPixelAspectRatio() == inParams.mPixelAspectRatio &&
            (inDelivered.IsProgressive() || inDelivered.GetFieldOrder() == inTime.GetFieldOrder()))
            return inFrame;
        // Draft renders keep a full-frame rendering whole; the consumer
        // reduces it together with the rest of the layer.
        if (inParams.mQuality < mvxmediatypes::kRenderQuality_Medium &&
            IsFullFrameRendering(*inFrame, inParams) && inDelivered == inTime)
            return inFrame;

        CutlistRenderParams params = inParams;
        params.mHeight = targetHeight;
        FrameRef scaled = CreateFrameForParams(params, inFrame);
        scaled->SetFieldType(inTime.GetFieldOrder());
        std::int32_t selection = inDelivered.GetFieldOrder();
        if (inTime.IsProgressive() && inDelivered.IsInterlaced())
        {
            // CopyFrameWithFields counts fields by time (1 the earlier one):
            // translate the nearest slot into that numbering.
            const std::int32_t slot = NearestField(inDelivered, inTime.GetSecondFieldTime());
            const bool slotIsEarlier = inDelivered.GetFieldTime(slot) == inDelivered.GetTime();
            selection = slotIsEarlier ? VF::kFieldSelection_First : VF::kFieldSelection_Second;
        }
        const QRT::Result status = VF::VideoFrameManipulators::CopyFrameWithFields(
            inFrame, scaled, static_cast<mvxmediatypes::RenderQuality>(inParams.mQuality),
            selection);
        if (status < 0)
            return {};
        return scaled;
    }
};

} // namespace

QRT::InterfaceRef<IRenderableSource>
ScaleAndPARCorrectSource(const QRT::InterfaceRef<IRenderableSource>& inSource)
{
    return QRT::Allocated<RenderableSourceScaler>::Create<IRenderableSource>(inSource);
}

} // namespace ML
