#include "ML/RenderFrameRequest.h"

#include "BE/VideoSources.h"
#include "ContractExpect.h"
#include "ML/CutlistRenderer.h"
#include "PipelineTestSupport.h"
#include "QRT/Hash.h"
#include "VF/SharedVideoFrameCache.h"

#include <gtest/gtest.h>

using namespace pltest;
using mvxmediatypes::TickTime;

namespace
{

// The request key, mixed here run by run from the documented order.
QRT::Guid ExpectedKey(const QRT::Guid& inContent,
                      const std::vector<mvxmediatypes::PixelFormat>& inFormats,
                      bool inCompositeOnBlack, std::uint32_t inQuality,
                      std::uint32_t inSecondaryQuality)
{
    QRT::HashValue hash;
    const std::string prefix = "Hash Including Render Params";
    QRT::MixHash::MixInData(hash, prefix.data(), prefix.size());
    const auto bytes = QRT::GuidToBytes(inContent);
    QRT::MixHash::MixInData(hash, bytes.data(), 16);
    for (const auto& format : inFormats)
    {
        std::uint8_t value[8];
        const std::uint64_t raw = format.GetValue();
        for (int i = 0; i < 8; ++i)
            value[i] = static_cast<std::uint8_t>(raw >> (8 * i));
        QRT::MixHash::MixInData(hash, value, 8);
    }
    const std::uint8_t flag = inCompositeOnBlack ? 1 : 0;
    QRT::MixHash::MixInData(hash, &flag, 1);
    std::uint8_t quality[4];
    for (int i = 0; i < 4; ++i)
        quality[i] = static_cast<std::uint8_t>(inQuality >> (8 * i));
    QRT::MixHash::MixInData(hash, quality, 4);
    for (int i = 0; i < 4; ++i)
        quality[i] = static_cast<std::uint8_t>(inSecondaryQuality >> (8 * i));
    QRT::MixHash::MixInData(hash, quality, 4);
    return QRT::HashValueToGuid(hash);
}

class RenderFrameRequestTest : public ::testing::Test
{
protected:
    void SetUp() override { VF::SharedVideoFrameCache::Clear(); }

    QRT::InterfaceRef<TestProducer> mProducer = QRT::Allocated<TestProducer>::CreateInstance();
};

TEST_F(RenderFrameRequestTest, KeyMixesContentHashFormatsFlagAndQualitiesInOrder)
{
    auto settings = MakeSettings(7, mProducer);
    settings.mRequestedFormats = {mvxmediatypes::kPixelFormat_VUYA_4444_8u,
                                  mvxmediatypes::kPixelFormat_BGRA_4444_32f};
    settings.mCompositeOnBlack = true;
    settings.mQuality = 4;
    settings.mSecondaryQuality = 0xFFFFFFFFu;
    ML::RenderFrameRequest request(settings, false, true);
    EXPECT_EQ(request.mKey,
              ExpectedKey(mProducer->mHash, settings.mRequestedFormats, true, 4, 0xFFFFFFFFu));
    EXPECT_EQ(mProducer->mHashCount.load(), 1);
}

TEST_F(RenderFrameRequestTest, FormatOrderChangesKeyButCallerPriorityAndIdentifierDoNot)
{
    auto first = MakeSettings(1, mProducer);
    first.mRequestedFormats = {mvxmediatypes::kPixelFormat_BGRA_4444_8u,
                               mvxmediatypes::kPixelFormat_VUYA_4444_8u};
    auto swapped = first;
    swapped.mRequestedFormats = {mvxmediatypes::kPixelFormat_VUYA_4444_8u,
                                 mvxmediatypes::kPixelFormat_BGRA_4444_8u};
    auto other = first;
    other.mRequestID = 99;
    other.mPriority = 10;
    other.mCaller = &other;
    const ML::RenderFrameRequest a(first, false, true);
    const ML::RenderFrameRequest b(swapped, false, true);
    const ML::RenderFrameRequest c(other, false, true);
    EXPECT_NE(a.mKey, b.mKey);
    EXPECT_EQ(a.mKey, c.mKey);
    EXPECT_FALSE(a.mKey.IsNil());
}

TEST_F(RenderFrameRequestTest, DeferredKeyStaysNilUntilComputed)
{
    ML::RenderFrameRequest request = MakeRequest(MakeSettings(3, mProducer));
    EXPECT_TRUE(request.mKey.IsNil());
    EXPECT_EQ(mProducer->mHashCount.load(), 0);
    request.ComputeKey(true);
    EXPECT_FALSE(request.mKey.IsNil());
}

TEST_F(RenderFrameRequestTest, NilContentKeepsNilKeyAndRenderBreaksContracts)
{
    ML::RenderFrameRequest request = MakeRequest(MakeSettings(4, nullptr));
    request.ComputeKey(true);
    EXPECT_TRUE(request.mKey.IsNil());
    FrameRef frame;
    EXPECT_INPUT_CONTRACT(request.Render(frame, mvxmediatypes::kPixelFormat_Invalid),
                          "inPixelFormat != MF::kPixelFormat_Invalid");
    EXPECT_INPUT_CONTRACT(request.Render(frame, mvxmediatypes::kPixelFormat_BGRA_4444_8u),
                          "mKey != QRT::Guid()");
}

TEST_F(RenderFrameRequestTest, EmptyFormatListBreaksContract)
{
    auto settings = MakeSettings(5, mProducer);
    settings.mRequestedFormats.clear();
    EXPECT_INPUT_CONTRACT(ML::RenderFrameRequest(settings, true, false),
                          "mRequestedFormats.size() > 0");
}

TEST_F(RenderFrameRequestTest, RenderFormatIsFirstRasterFourFourFourElseBGRA)
{
    auto settings = MakeSettings(1, mProducer);
    settings.mRequestedFormats = {mvxmediatypes::kPixelFormat_YUYV_422_8u,
                                  mvxmediatypes::kPixelFormat_MJPG_422_Compressed};
    ML::RenderFrameRequest fallback = MakeRequest(settings);
    EXPECT_EQ(fallback.ChooseRenderPixelFormat(), mvxmediatypes::kPixelFormat_BGRA_4444_8u);
    EXPECT_EQ(fallback.mPixelFormat, mvxmediatypes::kPixelFormat_BGRA_4444_8u);

    settings.mRequestedFormats = {mvxmediatypes::kPixelFormat_YUYV_422_8u,
                                  mvxmediatypes::kPixelFormat_VUYA_4444_8u,
                                  mvxmediatypes::kPixelFormat_BGRA_4444_8u};
    ML::RenderFrameRequest chosen = MakeRequest(settings);
    EXPECT_EQ(chosen.ChooseRenderPixelFormat(), mvxmediatypes::kPixelFormat_VUYA_4444_8u);
}

TEST_F(RenderFrameRequestTest, SingleFieldInSecondHalfOfUpperFirstFrameMovesBackHalfAFrame)
{
    const std::int64_t frame = mvxmediatypes::kFrameRate_Video25.GetTicksPerFrame();
    const std::int64_t half = frame / 2;
    auto settings = MakeSettings(1, mProducer);
    settings.mFieldType = 1;
    settings.mRenderSingleField = true;
    settings.mTime = MF::FrameTime(TickTime::TicksToTime(3 * frame + half + half / 2));
    ML::RenderFrameRequest late = MakeRequest(settings);
    ML::CutlistRenderParams params;
    late.BuildRenderParams(true, params);
    EXPECT_EQ(params.mSingleField, 2u);
    const TickTime moved = TickTime::TicksToTime(3 * frame + half / 2);
    EXPECT_EQ(params.GetFrameTime(), MF::FrameTime(moved, moved + TickTime::TicksToTime(half)));

    settings.mTime = MF::FrameTime(TickTime::TicksToTime(3 * frame + half / 2));
    ML::RenderFrameRequest early = MakeRequest(settings);
    early.BuildRenderParams(true, params);
    EXPECT_EQ(params.mSingleField, 1u);
    EXPECT_EQ(params.GetFrameTime(), MF::FrameTime(moved, moved + TickTime::TicksToTime(half)));

    settings.mRenderSingleField = false;
    settings.mFieldType = 2;
    ML::RenderFrameRequest whole = MakeRequest(settings);
    whole.BuildRenderParams(true, params);
    EXPECT_EQ(params.mSingleField, 0u);
    EXPECT_EQ(params.GetFrameTime(), MF::FrameTime(moved + TickTime::TicksToTime(half), moved));
}

TEST_F(RenderFrameRequestTest, RenderParamsCarryRequestFields)
{
    auto settings = MakeSettings(1, mProducer, 360, 240);
    settings.mFullFrameRect = QRT::ParamRect(0, 0, 720, 480);
    settings.mQuality = 4;
    settings.mSecondaryQuality = 0xFFFFFFFFu;
    settings.mCutlistChoice = 3;
    settings.mCutlistParameter = 77;
    settings.mRenderFlags = 24;
    ML::RenderFrameRequest request = MakeRequest(settings);
    ML::CutlistRenderParams params;
    request.BuildRenderParams(true, params);
    EXPECT_EQ(params.mWidth, 360u);
    EXPECT_EQ(params.mHeight, 240u);
    EXPECT_EQ(params.mFullFrameWidth, 720u);
    EXPECT_EQ(params.mFullFrameHeight, 480u);
    EXPECT_EQ(params.mSecondaryQuality, 4u);
    EXPECT_EQ(params.mQuality, 4u);
    EXPECT_DOUBLE_EQ(params.mHorizontalScale, 0.5);
    EXPECT_DOUBLE_EQ(params.mVerticalScale, 0.5);
    EXPECT_EQ(params.mCutlistChoiceBit, 1u);
    EXPECT_EQ(params.mCutlistParameter, 77);
    EXPECT_EQ(params.mRenderFlags, 24u);
    EXPECT_EQ(params.mFieldType, 0u);
}

TEST_F(RenderFrameRequestTest, ProviderFieldTypeReplacesRequestsUnlessAsSource)
{
    auto provider = QRT::Allocated<TestCutlistProvider>::CreateInstance();
    auto settings = MakeSettings(1, mProducer);
    settings.mFieldType = 1;
    settings.mCutlistProvider = QRT::InterfaceRef<MF::IRenderableCutlistProvider>(provider);
    ML::RenderFrameRequest request = MakeRequest(settings);
    ML::CutlistRenderParams params;
    request.BuildRenderParams(true, params);
    EXPECT_EQ(params.mFieldType, 1u);
    provider->mFieldType = mvxmediatypes::kFieldType_LowerFirst;
    request.BuildRenderParams(true, params);
    EXPECT_EQ(params.mFieldType, 2u);
}

TEST_F(RenderFrameRequestTest, CutlistChoiceSelectsGetterAndIsFetchedOnce)
{
    auto provider = QRT::Allocated<TestCutlistProvider>::CreateInstance();
    for (auto& cutlist : provider->mCutlists)
        cutlist = QRT::InterfaceRef<MF::IRenderableCutlist>(
            QRT::Allocated<TestCutlist>::CreateInstance());
    const std::uint32_t choices[] = {0, 1, 3};
    for (int i = 0; i < 3; ++i)
    {
        auto settings = MakeSettings(1, nullptr);
        settings.mCutlistProvider = QRT::InterfaceRef<MF::IRenderableCutlistProvider>(provider);
        settings.mCutlistChoice = choices[i];
        ML::RenderFrameRequest request = MakeRequest(settings);
        EXPECT_EQ(request.GetRenderCutlist(true), provider->mCutlists[i]);
        EXPECT_EQ(request.GetRenderCutlist(true), provider->mCutlists[i]);
        EXPECT_EQ(provider->mCalls[i].load(), 1);
    }
    auto settings = MakeSettings(1, nullptr);
    settings.mCutlistProvider = QRT::InterfaceRef<MF::IRenderableCutlistProvider>(provider);
    settings.mCutlistChoice = 2;
    ML::RenderFrameRequest bad = MakeRequest(settings);
    EXPECT_INPUT_CONTRACT(bad.GetRenderCutlist(true),
                          "mCutlistChoice == 0 || mCutlistChoice == 1 || mCutlistChoice == 3");
}

TEST_F(RenderFrameRequestTest, CutlistKeyUsesProducerInNodeTimeAndBlackHashOutsideSegments)
{
    auto node = QRT::Allocated<TestNode>::CreateInstance();
    node->mProducer = QRT::InterfaceRef<ML::IRenderableNodeProducer>(mProducer);
    auto cutlist = QRT::Allocated<TestCutlist>::CreateInstance();
    cutlist->mNode = QRT::InterfaceRef<MF::IRenderableNode>(node);
    cutlist->mStart = TickTime::TicksToTime(1000);
    cutlist->mEnd = TickTime::TicksToTime(5000);
    cutlist->mOffset = TickTime::TicksToTime(100);
    auto provider = QRT::Allocated<TestCutlistProvider>::CreateInstance();
    provider->mCutlists[0] = QRT::InterfaceRef<MF::IRenderableCutlist>(cutlist);

    auto settings = MakeSettings(2, nullptr);
    settings.mCutlistProvider = QRT::InterfaceRef<MF::IRenderableCutlistProvider>(provider);
    ML::RenderFrameRequest inside = MakeRequest(settings);
    inside.ComputeKey(true);
    EXPECT_EQ(inside.mKey, ExpectedKey(mProducer->mHash, settings.mRequestedFormats, false, 0, 0));
    EXPECT_EQ(inside.mProducer.Get(), static_cast<ML::IRenderableNodeProducer*>(mProducer.Get()));
    EXPECT_EQ(inside.mNodeTime, MF::FrameTime(TickTime::TicksToTime(2000 - 1000 + 100)));

    settings.mRequestID = 9; // time 9000: after the segment
    settings.mTime = MF::FrameTime(TickTime::TicksToTime(9000));
    ML::RenderFrameRequest outside = MakeRequest(settings);
    outside.ComputeKey(true);
    ML::CutlistRenderParams params;
    outside.BuildRenderParams(true, params);
    EXPECT_EQ(outside.mKey, ExpectedKey(ML::CutlistRenderer::GetBlackFrameHash(params),
                                        settings.mRequestedFormats, false, 0, 0));
    EXPECT_FALSE(outside.mProducer);

    cutlist->mLookupStatus = static_cast<QRT::Result>(0xA0990002u);
    ML::RenderFrameRequest failing = MakeRequest(settings);
    try
    {
        failing.ComputeKey(true);
        ADD_FAILURE() << "no exception";
    }
    catch (const ML::RenderRequestException& error)
    {
        EXPECT_EQ(error.GetStatus(), static_cast<QRT::Result>(0xA0990002u));
        EXPECT_STREQ(error.what(), "RenderRequestException");
    }
}

TEST_F(RenderFrameRequestTest, StartPrefetchesCollectsFromNodeAndStartsEachHandleOnce)
{
    auto prefetch = QRT::Allocated<TestPrefetch>::CreateInstance();
    auto node = QRT::Allocated<TestNode>::CreateInstance();
    node->mPrefetch = QRT::InterfaceRef<ML::IRenderableNodePrefetch>(prefetch);
    auto cutlist = QRT::Allocated<TestCutlist>::CreateInstance();
    cutlist->mNode = QRT::InterfaceRef<MF::IRenderableNode>(node);
    cutlist->mOffset = TickTime::TicksToTime(500);
    auto provider = QRT::Allocated<TestCutlistProvider>::CreateInstance();
    provider->mCutlists[0] = QRT::InterfaceRef<MF::IRenderableCutlist>(cutlist);

    auto settings = MakeSettings(3, nullptr);
    settings.mCutlistProvider = QRT::InterfaceRef<MF::IRenderableCutlistProvider>(provider);
    settings.mPriority = 100;
    ML::RenderFrameRequest low = MakeRequest(settings);
    low.StartPrefetches();
    EXPECT_TRUE(low.mActivePrefetches.empty());

    settings.mPriority = 900;
    ML::RenderFrameRequest normal = MakeRequest(settings);
    normal.StartPrefetches();
    ASSERT_EQ(normal.mActivePrefetches.size(), 1u);
    EXPECT_EQ(prefetch->mInitiateCount.load(), 1);
    ASSERT_EQ(node->mPrefetchRanges.size(), 1u);
    EXPECT_EQ(node->mPrefetchRanges[0].first, TickTime::TicksToTime(3500));
    EXPECT_FALSE(normal.PrefetchesComplete());
    prefetch->mFrame = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, 4, 4,
                                            mvxmediatypes::kPixelAspectRatio_Square, true, false);
    prefetch->mComplete = true;
    EXPECT_TRUE(normal.PrefetchesComplete());
    FrameRef frame;
    normal.GetPrefetchResult(frame);
    EXPECT_EQ(frame, prefetch->mFrame);
}

TEST_F(RenderFrameRequestTest, PrefetchOnlyRequestTakesGivenHandlesAndCopiesShareResult)
{
    auto prefetch = QRT::Allocated<TestPrefetch>::CreateInstance();
    ML::RenderFrameRequest request(
        TickTime::TicksToTime(10),
        ML::RenderableNodePrefetchList{QRT::InterfaceRef<ML::IRenderableNodePrefetch>(prefetch)},
        12);
    EXPECT_TRUE(request.mPrefetchOnly);
    EXPECT_EQ(request.mCutlistParameter, -1);
    request.StartPrefetches();
    EXPECT_EQ(request.mActivePrefetches.size(), 1u);
    EXPECT_TRUE(request.mGivenPrefetches.empty());
    EXPECT_TRUE(request.PrefetchesWantMoreTime(1.0) == false);
    prefetch->mWantMoreTime = true;
    EXPECT_TRUE(request.PrefetchesWantMoreTime(2.5));
    EXPECT_DOUBLE_EQ(prefetch->mLastElapsed.load(), 2.5);

    const ML::RenderFrameRequest copy = request;
    const auto frame = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, 2, 2,
                                            mvxmediatypes::kPixelAspectRatio_Square, true, false);
    copy.StoreResult(frame);
    EXPECT_EQ(request.GetResult(), frame);
}

TEST_F(RenderFrameRequestTest, RenderProducesConformedFrameAndCompositesOnBlack)
{
    mProducer->mFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
    auto settings = MakeSettings(5, mProducer, 8, 4);
    settings.mCompositeOnBlack = true;
    ML::RenderFrameRequest request = MakeRequest(settings);
    request.ComputeKey(true);
    // A half-transparent white frame.
    struct WhiteProducer : TestProducer
    {
        QRT::Result ProduceFrame(const MF::FrameTime& inTime,
                                 const ML::CutlistRenderParams& inParams,
                                 FrameRef& outFrame) override
        {
            TestProducer::ProduceFrame(inTime, inParams, outFrame);
            auto* pixels = static_cast<std::uint8_t*>(outFrame->GetWritableBaseAddress());
            for (std::uint32_t y = 0; y < mHeight; ++y)
                for (std::uint32_t x = 0; x < mWidth; ++x)
                {
                    std::uint8_t* pixel = pixels + y * outFrame->GetRowBytes() + 4 * x;
                    pixel[0] = pixel[1] = pixel[2] = 255;
                    pixel[3] = 128;
                }
            return QRT::kResult_Success;
        }
    };
    auto white = QRT::Allocated<WhiteProducer>::CreateInstance();
    request.mProducer = QRT::InterfaceRef<ML::IRenderableNodeProducer>(white);
    FrameRef frame;
    request.Render(frame, request.ChooseRenderPixelFormat());
    ASSERT_TRUE(frame);
    const auto* pixel = static_cast<const std::uint8_t*>(frame->GetBaseAddress());
    EXPECT_EQ(pixel[3], 255);
    EXPECT_NEAR(pixel[0], 128, 1);
    EXPECT_EQ(white->mProduceCount.load(), 1);
}

} // namespace

TEST(RenderFrameRequestMediaTest, FirstMediaComesOnlyFromImportedMediaNodes)
{
    BE::VideoSourceRef source;
    ASSERT_TRUE(BE::OpenVideoSource("pattern:bars", source).Succeeded());
    const auto media = QRT::QueryRef<BE::Deprecated::IMedia>(source);
    ASSERT_TRUE(media);

    const BE::ImportedVideoSegmentNode imported(media);
    EXPECT_EQ(ML::RenderFrameRequest::GetFirstMediaFromVideoSegment(imported), media);

    const BE::VideoSegmentNode clip(2);
    EXPECT_FALSE(ML::RenderFrameRequest::GetFirstMediaFromVideoSegment(clip));

    const BE::ImportedVideoSegmentNode offline{QRT::InterfaceRef<BE::Deprecated::IMedia>()};
    EXPECT_FALSE(ML::RenderFrameRequest::GetFirstMediaFromVideoSegment(offline));
}
