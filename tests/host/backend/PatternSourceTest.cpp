#include "BE/MediaStatus.h"
#include "BE/PatternSettings.h"
#include "BackendTestSupport.h"
#include "ContractExpect.h"
#include "VF/VideoFrame.h"

#include <tuple>

#include <gtest/gtest.h>

namespace
{

using namespace betest;
using namespace mvxmediatypes;
using BE::Deprecated::kFrameRequestFlag_NoBlock;

TickTime FrameTime(std::int64_t inFrame)
{
    return TickTime::FromFrame(inFrame, kFrameRate_Video25);
}

// The left edge of the moving box in the given row, or -1 when the row shows no box.
int BoxLeft(const FrameRef& inFrame, int inRow)
{
    for (int x = 0; x < inFrame->GetBounds().Width(); ++x)
        if (Pixel(inFrame, x, inRow) == Bgra(224, 224, 224))
            return x;
    return -1;
}

using PatternSourceTest = ::testing::Test;

TEST_F(PatternSourceTest, PixelsHaveTheirExactValues)
{
    // Premultiplied over the matte: round((100 * c + 155 * m) / 255).
    const std::tuple<const char*, int, std::array<int, 4>> cases[] = {
        {"gradient?size=5x1&from=000000&to=FF0040", 1, Bgra(16, 0, 64)},
        {"gradient?size=5x1&from=000000&to=FF0040", 3, Bgra(48, 0, 191)},
        {"solid?size=4x1&color=204060&alpha=straight&opacity=100", 3, Bgra(0x60, 0x40, 0x20, 100)},
        {"solid?size=4x1&color=204060&alpha=premultiplied&opacity=100&matte=FFFFFF", 0,
         Bgra(193, 180, 168, 100)}};
    for (const auto& [media, x, bgra] : cases)
        EXPECT_EQ(
            Pixel(ReadFrameOrFail(OpenOrFail(std::string("pattern:") + media), TickTime()), x, 0),
            bgra)
            << media;
    const FrameRef bars = ReadFrameOrFail(OpenOrFail("pattern:bars?size=70x4"), TickTime());
    const std::array<std::array<int, 4>, 7> colours = {
        Bgra(191, 191, 191), Bgra(0, 191, 191), Bgra(191, 191, 0), Bgra(0, 191, 0),
        Bgra(191, 0, 191),   Bgra(0, 0, 191),   Bgra(191, 0, 0)};
    for (int y = 0; y < 4; ++y)
        for (int x = 0; x < 70; ++x)
            ASSERT_EQ(Pixel(bars, x, y), colours[x / 10]) << x << "," << y;
}

TEST_F(PatternSourceTest, MovingBoxAdvancesEveryFieldAndTheFrameNumberIsDrawn)
{
    // 64 x 32: an 8-pixel box on the bottom row, 2 pixels per field period,
    // wrapping over 57 positions.
    const BE::VideoSourceRef source =
        OpenOrFail("pattern:moving?size=64x32&rate=25&field=progressive&alpha=none");
    for (const auto& [frameIndex, left] : {std::pair{1, 4}, {15, 3}, {-1, 53}})
    {
        const FrameRef frame = ReadFrameOrFail(source, FrameTime(frameIndex));
        SCOPED_TRACE(::testing::Message() << "frame " << frameIndex);
        EXPECT_EQ(std::tuple(BoxLeft(frame, 31), BoxLeft(frame, 24)), std::tuple(left, left));
        EXPECT_EQ(Pixel(frame, left + 8, 31), Bgra(48, 48, 48));
        EXPECT_EQ(BoxLeft(frame, 23), -1) << "the box is 8 rows high";
    }
    // Interlaced, frame 2: the earlier field at phase 4 (box at 8), the later at phase 5 (box at
    // 10).
    const BE::VideoSourceRef upper = OpenOrFail("pattern:moving?size=64x32&field=upper");
    const FrameRef frame = ReadFrameOrFail(upper, FrameTime(2));
    EXPECT_EQ(frame->GetFieldType(), kFieldType_UpperFirst);
    EXPECT_EQ(std::tuple(BoxLeft(frame, 30), BoxLeft(frame, 31)), std::tuple(8, 10));
    const FrameRef lower =
        ReadFrameOrFail(OpenOrFail("pattern:moving?size=64x32&field=lower"), FrameTime(2));
    EXPECT_EQ(std::tuple(BoxLeft(lower, 31), BoxLeft(lower, 30)), std::tuple(8, 10));
    // Scaled to half height, the fields stay apart.
    const FrameRef scaled = ReadFrameOrFail(upper, FrameTime(2), {64, 16});
    ASSERT_EQ(scaled->GetBounds().Height(), 16);
    EXPECT_EQ(std::tuple(BoxLeft(scaled, 14), BoxLeft(scaled, 15)), std::tuple(8, 10));
}

TEST_F(PatternSourceTest, DescriptionAndMediaInterfacesFollowThePattern)
{
    const std::string text = "pattern:moving?size=720x486&rate=29.97&field=lower&par=10:11";
    const BE::VideoSourceRef moving = OpenOrFail(text);
    EXPECT_EQ(moving->GetFrameRate(), kFrameRate_Video2997);
    const auto info = QRT::QueryRef<BE::Deprecated::IMediaInfo>(moving);
    const auto media = QRT::QueryRef<BE::Deprecated::IMedia>(moving);
    ASSERT_TRUE(info && media);
    EXPECT_EQ(info->GetKind(), BE::Deprecated::kMediaInfoKind_Clip);
    EXPECT_EQ(info->GetDuration(), kTime_Max);
    EXPECT_EQ(info->GetName(), u"pattern:moving?size=720x486&rate=705600000/23543520&field=lower&"
                               u"par=10:11&alpha=none");
    EXPECT_EQ(info->GetStreamCount(BE::Deprecated::kMediaType_Audio), 0u);
    EXPECT_EQ(media->GetMediaInfo(), info);
    EXPECT_EQ(media->GetMediaPath(), BE::ParsePatternSettings(text).mSettings.ToText());
    const auto copy = info->Copy();
    ASSERT_TRUE(copy);
    EXPECT_EQ(copy->GetVideoSource(BE::Deprecated::kMediaType_Video, 0)
                  ->GetFrameKey(TickTime(), {}, {}, {}),
              moving->GetFrameKey(TickTime(), {}, {}, {}));
    EXPECT_EQ(QRT::QueryRef<BE::Deprecated::IMediaInfo>(OpenOrFail("pattern:bars"))->GetKind(),
              BE::Deprecated::kMediaInfoKind_TimeInvariant);
}

TEST_F(PatternSourceTest, NoBlockRequestsAnswerOnlyHeldFramesAndKeysTellFramesApart)
{
    const BE::VideoSourceRef source = OpenOrFail("pattern:moving?size=16x16");
    FrameRef frame;
    EXPECT_EQ(ReadFrame(source, FrameTime(3), frame, kFrameRequestFlag_NoBlock),
              BE::kResult_FrameNotReady);
    const FrameRef read = ReadFrameOrFail(source, FrameTime(3));
    EXPECT_EQ(ReadFrame(source, FrameTime(3), frame, kFrameRequestFlag_NoBlock),
              QRT::kResult_Success);
    EXPECT_EQ(frame.Get(), read.Get());
    // A prefetch hold keeps two more frames while it lasts (the six most recent of
    // ten); without holds only the four most recent frames stay.
    BE::Deprecated::PrefetchHold hold = source->GetPrefetchHold();
    for (int index = 0; index < 10; ++index)
        ReadFrameOrFail(source, FrameTime(index));
    EXPECT_EQ(ReadFrame(source, FrameTime(3), frame, kFrameRequestFlag_NoBlock),
              BE::kResult_FrameNotReady);
    EXPECT_EQ(ReadFrame(source, FrameTime(4), frame, kFrameRequestFlag_NoBlock),
              QRT::kResult_Success);
    hold.reset();
    EXPECT_EQ(ReadFrame(source, FrameTime(5), frame, kFrameRequestFlag_NoBlock),
              BE::kResult_FrameNotReady);
    // Frame keys are stable and tell frames apart; time-invariant media has one.
    const auto key = source->GetFrameKey(FrameTime(4), {}, {}, {});
    EXPECT_EQ(key, source->GetFrameKey(FrameTime(4) + TickTime::TicksToTime(5), {}, {}, {}));
    EXPECT_NE(key, source->GetFrameKey(FrameTime(5), {}, {}, {}));
    EXPECT_NE(key, source->GetFrameKey(FrameTime(4), {16, 8}, {}, {}));
    const BE::VideoSourceRef bars = OpenOrFail("pattern:bars?size=32x16");
    EXPECT_EQ(bars->GetFrameKey(FrameTime(0), {}, {}, {}),
              bars->GetFrameKey(FrameTime(250), {}, {}, {}));
}

TEST_F(PatternSourceTest, DrawIntoFrameConvertsToAnUnsharedDestination)
{
    const BE::VideoSourceRef source = OpenOrFail("pattern:solid?size=32x16&color=FF0000");
    FrameRef destination = VF::CreateVideoFrame(kPixelFormat_BGRA_4444_8u, 8, 4,
                                                kPixelAspectRatio_Square, true, false);
    ASSERT_TRUE(destination);
    const auto draw = [&]
    {
        return source->DrawVideoFrame(TickTime(), MF::BinaryData(), TickTime(), TickTime(),
                                      destination, kRenderQuality_Max, kFieldType_Progressive, true,
                                      false, false, false, 0.0);
    };
    EXPECT_EQ(draw(), QRT::kResult_Success);
    EXPECT_EQ(Pixel(destination, 7, 3), Bgra(0, 0, 255));
    destination->MarkShared(1);
    vrtest::ExpectInputContract(draw, "!ioDestination->IsShared()");
}

using PatternSettingsTest = ::testing::Test;

TEST_F(PatternSettingsTest, DefaultsCanonicalTextAndBadPatterns)
{
    const BE::PatternParseResult bars = BE::ParsePatternSettings("pattern:bars");
    ASSERT_TRUE(bars.Succeeded());
    EXPECT_EQ(bars.mSettings.ToText(),
              "pattern:bars?size=1920x1080&rate=705600000/28224000&field=progressive&par=1:1"
              "&alpha=none");
    const BE::PatternParseResult full = BE::ParsePatternSettings(
        "pattern:gradient?size=8x2&rate=30000/1001&field=upper&par=20:22&alpha=premultiplied");
    ASSERT_TRUE(full.Succeeded()) << full.mMessage;
    EXPECT_EQ(BE::ParsePatternSettings(full.mSettings.ToText()).mSettings, full.mSettings);
    const std::pair<const char*, const char*> cases[] = {
        {"pattern:stripes", "unknown pattern 'stripes' (expected bars, solid, gradient or moving)"},
        {"pattern:bars?size=0x10", "size '0x10' is not WxH with 1..32768 each"},
        {"pattern:bars?rate=0", "rate '0' is not a frame rate between 1/1000 and 1000"},
        {"pattern:bars?field=top", "field 'top' is not progressive, upper or lower"},
        {"pattern:bars?par=1:0", "par '1:0' is not N:D with positive terms"},
        {"pattern:bars?color=FF0000", "color applies to solid patterns only"},
        {"pattern:solid?color=red", "color 'red' is not RRGGBB"},
        {"pattern:bars?size=8x8&size=9x9", "parameter 'size' given twice"},
        {"pattern:bars?speed=2", "unknown parameter 'speed'"},
        {"pattern:bars?opacity=9", "opacity needs alpha=straight or alpha=premultiplied"},
        {"pattern:bars?", "empty parameter list after '?'"},
        {"pattern:bars?size=8x8&", "empty parameter after '&'"},
        {"pattern:bars?size", "parameter 'size' is not key=value"}};
    for (const auto& [text, problem] : cases)
    {
        const BE::PatternParseResult result = BE::ParsePatternSettings(text);
        EXPECT_EQ(result.mResult, BE::kResult_BadPattern) << text;
        EXPECT_EQ(result.mMessage, std::string("pattern '") + text + "': " + problem);
    }
    BE::VideoSourceRef source;
    BE::OpenStatus status = BE::OpenVideoSource("pattern:waves", source);
    EXPECT_EQ(status.mResult, BE::kResult_BadPattern);
    EXPECT_FALSE(source);
    status = BE::OpenVideoSource("/tmp/clip.mov", source);
    EXPECT_EQ(status.mResult, BE::kResult_MediaUnsupported);
    EXPECT_EQ(status.mMessage,
              "/tmp/clip.mov: unknown media (expected .png, .jpg, .jpeg, .y4m or pattern:...)");
}

} // namespace
