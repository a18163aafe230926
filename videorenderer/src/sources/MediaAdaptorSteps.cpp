// The steps shared by the two media adaptors.

#include "sources/MediaAdaptorSteps.h"

#include "BE/IMediaInfo.h"
#include "IR/ImageRenderer.h"
#include "ML/RenderRequestException.h"
#include "VF/PixelFormatConversions.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"

namespace ML::MediaAdaptorSteps
{
namespace
{

// Properties-word tests (the high 32 bits of a PixelFormat).
constexpr std::uint32_t kPropertyMask_Storage = 0xC0000u;
constexpr std::uint32_t kPropertyStorage_Raster = 0x40000u;
constexpr std::uint32_t kPropertyMask_Chroma = 0xC00u;
constexpr std::uint32_t kProperty_YUV = 0x1u;

// The format 16-bit RGB frames are un-premultiplied in when the image renderer
// cannot address them directly: deep enough to lose nothing on the way back.
constexpr mvxmediatypes::PixelFormat kStagingFormat = mvxmediatypes::kPixelFormat_BGRA_4444_32f;

mvxmediatypes::RenderQuality AsRenderQuality(std::uint32_t inQuality)
{
    return static_cast<mvxmediatypes::RenderQuality>(inQuality);
}

// Un-premultiplies the pixels of plane 0 in place. inFormat is the IR format of
// the memory with straight alpha (bit 2).
void UnPremultiplyInPlace(void* ioBase, std::int32_t inRowBytes, IR_PixelFormat inFormat,
                          std::int32_t inWidth, std::int32_t inHeight, std::uint32_t inMatteColor,
                          std::uint32_t inQuality)
{
    const std::int32_t quality = static_cast<std::int32_t>(inQuality);
    std::int32_t status = kIR_NoError;
    if (inMatteColor != 0)
    {
        status = IR_UnPremultiplyAgainstMatteColor(ioBase, inRowBytes, ioBase, inRowBytes, inFormat,
                                                   inWidth, inHeight, inMatteColor,
                                                   kIR_FormatBit_StraightAlpha, quality);
    }
    else
    {
        // Premultiplied over black is the image renderer's own premultiplied
        // encoding: read the memory as such and write it back straight.
        const IR_PixelFormat premultiplied =
            (inFormat & ~kIR_FormatBit_StraightAlpha) | kIR_FormatBit_PremultipliedAlpha;
        status = IR_Convert(ioBase, inRowBytes, premultiplied, ioBase, inRowBytes, inFormat,
                            inWidth, inHeight, quality);
    }
    ThrowIfFailed(status);
}

} // namespace

BE::VideoFrameRequest MakeFrameRequest(const MF::FrameTime& inTime,
                                       const CutlistRenderParams& inParams)
{
    BE::VideoFrameRequest request;
    request.mWidth = inParams.mWidth;
    request.mHeight = inParams.mHeight;
    request.mPixelAspectRatio = inParams.mPixelAspectRatio;
    request.mPixelFormat = inParams.mPixelFormat;
    request.mFieldType = inTime.GetFieldOrder();
    request.mQuality = inParams.mQuality;
    return request;
}

mvxmediatypes::TickTime ConvertTimeByFrameNumber(mvxmediatypes::TickTime inTime,
                                                 mvxmediatypes::FrameRate inOwnRate,
                                                 mvxmediatypes::FrameRate inSourceRate)
{
    const std::int64_t frame = inTime.ToFrame64(inOwnRate);
    return mvxmediatypes::TickTime::FromFrame(frame, inSourceRate);
}

std::int32_t GetMediaInfoKind(const QRT::InterfaceRef<BE::Deprecated::IVideoSource>& inSource)
{
    const QRT::InterfaceRef<BE::Deprecated::IMediaInfo> info =
        QRT::QueryRef<BE::Deprecated::IMediaInfo>(inSource);
    return info ? info->GetKind() : BE::Deprecated::kMediaInfoKind_Clip;
}

bool HasReworkableAlpha(const MF::IVideoFrame& inFrame)
{
    if (!inFrame.HasAlpha())
        return false;
    const std::uint32_t properties = inFrame.GetPixelFormat().GetProperties();
    return (properties & kPropertyMask_Storage) == kPropertyStorage_Raster &&
           (properties & kPropertyMask_Chroma) == 0;
}

void ConformAlpha(FrameRef& ioFrame, mvxmediatypes::AlphaChannel inAlphaKind,
                  std::uint32_t inMatteColor, std::uint32_t inQuality)
{
    MVX_INPUT_CONTRACT(ioFrame != nullptr);
    const mvxmediatypes::PixelFormat format = ioFrame->GetPixelFormat();
    const bool wanted = inAlphaKind == mvxmediatypes::kAlphaChannel_Premultiplied &&
                        HasReworkableAlpha(*ioFrame) &&
                        (format.GetProperties() & kProperty_YUV) == 0 &&
                        QRT::QueryRef<MF::IVideoFrameRowBytes>(ioFrame) &&
                        QRT::QueryRef<MF::IVideoFrameBaseAddress>(ioFrame);
    const IR_PixelFormat irFormat = VF::BEPixelFormatToIRPixelFormat(format);
    // A format that stores premultiplied colour by definition keeps it: there
    // is no straight variant of its memory to convert into.
    const bool storesPremultiplied =
        irFormat != VF::kIR_PixelFormat_Invalid && (irFormat & kIR_FormatBit_StraightAlpha) == 0;

    if (wanted && !storesPremultiplied)
    {
        ioFrame = VF::MakeWriteableVideoFrame(ioFrame, AsRenderQuality(inQuality));
        const QRT::ParamRect bounds = ioFrame->GetBounds();
        if (irFormat != VF::kIR_PixelFormat_Invalid)
        {
            const QRT::InterfaceRef<MF::IVideoFrameRowBytes> rowBytes =
                QRT::QueryRef<MF::IVideoFrameRowBytes>(ioFrame);
            const QRT::InterfaceRef<MF::IVideoFrameBaseAddress> base =
                QRT::QueryRef<MF::IVideoFrameBaseAddress>(ioFrame);
            UnPremultiplyInPlace(base->GetWritableBaseAddress(), rowBytes->GetRowBytes(), irFormat,
                                 bounds.Width(), bounds.Height(), inMatteColor, inQuality);
            ioFrame->SetAlphaChannel(mvxmediatypes::kAlphaChannel_Straight);
        }
        else
        {
            const FrameRef staging = VF::VideoFrameManipulators::MakeAddressableVideoFrame(
                ioFrame, kStagingFormat, AsRenderQuality(inQuality));
            if (!staging)
                ThrowIfFailed(VF::kResult_UnsupportedPixelFormat);
            UnPremultiplyInPlace(staging->GetWritableBaseAddress(), staging->GetRowBytes(),
                                 VF::BEPixelFormatToIRPixelFormat(kStagingFormat), bounds.Width(),
                                 bounds.Height(), inMatteColor, inQuality);
            // Both straight, so the copy back is a plain change of depth.
            staging->SetAlphaChannel(mvxmediatypes::kAlphaChannel_Straight);
            ioFrame->SetAlphaChannel(mvxmediatypes::kAlphaChannel_Straight);
            ThrowIfFailed(VF::VideoFrameManipulators::CopyFrame(staging, ioFrame,
                                                                AsRenderQuality(inQuality)));
        }
        ioFrame->AlphaChanged();
        return;
    }
    if (ioFrame->GetAlphaChannel() != inAlphaKind)
    {
        ioFrame = VF::MakeWriteableVideoFrame(ioFrame, AsRenderQuality(inQuality));
        ioFrame->SetAlphaChannel(inAlphaKind);
    }
}

void ApplyAlphaHandling(FrameRef& ioFrame, bool inIgnoreAlpha, bool inInvertAlpha,
                        mvxmediatypes::AlphaChannel inAlphaKind, std::uint32_t inMatteColor,
                        std::uint32_t inQuality)
{
    MVX_INPUT_CONTRACT(ioFrame != nullptr);
    if (!HasReworkableAlpha(*ioFrame))
        return;
    if (inIgnoreAlpha)
    {
        ioFrame = VF::MakeWriteableVideoFrame(ioFrame, AsRenderQuality(inQuality));
        ThrowIfFailed(VF::VideoFrameManipulators::OpaqueAlpha(ioFrame));
        ioFrame->AlphaChanged();
        return;
    }
    if (inInvertAlpha)
    {
        ioFrame = VF::MakeWriteableVideoFrame(ioFrame, AsRenderQuality(inQuality));
        ThrowIfFailed(VF::VideoFrameManipulators::InvertAlpha(ioFrame));
        ioFrame->AlphaChanged();
    }
    ConformAlpha(ioFrame, inAlphaKind, inMatteColor, inQuality);
}

void ThrowIfFailed(QRT::Result inStatus)
{
    if (QRT::Failed(inStatus))
        throw RenderRequestException(inStatus);
}

} // namespace ML::MediaAdaptorSteps
