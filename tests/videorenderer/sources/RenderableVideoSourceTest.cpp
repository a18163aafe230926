// RenderableVideoSource (CreateRenderableSource): rates, frame-time
// conforming, the frame request, alpha and pixel-aspect handling, failures and
// prefetch collection.

#include "BE/MediaStatus.h"
#include "BE/VideoSources.h"
#include "ML/RenderableVideoSources.h"
#include "QRT/Exception.h"
#include "ScriptedSources.h"

namespace ML::Test
{
namespace
{

using mt::PixelAspectRatio;
using TickPair = std::pair<std::int64_t, std::int64_t>;

// The two field times in ticks, for readable comparisons.
TickPair TicksOf(const MF::FrameTime& inTime)
{
    return {inTime.GetFirstFieldTime().GetTicks(), inTime.GetSecondFieldTime().GetTicks()};
}

BE::VideoSourceRef OpenPattern(const std::string& inMedia)
{
    BE::VideoSourceRef source;
    const BE::OpenStatus status = BE::OpenVideoSource(inMedia, source);
    EXPECT_TRUE(status.Succeeded()) << status.mMessage;
    return source;
}

class RenderableVideoSourceTest : public ::testing::Test
{
protected:
    struct Declaration
    {
        mt::AlphaChannel mAlphaKind = mt::kAlphaChannel_Straight;
        QRT::ParamColor mMatte{};
        bool mIgnoreAlpha = false, mInvertAlpha = false;
        FrameRate mFrameRate = k25;
        mt::FieldType mFieldType = kProg;
        PixelAspectRatio mRatio = mt::kPixelAspectRatio_Square;
    };

    // inSource: a back-end video source reference or a scripted source.
    template <typename Source>
    SourceRef Make(const Source& inSource, const Declaration& inDeclaration) const
    {
        return CreateRenderableSource(
            BE::VideoSourceRef(inSource), mBinaryData, inDeclaration.mAlphaKind,
            inDeclaration.mMatte, inDeclaration.mIgnoreAlpha, inDeclaration.mInvertAlpha,
            inDeclaration.mFrameRate, inDeclaration.mFieldType, inDeclaration.mRatio, mProfile);
    }
    // A scripted source handing out inFrame, marked shared.
    static ScriptedSourceRef Handing(const FrameRef& inFrame)
    {
        const ScriptedSourceRef scripted = MakeScriptedSource();
        inFrame->MarkShared(1);
        scripted->mFrame = inFrame;
        return scripted;
    }

    const std::uint8_t mBytes[3] = {7, 8, 9};
    const MF::BinaryData mBinaryData{mBytes, sizeof(mBytes)};
    const BE::ColorProfile mProfile{"BT.709", std::make_shared<const std::vector<std::uint8_t>>(
                                                  std::vector<std::uint8_t>{1, 2})};
    const CutlistRenderParams m4x2 = MakeParams(4, 2);
};

TEST_F(RenderableVideoSourceTest, RatesFollowTheDeclarationTheSourceAndStills)
{
    const ScriptedSourceRef progressive = MakeScriptedSource();
    const ScriptedSourceRef lower = MakeScriptedSource();
    lower->mFieldType = kLower;
    const ScriptedSourceRef still = MakeScriptedSource();
    still->mStill = true;
    still->mFrameRate = k1000;
    // An odd interlaced frame is stored one tick longer; progressive and
    // as-source declarations keep it.
    const FrameRate odd = FrameRate::Create(1'000'001);
    const FrameRate even = FrameRate::Create(1'000'002);
    // Source, declared field type and rate, frame rate, field rate.
    const std::tuple<ScriptedSourceRef, mt::FieldType, FrameRate, FrameRate, FrameRate> cases[] = {
        {lower, kProg, k25, k25, k25},           {progressive, kUpper, k25, k25, k50},
        {lower, kAsSource, k25, k25, k50},       {progressive, kAsSource, k25, k25, k25},
        {still, kProg, k25, k1000, k1000},       {progressive, kLower, odd, even, even * 2},
        {progressive, kAsSource, odd, odd, odd},
    };
    for (const auto& [scripted, declared, declaredRate, rate, fieldRate] : cases)
    {
        const SourceRef source =
            Make(scripted, {.mFrameRate = declaredRate, .mFieldType = declared});
        EXPECT_EQ(std::pair(RateOf(*source), FieldRateOf(*source)), std::pair(rate, fieldRate))
            << declared << " " << declaredRate.GetFrameDuration().GetTicks();
    }
}

TEST_F(RenderableVideoSourceTest, ConformsToTheFrameOrFieldGridInTheDeliveredOrder)
{
    const std::int64_t f4 = 4 * kFrame25;
    const std::int64_t f2 = 2 * kFrame25;
    const std::int64_t early = f4 + kField25 + 99;
    const MF::FrameTime upperRequest(Ticks(f2 + 10), Ticks(f2 + 10 + kField25));
    const MF::FrameTime interlaced(Ticks(7 * kFrame25 + 5), Ticks(7 * kFrame25 + 5 + kField25));
    const MF::FrameTime order1(Ticks(early), Ticks(early + kField25));
    const MF::FrameTime order0(Ticks(early));
    const std::int32_t invariant = BE::Deprecated::kMediaInfoKind_TimeInvariant;
    const std::int32_t clip = BE::Deprecated::kMediaInfoKind_Clip;
    const FrameRate odd = FrameRate::Create(1'000'001);
    // Source field type, declared field type, media kind, declared rate,
    // request, conformed field times.
    const std::tuple<mt::FieldType, mt::FieldType, std::int32_t, FrameRate, MF::FrameTime, TickPair>
        cases[] = {
            // Time-invariant media and clips without a rate: one frame at 0.
            {kProg, kUpper, invariant, k25, interlaced, {0, 0}},
            {kProg, kUpper, clip, kNoRate, interlaced, {0, 0}},
            // Interlaced material: progressive requests on the field grid,
            // interlaced ones on the frame grid in their order.
            {kUpper, kAsSource, clip, k25, order0, {f4 + kField25, f4 + kField25}},
            {kUpper, kAsSource, clip, k25, order1, {f4, f4 + kField25}},
            {kProg, kAsSource, clip, k25, upperRequest, {f2, f2}},
            // A declared order wins over the request's, also a progressive one.
            {kProg, kLower, clip, k25, upperRequest, {f2 + kField25, f2}},
            // An odd interlaced frame: fields half the stored frame apart.
            {kProg, kUpper, clip, odd, MF::FrameTime(Ticks(1'000'003)), {1'000'002, 1'500'003}},
        };
    for (const auto& [fieldType, declared, kind, rate, request, conformed] : cases)
    {
        const ScriptedSourceRef scripted = MakeScriptedSource();
        std::tie(scripted->mFieldType, scripted->mKind) = std::pair(fieldType, kind);
        const SourceRef source = Make(scripted, {.mFrameRate = rate, .mFieldType = declared});
        EXPECT_EQ(TicksOf(Conform(*source, request)), conformed)
            << "request " << request.GetTime().GetTicks();
    }
    // A still conforms without aligning; a real time-invariant pattern to 0.
    const ScriptedSourceRef still = MakeScriptedSource();
    still->mStill = true;
    still->mFrameRate = k1000;
    const std::int64_t time = 3 * kFrame25 + 12'345;
    EXPECT_EQ(TicksOf(Conform(*Make(still, {}), MF::FrameTime(Ticks(time)))), TickPair(time, time));
    const SourceRef pattern = Make(OpenPattern("pattern:solid?size=8x4"), {.mFieldType = kUpper});
    EXPECT_EQ(TicksOf(Conform(*pattern, interlaced)), TickPair(0, 0));
}

TEST_F(RenderableVideoSourceTest, FailuresAreThrownAndEmptyTheOutput)
{
    const ScriptedSourceRef failing = MakeScriptedSource();
    failing->mFrameStatus = BE::kResult_FrameOutOfRange;
    FrameRef frame = MakeFilledFrame(4, 2, Pixel{});
    EXPECT_EQ(RenderStatus(*Make(failing, {}), m4x2, frame), BE::kResult_FrameOutOfRange);
    EXPECT_FALSE(frame);

    // Success without a frame, and no source at all.
    const Declaration upper{.mFieldType = kUpper};
    for (const SourceRef& source :
         {Make(MakeScriptedSource(), {}), Make(BE::VideoSourceRef(), upper)})
    {
        frame = MakeFilledFrame(4, 2, Pixel{});
        EXPECT_THROW(source->RenderFrame(MF::FrameTime(), m4x2, frame),
                     QRT::NullInterfaceException);
        EXPECT_FALSE(frame);
    }
    // Without a source the description comes from the declaration.
    const SourceRef empty = Make(BE::VideoSourceRef(), upper);
    EXPECT_EQ(FieldRateOf(*empty), k50);
    EXPECT_EQ(TicksOf(Conform(*empty, MF::FrameTime(Ticks(kFrame25 + 1)))),
              TickPair(kFrame25, kFrame25 + kField25));
    RenderableNodePrefetchList prefetches;
    empty->CollectPrefetches(MF::FrameTime(), m4x2, prefetches);
    EXPECT_TRUE(prefetches.empty());
}

TEST_F(RenderableVideoSourceTest, AlphaIsMadeStraightInvertedOrIgnoredAsDeclared)
{
    // Red at alpha 128 premultiplied over black (stored red 128) and over blue.
    const std::string overBlack =
        "pattern:solid?size=8x4&color=FF0000&alpha=premultiplied&opacity=128&matte=000000";
    const std::string overBlue =
        "pattern:solid?size=8x4&color=FF0000&alpha=premultiplied&opacity=128&matte=0000FF";
    const std::string straight = "pattern:solid?size=8x4&color=336699&alpha=straight&opacity=64";
    const auto pre = mt::kAlphaChannel_Premultiplied;
    const auto plain = mt::kAlphaChannel_Straight;
    const QRT::ParamColor blue = QRT::ParamColor::FromRGBA(0, 0, 0xFF);
    // Only the colour bytes count: an alpha byte alone is still a black matte.
    const QRT::ParamColor black = QRT::ParamColor::FromRGBA(0, 0, 0, 0xFF);
    const Pixel opaque{0x99, 0x66, 0x33, 255};
    // Media, alpha kind, matte, ignore and invert alpha, pixel.
    const std::tuple<const std::string&, mt::AlphaChannel, QRT::ParamColor, bool, bool, Pixel>
        cases[] = {
            {overBlack, pre, black, false, false, {0, 0, 255, 128}},
            {overBlue, pre, blue, false, false, {0, 0, 255, 128}},
            // The blue matte taken as black.
            {overBlue, pre, {}, false, false, {253, 0, 255, 128}},
            // Ignoring wins over inverting and over premultiplied.
            {straight, plain, {}, true, true, opaque},
            {straight, plain, {}, false, true, {0x99, 0x66, 0x33, 191}},
        };
    for (const auto& [media, kind, matte, ignore, invert, expected] : cases)
    {
        SCOPED_TRACE(testing::Message() << media << " " << ignore << invert);
        const FrameRef frame = Render(*Make(OpenPattern(media), {kind, matte, ignore, invert}),
                                      MF::FrameTime(), MakeParams(8, 4, 5));
        EXPECT_TRUE(AllPixelsAre(frame, expected));
        EXPECT_TRUE(ignore || invert || frame->GetAlphaChannel() == plain);
    }
}

TEST_F(RenderableVideoSourceTest, SixteenBitPremultipliedIsMadeStraightThroughStaging)
{
    // Red at alpha one half, premultiplied over black, in 16 bits per channel.
    const auto format = mt::kPixelFormat_BGRA_4444_16u;
    const FrameRef delivered = Converted(MakeFilledFrame(4, 2, Pixel{0, 0, 128, 128}), format);
    const FrameRef frame =
        Render(*Make(Handing(delivered), {.mAlphaKind = mt::kAlphaChannel_Premultiplied}),
               MF::FrameTime(), MakeParams(4, 2, 5, format));
    ASSERT_EQ(frame->GetPixelFormat(), format);
    EXPECT_EQ(frame->GetAlphaChannel(), mt::kAlphaChannel_Straight);
    EXPECT_TRUE(AllPixelsAre(Converted(frame), Pixel{0, 0, 255, 128}));
}

TEST_F(RenderableVideoSourceTest, StraightDeclarationRelabelsACopyAndLeavesTheDeliveredFrame)
{
    FrameRef delivered = MakeFilledFrame(4, 2, Pixel{0x10, 0x20, 0x40, 0x80});
    delivered->SetAlphaChannel(mt::kAlphaChannel_Premultiplied);
    const FrameRef frame = Render(*Make(Handing(delivered), {}), MF::FrameTime(), m4x2);
    EXPECT_NE(frame.Get(), delivered.Get());
    EXPECT_EQ(frame->GetAlphaChannel(), mt::kAlphaChannel_Straight);
    EXPECT_TRUE(AllPixelsAre(frame, Pixel{0x10, 0x20, 0x40, 0x80}));
    EXPECT_EQ(delivered->GetAlphaChannel(), mt::kAlphaChannel_Premultiplied);
}

TEST_F(RenderableVideoSourceTest, PixelAspectRatioIsAdjustedForNonUniformDelivery)
{
    const FrameRef delivered = MakeFilledFrame(360, 480, Pixel{0, 0, 0, 255});
    const ScriptedSourceRef scripted = Handing(delivered);
    const PixelAspectRatio ntsc(10, 11);
    const PixelAspectRatio square = mt::kPixelAspectRatio_Square;
    // Declared ratio, requested size, ratio of the frame, whether it is the delivered one.
    const std::tuple<PixelAspectRatio, std::uint32_t, std::uint32_t, PixelAspectRatio, bool>
        cases[] = {
            // Half the columns of a 720x480 request: pixels twice as wide.
            {ntsc, 720, 480, PixelAspectRatio(20, 11), false},
            // Uniform delivery keeps the declared ratio; a request without a size too.
            // A frame that already has the ratio is handed on untouched, and a
            // clip that accepts any ratio keeps the source's.
            {PixelAspectRatio(2, 2), 360, 480, square, true},
            {mt::kPixelAspectRatio_Any, 720, 480, square, true},
        };
    for (const auto& [declared, width, height, expected, same] : cases)
    {
        const FrameRef frame = Render(*Make(scripted, {.mRatio = declared}), MF::FrameTime(),
                                      MakeParams(width, height, 5));
        ASSERT_TRUE(frame);
        EXPECT_EQ(std::pair(frame->GetPixelAspectRatio(), frame == delivered),
                  std::pair(expected, same))
            << width << "x" << height;
    }
    EXPECT_EQ(delivered->GetPixelAspectRatio(), square);
}

TEST_F(RenderableVideoSourceTest, CollectsOneHandleForTheConvertedTimeOnlyWhenWanted)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mFrameRate = k50;
    const SourceRef source = Make(scripted, {});
    const MF::FrameTime time(Ticks(kFrame25 * 3 + kField25 + 1), Ticks(kFrame25 * 3 + 1));
    RenderableNodePrefetchList prefetches;
    // Not wanted: the source still receives the hint.
    source->CollectPrefetches(time, m4x2, prefetches);
    EXPECT_TRUE(prefetches.empty());
    scripted->mPrefetchWanted = true;
    source->CollectPrefetches(time, m4x2, prefetches);
    ASSERT_EQ(prefetches.size(), 1u);
    ASSERT_TRUE(prefetches[0]);

    ASSERT_EQ(scripted->PrefetchCalls().size(), 2u);
    const FrameCall hint = scripted->PrefetchCalls().back();
    EXPECT_EQ(hint.mTime.GetTicks(), 3 * kField25);
    // The request the read would make: the params' size, ratio, format and
    // quality, in the request's field order.
    const BE::VideoFrameRequest request{
        4, 2, mt::kPixelAspectRatio_Square, mt::kPixelFormat_BGRA_4444_8u, kLower, 4};
    EXPECT_EQ(hint.mRequest, request);
    EXPECT_EQ(hint.mBinaryData, mBinaryData);
    // The handle reads the frame of the converted time with the same record.
    QRT::Guid key;
    prefetches[0]->GetPrefetchKey(key);
    EXPECT_EQ(key, scripted->KeyFor(Ticks(3 * kField25)));
}

} // namespace
} // namespace ML::Test
