#include "render/FramePixels.h"

#include "IR/ImageRenderer.h"
#include "ML/RenderStatus.h"
#include "VF/PixelFormatConversions.h"
#include "VF/VideoFrameManipulators.h"

namespace ML
{

std::uint32_t GetImageRendererFormat(mvxmediatypes::PixelFormat inFormat,
                                     mvxmediatypes::AlphaChannel inAlpha)
{
    IR_PixelFormat format = VF::BEPixelFormatToIRPixelFormat(inFormat);
    // A frame whose alpha kind says premultiplied carries associated colour,
    // whatever its format's own layout says.
    if (inAlpha == mvxmediatypes::kAlphaChannel_Premultiplied &&
        (format & kIR_FormatBit_StraightAlpha) != 0 &&
        (format & (0xFu << 8)) == kIR_FormatLayout_BGRA)
        format = (format & ~kIR_FormatBit_StraightAlpha) | kIR_FormatBit_PremultipliedAlpha;
    return format;
}

QRT::Result ConvertFramePixels(const QRT::InterfaceRef<MF::IVideoFrame>& inSourceFrame,
                               const QRT::InterfaceRef<MF::IVideoFrame>& inDestinationFrame,
                               std::uint32_t inQuality)
{
    const MF::IVideoFrame& inSource = *inSourceFrame;
    MF::IVideoFrame& ioDestination = *inDestinationFrame;
    const std::uint32_t sourceFormat =
        GetImageRendererFormat(inSource.GetPixelFormat(), inSource.GetAlphaChannel());
    const std::uint32_t destinationFormat =
        GetImageRendererFormat(ioDestination.GetPixelFormat(), ioDestination.GetAlphaChannel());
    // Formats the image renderer cannot address directly (deep integer, half
    // float, fields stored apart) go through the frame library's staged copy.
    if (!IR_IsValidPixelFormat(sourceFormat) || !IR_IsValidPixelFormat(destinationFormat))
        return VF::VideoFrameManipulators::CopyFrame(
            inSourceFrame, inDestinationFrame,
            static_cast<mvxmediatypes::RenderQuality>(inQuality));
    const QRT::ParamRect source = inSource.GetBounds();
    const QRT::ParamRect destination = ioDestination.GetBounds();
    return IR_ScaleConvert(inSource.GetBaseAddress(), inSource.GetRowBytes(), sourceFormat,
                           source.Width(), source.Height(), ioDestination.GetWritableBaseAddress(),
                           ioDestination.GetRowBytes(), destinationFormat, destination.Width(),
                           destination.Height(), static_cast<std::int32_t>(inQuality));
}

} // namespace ML
