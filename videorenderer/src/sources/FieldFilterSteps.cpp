#include "sources/FieldFilterSteps.h"

#include "IR/ImageRenderer.h"
#include "ML/RenderRequestException.h"
#include "VF/PixelFormatConversions.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <cstring>

namespace ML::FieldFilterSteps
{

namespace
{

using mvxmediatypes::PixelFormat;
using mvxmediatypes::RenderQuality;

RenderQuality QualityOf(std::uint32_t inQuality)
{
    return static_cast<RenderQuality>(inQuality);
}

// The layout values (bits 14 to 17 of the properties word) of the
// pixel-pair formats whose full frame is stored at half width.
bool IsHalfWidthLayout(std::uint32_t inProperties)
{
    const std::uint32_t layout = inProperties & mvxmediatypes::kPixelProperty_LayoutMask;
    return layout == 0x24000 || layout == 0x28000 || layout == 0x2C000 || layout == 0x30000;
}

// The format in which pixels of inFormat are worked on by the image renderer:
// the format itself when the image renderer addresses it, else the nearest
// one it does (interleaved 4:2:2 for formats storing fields apart, so that
// the copy there and back is a reordering of rows).
PixelFormat StagingFormatFor(PixelFormat inFormat)
{
    if (VF::BEPixelFormatToIRPixelFormat(inFormat) != VF::kIR_PixelFormat_Invalid)
        return inFormat;
    if (inFormat.IsYUV() && inFormat.GetChroma() != mvxmediatypes::kPixelChroma_444 &&
        !inFormat.IsFloat() && inFormat.GetBitDepth() == 8)
        return mvxmediatypes::kPixelFormat_YUYV_422_8u;
    if (inFormat.IsYUV() && !inFormat.IsFloat() && inFormat.GetBitDepth() == 8)
        return mvxmediatypes::kPixelFormat_VUYA_4444_8u;
    return mvxmediatypes::kPixelFormat_BGRA_4444_32f;
}

// inFrame in a format the image renderer addresses (itself when it already is).
FrameRef ToStaging(const FrameRef& inFrame, RenderQuality inQuality)
{
    const PixelFormat staging = StagingFormatFor(inFrame->GetPixelFormat());
    if (staging == inFrame->GetPixelFormat())
        return inFrame;
    FrameRef copy =
        VF::VideoFrameManipulators::MakeAddressableVideoFrame(inFrame, staging, inQuality);
    if (!copy)
        throw RenderRequestException(VF::kResult_UnsupportedPixelFormat);
    return copy;
}

// Number of picture rows of field inField (1 or 2) in a frame of inHeight rows.
std::int32_t FieldRows(std::int32_t inHeight, std::int32_t inField)
{
    return inField == kFirstSlot ? (inHeight + 1) / 2 : inHeight / 2;
}

// The memory row where field inField starts. Picture row r of a bottom-left
// buffer is memory row height - 1 - r, which exchanges the field offsets of
// an even-height frame.
std::int32_t FieldStartRow(IR_PixelFormat inFormat, std::int32_t inHeight, std::int32_t inField)
{
    if (IR_IsOriginBottomLeft(inFormat))
        return (inHeight - inField) % 2;
    return inField - 1;
}

// Copies one field between two buffers of one staging format.
QRT::Result CopyFieldBetweenBuffers(const VF::IRFrameBuffer& inSource, std::int32_t inSourceField,
                                    const VF::IRWritableFrameBuffer& inDestination,
                                    std::int32_t inSlot, RenderQuality inQuality)
{
    // A single-row frame has no second field: its only row stands for both.
    if (FieldRows(inSource.mHeight, inSourceField) == 0)
        inSourceField = kFirstSlot;
    const std::int32_t sourceRows = FieldRows(inSource.mHeight, inSourceField);
    const std::int32_t destinationRows = FieldRows(inDestination.mHeight, inSlot);
    if (destinationRows == 0)
        return QRT::kResult_Success;

    const auto* source = static_cast<const std::uint8_t*>(inSource.mBase) +
                         static_cast<std::ptrdiff_t>(
                             FieldStartRow(inSource.mFormat, inSource.mHeight, inSourceField)) *
                             inSource.mRowBytes;
    auto* destination = static_cast<std::uint8_t*>(inDestination.mBase) +
                        static_cast<std::ptrdiff_t>(
                            FieldStartRow(inDestination.mFormat, inDestination.mHeight, inSlot)) *
                            inDestination.mRowBytes;
    const std::int32_t sourcePitch = inSource.mRowBytes * 2;
    const std::int32_t destinationPitch = inDestination.mRowBytes * 2;

    // Fields of equal size are copied row by row: exact, whatever the alpha.
    if (inSource.mFormat == inDestination.mFormat && inSource.mWidth == inDestination.mWidth &&
        sourceRows == destinationRows)
    {
        const auto rowBytes =
            static_cast<std::size_t>(IR_MinimumRowBytes(inSource.mFormat, inSource.mWidth));
        for (std::int32_t row = 0; row < sourceRows; ++row)
            std::memcpy(destination + static_cast<std::ptrdiff_t>(row) * destinationPitch,
                        source + static_cast<std::ptrdiff_t>(row) * sourcePitch, rowBytes);
        return QRT::kResult_Success;
    }
    return IR_ScaleConvert(source, sourcePitch, inSource.mFormat, inSource.mWidth, sourceRows,
                           destination, destinationPitch, inDestination.mFormat,
                           inDestination.mWidth, destinationRows,
                           static_cast<std::int32_t>(inQuality));
}

// inResult in the format and attributes of inTarget: inResult itself when the
// formats agree, else inTarget filled with its converted pixels.
FrameRef FromStaging(const FrameRef& inResult, const FrameRef& inTarget, RenderQuality inQuality)
{
    if (inResult == inTarget)
        return inTarget;
    ThrowIfFailed(VF::VideoFrameManipulators::CopyFrame(inResult, inTarget, inQuality));
    return inTarget;
}

// A writeable frame of the same format as inFrame in the staging format (a
// staging copy when inFrame's format is not addressable). inFrame must be
// writeable itself.
FrameRef WritableStaging(const FrameRef& inFrame, RenderQuality inQuality)
{
    FrameRef staging = ToStaging(inFrame, inQuality);
    if (staging == inFrame)
        return inFrame;
    return VF::MakeWriteableVideoFrame(staging, inQuality);
}

// Whether the kept field is memory rows 1, 3, 5, ... (the image renderer's second field)
// when the picture's field inKeepSecond is kept: a bottom-left buffer of even height
// exchanges the two.
bool KeepsSecondRows(IR_PixelFormat inFormat, std::int32_t inHeight, bool inKeepSecond)
{
    return inKeepSecond != (IR_IsOriginBottomLeft(inFormat) && inHeight % 2 == 0);
}

// A new frame like the shared frame inFrame (of a format the image renderer addresses)
// holding only the rows of its kept field, as the writeable copy that deinterlacing
// rebuilds the other rows of: the rows it would overwrite are not copied.
FrameRef CopyKeptField(const FrameRef& inFrame, bool inKeepSecond)
{
    FrameRef copy = inFrame->CreateEmptyFrame(false);
    MVX_OUTPUT_CONTRACT(copy != nullptr);
    const VF::IRFrameBuffer in = VF::GetIRFrameBuffer(*inFrame);
    const VF::IRWritableFrameBuffer out = VF::GetWritableIRFrameBuffer(*copy);
    const auto bytes = static_cast<std::size_t>(IR_MinimumRowBytes(in.mFormat, in.mWidth));
    // A single row is kept whichever field is asked for (it has no neighbour to rebuild from).
    const std::int32_t first =
        in.mHeight < 2 ? 0 : (KeepsSecondRows(in.mFormat, in.mHeight, inKeepSecond) ? 1 : 0);
    const std::int32_t step = in.mHeight < 2 ? 1 : 2;
    const bool bottomLeft = IR_IsOriginBottomLeft(in.mFormat);
    for (std::int32_t y = first; y < in.mHeight; y += step)
    {
        const std::int32_t row = bottomLeft ? in.mHeight - 1 - y : y;
        std::memcpy(static_cast<std::uint8_t*>(out.mBase) + std::ptrdiff_t{row} * out.mRowBytes,
                    static_cast<const std::uint8_t*>(in.mBase) + std::ptrdiff_t{row} * in.mRowBytes,
                    bytes);
    }
    if (inFrame->TracksVisibleContent())
        copy->SetVisibleContentRect(inFrame->GetVisibleContentRect());
    copy->SetRenderTime(inFrame->GetRenderTime());
    return copy;
}

} // namespace

void ThrowIfFailed(QRT::Result inStatus)
{
    if (inStatus < 0)
        throw RenderRequestException(inStatus);
}

MF::FrameTime ConformUpstream(const QRT::InterfaceRef<IRenderableSource>& inUpstream,
                              const MF::FrameTime& inRequested, const CutlistRenderParams& inParams)
{
    MF::FrameTime conformed;
    inUpstream->ConformFrameTime(inRequested, inParams, conformed);
    return conformed;
}

FrameRef RenderUpstream(const QRT::InterfaceRef<IRenderableSource>& inUpstream,
                        const MF::FrameTime& inTime, const CutlistRenderParams& inParams)
{
    FrameRef frame;
    inUpstream->RenderFrame(inTime, inParams, frame);
    return frame;
}

bool IsFullFrameRendering(const MF::IVideoFrame& inFrame, const CutlistRenderParams& inParams)
{
    const auto width = static_cast<std::int32_t>(inParams.mWidth);
    const auto height = static_cast<std::int32_t>(inParams.mHeight);
    if (!inFrame.CanProvideRect(QRT::ParamRect(0, 0, width, height)))
        return false;
    const QRT::ParamRect bounds = inFrame.GetBounds();
    if (bounds.Width() == width && bounds.Height() == height)
        return false;
    const auto fullWidth = static_cast<std::int32_t>(inParams.mFullFrameWidth);
    const auto fullHeight = static_cast<std::int32_t>(inParams.mFullFrameHeight);
    if (bounds == QRT::ParamRect(0, 0, fullWidth, fullHeight))
        return true;
    const std::uint32_t properties = inFrame.GetPixelFormat().GetProperties();
    const bool halvedPairs = (properties & mvxmediatypes::kPixelProperty_YUV) != 0 &&
                             IsHalfWidthLayout(properties) &&
                             (properties & mvxmediatypes::kPixelProperty_ChromaMask) ==
                                 mvxmediatypes::kPixelProperty_ChromaMask;
    return halvedPairs && bounds == QRT::ParamRect(0, 0, fullWidth / 2, fullHeight);
}

FrameRef CreateFrameForParams(const CutlistRenderParams& inParams, const FrameRef& inModel)
{
    PixelFormat format = inParams.mPixelFormat;
    if (!format.IsValid() && inModel)
        format = inModel->GetPixelFormat();
    FrameRef frame;
    ThrowIfFailed(VF::CreateVideoFrame(format, inParams.mWidth, inParams.mHeight,
                                       inParams.mPixelAspectRatio, false, false, frame));
    return frame;
}

FrameRef MakeAddressableCopy(const FrameRef& inFrame, const CutlistRenderParams& inParams)
{
    MVX_INPUT_CONTRACT(inFrame != nullptr);
    const RenderQuality quality = QualityOf(inParams.mQuality);
    if (IsFullFrameRendering(*inFrame, inParams))
    {
        FrameRef reduced = CreateFrameForParams(inParams, inFrame);
        reduced->SetFieldType(inFrame->GetFieldType());
        ThrowIfFailed(VF::VideoFrameManipulators::CopyFrame(inFrame, reduced, quality));
        return reduced;
    }
    FrameRef copy = VF::VideoFrameManipulators::MakeAddressableVideoFrame(
        inFrame, inParams.mPixelFormat, quality);
    if (!copy)
        throw RenderRequestException(VF::kResult_UnsupportedPixelFormat);
    return copy;
}

bool IsWholeFieldMultiple(const MF::IVideoFrame& inFrame, const CutlistRenderParams& inParams)
{
    const std::int64_t height = inFrame.GetBounds().Height();
    const std::int64_t requested = inParams.mHeight;
    return requested > 0 && (height == 2 * requested || height == 4 * requested);
}

FrameRef TakeFieldDirectly(const FrameRef& inFrame, const CutlistRenderParams& inParams,
                           bool inKeepSecond)
{
    MVX_INPUT_CONTRACT(inFrame != nullptr);
    MVX_INPUT_CONTRACT(IsWholeFieldMultiple(*inFrame, inParams));
    const RenderQuality quality = QualityOf(inParams.mQuality);
    // The kept field goes straight into a frame of the requested height (at
    // the source's width; a differing width or format is converted afterwards).
    const FrameRef source = ToStaging(inFrame, quality);
    const VF::IRFrameBuffer in = VF::GetIRFrameBuffer(*source);
    FrameRef extracted;
    ThrowIfFailed(VF::CreateVideoFrame(source->GetPixelFormat(),
                                       static_cast<std::uint32_t>(in.mWidth), inParams.mHeight,
                                       inParams.mPixelAspectRatio, false, false, extracted));
    const VF::IRWritableFrameBuffer out = VF::GetWritableIRFrameBuffer(*extracted);
    const bool keepSecondRows = KeepsSecondRows(in.mFormat, in.mHeight, inKeepSecond);
    ThrowIfFailed(IR_DeinterlaceCopy(in.mBase, in.mRowBytes, in.mHeight, out.mBase, out.mRowBytes,
                                     out.mHeight, in.mFormat, in.mWidth, keepSecondRows,
                                     static_cast<std::int32_t>(quality)));
    FrameRef result = extracted;
    if ((inParams.mPixelFormat.IsValid() && extracted->GetPixelFormat() != inParams.mPixelFormat) ||
        extracted->GetBounds().Width() != static_cast<std::int32_t>(inParams.mWidth))
    {
        result = CreateFrameForParams(inParams, inFrame);
        ThrowIfFailed(VF::VideoFrameManipulators::CopyFrame(extracted, result, quality));
    }
    result->SetFieldType(mvxmediatypes::kFieldType_Progressive);
    return result;
}

FrameRef DeinterlaceKeepingField(const FrameRef& inFrame, const CutlistRenderParams& inParams,
                                 bool inKeepSecond)
{
    MVX_INPUT_CONTRACT(inFrame != nullptr);
    const RenderQuality quality = QualityOf(inParams.mQuality);
    const PixelFormat format = inFrame->GetPixelFormat();
    if (format.IsFieldByField() && IsWholeFieldMultiple(*inFrame, inParams))
        return TakeFieldDirectly(inFrame, inParams, inKeepSecond);

    FrameRef work;
    if (format.IsFieldByField())
    {
        // Fields stored apart: a frame for the parameters receives both fields,
        // each scaled on its own.
        work = CreateFrameForParams(inParams, inFrame);
        work->SetFieldType(inFrame->GetFieldType());
        const std::int32_t selection = mvxmediatypes::IsInterlaced(inFrame->GetFieldType())
                                           ? VF::kFieldSelection_First
                                           : VF::kFieldSelection_Frame;
        ThrowIfFailed(
            VF::VideoFrameManipulators::CopyFrameWithFields(inFrame, work, quality, selection));
    }
    else
    {
        const FrameRef addressable = MakeAddressableCopy(inFrame, inParams);
        work = addressable == inFrame && inFrame->IsShared() && StagingFormatFor(format) == format
                   ? CopyKeptField(inFrame, inKeepSecond)
                   : VF::MakeWriteableVideoFrame(addressable, quality);
    }

    const FrameRef staging = WritableStaging(work, quality);
    const VF::IRWritableFrameBuffer buffer = VF::GetWritableIRFrameBuffer(*staging);
    const bool keepSecondRows = KeepsSecondRows(buffer.mFormat, buffer.mHeight, inKeepSecond);
    ThrowIfFailed(IR_Deinterlace(buffer.mBase, buffer.mRowBytes, buffer.mFormat, buffer.mWidth,
                                 buffer.mHeight, keepSecondRows,
                                 static_cast<std::int32_t>(inParams.mSecondaryQuality)));
    FrameRef result = FromStaging(staging, work, quality);
    result->SetFieldType(mvxmediatypes::kFieldType_Progressive);
    return result;
}

QRT::Result CopyFieldIntoSlot(const FrameRef& inSource, std::int32_t inSourceField,
                              const FrameRef& inDestination, std::int32_t inSlot,
                              std::uint32_t inQuality)
{
    MVX_INPUT_CONTRACT(inSource != nullptr);
    MVX_INPUT_CONTRACT(inDestination != nullptr);
    MVX_INPUT_CONTRACT(inSourceField == kFirstSlot || inSourceField == kSecondSlot);
    MVX_INPUT_CONTRACT(inSlot == kFirstSlot || inSlot == kSecondSlot);
    const RenderQuality quality = QualityOf(inQuality);
    const FrameRef staging = WritableStaging(inDestination, quality);
    const FrameRef source = VF::VideoFrameManipulators::MakeAddressableVideoFrame(
        inSource, staging->GetPixelFormat(), quality);
    if (!source)
        return VF::kResult_UnsupportedPixelFormat;
    const QRT::Result status =
        CopyFieldBetweenBuffers(VF::GetIRFrameBuffer(*source), inSourceField,
                                VF::GetWritableIRFrameBuffer(*staging), inSlot, quality);
    if (status < 0 || staging == inDestination)
        return status;
    return VF::VideoFrameManipulators::CopyFrame(staging, inDestination, quality);
}

FrameRef AssembleFields(const MF::FrameTime& inRequested, const FrameRef& inFirst,
                        const MF::FrameTime& inFirstTime, const FrameRef& inSecond,
                        const MF::FrameTime& inSecondTime, const CutlistRenderParams& inParams)
{
    MVX_INPUT_CONTRACT(inFirst != nullptr || inSecond != nullptr);
    CutlistRenderParams params = inParams;
    if (inSecond && !IsFullFrameRendering(*inSecond, inParams))
    {
        const QRT::ParamRect bounds = inSecond->GetBounds();
        params.mWidth = static_cast<std::uint32_t>(bounds.Width());
        params.mHeight = static_cast<std::uint32_t>(bounds.Height());
        params.mPixelAspectRatio = inSecond->GetPixelAspectRatio();
    }

    if (inRequested.IsProgressive() && inFirst == inSecond)
    {
        // A frame upstream delivered progressive has no field of another time
        // to drop: deinterlacing it would only halve its vertical detail.
        if (inSecondTime.IsProgressive())
            return inSecond;
        const bool keepSecond =
            inSecondTime.GetSecondFieldTime() == inRequested.GetSecondFieldTime();
        return DeinterlaceKeepingField(inSecond, params, keepSecond);
    }

    const FrameRef& model = inSecond ? inSecond : inFirst;
    FrameRef result = CreateFrameForParams(params, model);
    result->SetFieldType(inRequested.GetFieldOrder());
    const FrameRef& second = inSecond ? inSecond : inFirst;
    const MF::FrameTime& secondTime = inSecond ? inSecondTime : inFirstTime;
    const FrameRef& first = inFirst ? inFirst : inSecond;
    const MF::FrameTime& firstTime = inFirst ? inFirstTime : inSecondTime;

    const std::int32_t secondField =
        secondTime.GetSecondFieldTime() == inRequested.GetSecondFieldTime() ? kSecondSlot
                                                                            : kFirstSlot;
    const std::int32_t firstField =
        firstTime.GetFirstFieldTime() != inRequested.GetFirstFieldTime() ? kSecondSlot : kFirstSlot;
    ThrowIfFailed(CopyFieldIntoSlot(second, secondField, result, kSecondSlot, params.mQuality));
    ThrowIfFailed(CopyFieldIntoSlot(first, firstField, result, kFirstSlot, params.mQuality));
    return result;
}

} // namespace ML::FieldFilterSteps
