#include "BE/MediaStatus.h"
#include "BE/PatternSettings.h"
#include "BackendTestSupport.h"
#include "ContractExpect.h"
#include "VF/VideoFrame.h"

#include <gtest/gtest.h>

namespace
{

using namespace betest;
using BE::Deprecated::kFrameRequestFlag_NoBlock;
using mvxmediatypes::FrameRate;

TickTime FrameTime(std::int64_t inFrame, FrameRate inRate = mvxmediatypes::kFrameRate_Video25)
{
    return TickTime::FromFrame(inFrame, inRate);
}

// The left edge of the moving box in the given row, or -1 when the row shows no box.
int BoxLeft(const FrameRef& inFrame, int inRow)
{
    for (int x = 0; x < inFrame->GetBounds().Width(); ++x)
        if (Pixel(inFrame, x, inRow) == Bgra(224, 224, 224))
            return x;
    return -1;
}

class PatternSourceTest : public ::testing::Test
{
};

TEST_F(PatternSourceTest, BarsHaveTheSevenColoursAtTheirColumns)
{
    const BE::VideoSourceRef source = OpenOrFail("pattern:bars?size=70x4");
    const FrameRef frame = ReadFrameOrFail(source, TickTime());
    const std::array<std::array<int, 4>, 7> expected = {
        Bgra(191, 191, 191), Bgra(0, 191, 191), Bgra(191, 191, 0), Bgra(0, 191, 0),
        Bgra(191, 0, 191),   Bgra(0, 0, 191),   Bgra(191, 0, 0)};
    for (int bar = 0; bar < 7; ++bar)
    {
        EXPECT_EQ(Pixel(frame, bar * 10, 0), expected[bar]) << "bar " << bar;
        EXPECT_EQ(Pixel(frame, bar * 10 + 9, 3), expected[bar]) << "bar " << bar;
    }
    EXPECT_EQ(frame->GetPixelFormat(), mvxmediatypes::kPixelFormat_BGRA_4444_8u);
    EXPECT_EQ(frame->GetAlphaChannel(), mvxmediatypes::kAlphaChannel_None);
    EXPECT_TRUE(frame->IsShared());
}

TEST_F(PatternSourceTest, SolidColourIsExactEverywhere)
{
    const BE::VideoSourceRef source = OpenOrFail("pattern:solid?size=9x5&color=12ab7F");
    const FrameRef frame = ReadFrameOrFail(source, TickTime());
    for (int y = 0; y < 5; ++y)
        for (int x = 0; x < 9; ++x)
            ASSERT_EQ(Pixel(frame, x, y), Bgra(0x7F, 0xAB, 0x12)) << x << "," << y;
}

TEST_F(PatternSourceTest, GradientRampsFromFirstToLastColumn)
{
    const BE::VideoSourceRef source = OpenOrFail("pattern:gradient?size=5x1&from=000000&to=FF0040");
    const FrameRef frame = ReadFrameOrFail(source, TickTime());
    EXPECT_EQ(Pixel(frame, 0, 0), Bgra(0, 0, 0));
    EXPECT_EQ(Pixel(frame, 1, 0), Bgra(16, 0, 64));
    EXPECT_EQ(Pixel(frame, 2, 0), Bgra(32, 0, 128));
    EXPECT_EQ(Pixel(frame, 3, 0), Bgra(48, 0, 191));
    EXPECT_EQ(Pixel(frame, 4, 0), Bgra(64, 0, 255));
}

TEST_F(PatternSourceTest, MovingBoxAdvancesEveryFrame)
{
    // 64 x 32: an 8-pixel box on the bottom row, 2 pixels per field period,
    // wrapping over 57 positions.
    const BE::VideoSourceRef source = OpenOrFail("pattern:moving?size=64x32&rate=25");
    const std::pair<int, int> expected[] = {{0, 0}, {1, 4}, {3, 12}, {15, 3}, {-1, 53}};
    for (const auto& [frameIndex, left] : expected)
    {
        const FrameRef frame = ReadFrameOrFail(source, FrameTime(frameIndex));
        EXPECT_EQ(BoxLeft(frame, 31), left) << "frame " << frameIndex;
        EXPECT_EQ(BoxLeft(frame, 24), left) << "frame " << frameIndex;
        EXPECT_EQ(Pixel(frame, left + 7, 31), Bgra(224, 224, 224));
        if (left + 8 < 64)
        {
            EXPECT_EQ(Pixel(frame, left + 8, 31), Bgra(48, 48, 48));
        }
        EXPECT_EQ(BoxLeft(frame, 23), -1) << "the box is 8 rows high";
    }
}

TEST_F(PatternSourceTest, FrameNumberDigitsDifferBetweenFrames)
{
    // Cells of 2 pixels from (2, 2): the top row of '0' is lit across, that
    // of '1' only in the middle column.
    const BE::VideoSourceRef source = OpenOrFail("pattern:moving?size=64x32");
    const FrameRef zero = ReadFrameOrFail(source, FrameTime(0));
    const FrameRef one = ReadFrameOrFail(source, FrameTime(1));
    const FrameRef twelve = ReadFrameOrFail(source, FrameTime(12));
    const auto yellow = Bgra(0, 255, 255);
    const auto grey = Bgra(48, 48, 48);
    EXPECT_EQ(Pixel(zero, 2, 2), yellow);
    EXPECT_EQ(Pixel(zero, 6, 3), yellow);
    EXPECT_EQ(Pixel(one, 2, 2), grey);
    EXPECT_EQ(Pixel(one, 4, 2), yellow);
    // '1' then '2': the second glyph starts at x = 10; the middle row of '2'
    // (glyph row 2, y = 6) is lit across, its fourth row (y = 8) only on the left.
    EXPECT_EQ(Pixel(twelve, 10, 8), yellow);
    EXPECT_EQ(Pixel(twelve, 14, 8), grey);
    EXPECT_EQ(Pixel(twelve, 14, 6), yellow);
    EXPECT_EQ(Pixel(zero, 10, 6), grey) << "frame 0 has one digit only";
}

TEST_F(PatternSourceTest, InterlacedPatternDrawsEachFieldAtItsOwnTime)
{
    // Frame 2: the earlier field at phase 4 (box at 8), the later at phase 5 (box at 10).
    const FrameRef upper =
        ReadFrameOrFail(OpenOrFail("pattern:moving?size=64x32&field=upper"), FrameTime(2));
    EXPECT_EQ(upper->GetFieldType(), mvxmediatypes::kFieldType_UpperFirst);
    EXPECT_EQ(BoxLeft(upper, 30), 8);
    EXPECT_EQ(BoxLeft(upper, 28), 8);
    EXPECT_EQ(BoxLeft(upper, 31), 10);
    EXPECT_EQ(BoxLeft(upper, 29), 10);

    const FrameRef lower =
        ReadFrameOrFail(OpenOrFail("pattern:moving?size=64x32&field=lower"), FrameTime(2));
    EXPECT_EQ(lower->GetFieldType(), mvxmediatypes::kFieldType_LowerFirst);
    EXPECT_EQ(BoxLeft(lower, 31), 8);
    EXPECT_EQ(BoxLeft(lower, 30), 10);

    const FrameRef progressive =
        ReadFrameOrFail(OpenOrFail("pattern:moving?size=64x32"), FrameTime(2));
    EXPECT_EQ(BoxLeft(progressive, 31), 8);
    EXPECT_EQ(BoxLeft(progressive, 30), 8);
}

TEST_F(PatternSourceTest, ScaledInterlacedFrameKeepsItsFieldsApart)
{
    const BE::VideoSourceRef source = OpenOrFail("pattern:moving?size=64x32&field=upper");
    BE::VideoFrameRequest request;
    request.mWidth = 64;
    request.mHeight = 16;
    const FrameRef frame = ReadFrameOrFail(source, FrameTime(2), request);
    ASSERT_EQ(frame->GetBounds().Height(), 16);
    EXPECT_EQ(BoxLeft(frame, 14), 8);
    EXPECT_EQ(BoxLeft(frame, 15), 10);
}

TEST_F(PatternSourceTest, StraightAlphaKeepsColourAndSetsOpacity)
{
    const BE::VideoSourceRef source =
        OpenOrFail("pattern:solid?size=4x4&color=204060&alpha=straight&opacity=100");
    const FrameRef frame = ReadFrameOrFail(source, TickTime());
    EXPECT_EQ(Pixel(frame, 3, 3), Bgra(0x60, 0x40, 0x20, 100));
    EXPECT_EQ(frame->GetAlphaChannel(), mvxmediatypes::kAlphaChannel_Straight);
    EXPECT_EQ(source->GetAlphaChannel(), mvxmediatypes::kAlphaChannel_Straight);
    EXPECT_EQ(source->GetMatteColor().GetValue(), 0u);
}

TEST_F(PatternSourceTest, PremultipliedAlphaIsOverTheMatteColour)
{
    // round((100 * c + 155 * 255) / 255) for c = 0x20, 0x40, 0x60.
    const BE::VideoSourceRef source = OpenOrFail(
        "pattern:solid?size=4x4&color=204060&alpha=premultiplied&opacity=100&matte=FFFFFF");
    const FrameRef frame = ReadFrameOrFail(source, TickTime());
    EXPECT_EQ(Pixel(frame, 0, 0), Bgra(193, 180, 168, 100));
    EXPECT_EQ(frame->GetAlphaChannel(), mvxmediatypes::kAlphaChannel_Premultiplied);
    EXPECT_EQ(source->GetMatteColor().GetRGB24(), 0xFFFFFFu);

    const FrameRef overBlack = ReadFrameOrFail(
        OpenOrFail("pattern:solid?size=4x4&color=204060&alpha=premultiplied&opacity=100"),
        TickTime());
    EXPECT_EQ(Pixel(overBlack, 0, 0), Bgra(38, 25, 13, 100));
}

TEST_F(PatternSourceTest, RequestedSizeAndAspectAreHonoured)
{
    const BE::VideoSourceRef source = OpenOrFail("pattern:solid?size=64x32&color=336699&par=10:11");
    BE::VideoFrameRequest request;
    request.mWidth = 16;
    request.mHeight = 8;
    const FrameRef frame = ReadFrameOrFail(source, TickTime(), request);
    EXPECT_EQ(frame->GetBounds(), QRT::ParamRect(0, 0, 16, 8));
    EXPECT_EQ(Pixel(frame, 15, 7), Bgra(0x99, 0x66, 0x33));
    EXPECT_EQ(frame->GetPixelAspectRatio(), mvxmediatypes::PixelAspectRatio(10, 11));
}

TEST_F(PatternSourceTest, DescriptionFollowsThePattern)
{
    const BE::VideoSourceRef moving =
        OpenOrFail("pattern:moving?size=720x486&rate=29.97&field=lower&par=10:11");
    EXPECT_EQ(moving->GetFrameRate(), mvxmediatypes::kFrameRate_Video2997);
    EXPECT_EQ(moving->GetFieldType(), mvxmediatypes::kFieldType_LowerFirst);
    EXPECT_EQ(moving->GetBounds(), QRT::ParamRect(0, 0, 720, 486));
    EXPECT_FALSE(moving->IsStill());
    EXPECT_FALSE(moving->IsImage());
    const auto movingInfo = QRT::QueryRef<BE::Deprecated::IMediaInfo>(moving);
    ASSERT_TRUE(movingInfo);
    EXPECT_EQ(movingInfo->GetKind(), BE::Deprecated::kMediaInfoKind_Clip);
    EXPECT_EQ(movingInfo->GetDuration(), mvxmediatypes::kTime_Max);

    const BE::VideoSourceRef bars = OpenOrFail("pattern:bars");
    EXPECT_TRUE(bars->IsStill());
    EXPECT_EQ(QRT::QueryRef<BE::Deprecated::IMediaInfo>(bars)->GetKind(),
              BE::Deprecated::kMediaInfoKind_TimeInvariant);
    EXPECT_EQ(bars->GetBounds(), QRT::ParamRect(0, 0, 1920, 1080));
}

TEST_F(PatternSourceTest, NoBlockRequestAnswersOnlyHeldFrames)
{
    const BE::VideoSourceRef source = OpenOrFail("pattern:moving?size=32x16");
    FrameRef frame;
    EXPECT_EQ(ReadFrame(source, FrameTime(3), frame, kFrameRequestFlag_NoBlock),
              BE::kResult_FrameNotReady);
    EXPECT_FALSE(frame);
    const FrameRef read = ReadFrameOrFail(source, FrameTime(3));
    EXPECT_EQ(ReadFrame(source, FrameTime(3), frame, kFrameRequestFlag_NoBlock),
              QRT::kResult_Success);
    EXPECT_EQ(frame.Get(), read.Get());
}

TEST_F(PatternSourceTest, PrefetchHoldKeepsEveryFrameReadWhileItLasts)
{
    const BE::VideoSourceRef source = OpenOrFail("pattern:moving?size=16x16");
    BE::Deprecated::PrefetchHold hold = source->GetPrefetchHold();
    ASSERT_TRUE(hold);
    for (int frame = 0; frame < 10; ++frame)
        ReadFrameOrFail(source, FrameTime(frame));
    FrameRef frame;
    for (int index = 0; index < 10; ++index)
        EXPECT_EQ(ReadFrame(source, FrameTime(index), frame, kFrameRequestFlag_NoBlock),
                  QRT::kResult_Success)
            << index;
    hold.reset();
    // Without holds only the four most recent frames stay.
    EXPECT_EQ(ReadFrame(source, FrameTime(5), frame, kFrameRequestFlag_NoBlock),
              BE::kResult_FrameNotReady);
    EXPECT_EQ(ReadFrame(source, FrameTime(9), frame, kFrameRequestFlag_NoBlock),
              QRT::kResult_Success);
}

TEST_F(PatternSourceTest, FrameKeysAreStableAndTellFramesApart)
{
    const std::string media = "pattern:moving?size=32x16";
    const BE::VideoSourceRef first = OpenOrFail(media);
    const BE::VideoSourceRef second = OpenOrFail("pattern:moving?rate=25&size=32x16");
    const BE::VideoFrameRequest request;
    const MF::BinaryData none;
    const BE::ColorProfile profile;
    const auto key = first->GetFrameKey(FrameTime(4), request, none, profile);
    EXPECT_EQ(key, second->GetFrameKey(FrameTime(4), request, none, profile));
    EXPECT_EQ(key,
              first->GetFrameKey(FrameTime(4) + TickTime::TicksToTime(5), request, none, profile))
        << "a time inside the same frame names the same frame";
    EXPECT_NE(key, first->GetFrameKey(FrameTime(5), request, none, profile));
    BE::VideoFrameRequest smaller;
    smaller.mWidth = 16;
    smaller.mHeight = 8;
    EXPECT_NE(key, first->GetFrameKey(FrameTime(4), smaller, none, profile));
    EXPECT_NE(key,
              first->GetFrameKey(FrameTime(4), request, MF::BinaryData::FromText("x"), profile));
    EXPECT_NE(key, first->GetFrameKey(FrameTime(4), request, none, BE::ColorProfile{"sRGB", {}}));
    EXPECT_NE(
        key,
        OpenOrFail("pattern:moving?size=32x18")->GetFrameKey(FrameTime(4), request, none, profile));

    // Time-invariant media: one key for every time.
    const BE::VideoSourceRef bars = OpenOrFail("pattern:bars?size=32x16");
    EXPECT_EQ(bars->GetFrameKey(FrameTime(0), request, none, profile),
              bars->GetFrameKey(FrameTime(250), request, none, profile));
}

TEST_F(PatternSourceTest, DrawIntoFrameConvertsToTheDestination)
{
    const BE::VideoSourceRef source = OpenOrFail("pattern:solid?size=32x16&color=FF0000");
    FrameRef destination =
        VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, 8, 4,
                             mvxmediatypes::kPixelAspectRatio_Square, true, false);
    ASSERT_TRUE(destination);
    EXPECT_EQ(source->DrawVideoFrame(TickTime(), MF::BinaryData(), TickTime(), TickTime(),
                                     destination, mvxmediatypes::kRenderQuality_Max,
                                     mvxmediatypes::kFieldType_Progressive, true, false, false,
                                     false, 0.0),
              QRT::kResult_Success);
    EXPECT_EQ(Pixel(destination, 7, 3), Bgra(0, 0, 255));
    destination->MarkShared(1);
    vrtest::ExpectInputContract(
        [&]
        {
            source->DrawVideoFrame(TickTime(), MF::BinaryData(), TickTime(), TickTime(),
                                   destination, mvxmediatypes::kRenderQuality_Max,
                                   mvxmediatypes::kFieldType_Progressive, true, false, false, false,
                                   0.0);
        },
        "!ioDestination->IsShared()");
}

TEST_F(PatternSourceTest, MediaInterfacesReachTheSameObject)
{
    const BE::VideoSourceRef source = OpenOrFail("pattern:bars?size=8x8");
    const auto info = QRT::QueryRef<BE::Deprecated::IMediaInfo>(source);
    const auto media = QRT::QueryRef<BE::Deprecated::IMedia>(source);
    ASSERT_TRUE(info && media);
    EXPECT_EQ(info->GetVideoSource(BE::Deprecated::kMediaType_Video, 0), source);
    EXPECT_EQ(info->GetStreamCount(BE::Deprecated::kMediaType_Video), 1u);
    EXPECT_EQ(info->GetStreamCount(BE::Deprecated::kMediaType_Audio), 0u);
    EXPECT_EQ(media->GetMediaPath(),
              BE::ParsePatternSettings("pattern:bars?size=8x8").mSettings.ToText());
    vrtest::ExpectInputContract([&] { info->GetVideoSource(BE::Deprecated::kMediaType_Audio, 0); },
                                "inType == Deprecated::kMediaType_Video");
    vrtest::ExpectInputContract([&] { info->GetVideoSource(BE::Deprecated::kMediaType_Video, 1); },
                                "inIndex == 0");
    const auto copy = info->Copy();
    ASSERT_TRUE(copy);
    EXPECT_NE(copy, info);
    const auto copySource = copy->GetVideoSource(BE::Deprecated::kMediaType_Video, 0);
    EXPECT_EQ(copySource->GetFrameKey(TickTime(), {}, {}, {}),
              source->GetFrameKey(TickTime(), {}, {}, {}));
}

class PatternSettingsTest : public ::testing::Test
{
protected:
    static std::string Problem(const std::string& inText)
    {
        const BE::PatternParseResult result = BE::ParsePatternSettings(inText);
        EXPECT_EQ(result.mResult, BE::kResult_BadPattern) << inText;
        return result.mMessage;
    }
};

TEST_F(PatternSettingsTest, DefaultsAndCanonicalText)
{
    const BE::PatternParseResult bars = BE::ParsePatternSettings("pattern:bars");
    ASSERT_TRUE(bars.Succeeded());
    EXPECT_EQ(bars.mSettings.ToText(),
              "pattern:bars?size=1920x1080&rate=705600000/28224000&field=progressive&par=1:1"
              "&alpha=none");
    EXPECT_EQ(BE::ParsePatternSettings(bars.mSettings.ToText()).mSettings, bars.mSettings);
    const BE::PatternParseResult full = BE::ParsePatternSettings(
        "pattern:moving?size=1920x1080&rate=25&field=upper&par=10:11&alpha=straight");
    ASSERT_TRUE(full.Succeeded()) << full.mMessage;
    EXPECT_EQ(full.mSettings.mFieldType, mvxmediatypes::kFieldType_UpperFirst);
    EXPECT_EQ(full.mSettings.mPixelAspectRatio, mvxmediatypes::PixelAspectRatio(10, 11));
    EXPECT_EQ(full.mSettings.mAlpha, mvxmediatypes::kAlphaChannel_Straight);
    EXPECT_EQ(BE::ParsePatternSettings("pattern:bars?rate=30000/1001").mSettings.mFrameRate,
              mvxmediatypes::kFrameRate_Video2997);
    EXPECT_EQ(BE::ParsePatternSettings("pattern:bars?rate=59.94").mSettings.mFrameRate,
              mvxmediatypes::kFrameRate_Video5994);
}

TEST_F(PatternSettingsTest, BadPatternsNameTheirProblem)
{
    EXPECT_EQ(Problem("pattern:stripes"),
              "pattern 'pattern:stripes': unknown pattern 'stripes' (expected bars, solid, "
              "gradient or moving)");
    EXPECT_EQ(Problem("pattern:bars?size=0x10"),
              "pattern 'pattern:bars?size=0x10': size '0x10' is not WxH with 1..32768 each");
    EXPECT_EQ(Problem("pattern:bars?size=40000x10"),
              "pattern 'pattern:bars?size=40000x10': size '40000x10' is not WxH with "
              "1..32768 each");
    EXPECT_EQ(Problem("pattern:bars?rate=0"),
              "pattern 'pattern:bars?rate=0': rate '0' is not a frame rate between 1/1000 "
              "and 1000");
    EXPECT_EQ(Problem("pattern:bars?field=top"),
              "pattern 'pattern:bars?field=top': field 'top' is not progressive, upper or "
              "lower");
    EXPECT_EQ(Problem("pattern:bars?par=1:0"),
              "pattern 'pattern:bars?par=1:0': par '1:0' is not N:D with positive terms");
    EXPECT_EQ(Problem("pattern:bars?color=FF0000"),
              "pattern 'pattern:bars?color=FF0000': color applies to solid patterns only");
    EXPECT_EQ(Problem("pattern:solid?color=red"),
              "pattern 'pattern:solid?color=red': color 'red' is not RRGGBB");
    EXPECT_EQ(Problem("pattern:bars?size=8x8&size=9x9"),
              "pattern 'pattern:bars?size=8x8&size=9x9': parameter 'size' given twice");
    EXPECT_EQ(Problem("pattern:bars?speed=2"),
              "pattern 'pattern:bars?speed=2': unknown parameter 'speed'");
    EXPECT_EQ(Problem("pattern:bars?opacity=9"),
              "pattern 'pattern:bars?opacity=9': opacity needs alpha=straight or "
              "alpha=premultiplied");
    EXPECT_EQ(Problem("pattern:bars?alpha=straight&opacity=256"),
              "pattern 'pattern:bars?alpha=straight&opacity=256': opacity '256' is not "
              "0..255");
    EXPECT_EQ(Problem("pattern:bars?"), "pattern 'pattern:bars?': empty parameter list after '?'");
    EXPECT_EQ(Problem("pattern:bars?size=8x8&"),
              "pattern 'pattern:bars?size=8x8&': empty parameter after '&'");
    EXPECT_EQ(Problem("pattern:bars?size"),
              "pattern 'pattern:bars?size': parameter 'size' is not key=value");
}

TEST_F(PatternSettingsTest, OpenVideoSourceReportsBadPatternsAndUnknownMedia)
{
    BE::VideoSourceRef source;
    BE::OpenStatus status = BE::OpenVideoSource("pattern:waves", source);
    EXPECT_EQ(status.mResult, BE::kResult_BadPattern);
    EXPECT_EQ(status.mMessage, "pattern 'pattern:waves': unknown pattern 'waves' (expected "
                               "bars, solid, gradient or moving)");
    EXPECT_FALSE(source);
    status = BE::OpenVideoSource("/tmp/clip.mov", source);
    EXPECT_EQ(status.mResult, BE::kResult_MediaUnsupported);
    EXPECT_EQ(status.mMessage,
              "/tmp/clip.mov: unknown media (expected .png, .jpg, .jpeg, .y4m or pattern:...)");
    EXPECT_FALSE(source);
}

} // namespace
