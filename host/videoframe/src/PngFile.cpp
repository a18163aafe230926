#include "VF/PngFile.h"

#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "mvxcore/debug/Contract.h"

#include <cstdio>
#include <cstring>
#include <memory>
#include <vector>

#include <png.h>

namespace VF
{
namespace
{

namespace mt = mvxmediatypes;

// The simplified libpng interface keeps its own error state (it uses
// setjmp/longjmp internally and reports through image.message), so no jump
// crosses our frames. The image must be freed on every path.
struct PngImage
{
    png_image mImage;
    PngImage()
    {
        std::memset(&mImage, 0, sizeof mImage);
        mImage.version = PNG_IMAGE_VERSION;
    }
    ~PngImage() { png_image_free(&mImage); }
    PngImage(const PngImage&) = delete;
    PngImage& operator=(const PngImage&) = delete;
};

PngStatus Failure(QRT::Result inResult, const std::string& inPath, const std::string& inProblem)
{
    return PngStatus{inResult, inPath + ": " + inProblem};
}

} // namespace

PngStatus WritePngFile(const std::string& inPath, const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
                       PngChannels inChannels)
{
    MVX_INPUT_CONTRACT(inFrame != nullptr);
    QRT::InterfaceRef<MF::IVideoFrame> bgra = inFrame;
    if (inFrame->GetPixelFormat() != mt::kPixelFormat_BGRA_4444_8u)
    {
        const QRT::ParamRect bounds = inFrame->GetBounds();
        bgra = CreateVideoFrame(
            mt::kPixelFormat_BGRA_4444_8u, static_cast<uint32_t>(bounds.Width()),
            static_cast<uint32_t>(bounds.Height()), mt::kPixelAspectRatio_Square, false, false);
        if (!bgra ||
            QRT::Failed(VideoFrameManipulators::CopyFrame(inFrame, bgra, mt::kRenderQuality_Max)))
            return Failure(kResult_UnsupportedPixelFormat, inPath,
                           "the frame's pixel format cannot be written as PNG");
    }
    const QRT::ParamRect bounds = bgra->GetBounds();
    const bool withAlpha = inChannels == PngChannels::kRGBA;
    PngImage png;
    png.mImage.width = static_cast<png_uint_32>(bounds.Width());
    png.mImage.height = static_cast<png_uint_32>(bounds.Height());
    png.mImage.format = withAlpha ? PNG_FORMAT_BGRA : PNG_FORMAT_BGR;
    // Rendered frames are written as they come: favour speed over file size.
    png.mImage.flags = PNG_IMAGE_FLAG_FAST;
    int ok = 0;
    if (withAlpha)
    {
        ok = png_image_write_to_file(&png.mImage, inPath.c_str(), 0, bgra->GetBaseAddress(),
                                     bgra->GetRowBytes(), nullptr);
    }
    else
    {
        // Three bytes a pixel: pack the rows without their alpha.
        const size_t width = static_cast<size_t>(bounds.Width());
        std::vector<uint8_t> packed(width * 3 * static_cast<size_t>(bounds.Height()));
        const auto* base = static_cast<const uint8_t*>(bgra->GetBaseAddress());
        for (int32_t y = 0; y < bounds.Height(); ++y)
        {
            const uint8_t* in = base + static_cast<size_t>(y) * bgra->GetRowBytes();
            uint8_t* out = packed.data() + static_cast<size_t>(y) * width * 3;
            for (size_t x = 0; x < width; ++x)
                std::memcpy(out + 3 * x, in + 4 * x, 3);
        }
        ok = png_image_write_to_file(&png.mImage, inPath.c_str(), 0, packed.data(),
                                     static_cast<png_int_32>(width * 3), nullptr);
    }
    if (!ok)
        return Failure(kResult_PngWriteFailed, inPath, png.mImage.message);
    return PngStatus{};
}

PngStatus ReadPngFile(const std::string& inPath, QRT::InterfaceRef<MF::IVideoFrame>& outFrame)
{
    outFrame.Reset();
    std::unique_ptr<FILE, int (*)(FILE*)> file(std::fopen(inPath.c_str(), "rb"), &std::fclose);
    if (!file)
        return Failure(kResult_PngCannotOpen, inPath, std::strerror(errno));
    png_byte signature[8] = {};
    if (std::fread(signature, 1, sizeof signature, file.get()) != sizeof signature ||
        png_sig_cmp(signature, 0, sizeof signature) != 0)
        return Failure(kResult_PngCannotOpen, inPath, "not a PNG file");
    std::rewind(file.get());

    PngImage png;
    if (!png_image_begin_read_from_stdio(&png.mImage, file.get()))
        return Failure(kResult_PngMalformed, inPath, png.mImage.message);
    if (png.mImage.width == 0 || png.mImage.height == 0 || png.mImage.width > kMaxFrameDimension ||
        png.mImage.height > kMaxFrameDimension)
        return Failure(kResult_PngMalformed, inPath, "picture size out of range");
    png.mImage.format = PNG_FORMAT_BGRA;
    QRT::InterfaceRef<MF::IVideoFrame> frame;
    const QRT::Result created =
        CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, png.mImage.width, png.mImage.height,
                         mt::kPixelAspectRatio_Square, false, false, frame);
    if (QRT::Failed(created))
        return Failure(created, inPath, "no memory for the picture");
    if (!png_image_finish_read(&png.mImage, nullptr, frame->GetWritableBaseAddress(),
                               frame->GetRowBytes(), nullptr))
        return Failure(kResult_PngMalformed, inPath, png.mImage.message);
    outFrame = frame;
    return PngStatus{};
}

} // namespace VF
