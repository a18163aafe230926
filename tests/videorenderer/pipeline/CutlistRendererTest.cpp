#include "ML/CutlistRenderer.h"

#include "TestCutlists.h"
#include "TestFrames.h"
#include "TestNode.h"
#include "TestPrefetch.h"
#include "TestProducer.h"
#include "VF/SharedVideoFrameCache.h"

#include <gtest/gtest.h>

using namespace vrtest;
using mvxmediatypes::TickTime;

namespace
{

constexpr auto kBGRA = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
constexpr auto kVUYA = mvxmediatypes::kPixelFormat_VUYA_4444_8u;

class CutlistRendererTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        VF::SharedVideoFrameCache::Clear();
        mParams.mFullFrameWidth = 16;
        mParams.mFullFrameHeight = 8;
        mParams.mQuality = 4;
    }

    FrameRef Render(bool inInsertIntoCache)
    {
        return ML::CutlistRenderer::RenderFrameFromCutlist(
            mProducer, mParams, MF::FrameTime(TickTime::TicksToTime(10)), mBGRA, inInsertIntoCache);
    }
    FrameRef Conform(const FrameRef& inFrame, mvxmediatypes::PixelFormat inPreferred,
                     const std::vector<mvxmediatypes::PixelFormat>& inAcceptable)
    {
        return ML::CutlistRenderer::ConformFrameToOutput(inFrame, mParams, inPreferred,
                                                         inAcceptable);
    }
    bool Conforms(const FrameRef& inFrame)
    {
        return ML::CutlistRenderer::FrameAlreadyConformsToOutput(inFrame, mParams);
    }

    QRT::InterfaceRef<TestProducer> mProducer = QRT::Allocated<TestProducer>::CreateInstance();
    QRT::InterfaceRef<TestNode> mNode = NewNode(mProducer);
    const CutlistRef mCutlistRef = OneSegment(mNode, 1000, 2000);
    ML::CutlistRenderParams mParams = MakeParams(8, 4);
    const std::vector<mvxmediatypes::PixelFormat> mBGRA{kBGRA};
};

TEST_F(CutlistRendererTest, SegmentGivesProducerNodeTimeAndHashAndOutsideOneCachedBlackFrame)
{
    QRT::InterfaceRef<ML::IRenderableNodeProducer> producer;
    MF::FrameTime local;
    QRT::Guid hash;
    mParams.SetFrameTime(MF::FrameTime(TickTime::TicksToTime(1500)));
    ASSERT_EQ(ML::CutlistRenderer::GetProducerForCutlist(mCutlistRef, mParams, producer, local), 0);
    EXPECT_EQ(producer.Get(), static_cast<ML::IRenderableNodeProducer*>(mProducer.Get()));
    EXPECT_EQ(local, MF::FrameTime(TickTime::TicksToTime(500)));
    ASSERT_EQ(ML::CutlistRenderer::GetCutlistFrameHash(hash, mCutlistRef, mParams), 0);
    EXPECT_EQ(hash, mProducer->mHash);

    mParams.SetFrameTime(MF::FrameTime(TickTime::TicksToTime(5000)));
    ASSERT_EQ(ML::CutlistRenderer::GetProducerForCutlist(mCutlistRef, mParams, producer, local), 0);
    EXPECT_FALSE(producer);
    const auto first =
        ML::CutlistRenderer::RenderFrameFromCutlist(producer, mParams, local, mBGRA, true);
    EXPECT_EQ(first, ML::CutlistRenderer::GetBlackFrame(mParams));
    ASSERT_TRUE(IsFilledWith(first, {0, 0, 0, 0}));
    EXPECT_EQ(first->GetBounds(), QRT::ParamRect(0, 0, 8, 4));
    ASSERT_EQ(ML::CutlistRenderer::GetCutlistFrameHash(hash, mCutlistRef, mParams), 0);
    EXPECT_EQ(hash, ML::CutlistRenderer::GetBlackFrameHash(mParams));
    // Y'CbCr black is video-range black with neutral chroma (V, U, Y, A).
    mParams.mPixelFormat = mvxmediatypes::kPixelFormat_VUYA_4444_8u;
    EXPECT_TRUE(IsFilledWith(ML::CutlistRenderer::GetBlackFrame(mParams), {128, 128, 16, 0}));

    const CutlistRef failing = QRT::Allocated<FailingCutlist>::CreateInstance();
    EXPECT_EQ(ML::CutlistRenderer::GetProducerForCutlist(failing, mParams, producer, local),
              kLookupFailure);
    EXPECT_THROW(ML::CutlistRenderer::GetProducerForCutlist({}, mParams, producer, local),
                 QRT::NullInterfaceException);
}

TEST_F(CutlistRendererTest, CacheServesInsertedFrameWithoutProducingAndOnlyWhenAskedToInsert)
{
    const auto uncached = Render(false);
    ASSERT_TRUE(uncached);
    const auto produced = Render(true);
    EXPECT_NE(produced, uncached);
    EXPECT_EQ(Render(false), produced);
    EXPECT_EQ(mProducer->mProduceCount.load(), 2);
    // A failed render (of another hash) gives no frame.
    mProducer->mHash = QRT::Guid("{11111111-2222-3333-4444-666666666666}");
    mProducer->mFailure = ProducerFailure::kStatus;
    EXPECT_FALSE(Render(true));
}

TEST_F(CutlistRendererTest, NilFrameHashIsNeitherLookedUpNorCached)
{
    // The cache's own contracts refuse a nil key; its counters show that no
    // lookup or insertion was even tried.
    mProducer->mHash = QRT::Guid();
    const VF::FrameCacheStatistics before = VF::SharedVideoFrameCache::GetStatistics();
    FrameRef frames[2];
    for (FrameRef& frame : frames)
        ASSERT_NO_THROW(frame = Render(true));
    EXPECT_NE(frames[0], frames[1]);
    const VF::FrameCacheStatistics after = VF::SharedVideoFrameCache::GetStatistics();
    EXPECT_EQ(after.mHits + after.mMisses, before.mHits + before.mMisses);
    EXPECT_EQ(after.mInsertions + after.mRefused, before.mInsertions + before.mRefused);
}

TEST_F(CutlistRendererTest, ConversionOnlyWhenNearestFormatDiffers)
{
    const auto vuya = MakeFrame(8, 4, kVUYA);
    vuya->SetFieldType(mvxmediatypes::kFieldType_UpperFirst);
    // The frame's own format is acceptable: no conversion.
    EXPECT_EQ(Conform(vuya, kVUYA, {kBGRA, kVUYA}), vuya);
    const auto converted = Conform(vuya, kBGRA, mBGRA);
    ASSERT_TRUE(converted);
    EXPECT_EQ(converted->GetPixelFormat(), kBGRA);
    EXPECT_EQ(converted->GetFieldType(), mvxmediatypes::kFieldType_UpperFirst);
    EXPECT_FALSE(Conform({}, mvxmediatypes::kPixelFormat_Any, mBGRA));
}

TEST_F(CutlistRendererTest, DeepFormatIsConvertedThroughTheFrameLibrary)
{
    // 16-bit frames are not addressable by the image renderer; conforming
    // goes through the frame library's staged copy (16u stores v * 257).
    const auto deep = MakeFrame(8, 4, mvxmediatypes::kPixelFormat_BGRA_4444_16u);
    ASSERT_TRUE(deep);
    for (int y = 0; y < 4; ++y)
    {
        auto* row = reinterpret_cast<std::uint16_t*>(
            static_cast<std::uint8_t*>(deep->GetWritableBaseAddress()) + y * deep->GetRowBytes());
        for (int i = 0; i < 32; ++i)
            row[i] = static_cast<std::uint16_t>(Bgra{10, 128, 250, 255}[i % 4] * 257);
    }
    EXPECT_TRUE(IsFilledWith(Conform(deep, kBGRA, mBGRA), {10, 128, 250, 255}));
}

TEST_F(CutlistRendererTest, FullFrameRenderingIsConformedToRequestedSize)
{
    const auto full = MakeFrame(16, 8, kVUYA);
    full->SetFullFrameRect(QRT::ParamRect(0, 0, 16, 8));
    EXPECT_TRUE(ML::CutlistRenderer::UseRequestedSize(full, mParams));
    EXPECT_EQ(Conform(full, kBGRA, mBGRA)->GetBounds(), QRT::ParamRect(0, 0, 8, 4));
    EXPECT_FALSE(ML::CutlistRenderer::UseRequestedSize(MakeFrame(16, 8, kVUYA), mParams));
    // A full frame already at the requested size keeps its own.
    const auto exact = MakeFrame(8, 4, kVUYA);
    exact->SetFullFrameRect(QRT::ParamRect(0, 0, 8, 4));
    EXPECT_FALSE(ML::CutlistRenderer::UseRequestedSize(exact, mParams));
}

TEST_F(CutlistRendererTest, FrameConformsByBoundsRatioFullFrameAndFieldUse)
{
    // An interlaced frame serves a progressive request only for one field
    // or below quality 3.
    auto frame = MakeFrame(8, 4);
    frame->SetFieldType(mvxmediatypes::kFieldType_UpperFirst);
    mParams.mQuality = 3;
    EXPECT_FALSE(Conforms(frame));
    mParams.mSingleField = 1;
    EXPECT_TRUE(Conforms(frame));
    mParams.mQuality = 2;
    mParams.mSingleField = 0;
    EXPECT_TRUE(Conforms(frame));
    frame->SetOriginOffset(1, 1);
    EXPECT_FALSE(Conforms(frame));

    auto large = MakeFrame(16, 8);
    EXPECT_FALSE(Conforms(large));
    large->SetFullFrameRect(QRT::ParamRect(0, 0, 16, 8));
    EXPECT_TRUE(Conforms(large));
    mParams.mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_D1PAL;
    EXPECT_FALSE(Conforms(large));
}

TEST_F(CutlistRendererTest, CollectPrefetchesAsksNodeForLocalRange)
{
    mNode->mPrefetch = QRT::Allocated<TestPrefetch>::CreateInstance();
    mParams.SetFrameTime(MF::FrameTime(TickTime::TicksToTime(1700), TickTime::TicksToTime(1600)));
    ML::RenderableNodePrefetchList list;
    ASSERT_EQ(ML::CutlistRenderer::CollectCutlistPrefetches(mCutlistRef, mParams, list), 0);
    EXPECT_EQ(list.size(), 1u);
    EXPECT_EQ(mNode->PrefetchRanges(), std::vector{MF::TickTimeRange(TickTime::TicksToTime(600),
                                                                     TickTime::TicksToTime(700))});
    EXPECT_EQ(ML::CutlistRenderer::CollectCutlistPrefetches({}, mParams, list), 0);
    // Outside the segments there is no node to ask.
    mParams.SetFrameTime(MF::FrameTime(TickTime::TicksToTime(5000)));
    EXPECT_EQ(ML::CutlistRenderer::CollectCutlistPrefetches(mCutlistRef, mParams, list), 0);
    EXPECT_EQ(list.size(), 1u);
}

} // namespace
