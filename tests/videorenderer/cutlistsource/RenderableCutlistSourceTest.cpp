#include "ML/RenderableCutlistSource.h"

#include "BE/CutlistProvider.h"
#include "ML/RenderStatus.h"
#include "TestCutlists.h"
#include "TestFrames.h"
#include "TestNode.h"
#include "TestProducer.h"
#include "VF/SharedVideoFrameCache.h"

#include <tuple>

#include <gtest/gtest.h>

namespace
{

using namespace vrtest;
using mvxmediatypes::FieldType;
using mvxmediatypes::TickTime;

constexpr std::int64_t kFrameTicks = 28'224'000; // 25 fps
constexpr std::int64_t kFieldTicks = kFrameTicks / 2;

TickTime Ticks(std::int64_t inTicks)
{
    return TickTime::TicksToTime(inTicks);
}

// A node whose producer makes frames as the parameters ask.
QRT::InterfaceRef<TestNode> SizedNode(std::uint32_t inSeed)
{
    auto producer = QRT::Allocated<TestProducer>::CreateInstance();
    producer->mHash = QRT::Guid(0x0a000000u + inSeed, 0, 0, {0, 0, 0, 0, 0, 0, 0, 1});
    producer->mFormat = mvxmediatypes::kPixelFormat_Invalid;
    producer->mWidth = 0;
    return NewNode(producer);
}

TestProducer& ProducerOf(const QRT::InterfaceRef<TestNode>& inNode)
{
    return *static_cast<TestProducer*>(inNode->mProducer.Get());
}

constexpr auto kP = mvxmediatypes::kFieldType_Progressive;
constexpr auto kU = mvxmediatypes::kFieldType_UpperFirst;
constexpr auto kL = mvxmediatypes::kFieldType_LowerFirst;
constexpr auto kA = mvxmediatypes::kFieldType_AsSource;

// Expects inCall to throw the render request exception with inStatus.
template <typename Call>
void ExpectRenderException(Call&& inCall, QRT::Result inStatus)
{
    try
    {
        inCall();
        ADD_FAILURE() << "no exception";
    }
    catch (const ML::RenderRequestException& error)
    {
        EXPECT_EQ(error.GetStatus(), inStatus);
    }
}

class RenderableCutlistSourceTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        VF::SharedVideoFrameCache::Clear();
        mParams.mFullFrameWidth = 16;
        mParams.mFullFrameHeight = 8;
        mParams.mFullFramePixelAspectRatio = mvxmediatypes::kPixelAspectRatio_D1PAL;
        mParams.mHorizontalScale = 0.5;
        mParams.mVerticalScale = 0.5;
        mParams.mQuality = 2;
    }

    void TearDown() override { VF::SharedVideoFrameCache::Clear(); }

    // A source over cutlists of one segment over [0, 100 frames) onto each of
    // the three nodes, whose provider reports inFieldType.
    QRT::InterfaceRef<ML::IRenderableSource>
    Source(FieldType inFieldType,
           mvxmediatypes::FrameRate inRate = mvxmediatypes::kFrameRate_Video25)
    {
        BE::CutlistProviderSettings settings;
        settings.mRight = 16;
        settings.mBottom = 8;
        settings.mFieldType = inFieldType;
        settings.mFrameRate = inRate;
        auto provider = BE::CreateCutlistProvider(settings);
        CutlistRef cutlists[3];
        for (int i = 0; i < 3; ++i)
            cutlists[i] = OneSegment(mNodes[i], 0, 100 * kFrameTicks);
        provider->SetCutlists(mName, {cutlists[0], cutlists[1], cutlists[2]});
        return ML::CreateRenderableCutlistSource(provider, inRate, mName);
    }

    QRT::InterfaceRef<ML::IRenderableSource> BareSource()
    {
        return ML::CreateRenderableCutlistSource(mBare, mvxmediatypes::kFrameRate_Video25, mName);
    }

    const QRT::ImmutableString mName = QRT::ImmutableString::CreateStatic("Timeline A");
    // Main, alternate and third.
    const QRT::InterfaceRef<TestNode> mNodes[3] = {SizedNode(1), SizedNode(2), SizedNode(3)};
    QRT::InterfaceRef<BareCutlistProvider> mBare =
        QRT::Allocated<BareCutlistProvider>::CreateInstance();
    ML::CutlistRenderParams mParams = MakeParams(8, 4);
    FrameRef mFrame;
};

TEST_F(RenderableCutlistSourceTest, ConformedTimeAndFieldRateFollowTheFieldType)
{
    const auto t = [](std::int64_t inTicks) { return Ticks(2 * kFrameTicks + inTicks); };
    const MF::FrameTime frame(t(0));
    const MF::FrameTime upper(t(0), t(kFieldTicks));
    const MF::FrameTime lower(t(kFieldTicks), t(0));
    const auto k25 = mvxmediatypes::kFrameRate_Video25;
    const std::tuple<FieldType, MF::FrameTime, MF::FrameTime, mvxmediatypes::FrameRate> cases[] = {
        {kP, MF::FrameTime(t(100)), frame, k25},
        {kU, MF::FrameTime(t(100)), upper, k25},
        {kL, MF::FrameTime(t(100)), lower, k25},
        // "As source" takes the order of an interlaced request.
        {kA, MF::FrameTime(t(7), t(9)), upper, k25},
        {kA, MF::FrameTime(t(9), t(7)), lower, k25},
        {kA, MF::FrameTime(t(9)), frame, k25},
        // A zero rate leaves the time unaligned.
        {kP, MF::FrameTime(t(9)), MF::FrameTime(t(9)), mvxmediatypes::kFrameRate_Zero},
    };
    for (const auto& [type, requested, expected, rate] : cases)
    {
        SCOPED_TRACE(type);
        MF::FrameTime conformed(Ticks(-1));
        const auto source = Source(type, rate);
        source->ConformFrameTime(requested, mParams, conformed);
        EXPECT_EQ(conformed, expected);
        // The field rate is twice the frame rate only when interlaced.
        mvxmediatypes::FrameRate frameRate, fieldRate;
        source->GetFrameRate(frameRate);
        source->GetFieldRate(fieldRate);
        EXPECT_EQ(
            std::pair(frameRate, fieldRate),
            std::pair(rate, type == kU || type == kL ? mvxmediatypes::kFrameRate_Video50 : rate));
    }
}

TEST_F(RenderableCutlistSourceTest, RenderSizeFollowsFieldTypeAndQuality)
{
    // Interlaced below quality 3 keeps the requested size with an even
    // height (scale rescaled to match); from quality 3 it renders the full
    // frame (16 wide, scale 1). Progressive renders the full frame only from
    // quality 5.
    // Field type, quality, height, full-frame height, width, height and
    // vertical scale the producer sees.
    const std::tuple<FieldType, std::uint32_t, std::uint32_t, std::uint32_t, std::uint32_t,
                     std::uint32_t, double>
        cases[] = {
            {kU, 2, 4, 8, 8, 4, 0.5},
            {kL, 2, 5, 8, 8, 6, 6.0 / 8.0},
            // An unset quality (all bits) counts as below 3 when compared signed.
            {kL, 0xFFFFFFFFu, 5, 8, 8, 6, 6.0 / 8.0},
            // Without a full-frame height the scale stays as requested.
            {kL, 1, 5, 0, 8, 6, 0.5},
            {kU, 3, 4, 8, 16, 8, 1.0},
            {kP, 4, 5, 8, 8, 5, 0.5},
            {kP, 5, 5, 8, 16, 8, 1.0},
        };
    for (const auto& [type, quality, height, fullHeight, widthSeen, heightSeen, scale] : cases)
    {
        SCOPED_TRACE(testing::Message() << type << " q" << quality);
        std::tie(mParams.mQuality, mParams.mHeight, mParams.mFullFrameHeight) =
            std::tuple(quality, height, fullHeight);
        const MF::FrameTime time(Ticks(kFrameTicks), Ticks(kFrameTicks + kFieldTicks));
        Source(type)->RenderFrame(time, mParams, mFrame);
        ASSERT_TRUE(mFrame);
        const ML::CutlistRenderParams seen = ProducerOf(mNodes[0]).LastParams();
        const bool full = widthSeen == 16;
        EXPECT_EQ(std::tuple(seen.mWidth, seen.mHeight, seen.mVerticalScale, seen.mHorizontalScale),
                  std::tuple(widthSeen, heightSeen, scale, full ? 1.0 : 0.5));
        EXPECT_EQ(seen.mPixelAspectRatio, full ? mvxmediatypes::kPixelAspectRatio_D1PAL
                                               : mvxmediatypes::kPixelAspectRatio_Square);
        EXPECT_EQ(
            std::tuple(seen.mFieldType, seen.mFrameRate, seen.GetFrameTime()),
            std::tuple(static_cast<std::uint32_t>(type), mvxmediatypes::kFrameRate_Video25, time));
        EXPECT_EQ(mFrame->GetBounds().Height(), static_cast<std::int32_t>(heightSeen));
    }
}

TEST_F(RenderableCutlistSourceTest, FailedLookupOrProducerIsThrownAndCollectsNothing)
{
    mBare->mCutlists[0] = QRT::Allocated<FailingCutlist>::CreateInstance();
    const auto source = BareSource();
    mFrame = MakeFrame(2, 2);
    ExpectRenderException([&] { source->RenderFrame(MF::FrameTime(Ticks(0)), mParams, mFrame); },
                          kLookupFailure);
    EXPECT_FALSE(mFrame);
    ML::RenderableNodePrefetchList prefetches;
    source->CollectPrefetches(MF::FrameTime(Ticks(0)), mParams, prefetches);
    EXPECT_TRUE(prefetches.empty());

    ProducerOf(mNodes[0]).mFailure = ProducerFailure::kStatus;
    ExpectRenderException([&] { Source(kP)->RenderFrame(MF::FrameTime(), mParams, mFrame); },
                          ML::kResult_RenderFailed);
}

} // namespace
