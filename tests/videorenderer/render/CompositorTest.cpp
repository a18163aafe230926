// The compositor node, its producer and the compositing step, checked on the
// pixels of small BGRA frames: each row of a frame is written as one letter
// per pixel, R for red, B for blue, ? for anything else.

#include "ContractExpect.h"
#include "ML/CutlistRenderer.h"
#include "ML/IRenderableNodeIntrinsicParameterProvider.h"
#include "ML/RenderFlags.h"
#include "ML/RenderableNodeCompositorImpl.h"
#include "ML/RenderableNodes.h"
#include "MediaNodeTestSupport.h"
#include "QRT/Exception.h"
#include "TestFrames.h"
#include "TestNode.h"
#include "TestProducer.h"
#include "VF/SharedVideoFrameCache.h"
#include "render/VideoFrameCompositeUtilities.h"

#include <cstddef>
#include <map>
#include <string>

#include <gtest/gtest.h>

namespace
{

using graphtest::BytesOf;
using graphtest::FrameHash;
using graphtest::NodeRef;
using graphtest::ProducerOf;
using graphtest::Render;
using graphtest::Ticks;
using mvxmediatypes::TickTime;
using vrtest::Bgra;
using vrtest::FrameRef;

constexpr Bgra kRed{0, 0, 255, 255};
constexpr Bgra kBlue{255, 0, 0, 255};
constexpr std::uint32_t kRedColor = 0xFFFF0000u;

// A layer answering its test producer, with per-time motion.
class LayerNode
    : public ML::RenderableNodeWithInterfaces<vrtest::TestNode,
                                              ML::IRenderableNodeIntrinsicParameterProvider>
{
public:
    QRT::Result GetIntrinsicParameters(TickTime inLayerTime, const ML::CutlistRenderParams&,
                                       ML::MotionRecord& ioRecord) const override
    {
        if (const auto found = mMotion.find(inLayerTime); found != mMotion.end())
            ioRecord = found->second;
        return QRT::kResult_Success;
    }

    QRT::InterfaceRef<vrtest::TestProducer> mTest =
        QRT::Allocated<vrtest::TestProducer>::CreateInstance();
    std::map<TickTime, ML::MotionRecord> mMotion;
};

// A sealed layer whose frames are the request's size and format, filled with inColor.
QRT::InterfaceRef<LayerNode> MakeLayer(const Bgra& inColor,
                                       std::map<TickTime, ML::MotionRecord> inMotion = {})
{
    auto node = QRT::Allocated<LayerNode>::CreateInstance();
    node->mProducer = node->mTest;
    node->mTest->mFormat = mvxmediatypes::kPixelFormat_Invalid;
    node->mTest->mWidth = 0;
    node->mTest->mPaint = [inColor](MF::IVideoFrame& ioFrame) { vrtest::Fill(ioFrame, inColor); };
    node->mMotion = std::move(inMotion);
    node->MakeImmutable();
    return node;
}

struct LayerInput
{
    NodeRef mNode;
    std::int64_t mOffset = 0;
    std::uint32_t mTrack = 0;
};

NodeRef MakeCompositor(const std::vector<LayerInput>& inLayers)
{
    auto compositor = ML::RenderableNodeCompositorImpl::Create();
    for (const LayerInput& layer : inLayers)
        compositor->AddTrackInput(layer.mNode, Ticks(layer.mOffset), layer.mTrack);
    compositor->MakeImmutable();
    return compositor->GetSelfReference();
}

const std::uint8_t* PixelAt(const MF::IVideoFrame& inFrame, std::int32_t inX, std::int32_t inY)
{
    return static_cast<const std::uint8_t*>(inFrame.GetBaseAddress()) +
           static_cast<std::ptrdiff_t>(inY) * inFrame.GetRowBytes() + 4 * inX;
}

// "RRBB|RRBB|..." for a BGRA_4444_8u frame.
std::string Letters(const FrameRef& inFrame)
{
    if (!inFrame || inFrame->GetPixelFormat() != mvxmediatypes::kPixelFormat_BGRA_4444_8u)
        return "no BGRA frame";
    std::string letters;
    const QRT::ParamRect bounds = inFrame->GetBounds();
    for (std::int32_t y = 0; y < bounds.Height(); ++y)
    {
        letters += y == 0 ? "" : "|";
        for (std::int32_t x = 0; x < bounds.Width(); ++x)
        {
            const std::uint8_t* pixel = PixelAt(*inFrame, x, y);
            letters += std::equal(kRed.begin(), kRed.end(), pixel)     ? 'R'
                       : std::equal(kBlue.begin(), kBlue.end(), pixel) ? 'B'
                                                                       : '?';
        }
    }
    return letters;
}

class CompositorTest : public ::testing::Test
{
protected:
    void SetUp() override { VF::SharedVideoFrameCache::Clear(); }
    void TearDown() override { VF::SharedVideoFrameCache::Clear(); }

    ML::CutlistRenderParams mParams = vrtest::MakeParams(8, 4);
};

TEST(MotionRecordTest, EachComparisonReadsItsFields)
{
    using R = ML::MotionRecord;
    // Per field: 2 when both comparisons read it, 1 when only SameMotion does.
    const std::pair<std::size_t, int> fields[] = {
        {offsetof(R, mAnchorX), 2},          {offsetof(R, mAnchorY), 2},
        {offsetof(R, mPositionX), 2},        {offsetof(R, mPositionY), 2},
        {offsetof(R, mScaleX), 2},           {offsetof(R, mScaleY), 2},
        {offsetof(R, mRotation), 2},         {offsetof(R, mReserved1), 2},
        {offsetof(R, mReserved2), 0},        {offsetof(R, mReserved3), 2},
        {offsetof(R, mMediaPixelAspect), 0}, {offsetof(R, mMediaWidth), 2},
        {offsetof(R, mMediaHeight), 2},      {offsetof(R, mReserved4), 0},
        {offsetof(R, mBlendMode), 1},        {offsetof(R, mOpacity), 1},
    };
    for (const auto& [offset, reads] : fields)
    {
        SCOPED_TRACE(offset);
        R record;
        reinterpret_cast<unsigned char*>(&record)[offset + 3] ^= 0x08;
        EXPECT_EQ(ML::SameGeometry(record, ML::kIdentityMotionRecord), reads < 2);
        EXPECT_EQ(ML::SameMotion(record, ML::kIdentityMotionRecord), reads == 0);
    }
}

TEST_F(CompositorTest, FlagsAreTheInputsEmptyIsBlackAndAFailingLayerAborts)
{
    const struct
    {
        std::vector<std::uint32_t> mInputFlags;
        std::uint32_t mExpected;
    } cases[] = {{{}, 92}, {{92 | 1, 84}, 84}, {{84 | 8, 1}, 0}};
    for (const auto& testCase : cases)
    {
        std::vector<LayerInput> layers;
        for (const std::uint32_t flags : testCase.mInputFlags)
            layers.push_back({graphtest::MakeLeaf("Leaf", flags)});
        EXPECT_EQ(MakeCompositor(layers)->GetRenderFlags(), testCase.mExpected);
    }
    auto withEmptyInput = ML::RenderableNodeCompositorImpl::Create();
    withEmptyInput->AddTrackInput({}, Ticks(0), 0);
    EXPECT_THROW(withEmptyInput->MakeImmutable(), QRT::NullInterfaceException);

    const NodeRef empty = MakeCompositor({});
    EXPECT_EQ(Render(empty, mParams), ML::CutlistRenderer::GetBlackFrame(mParams));
    EXPECT_EQ(FrameHash(empty, mParams), ML::CutlistRenderer::GetBlackFrameHash(mParams));

    // A failing layer aborts the composite with its status; the layers above are not asked.
    const auto failing = MakeLayer(kBlue);
    failing->mTest->mFailure = vrtest::ProducerFailure::kStatus;
    const auto above = MakeLayer(kRed);
    const NodeRef compositor = MakeCompositor({{NodeRef(failing.Get())}, {NodeRef(above.Get())}});
    FrameRef frame;
    EXPECT_EQ(ProducerOf(compositor, mParams)->ProduceFrame(mParams.GetFrameTime(), mParams, frame),
              failing->mTest->mFailureStatus);
    EXPECT_FALSE(frame);
    EXPECT_EQ(above->mTest->mProduceCount.load(), 0);
}

TEST_F(CompositorTest, FieldMotionIsDrawnInTwoPassesHashedInOrderAndOneFieldIsKept)
{
    // The layer starts 10 ticks late: field 1 (its tick 0) moves the half-size
    // layer left, field 2 (its tick 10) right.
    mParams.SetFrameTime(MF::FrameTime(Ticks(10), Ticks(20)));
    mParams.mFieldType = mvxmediatypes::kFieldType_UpperFirst;
    const ML::MotionRecord left{.mPositionX = 0.25f, .mScaleX = 0.5f, .mScaleY = 0.5f};
    const ML::MotionRecord right{.mPositionX = 0.75f, .mScaleX = 0.5f, .mScaleY = 0.5f};
    const auto top = MakeLayer(kBlue, {{Ticks(0), left}, {Ticks(10), right}});
    const NodeRef bottom = ML::CreateSolidColorNode(kRedColor);
    const NodeRef compositor = MakeCompositor({{bottom}, {NodeRef(top.Get()), 10, 1}});
    const struct
    {
        std::uint32_t mSingleField;
        std::uint32_t mQuality;
        mvxmediatypes::FieldType mFieldType;
        const char* mRows; // rows the case checks; '.' rows are not checked
    } cases[] = {
        {0, 0, mvxmediatypes::kFieldType_UpperFirst, "RRRRRRRR|RRRRBBBB|BBBBRRRR|RRRRRRRR"},
        {1, 3, mvxmediatypes::kFieldType_Progressive, "RRRRRRRR|........|BBBBRRRR|........"},
        {2, 3, mvxmediatypes::kFieldType_Progressive, "........|RRRRBBBB|........|RRRRRRRR"},
    };
    for (const auto& testCase : cases)
    {
        SCOPED_TRACE(testCase.mSingleField);
        mParams.mSingleField = testCase.mSingleField;
        mParams.mQuality = testCase.mQuality;
        const FrameRef frame = Render(compositor, mParams);
        ASSERT_TRUE(frame);
        EXPECT_EQ(frame->GetFieldType(), testCase.mFieldType);
        std::string letters = Letters(frame);
        const std::string expected = testCase.mRows;
        for (std::size_t index = 0; index < expected.size() && index < letters.size(); ++index)
            letters[index] = expected[index] == '.' ? '.' : letters[index];
        EXPECT_EQ(letters, expected);
    }

    // The exact runs: each layer's two records and frame hash, in layer time,
    // then the node hash and the request.
    const ML::MotionRecord identity;
    EXPECT_EQ(
        FrameHash(compositor, mParams),
        graphtest::HashOfRuns(
            {"RenderableNodeCompositorProducer", BytesOf(identity), BytesOf(identity),
             BytesOf(FrameHash(bottom, mParams)), BytesOf(left), BytesOf(right),
             BytesOf(top->mTest->mHash), BytesOf(compositor->GetNodeHash()),
             BytesOf(mParams.mPixelAspectRatio), BytesOf(mParams.mWidth), BytesOf(mParams.mHeight),
             BytesOf(mParams.mQuality), BytesOf(mParams.mSingleField),
             BytesOf(mParams.mSecondaryQuality), BytesOf(mParams.mPixelFormat)}));
    EXPECT_EQ(top->mTest->LastHashTime(), MF::FrameTime(Ticks(0), Ticks(10)));
}

TEST_F(CompositorTest, TrackIndexLimitKeepsTheTracksAtOrBelowIt)
{
    const auto blue = MakeLayer(kBlue);
    const NodeRef compositor =
        MakeCompositor({{ML::CreateSolidColorNode(kRedColor), 0, 0}, {NodeRef(blue.Get()), 0, 2}});
    const struct
    {
        std::int64_t mLimit;
        char mExpected;
    } cases[] = {{-1, 'B'}, {1, 'R'}, {2, 'B'}};
    for (const auto& testCase : cases)
    {
        mParams.mCutlistParameter = testCase.mLimit;
        EXPECT_EQ(Letters(Render(compositor, mParams)).front(), testCase.mExpected)
            << testCase.mLimit;
    }
    // Inputs added without a track index break the pairing once a limit applies.
    auto unpaired = ML::RenderableNodeCompositorImpl::Create();
    unpaired->AddTrackInput(ML::CreateSolidColorNode(kRedColor), Ticks(0), 0);
    unpaired->AddInput(ML::CreateSolidColorNode(kRedColor), Ticks(0));
    unpaired->MakeImmutable();
    EXPECT_INPUT_CONTRACT(ProducerOf(unpaired->GetSelfReference(), mParams),
                          "mInputs.size() == mTrackIndices.size()");
}

TEST_F(CompositorTest, IdentityLayerPassesThroughAndEmptyContentKeepsTheLower)
{
    const auto layer = MakeLayer(kBlue);
    const MF::IVideoFrame* painted = nullptr;
    layer->mTest->mPaint = [&](MF::IVideoFrame& ioFrame) { painted = &ioFrame; };
    EXPECT_EQ(Render(MakeCompositor({{NodeRef(layer.Get())}}), mParams).Get(), painted);
    // A faded layer alone keeps its opacity (over nothing, its alpha is halved).
    ML::MotionRecord faded;
    faded.mOpacity = 0.5f;
    const auto alone = MakeLayer(kBlue, {{mParams.GetFirstFieldTime(), faded}});
    const FrameRef halved = Render(MakeCompositor({{NodeRef(alone.Get())}}), mParams);
    EXPECT_NEAR(PixelAt(*halved, 3, 2)[3], 128, 1);

    const FrameRef frame = vrtest::MakeFrame(8, 4);
    EXPECT_EQ(ML::ApplyMotion(frame, ML::kIdentityMotionRecord, ML::kIdentityMotionRecord, mParams),
              frame);
    // Opacity and blend mode do not count for a layer alone; geometry does.
    EXPECT_EQ(ML::ApplyMotion(frame, faded, faded, mParams), frame);
    const ML::MotionRecord shifted{.mPositionX = 0.4f};
    EXPECT_NE(ML::ApplyMotion(frame, shifted, shifted, mParams), frame);

    const FrameRef lower = vrtest::MakeFrame(8, 4);
    lower->MarkShared(1);
    const FrameRef nothing =
        VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, 8, 4,
                             mvxmediatypes::kPixelAspectRatio_Square, true, true);
    EXPECT_EQ(ML::CompositeLayer(nothing, faded, faded, lower, mParams), lower);
    EXPECT_INPUT_CONTRACT(ML::CompositeLayer({}, faded, faded, lower, mParams), "inFrame");
    EXPECT_INPUT_CONTRACT(ML::CompositeLayer(frame, faded, faded, vrtest::MakeFrame(4, 4), mParams),
                          "!inLowerFrame || FrameAlreadyConformsToOutput(inLowerFrame, "
                          "inRenderParams)");
}

TEST_F(CompositorTest, StillRangesAreTheShiftedUnionAndSmartTimesNeedOneInput)
{
    const auto first = graphtest::MakeMutable<graphtest::ScriptedProviderNode>("Still", 0);
    first->mStillRanges = {graphtest::Range(100, 200)};
    first->mSmartTimes = {Ticks(120)};
    const auto second = graphtest::MakeMutable<graphtest::ScriptedProviderNode>("Still", 0);
    second->mStillRanges = {graphtest::Range(0, 30)};
    const NodeRef one = MakeCompositor({{graphtest::Seal(first), 50}});
    const NodeRef two = MakeCompositor({{NodeRef(first.Get()), 50}, {graphtest::Seal(second), 0}});
    const auto provider = [](const NodeRef& inNode)
    { return QRT::QueryRef<ML::IRenderableNodeProducerProvider>(inNode); };

    MF::TickTimeRangeList ranges;
    provider(two)->GetStillRanges(Ticks(0), Ticks(1000), ranges);
    EXPECT_EQ(ranges, (MF::TickTimeRangeList{graphtest::Range(150, 250), graphtest::Range(0, 30)}));
    EXPECT_EQ(first->mStillQuestions.back(), graphtest::Range(-50, 950));

    std::set<TickTime> times;
    provider(two)->GetSmartRenderTimes(Ticks(0), Ticks(1000), mParams.mFrameRate, false, times);
    EXPECT_TRUE(times.empty());
    provider(one)->GetSmartRenderTimes(Ticks(0), Ticks(1000), mParams.mFrameRate, false, times);
    EXPECT_EQ(times, (std::set<TickTime>{Ticks(170)}));
    EXPECT_EQ(first->mSmartQuestions.back(), graphtest::Range(-50, 950));
}

TEST_F(CompositorTest, OffsetCompositeClipsAtEveryEdgeAndGrowsTheVisibleContent)
{
    // Transparent but for its bottom-right pixel, so that a misplaced start shows.
    const FrameRef source = vrtest::MakeFrame(2, 2);
    std::copy(kBlue.begin(), kBlue.end(),
              static_cast<std::uint8_t*>(source->GetWritableBaseAddress()) + source->GetRowBytes() +
                  4);
    const struct
    {
        std::int32_t mX, mY;
        QRT::ParamRect mCovered;
    } cases[] = {
        {1, 1, {1, 1, 3, 3}}, {-1, -1, {0, 0, 1, 1}}, {2, 2, {2, 2, 4, 4}},
        {3, 2, {3, 2, 4, 4}}, {-1, 3, {0, 3, 1, 4}},  {4, 0, {}},
        {0, -2, {}},
    };
    for (const auto& testCase : cases)
    {
        SCOPED_TRACE(testing::Message() << testCase.mX << "," << testCase.mY);
        const FrameRef destination =
            VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, 4, 4,
                                 mvxmediatypes::kPixelAspectRatio_Square, true, true);
        vrtest::Fill(*destination, kRed);
        ASSERT_EQ(ML::CompositeFrameAtOffset(source, destination, testCase.mX, testCase.mY),
                  QRT::kResult_Success);
        std::string expected;
        for (std::int32_t y = 0; y < 4; ++y)
            for (std::int32_t x = 0; x < 4; ++x)
                expected += std::string(y > 0 && x == 0 ? "|" : "") +
                            (x == testCase.mX + 1 && y == testCase.mY + 1 ? 'B' : 'R');
        EXPECT_EQ(Letters(destination), expected);
        EXPECT_EQ(destination->GetVisibleContentRect(), testCase.mCovered);
    }
    EXPECT_INPUT_CONTRACT(ML::CompositeFrameAtOffset({}, source, 0, 0), "inSourceFrame != NULL");
}

} // namespace
