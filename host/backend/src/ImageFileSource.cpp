// Still images from PNG and JPEG files. Opening reads only the header (size
// and validity); the pixels are decoded on the first frame request, on
// whichever thread asks (the prefetcher sends image sources to its image
// executor), and the decoded frame is then kept, shared, for every later
// request of any size or format. A failed decode is answered with its status,
// keeps its reason for GetLastReadFailure, and is tried again on the next
// request.

#include "BE/MediaStatus.h"
#include "BE/VideoSources.h"
#include "FileUtilities.h"
#include "QRT/Allocated.h"
#include "VF/PngFile.h"
#include "VF/VideoFrame.h"
#include "VideoSourceBase.h"
#include "mvxcore/utility/Strings.h"

#include <cerrno>
#include <csetjmp>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <mutex>
#include <unistd.h>
#include <vector>

#include <jpeglib.h>

namespace BE
{

using detail::FrameRef;
using mvxmediatypes::PixelFormat;

namespace
{

enum class ImageKind
{
    kPng,
    kJpeg,
};

constexpr std::uint8_t kPngSignature[8] = {0x89, 'P', 'N', 'G', '\r', '\n', 0x1A, '\n'};

OpenStatus Fail(const std::string& inPath, QRT::Result inStatus, const std::string& inProblem)
{
    return OpenStatus{inStatus, inPath + ": " + inProblem};
}

std::uint32_t ReadBigEndian32(const std::uint8_t* inBytes)
{
    return (std::uint32_t{inBytes[0]} << 24) | (std::uint32_t{inBytes[1]} << 16) |
           (std::uint32_t{inBytes[2]} << 8) | std::uint32_t{inBytes[3]};
}

// --- JPEG through libjpeg ---------------------------------------------------------

// libjpeg reports errors through a callback that must not return; it jumps
// back to the decode function. Warnings (corrupt or truncated data, which
// libjpeg would otherwise paper over with grey) are recorded and turned into
// a failure, so a damaged file never yields a silently damaged picture.
struct JpegErrorManager
{
    jpeg_error_mgr mPublic;
    std::jmp_buf mJump;
    char mMessage[JMSG_LENGTH_MAX];
    bool mWarned;
};

void JpegErrorExit(j_common_ptr inInfo)
{
    auto* manager = reinterpret_cast<JpegErrorManager*>(inInfo->err);
    (*inInfo->err->format_message)(inInfo, manager->mMessage);
    std::longjmp(manager->mJump, 1);
}

void JpegEmitMessage(j_common_ptr inInfo, int inLevel)
{
    auto* manager = reinterpret_cast<JpegErrorManager*>(inInfo->err);
    // Level -1 is a warning about the data; positive levels are trace output.
    if (inLevel < 0 && !manager->mWarned)
    {
        (*inInfo->err->format_message)(inInfo, manager->mMessage);
        manager->mWarned = true;
    }
}

// Everything one libjpeg run touches lives here, outside the function that
// calls setjmp, so nothing it needs after a jump is a clobbered local.
struct JpegJob
{
    jpeg_decompress_struct mInfo;
    JpegErrorManager mErrors;
    std::FILE* mFile = nullptr;
    bool mHeaderOnly = true;
    std::uint32_t mWidth = 0;
    std::uint32_t mHeight = 0;
    // BGRA rows of mWidth * 4 bytes.
    std::vector<std::uint8_t> mPixels;
};

// Answers true on success; otherwise mErrors.mMessage says why.
bool RunJpeg(JpegJob& ioJob)
{
    std::memset(&ioJob.mInfo, 0, sizeof(ioJob.mInfo));
    ioJob.mInfo.err = jpeg_std_error(&ioJob.mErrors.mPublic);
    ioJob.mErrors.mPublic.error_exit = &JpegErrorExit;
    ioJob.mErrors.mPublic.emit_message = &JpegEmitMessage;
    ioJob.mErrors.mWarned = false;
    ioJob.mErrors.mMessage[0] = '\0';
    if (setjmp(ioJob.mErrors.mJump) != 0)
    {
        jpeg_destroy_decompress(&ioJob.mInfo);
        return false;
    }
    jpeg_create_decompress(&ioJob.mInfo);
    jpeg_stdio_src(&ioJob.mInfo, ioJob.mFile);
    jpeg_read_header(&ioJob.mInfo, TRUE);
    ioJob.mWidth = ioJob.mInfo.image_width;
    ioJob.mHeight = ioJob.mInfo.image_height;
    if (!ioJob.mHeaderOnly && !ioJob.mErrors.mWarned)
    {
        ioJob.mInfo.out_color_space = JCS_EXT_BGRA;
        jpeg_start_decompress(&ioJob.mInfo);
        ioJob.mPixels.resize(std::size_t{ioJob.mInfo.output_width} * 4 * ioJob.mInfo.output_height);
        while (ioJob.mInfo.output_scanline < ioJob.mInfo.output_height)
        {
            JSAMPROW row = ioJob.mPixels.data() +
                           std::size_t{ioJob.mInfo.output_scanline} * ioJob.mInfo.output_width * 4;
            jpeg_read_scanlines(&ioJob.mInfo, &row, 1);
        }
        jpeg_finish_decompress(&ioJob.mInfo);
    }
    jpeg_destroy_decompress(&ioJob.mInfo);
    return !ioJob.mErrors.mWarned;
}

// Reads a JPEG file's header (inHeaderOnly) or whole picture.
QRT::Result ReadJpeg(const std::string& inPath, bool inHeaderOnly, JpegJob& outJob,
                     std::string& outMessage)
{
    outJob.mFile = std::fopen(inPath.c_str(), "rb");
    if (!outJob.mFile)
    {
        outMessage = inPath + ": " + detail::DescribeErrno(errno);
        return kResult_MediaCannotOpen;
    }
    outJob.mHeaderOnly = inHeaderOnly;
    const bool decoded = RunJpeg(outJob);
    std::fclose(outJob.mFile);
    outJob.mFile = nullptr;
    if (!decoded)
    {
        outMessage = inPath + ": " + outJob.mErrors.mMessage;
        return kResult_MediaMalformed;
    }
    return QRT::kResult_Success;
}

class ImageFileSource : public detail::VideoSourceBase
{
public:
    ImageFileSource(detail::SourceDescription inDescription, ImageKind inKind)
        : VideoSourceBase(std::move(inDescription))
        , mKind(inKind)
    {
    }

    std::string GetLastReadFailure() const override
    {
        std::lock_guard lock(mDecodeMutex);
        return mFailure;
    }

protected:
    QRT::Result ProduceFrame(std::int64_t /*inIndex*/, PixelFormat /*inFormat*/,
                             FrameRef& outFrame) override
    {
        std::lock_guard lock(mDecodeMutex);
        if (!mDecoded)
        {
            FrameRef decoded;
            const detail::SourceDescription& description = GetDescription();
            QRT::Result status = kResult_MediaMalformed;
            try
            {
                status = Decode(decoded, mFailure);
            }
            catch (const std::bad_alloc&)
            {
                mFailure = description.mMediaPath + ": no memory for the " +
                           std::to_string(description.mWidth) + "x" +
                           std::to_string(description.mHeight) + " picture";
                return VF::kResult_OutOfFrameMemory;
            }
            if (QRT::Failed(status))
                return status;
            // A file replaced since opening must not pass for the old picture.
            const QRT::ParamRect bounds = decoded->GetBounds();
            if (static_cast<std::uint32_t>(bounds.Width()) != description.mWidth ||
                static_cast<std::uint32_t>(bounds.Height()) != description.mHeight)
            {
                mFailure = description.mMediaPath + ": the picture changed size since it was "
                                                    "opened";
                return kResult_MediaMalformed;
            }
            decoded->SetAlphaChannel(description.mAlpha);
            decoded->MarkShared(1);
            mDecoded = std::move(decoded);
            mFailure.clear();
        }
        outFrame = mDecoded;
        return QRT::kResult_Success;
    }

    QRT::InterfaceRef<Deprecated::IMediaInfo> Reopen() const override
    {
        VideoSourceRef source;
        if (!OpenImageFileSource(GetDescription().mMediaPath, source).Succeeded())
            return {};
        return source;
    }

private:
    // Decodes the file; on failure outMessage names the file and the reason.
    QRT::Result Decode(FrameRef& outFrame, std::string& outMessage) const
    {
        const std::string& path = GetDescription().mMediaPath;
        if (mKind == ImageKind::kPng)
        {
            VF::PngStatus status = VF::ReadPngFile(path, outFrame);
            outMessage = std::move(status.mMessage);
            return status.mResult;
        }

        JpegJob job;
        const QRT::Result status = ReadJpeg(path, false, job, outMessage);
        if (QRT::Failed(status))
            return status;
        FrameRef frame;
        const QRT::Result created =
            VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, job.mWidth, job.mHeight,
                                 mvxmediatypes::kPixelAspectRatio_Square, false, false, frame);
        if (QRT::Failed(created))
        {
            outMessage = path + ": no memory for the " + std::to_string(job.mWidth) + "x" +
                         std::to_string(job.mHeight) + " picture";
            return created;
        }
        auto* base = static_cast<std::uint8_t*>(frame->GetWritableBaseAddress());
        const std::size_t rowBytes = static_cast<std::size_t>(frame->GetRowBytes());
        const std::size_t packedRow = std::size_t{job.mWidth} * 4;
        for (std::uint32_t y = 0; y < job.mHeight; ++y)
            std::memcpy(base + y * rowBytes, job.mPixels.data() + y * packedRow, packedRow);
        outFrame = std::move(frame);
        return QRT::kResult_Success;
    }

    const ImageKind mKind;
    // Guards mDecoded and mFailure; held across the decode so that one
    // thread decodes.
    mutable std::mutex mDecodeMutex;
    FrameRef mDecoded;
    // The reason the latest decode failed; empty once one succeeds.
    std::string mFailure;
};

} // namespace

std::string GetLastReadFailure(const VideoSourceRef& inSource)
{
    const auto* source = dynamic_cast<const detail::VideoSourceBase*>(inSource.Get());
    return source ? source->GetLastReadFailure() : std::string();
}

OpenStatus OpenImageFileSource(const std::string& inPath, VideoSourceRef& outSource)
{
    outSource.Reset();
    const std::string extension = detail::GetLowerCaseExtension(inPath);
    if (extension != "png" && extension != "jpg" && extension != "jpeg")
        return Fail(inPath, kResult_MediaUnsupported,
                    "not a still image file (.png, .jpg or .jpeg)");
    const int descriptor = open(inPath.c_str(), O_RDONLY | O_CLOEXEC);
    if (descriptor < 0)
        return Fail(inPath, kResult_MediaCannotOpen, detail::DescribeErrno(errno));
    detail::FileIdentity identity;
    const bool regular = detail::GetFileIdentity(descriptor, inPath, identity);
    std::uint8_t header[24] = {};
    const std::size_t headerBytes = detail::ReadAt(descriptor, 0, header, sizeof(header));
    close(descriptor);
    if (!regular)
        return Fail(inPath, kResult_MediaCannotOpen, "not a regular file");

    const ImageKind kind = extension == "png" ? ImageKind::kPng : ImageKind::kJpeg;
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    if (kind == ImageKind::kPng)
    {
        if (headerBytes < sizeof(header) || std::memcmp(header, kPngSignature, 8) != 0)
            return Fail(inPath, kResult_MediaMalformed, "not a PNG file (no PNG signature)");
        if (std::memcmp(header + 12, "IHDR", 4) != 0)
            return Fail(inPath, kResult_MediaMalformed, "the PNG file does not start with IHDR");
        width = ReadBigEndian32(header + 16);
        height = ReadBigEndian32(header + 20);
    }
    else
    {
        JpegJob job;
        std::string message;
        const QRT::Result status = ReadJpeg(inPath, true, job, message);
        if (QRT::Failed(status))
            return OpenStatus{status, message};
        width = job.mWidth;
        height = job.mHeight;
    }
    if (width == 0 || height == 0 || width > VF::kMaxFrameDimension ||
        height > VF::kMaxFrameDimension)
        return Fail(inPath, kResult_MediaMalformed,
                    "picture size " + std::to_string(width) + "x" + std::to_string(height) +
                        " is outside 1..32768");

    detail::SourceDescription description;
    description.mMediaPath = inPath;
    description.mIdentity = (kind == ImageKind::kPng ? "png|" : "jpeg|") + identity.ToText();
    description.mName = mvxcore::utility::UTF8to16(inPath);
    description.mWidth = width;
    description.mHeight = height;
    description.mFrameRate = mvxmediatypes::kFrameRate_Video1000;
    description.mFieldType = mvxmediatypes::kFieldType_Progressive;
    description.mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    description.mAlpha = kind == ImageKind::kPng ? mvxmediatypes::kAlphaChannel_Straight
                                                 : mvxmediatypes::kAlphaChannel_None;
    description.mStill = true;
    description.mImage = true;
    description.mPrefetchWanted = true;
    description.mKind = Deprecated::kMediaInfoKind_Clip;
    description.mFrameCount = -1;
    description.mPixelFormats = {mvxmediatypes::kPixelFormat_BGRA_4444_8u};
    description.mColorProfile.mName = "sRGB";
    outSource = QRT::Allocated<ImageFileSource>::Create<Deprecated::IVideoSource>(
        std::move(description), kind);
    return {};
}

} // namespace BE
