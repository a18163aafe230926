#include "FrameWriters.h"

#include "IR/YUVPlanes.h"
#include "Options.h"
#include "PendingOutput.h"
#include "VF/PngFile.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "mvxmediatypes/TickTime.h"

#include <cerrno>
#include <climits>
#include <cmath>
#include <cstring>
#include <filesystem>
#include <map>
#include <mutex>
#include <numeric>
#include <sys/uio.h>
#include <system_error>

namespace vrender
{
namespace
{

namespace mt = mvxmediatypes;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

std::string ErrnoText(int inError)
{
    if (inError == EPIPE)
        return "the reader closed the pipe";
    return std::strerror(inError);
}

// Creates the directory that will hold inPath; empty on success.
std::string MakeParentDirectory(const std::string& inPath)
{
    const std::filesystem::path parent = std::filesystem::path(inPath).parent_path();
    if (parent.empty())
        return {};
    std::error_code error;
    std::filesystem::create_directories(parent, error);
    if (error)
        return "cannot create directory '" + parent.string() + "': " + error.message();
    return {};
}

std::string Quoted(const std::string& inText)
{
    return "'" + inText + "'";
}

class PngSequenceWriter final : public FrameWriter
{
public:
    PngSequenceWriter(std::string inPattern, bool inOverwrite)
        : mPattern(std::move(inPattern))
        , mOverwrite(inOverwrite)
    {
    }

    bool Begin(const StreamInfo& inInfo, std::string& outError) override
    {
        mInfo = inInfo;
        // Fails early, before any render, when the first directory cannot be made.
        outError = MakeParentDirectory(FormatFramePath(mPattern, inInfo.mFirstFrame));
        if (!outError.empty())
            return false;
        FindEarlierFrames();
        if (mEarlier.empty() || mOverwrite)
            return true;
        const std::string first = Quoted(mEarlier.begin()->second);
        outError = (mEarlier.size() == 1
                        ? first + ", a frame of " + mPattern + " from an earlier render, exists"
                        : first + " and " + std::to_string(mEarlier.size() - 1) +
                              " more frames of " + mPattern + " from an earlier render exist") +
                   "; give --overwrite to replace them (the earlier frames outside the new "
                   "range are then removed)";
        return false;
    }

    // Frames are converted to the render's format first, which sets the depth.
    bool Accepts(mt::PixelFormat /*inFormat*/) const override { return false; }

    EncodedFrame Encode(std::int64_t inIndex, const FrameRef& inFrame) override
    {
        EncodedFrame encoded;
        encoded.mIndex = inIndex;
        encoded.mFinalPath = FormatFramePath(mPattern, inIndex);
        // Written under a temporary name and renamed in order, so that an
        // interrupted run never leaves a half-written file under a frame's name.
        encoded.mTemporaryPath = encoded.mFinalPath + ".part";
        encoded.mError = MakeParentDirectory(encoded.mFinalPath);
        if (encoded.mError.empty() &&
            !PendingOutput::Get().AddTemporaryFile(encoded.mTemporaryPath))
            encoded.mError = "the program is ending";
        if (!encoded.mError.empty())
        {
            encoded.mTemporaryPath.clear();
            return encoded;
        }
        const bool keepAlpha = inFrame->HasAlpha() && !inFrame->IsAlphaOpaque();
        const VF::PngStatus status =
            VF::WritePngFile(encoded.mTemporaryPath, inFrame,
                             keepAlpha ? VF::PngChannels::kRGBA : VF::PngChannels::kRGB,
                             VF::GetPngDepthFor(inFrame->GetPixelFormat()));
        if (!status.Succeeded())
        {
            encoded.mError = status.mMessage;
            Discard(encoded);
        }
        return encoded;
    }

    bool Commit(EncodedFrame& ioFrame, std::string& outError) override
    {
        std::error_code error;
        std::filesystem::rename(ioFrame.mTemporaryPath, ioFrame.mFinalPath, error);
        if (error)
        {
            outError = "cannot write '" + ioFrame.mFinalPath + "': " + error.message();
            Discard(ioFrame);
            return false;
        }
        PendingOutput::Get().RemoveTemporaryFile(ioFrame.mTemporaryPath);
        ioFrame.mTemporaryPath.clear();
        return true;
    }

    void Discard(EncodedFrame& ioFrame) override
    {
        if (ioFrame.mTemporaryPath.empty())
            return;
        std::error_code ignored;
        std::filesystem::remove(ioFrame.mTemporaryPath, ignored);
        PendingOutput::Get().RemoveTemporaryFile(ioFrame.mTemporaryPath);
        ioFrame.mTemporaryPath.clear();
    }

    // Every frame of the range is written: the earlier frames outside it go.
    bool Finish(std::string& outError) override
    {
        for (const auto& [frame, path] : mEarlier)
        {
            if (InRange(frame))
                continue;
            std::error_code error;
            std::filesystem::remove(path, error);
            if (error)
            {
                outError =
                    "cannot remove the earlier frame " + Quoted(path) + ": " + error.message();
                return false;
            }
        }
        return true;
    }

    std::string Describe() const override { return mPattern; }

private:
    bool InRange(std::int64_t inFrame) const
    {
        return inFrame >= mInfo.mFirstFrame && inFrame - mInfo.mFirstFrame < mInfo.mFrameCount;
    }

    // The existing files of the pattern, by frame number: every match in the
    // folder when the number is in the file name, else those of the range.
    void FindEarlierFrames()
    {
        mEarlier.clear();
        const std::size_t slash = mPattern.rfind('/');
        const std::string name = slash == std::string::npos ? mPattern : mPattern.substr(slash + 1);
        if (CheckFramePattern(name).empty())
        {
            const std::filesystem::path directory =
                std::filesystem::path(FormatFramePath(mPattern, 0)).parent_path();
            std::error_code error;
            for (std::filesystem::directory_iterator
                     entry(directory.empty() ? std::filesystem::path(".") : directory, error),
                 last;
                 !error && entry != last; entry.increment(error))
            {
                const std::string file = entry->path().filename().string();
                if (const std::optional<std::int64_t> frame = MatchFramePath(name, file))
                    mEarlier.emplace(*frame, FormatFramePath(mPattern, *frame));
            }
            return;
        }
        for (std::int64_t frame = mInfo.mFirstFrame; InRange(frame); ++frame)
        {
            std::error_code error;
            const std::string path = FormatFramePath(mPattern, frame);
            if (std::filesystem::exists(path, error))
                mEarlier.emplace(frame, path);
        }
    }

    const std::string mPattern;
    const bool mOverwrite;
    StreamInfo mInfo;
    // Frame number to path of the files found by Begin.
    std::map<std::int64_t, std::string> mEarlier;
};

class Y4MWriter final : public FrameWriter
{
public:
    Y4MWriter(std::FILE* inFile, std::string inPath, Y4MChroma inChroma, bool inOverwrite)
        : mFile(inFile)
        , mPath(std::move(inPath))
        , mChroma(inChroma)
        , mOverwrite(inOverwrite)
    {
    }

    ~Y4MWriter() override
    {
        if (mOwnsFile && mFile)
        {
            PendingOutput::Get().RemoveStream(mFile);
            std::fclose(mFile);
        }
    }

    bool Begin(const StreamInfo& inInfo, std::string& outError) override
    {
        mInfo = inInfo;
        if (!mFile)
        {
            outError = MakeParentDirectory(mPath);
            if (!outError.empty())
                return false;
            std::error_code error;
            if (!mOverwrite && std::filesystem::exists(mPath, error))
            {
                outError = Quoted(mPath) + " exists; give --overwrite to replace it";
                return false;
            }
            mFile = std::fopen(mPath.c_str(), "wb");
            if (!mFile)
            {
                outError = "cannot create '" + mPath + "': " + ErrnoText(errno);
                return false;
            }
            mOwnsFile = true;
            PendingOutput::Get().AddStream(mFile);
        }
        const std::string header = MakeY4MHeader(inInfo, mChroma);
        return Write(header.data(), header.size(), outError);
    }

    bool Accepts(mt::PixelFormat inFormat) const override
    {
        return inFormat.IsRaster() && (!inFormat.IsPlanar() || mChroma == Y4MChroma::k420);
    }

    EncodedFrame Encode(std::int64_t inIndex, const FrameRef& inFrame) override
    {
        EncodedFrame encoded;
        encoded.mIndex = inIndex;
        const QRT::ParamRect bounds = inFrame->GetBounds();
        const std::uint32_t width = static_cast<std::uint32_t>(bounds.Width());
        const std::uint32_t height = static_cast<std::uint32_t>(bounds.Height());
        const mt::PixelFormat format = inFrame->GetPixelFormat();
        if (width != mInfo.mWidth || height != mInfo.mHeight)
        {
            encoded.mError = "frame " + std::to_string(inIndex) + " is " + std::to_string(width) +
                             "x" + std::to_string(height) + ", the stream " +
                             std::to_string(mInfo.mWidth) + "x" + std::to_string(mInfo.mHeight);
            return encoded;
        }
        if (!Accepts(format))
        {
            encoded.mError = "frame " + std::to_string(inIndex) + " is " +
                             std::string(mt::GetPixelFormatName(format)) +
                             ", which the stream's chroma sampling cannot take as it is";
            return encoded;
        }
        if (format == mt::kPixelFormat_YUV_420_8u_Planar)
        {
            encoded.mFrame = inFrame;
            return encoded;
        }
        FrameRef packed = inFrame;
        if (format != mt::kPixelFormat_BGRA_4444_8u && format != mt::kPixelFormat_VUYA_4444_8u)
        {
            packed = VF::CreateVideoFrame(mt::kPixelFormat_VUYA_4444_8u, width, height,
                                          inFrame->GetPixelAspectRatio(), false, false);
            const QRT::Result result =
                packed ? VF::VideoFrameManipulators::CopyFrame(inFrame, packed, mInfo.mQuality)
                       : VF::kResult_OutOfFrameMemory;
            if (QRT::Failed(result))
            {
                encoded.mError = "frame " + std::to_string(inIndex) +
                                 ": cannot convert to Y'CbCr (status " +
                                 std::to_string(static_cast<std::uint32_t>(result)) + ")";
                return encoded;
            }
        }
        PackPlanes(*packed, encoded.mBytes);
        return encoded;
    }

    bool Commit(EncodedFrame& ioFrame, std::string& outError) override
    {
        const bool written = ioFrame.mFrame
                                 ? WriteFrame(*ioFrame.mFrame, outError)
                                 : Write(ioFrame.mBytes.data(), ioFrame.mBytes.size(), outError);
        Discard(ioFrame);
        return written;
    }

    // Keeps the buffer for a later frame: its pages are touched already.
    void Discard(EncodedFrame& ioFrame) override
    {
        ioFrame.mFrame.Reset();
        if (ioFrame.mBytes.empty())
            return;
        std::lock_guard lock(mSpareMutex);
        if (mSpare.size() < kMaxSpareBuffers)
            mSpare.push_back(std::move(ioFrame.mBytes));
        ioFrame.mBytes = {};
    }

    bool Finish(std::string& outError) override
    {
        if (!mFile)
            return true;
        if (std::fflush(mFile) != 0)
        {
            outError = "writing " + Describe() + ": " + ErrnoText(errno);
            return false;
        }
        if (mOwnsFile)
        {
            PendingOutput::Get().RemoveStream(mFile);
            const int result = std::fclose(mFile);
            mFile = nullptr;
            if (result != 0)
            {
                outError = "writing " + Describe() + ": " + ErrnoText(errno);
                return false;
            }
        }
        return true;
    }

    std::string Describe() const override
    {
        return mPath.empty() ? std::string("standard output") : "'" + mPath + "'";
    }

private:
    static constexpr char kFrameTag[] = "FRAME\n";
    static constexpr std::size_t kTagSize = sizeof(kFrameTag) - 1;
    // Buffers kept for reuse; more frames than this are rarely in flight.
    static constexpr std::size_t kMaxSpareBuffers = 8;

    bool Write(const void* inData, std::size_t inSize, std::string& outError)
    {
        if (std::fwrite(inData, 1, inSize, mFile) == inSize)
            return true;
        outError = "writing " + Describe() + ": " + ErrnoText(errno);
        return false;
    }

    // "FRAME\n" and the planes of a planar 4:2:0 frame in one gathered write
    // (rows one by one when they are padded). The stream's lock is held
    // throughout, so that a forced exit's flush waits for the whole frame.
    bool WriteFrame(const MF::IVideoFrame& inFrame, std::string& outError)
    {
        std::vector<iovec> pieces;
        pieces.push_back({const_cast<char*>(kFrameTag), kTagSize});
        const std::size_t chromaWidth = (mInfo.mWidth + 1) / 2;
        const std::size_t chromaHeight = (mInfo.mHeight + 1) / 2;
        for (std::uint32_t plane = 0; plane < 3; ++plane)
        {
            const std::size_t width = plane == 0 ? mInfo.mWidth : chromaWidth;
            const std::size_t rows = plane == 0 ? mInfo.mHeight : chromaHeight;
            const auto rowBytes = static_cast<std::size_t>(inFrame.GetPlaneRowBytes(plane));
            auto* base =
                static_cast<std::uint8_t*>(const_cast<void*>(inFrame.GetPlaneBaseAddress(plane)));
            if (rowBytes == width)
                pieces.push_back({base, width * rows});
            else
                for (std::size_t y = 0; y < rows; ++y)
                    pieces.push_back({base + y * rowBytes, width});
        }
        flockfile(mFile);
        bool written = fflush_unlocked(mFile) == 0;
        const int descriptor = fileno(mFile);
        for (std::size_t next = 0; written && next < pieces.size();)
        {
            const int count =
                static_cast<int>(std::min<std::size_t>(pieces.size() - next, IOV_MAX));
            const ssize_t result = writev(descriptor, pieces.data() + next, count);
            if (result < 0)
            {
                written = errno == EINTR;
                continue;
            }
            // Skips what went out; a short write resumes inside a piece.
            auto left = static_cast<std::size_t>(result);
            while (next < pieces.size() && left >= pieces[next].iov_len)
                left -= pieces[next++].iov_len;
            if (left > 0)
            {
                pieces[next].iov_base = static_cast<std::uint8_t*>(pieces[next].iov_base) + left;
                pieces[next].iov_len -= left;
            }
        }
        const int error = errno;
        funlockfile(mFile);
        if (!written)
            outError = "writing " + Describe() + ": " + ErrnoText(error);
        return written;
    }

    // "FRAME\n", then the Y, Cb and Cr planes of a BGRA or VUYA frame, into
    // outBytes (a spare buffer when there is one).
    void PackPlanes(const MF::IVideoFrame& inFrame, std::vector<std::uint8_t>& outBytes)
    {
        const std::uint32_t width = mInfo.mWidth;
        const std::uint32_t height = mInfo.mHeight;
        const bool subsampled = mChroma == Y4MChroma::k420;
        const std::uint32_t chromaWidth = subsampled ? (width + 1) / 2 : width;
        const std::uint32_t chromaHeight = subsampled ? (height + 1) / 2 : height;
        const std::size_t lumaSize = std::size_t{width} * height;
        const std::size_t chromaSize = std::size_t{chromaWidth} * chromaHeight;
        {
            std::lock_guard lock(mSpareMutex);
            if (!mSpare.empty())
            {
                outBytes = std::move(mSpare.back());
                mSpare.pop_back();
            }
        }
        outBytes.resize(kTagSize + lumaSize + 2 * chromaSize);
        std::memcpy(outBytes.data(), kFrameTag, kTagSize);
        std::uint8_t* luma = outBytes.data() + kTagSize;
        std::uint8_t* cb = luma + lumaSize;
        std::uint8_t* cr = cb + chromaSize;
        const bool vuya = inFrame.GetPixelFormat() == mt::kPixelFormat_VUYA_4444_8u;
        // The formats and sizes are checked above, so the packing cannot fail.
        IR_PackYUVPlanes(inFrame.GetBaseAddress(), inFrame.GetRowBytes(),
                         vuya ? kIR_PixelFormat_VUYA_4444_8u : kIR_PixelFormat_BGRA_8u,
                         height < 720, luma, static_cast<std::int32_t>(width), cb,
                         static_cast<std::int32_t>(chromaWidth), cr,
                         static_cast<std::int32_t>(chromaWidth), subsampled,
                         static_cast<std::int32_t>(width), static_cast<std::int32_t>(height));
    }

    std::FILE* mFile;
    const std::string mPath;
    const Y4MChroma mChroma;
    const bool mOverwrite;
    bool mOwnsFile = false;
    StreamInfo mInfo;
    // Guards mSpare.
    std::mutex mSpareMutex;
    std::vector<std::vector<std::uint8_t>> mSpare;
};

} // namespace

void GetFrameRateRatio(mt::FrameRate inRate, std::int64_t& outNumerator,
                       std::int64_t& outDenominator)
{
    const std::int64_t ticks = inRate.GetTicksPerFrame();
    if (ticks <= 0)
    {
        outNumerator = 0;
        outDenominator = 1;
        return;
    }
    const std::int64_t divisor = std::gcd(mt::kTicksPerSecond, ticks);
    outNumerator = mt::kTicksPerSecond / divisor;
    outDenominator = ticks / divisor;
}

std::string MakeY4MHeader(const StreamInfo& inInfo, Y4MChroma inChroma)
{
    std::int64_t numerator = 0;
    std::int64_t denominator = 1;
    GetFrameRateRatio(inInfo.mFrameRate, numerator, denominator);
    const char interlace = inInfo.mFieldType == mt::kFieldType_UpperFirst   ? 't'
                           : inInfo.mFieldType == mt::kFieldType_LowerFirst ? 'b'
                                                                            : 'p';
    return "YUV4MPEG2 W" + std::to_string(inInfo.mWidth) + " H" + std::to_string(inInfo.mHeight) +
           " F" + std::to_string(numerator) + ":" + std::to_string(denominator) + " I" + interlace +
           " A" + std::to_string(inInfo.mPixelAspectRatio.GetNumerator()) + ":" +
           std::to_string(inInfo.mPixelAspectRatio.GetDenominator()) + " C" +
           (inChroma == Y4MChroma::k420 ? "420" : "444") + " XCOLORRANGE=LIMITED\n";
}

std::unique_ptr<FrameWriter> CreatePngSequenceWriter(std::string inPattern, bool inOverwrite)
{
    return std::make_unique<PngSequenceWriter>(std::move(inPattern), inOverwrite);
}

std::unique_ptr<FrameWriter> CreateY4MWriter(std::FILE* inFile, std::string inPath,
                                             Y4MChroma inChroma, bool inOverwrite)
{
    return std::make_unique<Y4MWriter>(inFile, std::move(inPath), inChroma, inOverwrite);
}

} // namespace vrender
