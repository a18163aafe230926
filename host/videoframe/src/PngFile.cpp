#include "VF/PngFile.h"

#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "mvxcore/debug/Contract.h"

#include <cerrno>
#include <csetjmp>
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
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

PngStatus Failure(QRT::Result inResult, const std::string& inPath, const std::string& inProblem)
{
    return PngStatus{inResult, inPath + ": " + inProblem};
}

// libpng reports errors through a callback that must not return; it records
// the reason and jumps back into the Run* function that set the jump. Those
// functions hold nothing that needs destroying, and everything a run touches
// lives in its job, so nothing needed after a jump is a clobbered local.
// Warnings (a damaged ancillary chunk) are not failures and are not printed.
struct PngJobBase
{
    png_structp mPng = nullptr;
    png_infop mInfo = nullptr;
    std::FILE* mFile = nullptr;
    char mMessage[256] = {};
};

extern "C" void PngErrorExit(png_structp inPng, png_const_charp inMessage)
{
    auto* job = static_cast<PngJobBase*>(png_get_error_ptr(inPng));
    std::snprintf(job->mMessage, sizeof job->mMessage, "%s", inMessage);
    png_longjmp(inPng, 1);
}

extern "C" void PngWarning(png_structp, png_const_charp) {}

// Reads through stdio and names a short read: the file ends early.
extern "C" void PngReadData(png_structp inPng, png_bytep outData, size_t inLength)
{
    auto* job = static_cast<PngJobBase*>(png_get_io_ptr(inPng));
    if (std::fread(outData, 1, inLength, job->mFile) == inLength)
        return;
    png_error(inPng,
              std::ferror(job->mFile) ? std::strerror(errno) : "the file ends early (truncated)");
}

struct PngReadJob : PngJobBase
{
    png_uint_32 mWidth = 0;
    png_uint_32 mHeight = 0;
    size_t mRowBytes = 0;
    png_bytepp mRows = nullptr;

    ~PngReadJob()
    {
        if (mPng)
            png_destroy_read_struct(&mPng, mInfo ? &mInfo : nullptr, nullptr);
    }
};

// Reads the header and sets up every colour type and depth to come out as
// 8-bit BGRA: palettes and low-depth grey expanded, transparency keys made
// alpha, 16-bit samples scaled with rounding, grey made RGB, opaque alpha
// added where the file has none, interlaced passes combined.
bool RunReadHeader(PngReadJob& ioJob)
{
    if (setjmp(png_jmpbuf(ioJob.mPng)) != 0)
        return false;
    png_set_read_fn(ioJob.mPng, &ioJob, &PngReadData);
    png_read_info(ioJob.mPng, ioJob.mInfo);
    ioJob.mWidth = png_get_image_width(ioJob.mPng, ioJob.mInfo);
    ioJob.mHeight = png_get_image_height(ioJob.mPng, ioJob.mInfo);
    const png_byte colorType = png_get_color_type(ioJob.mPng, ioJob.mInfo);
    png_set_expand(ioJob.mPng);
    png_set_scale_16(ioJob.mPng);
    if ((colorType & PNG_COLOR_MASK_COLOR) == 0)
        png_set_gray_to_rgb(ioJob.mPng);
    png_set_bgr(ioJob.mPng);
    if ((colorType & PNG_COLOR_MASK_ALPHA) == 0 &&
        !png_get_valid(ioJob.mPng, ioJob.mInfo, PNG_INFO_tRNS))
        png_set_filler(ioJob.mPng, 0xFF, PNG_FILLER_AFTER);
    png_set_interlace_handling(ioJob.mPng);
    png_read_update_info(ioJob.mPng, ioJob.mInfo);
    ioJob.mRowBytes = png_get_rowbytes(ioJob.mPng, ioJob.mInfo);
    return true;
}

bool RunReadRows(PngReadJob& ioJob)
{
    if (setjmp(png_jmpbuf(ioJob.mPng)) != 0)
        return false;
    png_read_image(ioJob.mPng, ioJob.mRows);
    // The chunks after the pixels, IEND included, must be whole too.
    png_read_end(ioJob.mPng, nullptr);
    return true;
}

struct PngWriteJob : PngJobBase
{
    png_uint_32 mWidth = 0;
    png_uint_32 mHeight = 0;
    int mBitDepth = 8;
    int mColorType = PNG_COLOR_TYPE_RGB;
    png_bytepp mRows = nullptr;

    ~PngWriteJob()
    {
        if (mPng)
            png_destroy_write_struct(&mPng, mInfo ? &mInfo : nullptr);
    }
};

bool RunWrite(PngWriteJob& ioJob)
{
    if (setjmp(png_jmpbuf(ioJob.mPng)) != 0)
        return false;
    png_init_io(ioJob.mPng, ioJob.mFile);
    // Rendered frames are written as they come: no row filters (choosing one
    // per row costs more than it saves on rendered pictures) and zlib's
    // default level.
    png_set_filter(ioJob.mPng, PNG_FILTER_TYPE_BASE, PNG_FILTER_NONE);
    png_set_compression_level(ioJob.mPng, PNG_Z_DEFAULT_COMPRESSION);
    png_set_IHDR(ioJob.mPng, ioJob.mInfo, ioJob.mWidth, ioJob.mHeight, ioJob.mBitDepth,
                 ioJob.mColorType, PNG_INTERLACE_NONE, PNG_COMPRESSION_TYPE_BASE,
                 PNG_FILTER_TYPE_BASE);
    png_set_sRGB(ioJob.mPng, ioJob.mInfo, PNG_sRGB_INTENT_PERCEPTUAL);
    png_write_info(ioJob.mPng, ioJob.mInfo);
    png_write_image(ioJob.mPng, ioJob.mRows);
    png_write_end(ioJob.mPng, ioJob.mInfo);
    return true;
}

// The frame in inFormat (straight BGRA of 8 or 16 bits), converted when it
// is in another format; empty when it cannot be.
FrameRef InFormat(const FrameRef& inFrame, mt::PixelFormat inFormat)
{
    if (inFrame->GetPixelFormat() == inFormat)
        return inFrame;
    const QRT::ParamRect bounds = inFrame->GetBounds();
    FrameRef converted = CreateVideoFrame(inFormat, static_cast<uint32_t>(bounds.Width()),
                                          static_cast<uint32_t>(bounds.Height()),
                                          mt::kPixelAspectRatio_Square, false, false);
    if (!converted ||
        QRT::Failed(VideoFrameManipulators::CopyFrame(inFrame, converted, mt::kRenderQuality_Max)))
        return {};
    return converted;
}

// The file's rows from BGRA rows: RGB or RGBA, 8-bit or 16-bit big-endian.
template <typename Sample>
void PackRows(const FrameRef& inFrame, bool inWithAlpha, std::vector<uint8_t>& outBytes)
{
    const QRT::ParamRect bounds = inFrame->GetBounds();
    const size_t width = static_cast<size_t>(bounds.Width());
    const size_t channels = inWithAlpha ? 4 : 3;
    outBytes.resize(width * channels * sizeof(Sample) * static_cast<size_t>(bounds.Height()));
    const auto* base = static_cast<const uint8_t*>(inFrame->GetBaseAddress());
    uint8_t* out = outBytes.data();
    static constexpr int kFromBGRA[4] = {2, 1, 0, 3};
    for (int32_t y = 0; y < bounds.Height(); ++y)
    {
        const auto* in = reinterpret_cast<const Sample*>(
            base + static_cast<size_t>(y) * static_cast<size_t>(inFrame->GetRowBytes()));
        for (size_t x = 0; x < width; ++x)
        {
            for (size_t c = 0; c < channels; ++c)
            {
                const Sample value = in[4 * x + static_cast<size_t>(kFromBGRA[c])];
                if constexpr (sizeof(Sample) == 2)
                    *out++ = static_cast<uint8_t>(value >> 8);
                *out++ = static_cast<uint8_t>(value);
            }
        }
    }
}

} // namespace

PngDepth GetPngDepthFor(mt::PixelFormat inFormat)
{
    return inFormat.GetSampleKind() == mt::kPixelSampleKind_8u ? PngDepth::k8 : PngDepth::k16;
}

PngStatus WritePngFile(const std::string& inPath, const FrameRef& inFrame, PngChannels inChannels,
                       PngDepth inDepth)
{
    MVX_INPUT_CONTRACT(inFrame != nullptr);
    const bool deep = inDepth == PngDepth::k16;
    const FrameRef bgra =
        InFormat(inFrame, deep ? mt::kPixelFormat_BGRA_4444_16u : mt::kPixelFormat_BGRA_4444_8u);
    if (!bgra)
        return Failure(kResult_UnsupportedPixelFormat, inPath,
                       "the frame's pixel format cannot be written as PNG");
    const bool withAlpha = inChannels == PngChannels::kRGBA;
    // Kept by the thread from file to file: a fresh buffer would be paged in
    // anew for every frame.
    thread_local std::vector<uint8_t> bytes;
    if (deep)
        PackRows<uint16_t>(bgra, withAlpha, bytes);
    else
        PackRows<uint8_t>(bgra, withAlpha, bytes);

    PngWriteJob job;
    const QRT::ParamRect bounds = bgra->GetBounds();
    job.mWidth = static_cast<png_uint_32>(bounds.Width());
    job.mHeight = static_cast<png_uint_32>(bounds.Height());
    job.mBitDepth = deep ? 16 : 8;
    job.mColorType = withAlpha ? PNG_COLOR_TYPE_RGB_ALPHA : PNG_COLOR_TYPE_RGB;
    std::vector<png_bytep> rows(job.mHeight);
    const size_t rowBytes = bytes.size() / job.mHeight;
    for (size_t y = 0; y < rows.size(); ++y)
        rows[y] = bytes.data() + y * rowBytes;
    job.mRows = rows.data();

    std::unique_ptr<FILE, int (*)(FILE*)> file(std::fopen(inPath.c_str(), "wb"), &std::fclose);
    if (!file)
        return Failure(kResult_PngWriteFailed, inPath, std::strerror(errno));
    job.mFile = file.get();
    job.mPng = png_create_write_struct(PNG_LIBPNG_VER_STRING, &job, &PngErrorExit, &PngWarning);
    job.mInfo = job.mPng ? png_create_info_struct(job.mPng) : nullptr;
    if (!job.mInfo)
        return Failure(kResult_PngWriteFailed, inPath, "no memory for the encoder");
    if (!RunWrite(job))
        return Failure(kResult_PngWriteFailed, inPath, job.mMessage);
    if (std::fclose(file.release()) != 0)
        return Failure(kResult_PngWriteFailed, inPath, std::strerror(errno));
    return PngStatus{};
}

PngStatus ReadPngFile(const std::string& inPath, FrameRef& outFrame)
{
    outFrame.Reset();
    std::unique_ptr<FILE, int (*)(FILE*)> file(std::fopen(inPath.c_str(), "rb"), &std::fclose);
    if (!file)
        return Failure(kResult_PngCannotOpen, inPath, std::strerror(errno));
    png_byte signature[8] = {};
    if (std::fread(signature, 1, sizeof signature, file.get()) != sizeof signature ||
        png_sig_cmp(signature, 0, sizeof signature) != 0)
        return Failure(kResult_PngCannotOpen, inPath, "not a PNG file");

    PngReadJob job;
    job.mFile = file.get();
    job.mPng = png_create_read_struct(PNG_LIBPNG_VER_STRING, &job, &PngErrorExit, &PngWarning);
    job.mInfo = job.mPng ? png_create_info_struct(job.mPng) : nullptr;
    if (!job.mInfo)
        return Failure(kResult_OutOfFrameMemory, inPath, "no memory for the decoder");
    png_set_sig_bytes(job.mPng, sizeof signature);
    if (!RunReadHeader(job))
        return Failure(kResult_PngMalformed, inPath, job.mMessage);
    if (job.mWidth == 0 || job.mHeight == 0 || job.mWidth > kMaxFrameDimension ||
        job.mHeight > kMaxFrameDimension)
        return Failure(kResult_PngMalformed, inPath, "picture size out of range");
    if (job.mRowBytes != size_t{job.mWidth} * 4)
        return Failure(kResult_PngMalformed, inPath, "unexpected row layout");
    FrameRef frame;
    const QRT::Result created =
        CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, job.mWidth, job.mHeight,
                         mt::kPixelAspectRatio_Square, false, false, frame);
    if (QRT::Failed(created))
        return Failure(created, inPath,
                       "no memory for the " + std::to_string(job.mWidth) + "x" +
                           std::to_string(job.mHeight) + " picture");
    std::vector<png_bytep> rows(job.mHeight);
    auto* base = static_cast<uint8_t*>(frame->GetWritableBaseAddress());
    for (size_t y = 0; y < rows.size(); ++y)
        rows[y] = base + y * static_cast<size_t>(frame->GetRowBytes());
    job.mRows = rows.data();
    if (!RunReadRows(job))
        return Failure(kResult_PngMalformed, inPath, job.mMessage);
    outFrame = frame;
    return PngStatus{};
}

} // namespace VF
