// RenderableGetVideoSource (CreateRenderableGetVideoSource): rates, frame-time
// conforming anchored at the frame-grid origin, the frame it makes and the
// draw-into-frame arguments, alpha handling and failures.

#include "BE/MediaStatus.h"
#include "BE/VideoSources.h"
#include "ML/RenderableVideoSources.h"
#include "QRT/Exception.h"
#include "ScriptedSources.h"

namespace ML::Test
{
namespace
{

using Pair = std::pair<std::int64_t, std::int64_t>;

class RenderableGetVideoSourceTest : public ::testing::Test
{
protected:
    struct Declaration
    {
        TickTime mOrigin{};
        QRT::ParamColor mMatte{};
        mt::AlphaChannel mAlphaKind = mt::kAlphaChannel_Straight;
        bool mIgnoreAlpha = false, mInvertAlpha = false;
        FrameRate mFrameRate = k25;
    };

    // inSource: a back-end video source reference or a scripted source.
    template <typename Source>
    SourceRef Make(const Source& inSource, const Declaration& inDeclaration) const
    {
        return CreateRenderableGetVideoSource(
            BE::VideoSourceRef(inSource), mBinaryData, inDeclaration.mOrigin, Ticks(4242),
            inDeclaration.mMatte, inDeclaration.mAlphaKind, inDeclaration.mIgnoreAlpha,
            inDeclaration.mInvertAlpha, true, 0.625, inDeclaration.mFrameRate);
    }
    // The two field times of the conformed request, in ticks.
    static Pair Conformed(const SourceRef& inSource, TickTime inFirst, TickTime inSecond)
    {
        const MF::FrameTime conformed = Conform(*inSource, MF::FrameTime(inFirst, inSecond));
        return {conformed.GetFirstFieldTime().GetTicks(),
                conformed.GetSecondFieldTime().GetTicks()};
    }

    const std::uint8_t mBytes[2] = {0xAB, 0xCD};
    const MF::BinaryData mBinaryData{mBytes, sizeof(mBytes)};
    const CutlistRenderParams m4x2 = MakeParams(4, 2, 5);
};

TEST_F(RenderableGetVideoSourceTest, RatesFollowKindStillAndSourceFieldType)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    const SourceRef source = Make(scripted, {});
    const std::int32_t clip = BE::Deprecated::kMediaInfoKind_Clip;
    const std::tuple<mt::FieldType, bool, std::int32_t, FrameRate, FrameRate> cases[] = {
        {kProg, false, clip, k25, k25},
        {kLower, false, clip, k25, k50},
        {kUpper, true, clip, k1000, k1000},
        {kUpper, false, BE::Deprecated::kMediaInfoKind_TimeInvariant, kNoRate, kNoRate},
    };
    for (const auto& [fieldType, still, kind, rate, fieldRate] : cases)
    {
        std::tie(scripted->mFieldType, scripted->mStill, scripted->mKind) =
            std::tuple(fieldType, still, kind);
        EXPECT_EQ(std::pair(RateOf(*source), FieldRateOf(*source)), std::pair(rate, fieldRate))
            << fieldType << " still " << still;
    }
}

TEST_F(RenderableGetVideoSourceTest, FrameGridIsAnchoredAtTheOriginAndKeepsTheRequestedOrder)
{
    const SourceRef anchored = Make(MakeScriptedSource(), {.mOrigin = Ticks(1000)});
    const auto progressive = [&](std::int64_t inTicks)
    { return Conformed(anchored, Ticks(inTicks), Ticks(inTicks)).first; };
    EXPECT_EQ(progressive(kFrame25 + 999), 1000);
    EXPECT_EQ(progressive(kFrame25 + 1000), kFrame25 + 1000);
    // Before the origin the grid continues downward.
    EXPECT_EQ(progressive(999), 1000 - kFrame25);

    const ScriptedSourceRef scripted = MakeScriptedSource();
    scripted->mFieldType = kUpper;
    const SourceRef source = Make(scripted, {});
    const std::int64_t frame = kFrame25 * 6;
    const TickTime early = Ticks(frame + 77);
    const TickTime late = Ticks(frame + 77 + kField25);
    EXPECT_EQ(Conformed(source, early, late), Pair(frame, frame + kField25));
    EXPECT_EQ(Conformed(source, late, early), Pair(frame + kField25, frame));
    // A progressive request stays progressive, on the frame grid.
    EXPECT_EQ(Conformed(source, late, late), Pair(frame, frame));

    // Stills are not aligned; time-invariant media and clips without a rate conform to 0.
    scripted->mFieldType = kUpper;
    scripted->mStill = true;
    EXPECT_EQ(Conformed(source, early, late), Pair(frame + 77, frame + 77));
    scripted->mStill = false;
    scripted->mKind = BE::Deprecated::kMediaInfoKind_TimeInvariant;
    EXPECT_EQ(Conformed(source, early, late), Pair(0, 0));
    scripted->mKind = BE::Deprecated::kMediaInfoKind_Clip;
    EXPECT_EQ(Conformed(Make(scripted, {.mFrameRate = kNoRate}), early, late), Pair(0, 0));
}

TEST_F(RenderableGetVideoSourceTest, ConvertsTimeByFrameNumberOnlyBetweenVideoRates)
{
    const ScriptedSourceRef scripted = MakeScriptedSource();
    const MF::FrameTime time(Ticks(kFrame25 * 9 + 3));
    const Declaration noRate{.mOrigin = Ticks(300), .mInvertAlpha = true, .mFrameRate = kNoRate};
    // Still rates are not numbered against video rates, nor is a clip without a rate.
    const std::tuple<FrameRate, Declaration, std::int64_t> cases[] = {
        {k50, {}, 9 * kField25}, {k1000, {}, kFrame25 * 9 + 3}, {k50, noRate, kFrame25 * 9 + 3}};
    for (const auto& [rate, declaration, ticks] : cases)
    {
        scripted->mFrameRate = rate;
        Render(*Make(scripted, declaration), time, MakeParams(2, 2));
        EXPECT_EQ(scripted->DrawCalls().back().mTime.GetTicks(), ticks);
    }
    // The clip's arguments; quality 4 of the params is kRenderQuality_High.
    EXPECT_EQ(scripted->DrawCalls().back().mArguments,
              "data 2 origin 300 second 4242 quality 4 field 0 progressive 1 ignore 0 invert 1 "
              "third 1 value 0.625");
}

TEST_F(RenderableGetVideoSourceTest, FailuresAreThrownWithTheirStatusAndNoPrefetchIsCollected)
{
    const ScriptedSourceRef failing = MakeScriptedSource();
    failing->mDrawStatus = BE::kResult_MediaMalformed;
    FrameRef frame = MakeFilledFrame(2, 2, Pixel{});
    EXPECT_EQ(RenderStatus(*Make(failing, {}), m4x2, frame), BE::kResult_MediaMalformed);
    EXPECT_FALSE(frame);

    // No format to choose from: the frame cannot be made.
    const ScriptedSourceRef formatless = MakeScriptedSource();
    formatless->mPixelFormats.clear();
    frame = MakeFilledFrame(2, 2, Pixel{});
    EXPECT_TRUE(QRT::Failed(RenderStatus(*Make(formatless, {}), m4x2, frame)));
    EXPECT_FALSE(frame);
    EXPECT_TRUE(formatless->DrawCalls().empty());

    const SourceRef empty = Make(BE::VideoSourceRef(), {});
    EXPECT_THROW(Render(*empty, MF::FrameTime(), m4x2), QRT::NullInterfaceException);
    EXPECT_THROW(RateOf(*empty), QRT::NullInterfaceException);

    formatless->mPrefetchWanted = true;
    RenderableNodePrefetchList prefetches;
    Make(formatless, {})->CollectPrefetches(MF::FrameTime(), m4x2, prefetches);
    EXPECT_TRUE(prefetches.empty());
    EXPECT_TRUE(formatless->PrefetchCalls().empty());
}

} // namespace
} // namespace ML::Test
