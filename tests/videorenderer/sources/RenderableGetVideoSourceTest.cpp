// RenderableGetVideoSource (CreateRenderableGetVideoSource): rates, frame-time
// conforming anchored at the frame-grid origin, the frame it makes and the
// draw-into-frame arguments, alpha handling and failures.

#include "ML/RenderRequestException.h"
#include "ML/RenderableVideoSources.h"
#include "QRT/Exception.h"
#include "ScriptedVideoSource.h"
#include "SourceTestSupport.h"

#include <gtest/gtest.h>

namespace ML::Test
{
namespace
{

using mvxmediatypes::PixelAspectRatio;

class RenderableGetVideoSourceTest : public ::testing::Test
{
protected:
    struct Declaration
    {
        TickTime mOrigin;
        TickTime mSecondTime = Ticks(4242);
        QRT::ParamColor mMatte;
        mvxmediatypes::AlphaChannel mAlphaKind = mvxmediatypes::kAlphaChannel_Straight;
        bool mIgnoreAlpha = false;
        bool mInvertAlpha = false;
        bool mThirdFlag = true;
        double mValue = 0.625;
        FrameRate mFrameRate = mvxmediatypes::kFrameRate_Video25;
    };

    SourceRef Make(const BE::VideoSourceRef& inSource, const Declaration& inDeclaration)
    {
        return CreateRenderableGetVideoSource(inSource, mBinaryData, inDeclaration.mOrigin,
                                              inDeclaration.mSecondTime, inDeclaration.mMatte,
                                              inDeclaration.mAlphaKind, inDeclaration.mIgnoreAlpha,
                                              inDeclaration.mInvertAlpha, inDeclaration.mThirdFlag,
                                              inDeclaration.mValue, inDeclaration.mFrameRate);
    }

    SourceRef MakeOver(const ScriptedSourceRef& inScripted, const Declaration& inDeclaration)
    {
        return Make(BE::VideoSourceRef(inScripted), inDeclaration);
    }

    const std::uint8_t mBytes[2] = {0xAB, 0xCD};
    const MF::BinaryData mBinaryData{mBytes, sizeof(mBytes)};
};

// --- Rates -------------------------------------------------------------------------

TEST_F(RenderableGetVideoSourceTest, RatesFollowKindStillAndSourceFieldType)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    const SourceRef source = MakeOver(scripted, {});
    EXPECT_EQ(RateOf(*source), mvxmediatypes::kFrameRate_Video25);
    EXPECT_EQ(FieldRateOf(*source), mvxmediatypes::kFrameRate_Video25);

    for (mvxmediatypes::FieldType fieldType :
         {mvxmediatypes::kFieldType_UpperFirst, mvxmediatypes::kFieldType_LowerFirst,
          mvxmediatypes::kFieldType_AsSource})
    {
        scripted->mFieldType = fieldType;
        EXPECT_EQ(FieldRateOf(*source), mvxmediatypes::kFrameRate_Video50) << fieldType;
    }
    scripted->mFieldType = mvxmediatypes::kFieldType_Unknown;
    EXPECT_EQ(FieldRateOf(*source), mvxmediatypes::kFrameRate_Video25);

    scripted->mFieldType = mvxmediatypes::kFieldType_UpperFirst;
    scripted->mStill = true;
    EXPECT_EQ(RateOf(*source), mvxmediatypes::kFrameRate_Video1000);
    EXPECT_EQ(FieldRateOf(*source), mvxmediatypes::kFrameRate_Video1000);

    scripted->mStill = false;
    scripted->mKind = BE::Deprecated::kMediaInfoKind_TimeInvariant;
    EXPECT_EQ(RateOf(*source), mvxmediatypes::kFrameRate_Zero);
    EXPECT_EQ(FieldRateOf(*source), mvxmediatypes::kFrameRate_Zero);
}

// --- ConformFrameTime --------------------------------------------------------------

TEST_F(RenderableGetVideoSourceTest, FrameGridIsAnchoredAtTheOrigin)
{
    Declaration declaration;
    declaration.mOrigin = Ticks(1000);
    const SourceRef source = MakeOver(MakeScriptedSource(), declaration);
    EXPECT_EQ(TicksOf(Conform(*source, MF::FrameTime(Ticks(kFrame25 + 999)))), Pair(1000, 1000));
    EXPECT_EQ(TicksOf(Conform(*source, MF::FrameTime(Ticks(kFrame25 + 1000)))),
              Pair(kFrame25 + 1000, kFrame25 + 1000));
    // Before the origin the grid continues downward.
    EXPECT_EQ(TicksOf(Conform(*source, MF::FrameTime(Ticks(999)))),
              Pair(1000 - kFrame25, 1000 - kFrame25));
}

TEST_F(RenderableGetVideoSourceTest, InterlacedRequestGetsSecondFieldInItsOrder)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mFieldType = mvxmediatypes::kFieldType_UpperFirst;
    const SourceRef source = MakeOver(scripted, {});
    const std::int64_t frame = kFrame25 * 6;
    const TickTime early = Ticks(frame + 77);
    const TickTime late = Ticks(frame + 77 + kField25);
    EXPECT_EQ(TicksOf(Conform(*source, MF::FrameTime(early, late))), Pair(frame, frame + kField25));
    EXPECT_EQ(TicksOf(Conform(*source, MF::FrameTime(late, early))), Pair(frame + kField25, frame));
    // A progressive request stays progressive, on the frame grid.
    EXPECT_EQ(TicksOf(Conform(*source, MF::FrameTime(late))), Pair(frame, frame));

    // Over a progressive source the second field lies a whole frame later.
    scripted->mFieldType = mvxmediatypes::kFieldType_Progressive;
    EXPECT_EQ(TicksOf(Conform(*source, MF::FrameTime(early, late))), Pair(frame, frame + kFrame25));
}

TEST_F(RenderableGetVideoSourceTest, StillsAndTimeInvariantMediaAreNotAligned)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mStill = true;
    scripted->mFieldType = mvxmediatypes::kFieldType_UpperFirst;
    const SourceRef source = MakeOver(scripted, {});
    const TickTime early = Ticks(kFrame25 + 5);
    const TickTime late = Ticks(kFrame25 + 5 + kField25);
    EXPECT_EQ(TicksOf(Conform(*source, MF::FrameTime(early, late))),
              Pair(kFrame25 + 5, kFrame25 + 5));

    scripted->mStill = false;
    scripted->mKind = BE::Deprecated::kMediaInfoKind_TimeInvariant;
    EXPECT_EQ(TicksOf(Conform(*source, MF::FrameTime(early, late))), Pair(0, 0));

    scripted->mKind = BE::Deprecated::kMediaInfoKind_Clip;
    Declaration noRate;
    noRate.mFrameRate = mvxmediatypes::kFrameRate_Zero;
    EXPECT_EQ(TicksOf(Conform(*MakeOver(scripted, noRate), MF::FrameTime(early, late))),
              Pair(0, 0));
}

// --- RenderFrame ---------------------------------------------------------------------

TEST_F(RenderableGetVideoSourceTest, DrawsIntoNearestFormatWithTheClipsArguments)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mPixelFormats = {mvxmediatypes::kPixelFormat_BGRA_4444_8u,
                               mvxmediatypes::kPixelFormat_VUYA_4444_8u};
    Declaration declaration;
    declaration.mOrigin = Ticks(300);
    declaration.mIgnoreAlpha = false;
    declaration.mInvertAlpha = true;
    const SourceRef source = MakeOver(scripted, declaration);
    CutlistRenderParams params = MakeParams(6, 4, mvxmediatypes::kPixelFormat_VUYA_4444_32f, 2);
    params.mPixelAspectRatio = PixelAspectRatio(4, 3);
    const TickTime early = Ticks(kFrame25 * 2 + 11);
    const TickTime late = Ticks(kFrame25 * 2 + 11 + kField25);

    FrameRef frame;
    source->RenderFrame(MF::FrameTime(late, early), params, frame);
    ASSERT_TRUE(frame);
    const std::vector<DrawCall> calls = scripted->DrawCalls();
    ASSERT_EQ(calls.size(), 1u);
    const DrawCall& call = calls[0];
    // The YUV model is nearer than depth: the 8-bit VUYA the source offers.
    EXPECT_EQ(call.mDestinationFormat, mvxmediatypes::kPixelFormat_VUYA_4444_8u);
    EXPECT_EQ(call.mDestinationBounds.Width(), 6);
    EXPECT_EQ(call.mDestinationBounds.Height(), 4);
    EXPECT_EQ(call.mDestinationRatio, PixelAspectRatio(4, 3));
    EXPECT_EQ(call.mDestinationFieldType, mvxmediatypes::kFieldType_LowerFirst);
    // Its own frame is worked on in place (here: the inverted alpha).
    EXPECT_EQ(call.mDestination, static_cast<const void*>(frame.Get()));
    EXPECT_EQ(call.mTime, early);
    EXPECT_EQ(call.mBinaryData, mBinaryData);
    EXPECT_EQ(call.mFrameGridOrigin, Ticks(300));
    EXPECT_EQ(call.mSecondTime, Ticks(4242));
    EXPECT_EQ(call.mQuality, mvxmediatypes::kRenderQuality_Low);
    EXPECT_EQ(call.mFieldType, mvxmediatypes::kFieldType_LowerFirst);
    EXPECT_FALSE(call.mProgressive);
    EXPECT_FALSE(call.mIgnoreAlpha);
    EXPECT_TRUE(call.mInvertAlpha);
    EXPECT_TRUE(call.mThirdFlag);
    EXPECT_EQ(call.mValue, 0.625);
    EXPECT_EQ(frame->GetFieldType(), mvxmediatypes::kFieldType_LowerFirst);

    source->RenderFrame(MF::FrameTime(early), params, frame);
    EXPECT_TRUE(scripted->DrawCalls().at(1).mProgressive);
    EXPECT_EQ(scripted->DrawCalls().at(1).mFieldType, mvxmediatypes::kFieldType_Progressive);
}

TEST_F(RenderableGetVideoSourceTest, ConvertsTimeByFrameNumberOnlyBetweenVideoRates)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mFrameRate = mvxmediatypes::kFrameRate_Video50;
    FrameRef frame;
    const MF::FrameTime time(Ticks(kFrame25 * 9 + 3));
    MakeOver(scripted, {})->RenderFrame(time, MakeParams(2, 2), frame);
    EXPECT_EQ(scripted->DrawCalls().at(0).mTime.GetTicks(), 9 * kField25);

    // Still rates are not numbered against video rates.
    scripted->mFrameRate = mvxmediatypes::kFrameRate_Video1000;
    MakeOver(scripted, {})->RenderFrame(time, MakeParams(2, 2), frame);
    EXPECT_EQ(scripted->DrawCalls().at(1).mTime.GetTicks(), kFrame25 * 9 + 3);

    scripted->mFrameRate = mvxmediatypes::kFrameRate_Video50;
    Declaration noRate;
    noRate.mFrameRate = mvxmediatypes::kFrameRate_Zero;
    MakeOver(scripted, noRate)->RenderFrame(time, MakeParams(2, 2), frame);
    EXPECT_EQ(scripted->DrawCalls().at(2).mTime.GetTicks(), kFrame25 * 9 + 3);
}

TEST_F(RenderableGetVideoSourceTest, DrawsARealPatternSource)
{
    const SourceRef source = Make(OpenPattern("pattern:solid?size=8x4&color=336699"), {});
    FrameRef frame;
    source->RenderFrame(MF::FrameTime(Ticks(kFrame25)), MakeParams(4, 2), frame);
    ASSERT_TRUE(frame);
    EXPECT_EQ(frame->GetPixelFormat(), mvxmediatypes::kPixelFormat_BGRA_4444_8u);
    EXPECT_TRUE(AllPixelsAre(frame, Bgra(0x99, 0x66, 0x33, 255)));
}

TEST_F(RenderableGetVideoSourceTest, PremultipliedDrawIsUnpremultipliedAgainstTheMatte)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    // Red at alpha 128 premultiplied over blue.
    scripted->mDrawColor = 0x8080007Fu;
    Declaration declaration;
    declaration.mAlphaKind = mvxmediatypes::kAlphaChannel_Premultiplied;
    declaration.mMatte = QRT::ParamColor::FromRGBA(0, 0, 0xFF);
    FrameRef frame;
    MakeOver(scripted, declaration)->RenderFrame(MF::FrameTime(), MakeParams(4, 2), frame);
    ASSERT_TRUE(frame);
    EXPECT_TRUE(AllPixelsAre(frame, Bgra(0, 0, 255, 128)));
    EXPECT_EQ(frame->GetAlphaChannel(), mvxmediatypes::kAlphaChannel_Straight);

    // Ignore and invert together: opaque alpha, colour as drawn.
    declaration.mIgnoreAlpha = true;
    declaration.mInvertAlpha = true;
    MakeOver(scripted, declaration)->RenderFrame(MF::FrameTime(), MakeParams(4, 2), frame);
    EXPECT_TRUE(AllPixelsAre(frame, Bgra(0x7F, 0, 0x80, 255)));
}

TEST_F(RenderableGetVideoSourceTest, CollectsNoPrefetches)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mPrefetchWanted = true;
    RenderableNodePrefetchList prefetches;
    MakeOver(scripted, {})->CollectPrefetches(MF::FrameTime(), MakeParams(4, 2), prefetches);
    EXPECT_TRUE(prefetches.empty());
    EXPECT_TRUE(scripted->PrefetchCalls().empty());
}

// --- Failures --------------------------------------------------------------------------

TEST_F(RenderableGetVideoSourceTest, DrawFailureIsThrownWithItsStatus)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mDrawStatus = BE::kResult_MediaMalformed;
    FrameRef frame = MakeFilledFrame(2, 2, 0);
    try
    {
        MakeOver(scripted, {})->RenderFrame(MF::FrameTime(), MakeParams(4, 2), frame);
        FAIL() << "no exception";
    }
    catch (const RenderRequestException& exception)
    {
        EXPECT_EQ(exception.GetStatus(), BE::kResult_MediaMalformed);
    }
    EXPECT_FALSE(frame);
}

TEST_F(RenderableGetVideoSourceTest, FrameCreationFailureIsThrownWithItsStatus)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    // No format to choose from: the frame cannot be made.
    scripted->mPixelFormats.clear();
    FrameRef frame;
    QRT::Result expected = QRT::kResult_Success;
    FrameRef unused;
    expected = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_Invalid, 4, 2,
                                    mvxmediatypes::kPixelAspectRatio_Square, false, false, unused);
    ASSERT_TRUE(QRT::Failed(expected));
    try
    {
        MakeOver(scripted, {})->RenderFrame(MF::FrameTime(), MakeParams(4, 2), frame);
        FAIL() << "no exception";
    }
    catch (const RenderRequestException& exception)
    {
        EXPECT_EQ(exception.GetStatus(), expected);
    }
    EXPECT_FALSE(frame);
    EXPECT_TRUE(scripted->DrawCalls().empty());
}

TEST_F(RenderableGetVideoSourceTest, EmptySourceThrowsNullInterface)
{
    const SourceRef source = Make(BE::VideoSourceRef(), {});
    ASSERT_TRUE(source);
    FrameRef frame;
    EXPECT_THROW(source->RenderFrame(MF::FrameTime(), MakeParams(4, 2), frame),
                 QRT::NullInterfaceException);
    FrameRate rate;
    EXPECT_THROW(source->GetFrameRate(rate), QRT::NullInterfaceException);
}

} // namespace
} // namespace ML::Test
