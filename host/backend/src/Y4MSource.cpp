// Y4M video files: a text header ("YUV4MPEG2 W.. H.. F.. I.. A.. C.."),
// then frames, each a "FRAME" line followed by the planes Y, Cb, Cr of 8-bit
// samples. Opening parses the header and walks the file once to index the
// offset of every frame's pixels, so a malformed file is refused before
// anything is read from it, and a frame is later read with a single
// positional read. A file whose last frame is cut short (a recording that
// stopped, a copy that did not finish) keeps its complete frames: the cut
// frame stays in the index and its read fails, and the open status notes it.
// Reads of different frames may run on many threads at once: the descriptor
// is only read with pread.

#include "BE/MediaStatus.h"
#include "BE/VideoSources.h"
#include "FileUtilities.h"
#include "IR/ImageRenderer.h"
#include "QRT/Allocated.h"
#include "VF/VideoFrame.h"
#include "VideoSourceBase.h"
#include "mvxcore/utility/Strings.h"

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <charconv>
#include <cstring>
#include <fcntl.h>
#include <memory>
#include <unistd.h>
#include <vector>

namespace BE
{

using detail::FrameRef;
using mvxmediatypes::PixelFormat;

namespace
{

constexpr std::string_view kMagic = "YUV4MPEG2";
// Longer header or frame lines are refused as malformed.
constexpr std::size_t kMaxLineLength = 4096;
// Pictures of 720 rows and more use BT.709, smaller ones BT.601.
constexpr std::uint32_t kBT709MinimumHeight = 720;

enum class Chroma
{
    k420,
    k422,
    k444,
};

struct Y4MHeader
{
    std::uint32_t mWidth = 0;
    std::uint32_t mHeight = 0;
    std::int64_t mRateNumerator = 0;
    std::int64_t mRateDenominator = 0;
    mvxmediatypes::FieldType mFieldType = mvxmediatypes::kFieldType_Progressive;
    mvxmediatypes::PixelAspectRatio mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    Chroma mChroma = Chroma::k420;

    std::uint32_t ChromaWidth() const
    {
        return mChroma == Chroma::k444 ? mWidth : (mWidth + 1) / 2;
    }
    std::uint32_t ChromaHeight() const
    {
        return mChroma == Chroma::k420 ? (mHeight + 1) / 2 : mHeight;
    }
    std::uint64_t FrameBytes() const
    {
        return std::uint64_t{mWidth} * mHeight + 2 * std::uint64_t{ChromaWidth()} * ChromaHeight();
    }
};

// The descriptor, closed with the last owner.
class FileDescriptor
{
public:
    explicit FileDescriptor(int inDescriptor)
        : mDescriptor(inDescriptor)
    {
    }
    ~FileDescriptor()
    {
        if (mDescriptor >= 0)
            close(mDescriptor);
    }
    FileDescriptor(const FileDescriptor&) = delete;
    FileDescriptor& operator=(const FileDescriptor&) = delete;
    int Get() const { return mDescriptor; }

private:
    const int mDescriptor;
};

bool ParseInt(std::string_view inText, std::int64_t& outValue)
{
    if (inText.empty())
        return false;
    const char* end = inText.data() + inText.size();
    const auto [ptr, error] = std::from_chars(inText.data(), end, outValue);
    return error == std::errc() && ptr == end;
}

bool ParseRatio(std::string_view inText, std::int64_t& outFirst, std::int64_t& outSecond)
{
    const std::size_t colon = inText.find(':');
    return colon != std::string_view::npos && ParseInt(inText.substr(0, colon), outFirst) &&
           ParseInt(inText.substr(colon + 1), outSecond);
}

// Parses the header line (without its newline). Answers an empty text or
// the problem.
std::string ParseHeader(std::string_view inLine, Y4MHeader& outHeader, QRT::Result& outStatus)
{
    outStatus = kResult_MediaMalformed;
    if (inLine.substr(0, kMagic.size()) != kMagic ||
        (inLine.size() > kMagic.size() && inLine[kMagic.size()] != ' '))
        return "not a Y4M file (no YUV4MPEG2 signature)";
    bool haveWidth = false;
    bool haveHeight = false;
    bool haveRate = false;
    std::string_view rest = inLine.substr(kMagic.size());
    while (!rest.empty())
    {
        const std::size_t space = rest.find(' ');
        const std::string_view token = rest.substr(0, space);
        rest = space == std::string_view::npos ? std::string_view() : rest.substr(space + 1);
        if (token.empty())
            continue;
        const std::string_view value = token.substr(1);
        const std::string tokenText(token);
        std::int64_t first = 0;
        std::int64_t second = 0;
        switch (token[0])
        {
        case 'W':
        case 'H':
            if (!ParseInt(value, first) || first <= 0 || first > VF::kMaxFrameDimension)
                return "bad picture size '" + tokenText + "' (1..32768)";
            (token[0] == 'W' ? outHeader.mWidth : outHeader.mHeight) =
                static_cast<std::uint32_t>(first);
            (token[0] == 'W' ? haveWidth : haveHeight) = true;
            break;
        case 'F':
            if (!ParseRatio(value, first, second) || first <= 0 || second <= 0 ||
                first > 1'000'000'000 || second > 1'000'000'000 || first > second * 1000 ||
                first * 1000 < second)
                return "bad frame rate '" + tokenText + "'";
            outHeader.mRateNumerator = first;
            outHeader.mRateDenominator = second;
            haveRate = true;
            break;
        case 'I':
            if (value == "p" || value == "m" || value == "?")
                outHeader.mFieldType = mvxmediatypes::kFieldType_Progressive;
            else if (value == "t")
                outHeader.mFieldType = mvxmediatypes::kFieldType_UpperFirst;
            else if (value == "b")
                outHeader.mFieldType = mvxmediatypes::kFieldType_LowerFirst;
            else
                return "bad interlacing '" + tokenText + "'";
            break;
        case 'A':
            if (!ParseRatio(value, first, second) || first < 0 || second < 0 ||
                first > UINT32_MAX || second > UINT32_MAX || ((first == 0) != (second == 0)))
                return "bad pixel aspect ratio '" + tokenText + "'";
            // 0:0 means unknown, which is read as square.
            if (first != 0)
                outHeader.mPixelAspectRatio = mvxmediatypes::PixelAspectRatio(
                    static_cast<std::uint32_t>(first), static_cast<std::uint32_t>(second));
            break;
        case 'C':
            if (value == "420jpeg" || value == "420paldv" || value == "420mpeg2" || value == "420")
                outHeader.mChroma = Chroma::k420;
            else if (value == "422")
                outHeader.mChroma = Chroma::k422;
            else if (value == "444")
                outHeader.mChroma = Chroma::k444;
            else
            {
                outStatus = kResult_MediaUnsupported;
                return "unsupported colour space '" + tokenText +
                       "' (8-bit 420, 422 and 444 are read)";
            }
            break;
        case 'X':
            break;
        default:
            return "unknown header field '" + tokenText + "'";
        }
    }
    if (!haveWidth || !haveHeight)
        return "the header gives no picture size (W and H)";
    if (!haveRate)
        return "the header gives no frame rate (F)";
    outStatus = QRT::kResult_Success;
    return {};
}

// Reads the line at inOffset (at most kMaxLineLength bytes before the
// newline). False when no newline comes in time or the file ends.
bool ReadLine(int inDescriptor, std::uint64_t inOffset, std::string& outLine)
{
    char buffer[kMaxLineLength + 1];
    const std::size_t count = detail::ReadAt(inDescriptor, inOffset, buffer, sizeof(buffer));
    const std::string_view text(buffer, count);
    const std::size_t newline = text.find('\n');
    if (newline == std::string_view::npos)
        return false;
    outLine.assign(text.substr(0, newline));
    return true;
}

// Scratch memory of the calling thread, one block per slot, kept from frame
// to frame so that a read touches no fresh pages; its content is undefined.
std::uint8_t* ThreadScratch(std::size_t inSlot, std::size_t inBytes)
{
    thread_local std::unique_ptr<std::uint8_t[]> sBlocks[2];
    thread_local std::size_t sSizes[2] = {};
    if (sSizes[inSlot] < inBytes)
    {
        sBlocks[inSlot] = std::make_unique_for_overwrite<std::uint8_t[]>(inBytes);
        sSizes[inSlot] = inBytes;
    }
    return sBlocks[inSlot].get();
}

class Y4MSource : public detail::VideoSourceBase
{
public:
    Y4MSource(detail::SourceDescription inDescription, const Y4MHeader& inHeader,
              std::shared_ptr<FileDescriptor> inFile, std::vector<std::uint64_t> inOffsets,
              std::int64_t inCutFrame, std::string inCutReason)
        : VideoSourceBase(std::move(inDescription))
        , mHeader(inHeader)
        , mFile(std::move(inFile))
        , mOffsets(std::move(inOffsets))
        , mCutFrame(inCutFrame)
        , mCutReason(std::move(inCutReason))
    {
    }

    // The cut frame is the one read that fails for a reason the source
    // knows; any other read that fails leaves no reason.
    std::string GetLastReadFailure() const override
    {
        return mLastReadWasCut.load(std::memory_order_relaxed) ? mCutReason : std::string();
    }

protected:
    QRT::Result ProduceFrame(std::int64_t inIndex, PixelFormat inFormat,
                             FrameRef& outFrame) override
    {
        mLastReadWasCut.store(inIndex == mCutFrame, std::memory_order_relaxed);
        if (inIndex == mCutFrame)
            return kResult_MediaMalformed;
        const std::uint64_t offset = mOffsets[static_cast<std::size_t>(inIndex)];
        if (inFormat == mvxmediatypes::kPixelFormat_YUV_420_8u_Planar)
            return ReadPlanes(offset, outFrame);
        const std::uint64_t frameBytes = mHeader.FrameBytes();
        std::uint8_t* samples = ThreadScratch(0, frameBytes);
        if (detail::ReadAt(mFile->Get(), offset, samples, frameBytes) != frameBytes)
            return kResult_MediaMalformed;

        FrameRef frame;
        const QRT::Result created =
            VF::CreateVideoFrame(inFormat, mHeader.mWidth, mHeader.mHeight,
                                 mHeader.mPixelAspectRatio, false, false, frame);
        if (QRT::Failed(created))
            return created;

        const std::uint32_t width = mHeader.mWidth;
        const std::uint32_t height = mHeader.mHeight;
        const std::uint32_t chromaWidth = mHeader.ChromaWidth();
        const std::uint8_t* lumaPlane = samples;
        const std::uint8_t* cbPlane = lumaPlane + std::size_t{width} * height;
        const std::uint8_t* crPlane = cbPlane + std::size_t{chromaWidth} * mHeader.ChromaHeight();
        auto* base = static_cast<std::uint8_t*>(frame->GetWritableBaseAddress());
        const std::int32_t rowBytes = frame->GetRowBytes();
        const bool matrix601 = height < kBT709MinimumHeight;

        if (inFormat == mvxmediatypes::kPixelFormat_BGRA_4444_8u && mHeader.mChroma == Chroma::k420)
        {
            const auto chromaStride = static_cast<std::int32_t>(chromaWidth);
            const std::int32_t status = IR_ConvertYUV420Planes(
                lumaPlane, static_cast<std::int32_t>(width), cbPlane, chromaStride, crPlane,
                chromaStride, matrix601, base, rowBytes, kIR_PixelFormat_BGRA_8u,
                static_cast<std::int32_t>(width), static_cast<std::int32_t>(height));
            if (status != kIR_NoError)
                return kResult_MediaUnsupported;
        }
        else if (inFormat == mvxmediatypes::kPixelFormat_YUYV_422_8u)
        {
            // Offered for 4:2:2 files of even width only: the samples map one to one.
            for (std::uint32_t y = 0; y < height; ++y)
            {
                std::uint8_t* out = base + std::size_t{y} * rowBytes;
                const std::uint8_t* luma = lumaPlane + std::size_t{y} * width;
                const std::uint8_t* cb = cbPlane + std::size_t{y} * chromaWidth;
                const std::uint8_t* cr = crPlane + std::size_t{y} * chromaWidth;
                for (std::uint32_t pair = 0; pair < width / 2; ++pair)
                {
                    out[pair * 4 + 0] = luma[pair * 2];
                    out[pair * 4 + 1] = cb[pair];
                    out[pair * 4 + 2] = luma[pair * 2 + 1];
                    out[pair * 4 + 3] = cr[pair];
                }
            }
        }
        else
        {
            // VUYA 4:4:4, either delivered as such or staged for the
            // conversion to BGRA; subsampled chroma is repeated.
            const bool staged = inFormat != mvxmediatypes::kPixelFormat_VUYA_4444_8u;
            const std::int32_t stagingRowBytes = static_cast<std::int32_t>(width) * 4;
            std::uint8_t* staging =
                staged ? ThreadScratch(1, std::size_t{width} * 4 * height) : nullptr;
            std::uint8_t* vuyaBase = staged ? staging : base;
            const std::int32_t vuyaRowBytes = staged ? stagingRowBytes : rowBytes;
            for (std::uint32_t y = 0; y < height; ++y)
            {
                const std::uint32_t chromaRow = mHeader.mChroma == Chroma::k420 ? y / 2 : y;
                std::uint8_t* out = vuyaBase + std::size_t{y} * vuyaRowBytes;
                const std::uint8_t* luma = lumaPlane + std::size_t{y} * width;
                const std::uint8_t* cb = cbPlane + std::size_t{chromaRow} * chromaWidth;
                const std::uint8_t* cr = crPlane + std::size_t{chromaRow} * chromaWidth;
                const std::uint32_t shift = mHeader.mChroma == Chroma::k444 ? 0 : 1;
                for (std::uint32_t x = 0; x < width; ++x)
                {
                    out[x * 4 + 0] = cr[x >> shift];
                    out[x * 4 + 1] = cb[x >> shift];
                    out[x * 4 + 2] = luma[x];
                    out[x * 4 + 3] = 255;
                }
            }
            if (staged)
            {
                const IR_PixelFormat source =
                    kIR_PixelFormat_VUYA_4444_8u |
                    (matrix601 ? kIR_FormatBit_BT601 : kIR_FormatBit_BT709);
                const std::int32_t status = IR_Convert(
                    staging, stagingRowBytes, source, base, rowBytes, kIR_PixelFormat_BGRA_8u,
                    static_cast<std::int32_t>(width), static_cast<std::int32_t>(height),
                    mvxmediatypes::kRenderQuality_Max);
                if (status != kIR_NoError)
                    return kResult_MediaUnsupported;
            }
        }
        outFrame = std::move(frame);
        return QRT::kResult_Success;
    }

    QRT::InterfaceRef<Deprecated::IMediaInfo> Reopen() const override
    {
        VideoSourceRef source;
        if (!OpenY4MSource(GetDescription().mMediaPath, source).Succeeded())
            return {};
        return source;
    }

private:
    // The file's planes straight into a planar 4:2:0 frame: one read per
    // plane when its rows are unpadded, else through scratch memory.
    QRT::Result ReadPlanes(std::uint64_t inOffset, FrameRef& outFrame) const
    {
        FrameRef frame;
        const QRT::Result created =
            VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_YUV_420_8u_Planar, mHeader.mWidth,
                                 mHeader.mHeight, mHeader.mPixelAspectRatio, false, false, frame);
        if (QRT::Failed(created))
            return created;
        const std::uint32_t widths[3] = {mHeader.mWidth, mHeader.ChromaWidth(),
                                         mHeader.ChromaWidth()};
        const std::uint32_t heights[3] = {mHeader.mHeight, mHeader.ChromaHeight(),
                                          mHeader.ChromaHeight()};
        std::uint64_t offset = inOffset;
        for (std::uint32_t plane = 0; plane < 3; ++plane)
        {
            auto* base = static_cast<std::uint8_t*>(frame->GetWritablePlaneBaseAddress(plane));
            const auto rowBytes = static_cast<std::size_t>(frame->GetPlaneRowBytes(plane));
            const std::size_t width = widths[plane];
            const std::size_t bytes = width * heights[plane];
            std::uint8_t* target = rowBytes == width ? base : ThreadScratch(0, bytes);
            if (detail::ReadAt(mFile->Get(), offset, target, bytes) != bytes)
                return kResult_MediaMalformed;
            if (target != base)
                for (std::size_t y = 0; y < heights[plane]; ++y)
                    std::memcpy(base + y * rowBytes, target + y * width, width);
            offset += bytes;
        }
        outFrame = std::move(frame);
        return QRT::kResult_Success;
    }

    const Y4MHeader mHeader;
    const std::shared_ptr<FileDescriptor> mFile;
    // The file offset of every frame's first sample.
    const std::vector<std::uint64_t> mOffsets;
    // The index of the last frame when the file cuts it short, else -1.
    const std::int64_t mCutFrame;
    const std::string mCutReason;
    std::atomic<bool> mLastReadWasCut{false};
};

OpenStatus Fail(const std::string& inPath, QRT::Result inStatus, const std::string& inProblem)
{
    return OpenStatus{inStatus, inPath + ": " + inProblem};
}

} // namespace

OpenStatus OpenY4MSource(const std::string& inPath, VideoSourceRef& outSource)
{
    outSource.Reset();
    // Without O_NONBLOCK, opening a FIFO waits for a writer that may never
    // come; the identity check below refuses everything but regular files.
    const int descriptor = open(inPath.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
    if (descriptor < 0)
        return Fail(inPath, kResult_MediaCannotOpen, detail::DescribeErrno(errno));
    auto file = std::make_shared<FileDescriptor>(descriptor);
    detail::FileIdentity identity;
    if (!detail::GetFileIdentity(descriptor, inPath, identity))
        return Fail(inPath, kResult_MediaCannotOpen, "not a regular file");

    std::string line;
    if (!ReadLine(descriptor, 0, line))
        return Fail(inPath, kResult_MediaMalformed,
                    identity.mSize == 0
                        ? "the file is empty"
                        : "no Y4M header line (no newline in the first 4096 bytes)");
    Y4MHeader header;
    QRT::Result status = QRT::kResult_Success;
    const std::string problem = ParseHeader(line, header, status);
    if (!problem.empty())
        return Fail(inPath, status, problem);

    // Index every frame. The end of the file may cut the last frame short,
    // in its FRAME line or in its samples; everything else is damage.
    const std::uint64_t frameBytes = header.FrameBytes();
    std::vector<std::uint64_t> offsets;
    std::string cut;
    std::uint64_t position = line.size() + 1;
    while (position < identity.mSize && cut.empty())
    {
        const std::string frameName = "frame " + std::to_string(offsets.size());
        const std::uint64_t remaining = identity.mSize - position;
        if (!ReadLine(descriptor, position, line))
        {
            char start[5] = {};
            const std::size_t count = detail::ReadAt(descriptor, position, start, sizeof(start));
            if (remaining > kMaxLineLength || offsets.empty() ||
                std::string_view(start, count) != std::string_view("FRAME").substr(0, count))
                return Fail(inPath, kResult_MediaMalformed,
                            frameName + " at byte " + std::to_string(position) +
                                ": no FRAME line (file truncated or damaged)");
            cut = frameName + " is truncated: 0 of " + std::to_string(frameBytes) + " bytes";
            line.clear();
        }
        else if (line.substr(0, 5) != "FRAME" || (line.size() > 5 && line[5] != ' '))
            return Fail(inPath, kResult_MediaMalformed,
                        frameName + " at byte " + std::to_string(position) +
                            ": expected a FRAME line");
        const std::uint64_t data = std::min(position + line.size() + 1, identity.mSize);
        if (cut.empty() && data + frameBytes > identity.mSize)
        {
            cut = frameName + " is truncated: " + std::to_string(identity.mSize - data) + " of " +
                  std::to_string(frameBytes) + " bytes";
            if (offsets.empty())
                return Fail(inPath, kResult_MediaMalformed, cut);
        }
        offsets.push_back(data);
        position = data + frameBytes;
    }
    if (offsets.empty())
        return Fail(inPath, kResult_MediaMalformed, "the file holds no frames");
    const std::int64_t cutFrame = cut.empty() ? -1 : static_cast<std::int64_t>(offsets.size()) - 1;

    detail::SourceDescription description;
    description.mMediaPath = inPath;
    description.mIdentity = "y4m|" + identity.ToText();
    description.mName = mvxcore::utility::UTF8to16(inPath);
    description.mWidth = header.mWidth;
    description.mHeight = header.mHeight;
    description.mFrameRate =
        mvxmediatypes::FrameRate::Create(header.mRateNumerator, header.mRateDenominator);
    description.mFieldType = header.mFieldType;
    description.mPixelAspectRatio = header.mPixelAspectRatio;
    description.mAlpha = mvxmediatypes::kAlphaChannel_None;
    description.mStill = false;
    description.mImage = false;
    description.mPrefetchWanted = true;
    description.mKind = Deprecated::kMediaInfoKind_Clip;
    description.mFrameCount = static_cast<std::int64_t>(offsets.size());
    description.mPixelFormats = {mvxmediatypes::kPixelFormat_BGRA_4444_8u,
                                 mvxmediatypes::kPixelFormat_VUYA_4444_8u};
    // 4:2:0 files hand their planes over unconverted to whoever asks for them.
    if (header.mChroma == Chroma::k420)
        description.mPixelFormats.push_back(mvxmediatypes::kPixelFormat_YUV_420_8u_Planar);
    if (header.mChroma == Chroma::k422 && header.mWidth % 2 == 0)
        description.mPixelFormats.push_back(mvxmediatypes::kPixelFormat_YUYV_422_8u);
    description.mColorProfile.mName = header.mHeight < kBT709MinimumHeight ? "BT.601" : "BT.709";

    outSource = QRT::Allocated<Y4MSource>::Create<Deprecated::IVideoSource>(
        std::move(description), header, std::move(file), std::move(offsets), cutFrame,
        cut.empty() ? std::string() : inPath + ": " + cut);
    if (!cut.empty())
        return OpenStatus{QRT::kResult_Success, inPath + ": " + cut};
    return {};
}

} // namespace BE
