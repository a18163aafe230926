#include "ML/RenderFrameRequest.h"

#include "BE/CutlistProvider.h"
#include "BE/VideoSources.h"
#include "ContractExpect.h"
#include "ML/CutlistRenderer.h"
#include "PipelineTestSupport.h"
#include "QRT/Hash.h"
#include "TestCutlists.h"
#include "TestFrames.h"
#include "TestNode.h"
#include "TestPrefetch.h"
#include "TestProducer.h"
#include "VF/SharedVideoFrameCache.h"

#include <tuple>

#include <gtest/gtest.h>

using namespace vrtest;
using mvxmediatypes::TickTime;

namespace
{

constexpr auto kBGRA = mvxmediatypes::kPixelFormat_BGRA_4444_8u;

// The request key, mixed here from the documented order: prefix, content
// hash, each format's 64-bit value, the composite-on-black flag, the two
// qualities, all little-endian.
QRT::Guid ExpectedKey(const QRT::Guid& inContent,
                      const std::vector<mvxmediatypes::PixelFormat>& inFormats,
                      bool inCompositeOnBlack, std::uint32_t inQuality,
                      std::uint32_t inSecondaryQuality)
{
    QRT::HashValue hash;
    const auto mix = [&hash](std::uint64_t inValue, int inBytes)
    {
        std::uint8_t bytes[8];
        for (int i = 0; i < inBytes; ++i)
            bytes[i] = static_cast<std::uint8_t>(inValue >> (8 * i));
        QRT::MixHash::MixInData(hash, bytes, static_cast<std::size_t>(inBytes));
    };
    const std::string prefix = "Hash Including Render Params";
    QRT::MixHash::MixInData(hash, prefix.data(), prefix.size());
    QRT::MixHash::MixInData(hash, QRT::GuidToBytes(inContent).data(), 16);
    for (const auto& format : inFormats)
        mix(format.GetValue(), 8);
    mix(inCompositeOnBlack ? 1 : 0, 1);
    mix(inQuality, 4);
    mix(inSecondaryQuality, 4);
    return QRT::HashValueToGuid(hash);
}

class RenderFrameRequestTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        VF::SharedVideoFrameCache::Clear();
        mProvider->mCutlists[0] = OneSegment(mNode);
    }

    // Settings of request inRequestID rendered from mProvider's cutlists.
    ML::RenderFrameRequestSettings CutlistSettings(std::uint32_t inRequestID)
    {
        auto settings = MakeSettings(inRequestID, nullptr);
        settings.mCutlistProvider = mProvider;
        return settings;
    }

    QRT::InterfaceRef<TestProducer> mProducer = QRT::Allocated<TestProducer>::CreateInstance();
    QRT::InterfaceRef<TestNode> mNode = NewNode(mProducer);
    QRT::InterfaceRef<BareCutlistProvider> mProvider =
        QRT::Allocated<BareCutlistProvider>::CreateInstance();
};

TEST_F(RenderFrameRequestTest, KeyMixesContentFormatsFlagAndQualitiesInOrder)
{
    auto settings = MakeSettings(7, mProducer);
    settings.mRequestedFormats = {mvxmediatypes::kPixelFormat_VUYA_4444_8u,
                                  mvxmediatypes::kPixelFormat_BGRA_4444_32f};
    settings.mCompositeOnBlack = true;
    settings.mQuality = 4;
    settings.mSecondaryQuality = 0xFFFFFFFFu;
    const ML::RenderFrameRequest request(settings, false, true);
    EXPECT_EQ(request.mKey,
              ExpectedKey(mProducer->mHash, settings.mRequestedFormats, true, 4, 0xFFFFFFFFu));

    // A deferred key stays nil, and the hash unasked, until it is computed.
    ML::RenderFrameRequest deferred = MakeRequest(MakeSettings(3, mProducer));
    EXPECT_TRUE(deferred.mKey.IsNil());
    EXPECT_EQ(mProducer->mHashCount.load(), 1);
    deferred.ComputeKey(true);
    EXPECT_EQ(deferred.mKey, ExpectedKey(mProducer->mHash, {kBGRA}, false, 0, 0));
}

TEST_F(RenderFrameRequestTest, NilContentOrNoFormatsBreakContractsAndRenderFormatIsRaster)
{
    ML::RenderFrameRequest request = MakeRequest(MakeSettings(4, nullptr));
    request.ComputeKey(true);
    EXPECT_TRUE(request.mKey.IsNil());
    FrameRef frame;
    EXPECT_INPUT_CONTRACT(request.Render(frame, mvxmediatypes::kPixelFormat_Invalid),
                          "inPixelFormat != MF::kPixelFormat_Invalid");
    EXPECT_INPUT_CONTRACT(request.Render(frame, kBGRA), "mKey != QRT::Guid()");
    auto settings = MakeSettings(5, mProducer);
    settings.mRequestedFormats.clear();
    EXPECT_INPUT_CONTRACT(ML::RenderFrameRequest(settings, true, false),
                          "mRequestedFormats.size() > 0");
    // The first raster 4:4:4 format requested, else BGRA.
    settings.mRequestedFormats = {mvxmediatypes::kPixelFormat_YUYV_422_8u};
    EXPECT_EQ(MakeRequest(settings).ChooseRenderPixelFormat(), kBGRA);
    settings.mRequestedFormats.push_back(mvxmediatypes::kPixelFormat_VUYA_4444_8u);
    settings.mRequestedFormats.push_back(kBGRA);
    EXPECT_EQ(MakeRequest(settings).ChooseRenderPixelFormat(),
              mvxmediatypes::kPixelFormat_VUYA_4444_8u);
}

TEST_F(RenderFrameRequestTest, SingleFieldOfUpperFirstFrameIsTheHalfTheTimeFallsIn)
{
    const std::int64_t frame = mvxmediatypes::kFrameRate_Video25.GetTicksPerFrame();
    const std::int64_t half = frame / 2;
    const TickTime start = TickTime::TicksToTime(3 * frame + half / 2);
    const TickTime later = start + TickTime::TicksToTime(half);
    const struct
    {
        std::uint32_t mFieldType;
        bool mSingle;
        std::int64_t mTime;
        std::uint32_t mExpectedField;
        MF::FrameTime mExpectedTime;
    } cases[] = {
        // In the second half: moved back half a frame, second field.
        {1, true, 3 * frame + half + half / 2, 2, MF::FrameTime(start, later)},
        {1, true, 3 * frame + half / 2, 1, MF::FrameTime(start, later)},
        {2, false, 3 * frame + half / 2, 0, MF::FrameTime(later, start)},
    };
    for (const auto& testCase : cases)
    {
        SCOPED_TRACE(testCase.mTime);
        auto settings = MakeSettings(1, mProducer);
        settings.mFieldType = testCase.mFieldType;
        settings.mRenderSingleField = testCase.mSingle;
        settings.mTime = MF::FrameTime(TickTime::TicksToTime(testCase.mTime));
        ML::CutlistRenderParams params;
        MakeRequest(settings).BuildRenderParams(true, params);
        EXPECT_EQ(params.mSingleField, testCase.mExpectedField);
        EXPECT_EQ(params.GetFrameTime(), testCase.mExpectedTime);
    }
}

TEST_F(RenderFrameRequestTest, RenderParamsCarryRequestFieldsAndProviderFieldType)
{
    auto settings = MakeSettings(1, mProducer, 360, 240);
    settings.mFullFrameRect = QRT::ParamRect(0, 0, 720, 480);
    settings.mQuality = 4;
    settings.mSecondaryQuality = 0xFFFFFFFFu;
    settings.mCutlistChoice = 3;
    settings.mCutlistParameter = 77;
    settings.mRenderFlags = 24;
    ML::CutlistRenderParams params;
    MakeRequest(settings).BuildRenderParams(true, params);
    EXPECT_EQ(std::tuple(params.mWidth, params.mFullFrameHeight, params.mVerticalScale),
              std::tuple(360u, 480u, 0.5));
    // An unset secondary quality takes the quality.
    EXPECT_EQ(std::tuple(params.mQuality, params.mSecondaryQuality), std::tuple(4u, 4u));
    EXPECT_EQ(std::tuple(params.mCutlistChoiceBit, params.mCutlistParameter, params.mRenderFlags),
              std::tuple(1u, 77, 24u));
    // The priority class gives the cache priority of the frames the render reads and makes.
    for (const auto& [priority, cachePriority] :
         {std::pair{1000u, VF::kCachePriority_High}, std::pair{811u, VF::kCachePriority_High},
          std::pair{810u, VF::kCachePriority_Low}, std::pair{0u, VF::kCachePriority_Low}})
    {
        settings.mPriority = priority;
        MakeRequest(settings).BuildRenderParams(true, params);
        EXPECT_EQ(params.mCachePriority, cachePriority) << priority;
    }

    // A provider's field type replaces the request's, unless it is "as source".
    settings.mFieldType = 1;
    BE::CutlistProviderSettings described;
    for (const auto& [type, expected] : {std::pair{mvxmediatypes::kFieldType_AsSource, 1u},
                                         std::pair{mvxmediatypes::kFieldType_LowerFirst, 2u}})
    {
        described.mFieldType = type;
        settings.mCutlistProvider = BE::CreateCutlistProvider(described);
        MakeRequest(settings).BuildRenderParams(true, params);
        EXPECT_EQ(params.mFieldType, expected);
    }
}

TEST_F(RenderFrameRequestTest, CutlistChoiceSelectsGetterAndIsFetchedOnce)
{
    for (auto& cutlist : mProvider->mCutlists)
        cutlist = OneSegment(mNode);
    const std::uint32_t choices[] = {0, 1, 3};
    for (std::size_t i = 0; i < 3; ++i)
    {
        auto settings = CutlistSettings(1);
        settings.mCutlistChoice = choices[i];
        ML::RenderFrameRequest request = MakeRequest(settings);
        EXPECT_EQ(request.GetRenderCutlist(true), mProvider->mCutlists[i]);
        EXPECT_EQ(request.GetRenderCutlist(true), mProvider->mCutlists[i]);
        EXPECT_EQ(mProvider->Calls().size(), i + 1u);
    }
    auto settings = CutlistSettings(1);
    settings.mCutlistChoice = 2;
    EXPECT_INPUT_CONTRACT(MakeRequest(settings).GetRenderCutlist(true),
                          "mCutlistChoice == 0 || mCutlistChoice == 1 || mCutlistChoice == 3");
}

// The producer's hash is asked for the node's own time, the time the render
// then produces at; where no producer can be had (no segment at the time, or a
// failed lookup) the key is made from the black frame's hash.
TEST_F(RenderFrameRequestTest, CutlistKeyUsesProducerInNodeTimeAndBlackHashWithoutProducer)
{
    mProvider->mCutlists[0] = OneSegment(mNode, 1000, 5000, 100);
    auto settings = CutlistSettings(2);
    ML::RenderFrameRequest inside = MakeRequest(settings);
    inside.ComputeKey(true);
    EXPECT_EQ(inside.mKey, ExpectedKey(mProducer->mHash, {kBGRA}, false, 0, 0));
    const MF::FrameTime nodeTime(TickTime::TicksToTime(2000 - 1000 + 100));
    EXPECT_EQ(mProducer->LastHashTime(), nodeTime);
    EXPECT_EQ(inside.mNodeTime, nodeTime);

    settings.mTime = MF::FrameTime(TickTime::TicksToTime(9000)); // after the segment
    for (const bool failingLookup : {false, true})
    {
        SCOPED_TRACE(failingLookup ? "failed lookup" : "no segment");
        if (failingLookup)
            mProvider->mCutlists[0] = QRT::Allocated<FailingCutlist>::CreateInstance();
        ML::RenderFrameRequest outside = MakeRequest(settings);
        outside.ComputeKey(true);
        ML::CutlistRenderParams params;
        outside.BuildRenderParams(true, params);
        EXPECT_EQ(outside.mKey, ExpectedKey(ML::CutlistRenderer::GetBlackFrameHash(params), {kBGRA},
                                            false, 0, 0));
        EXPECT_FALSE(outside.mProducer);
    }
}

TEST_F(RenderFrameRequestTest, OnlyNormalPriorityStartsTheNodesPrefetchesOnce)
{
    auto prefetch = QRT::Allocated<TestPrefetch>::CreateInstance();
    mNode->mPrefetch = prefetch;
    mProvider->mCutlists[0] = OneSegment(mNode, 0, 1'000'000, 500);
    auto settings = CutlistSettings(3);
    settings.mPriority = 100;
    ML::RenderFrameRequest low = MakeRequest(settings);
    low.StartPrefetches();
    EXPECT_TRUE(low.mActivePrefetches.empty());

    settings.mPriority = 900;
    ML::RenderFrameRequest normal = MakeRequest(settings);
    normal.StartPrefetches();
    EXPECT_EQ(prefetch->mInitiateCount.load(), 1);
    ASSERT_EQ(mNode->PrefetchRanges().size(), 1u);
    EXPECT_EQ(mNode->PrefetchRanges()[0].first, TickTime::TicksToTime(3500));
    EXPECT_FALSE(normal.PrefetchesComplete());
    const auto frame = MakeFrame(4, 4);
    prefetch->Complete(frame);
    EXPECT_TRUE(normal.PrefetchesComplete());
    FrameRef result;
    normal.GetPrefetchResult(result);
    EXPECT_EQ(result, frame);
}

TEST_F(RenderFrameRequestTest, CompositeOnBlackTreatsPremultipliedStorageAsAssociatedColour)
{
    // A half-transparent pixel on black: straight colour is scaled by its
    // alpha, premultiplied colour is already scaled and stays. The frame's
    // format is the straight BGRA_4444_8u either way: only its alpha kind
    // says the colour is premultiplied.
    const struct
    {
        mvxmediatypes::AlphaChannel mAlpha;
        Bgra mPixel;
        std::uint8_t mExpected;
    } cases[] = {
        {mvxmediatypes::kAlphaChannel_Straight, {255, 255, 255, 128}, 128},
        {mvxmediatypes::kAlphaChannel_Premultiplied, {100, 100, 100, 128}, 100},
    };
    for (const auto& testCase : cases)
    {
        SCOPED_TRACE(static_cast<int>(testCase.mAlpha));
        auto producer = QRT::Allocated<TestProducer>::CreateInstance();
        producer->mPaint = [&](MF::IVideoFrame& ioFrame)
        {
            Fill(ioFrame, testCase.mPixel);
            ioFrame.SetAlphaChannel(testCase.mAlpha);
        };
        auto settings = MakeSettings(5, producer, 8, 4);
        settings.mCompositeOnBlack = true;
        ML::RenderFrameRequest request = MakeRequest(settings);
        request.ComputeKey(true);
        FrameRef frame;
        request.Render(frame, request.ChooseRenderPixelFormat());
        const std::uint8_t value = testCase.mExpected;
        EXPECT_TRUE(IsFilledWith(frame, {value, value, value, 255}));
        EXPECT_EQ(producer->mProduceCount.load(), 1);
    }
}

} // namespace

TEST(RenderFrameRequestMediaTest, FirstMediaComesOnlyFromImportedMediaNodes)
{
    BE::VideoSourceRef source;
    ASSERT_TRUE(BE::OpenVideoSource("pattern:bars", source).Succeeded());
    const auto media = QRT::QueryRef<BE::Deprecated::IMedia>(source);
    ASSERT_TRUE(media);
    EXPECT_EQ(
        ML::RenderFrameRequest::GetFirstMediaFromVideoSegment(BE::ImportedVideoSegmentNode(media)),
        media);
    EXPECT_FALSE(ML::RenderFrameRequest::GetFirstMediaFromVideoSegment(BE::VideoSegmentNode(2)));
    EXPECT_FALSE(ML::RenderFrameRequest::GetFirstMediaFromVideoSegment(
        BE::ImportedVideoSegmentNode{QRT::InterfaceRef<BE::Deprecated::IMedia>()}));
}
