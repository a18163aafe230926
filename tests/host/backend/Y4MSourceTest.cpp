#include "BE/MediaStatus.h"
#include "BackendTestSupport.h"

#include <algorithm>
#include <cmath>

#include <gtest/gtest.h>

namespace
{

using namespace betest;

struct Yuv
{
    int mY;
    int mCb;
    int mCr;
};

// A Y4M file whose frame i has every sample of each plane set to inFrames[i].
std::string MakeY4M(const std::string& inHeader, int inWidth, int inHeight, int inChromaWidth,
                    int inChromaHeight, const std::vector<Yuv>& inFrames)
{
    std::string bytes = inHeader + "\n";
    for (const Yuv& frame : inFrames)
    {
        bytes += "FRAME\n";
        bytes.append(std::size_t(inWidth) * inHeight, char(frame.mY));
        bytes.append(std::size_t(inChromaWidth) * inChromaHeight, char(frame.mCb));
        bytes.append(std::size_t(inChromaWidth) * inChromaHeight, char(frame.mCr));
    }
    return bytes;
}

// Video-range Y'CbCr to 8-bit B, G, R by the matrix's luma weights.
std::array<int, 4> ExpectedBgra(const Yuv& inYuv, bool inBT601)
{
    const double kr = inBT601 ? 0.299 : 0.2126;
    const double kb = inBT601 ? 0.114 : 0.0722;
    const double y = (inYuv.mY - 16) * 255.0 / 219.0;
    const double cb = (inYuv.mCb - 128) * 255.0 / 224.0;
    const double cr = (inYuv.mCr - 128) * 255.0 / 224.0;
    const double red = y + 2 * (1 - kr) * cr;
    const double blue = y + 2 * (1 - kb) * cb;
    const double green = (y - kr * red - kb * blue) / (1 - kr - kb);
    auto clamp = [](double inValue) { return int(std::lround(std::clamp(inValue, 0.0, 255.0))); };
    return Bgra(clamp(blue), clamp(green), clamp(red));
}

void ExpectNear(const std::array<int, 4>& inActual, const std::array<int, 4>& inExpected)
{
    for (int channel = 0; channel < 4; ++channel)
        EXPECT_NEAR(inActual[channel], inExpected[channel], 1) << "channel " << channel;
}

class Y4MSourceTest : public ::testing::Test
{
protected:
    BE::VideoSourceRef Write(const std::string& inName, const std::string& inBytes)
    {
        mPath = mDirectory.File(inName);
        WriteBytes(mPath, inBytes);
        return OpenOrFail(mPath);
    }

    BE::OpenStatus WriteAndFail(const std::string& inName, const std::string& inBytes)
    {
        mPath = mDirectory.File(inName);
        WriteBytes(mPath, inBytes);
        BE::VideoSourceRef source;
        const BE::OpenStatus status = BE::OpenVideoSource(mPath, source);
        EXPECT_FALSE(source);
        return status;
    }

    TempDirectory mDirectory;
    std::string mPath;
};

const Yuv kReddish{81, 90, 240};
const Yuv kGreenish{145, 54, 34};
const Yuv kBluish{41, 240, 110};

TEST_F(Y4MSourceTest, Reads420FramesByIndexAsBgra)
{
    const BE::VideoSourceRef source =
        Write("a.y4m", MakeY4M("YUV4MPEG2 W8 H6 F25:1 Ip A1:1 C420jpeg", 8, 6, 4, 3,
                               {kReddish, kGreenish, kBluish}));
    EXPECT_EQ(source->GetBounds(), QRT::ParamRect(0, 0, 8, 6));
    EXPECT_EQ(source->GetFrameRate(), mvxmediatypes::kFrameRate_Video25);
    EXPECT_EQ(source->GetColorProfile().mName, "BT.601");
    const auto rate = mvxmediatypes::kFrameRate_Video25;
    const Yuv frames[] = {kReddish, kGreenish, kBluish};
    // Read out of order: frames are found by index, not by reading on.
    for (int index : {2, 0, 1})
    {
        const FrameRef frame = ReadFrameOrFail(source, TickTime::FromFrame(index, rate));
        ASSERT_TRUE(frame);
        EXPECT_EQ(frame->GetPixelFormat(), mvxmediatypes::kPixelFormat_BGRA_4444_8u);
        ExpectNear(Pixel(frame, 0, 0), ExpectedBgra(frames[index], true));
        ExpectNear(Pixel(frame, 7, 5), ExpectedBgra(frames[index], true));
    }
    FrameRef frame;
    EXPECT_EQ(ReadFrame(source, TickTime::FromFrame(3, rate), frame), BE::kResult_FrameOutOfRange);
    EXPECT_EQ(ReadFrame(source, TickTime::FromFrame(-1, rate), frame), BE::kResult_FrameOutOfRange);
    EXPECT_FALSE(frame);
    EXPECT_FALSE(source->IsPrefetchWanted(TickTime::FromFrame(3, rate)));
    EXPECT_TRUE(source->IsPrefetchWanted(TickTime::FromFrame(2, rate)));
    EXPECT_EQ(QRT::QueryRef<BE::Deprecated::IMediaInfo>(source)->GetDuration(),
              TickTime::FromFrame(3, rate));
}

TEST_F(Y4MSourceTest, Reads422And444Frames)
{
    const BE::VideoSourceRef yuv422 =
        Write("b.y4m", MakeY4M("YUV4MPEG2 W6 H4 F30:1 C422", 6, 4, 3, 4, {kGreenish}));
    ExpectNear(Pixel(ReadFrameOrFail(yuv422, TickTime()), 5, 3), ExpectedBgra(kGreenish, true));
    const BE::VideoSourceRef yuv444 =
        Write("c.y4m", MakeY4M("YUV4MPEG2 W5 H3 F30:1 C444", 5, 3, 5, 3, {kBluish, kReddish}));
    ExpectNear(Pixel(ReadFrameOrFail(yuv444, TickTime()), 4, 2), ExpectedBgra(kBluish, true));
    ExpectNear(Pixel(ReadFrameOrFail(yuv444, TickTime::FromFrame(1, yuv444->GetFrameRate())), 0, 0),
               ExpectedBgra(kReddish, true));
}

TEST_F(Y4MSourceTest, TallPicturesUseBT709)
{
    const BE::VideoSourceRef source =
        Write("hd.y4m", MakeY4M("YUV4MPEG2 W4 H720 F50:1 C420", 4, 720, 2, 360, {kReddish}));
    EXPECT_EQ(source->GetColorProfile().mName, "BT.709");
    const FrameRef frame = ReadFrameOrFail(source, TickTime());
    ExpectNear(Pixel(frame, 3, 719), ExpectedBgra(kReddish, false));
    EXPECT_NE(ExpectedBgra(kReddish, false), ExpectedBgra(kReddish, true));
}

TEST_F(Y4MSourceTest, YuvFormatsAreDeliveredWhenAskedFor)
{
    const BE::VideoSourceRef source =
        Write("d.y4m", MakeY4M("YUV4MPEG2 W4 H2 F25:1 C422", 4, 2, 2, 2, {kGreenish}));
    const auto formats = source->GetPixelFormats();
    ASSERT_EQ(formats.size(), 3u);
    EXPECT_EQ(formats[0], mvxmediatypes::kPixelFormat_BGRA_4444_8u);
    BE::VideoFrameRequest request;
    request.mPixelFormat = mvxmediatypes::kPixelFormat_VUYA_4444_8u;
    const FrameRef vuya = ReadFrameOrFail(source, TickTime(), request);
    EXPECT_EQ(vuya->GetPixelFormat(), mvxmediatypes::kPixelFormat_VUYA_4444_8u);
    EXPECT_EQ(Pixel(vuya, 3, 1), (std::array<int, 4>{34, 54, 145, 255}));
    request.mPixelFormat = mvxmediatypes::kPixelFormat_YUYV_422_8u;
    const FrameRef yuyv = ReadFrameOrFail(source, TickTime(), request);
    EXPECT_EQ(yuyv->GetPixelFormat(), mvxmediatypes::kPixelFormat_YUYV_422_8u);
    EXPECT_EQ(Pixel(yuyv, 1, 1), (std::array<int, 4>{145, 54, 145, 34}));
}

TEST_F(Y4MSourceTest, HeaderGivesRateAspectAndFieldOrder)
{
    const BE::VideoSourceRef upper =
        Write("e.y4m", MakeY4M("YUV4MPEG2 W4 H4 F30000:1001 It A10:11 C444 XYSCSS=444", 4, 4, 4, 4,
                               {kReddish}));
    EXPECT_EQ(upper->GetFrameRate(), mvxmediatypes::kFrameRate_Video2997);
    EXPECT_EQ(upper->GetFieldType(), mvxmediatypes::kFieldType_UpperFirst);
    EXPECT_EQ(upper->GetPixelAspectRatio(), mvxmediatypes::PixelAspectRatio(10, 11));
    const FrameRef frame = ReadFrameOrFail(upper, TickTime());
    EXPECT_EQ(frame->GetFieldType(), mvxmediatypes::kFieldType_UpperFirst);
    EXPECT_EQ(frame->GetPixelAspectRatio(), mvxmediatypes::PixelAspectRatio(10, 11));
    const BE::VideoSourceRef lower =
        Write("f.y4m", MakeY4M("YUV4MPEG2 W4 H4 F25:1 Ib A0:0", 4, 4, 2, 2, {kReddish}));
    EXPECT_EQ(lower->GetFieldType(), mvxmediatypes::kFieldType_LowerFirst);
    EXPECT_EQ(lower->GetPixelAspectRatio(), mvxmediatypes::kPixelAspectRatio_Square);
}

TEST_F(Y4MSourceTest, FrameKeysFollowTheFile)
{
    const std::string bytes = MakeY4M("YUV4MPEG2 W4 H4 F25:1", 4, 4, 2, 2, {kReddish, kBluish});
    const BE::VideoSourceRef first = Write("g.y4m", bytes);
    const BE::VideoSourceRef again = OpenOrFail(mPath);
    const auto frame1 = TickTime::FromFrame(1, mvxmediatypes::kFrameRate_Video25);
    const auto key = first->GetFrameKey(frame1, {}, {}, {});
    EXPECT_EQ(key, again->GetFrameKey(frame1, {}, {}, {}));
    EXPECT_NE(key, first->GetFrameKey(TickTime(), {}, {}, {}));
    // The same content in another file is other material.
    const BE::VideoSourceRef other = Write("h.y4m", bytes);
    EXPECT_NE(key, other->GetFrameKey(frame1, {}, {}, {}));
}

TEST_F(Y4MSourceTest, TruncatedAndMalformedFilesAreRefused)
{
    std::string bytes = MakeY4M("YUV4MPEG2 W4 H4 F25:1", 4, 4, 2, 2, {kReddish, kBluish});
    BE::OpenStatus status = WriteAndFail("t.y4m", bytes.substr(0, bytes.size() - 14));
    EXPECT_EQ(status.mResult, BE::kResult_MediaMalformed);
    EXPECT_EQ(status.mMessage, mPath + ": frame 1 is truncated: 10 of 24 bytes");

    status = WriteAndFail("u.y4m", bytes.substr(0, 25));
    EXPECT_EQ(status.mResult, BE::kResult_MediaMalformed);
    EXPECT_EQ(status.mMessage, mPath + ": frame 0 at byte 22: no FRAME line (file truncated or "
                                       "damaged)");

    status = WriteAndFail("v.y4m", std::string(5000, '\x7f'));
    EXPECT_EQ(status.mMessage, mPath + ": no Y4M header line (no newline in the first 4096 bytes)");
    status = WriteAndFail("w.y4m", "RIFF1234\nFRAME\n");
    EXPECT_EQ(status.mMessage, mPath + ": not a Y4M file (no YUV4MPEG2 signature)");
    status = WriteAndFail("x.y4m", "");
    EXPECT_EQ(status.mMessage, mPath + ": the file is empty");
    status = WriteAndFail("y.y4m", "YUV4MPEG2 W4 H4 F25:1\n");
    EXPECT_EQ(status.mMessage, mPath + ": the file holds no frames");
    status = WriteAndFail("z.y4m", "YUV4MPEG2 W4 H4\nFRAME\n");
    EXPECT_EQ(status.mMessage, mPath + ": the header gives no frame rate (F)");
    status = WriteAndFail("aa.y4m", "YUV4MPEG2 W0 H4 F25:1\n");
    EXPECT_EQ(status.mMessage, mPath + ": bad picture size 'W0' (1..32768)");
    status = WriteAndFail("ab.y4m", "YUV4MPEG2 W4 H4 F25:0\n");
    EXPECT_EQ(status.mMessage, mPath + ": bad frame rate 'F25:0'");
    status = WriteAndFail("ac.y4m", "YUV4MPEG2 W4 H4 F25:1 C420p10\n");
    EXPECT_EQ(status.mResult, BE::kResult_MediaUnsupported);
    EXPECT_EQ(status.mMessage,
              mPath + ": unsupported colour space 'C420p10' (8-bit 420, 422 and 444 are read)");
    bytes.replace(bytes.find("FRAME", 30), 5, "FRAMX");
    status = WriteAndFail("ad.y4m", bytes);
    EXPECT_EQ(status.mMessage, mPath + ": frame 1 at byte 52: expected a FRAME line");

    BE::VideoSourceRef source;
    status = BE::OpenVideoSource(mDirectory.File("missing.y4m"), source);
    EXPECT_EQ(status.mResult, BE::kResult_MediaCannotOpen);
    EXPECT_NE(status.mMessage.find("No such file or directory"), std::string::npos);
}

TEST_F(Y4MSourceTest, FileCutShortAfterOpeningFailsTheRead)
{
    const std::string bytes = MakeY4M("YUV4MPEG2 W4 H4 F25:1", 4, 4, 2, 2, {kReddish, kBluish});
    const BE::VideoSourceRef source = Write("cut.y4m", bytes);
    WriteBytes(mPath, bytes.substr(0, bytes.size() - 5));
    FrameRef frame;
    EXPECT_EQ(ReadFrame(source, TickTime::FromFrame(1, mvxmediatypes::kFrameRate_Video25), frame),
              BE::kResult_MediaMalformed);
    EXPECT_FALSE(frame);
    EXPECT_EQ(ReadFrame(source, TickTime(), frame), QRT::kResult_Success);
}

} // namespace
