// RenderableGetVideoSource (CreateRenderableGetVideoSource): rates, frame-time
// conforming anchored at the frame-grid origin, the frame it makes and the
// draw-into-frame arguments, alpha handling and failures.

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

    SourceRef Make(const BE::VideoSourceRef& inSource, const Declaration& inDeclaration) const
    {
        return CreateRenderableGetVideoSource(inSource, mBinaryData, inDeclaration.mOrigin,
                                              inDeclaration.mSecondTime, inDeclaration.mMatte,
                                              inDeclaration.mAlphaKind, inDeclaration.mIgnoreAlpha,
                                              inDeclaration.mInvertAlpha, inDeclaration.mThirdFlag,
                                              inDeclaration.mValue, inDeclaration.mFrameRate);
    }
    SourceRef Make(const ScriptedSourceRef& inScripted, const Declaration& inDeclaration) const
    {
        return Make(BE::VideoSourceRef(inScripted), inDeclaration);
    }
    // The two field times of the conformed request, in ticks.
    static std::pair<std::int64_t, std::int64_t> Conformed(const SourceRef& inSource,
                                                           TickTime inFirst, TickTime inSecond)
    {
        const MF::FrameTime conformed = Conform(*inSource, MF::FrameTime(inFirst, inSecond));
        return {conformed.GetFirstFieldTime().GetTicks(),
                conformed.GetSecondFieldTime().GetTicks()};
    }
    // The status of the RenderRequestException that rendering throws (0 when none).
    QRT::Result RenderStatus(const SourceRef& inSource, FrameRef& outFrame) const
    {
        try
        {
            inSource->RenderFrame(MF::FrameTime(), m4x2, outFrame);
        }
        catch (const RenderRequestException& exception)
        {
            return exception.GetStatus();
        }
        return QRT::kResult_Success;
    }

    const std::uint8_t mBytes[2] = {0xAB, 0xCD};
    const MF::BinaryData mBinaryData{mBytes, sizeof(mBytes)};
    const CutlistRenderParams m4x2 = MakeParams(4, 2, 5);
};

TEST_F(RenderableGetVideoSourceTest, RatesFollowKindStillAndSourceFieldType)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    const SourceRef source = Make(scripted, {});
    const struct
    {
        mvxmediatypes::FieldType mFieldType;
        bool mStill;
        std::int32_t mKind;
        FrameRate mRate;
        FrameRate mFieldRate;
    } cases[] = {
        {mvxmediatypes::kFieldType_Progressive, false, BE::Deprecated::kMediaInfoKind_Clip,
         mvxmediatypes::kFrameRate_Video25, mvxmediatypes::kFrameRate_Video25},
        {mvxmediatypes::kFieldType_UpperFirst, false, BE::Deprecated::kMediaInfoKind_Clip,
         mvxmediatypes::kFrameRate_Video25, mvxmediatypes::kFrameRate_Video50},
        {mvxmediatypes::kFieldType_LowerFirst, false, BE::Deprecated::kMediaInfoKind_Clip,
         mvxmediatypes::kFrameRate_Video25, mvxmediatypes::kFrameRate_Video50},
        {mvxmediatypes::kFieldType_AsSource, false, BE::Deprecated::kMediaInfoKind_Clip,
         mvxmediatypes::kFrameRate_Video25, mvxmediatypes::kFrameRate_Video50},
        {mvxmediatypes::kFieldType_Unknown, false, BE::Deprecated::kMediaInfoKind_Clip,
         mvxmediatypes::kFrameRate_Video25, mvxmediatypes::kFrameRate_Video25},
        {mvxmediatypes::kFieldType_UpperFirst, true, BE::Deprecated::kMediaInfoKind_Clip,
         mvxmediatypes::kFrameRate_Video1000, mvxmediatypes::kFrameRate_Video1000},
        {mvxmediatypes::kFieldType_UpperFirst, false, BE::Deprecated::kMediaInfoKind_TimeInvariant,
         mvxmediatypes::kFrameRate_Zero, mvxmediatypes::kFrameRate_Zero},
    };
    for (const auto& c : cases)
    {
        scripted->mFieldType = c.mFieldType;
        scripted->mStill = c.mStill;
        scripted->mKind = c.mKind;
        EXPECT_EQ(RateOf(*source), c.mRate) << c.mFieldType << " still " << c.mStill;
        EXPECT_EQ(FieldRateOf(*source), c.mFieldRate) << c.mFieldType << " still " << c.mStill;
    }
}

TEST_F(RenderableGetVideoSourceTest, FrameGridIsAnchoredAtTheOriginAndKeepsTheRequestedOrder)
{
    Declaration declaration;
    declaration.mOrigin = Ticks(1000);
    const SourceRef anchored = Make(MakeScriptedSource(), declaration);
    const auto progressive = [&](std::int64_t inTicks)
    { return Conformed(anchored, Ticks(inTicks), Ticks(inTicks)).first; };
    EXPECT_EQ(progressive(kFrame25 + 999), 1000);
    EXPECT_EQ(progressive(kFrame25 + 1000), kFrame25 + 1000);
    // Before the origin the grid continues downward.
    EXPECT_EQ(progressive(999), 1000 - kFrame25);

    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mFieldType = mvxmediatypes::kFieldType_UpperFirst;
    const SourceRef source = Make(scripted, {});
    const std::int64_t frame = kFrame25 * 6;
    const TickTime early = Ticks(frame + 77);
    const TickTime late = Ticks(frame + 77 + kField25);
    using Pair = std::pair<std::int64_t, std::int64_t>;
    EXPECT_EQ(Conformed(source, early, late), Pair(frame, frame + kField25));
    EXPECT_EQ(Conformed(source, late, early), Pair(frame + kField25, frame));
    // A progressive request stays progressive, on the frame grid.
    EXPECT_EQ(Conformed(source, late, late), Pair(frame, frame));
    // Over a progressive source the second field lies a whole frame later.
    scripted->mFieldType = mvxmediatypes::kFieldType_Progressive;
    EXPECT_EQ(Conformed(source, early, late), Pair(frame, frame + kFrame25));

    // Stills are not aligned; time-invariant media and clips without a rate conform to 0.
    scripted->mFieldType = mvxmediatypes::kFieldType_UpperFirst;
    scripted->mStill = true;
    EXPECT_EQ(Conformed(source, early, late), Pair(frame + 77, frame + 77));
    scripted->mStill = false;
    scripted->mKind = BE::Deprecated::kMediaInfoKind_TimeInvariant;
    EXPECT_EQ(Conformed(source, early, late), Pair(0, 0));
    scripted->mKind = BE::Deprecated::kMediaInfoKind_Clip;
    Declaration noRate;
    noRate.mFrameRate = mvxmediatypes::kFrameRate_Zero;
    EXPECT_EQ(Conformed(Make(scripted, noRate), early, late), Pair(0, 0));
}

TEST_F(RenderableGetVideoSourceTest, DrawsIntoNearestFormatWithTheClipsArguments)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mPixelFormats = {mvxmediatypes::kPixelFormat_BGRA_4444_8u,
                               mvxmediatypes::kPixelFormat_VUYA_4444_8u};
    Declaration declaration;
    declaration.mOrigin = Ticks(300);
    declaration.mInvertAlpha = true;
    const SourceRef source = Make(scripted, declaration);
    CutlistRenderParams params = MakeParams(6, 4, 2, mvxmediatypes::kPixelFormat_VUYA_4444_32f);
    params.mPixelAspectRatio = PixelAspectRatio(4, 3);
    const TickTime early = Ticks(kFrame25 * 2 + 11);
    const TickTime late = Ticks(kFrame25 * 2 + 11 + kField25);

    const FrameRef frame = Render(*source, MF::FrameTime(late, early), params);
    ASSERT_TRUE(frame);
    EXPECT_EQ(frame->GetFieldType(), mvxmediatypes::kFieldType_LowerFirst);
    const std::vector<DrawCall> calls = scripted->DrawCalls();
    ASSERT_EQ(calls.size(), 1u);
    const DrawCall& call = calls[0];
    // The YUV model is nearer than depth: the 8-bit VUYA the source offers.
    EXPECT_EQ(call.mDestinationFormat, mvxmediatypes::kPixelFormat_VUYA_4444_8u);
    EXPECT_EQ(call.mDestinationBounds, QRT::ParamRect(0, 0, 6, 4));
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

    Render(*source, MF::FrameTime(early), params);
    EXPECT_TRUE(scripted->DrawCalls().at(1).mProgressive);
    EXPECT_EQ(scripted->DrawCalls().at(1).mFieldType, mvxmediatypes::kFieldType_Progressive);
}

TEST_F(RenderableGetVideoSourceTest, ConvertsTimeByFrameNumberOnlyBetweenVideoRates)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    const MF::FrameTime time(Ticks(kFrame25 * 9 + 3));
    Declaration noRate;
    noRate.mFrameRate = mvxmediatypes::kFrameRate_Zero;
    // Still rates are not numbered against video rates, nor is a clip without a rate.
    const struct
    {
        FrameRate mSourceRate;
        Declaration mDeclaration;
        std::int64_t mTicks;
    } cases[] = {{mvxmediatypes::kFrameRate_Video50, {}, 9 * kField25},
                 {mvxmediatypes::kFrameRate_Video1000, {}, kFrame25 * 9 + 3},
                 {mvxmediatypes::kFrameRate_Video50, noRate, kFrame25 * 9 + 3}};
    for (const auto& c : cases)
    {
        scripted->mFrameRate = c.mSourceRate;
        Render(*Make(scripted, c.mDeclaration), time, MakeParams(2, 2));
        EXPECT_EQ(scripted->DrawCalls().back().mTime.GetTicks(), c.mTicks);
    }
}

TEST_F(RenderableGetVideoSourceTest, DrawnAlphaIsMadeStraightOrOpaqueAndARealPatternDraws)
{
    BE::VideoSourceRef pattern;
    ASSERT_TRUE(BE::OpenVideoSource("pattern:solid?size=8x4&color=336699", pattern).Succeeded());
    const FrameRef drawn = Render(*Make(pattern, {}), MF::FrameTime(Ticks(kFrame25)), m4x2);
    ASSERT_TRUE(drawn);
    EXPECT_EQ(drawn->GetPixelFormat(), mvxmediatypes::kPixelFormat_BGRA_4444_8u);
    EXPECT_TRUE(AllPixelsAre(drawn, Pixel{0x99, 0x66, 0x33, 255}));

    // Red at alpha 128 premultiplied over blue.
    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mDrawPixel = Pixel{0x7F, 0, 0x80, 0x80};
    Declaration declaration;
    declaration.mAlphaKind = mvxmediatypes::kAlphaChannel_Premultiplied;
    declaration.mMatte = QRT::ParamColor::FromRGBA(0, 0, 0xFF);
    FrameRef frame = Render(*Make(scripted, declaration), MF::FrameTime(), m4x2);
    EXPECT_TRUE(AllPixelsAre(frame, Pixel{0, 0, 255, 128}));
    EXPECT_EQ(frame->GetAlphaChannel(), mvxmediatypes::kAlphaChannel_Straight);
    // Ignore and invert together: opaque alpha, colour as drawn.
    declaration.mIgnoreAlpha = declaration.mInvertAlpha = true;
    frame = Render(*Make(scripted, declaration), MF::FrameTime(), m4x2);
    EXPECT_TRUE(AllPixelsAre(frame, Pixel{0x7F, 0, 0x80, 255}));
}

TEST_F(RenderableGetVideoSourceTest, CollectsNoPrefetches)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mPrefetchWanted = true;
    RenderableNodePrefetchList prefetches;
    Make(scripted, {})->CollectPrefetches(MF::FrameTime(), m4x2, prefetches);
    EXPECT_TRUE(prefetches.empty());
    EXPECT_TRUE(scripted->PrefetchCalls().empty());
}

TEST_F(RenderableGetVideoSourceTest, DrawAndFrameCreationFailuresAreThrownWithTheirStatus)
{
    const ScriptedSourceRef failing = MakeScriptedSource();
    failing->mDrawStatus = BE::kResult_MediaMalformed;
    FrameRef frame = MakeFilledFrame(2, 2, Pixel{});
    EXPECT_EQ(RenderStatus(Make(failing, {}), frame), BE::kResult_MediaMalformed);
    EXPECT_FALSE(frame);

    // No format to choose from: the frame cannot be made.
    const ScriptedSourceRef formatless = MakeScriptedSource();
    formatless->mPixelFormats.clear();
    FrameRef unused;
    const QRT::Result expected =
        VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_Invalid, 4, 2,
                             mvxmediatypes::kPixelAspectRatio_Square, false, false, unused);
    ASSERT_TRUE(QRT::Failed(expected));
    frame = MakeFilledFrame(2, 2, Pixel{});
    EXPECT_EQ(RenderStatus(Make(formatless, {}), frame), expected);
    EXPECT_FALSE(frame);
    EXPECT_TRUE(formatless->DrawCalls().empty());
}

TEST_F(RenderableGetVideoSourceTest, EmptySourceThrowsNullInterface)
{
    const SourceRef source = Make(BE::VideoSourceRef(), {});
    ASSERT_TRUE(source);
    EXPECT_THROW(Render(*source, MF::FrameTime(), m4x2), QRT::NullInterfaceException);
    EXPECT_THROW(RateOf(*source), QRT::NullInterfaceException);
}

} // namespace
} // namespace ML::Test
