#include "ML/RenderableCutlistSource.h"

#include "BE/CutlistProvider.h"
#include "CutlistSourceTestSupport.h"
#include "ML/IMutableCutlist.h"
#include "ML/RenderRequestException.h"
#include "ML/RenderStatus.h"
#include "VF/SharedVideoFrameCache.h"

#include <gtest/gtest.h>

namespace
{

using namespace cstest;
using mvxmediatypes::FieldType;
using mvxmediatypes::TickTime;

constexpr std::int64_t kFrameTicks = 28'224'000; // 25 fps
constexpr std::int64_t kFieldTicks = kFrameTicks / 2;

TickTime Ticks(std::int64_t inTicks)
{
    return TickTime::TicksToTime(inTicks);
}

// One segment over [0, 100 frames) onto inNode.
CutlistRef CutlistOver(const QRT::InterfaceRef<RecordingNode>& inNode, const char* inName)
{
    auto cutlist = ML::CreateMutableCutlist(QRT::ImmutableString::CreateStatic(inName));
    cutlist->AddSegment(mvxmediatypes::kTime_Zero, Ticks(100 * kFrameTicks),
                        mvxmediatypes::kTime_Zero, QRT::InterfaceRef<MF::IRenderableNode>(inNode));
    cutlist->MakeImmutable();
    return CutlistRef(cutlist);
}

class RenderableCutlistSourceTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        VF::SharedVideoFrameCache::Clear();
        mParams.mWidth = 8;
        mParams.mHeight = 4;
        mParams.mFullFrameWidth = 16;
        mParams.mFullFrameHeight = 8;
        mParams.mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
        mParams.mFullFramePixelAspectRatio = mvxmediatypes::kPixelAspectRatio_D1PAL;
        mParams.mPixelFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
        mParams.mHorizontalScale = 0.5;
        mParams.mVerticalScale = 0.5;
        mParams.mQuality = 2;
    }

    void TearDown() override { VF::SharedVideoFrameCache::Clear(); }

    // A source over the main and alternate nodes' cutlists whose provider
    // reports inFieldType.
    QRT::InterfaceRef<ML::IRenderableSource>
    Source(FieldType inFieldType,
           mvxmediatypes::FrameRate inRate = mvxmediatypes::kFrameRate_Video25)
    {
        BE::CutlistProviderSettings settings;
        settings.mRight = 16;
        settings.mBottom = 8;
        settings.mFieldType = inFieldType;
        settings.mFrameRate = inRate;
        mProvider = BE::CreateCutlistProvider(settings);
        mProvider->SetCutlists(mName, {CutlistOver(mMain, "main"), CutlistOver(mAlternate, "alt"),
                                       CutlistOver(mThird, "third")});
        return ML::CreateRenderableCutlistSource(
            QRT::InterfaceRef<MF::IRenderableCutlistProvider>(mProvider), inRate, mName);
    }

    MF::FrameTime Conform(const QRT::InterfaceRef<ML::IRenderableSource>& inSource,
                          const MF::FrameTime& inRequested)
    {
        MF::FrameTime conformed(Ticks(-1));
        inSource->ConformFrameTime(inRequested, mParams, conformed);
        return conformed;
    }

    const QRT::ImmutableString mName = QRT::ImmutableString::CreateStatic("Sequence");
    QRT::InterfaceRef<RecordingNode> mMain = QRT::Allocated<RecordingNode>::CreateInstance(
        "main", QRT::Guid("{0a000000-0000-0000-0000-000000000001}"));
    QRT::InterfaceRef<RecordingNode> mAlternate = QRT::Allocated<RecordingNode>::CreateInstance(
        "alternate", QRT::Guid("{0a000000-0000-0000-0000-000000000002}"));
    QRT::InterfaceRef<RecordingNode> mThird = QRT::Allocated<RecordingNode>::CreateInstance(
        "third", QRT::Guid("{0a000000-0000-0000-0000-000000000003}"));
    QRT::InterfaceRef<BE::ICutlistProvider> mProvider;
    ML::CutlistRenderParams mParams;
};

TEST_F(RenderableCutlistSourceTest, CreationFetchesMainAndAlternateWithTheNameAndTrue)
{
    auto provider = QRT::Allocated<BareProvider>::CreateInstance();
    const auto source = ML::CreateRenderableCutlistSource(
        QRT::InterfaceRef<MF::IRenderableCutlistProvider>(provider),
        mvxmediatypes::kFrameRate_Video25, QRT::ImmutableString::CreateStatic("Timeline A"));
    ASSERT_TRUE(source);
    ASSERT_EQ(provider->mCalls.size(), 2u);
    EXPECT_EQ(provider->mCalls[0].mWhich, 0);
    EXPECT_EQ(provider->mCalls[1].mWhich, 1);
    for (const GetterCall& call : provider->mCalls)
    {
        EXPECT_EQ(call.mName, "Timeline A");
        EXPECT_TRUE(call.mFlag);
    }
    // Without a description the sequence counts as progressive.
    mvxmediatypes::FrameRate fieldRate;
    source->GetFieldRate(fieldRate);
    EXPECT_EQ(fieldRate, mvxmediatypes::kFrameRate_Video25);
}

TEST_F(RenderableCutlistSourceTest, EmptyProviderThrowsTheNullInterfaceException)
{
    EXPECT_THROW(ML::CreateRenderableCutlistSource({}, mvxmediatypes::kFrameRate_Video25, mName),
                 QRT::NullInterfaceException);
}

TEST_F(RenderableCutlistSourceTest, FrameAndFieldRatesFollowTheFieldType)
{
    mvxmediatypes::FrameRate rate;
    for (FieldType type :
         {mvxmediatypes::kFieldType_UpperFirst, mvxmediatypes::kFieldType_LowerFirst})
    {
        const auto source = Source(type);
        source->GetFrameRate(rate);
        EXPECT_EQ(rate.GetTicksPerFrame(), kFrameTicks);
        source->GetFieldRate(rate);
        EXPECT_EQ(rate.GetTicksPerFrame(), kFieldTicks) << type;
    }
    for (FieldType type :
         {mvxmediatypes::kFieldType_Progressive, mvxmediatypes::kFieldType_AsSource})
    {
        Source(type)->GetFieldRate(rate);
        EXPECT_EQ(rate.GetTicksPerFrame(), kFrameTicks) << type;
    }
}

TEST_F(RenderableCutlistSourceTest, ConformFrameTimeAlignsTheEarlierFieldAndAddsTheFieldOrder)
{
    const MF::FrameTime midFrame(Ticks(3 * kFrameTicks + 100));
    EXPECT_EQ(Conform(Source(mvxmediatypes::kFieldType_Progressive), midFrame),
              MF::FrameTime(Ticks(3 * kFrameTicks)));
    EXPECT_EQ(Conform(Source(mvxmediatypes::kFieldType_UpperFirst), midFrame),
              MF::FrameTime(Ticks(3 * kFrameTicks), Ticks(3 * kFrameTicks + kFieldTicks)));
    EXPECT_EQ(Conform(Source(mvxmediatypes::kFieldType_LowerFirst), midFrame),
              MF::FrameTime(Ticks(3 * kFrameTicks + kFieldTicks), Ticks(3 * kFrameTicks)));
    // The earlier field decides the frame, in either slot.
    const MF::FrameTime swapped(Ticks(5 * kFrameTicks + 10), Ticks(4 * kFrameTicks + 10));
    EXPECT_EQ(Conform(Source(mvxmediatypes::kFieldType_Progressive), swapped),
              MF::FrameTime(Ticks(4 * kFrameTicks)));
    // Negative times round down onto the grid.
    EXPECT_EQ(Conform(Source(mvxmediatypes::kFieldType_Progressive), MF::FrameTime(Ticks(-1))),
              MF::FrameTime(Ticks(-kFrameTicks)));
}

TEST_F(RenderableCutlistSourceTest, AsSourceFieldTypeTakesTheOrderOfAnInterlacedRequest)
{
    const auto source = Source(mvxmediatypes::kFieldType_AsSource);
    const TickTime t = Ticks(2 * kFrameTicks);
    EXPECT_EQ(
        Conform(source, MF::FrameTime(Ticks(2 * kFrameTicks + 7), Ticks(2 * kFrameTicks + 9))),
        MF::FrameTime(t, t + Ticks(kFieldTicks)));
    EXPECT_EQ(
        Conform(source, MF::FrameTime(Ticks(2 * kFrameTicks + 9), Ticks(2 * kFrameTicks + 7))),
        MF::FrameTime(t + Ticks(kFieldTicks), t));
    EXPECT_EQ(Conform(source, MF::FrameTime(Ticks(2 * kFrameTicks + 9))), MF::FrameTime(t));
}

TEST_F(RenderableCutlistSourceTest, ZeroFrameRateLeavesTheTimeUnaligned)
{
    const auto source =
        Source(mvxmediatypes::kFieldType_Progressive, mvxmediatypes::kFrameRate_Zero);
    EXPECT_EQ(Conform(source, MF::FrameTime(Ticks(12345))), MF::FrameTime(Ticks(12345)));
}

TEST_F(RenderableCutlistSourceTest, InterlacedLowQualityKeepsAnEvenHeightAndScale)
{
    const auto source = Source(mvxmediatypes::kFieldType_UpperFirst);
    const MF::FrameTime time(Ticks(kFrameTicks), Ticks(kFrameTicks + kFieldTicks));
    FrameRef frame;
    source->RenderFrame(time, mParams, frame);
    ASSERT_TRUE(frame);
    const ML::CutlistRenderParams seen = mMain->mProducer->LastParams();
    EXPECT_EQ(seen.mWidth, 8u);
    EXPECT_EQ(seen.mHeight, 4u);
    EXPECT_EQ(seen.mVerticalScale, 0.5);
    EXPECT_EQ(seen.mHorizontalScale, 0.5);
    EXPECT_EQ(seen.mPixelAspectRatio, mvxmediatypes::kPixelAspectRatio_Square);
    EXPECT_EQ(seen.mFieldType, 1u);
    EXPECT_EQ(seen.mFrameRate, mvxmediatypes::kFrameRate_Video25);
    EXPECT_EQ(seen.GetFrameTime(), time);
    EXPECT_EQ(mMain->mProducer->LastTime(), time);
    EXPECT_EQ(frame->GetBounds(), QRT::ParamRect(0, 0, 8, 4));
}

TEST_F(RenderableCutlistSourceTest, InterlacedLowQualityRaisesAnOddHeightAndRescales)
{
    const auto source = Source(mvxmediatypes::kFieldType_LowerFirst);
    mParams.mHeight = 5;
    FrameRef frame;
    source->RenderFrame(MF::FrameTime(Ticks(0)), mParams, frame);
    ASSERT_TRUE(frame);
    const ML::CutlistRenderParams seen = mMain->mProducer->LastParams();
    EXPECT_EQ(seen.mHeight, 6u);
    EXPECT_EQ(seen.mVerticalScale, 6.0 / 8.0);
    EXPECT_EQ(seen.mWidth, 8u);
    EXPECT_EQ(seen.mFieldType, 2u);

    // An unset quality (all bits) counts as below 3 when compared signed.
    mParams.mQuality = 0xFFFFFFFFu;
    source->RenderFrame(MF::FrameTime(Ticks(0)), mParams, frame);
    EXPECT_EQ(mMain->mProducer->LastParams().mHeight, 6u);

    // Without a full-frame height the scale stays as requested.
    mParams.mQuality = 1;
    mParams.mFullFrameHeight = 0;
    source->RenderFrame(MF::FrameTime(Ticks(0)), mParams, frame);
    EXPECT_EQ(mMain->mProducer->LastParams().mHeight, 6u);
    EXPECT_EQ(mMain->mProducer->LastParams().mVerticalScale, 0.5);
}

TEST_F(RenderableCutlistSourceTest, InterlacedHighQualityRendersTheFullFrame)
{
    const auto source = Source(mvxmediatypes::kFieldType_UpperFirst);
    mParams.mQuality = 3;
    FrameRef frame;
    source->RenderFrame(MF::FrameTime(Ticks(0)), mParams, frame);
    ASSERT_TRUE(frame);
    const ML::CutlistRenderParams seen = mMain->mProducer->LastParams();
    EXPECT_EQ(seen.mWidth, 16u);
    EXPECT_EQ(seen.mHeight, 8u);
    EXPECT_EQ(seen.mHorizontalScale, 1.0);
    EXPECT_EQ(seen.mVerticalScale, 1.0);
    EXPECT_EQ(seen.mPixelAspectRatio, mvxmediatypes::kPixelAspectRatio_D1PAL);
}

TEST_F(RenderableCutlistSourceTest, ProgressiveIsConformedOnlyFromQualityFive)
{
    const auto source = Source(mvxmediatypes::kFieldType_Progressive);
    mParams.mQuality = 4;
    mParams.mHeight = 5;
    FrameRef frame;
    source->RenderFrame(MF::FrameTime(Ticks(0)), mParams, frame);
    EXPECT_EQ(mMain->mProducer->LastParams().mWidth, 8u);
    EXPECT_EQ(mMain->mProducer->LastParams().mHeight, 5u);
    EXPECT_EQ(mMain->mProducer->LastParams().mFieldType, 0u);

    mParams.mQuality = 5;
    source->RenderFrame(MF::FrameTime(Ticks(0)), mParams, frame);
    EXPECT_EQ(mMain->mProducer->LastParams().mWidth, 16u);
    EXPECT_EQ(mMain->mProducer->LastParams().mHeight, 8u);
}

TEST_F(RenderableCutlistSourceTest, ChoiceBitPicksTheAlternateCutlistForRenderingAndPrefetching)
{
    const auto source = Source(mvxmediatypes::kFieldType_Progressive);
    const MF::FrameTime time(Ticks(2 * kFrameTicks));
    FrameRef frame;
    ML::RenderableNodePrefetchList prefetches;

    source->RenderFrame(time, mParams, frame);
    source->CollectPrefetches(time, mParams, prefetches);
    EXPECT_EQ(mMain->mProducer->mProduceCount.load(), 1);
    EXPECT_EQ(mAlternate->mProducer->mProduceCount.load(), 0);
    ASSERT_EQ(prefetches.size(), 1u);
    EXPECT_EQ(static_cast<MarkerPrefetch*>(prefetches[0].Get())->mOwner, "main");

    // Only bit 0 of the choice counts.
    mParams.mCutlistChoiceBit = 3;
    source->RenderFrame(time, mParams, frame);
    source->CollectPrefetches(time, mParams, prefetches);
    EXPECT_EQ(mAlternate->mProducer->mProduceCount.load(), 1);
    ASSERT_EQ(prefetches.size(), 2u);
    EXPECT_EQ(static_cast<MarkerPrefetch*>(prefetches[1].Get())->mOwner, "alternate");

    mParams.mCutlistChoiceBit = 2;
    source->RenderFrame(time, mParams, frame);
    EXPECT_EQ(mMain->mProducer->mProduceCount.load(), 2);
    EXPECT_EQ(mAlternate->mProducer->mProduceCount.load(), 1);
    // The third cutlist is never used.
    EXPECT_EQ(mThird->mProducer->mProduceCount.load(), 0);
    EXPECT_TRUE(mThird->PrefetchRanges().empty());
}

TEST_F(RenderableCutlistSourceTest, PrefetchesCoverBothFieldsOfTheRequestedFrame)
{
    const auto source = Source(mvxmediatypes::kFieldType_LowerFirst);
    const MF::FrameTime time(Ticks(kFrameTicks + kFieldTicks), Ticks(kFrameTicks));
    ML::RenderableNodePrefetchList prefetches;
    source->CollectPrefetches(time, mParams, prefetches);
    const auto ranges = mMain->PrefetchRanges();
    ASSERT_EQ(ranges.size(), 1u);
    EXPECT_EQ(ranges[0].first, Ticks(kFrameTicks));
    EXPECT_EQ(ranges[0].second, Ticks(kFrameTicks + kFieldTicks));
    ASSERT_EQ(prefetches.size(), 1u);
}

TEST_F(RenderableCutlistSourceTest, FailedLookupIsThrownWithItsStatus)
{
    auto provider = QRT::Allocated<BareProvider>::CreateInstance();
    provider->mCutlists[0] = CutlistRef(QRT::Allocated<FailingCutlist>::CreateInstance());
    const auto source = ML::CreateRenderableCutlistSource(
        QRT::InterfaceRef<MF::IRenderableCutlistProvider>(provider),
        mvxmediatypes::kFrameRate_Video25, mName);
    FrameRef frame = VF::CreateVideoFrame(mParams.mPixelFormat, 2, 2,
                                          mvxmediatypes::kPixelAspectRatio_Square, false, false);
    try
    {
        source->RenderFrame(MF::FrameTime(Ticks(0)), mParams, frame);
        ADD_FAILURE() << "no exception";
    }
    catch (const ML::RenderRequestException& error)
    {
        EXPECT_EQ(error.GetStatus(), static_cast<QRT::Result>(0xA0990042u));
    }
    EXPECT_FALSE(frame);
    // Collecting from a failing cutlist starts nothing.
    ML::RenderableNodePrefetchList prefetches;
    source->CollectPrefetches(MF::FrameTime(Ticks(0)), mParams, prefetches);
    EXPECT_TRUE(prefetches.empty());
}

TEST_F(RenderableCutlistSourceTest, FailedProducerIsThrownAsAFailedRender)
{
    const auto source = Source(mvxmediatypes::kFieldType_Progressive);
    mMain->mProducer->mFailureStatus = static_cast<QRT::Result>(0xA0990077u);
    FrameRef frame;
    try
    {
        source->RenderFrame(MF::FrameTime(Ticks(0)), mParams, frame);
        ADD_FAILURE() << "no exception";
    }
    catch (const ML::RenderRequestException& error)
    {
        EXPECT_EQ(error.GetStatus(), ML::kResult_RenderFailed);
    }
    EXPECT_FALSE(frame);
}

TEST_F(RenderableCutlistSourceTest, EmptyCutlistThrowsTheNullInterfaceExceptionAndCollectsNothing)
{
    auto provider = QRT::Allocated<BareProvider>::CreateInstance();
    const auto source = ML::CreateRenderableCutlistSource(
        QRT::InterfaceRef<MF::IRenderableCutlistProvider>(provider),
        mvxmediatypes::kFrameRate_Video25, mName);
    FrameRef frame;
    EXPECT_THROW(source->RenderFrame(MF::FrameTime(Ticks(0)), mParams, frame),
                 QRT::NullInterfaceException);
    ML::RenderableNodePrefetchList prefetches;
    source->CollectPrefetches(MF::FrameTime(Ticks(0)), mParams, prefetches);
    EXPECT_TRUE(prefetches.empty());
}

} // namespace
