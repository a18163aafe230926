#include "IR/ImageRenderer.h"
#include "IR/PlaneHalve.h"
#include "ML/RenderRequestException.h"
#include "ML/RenderableSourceFilters.h"
#include "QRT/Allocated.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "sources/FieldFilterSteps.h"
#include "sources/FilterSourceBase.h"

#include <array>
#include <utility>

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

// Pictures of this many rows or more use BT.709, smaller ones BT.601 (the
// image renderer's rule for 8-bit Y'CbCr).
constexpr std::int32_t kBT709MinimumRows = 720;

// The sizes (width, height) of the three planes of a 4:2:0 picture.
std::array<std::pair<std::int32_t, std::int32_t>, 3> PlaneSizes(std::int32_t inWidth,
                                                                std::int32_t inHeight)
{
    const std::pair<std::int32_t, std::int32_t> chroma((inWidth + 1) / 2, (inHeight + 1) / 2);
    return {{{inWidth, inHeight}, chroma, chroma}};
}

// A 4:2:0 frame reduced to exactly half its width and height, plane by plane:
// every sample the rounded mean of its 2x2 block, which is what bilinear and
// area sampling (quality 3 and up) give at that size. Empty when the request
// is not that: another format or size, fields, or a lower quality.
FrameRef HalvePlanes(const FrameRef& inFrame, const MF::FrameTime& inTime,
                     const MF::FrameTime& inDelivered, const CutlistRenderParams& inParams)
{
    if (inParams.mPixelFormat != mvxmediatypes::kPixelFormat_YUV_420_8u_Planar ||
        inParams.mQuality < mvxmediatypes::kRenderQuality_Medium || !inTime.IsProgressive() ||
        !inDelivered.IsProgressive())
        return {};
    const QRT::ParamRect bounds = inFrame->GetBounds();
    const auto source = PlaneSizes(bounds.Width(), bounds.Height());
    const auto target = PlaneSizes(static_cast<std::int32_t>(inParams.mWidth),
                                   static_cast<std::int32_t>(inParams.mHeight));
    for (std::size_t plane = 0; plane < 3; ++plane)
        if (source[plane].first != 2 * target[plane].first ||
            source[plane].second != 2 * target[plane].second)
            return {};
    FrameRef halved = CreateFrameForParams(inParams, inFrame);
    halved->SetFieldType(mvxmediatypes::kFieldType_Progressive);
    for (std::uint32_t plane = 0; plane < 3; ++plane)
        ThrowIfFailed(IR_HalvePlane8(
            static_cast<const std::uint8_t*>(inFrame->GetPlaneBaseAddress(plane)),
            inFrame->GetPlaneRowBytes(plane),
            static_cast<std::uint8_t*>(halved->GetWritablePlaneBaseAddress(plane)),
            halved->GetPlaneRowBytes(plane), target[plane].first, target[plane].second));
    return halved;
}

// A 4:2:0 frame as 8-bit BGRA of its own size, its codes read with BT.601
// (inMatrix601) or BT.709.
FrameRef PlanesToBGRA(const FrameRef& inFrame, bool inMatrix601)
{
    const QRT::ParamRect bounds = inFrame->GetBounds();
    FrameRef converted;
    ThrowIfFailed(VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u,
                                       static_cast<std::uint32_t>(bounds.Width()),
                                       static_cast<std::uint32_t>(bounds.Height()),
                                       inFrame->GetPixelAspectRatio(), false, false, converted));
    converted->SetFieldType(inFrame->GetFieldType());
    const auto plane = [&](std::uint32_t inPlane)
    { return static_cast<const std::uint8_t*>(inFrame->GetPlaneBaseAddress(inPlane)); };
    const std::int32_t status = IR_ConvertYUV420Planes(
        plane(0), inFrame->GetPlaneRowBytes(0), plane(1), inFrame->GetPlaneRowBytes(1), plane(2),
        inFrame->GetPlaneRowBytes(2), inMatrix601, converted->GetWritableBaseAddress(),
        converted->GetRowBytes(), kIR_PixelFormat_BGRA_8u, bounds.Width(), bounds.Height());
    if (status != kIR_NoError)
        throw RenderRequestException(VF::kResult_UnsupportedPixelFormat);
    return converted;
}

// RenderableSourceScaler: delivers the upstream frame at exactly the
// requested size and pixel aspect ratio. Interlaced material is scaled field
// by field so no row of one instant lands in a row of the other; a
// progressive request reducing interlaced material takes the single field
// nearest to the requested time. Frames that already fit pass unchanged. A
// request for 4:2:0 of a 4:2:0 frame at exactly half its size halves the
// planes (then converted to 8-bit BGRA when the two sizes read Y'CbCr with
// different matrices); any other 4:2:0 frame is scaled in 8-bit BGRA
// (converted at its own size first). BGRA answers to a request for 4:2:0 are
// for the consumer to convert.
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
        if (inFrame->GetPixelFormat() != mvxmediatypes::kPixelFormat_YUV_420_8u_Planar ||
            Fits(*inFrame, inTime, inDelivered, inParams))
            return Scale(inFrame, inTime, inDelivered, inParams);
        const bool sourceMatrix601 = inFrame->GetBounds().Height() < kBT709MinimumRows;
        if (FrameRef halved = HalvePlanes(inFrame, inTime, inDelivered, inParams))
        {
            // The halved planes hold the source's codes. A picture on the other
            // side of the matrix's row limit would read them with the other
            // matrix: it gets them as BGRA, converted with the source's.
            const bool targetMatrix601 = inParams.mHeight < kBT709MinimumRows;
            return targetMatrix601 == sourceMatrix601 ? halved
                                                      : PlanesToBGRA(halved, sourceMatrix601);
        }
        CutlistRenderParams params = inParams;
        params.mPixelFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
        return Scale(PlanesToBGRA(inFrame, sourceMatrix601), inTime, inDelivered, params);
    }

    // inFrame (not planar) at the requested size and pixel aspect ratio.
    static FrameRef Scale(const FrameRef& inFrame, const MF::FrameTime& inTime,
                          const MF::FrameTime& inDelivered, const CutlistRenderParams& inParams)
    {
        const std::uint32_t targetHeight = TargetHeight(inTime, inDelivered, inParams);

        if (Fits(*inFrame, inTime, inDelivered, inParams))
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

    static std::uint32_t TargetHeight(const MF::FrameTime& inTime, const MF::FrameTime& inDelivered,
                                      const CutlistRenderParams& inParams)
    {
        // Two fields of equal height need an even number of rows.
        if (inTime.IsInterlaced() && inDelivered.IsInterlaced() && inParams.mHeight % 2 != 0)
            return inParams.mHeight + 1;
        return inParams.mHeight;
    }

    // Whether inFrame already is the output: the target size and pixel aspect
    // ratio, and progressive or in the requested field order.
    static bool Fits(const MF::IVideoFrame& inFrame, const MF::FrameTime& inTime,
                     const MF::FrameTime& inDelivered, const CutlistRenderParams& inParams)
    {
        const QRT::ParamRect target(
            0, 0, static_cast<std::int32_t>(inParams.mWidth),
            static_cast<std::int32_t>(TargetHeight(inTime, inDelivered, inParams)));
        return inFrame.GetBounds() == target &&
               inFrame.GetPixelAspectRatio() == inParams.mPixelAspectRatio &&
               (inDelivered.IsProgressive() ||
                inDelivered.GetFieldOrder() == inTime.GetFieldOrder());
    }
};

} // namespace

QRT::InterfaceRef<IRenderableSource>
ScaleAndPARCorrectSource(const QRT::InterfaceRef<IRenderableSource>& inSource)
{
    return QRT::Allocated<RenderableSourceScaler>::Create<IRenderableSource>(inSource);
}

} // namespace ML
