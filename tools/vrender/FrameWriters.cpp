#include "FrameWriters.h"

#include "Options.h"
#include "PendingOutput.h"
#include "VF/PngFile.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "mvxmediatypes/TickTime.h"

#include <cerrno>
#include <cmath>
#include <cstring>
#include <filesystem>
#include <map>
#include <numeric>
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

    EncodedFrame Encode(std::int64_t inIndex, const FrameRef& inFrame) override
    {
        EncodedFrame encoded;
        encoded.mIndex = inIndex;
        const QRT::ParamRect bounds = inFrame->GetBounds();
        const std::uint32_t width = static_cast<std::uint32_t>(bounds.Width());
        const std::uint32_t height = static_cast<std::uint32_t>(bounds.Height());
        if (width != mInfo.mWidth || height != mInfo.mHeight)
        {
            encoded.mError = "frame " + std::to_string(inIndex) + " is " + std::to_string(width) +
                             "x" + std::to_string(height) + ", the stream " +
                             std::to_string(mInfo.mWidth) + "x" + std::to_string(mInfo.mHeight);
            return encoded;
        }
        if (inFrame->GetPixelFormat() == mt::kPixelFormat_BGRA_4444_8u)
        {
            // The common case gets an integer kernel; the general conversion
            // below works in floating point and costs several times as much.
            std::vector<std::uint8_t> vuya(std::size_t{width} * height * 4);
            ConvertBGRAToVUYA(*inFrame, height < 720, vuya.data());
            PackPlanes(vuya.data(), std::size_t{width} * 4, encoded.mBytes);
            return encoded;
        }
        FrameRef yuv = inFrame;
        if (inFrame->GetPixelFormat() != mt::kPixelFormat_VUYA_4444_8u)
        {
            yuv = VF::CreateVideoFrame(mt::kPixelFormat_VUYA_4444_8u, width, height,
                                       inFrame->GetPixelAspectRatio(), false, false);
            const QRT::Result result =
                yuv ? VF::VideoFrameManipulators::CopyFrame(inFrame, yuv, mInfo.mQuality)
                    : VF::kResult_OutOfFrameMemory;
            if (QRT::Failed(result))
            {
                encoded.mError = "frame " + std::to_string(inIndex) +
                                 ": cannot convert to Y'CbCr (status " +
                                 std::to_string(static_cast<std::uint32_t>(result)) + ")";
                return encoded;
            }
        }
        PackPlanes(static_cast<const std::uint8_t*>(yuv->GetBaseAddress()),
                   static_cast<std::size_t>(yuv->GetRowBytes()), encoded.mBytes);
        return encoded;
    }

    bool Commit(EncodedFrame& ioFrame, std::string& outError) override
    {
        return Write(ioFrame.mBytes.data(), ioFrame.mBytes.size(), outError);
    }

    void Discard(EncodedFrame& ioFrame) override { ioFrame.mBytes.clear(); }

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
    bool Write(const void* inData, std::size_t inSize, std::string& outError)
    {
        if (std::fwrite(inData, 1, inSize, mFile) == inSize)
            return true;
        outError = "writing " + Describe() + ": " + ErrnoText(errno);
        return false;
    }

    // Video-range Y'CbCr of 8-bit BGRA in VUYA byte order, with the matrix
    // the image renderer uses for a frame of this height, in 16-bit fixed point.
    void ConvertBGRAToVUYA(const MF::IVideoFrame& inFrame, bool inMatrix601,
                           std::uint8_t* outPixels) const
    {
        const double kr = inMatrix601 ? 0.299 : 0.2126;
        const double kb = inMatrix601 ? 0.114 : 0.0722;
        const double kg = 1.0 - kr - kb;
        const double luma = 219.0 / 255.0;
        const double chroma = 224.0 / 255.0;
        auto fixed = [](double inValue)
        { return static_cast<std::int32_t>(std::lround(inValue * 65536.0)); };
        const std::int32_t yR = fixed(luma * kr), yG = fixed(luma * kg), yB = fixed(luma * kb);
        const std::int32_t uR = fixed(-chroma * kr / (2 * (1 - kb))),
                           uG = fixed(-chroma * kg / (2 * (1 - kb))), uB = fixed(chroma * 0.5);
        const std::int32_t vR = fixed(chroma * 0.5), vG = fixed(-chroma * kg / (2 * (1 - kr))),
                           vB = fixed(-chroma * kb / (2 * (1 - kr)));
        constexpr std::int32_t kRound = 1 << 15;
        const auto* base = static_cast<const std::uint8_t*>(inFrame.GetBaseAddress());
        const std::size_t rowBytes = static_cast<std::size_t>(inFrame.GetRowBytes());
        for (std::uint32_t y = 0; y < mInfo.mHeight; ++y)
        {
            const std::uint8_t* row = base + y * rowBytes;
            std::uint8_t* out = outPixels + std::size_t{y} * mInfo.mWidth * 4;
            for (std::uint32_t x = 0; x < mInfo.mWidth; ++x)
            {
                const std::int32_t b = row[4 * x], g = row[4 * x + 1], r = row[4 * x + 2];
                // Every result lies inside 16..240 by construction; no clamping.
                out[4 * x] = static_cast<std::uint8_t>(
                    ((128 << 16) + vR * r + vG * g + vB * b + kRound) >> 16);
                out[4 * x + 1] = static_cast<std::uint8_t>(
                    ((128 << 16) + uR * r + uG * g + uB * b + kRound) >> 16);
                out[4 * x + 2] = static_cast<std::uint8_t>(
                    ((16 << 16) + yR * r + yG * g + yB * b + kRound) >> 16);
                out[4 * x + 3] = row[4 * x + 3];
            }
        }
    }

    // "FRAME\n", then the Y plane, then Cb, then Cr, from rows of VUYA bytes
    // (V = Cr, U = Cb, Y, A).
    void PackPlanes(const std::uint8_t* inBase, std::size_t inRowBytes,
                    std::vector<std::uint8_t>& outBytes) const
    {
        const std::uint32_t width = mInfo.mWidth;
        const std::uint32_t height = mInfo.mHeight;
        const bool subsampled = mChroma == Y4MChroma::k420;
        const std::uint32_t chromaWidth = subsampled ? (width + 1) / 2 : width;
        const std::uint32_t chromaHeight = subsampled ? (height + 1) / 2 : height;
        static constexpr char kFrameTag[] = "FRAME\n";
        const std::size_t tagSize = sizeof(kFrameTag) - 1;
        const std::size_t lumaSize = std::size_t{width} * height;
        const std::size_t chromaSize = std::size_t{chromaWidth} * chromaHeight;
        outBytes.resize(tagSize + lumaSize + 2 * chromaSize);
        std::memcpy(outBytes.data(), kFrameTag, tagSize);
        std::uint8_t* luma = outBytes.data() + tagSize;
        std::uint8_t* cb = luma + lumaSize;
        std::uint8_t* cr = cb + chromaSize;

        const std::uint8_t* base = inBase;
        const std::size_t rowBytes = inRowBytes;
        for (std::uint32_t y = 0; y < height; ++y)
        {
            const std::uint8_t* row = base + y * rowBytes;
            std::uint8_t* lumaRow = luma + std::size_t{y} * width;
            for (std::uint32_t x = 0; x < width; ++x)
                lumaRow[x] = row[4 * x + 2];
            if (!subsampled)
            {
                std::uint8_t* cbRow = cb + std::size_t{y} * width;
                std::uint8_t* crRow = cr + std::size_t{y} * width;
                for (std::uint32_t x = 0; x < width; ++x)
                {
                    cbRow[x] = row[4 * x + 1];
                    crRow[x] = row[4 * x];
                }
            }
        }
        if (!subsampled)
            return;
        for (std::uint32_t cy = 0; cy < chromaHeight; ++cy)
        {
            const std::uint8_t* top = base + (2 * cy) * rowBytes;
            // The last row of an odd height has no partner below.
            const std::uint8_t* bottom = 2 * cy + 1 < height ? top + rowBytes : top;
            std::uint8_t* cbRow = cb + std::size_t{cy} * chromaWidth;
            std::uint8_t* crRow = cr + std::size_t{cy} * chromaWidth;
            for (std::uint32_t cx = 0; cx < chromaWidth; ++cx)
            {
                const std::uint32_t left = 4 * (2 * cx);
                const std::uint32_t right = 2 * cx + 1 < width ? left + 4 : left;
                const unsigned sumCb =
                    top[left + 1] + top[right + 1] + bottom[left + 1] + bottom[right + 1];
                const unsigned sumCr = top[left] + top[right] + bottom[left] + bottom[right];
                cbRow[cx] = static_cast<std::uint8_t>((sumCb + 2) / 4);
                crRow[cx] = static_cast<std::uint8_t>((sumCr + 2) / 4);
            }
        }
    }

    std::FILE* mFile;
    const std::string mPath;
    const Y4MChroma mChroma;
    const bool mOverwrite;
    bool mOwnsFile = false;
    StreamInfo mInfo;
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
