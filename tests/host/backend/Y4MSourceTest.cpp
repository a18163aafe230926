#include "BE/MediaStatus.h"
#include "BackendTestSupport.h"

#include <algorithm>
#include <cstring>
#include <sys/stat.h>
#include <tuple>

#include <gtest/gtest.h>

namespace
{

using namespace betest;
using namespace mvxmediatypes;

// A frame colour as video-range Y'CbCr and as 8-bit BGRA by the BT.601 and BT.709 matrices.
struct Yuv
{
    int mY, mCb, mCr;
    std::array<int, 4> mBT601, mBT709;
};

const Yuv kColours[] = {{81, 90, 240, Bgra(0, 0, 254), Bgra(0, 24, 255)},
                        {145, 54, 34, Bgra(1, 255, 0), Bgra(0, 216, 0)},
                        {41, 240, 110, Bgra(255, 0, 0), Bgra(255, 15, 0)}};

const Yuv& Colour(char inName)
{
    return kColours[inName == 'R' ? 0 : inName == 'G' ? 1 : 2];
}

// A Y4M file of inWidth x inHeight with one frame per letter of inFrames (R, G
// or B), every sample of each plane set to the letter's colour.
std::string MakeY4M(const std::string& inHeader, int inWidth, int inHeight, const char* inFrames)
{
    const bool fullWidth = inHeader.find("C444") != std::string::npos;
    const bool fullHeight = fullWidth || inHeader.find("C422") != std::string::npos;
    const std::size_t chroma = std::size_t(fullWidth ? inWidth : (inWidth + 1) / 2) *
                               (fullHeight ? inHeight : (inHeight + 1) / 2);
    std::string bytes = inHeader + "\n";
    for (const char* name = inFrames; *name; ++name)
    {
        const Yuv& frame = Colour(*name);
        bytes += "FRAME\n";
        bytes.append(std::size_t(inWidth) * inHeight, char(frame.mY));
        bytes.append(chroma, char(frame.mCb));
        bytes.append(chroma, char(frame.mCr));
    }
    return bytes;
}

void ExpectNear(const std::array<int, 4>& inActual, const std::array<int, 4>& inExpected)
{
    for (int channel = 0; channel < 4; ++channel)
        EXPECT_NEAR(inActual[channel], inExpected[channel], 1) << "channel " << channel;
}

class Y4MFiles
{
protected:
    BE::OpenStatus Open(const std::string& inBytes, BE::VideoSourceRef& outSource)
    {
        mPath = mDirectory.File("clip" + std::to_string(++mFiles) + ".y4m");
        WriteBytes(mPath, inBytes);
        return BE::OpenVideoSource(mPath, outSource);
    }
    BE::VideoSourceRef Write(const std::string& inBytes)
    {
        BE::VideoSourceRef source;
        Open(inBytes, source);
        return OpenOrFail(mPath);
    }

    TempDirectory mDirectory;
    std::string mPath;
    int mFiles = 0;
};

class Y4MSourceTest : public ::testing::Test, protected Y4MFiles
{
};

// A header, its picture size and its frames' colours.
struct Variant
{
    const char* header;
    int width, height;
    const char* frames;
    FrameRate rate;
    FieldType field;
    PixelAspectRatio par;
};

class Y4MVariantTest : public ::testing::TestWithParam<Variant>, protected Y4MFiles
{
};

TEST_P(Y4MVariantTest, HeaderIsDescribedAndEveryFrameReadsAsBgra)
{
    const Variant& v = GetParam();
    const BE::VideoSourceRef source = Write(MakeY4M(v.header, v.width, v.height, v.frames));
    ASSERT_TRUE(source);
    // Pictures from 720 rows use BT.709.
    const bool bt601 = v.height < 720;
    EXPECT_EQ(source->GetBounds(), QRT::ParamRect(0, 0, v.width, v.height));
    EXPECT_EQ(source->GetColorProfile().mName, bt601 ? "BT.601" : "BT.709");
    EXPECT_EQ(source->GetFrameRate(), v.rate);
    EXPECT_EQ(source->GetFieldType(), v.field);
    EXPECT_EQ(source->GetPixelAspectRatio(), v.par);
    // Read last to first: frames are found by index, not by reading on.
    for (int index = int(std::strlen(v.frames)) - 1; index >= 0; --index)
    {
        const FrameRef frame = ReadFrameOrFail(source, TickTime::FromFrame(index, v.rate));
        ASSERT_TRUE(frame);
        EXPECT_EQ(frame->GetFieldType(), v.field);
        const auto& expected =
            bt601 ? Colour(v.frames[index]).mBT601 : Colour(v.frames[index]).mBT709;
        ExpectNear(Pixel(frame, 0, 0), expected);
        ExpectNear(Pixel(frame, v.width - 1, v.height - 1), expected);
    }
}

const FrameRate k25 = kFrameRate_Video25;
const FrameRate k2997 = kFrameRate_Video2997;
const FieldType kP = kFieldType_Progressive;
const FieldType kUF = kFieldType_UpperFirst;

// Without C: 4:2:0; A0:0 (unknown): square.
const Variant kVariants[] = {
    {"YUV4MPEG2 W8 H6 F25:1 Ip A1:1 C420jpeg", 8, 6, "RGB", k25, kP, {1, 1}},
    {"YUV4MPEG2 W6 H4 F30:1 C422", 6, 4, "G", kFrameRate_Video30, kP, {1, 1}},
    {"YUV4MPEG2 W4 H720 F25:1 C420", 4, 720, "R", k25, kP, {1, 1}},
    {"YUV4MPEG2 W4 H4 F30000:1001 It A10:11 C444 XYSCSS=444", 4, 4, "B", k2997, kUF, {10, 11}},
    {"YUV4MPEG2 W4 H4 F25:1 Ib A0:0", 4, 4, "GR", k25, kFieldType_LowerFirst, {1, 1}}};
INSTANTIATE_TEST_SUITE_P(Variants, Y4MVariantTest, ::testing::ValuesIn(kVariants));

TEST_F(Y4MSourceTest, FramesBeyondTheFileAreOutOfRangeAndKeysFollowTheFile)
{
    const auto rate = kFrameRate_Video25;
    const std::string bytes = MakeY4M("YUV4MPEG2 W4 H2 F25:1 C422", 4, 2, "GRB");
    const BE::VideoSourceRef source = Write(bytes);
    FrameRef frame;
    EXPECT_EQ(ReadFrame(source, TickTime::FromFrame(3, rate), frame), BE::kResult_FrameOutOfRange);
    EXPECT_EQ(ReadFrame(source, TickTime::FromFrame(-1, rate), frame), BE::kResult_FrameOutOfRange);
    EXPECT_FALSE(source->IsPrefetchWanted(TickTime::FromFrame(3, rate)));
    EXPECT_TRUE(source->IsPrefetchWanted(TickTime::FromFrame(2, rate)));
    EXPECT_EQ(QRT::QueryRef<BE::Deprecated::IMediaInfo>(source)->GetDuration(),
              TickTime::FromFrame(3, rate));
    // YUV formats are delivered when asked for.
    const auto InFormat = [&](PixelFormat inFormat)
    { return ReadFrameOrFail(source, TickTime(), {.mPixelFormat = inFormat}); };
    EXPECT_EQ(Pixel(InFormat(kPixelFormat_VUYA_4444_8u), 3, 1), Bgra(34, 54, 145));
    EXPECT_EQ(Pixel(InFormat(kPixelFormat_YUYV_422_8u), 1, 1), Bgra(145, 54, 145, 34));
    // Keys are stable across opens; the same content in another file is other material.
    const auto key = source->GetFrameKey(TickTime(), {}, {}, {});
    EXPECT_EQ(key, OpenOrFail(mPath)->GetFrameKey(TickTime(), {}, {}, {}));
    EXPECT_NE(key, source->GetFrameKey(TickTime::FromFrame(1, rate), {}, {}, {}));
    EXPECT_NE(key, Write(bytes)->GetFrameKey(TickTime(), {}, {}, {}));
}

TEST_F(Y4MSourceTest, DamagedFilesAreRefusedWithTheirReason)
{
    const std::string bytes = MakeY4M("YUV4MPEG2 W4 H4 F25:1", 4, 4, "RB");
    std::string misspelt = bytes;
    misspelt.replace(misspelt.find("FRAME", 30), 5, "FRAMX");
    const QRT::Result malformed = BE::kResult_MediaMalformed;
    const std::tuple<std::string, QRT::Result, std::string> cases[] = {
        {bytes.substr(0, 36), malformed, "frame 0 is truncated: 8 of 24 bytes"},
        {bytes.substr(0, 25), malformed,
         "frame 0 at byte 22: no FRAME line (file truncated or damaged)"},
        {misspelt, malformed, "frame 1 at byte 52: expected a FRAME line"},
        {bytes + "FRAXE", malformed,
         "frame 2 at byte 82: no FRAME line (file truncated or damaged)"},
        {std::string(5000, '\x7f'), malformed,
         "no Y4M header line (no newline in the first 4096 bytes)"},
        {"RIFF1234\nFRAME\n", malformed, "not a Y4M file (no YUV4MPEG2 signature)"},
        {"YUV4MPEG2 W4 H4 F25:1\n", malformed, "the file holds no frames"},
        {"YUV4MPEG2 W4 H4\nFRAME\n", malformed, "the header gives no frame rate (F)"},
        {"YUV4MPEG2 W0 H4 F25:1\n", malformed, "bad picture size 'W0' (1..32768)"},
        {"YUV4MPEG2 W4 H4 F25:0\n", malformed, "bad frame rate 'F25:0'"},
        {"YUV4MPEG2 W4 H4 F25:1 C420p10\n", BE::kResult_MediaUnsupported,
         "unsupported colour space 'C420p10' (8-bit 420, 422 and 444 are read)"}};
    for (const auto& [content, result, reason] : cases)
    {
        BE::VideoSourceRef source;
        const BE::OpenStatus status = Open(content, source);
        EXPECT_EQ(status.mResult, result) << reason;
        EXPECT_EQ(status.mMessage, mPath + ": " + reason);
    }
    // Nothing but a regular file is opened: a FIFO would wait for a writer.
    const std::string fifo = mDirectory.File("fifo.y4m");
    ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
    const std::pair<std::string, std::string> unopened[] = {
        {mDirectory.File("missing.y4m"), "No such file or directory"},
        {fifo, fifo + ": not a regular file (a FIFO)"},
        {mDirectory.File(""), "not a regular file (a directory)"}};
    for (const auto& [path, reason] : unopened)
    {
        BE::VideoSourceRef source;
        const BE::OpenStatus status = BE::OpenVideoSource(path, source);
        EXPECT_EQ(status.mResult, BE::kResult_MediaCannotOpen);
        EXPECT_NE(status.mMessage.find(reason), std::string::npos) << status.mMessage;
    }
    BE::VideoSourceRef direct;
    EXPECT_EQ(BE::OpenY4MSource(fifo, direct).mMessage, fifo + ": not a regular file");

    // A file cut short after opening fails the read of the lost frame only.
    const BE::VideoSourceRef cut = Write(bytes);
    WriteBytes(mPath, bytes.substr(0, bytes.size() - 5));
    FrameRef frame;
    EXPECT_EQ(ReadFrame(cut, TickTime::FromFrame(1, kFrameRate_Video25), frame),
              BE::kResult_MediaMalformed);
    EXPECT_EQ(ReadFrame(cut, TickTime(), frame), QRT::kResult_Success);
}

TEST_F(Y4MSourceTest, ALastFrameCutShortKeepsTheCompleteFrames)
{
    const std::string bytes = MakeY4M("YUV4MPEG2 W4 H4 F25:1", 4, 4, "RGB");
    // Cut inside the last frame's samples, and inside its FRAME line.
    const std::pair<std::size_t, std::string> cuts[] = {
        {bytes.size() - 14, "frame 2 is truncated: 10 of 24 bytes"},
        {bytes.size() - 27, "frame 2 is truncated: 0 of 24 bytes"}};
    for (const auto& [size, reason] : cuts)
    {
        SCOPED_TRACE(reason);
        BE::VideoSourceRef source;
        const BE::OpenStatus status = Open(bytes.substr(0, size), source);
        ASSERT_TRUE(status.Succeeded());
        EXPECT_EQ(status.mMessage, mPath + ": " + reason);
        EXPECT_EQ(QRT::QueryRef<BE::Deprecated::IMediaInfo>(source)->GetDuration(),
                  TickTime::FromFrame(3, kFrameRate_Video25));
        for (int index = 0; index < 2; ++index)
            ExpectNear(
                Pixel(ReadFrameOrFail(source, TickTime::FromFrame(index, kFrameRate_Video25)), 1,
                      1),
                Colour("RG"[index]).mBT601);
        FrameRef frame;
        EXPECT_EQ(ReadFrame(source, TickTime::FromFrame(2, kFrameRate_Video25), frame),
                  BE::kResult_MediaMalformed);
    }
}

// 4:2:0 files offer their planes as they are: a planar request (of any size)
// gets the file's samples in the frame's planes (padded rows or not), and no
// other request is answered with a planar frame.
TEST_F(Y4MSourceTest, A420FileHandsItsPlanesOverUnconverted)
{
    for (const auto& [width, height] : {std::pair(37, 9), std::pair(128, 2)})
    {
        SCOPED_TRACE(width);
        const int chromaWidth = (width + 1) / 2, chromaHeight = (height + 1) / 2;
        const std::size_t frameBytes = width * height + 2 * chromaWidth * chromaHeight;
        std::string samples;
        for (std::size_t i = 0; i < 2 * frameBytes; ++i)
            samples += char(i * 7 + i / 5);
        const BE::VideoSourceRef source =
            Write("YUV4MPEG2 W" + std::to_string(width) + " H" + std::to_string(height) +
                  " F25:1\nFRAME\n" + samples.substr(0, frameBytes) + "FRAME\n" +
                  samples.substr(frameBytes));
        ASSERT_TRUE(source);
        const std::vector<PixelFormat> formats = source->GetPixelFormats();
        EXPECT_EQ(std::count(formats.begin(), formats.end(), kPixelFormat_YUV_420_8u_Planar), 1);
        BE::VideoFrameRequest request;
        request.mPixelFormat = kPixelFormat_YUYV_422_8u;
        EXPECT_EQ(ReadFrameOrFail(source, TickTime::FromFrame(1, k25), request)->GetPixelFormat(),
                  kPixelFormat_VUYA_4444_8u);
        // Also a planar request of another size: the planes keep the file's.
        request.mPixelFormat = kPixelFormat_YUV_420_8u_Planar;
        std::tie(request.mWidth, request.mHeight) = std::pair(width / 2, height + 2);
        const FrameRef frame = ReadFrameOrFail(source, TickTime::FromFrame(1, k25), request);
        ASSERT_TRUE(frame && frame->GetPixelFormat() == request.mPixelFormat);
        ASSERT_EQ(frame->GetBounds(), QRT::ParamRect(0, 0, width, height));
        ASSERT_EQ(frame->GetPlaneCount(), 3u);
        std::string read;
        for (std::uint32_t plane = 0; plane < 3; ++plane)
        {
            const auto* base = static_cast<const char*>(frame->GetPlaneBaseAddress(plane));
            for (int y = 0; y < (plane ? chromaHeight : height); ++y)
                read.append(base + y * frame->GetPlaneRowBytes(plane), plane ? chromaWidth : width);
        }
        EXPECT_TRUE(read == samples.substr(frameBytes)) << "the planes differ from the file";
    }
}

} // namespace
