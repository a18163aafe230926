// RenderableVideoSource (CreateRenderableSource): rates, frame-time
// conforming, the frame request, alpha and pixel-aspect handling, failures and
// prefetch collection.

#include "ML/RenderRequestException.h"
#include "ML/RenderableVideoSources.h"
#include "QRT/Exception.h"
#include "ScriptedVideoSource.h"
#include "SourceTestSupport.h"

#include <atomic>
#include <thread>

#include <gtest/gtest.h>

namespace ML::Test
{
namespace
{

using mvxmediatypes::PixelAspectRatio;

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

    SourceRef Make(const BE::VideoSourceRef& inSource, const Declaration& inDeclaration)
    {
        return CreateRenderableSource(inSource, mBinaryData, inDeclaration.mAlphaKind,
                                      inDeclaration.mMatte, inDeclaration.mIgnoreAlpha,
                                      inDeclaration.mInvertAlpha, inDeclaration.mFrameRate,
                                      inDeclaration.mFieldType, inDeclaration.mRatio, mProfile);
    }

    SourceRef MakeOver(const ScriptedSourceRef& inScripted, const Declaration& inDeclaration)
    {
        return Make(BE::VideoSourceRef(inScripted), inDeclaration);
    }

    FrameRef Render(const SourceRef& inSource, const MF::FrameTime& inTime,
                    const CutlistRenderParams& inParams)
    {
        FrameRef frame;
        inSource->RenderFrame(inTime, inParams, frame);
        EXPECT_TRUE(frame);
        return frame;
    }

    const std::uint8_t mBytes[3] = {7, 8, 9};
    const MF::BinaryData mBinaryData{mBytes, sizeof(mBytes)};
    const BE::ColorProfile mProfile{"BT.709", std::make_shared<const std::vector<std::uint8_t>>(
                                                  std::vector<std::uint8_t>{1, 2})};
};

// --- Object model --------------------------------------------------------------

TEST_F(RenderableVideoSourceTest, AnswersOnlyItsOwnInterfaceAndTheRoot)
{
    const SourceRef source = MakeOver(MakeScriptedSource(), {});
    ASSERT_TRUE(source);
    void* found = nullptr;
    EXPECT_EQ(source->QueryInterface(IRenderableSource::kIID, &found), QRT::kResult_Success);
    EXPECT_EQ(found, source.Get());
    source->Release();
    EXPECT_EQ(source->QueryInterface(QRT::QRTUnknown::kIID, &found), QRT::kResult_Success);
    EXPECT_NE(found, nullptr);
    static_cast<QRT::QRTUnknown*>(found)->Release();
    found = &found;
    EXPECT_EQ(source->QueryInterface(MF::IVideoFrame::kIID, &found), QRT::kResult_NoInterface);
    EXPECT_EQ(found, nullptr);
}

// --- Rates -------------------------------------------------------------------------

TEST_F(RenderableVideoSourceTest, StillAnswersVideo1000AndConformsWithoutAligning)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mStill = true;
    scripted->mFrameRate = mvxmediatypes::kFrameRate_Video1000;
    const SourceRef source = MakeOver(scripted, {});
    EXPECT_EQ(RateOf(*source), mvxmediatypes::kFrameRate_Video1000);
    EXPECT_EQ(FieldRateOf(*source), mvxmediatypes::kFrameRate_Video1000);
    const std::int64_t time = kFrame25 * 3 + 12'345;
    EXPECT_EQ(TicksOf(Conform(*source, MF::FrameTime(Ticks(time)))), Pair(time, time));
}

TEST_F(RenderableVideoSourceTest, OddInterlacedFrameIsStoredOneTickLonger)
{
    Declaration declaration;
    declaration.mFrameRate = FrameRate::Create(1'000'001);
    declaration.mFieldType = mvxmediatypes::kFieldType_LowerFirst;
    EXPECT_EQ(RateOf(*MakeOver(MakeScriptedSource(), declaration)), FrameRate::Create(1'000'002));

    declaration.mFieldType = mvxmediatypes::kFieldType_UpperFirst;
    const SourceRef upper = MakeOver(MakeScriptedSource(), declaration);
    EXPECT_EQ(RateOf(*upper), FrameRate::Create(1'000'002));
    // The fields are then exactly half a frame apart.
    EXPECT_EQ(TicksOf(Conform(*upper, MF::FrameTime(Ticks(1'000'003)))),
              Pair(1'000'002, 1'500'003));

    // Progressive and as-source declarations keep an odd frame.
    declaration.mFieldType = mvxmediatypes::kFieldType_Progressive;
    EXPECT_EQ(RateOf(*MakeOver(MakeScriptedSource(), declaration)), FrameRate::Create(1'000'001));
    declaration.mFieldType = mvxmediatypes::kFieldType_AsSource;
    EXPECT_EQ(RateOf(*MakeOver(MakeScriptedSource(), declaration)), FrameRate::Create(1'000'001));
}

TEST_F(RenderableVideoSourceTest, FieldRateDoublesForInterlacedDeclarationsAndSources)
{
    const ScriptedSourceRef progressive = MakeScriptedSource();
    const ScriptedSourceRef lower = MakeScriptedSource();
    lower->mFieldType = mvxmediatypes::kFieldType_LowerFirst;
    Declaration declaration;

    declaration.mFieldType = mvxmediatypes::kFieldType_Progressive;
    EXPECT_EQ(FieldRateOf(*MakeOver(lower, declaration)), mvxmediatypes::kFrameRate_Video25);
    declaration.mFieldType = mvxmediatypes::kFieldType_UpperFirst;
    EXPECT_EQ(FieldRateOf(*MakeOver(progressive, declaration)), mvxmediatypes::kFrameRate_Video50);
    declaration.mFieldType = mvxmediatypes::kFieldType_AsSource;
    EXPECT_EQ(FieldRateOf(*MakeOver(lower, declaration)), mvxmediatypes::kFrameRate_Video50);
    EXPECT_EQ(FieldRateOf(*MakeOver(progressive, declaration)), mvxmediatypes::kFrameRate_Video25);
    declaration.mFieldType = mvxmediatypes::kFieldType_Unknown;
    EXPECT_EQ(FieldRateOf(*MakeOver(lower, declaration)), mvxmediatypes::kFrameRate_Video25);
    EXPECT_EQ(RateOf(*MakeOver(lower, declaration)), mvxmediatypes::kFrameRate_Video25);
}

// --- ConformFrameTime --------------------------------------------------------------

TEST_F(RenderableVideoSourceTest, TimeInvariantMediaConformsEveryTimeToZero)
{
    Declaration declaration;
    declaration.mFieldType = mvxmediatypes::kFieldType_UpperFirst;
    const SourceRef solid = Make(OpenPattern("pattern:solid?size=8x4"), declaration);
    const MF::FrameTime interlaced(Ticks(kFrame25 * 7 + 5), Ticks(kFrame25 * 7 + 5 + kField25));
    EXPECT_EQ(TicksOf(Conform(*solid, interlaced)), Pair(0, 0));

    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mKind = BE::Deprecated::kMediaInfoKind_TimeInvariant;
    EXPECT_EQ(TicksOf(Conform(*MakeOver(scripted, declaration), interlaced)), Pair(0, 0));

    // A clip without a rate has a single frame as well.
    declaration.mFrameRate = mvxmediatypes::kFrameRate_Zero;
    EXPECT_EQ(TicksOf(Conform(*MakeOver(MakeScriptedSource(), declaration), interlaced)),
              Pair(0, 0));
}

TEST_F(RenderableVideoSourceTest, ProgressiveRequestOverInterlacedSourceAlignsToFieldGrid)
{
    const ScriptedSourceRef upper = MakeScriptedSource();
    upper->mFieldType = mvxmediatypes::kFieldType_UpperFirst;
    Declaration declaration;
    declaration.mFieldType = mvxmediatypes::kFieldType_AsSource;
    const SourceRef source = MakeOver(upper, declaration);
    const std::int64_t secondField = kFrame25 * 4 + kField25;
    EXPECT_EQ(TicksOf(Conform(*source, MF::FrameTime(Ticks(secondField + 99)))),
              Pair(secondField, secondField));
}

TEST_F(RenderableVideoSourceTest, InterlacedRequestAlignsToFrameGridInRequestedOrder)
{
    const ScriptedSourceRef upper = MakeScriptedSource();
    upper->mFieldType = mvxmediatypes::kFieldType_UpperFirst;
    Declaration declaration;
    declaration.mFieldType = mvxmediatypes::kFieldType_AsSource;
    const SourceRef source = MakeOver(upper, declaration);
    const std::int64_t frame = kFrame25 * 4;
    const std::int64_t early = frame + kField25 + 99;
    const std::int64_t late = early + kField25;

    // Order 1: the first slot is the earlier field.
    EXPECT_EQ(TicksOf(Conform(*source, MF::FrameTime(Ticks(early), Ticks(late)))),
              Pair(frame, frame + kField25));
    // Order 2: the first slot is the later field.
    EXPECT_EQ(TicksOf(Conform(*source, MF::FrameTime(Ticks(late), Ticks(early)))),
              Pair(frame + kField25, frame));
}

TEST_F(RenderableVideoSourceTest, DeliveredOrderFollowsDeclarationOrProgressiveSource)
{
    const std::int64_t frame = kFrame25 * 2;
    const MF::FrameTime upperRequest(Ticks(frame + 10), Ticks(frame + 10 + kField25));

    // As-source over a progressive source: the frame stays progressive.
    Declaration declaration;
    declaration.mFieldType = mvxmediatypes::kFieldType_AsSource;
    EXPECT_EQ(TicksOf(Conform(*MakeOver(MakeScriptedSource(), declaration), upperRequest)),
              Pair(frame, frame));

    // A declared order wins over the request's, also for a progressive request.
    declaration.mFieldType = mvxmediatypes::kFieldType_LowerFirst;
    const SourceRef lower = MakeOver(MakeScriptedSource(), declaration);
    EXPECT_EQ(TicksOf(Conform(*lower, upperRequest)), Pair(frame + kField25, frame));
    EXPECT_EQ(TicksOf(Conform(*lower, MF::FrameTime(Ticks(frame + kField25 + 3)))),
              Pair(frame + kField25, frame));

    // A progressive declaration over an interlaced request.
    declaration.mFieldType = mvxmediatypes::kFieldType_Progressive;
    EXPECT_EQ(TicksOf(Conform(*MakeOver(MakeScriptedSource(), declaration), upperRequest)),
              Pair(frame, frame));
}

// --- RenderFrame: the request --------------------------------------------------------

TEST_F(RenderableVideoSourceTest, FrameRequestCarriesParamsFieldOrderAndClipData)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mFrame = MakeFilledFrame(4, 2, 0xFF102030u);
    const SourceRef source = MakeOver(scripted, {});
    CutlistRenderParams params = MakeParams(4, 2, mvxmediatypes::kPixelFormat_VUYA_4444_8u, 3);
    params.mPixelAspectRatio = PixelAspectRatio(10, 11);
    const std::int64_t early = kFrame25 * 5 + 17;

    Render(source, MF::FrameTime(Ticks(early + kField25), Ticks(early)), params);
    const std::vector<FrameRequestCall> calls = scripted->FrameCalls();
    ASSERT_EQ(calls.size(), 1u);
    // Same rates: the earlier field time goes to the source as it is.
    EXPECT_EQ(calls[0].mTime.GetTicks(), early);
    EXPECT_EQ(calls[0].mRequest.mWidth, 4u);
    EXPECT_EQ(calls[0].mRequest.mHeight, 2u);
    EXPECT_EQ(calls[0].mRequest.mPixelAspectRatio, PixelAspectRatio(10, 11));
    EXPECT_EQ(calls[0].mRequest.mPixelFormat, mvxmediatypes::kPixelFormat_VUYA_4444_8u);
    EXPECT_EQ(calls[0].mRequest.mFieldType, mvxmediatypes::kFieldType_LowerFirst);
    EXPECT_EQ(calls[0].mRequest.mQuality, 3u);
    EXPECT_EQ(calls[0].mBinaryData, mBinaryData);
    EXPECT_EQ(calls[0].mColorProfile, mProfile);
    EXPECT_EQ(calls[0].mFlags, BE::Deprecated::kFrameRequestFlag_Read);

    Render(source, MF::FrameTime(Ticks(early)), params);
    EXPECT_EQ(scripted->FrameCalls().at(1).mRequest.mFieldType,
              mvxmediatypes::kFieldType_Progressive);
}

TEST_F(RenderableVideoSourceTest, DifferentRatesConvertTheTimeByFrameNumber)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mFrame = MakeFilledFrame(4, 2, 0xFF000000u);
    scripted->mFrameRate = mvxmediatypes::kFrameRate_Video50;
    const SourceRef source = MakeOver(scripted, {});
    // Frame 7 at 25 (anywhere inside it) is frame 7 at 50.
    Render(source, MF::FrameTime(Ticks(kFrame25 * 7 + kFrame25 - 1)), MakeParams(4, 2));
    EXPECT_EQ(scripted->FrameCalls().at(0).mTime.GetTicks(), 7 * kField25);

    // A clip without a rate passes the time unchanged.
    Declaration noRate;
    noRate.mFrameRate = mvxmediatypes::kFrameRate_Zero;
    Render(MakeOver(scripted, noRate), MF::FrameTime(Ticks(kFrame25 + 5)), MakeParams(4, 2));
    EXPECT_EQ(scripted->FrameCalls().at(1).mTime.GetTicks(), kFrame25 + 5);
}

// --- RenderFrame: failures --------------------------------------------------------------

TEST_F(RenderableVideoSourceTest, SourceFailureIsThrownWithItsStatusAndEmptiesTheOutput)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mFrameStatus = BE::kResult_FrameOutOfRange;
    const SourceRef source = MakeOver(scripted, {});
    FrameRef frame = MakeFilledFrame(4, 2, 0);
    try
    {
        source->RenderFrame(MF::FrameTime(Ticks(0)), MakeParams(4, 2), frame);
        FAIL() << "no exception";
    }
    catch (const RenderRequestException& exception)
    {
        EXPECT_EQ(exception.GetStatus(), BE::kResult_FrameOutOfRange);
    }
    EXPECT_FALSE(frame);
}

TEST_F(RenderableVideoSourceTest, SuccessWithoutFrameThrowsNullInterface)
{
    const SourceRef source = MakeOver(MakeScriptedSource(), {});
    FrameRef frame;
    EXPECT_THROW(source->RenderFrame(MF::FrameTime(Ticks(0)), MakeParams(4, 2), frame),
                 QRT::NullInterfaceException);
    EXPECT_FALSE(frame);
}

TEST_F(RenderableVideoSourceTest, EmptySourceThrowsNullInterfaceOnlyWhenRendering)
{
    Declaration declaration;
    declaration.mFieldType = mvxmediatypes::kFieldType_UpperFirst;
    const SourceRef source = Make(BE::VideoSourceRef(), declaration);
    ASSERT_TRUE(source);
    FrameRef frame = MakeFilledFrame(4, 2, 0);
    EXPECT_THROW(source->RenderFrame(MF::FrameTime(Ticks(0)), MakeParams(4, 2), frame),
                 QRT::NullInterfaceException);
    EXPECT_FALSE(frame);
    // The description comes from the declaration.
    EXPECT_EQ(RateOf(*source), mvxmediatypes::kFrameRate_Video25);
    EXPECT_EQ(FieldRateOf(*source), mvxmediatypes::kFrameRate_Video50);
    EXPECT_EQ(TicksOf(Conform(*source, MF::FrameTime(Ticks(kFrame25 + 1)))),
              Pair(kFrame25, kFrame25 + kField25));
    RenderableNodePrefetchList prefetches;
    source->CollectPrefetches(MF::FrameTime(Ticks(0)), MakeParams(4, 2), prefetches);
    EXPECT_TRUE(prefetches.empty());
}

// --- RenderFrame: alpha -----------------------------------------------------------------

TEST_F(RenderableVideoSourceTest, PremultipliedOverBlackIsMadeStraight)
{
    // Red at alpha 128 premultiplied over black is stored as red 128.
    const BE::VideoSourceRef pattern = OpenPattern(
        "pattern:solid?size=8x4&color=FF0000&alpha=premultiplied&opacity=128&matte=000000");
    Declaration declaration;
    declaration.mAlphaKind = mvxmediatypes::kAlphaChannel_Premultiplied;
    // Only the colour bytes count: an alpha byte alone is still a black matte.
    declaration.mMatte = QRT::ParamColor::FromRGBA(0, 0, 0, 0xFF);
    const FrameRef frame = Render(Make(pattern, declaration), MF::FrameTime(), MakeParams(8, 4));
    EXPECT_TRUE(AllPixelsAre(frame, Bgra(0, 0, 255, 128)));
    EXPECT_EQ(frame->GetAlphaChannel(), mvxmediatypes::kAlphaChannel_Straight);

    // The source's own (shared) frame was not written.
    FrameRef original;
    ASSERT_EQ(pattern->GetVideoFrame(Ticks(0), BE::VideoFrameRequest{8, 4}, mBinaryData, mProfile,
                                     BE::Deprecated::kFrameRequestFlag_Read, original),
              QRT::kResult_Success);
    EXPECT_TRUE(AllPixelsAre(original, Bgra(0, 0, 128, 128)));
}

TEST_F(RenderableVideoSourceTest, PremultipliedOverColouredMatteIsUnpremultipliedAgainstIt)
{
    // Red at 128 over a blue matte: red 128, blue 127.
    const BE::VideoSourceRef pattern = OpenPattern(
        "pattern:solid?size=8x4&color=FF0000&alpha=premultiplied&opacity=128&matte=0000FF");
    Declaration declaration;
    declaration.mAlphaKind = mvxmediatypes::kAlphaChannel_Premultiplied;
    declaration.mMatte = QRT::ParamColor::FromRGBA(0, 0, 0xFF);
    const FrameRef frame = Render(Make(pattern, declaration), MF::FrameTime(), MakeParams(8, 4));
    EXPECT_TRUE(AllPixelsAre(frame, Bgra(0, 0, 255, 128)));
    EXPECT_EQ(frame->GetAlphaChannel(), mvxmediatypes::kAlphaChannel_Straight);

    // Taken as premultiplied over black instead, the blue would stay.
    declaration.mMatte = QRT::ParamColor();
    const FrameRef overBlack =
        Render(Make(pattern, declaration), MF::FrameTime(), MakeParams(8, 4));
    EXPECT_TRUE(AllPixelsAre(overBlack, Bgra(253, 0, 255, 128)));
}

TEST_F(RenderableVideoSourceTest, SixteenBitPremultipliedIsMadeStraightThroughStaging)
{
    // Full red at alpha 32768 / 65535 premultiplied over black.
    FrameRef delivered = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_16u, 4, 2,
                                              mvxmediatypes::kPixelAspectRatio_Square, true, false);
    ASSERT_TRUE(delivered);
    for (int y = 0; y < 2; ++y)
    {
        auto* row = reinterpret_cast<std::uint16_t*>(
            static_cast<std::uint8_t*>(delivered->GetWritableBaseAddress()) +
            y * delivered->GetRowBytes());
        for (int x = 0; x < 4; ++x)
        {
            row[4 * x + 2] = 32768;
            row[4 * x + 3] = 32768;
        }
    }
    delivered->MarkShared(1);
    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mFrame = delivered;
    Declaration declaration;
    declaration.mAlphaKind = mvxmediatypes::kAlphaChannel_Premultiplied;
    const FrameRef frame = Render(MakeOver(scripted, declaration), MF::FrameTime(),
                                  MakeParams(4, 2, mvxmediatypes::kPixelFormat_BGRA_4444_16u));
    ASSERT_EQ(frame->GetPixelFormat(), mvxmediatypes::kPixelFormat_BGRA_4444_16u);
    EXPECT_EQ(frame->GetAlphaChannel(), mvxmediatypes::kAlphaChannel_Straight);
    for (int y = 0; y < 2; ++y)
    {
        const auto* row = reinterpret_cast<const std::uint16_t*>(
            static_cast<const std::uint8_t*>(frame->GetBaseAddress()) + y * frame->GetRowBytes());
        for (int x = 0; x < 4; ++x)
        {
            EXPECT_EQ(row[4 * x + 0], 0);
            EXPECT_EQ(row[4 * x + 1], 0);
            EXPECT_EQ(row[4 * x + 2], 65535);
            EXPECT_EQ(row[4 * x + 3], 32768);
        }
    }
}

TEST_F(RenderableVideoSourceTest, StraightDeclarationRelabelsWithoutTouchingPixels)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    FrameRef delivered = MakeFilledFrame(4, 2, 0x80402010u);
    delivered->SetAlphaChannel(mvxmediatypes::kAlphaChannel_Premultiplied);
    delivered->MarkShared(1);
    scripted->mFrame = delivered;
    const FrameRef frame = Render(MakeOver(scripted, {}), MF::FrameTime(), MakeParams(4, 2));
    EXPECT_NE(frame.Get(), delivered.Get());
    EXPECT_EQ(frame->GetAlphaChannel(), mvxmediatypes::kAlphaChannel_Straight);
    EXPECT_TRUE(AllPixelsAre(frame, Bgra(0x10, 0x20, 0x40, 0x80)));
    EXPECT_EQ(delivered->GetAlphaChannel(), mvxmediatypes::kAlphaChannel_Premultiplied);
}

TEST_F(RenderableVideoSourceTest, IgnoreAndInvertTogetherOnlyMakeAlphaOpaque)
{
    const BE::VideoSourceRef pattern =
        OpenPattern("pattern:solid?size=8x4&color=336699&alpha=straight&opacity=64");
    Declaration declaration;
    declaration.mIgnoreAlpha = true;
    declaration.mInvertAlpha = true;
    FrameRef frame = Render(Make(pattern, declaration), MF::FrameTime(), MakeParams(8, 4));
    EXPECT_TRUE(AllPixelsAre(frame, Bgra(0x99, 0x66, 0x33, 255)));

    // Ignore alone also wins over a premultiplied declaration: no conversion.
    declaration.mInvertAlpha = false;
    declaration.mAlphaKind = mvxmediatypes::kAlphaChannel_Premultiplied;
    frame = Render(Make(pattern, declaration), MF::FrameTime(), MakeParams(8, 4));
    EXPECT_TRUE(AllPixelsAre(frame, Bgra(0x99, 0x66, 0x33, 255)));

    // Invert alone inverts the alpha and keeps straight colour.
    declaration = {};
    declaration.mInvertAlpha = true;
    frame = Render(Make(pattern, declaration), MF::FrameTime(), MakeParams(8, 4));
    EXPECT_TRUE(AllPixelsAre(frame, Bgra(0x99, 0x66, 0x33, 191)));
}

TEST_F(RenderableVideoSourceTest, OpaqueFormatsAreLeftAlone)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    const FrameRef delivered =
        VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_YUYV_422_8u, 4, 2,
                             mvxmediatypes::kPixelAspectRatio_Square, true, false);
    delivered->MarkShared(1);
    scripted->mFrame = delivered;
    Declaration declaration;
    declaration.mIgnoreAlpha = true;
    declaration.mAlphaKind = mvxmediatypes::kAlphaChannel_Premultiplied;
    const FrameRef frame = Render(MakeOver(scripted, declaration), MF::FrameTime(),
                                  MakeParams(4, 2, mvxmediatypes::kPixelFormat_YUYV_422_8u));
    EXPECT_EQ(frame.Get(), delivered.Get());
}

// --- RenderFrame: pixel aspect ratio ---------------------------------------------------

TEST_F(RenderableVideoSourceTest, PixelAspectRatioIsAdjustedForNonUniformDelivery)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    FrameRef delivered = MakeFilledFrame(360, 480, 0xFF000000u);
    delivered->MarkShared(1);
    scripted->mFrame = delivered;
    Declaration declaration;
    declaration.mRatio = PixelAspectRatio(10, 11);
    const SourceRef source = MakeOver(scripted, declaration);

    // Half the columns of a 720x480 request: pixels twice as wide.
    FrameRef frame = Render(source, MF::FrameTime(), MakeParams(720, 480));
    EXPECT_EQ(frame->GetPixelAspectRatio(), PixelAspectRatio(20, 11));
    EXPECT_NE(frame.Get(), delivered.Get());
    EXPECT_EQ(delivered->GetPixelAspectRatio(), mvxmediatypes::kPixelAspectRatio_Square);

    // Uniform delivery keeps the declared ratio; a request without a size too.
    frame = Render(source, MF::FrameTime(), MakeParams(720, 960));
    EXPECT_EQ(frame->GetPixelAspectRatio(), PixelAspectRatio(10, 11));
    frame = Render(source, MF::FrameTime(), MakeParams(0, 0));
    EXPECT_EQ(frame->GetPixelAspectRatio(), PixelAspectRatio(10, 11));

    // A frame that already has the ratio is handed on untouched.
    declaration.mRatio = PixelAspectRatio(2, 2);
    frame = Render(MakeOver(scripted, declaration), MF::FrameTime(), MakeParams(360, 480));
    EXPECT_EQ(frame.Get(), delivered.Get());

    // A clip that accepts any ratio keeps the source's.
    declaration.mRatio = mvxmediatypes::kPixelAspectRatio_Any;
    frame = Render(MakeOver(scripted, declaration), MF::FrameTime(), MakeParams(720, 480));
    EXPECT_EQ(frame.Get(), delivered.Get());
}

// --- CollectPrefetches -------------------------------------------------------------------

TEST_F(RenderableVideoSourceTest, CollectsOneHandleForTheConvertedTimeWhenWanted)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mFrameRate = mvxmediatypes::kFrameRate_Video50;
    scripted->mPrefetchWanted = true;
    const SourceRef source = MakeOver(scripted, {});
    const CutlistRenderParams params =
        MakeParams(4, 2, mvxmediatypes::kPixelFormat_BGRA_4444_8u, 4);
    const MF::FrameTime time(Ticks(kFrame25 * 3 + kField25 + 1), Ticks(kFrame25 * 3 + 1));

    RenderableNodePrefetchList prefetches;
    source->CollectPrefetches(time, params, prefetches);
    ASSERT_EQ(prefetches.size(), 1u);
    ASSERT_TRUE(prefetches[0]);

    const std::vector<PrefetchCall> hints = scripted->PrefetchCalls();
    ASSERT_EQ(hints.size(), 1u);
    EXPECT_EQ(hints[0].mTime.GetTicks(), 3 * kField25);
    EXPECT_EQ(hints[0].mRequest.mFieldType, mvxmediatypes::kFieldType_LowerFirst);
    EXPECT_EQ(hints[0].mRequest.mQuality, 4u);
    EXPECT_EQ(hints[0].mBinaryData, mBinaryData);

    // The handle reads the frame of the converted time with the same record.
    QRT::Guid key;
    prefetches[0]->GetPrefetchKey(key);
    EXPECT_EQ(key,
              scripted->GetFrameKey(Ticks(3 * kField25), hints[0].mRequest, mBinaryData, mProfile));

    // Appends to what the list already holds.
    source->CollectPrefetches(time, params, prefetches);
    EXPECT_EQ(prefetches.size(), 2u);
}

TEST_F(RenderableVideoSourceTest, CollectsNothingWhenNoPrefetchIsWanted)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    const SourceRef source = MakeOver(scripted, {});
    RenderableNodePrefetchList prefetches;
    source->CollectPrefetches(MF::FrameTime(Ticks(kFrame25)), MakeParams(4, 2), prefetches);
    EXPECT_TRUE(prefetches.empty());
    // The source still receives the hint.
    ASSERT_EQ(scripted->PrefetchCalls().size(), 1u);
    EXPECT_EQ(scripted->PrefetchCalls()[0].mTime.GetTicks(), kFrame25);
}

// --- Threads -----------------------------------------------------------------------------

TEST_F(RenderableVideoSourceTest, ConcurrentRendersOfOneSourceAgree)
{
    const BE::VideoSourceRef pattern = OpenPattern(
        "pattern:solid?size=16x8&color=FF8000&alpha=premultiplied&opacity=128&matte=0000FF");
    Declaration declaration;
    declaration.mAlphaKind = mvxmediatypes::kAlphaChannel_Premultiplied;
    declaration.mMatte = QRT::ParamColor::FromRGBA(0, 0, 0xFF);
    declaration.mRatio = PixelAspectRatio(10, 11);
    const SourceRef source = Make(pattern, declaration);
    const FrameRef reference = Render(source, MF::FrameTime(), MakeParams(16, 8));
    const std::array<int, 4> expected = Pixel(reference, 0, 0);

    constexpr int kThreads = 4;
    constexpr int kRendersPerThread = 50;
    std::atomic<int> mismatches{0};
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t)
        threads.emplace_back(
            [&, t]
            {
                for (int i = 0; i < kRendersPerThread; ++i)
                {
                    FrameRef frame;
                    // Two request sizes: the source scales for one of them.
                    const std::uint32_t width = (i + t) % 2 == 0 ? 16 : 32;
                    source->RenderFrame(MF::FrameTime(Ticks(i * kFrame25)), MakeParams(width, 8),
                                        frame);
                    if (!frame || !AllPixelsAre(frame, expected) ||
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
