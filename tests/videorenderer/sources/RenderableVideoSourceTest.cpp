// RenderableVideoSource (CreateRenderableSource): rates, frame-time
// conforming, the frame request, alpha and pixel-aspect handling, failures and
// prefetch collection.

#include "BE/MediaStatus.h"
#include "BE/VideoSources.h"
#include "ML/RenderRequestException.h"
#include "ML/RenderableVideoSources.h"
#include "QRT/Exception.h"
#include "ScriptedSources.h"

namespace ML::Test
{
namespace
{

using mvxmediatypes::PixelAspectRatio;
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

// The status of the RenderRequestException inRender throws (0 when none).
template <typename Render>
QRT::Result ThrownStatus(Render inRender)
{
    try
    {
        inRender();
    }
    catch (const RenderRequestException& exception)
    {
        return exception.GetStatus();
    }
    return QRT::kResult_Success;
}

class RenderableVideoSourceTest : public ::testing::Test
{
protected:
    struct Declaration
    {
        mvxmediatypes::AlphaChannel mAlphaKind = mvxmediatypes::kAlphaChannel_Straight;
        QRT::ParamColor mMatte;
        bool mIgnoreAlpha = false;
        bool mInvertAlpha = false;
        FrameRate mFrameRate = mvxmediatypes::kFrameRate_Video25;
        mvxmediatypes::FieldType mFieldType = mvxmediatypes::kFieldType_Progressive;
        PixelAspectRatio mRatio = mvxmediatypes::kPixelAspectRatio_Square;
    };

    SourceRef Make(const BE::VideoSourceRef& inSource, const Declaration& inDeclaration) const
    {
        return CreateRenderableSource(inSource, mBinaryData, inDeclaration.mAlphaKind,
                                      inDeclaration.mMatte, inDeclaration.mIgnoreAlpha,
                                      inDeclaration.mInvertAlpha, inDeclaration.mFrameRate,
                                      inDeclaration.mFieldType, inDeclaration.mRatio, mProfile);
    }
    SourceRef Make(const ScriptedSourceRef& inScripted, const Declaration& inDeclaration) const
    {
        return Make(BE::VideoSourceRef(inScripted), inDeclaration);
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
    lower->mFieldType = mvxmediatypes::kFieldType_LowerFirst;
    const ScriptedSourceRef still = MakeScriptedSource();
    still->mStill = true;
    still->mFrameRate = mvxmediatypes::kFrameRate_Video1000;
    const FrameRate odd = FrameRate::Create(1'000'001);
    const FrameRate even = FrameRate::Create(1'000'002);
    const struct
    {
        ScriptedSourceRef mSource;
        mvxmediatypes::FieldType mDeclared;
        FrameRate mDeclaredRate;
        FrameRate mRate;
        FrameRate mFieldRate;
    } cases[] = {
        {lower, mvxmediatypes::kFieldType_Progressive, mvxmediatypes::kFrameRate_Video25,
         mvxmediatypes::kFrameRate_Video25, mvxmediatypes::kFrameRate_Video25},
        {progressive, mvxmediatypes::kFieldType_UpperFirst, mvxmediatypes::kFrameRate_Video25,
         mvxmediatypes::kFrameRate_Video25, mvxmediatypes::kFrameRate_Video50},
        {lower, mvxmediatypes::kFieldType_AsSource, mvxmediatypes::kFrameRate_Video25,
         mvxmediatypes::kFrameRate_Video25, mvxmediatypes::kFrameRate_Video50},
        {progressive, mvxmediatypes::kFieldType_AsSource, mvxmediatypes::kFrameRate_Video25,
         mvxmediatypes::kFrameRate_Video25, mvxmediatypes::kFrameRate_Video25},
        {lower, mvxmediatypes::kFieldType_Unknown, mvxmediatypes::kFrameRate_Video25,
         mvxmediatypes::kFrameRate_Video25, mvxmediatypes::kFrameRate_Video25},
        {still, mvxmediatypes::kFieldType_Progressive, mvxmediatypes::kFrameRate_Video25,
         mvxmediatypes::kFrameRate_Video1000, mvxmediatypes::kFrameRate_Video1000},
        // An odd interlaced frame is stored one tick longer; progressive and
        // as-source declarations keep it.
        {progressive, mvxmediatypes::kFieldType_LowerFirst, odd, even, even * 2},
        {progressive, mvxmediatypes::kFieldType_Progressive, odd, odd, odd},
        {progressive, mvxmediatypes::kFieldType_AsSource, odd, odd, odd},
    };
    for (const auto& c : cases)
    {
        SCOPED_TRACE(testing::Message() << "declared " << c.mDeclared << " rate "
                                        << c.mDeclaredRate.GetTicksPerFrame());
        Declaration declaration;
        declaration.mFieldType = c.mDeclared;
        declaration.mFrameRate = c.mDeclaredRate;
        const SourceRef source = Make(c.mSource, declaration);
        EXPECT_EQ(RateOf(*source), c.mRate);
        EXPECT_EQ(FieldRateOf(*source), c.mFieldRate);
    }
}

TEST_F(RenderableVideoSourceTest, ConformsToTheFrameOrFieldGridInTheDeliveredOrder)
{
    using mvxmediatypes::kFieldType_AsSource;
    using mvxmediatypes::kFieldType_LowerFirst;
    using mvxmediatypes::kFieldType_Progressive;
    using mvxmediatypes::kFieldType_UpperFirst;
    const std::int64_t f4 = 4 * kFrame25;
    const std::int64_t f2 = 2 * kFrame25;
    const std::int64_t early = f4 + kField25 + 99;
    const MF::FrameTime upperRequest(Ticks(f2 + 10), Ticks(f2 + 10 + kField25));
    const MF::FrameTime interlaced(Ticks(7 * kFrame25 + 5), Ticks(7 * kFrame25 + 5 + kField25));
    const struct
    {
        const char* mWhat;
        mvxmediatypes::FieldType mSourceFieldType;
        mvxmediatypes::FieldType mDeclared;
        std::int32_t mKind;
        FrameRate mDeclaredRate;
        MF::FrameTime mRequest;
        TickPair mConformed;
    } cases[] = {
        {"time-invariant media: one frame at 0",
         kFieldType_Progressive,
         kFieldType_UpperFirst,
         BE::Deprecated::kMediaInfoKind_TimeInvariant,
         mvxmediatypes::kFrameRate_Video25,
         interlaced,
         {0, 0}},
        {"a clip without a rate: one frame",
         kFieldType_Progressive,
         kFieldType_UpperFirst,
         BE::Deprecated::kMediaInfoKind_Clip,
         mvxmediatypes::kFrameRate_Zero,
         interlaced,
         {0, 0}},
        {"progressive request over interlaced: field grid",
         kFieldType_UpperFirst,
         kFieldType_AsSource,
         BE::Deprecated::kMediaInfoKind_Clip,
         mvxmediatypes::kFrameRate_Video25,
         MF::FrameTime(Ticks(f4 + kField25 + 99)),
         {f4 + kField25, f4 + kField25}},
        {"interlaced request, order 1: frame grid",
         kFieldType_UpperFirst,
         kFieldType_AsSource,
         BE::Deprecated::kMediaInfoKind_Clip,
         mvxmediatypes::kFrameRate_Video25,
         MF::FrameTime(Ticks(early), Ticks(early + kField25)),
         {f4, f4 + kField25}},
        {"interlaced request, order 2",
         kFieldType_UpperFirst,
         kFieldType_AsSource,
         BE::Deprecated::kMediaInfoKind_Clip,
         mvxmediatypes::kFrameRate_Video25,
         MF::FrameTime(Ticks(early + kField25), Ticks(early)),
         {f4 + kField25, f4}},
        {"as source over progressive stays progressive",
         kFieldType_Progressive,
         kFieldType_AsSource,
         BE::Deprecated::kMediaInfoKind_Clip,
         mvxmediatypes::kFrameRate_Video25,
         upperRequest,
         {f2, f2}},
        {"a declared order wins over the request's",
         kFieldType_Progressive,
         kFieldType_LowerFirst,
         BE::Deprecated::kMediaInfoKind_Clip,
         mvxmediatypes::kFrameRate_Video25,
         upperRequest,
         {f2 + kField25, f2}},
        {"also for a progressive request",
         kFieldType_Progressive,
         kFieldType_LowerFirst,
         BE::Deprecated::kMediaInfoKind_Clip,
         mvxmediatypes::kFrameRate_Video25,
         MF::FrameTime(Ticks(f2 + kField25 + 3)),
         {f2 + kField25, f2}},
        {"a progressive declaration",
         kFieldType_UpperFirst,
         kFieldType_Progressive,
         BE::Deprecated::kMediaInfoKind_Clip,
         mvxmediatypes::kFrameRate_Video25,
         upperRequest,
         {f2, f2}},
        {"odd interlaced frame: fields half the stored frame apart",
         kFieldType_Progressive,
         kFieldType_UpperFirst,
         BE::Deprecated::kMediaInfoKind_Clip,
         FrameRate::Create(1'000'001),
         MF::FrameTime(Ticks(1'000'003)),
         {1'000'002, 1'500'003}},
    };
    for (const auto& c : cases)
    {
        const ScriptedSourceRef scripted = MakeScriptedSource();
        scripted->mFieldType = c.mSourceFieldType;
        scripted->mKind = c.mKind;
        Declaration declaration;
        declaration.mFieldType = c.mDeclared;
        declaration.mFrameRate = c.mDeclaredRate;
        EXPECT_EQ(TicksOf(Conform(*Make(scripted, declaration), c.mRequest)), c.mConformed)
            << c.mWhat;
    }
    // A still conforms without aligning; a real time-invariant pattern to 0.
    const ScriptedSourceRef still = MakeScriptedSource();
    still->mStill = true;
    still->mFrameRate = mvxmediatypes::kFrameRate_Video1000;
    const std::int64_t time = 3 * kFrame25 + 12'345;
    EXPECT_EQ(TicksOf(Conform(*Make(still, {}), MF::FrameTime(Ticks(time)))), TickPair(time, time));
    Declaration upper;
    upper.mFieldType = kFieldType_UpperFirst;
    EXPECT_EQ(TicksOf(Conform(*Make(OpenPattern("pattern:solid?size=8x4"), upper), interlaced)),
              TickPair(0, 0));
}

TEST_F(RenderableVideoSourceTest, FrameRequestCarriesParamsFieldOrderAndClipData)
{
    const ScriptedSourceRef scripted =
        Handing(MakeFilledFrame(4, 2, Pixel{0x30, 0x20, 0x10, 0xFF}));
    const SourceRef source = Make(scripted, {});
    CutlistRenderParams params = MakeParams(4, 2, 3, mvxmediatypes::kPixelFormat_VUYA_4444_8u);
    params.mPixelAspectRatio = PixelAspectRatio(10, 11);
    const std::int64_t early = kFrame25 * 5 + 17;
    ASSERT_TRUE(Render(*source, MF::FrameTime(Ticks(early + kField25), Ticks(early)), params));
    const std::vector<FrameCall> calls = scripted->FrameCalls();
    ASSERT_EQ(calls.size(), 1u);
    // Same rates: the earlier field time goes to the source as it is.
    EXPECT_EQ(calls[0].mTime.GetTicks(), early);
    const BE::VideoFrameRequest expected{4,
                                         2,
                                         PixelAspectRatio(10, 11),
                                         mvxmediatypes::kPixelFormat_VUYA_4444_8u,
                                         mvxmediatypes::kFieldType_LowerFirst,
                                         3};
    EXPECT_EQ(calls[0].mRequest, expected);
    EXPECT_EQ(calls[0].mBinaryData, mBinaryData);
    EXPECT_EQ(calls[0].mColorProfile, mProfile);
    EXPECT_EQ(calls[0].mFlags, BE::Deprecated::kFrameRequestFlag_Read);

    Render(*source, MF::FrameTime(Ticks(early)), params);
    EXPECT_EQ(scripted->FrameCalls().at(1).mRequest.mFieldType,
              mvxmediatypes::kFieldType_Progressive);
}

TEST_F(RenderableVideoSourceTest, DifferentRatesConvertTheTimeByFrameNumber)
{
    const ScriptedSourceRef scripted = Handing(MakeFilledFrame(4, 2, Pixel{0, 0, 0, 255}));
    scripted->mFrameRate = mvxmediatypes::kFrameRate_Video50;
    // Frame 7 at 25 (anywhere inside it) is frame 7 at 50.
    Render(*Make(scripted, {}), MF::FrameTime(Ticks(kFrame25 * 7 + kFrame25 - 1)), m4x2);
    EXPECT_EQ(scripted->FrameCalls().at(0).mTime.GetTicks(), 7 * kField25);
    // A clip without a rate passes the time unchanged.
    Declaration noRate;
    noRate.mFrameRate = mvxmediatypes::kFrameRate_Zero;
    Render(*Make(scripted, noRate), MF::FrameTime(Ticks(kFrame25 + 5)), m4x2);
    EXPECT_EQ(scripted->FrameCalls().at(1).mTime.GetTicks(), kFrame25 + 5);
}

TEST_F(RenderableVideoSourceTest, FailuresAreThrownAndEmptyTheOutput)
{
    const ScriptedSourceRef failing = MakeScriptedSource();
    failing->mFrameStatus = BE::kResult_FrameOutOfRange;
    FrameRef frame = MakeFilledFrame(4, 2, Pixel{});
    EXPECT_EQ(ThrownStatus([&] { Make(failing, {})->RenderFrame(MF::FrameTime(), m4x2, frame); }),
              BE::kResult_FrameOutOfRange);
    EXPECT_FALSE(frame);

    // Success without a frame.
    frame = MakeFilledFrame(4, 2, Pixel{});
    EXPECT_THROW(Make(MakeScriptedSource(), {})->RenderFrame(MF::FrameTime(), m4x2, frame),
                 QRT::NullInterfaceException);
    EXPECT_FALSE(frame);
}

TEST_F(RenderableVideoSourceTest, EmptySourceThrowsNullInterfaceOnlyWhenRendering)
{
    Declaration declaration;
    declaration.mFieldType = mvxmediatypes::kFieldType_UpperFirst;
    const SourceRef source = Make(BE::VideoSourceRef(), declaration);
    ASSERT_TRUE(source);
    FrameRef frame = MakeFilledFrame(4, 2, Pixel{});
    EXPECT_THROW(source->RenderFrame(MF::FrameTime(), m4x2, frame), QRT::NullInterfaceException);
    EXPECT_FALSE(frame);
    // The description comes from the declaration.
    EXPECT_EQ(RateOf(*source), mvxmediatypes::kFrameRate_Video25);
    EXPECT_EQ(FieldRateOf(*source), mvxmediatypes::kFrameRate_Video50);
    EXPECT_EQ(TicksOf(Conform(*source, MF::FrameTime(Ticks(kFrame25 + 1)))),
              TickPair(kFrame25, kFrame25 + kField25));
    RenderableNodePrefetchList prefetches;
    source->CollectPrefetches(MF::FrameTime(), m4x2, prefetches);
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
    const auto premultiplied = mvxmediatypes::kAlphaChannel_Premultiplied;
    const auto plain = mvxmediatypes::kAlphaChannel_Straight;
    const struct
    {
        const char* mWhat;
        const std::string& mMedia;
        mvxmediatypes::AlphaChannel mKind;
        QRT::ParamColor mMatte;
        bool mIgnore;
        bool mInvert;
        Pixel mExpected;
    } cases[] = {
        // Only the colour bytes count: an alpha byte alone is still a black matte.
        {"over black",
         overBlack,
         premultiplied,
         QRT::ParamColor::FromRGBA(0, 0, 0, 0xFF),
         false,
         false,
         {0, 0, 255, 128}},
        {"over the blue matte",
         overBlue,
         premultiplied,
         QRT::ParamColor::FromRGBA(0, 0, 0xFF),
         false,
         false,
         {0, 0, 255, 128}},
        {"blue matte taken as black",
         overBlue,
         premultiplied,
         QRT::ParamColor(),
         false,
         false,
         {253, 0, 255, 128}},
        {"ignore and invert: opaque", straight, plain, {}, true, true, {0x99, 0x66, 0x33, 255}},
        {"ignore wins over premultiplied",
         straight,
         premultiplied,
         {},
         true,
         false,
         {0x99, 0x66, 0x33, 255}},
        {"invert alone", straight, plain, {}, false, true, {0x99, 0x66, 0x33, 191}},
    };
    for (const auto& c : cases)
    {
        SCOPED_TRACE(c.mWhat);
        Declaration declaration;
        declaration.mAlphaKind = c.mKind;
        declaration.mMatte = c.mMatte;
        declaration.mIgnoreAlpha = c.mIgnore;
        declaration.mInvertAlpha = c.mInvert;
        const FrameRef frame =
            Render(*Make(OpenPattern(c.mMedia), declaration), MF::FrameTime(), MakeParams(8, 4, 5));
        EXPECT_TRUE(AllPixelsAre(frame, c.mExpected));
        if (!c.mIgnore && !c.mInvert)
        {
            EXPECT_EQ(frame->GetAlphaChannel(), plain);
        }
    }

    // The source's own (shared) frame was not written.
    FrameRef original;
    ASSERT_EQ(OpenPattern(overBlack)->GetVideoFrame(
                  Ticks(0), BE::VideoFrameRequest{8, 4}, mBinaryData, mProfile,
                  BE::Deprecated::kFrameRequestFlag_Read, original),
              QRT::kResult_Success);
    EXPECT_TRUE(AllPixelsAre(original, Pixel{0, 0, 128, 128}));
}

TEST_F(RenderableVideoSourceTest, SixteenBitPremultipliedIsMadeStraightThroughStaging)
{
    // Full red at alpha 32768 / 65535 premultiplied over black.
    FrameRef delivered = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_16u, 4, 2,
                                              mvxmediatypes::kPixelAspectRatio_Square, true, false);
    for (int y = 0; y < 2; ++y)
        for (int x = 0; x < 4; ++x)
        {
            auto* pixel = reinterpret_cast<std::uint16_t*>(
                              static_cast<std::uint8_t*>(delivered->GetWritableBaseAddress()) +
                              y * delivered->GetRowBytes()) +
                          4 * x;
            pixel[2] = pixel[3] = 32768;
        }
    Declaration declaration;
    declaration.mAlphaKind = mvxmediatypes::kAlphaChannel_Premultiplied;
    const FrameRef frame = Render(*Make(Handing(delivered), declaration), MF::FrameTime(),
                                  MakeParams(4, 2, 5, mvxmediatypes::kPixelFormat_BGRA_4444_16u));
    ASSERT_EQ(frame->GetPixelFormat(), mvxmediatypes::kPixelFormat_BGRA_4444_16u);
    EXPECT_EQ(frame->GetAlphaChannel(), mvxmediatypes::kAlphaChannel_Straight);
    for (int y = 0; y < 2; ++y)
        for (int x = 0; x < 4; ++x)
        {
            const auto* pixel = reinterpret_cast<const std::uint16_t*>(
                                    static_cast<const std::uint8_t*>(frame->GetBaseAddress()) +
                                    y * frame->GetRowBytes()) +
                                4 * x;
            EXPECT_EQ(std::vector<int>(pixel, pixel + 4), (std::vector<int>{0, 0, 65535, 32768}));
        }
}

TEST_F(RenderableVideoSourceTest, StraightDeclarationRelabelsAndOpaqueFormatsAreLeftAlone)
{
    FrameRef delivered = MakeFilledFrame(4, 2, Pixel{0x10, 0x20, 0x40, 0x80});
    delivered->SetAlphaChannel(mvxmediatypes::kAlphaChannel_Premultiplied);
    const FrameRef frame = Render(*Make(Handing(delivered), {}), MF::FrameTime(), m4x2);
    EXPECT_NE(frame.Get(), delivered.Get());
    EXPECT_EQ(frame->GetAlphaChannel(), mvxmediatypes::kAlphaChannel_Straight);
    EXPECT_TRUE(AllPixelsAre(frame, Pixel{0x10, 0x20, 0x40, 0x80}));
    EXPECT_EQ(delivered->GetAlphaChannel(), mvxmediatypes::kAlphaChannel_Premultiplied);

    const FrameRef opaque =
        VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_YUYV_422_8u, 4, 2,
                             mvxmediatypes::kPixelAspectRatio_Square, true, false);
    Declaration declaration;
    declaration.mIgnoreAlpha = true;
    declaration.mAlphaKind = mvxmediatypes::kAlphaChannel_Premultiplied;
    EXPECT_EQ(Render(*Make(Handing(opaque), declaration), MF::FrameTime(),
                     MakeParams(4, 2, 5, mvxmediatypes::kPixelFormat_YUYV_422_8u))
                  .Get(),
              opaque.Get());
}

TEST_F(RenderableVideoSourceTest, PixelAspectRatioIsAdjustedForNonUniformDelivery)
{
    const FrameRef delivered = MakeFilledFrame(360, 480, Pixel{0, 0, 0, 255});
    const ScriptedSourceRef scripted = Handing(delivered);
    const struct
    {
        PixelAspectRatio mDeclared;
        std::uint32_t mWidth, mHeight;
        PixelAspectRatio mExpected;
        bool mSameFrame;
    } cases[] = {
        // Half the columns of a 720x480 request: pixels twice as wide.
        {PixelAspectRatio(10, 11), 720, 480, PixelAspectRatio(20, 11), false},
        // Uniform delivery keeps the declared ratio; a request without a size too.
        {PixelAspectRatio(10, 11), 720, 960, PixelAspectRatio(10, 11), false},
        {PixelAspectRatio(10, 11), 0, 0, PixelAspectRatio(10, 11), false},
        // A frame that already has the ratio is handed on untouched.
        {PixelAspectRatio(2, 2), 360, 480, mvxmediatypes::kPixelAspectRatio_Square, true},
        // A clip that accepts any ratio keeps the source's.
        {mvxmediatypes::kPixelAspectRatio_Any, 720, 480, mvxmediatypes::kPixelAspectRatio_Square,
         true},
    };
    for (const auto& c : cases)
    {
        Declaration declaration;
        declaration.mRatio = c.mDeclared;
        const FrameRef frame = Render(*Make(scripted, declaration), MF::FrameTime(),
                                      MakeParams(c.mWidth, c.mHeight, 5));
        ASSERT_TRUE(frame);
        EXPECT_EQ(frame->GetPixelAspectRatio(), c.mExpected) << c.mWidth << "x" << c.mHeight;
        EXPECT_EQ(frame.Get() == delivered.Get(), c.mSameFrame) << c.mWidth << "x" << c.mHeight;
    }
    EXPECT_EQ(delivered->GetPixelAspectRatio(), mvxmediatypes::kPixelAspectRatio_Square);
}

TEST_F(RenderableVideoSourceTest, CollectsOneHandleForTheConvertedTimeOnlyWhenWanted)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mFrameRate = mvxmediatypes::kFrameRate_Video50;
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

    const std::vector<PrefetchCall> hints = scripted->PrefetchCalls();
    ASSERT_EQ(hints.size(), 2u);
    for (const PrefetchCall& hint : hints)
    {
        EXPECT_EQ(hint.mTime.GetTicks(), 3 * kField25);
        EXPECT_EQ(hint.mRequest.mFieldType, mvxmediatypes::kFieldType_LowerFirst);
        EXPECT_EQ(hint.mRequest.mQuality, 4u);
        EXPECT_EQ(hint.mBinaryData, mBinaryData);
    }
    // The handle reads the frame of the converted time with the same record.
    QRT::Guid key;
    prefetches[0]->GetPrefetchKey(key);
    EXPECT_EQ(key, scripted->KeyFor(Ticks(3 * kField25)));
    // Appends to what the list already holds.
    source->CollectPrefetches(time, m4x2, prefetches);
    EXPECT_EQ(prefetches.size(), 2u);
}

TEST_F(RenderableVideoSourceTest, ConcurrentRendersOfOneSourceAgree)
{
    Declaration declaration;
    declaration.mAlphaKind = mvxmediatypes::kAlphaChannel_Premultiplied;
    declaration.mMatte = QRT::ParamColor::FromRGBA(0, 0, 0xFF);
    declaration.mRatio = PixelAspectRatio(10, 11);
    const SourceRef source = Make(
        OpenPattern(
            "pattern:solid?size=16x8&color=FF8000&alpha=premultiplied&opacity=128&matte=0000FF"),
        declaration);
    const Pixel expected = ReadPixel(*Render(*source, MF::FrameTime(), MakeParams(16, 8, 5)), 0, 0);
    std::atomic<int> mismatches{0};
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
        threads.emplace_back(
            [&, t]
            {
                for (int i = 0; i < 50; ++i)
                {
                    // Two request sizes: the source scales for one of them.
                    const FrameRef frame = Render(*source, MF::FrameTime(Ticks(i * kFrame25)),
                                                  MakeParams((i + t) % 2 == 0 ? 16 : 32, 8, 5));
                    if (!AllPixelsAre(frame, expected) ||
                        frame->GetAlphaChannel() != mvxmediatypes::kAlphaChannel_Straight)
                        ++mismatches;
                }
            });
    for (std::thread& thread : threads)
        thread.join();
    EXPECT_EQ(mismatches.load(), 0);
}

} // namespace
} // namespace ML::Test
