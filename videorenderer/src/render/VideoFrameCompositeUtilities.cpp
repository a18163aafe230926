#include "render/VideoFrameCompositeUtilities.h"

#include "IR/ImageRenderer.h"
#include "ML/CutlistRenderer.h"
#include "ML/RenderStatus.h"
#include "QRT/Param.h"
#include "VF/PixelFormatConversions.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "mvxcore/debug/Contract.h"
#include "render/FramePixels.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <vector>

namespace ML
{
namespace
{

using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;
using mvxmediatypes::PixelFormat;

// The quality of plain offset composites: bilinear, in the buffers' encoding.
constexpr std::int32_t kOffsetCompositeQuality = 4;

mvxmediatypes::RenderQuality QualityOf(std::uint32_t inQuality)
{
    return static_cast<mvxmediatypes::RenderQuality>(inQuality);
}

// True when the image renderer can draw in frames of inFormat (the BGRA layout).
bool IsDrawableFormat(IR_PixelFormat inFormat)
{
    return IR_IsValidPixelFormat(inFormat) &&
           (inFormat & kIR_FormatMask_Layout) == kIR_FormatLayout_BGRA;
}

// The alpha kind a new frame of inFormat starts with.
mvxmediatypes::AlphaChannel NewFrameAlpha(PixelFormat inFormat)
{
    return (VF::BEPixelFormatToIRPixelFormat(inFormat) & kIR_FormatBit_PremultipliedAlpha) != 0
               ? mvxmediatypes::kAlphaChannel_Premultiplied
               : mvxmediatypes::kAlphaChannel_Straight;
}

bool FrameAlreadyConformsToOutput(const FrameRef& inFrame, const CutlistRenderParams& inParams)
{
    return CutlistRenderer::FrameAlreadyConformsToOutput(inFrame, inParams);
}

IR_PixelFormat ReadFormatOf(const MF::IVideoFrame& inFrame)
{
    return GetImageRendererFormat(inFrame.GetPixelFormat(), inFrame.GetAlphaChannel());
}

// inFrame itself when the image renderer reads it as a frame of inFormat with
// alpha kind inAlpha; otherwise a converted copy of its size (empty when the
// copy cannot be made).
FrameRef ReadableAs(const FrameRef& inFrame, PixelFormat inFormat,
                    mvxmediatypes::AlphaChannel inAlpha, std::uint32_t inQuality)
{
    if (inFrame->GetPixelFormat() == inFormat &&
        ReadFormatOf(*inFrame) == GetImageRendererFormat(inFormat, inAlpha))
        return inFrame;
    const QRT::ParamRect bounds = inFrame->GetBounds();
    FrameRef copy = VF::CreateVideoFrame(inFormat, static_cast<std::uint32_t>(bounds.Width()),
                                         static_cast<std::uint32_t>(bounds.Height()),
                                         inFrame->GetPixelAspectRatio(), false, false);
    if (!copy)
        return {};
    copy->SetAlphaChannel(inAlpha);
    copy->SetFieldType(inFrame->GetFieldType());
    if (inFrame->HasFullFrame(0))
        copy->SetFullFrameRect(inFrame->GetFullFrameRect());
    if (QRT::Failed(ConvertFramePixels(inFrame, copy, inQuality)))
        return {};
    return copy;
}

// A layer or lower frame made ready for drawing in the compositing format.
FrameRef PrepareForDrawing(const FrameRef& inFrame, const CutlistRenderParams& inParams)
{
    const PixelFormat format = GetCompositingFormat(inParams);
    FrameRef prepared;
    if (inParams.mQuality >= static_cast<std::uint32_t>(mvxmediatypes::kRenderQuality_Max))
        prepared = CutlistRenderer::ConformFrameToOutput(inFrame, inParams, format, {format});
    else if (CutlistRenderer::UseRequestedSize(inFrame, inParams))
    {
        prepared = VF::CreateVideoFrame(format, inParams.mWidth, inParams.mHeight,
                                        inParams.mPixelAspectRatio, false, false);
        if (!prepared)
            return {};
        prepared->SetFieldType(inFrame->GetFieldType());
        if (QRT::Failed(ConvertFramePixels(inFrame, prepared, inParams.mQuality)))
            return {};
    }
    else
        prepared = VF::VideoFrameManipulators::MakeAddressableVideoFrame(
            inFrame, format, QualityOf(inParams.mQuality));
    return prepared ? ReadableAs(prepared, format, NewFrameAlpha(format), inParams.mQuality)
                    : FrameRef();
}

// The part of the destination that inRect of the source covers through
// inMatrix: the bounding box of its four corners.
QRT::ParamRect MapRect(const QRT::ParamRect& inRect, const IR_AffineMatrix& inMatrix)
{
    double left = INFINITY, top = INFINITY, right = -INFINITY, bottom = -INFINITY;
    for (const double x : {double(inRect.mLeft), double(inRect.mRight)})
        for (const double y : {double(inRect.mTop), double(inRect.mBottom)})
        {
            const double mappedX = inMatrix.a * x + inMatrix.c * y + inMatrix.tx;
            const double mappedY = inMatrix.b * x + inMatrix.d * y + inMatrix.ty;
            left = std::min(left, mappedX);
            right = std::max(right, mappedX);
            top = std::min(top, mappedY);
            bottom = std::max(bottom, mappedY);
        }
    // Clamped before the conversion: the rectangle is clipped to the frame anyway.
    const auto edge = [](double inValue)
    { return static_cast<std::int32_t>(std::clamp(inValue, -1.0e9, 1.0e9)); };
    return QRT::ParamRect(edge(std::floor(left)), edge(std::floor(top)), edge(std::ceil(right)),
                          edge(std::ceil(bottom)));
}

// One drawing pass of inUpper onto inDestination with inRecord over the rows
// of inFieldSelector. The destination's visible content grows by the
// layer's (inUpperContent, in the upper frame's coordinates).
QRT::Result DrawPass(const MF::IVideoFrame& inUpper, const QRT::ParamRect& inUpperContent,
                     MF::IVideoFrame& ioDestination, const MotionRecord& inRecord,
                     std::int32_t inFieldSelector, bool inHasLowerFrame, std::uint32_t inQuality)
{
    const VF::IRFrameBuffer source = VF::GetIRFrameBuffer(inUpper);
    const VF::IRWritableFrameBuffer destination = VF::GetWritableIRFrameBuffer(ioDestination);
    const IR_PixelFormat sourceFormat = ReadFormatOf(inUpper);
    const IR_PixelFormat destinationFormat = ReadFormatOf(ioDestination);
    IR_AffineMatrix matrix;
    IR_BuildMotionMatrix(ToMotionGeometry(inRecord), source.mWidth, source.mHeight,
                         destination.mWidth, destination.mHeight, &matrix);
    const auto quality = static_cast<std::int32_t>(inQuality);
    const QRT::Result status =
        !inHasLowerFrame || inRecord.mBlendMode == kIR_BlendMode_Normal
            ? IR_Motion(source.mBase, source.mRowBytes, sourceFormat, source.mWidth, source.mHeight,
                        destination.mBase, destination.mRowBytes, destinationFormat,
                        destination.mWidth, destination.mHeight, &matrix, inRecord.mOpacity,
                        quality, inFieldSelector, inHasLowerFrame)
            : IR_MotionWithBlendMode(source.mBase, source.mRowBytes, sourceFormat, source.mWidth,
                                     source.mHeight, destination.mBase, destination.mRowBytes,
                                     destinationFormat, destination.mWidth, destination.mHeight,
                                     &matrix, inRecord.mOpacity, quality, inFieldSelector,
                                     inHasLowerFrame, inRecord.mBlendMode);
    ioDestination.AlphaChanged();
    if (QRT::Succeeded(status))
        ioDestination.GrowVisibleContentRect(MapRect(inUpperContent, matrix));
    return status;
}

} // namespace

PixelFormat GetCompositingFormat(const CutlistRenderParams& inParams)
{
    if (inParams.mQuality >= static_cast<std::uint32_t>(mvxmediatypes::kRenderQuality_Max))
        return mvxmediatypes::kPixelFormat_BGRP_4444_32f_Linear;
    if (IsDrawableFormat(VF::BEPixelFormatToIRPixelFormat(inParams.mPixelFormat)))
        return inParams.mPixelFormat;
    return mvxmediatypes::kPixelFormat_BGRA_4444_32f;
}

FrameRef CompositeLayer(const FrameRef& inFrame, const MotionRecord& inFirstFieldMotion,
                        const MotionRecord& inSecondFieldMotion, const FrameRef& inLowerFrame,
                        const CutlistRenderParams& inRenderParams)
{
    MVX_INPUT_CONTRACT(inFrame);
    MVX_INPUT_CONTRACT(!inLowerFrame || FrameAlreadyConformsToOutput(inLowerFrame, inRenderParams));
    // A layer that holds nothing leaves the picture below as it is; it is
    // tested before any conversion so that it costs nothing.
    const QRT::ParamRect content = inFrame->GetVisibleContentRect();
    const bool nothingDrawn =
        content.mLeft == 0 && content.mTop == 0 && content.mRight == 0 && content.mBottom == 0;
    if (inLowerFrame && nothingDrawn)
        return inLowerFrame;

    const FrameRef upper = PrepareForDrawing(inFrame, inRenderParams);
    if (!upper)
        return {};
    // A conversion to another size draws the whole converted frame.
    const QRT::ParamRect upperContent =
        upper->GetBounds() == inFrame->GetBounds() ? content : upper->GetBounds();
    const FrameRef lower =
        inLowerFrame ? PrepareForDrawing(inLowerFrame, inRenderParams) : FrameRef();
    if (inLowerFrame && !lower)
        return {};

    FrameRef destination;
    if (lower && !lower->IsShared())
        destination = lower;
    else
    {
        const bool fresh = !lower;
        destination = VF::CreateVideoFrame(GetCompositingFormat(inRenderParams),
                                           inRenderParams.mWidth, inRenderParams.mHeight,
                                           inRenderParams.mPixelAspectRatio, fresh, fresh);
        if (!destination)
            return {};
        const bool oneFieldOfProgressive =
            !mvxmediatypes::IsInterlaced(upper->GetFieldType()) &&
            inRenderParams.mSingleField != 0 &&
            inRenderParams.mQuality <
                static_cast<std::uint32_t>(mvxmediatypes::kRenderQuality_Medium);
        destination->SetFieldType(oneFieldOfProgressive ? mvxmediatypes::kFieldType_Progressive
                                                        : static_cast<mvxmediatypes::FieldType>(
                                                              inRenderParams.mFieldType));
        if (lower && QRT::Failed(VF::VideoFrameManipulators::CopyFrame(
                         lower, destination, QualityOf(inRenderParams.mQuality))))
            return {};
    }

    const bool hasLower = lower != nullptr;
    // Without a lower frame the blend mode does not matter: equal geometry and
    // opacity draw both fields at once.
    const bool onePass = SameMotion(inFirstFieldMotion, inSecondFieldMotion) ||
                         (!hasLower && SameGeometry(inFirstFieldMotion, inSecondFieldMotion) &&
                          inFirstFieldMotion.mOpacity == inSecondFieldMotion.mOpacity);
    const auto pass = [&](const MotionRecord& inRecord, std::int32_t inField)
    {
        return QRT::Succeeded(DrawPass(*upper, upperContent, *destination, inRecord, inField,
                                       hasLower, inRenderParams.mQuality));
    };
    if (onePass)
        return pass(inFirstFieldMotion, kIR_Field_All) ? destination : FrameRef();
    // Two fields drawn apart make an interlaced picture, also in a lower frame
    // that was progressive.
    destination->SetFieldType(static_cast<mvxmediatypes::FieldType>(inRenderParams.mFieldType));
    return pass(inFirstFieldMotion, kIR_Field_First) && pass(inSecondFieldMotion, kIR_Field_Second)
               ? destination
               : FrameRef();
}

FrameRef ApplyMotion(const FrameRef& inFrame, const MotionRecord& inFirstFieldMotion,
                     const MotionRecord& inSecondFieldMotion,
                     const CutlistRenderParams& inRenderParams)
{
    if (SameGeometry(inFirstFieldMotion, inSecondFieldMotion) &&
        SameGeometry(inFirstFieldMotion, kIdentityMotionRecord) &&
        FrameAlreadyConformsToOutput(inFrame, inRenderParams))
        return inFrame;
    MotionRecord first = inFirstFieldMotion;
    MotionRecord second = inSecondFieldMotion;
    for (MotionRecord* record : {&first, &second})
    {
        record->mBlendMode = kIR_BlendMode_Normal;
        record->mOpacity = 1.0f;
    }
    return CompositeLayer(inFrame, first, second, {}, inRenderParams);
}

QRT::Result CompositeFrameAtOffset(const FrameRef& inSourceFrame,
                                   const FrameRef& inDestinationFrame, std::int32_t inX,
                                   std::int32_t inY)
{
    MVX_INPUT_CONTRACT(inSourceFrame != NULL);
    MVX_INPUT_CONTRACT(inDestinationFrame != NULL);
    // A destination the image renderer cannot composite in is worked on in a
    // float copy and converted back.
    const bool staged = !IsDrawableFormat(ReadFormatOf(*inDestinationFrame));
    const FrameRef work =
        staged ? ReadableAs(inDestinationFrame, mvxmediatypes::kPixelFormat_BGRA_4444_32f,
                            mvxmediatypes::kAlphaChannel_Straight, kOffsetCompositeQuality)
               : inDestinationFrame;
    if (!work)
        return kResult_RenderFailed;
    const FrameRef source = ReadableAs(inSourceFrame, work->GetPixelFormat(),
                                       work->GetAlphaChannel(), kOffsetCompositeQuality);
    if (!source)
        return kResult_RenderFailed;

    const QRT::ParamRect sourceBounds = source->GetBounds();
    const QRT::ParamRect bounds = work->GetBounds();
    const std::int64_t left = std::max<std::int64_t>(0, inX);
    const std::int64_t top = std::max<std::int64_t>(0, inY);
    const std::int64_t right =
        std::min<std::int64_t>(bounds.Width(), std::int64_t(inX) + sourceBounds.Width());
    const std::int64_t bottom =
        std::min<std::int64_t>(bounds.Height(), std::int64_t(inY) + sourceBounds.Height());
    QRT::Result status = QRT::kResult_Success;
    if (left < right && top < bottom)
    {
        const IR_PixelFormat format = ReadFormatOf(*work);
        const std::int64_t pixelBytes = IR_MinimumRowBytes(format, 1);
        const auto* sourceBase = static_cast<const std::byte*>(source->GetBaseAddress()) +
                                 (top - inY) * source->GetRowBytes() + (left - inX) * pixelBytes;
        auto* destinationBase = static_cast<std::byte*>(work->GetWritableBaseAddress()) +
                                top * work->GetRowBytes() + left * pixelBytes;
        status =
            IR_Composite(sourceBase, source->GetRowBytes(), destinationBase, work->GetRowBytes(),
                         format, static_cast<std::int32_t>(right - left),
                         static_cast<std::int32_t>(bottom - top), 1.0f, kOffsetCompositeQuality);
        work->AlphaChanged();
    }
    if (QRT::Succeeded(status) && staged)
        status = VF::VideoFrameManipulators::CopyFrame(work, inDestinationFrame,
                                                       QualityOf(kOffsetCompositeQuality));
    inDestinationFrame->AlphaChanged();
    const QRT::ParamRect content = inSourceFrame->GetVisibleContentRect();
    if (QRT::Succeeded(status) && !content.IsEmpty())
        inDestinationFrame->GrowVisibleContentRect(QRT::ParamRect(
            content.mLeft + inX, content.mTop + inY, content.mRight + inX, content.mBottom + inY));
    return status;
}

} // namespace ML
