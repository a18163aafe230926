#include "ML/CutlistRenderer.h"

#include "PipelineTestSupport.h"
#include "QRT/Hash.h"
#include "VF/SharedVideoFrameCache.h"

#include <gtest/gtest.h>

using namespace pltest;
using mvxmediatypes::TickTime;

namespace
{

class CutlistRendererTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        VF::SharedVideoFrameCache::Clear();
        mNode->mProducer = QRT::InterfaceRef<ML::IRenderableNodeProducer>(mProducer);
        mCutlist->mNode = QRT::InterfaceRef<MF::IRenderableNode>(mNode);
        mCutlist->mStart = TickTime::TicksToTime(1000);
        mCutlist->mEnd = TickTime::TicksToTime(2000);
        mParams.mWidth = 8;
        mParams.mHeight = 4;
        mParams.mFullFrameWidth = 16;
        mParams.mFullFrameHeight = 8;
        mParams.mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
        mParams.mPixelFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
        mParams.mQuality = 4;
    }

    QRT::InterfaceRef<MF::IRenderableCutlist> Cutlist()
    {
        return QRT::InterfaceRef<MF::IRenderableCutlist>(mCutlist);
    }

    QRT::InterfaceRef<TestProducer> mProducer = QRT::Allocated<TestProducer>::CreateInstance();
    QRT::InterfaceRef<TestNode> mNode = QRT::Allocated<TestNode>::CreateInstance();
    QRT::InterfaceRef<TestCutlist> mCutlist = QRT::Allocated<TestCutlist>::CreateInstance();
    ML::CutlistRenderParams mParams;
    const std::vector<mvxmediatypes::PixelFormat> mBGRA{mvxmediatypes::kPixelFormat_BGRA_4444_8u};
};

TEST_F(CutlistRendererTest, BlackFrameHashMixesPrefixSizeRatioAndFormat)
{
    QRT::HashValue hash;
    const std::string prefix = "BlackVideoFrame from RenderFrameFromCutlist";
    ASSERT_EQ(prefix.size(), 43u);
    QRT::MixHash::MixInData(hash, prefix.data(), prefix.size());
    const std::uint32_t width = 8;
    const std::uint32_t height = 4;
    const std::uint32_t ratio[2] = {1, 1};
    QRT::MixHash::MixInData(hash, &width, 4);
    QRT::MixHash::MixInData(hash, &height, 4);
    QRT::MixHash::MixInData(hash, ratio, 8);
    const std::uint64_t format = mvxmediatypes::kPixelFormat_BGRA_4444_8u.GetValue();
    QRT::MixHash::MixInData(hash, &format, 8);
    EXPECT_EQ(ML::CutlistRenderer::GetBlackFrameHash(mParams), QRT::HashValueToGuid(hash));
}

TEST_F(CutlistRendererTest, TimeOutsideSegmentsGivesOneCachedBlackFrame)
{
    mParams.SetFrameTime(MF::FrameTime(TickTime::TicksToTime(5000)));
    QRT::InterfaceRef<ML::IRenderableNodeProducer> producer;
    MF::FrameTime local;
    ASSERT_EQ(ML::CutlistRenderer::GetProducerForCutlist(Cutlist(), mParams, producer, local), 0);
    EXPECT_FALSE(producer);
    const auto first =
        ML::CutlistRenderer::RenderFrameFromCutlist(producer, mParams, local, mBGRA, true);
    const auto second = ML::CutlistRenderer::GetBlackFrame(mParams);
    ASSERT_TRUE(first);
    EXPECT_EQ(first, second);
    EXPECT_EQ(first->GetBounds(), QRT::ParamRect(0, 0, 8, 4));
    EXPECT_EQ(first->GetPixelFormat(), mvxmediatypes::kPixelFormat_BGRA_4444_8u);
    EXPECT_TRUE(first->IsShared());
    const auto* pixels = static_cast<const std::uint8_t*>(first->GetBaseAddress());
    EXPECT_EQ(pixels[0] | pixels[1] | pixels[2], 0);

    QRT::Guid hash;
    ASSERT_EQ(ML::CutlistRenderer::GetCutlistFrameHash(hash, Cutlist(), mParams), 0);
    EXPECT_EQ(hash, ML::CutlistRenderer::GetBlackFrameHash(mParams));
}

TEST_F(CutlistRendererTest, ProducerGetsNodeTimeAndFailedLookupIsReturned)
{
    mParams.SetFrameTime(MF::FrameTime(TickTime::TicksToTime(1500)));
    QRT::InterfaceRef<ML::IRenderableNodeProducer> producer;
    MF::FrameTime local;
    ASSERT_EQ(ML::CutlistRenderer::GetProducerForCutlist(Cutlist(), mParams, producer, local), 0);
    EXPECT_EQ(producer.Get(), static_cast<ML::IRenderableNodeProducer*>(mProducer.Get()));
    EXPECT_EQ(local, MF::FrameTime(TickTime::TicksToTime(500)));

    QRT::Guid hash;
    ASSERT_EQ(ML::CutlistRenderer::GetCutlistFrameHash(hash, Cutlist(), mParams), 0);
    EXPECT_EQ(hash, mProducer->mHash);

    mCutlist->mLookupStatus = static_cast<QRT::Result>(0xA0990003u);
    EXPECT_EQ(ML::CutlistRenderer::GetProducerForCutlist(Cutlist(), mParams, producer, local),
              static_cast<QRT::Result>(0xA0990003u));
    EXPECT_THROW(ML::CutlistRenderer::GetProducerForCutlist({}, mParams, producer, local),
                 QRT::NullInterfaceException);
}

TEST_F(CutlistRendererTest, CachedFrameInRequestedFormatIsReturnedWithoutCopyOrProducing)
{
    const auto producer = QRT::InterfaceRef<ML::IRenderableNodeProducer>(mProducer);
    const MF::FrameTime local(TickTime::TicksToTime(10));
    const auto produced =
        ML::CutlistRenderer::RenderFrameFromCutlist(producer, mParams, local, mBGRA, true);
    ASSERT_TRUE(produced);
    EXPECT_EQ(mProducer->mProduceCount.load(), 1);
    const auto again =
        ML::CutlistRenderer::RenderFrameFromCutlist(producer, mParams, local, mBGRA, false);
    EXPECT_EQ(again, produced);
    EXPECT_EQ(mProducer->mProduceCount.load(), 1);
}

TEST_F(CutlistRendererTest, InsertIntoCacheClearDoesNotInsert)
{
    const auto producer = QRT::InterfaceRef<ML::IRenderableNodeProducer>(mProducer);
    const MF::FrameTime local(TickTime::TicksToTime(10));
    const auto first =
        ML::CutlistRenderer::RenderFrameFromCutlist(producer, mParams, local, mBGRA, false);
    ASSERT_TRUE(first);
    EXPECT_FALSE(VF::SharedVideoFrameCache::RetrieveFromCache(mProducer->mHash));
    ML::CutlistRenderer::RenderFrameFromCutlist(producer, mParams, local, mBGRA, false);
    EXPECT_EQ(mProducer->mProduceCount.load(), 2);
}

TEST_F(CutlistRendererTest, FailedProduceGivesEmptyFrame)
{
    mProducer->mFailure = ProducerFailure::kStatus;
    const auto frame = ML::CutlistRenderer::RenderFrameFromCutlist(
        QRT::InterfaceRef<ML::IRenderableNodeProducer>(mProducer), mParams,
        MF::FrameTime(TickTime::TicksToTime(10)), mBGRA, true);
    EXPECT_FALSE(frame);
}

TEST_F(CutlistRendererTest, ConversionOnlyWhenNearestFormatDiffers)
{
    const auto vuya = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_VUYA_4444_8u, 8, 4,
                                           mvxmediatypes::kPixelAspectRatio_Square, true, false);
    vuya->SetFieldType(mvxmediatypes::kFieldType_UpperFirst);
    const std::vector<mvxmediatypes::PixelFormat> both{mvxmediatypes::kPixelFormat_BGRA_4444_8u,
                                                       mvxmediatypes::kPixelFormat_VUYA_4444_8u};
    // The frame's own format is acceptable: no conversion.
    EXPECT_EQ(ML::CutlistRenderer::ConformFrameToOutput(
                  vuya, mParams, mvxmediatypes::kPixelFormat_VUYA_4444_8u, both),
              vuya);
    const auto converted = ML::CutlistRenderer::ConformFrameToOutput(
        vuya, mParams, mvxmediatypes::kPixelFormat_BGRA_4444_8u, mBGRA);
    ASSERT_TRUE(converted);
    EXPECT_NE(converted, vuya);
    EXPECT_EQ(converted->GetPixelFormat(), mvxmediatypes::kPixelFormat_BGRA_4444_8u);
    EXPECT_EQ(converted->GetBounds(), QRT::ParamRect(0, 0, 8, 4));
    EXPECT_EQ(converted->GetFieldType(), mvxmediatypes::kFieldType_UpperFirst);
    EXPECT_FALSE(ML::CutlistRenderer::ConformFrameToOutput({}, mParams,
                                                           mvxmediatypes::kPixelFormat_Any, mBGRA));
}

TEST_F(CutlistRendererTest, DeepFormatIsConvertedThroughTheFrameLibrary)
{
    // 16-bit frames are not addressable by the image renderer; conforming
    // goes through the frame library's staged copy (16u stores v * 257).
    const auto deep = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_16u, 8, 4,
                                           mvxmediatypes::kPixelAspectRatio_Square, true, false);
    ASSERT_TRUE(deep);
    for (int y = 0; y < 4; ++y)
    {
        auto* row = reinterpret_cast<std::uint16_t*>(
            static_cast<std::uint8_t*>(deep->GetWritableBaseAddress()) + y * deep->GetRowBytes());
        for (int x = 0; x < 8; ++x)
        {
            row[4 * x + 0] = 10 * 257;  // blue
            row[4 * x + 1] = 128 * 257; // green
            row[4 * x + 2] = 250 * 257; // red
            row[4 * x + 3] = 255 * 257; // alpha
        }
    }
    const auto conformed = ML::CutlistRenderer::ConformFrameToOutput(
        deep, mParams, mvxmediatypes::kPixelFormat_BGRA_4444_8u, mBGRA);
    ASSERT_TRUE(conformed);
    EXPECT_NE(conformed, deep);
    ASSERT_EQ(conformed->GetPixelFormat(), mvxmediatypes::kPixelFormat_BGRA_4444_8u);
    const auto* pixels = static_cast<const std::uint8_t*>(conformed->GetBaseAddress()) +
                         3 * conformed->GetRowBytes() + 4 * 7;
    EXPECT_EQ(pixels[0], 10);
    EXPECT_EQ(pixels[1], 128);
    EXPECT_EQ(pixels[2], 250);
    EXPECT_EQ(pixels[3], 255);
}

TEST_F(CutlistRendererTest, FullFrameRenderingIsConformedToRequestedSize)
{
    const auto full = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_VUYA_4444_8u, 16, 8,
                                           mvxmediatypes::kPixelAspectRatio_Square, true, false);
    full->SetFullFrameRect(QRT::ParamRect(0, 0, 16, 8));
    EXPECT_TRUE(ML::CutlistRenderer::UseRequestedSize(full, mParams));
    const auto converted = ML::CutlistRenderer::ConformFrameToOutput(
        full, mParams, mvxmediatypes::kPixelFormat_BGRA_4444_8u, mBGRA);
    EXPECT_EQ(converted->GetBounds(), QRT::ParamRect(0, 0, 8, 4));

    const auto plain = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_VUYA_4444_8u, 16, 8,
                                            mvxmediatypes::kPixelAspectRatio_Square, true, false);
    EXPECT_FALSE(ML::CutlistRenderer::UseRequestedSize(plain, mParams));
}

TEST_F(CutlistRendererTest, InterlacedFrameServesProgressiveRequestOnlyForOneField)
{
    auto frame = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, 8, 4,
                                      mvxmediatypes::kPixelAspectRatio_Square, true, false);
    frame->SetFieldType(mvxmediatypes::kFieldType_UpperFirst);
    mParams.mFieldType = 0;
    mParams.mQuality = 3;
    EXPECT_FALSE(ML::CutlistRenderer::FrameAlreadyConformsToOutput(frame, mParams));
    mParams.mSingleField = 1;
    EXPECT_TRUE(ML::CutlistRenderer::FrameAlreadyConformsToOutput(frame, mParams));
    mParams.mQuality = 2;
    mParams.mSingleField = 0;
    EXPECT_TRUE(ML::CutlistRenderer::FrameAlreadyConformsToOutput(frame, mParams));
    frame->SetOriginOffset(1, 1);
    EXPECT_FALSE(ML::CutlistRenderer::FrameAlreadyConformsToOutput(frame, mParams));
}

TEST_F(CutlistRendererTest, FrameConformsByBoundsRatioOrFullFrame)
{
    auto frame = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, 16, 8,
                                      mvxmediatypes::kPixelAspectRatio_Square, true, false);
    EXPECT_FALSE(ML::CutlistRenderer::FrameAlreadyConformsToOutput(frame, mParams));
    frame->SetFullFrameRect(QRT::ParamRect(0, 0, 16, 8));
    EXPECT_TRUE(ML::CutlistRenderer::FrameAlreadyConformsToOutput(frame, mParams));
    mParams.mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_D1PAL;
    EXPECT_FALSE(ML::CutlistRenderer::FrameAlreadyConformsToOutput(frame, mParams));
}

TEST_F(CutlistRendererTest, CollectPrefetchesAsksNodeForLocalRange)
{
    auto prefetch = QRT::Allocated<TestPrefetch>::CreateInstance();
    mNode->mPrefetch = QRT::InterfaceRef<ML::IRenderableNodePrefetch>(prefetch);
    mParams.SetFrameTime(MF::FrameTime(TickTime::TicksToTime(1700), TickTime::TicksToTime(1600)));
    ML::RenderableNodePrefetchList list;
    ASSERT_EQ(ML::CutlistRenderer::CollectCutlistPrefetches(Cutlist(), mParams, list), 0);
    ASSERT_EQ(list.size(), 1u);
    ASSERT_EQ(mNode->mPrefetchRanges.size(), 1u);
    EXPECT_EQ(mNode->mPrefetchRanges[0],
              MF::TickTimeRange(TickTime::TicksToTime(600), TickTime::TicksToTime(700)));
    EXPECT_EQ(prefetch->mInitiateCount.load(), 0);
    EXPECT_EQ(ML::CutlistRenderer::CollectCutlistPrefetches({}, mParams, list), 0);
    EXPECT_EQ(list.size(), 1u);
}

} // namespace
