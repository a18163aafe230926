// The compositor node, its producer and the compositing step, checked on the
// pixels of small BGRA frames: each row of a frame is written as one letter
// per pixel, R for red, B for blue, ? for anything else.

#include "ContractExpect.h"
#include "IR/ImageRenderer.h"
#include "ML/CutlistRenderer.h"
#include "ML/IRenderableNodeIntrinsicParameterProvider.h"
#include "ML/RenderFlags.h"
#include "ML/RenderableNodeCompositorImpl.h"
#include "ML/RenderableNodes.h"
#include "QRT/Exception.h"
#include "TestFrames.h"
#include "TestNodeKinds.h"
#include "TestProducer.h"
#include "VF/PixelFormatConversions.h"
#include "VF/SharedVideoFrameCache.h"
#include "render/VideoFrameCompositeUtilities.h"

#include <cstddef>
#include <map>
#include <string>

#include <gtest/gtest.h>

namespace
{

using graphtest::NodeRef;
using graphtest::Ticks;
using mvxmediatypes::TickTime;
using vrtest::Bgra;
using vrtest::FrameRef;

constexpr Bgra kRed{0, 0, 255, 255};
constexpr Bgra kBlue{255, 0, 0, 255};
constexpr std::uint32_t kRedColor = 0xFFFF0000u;

// A layer with a producer and per-time motion that records when it was asked.
class LayerNode
    : public ML::RenderableNodeWithInterfaces<graphtest::ScriptedProviderNode,
                                              ML::IRenderableNodeIntrinsicParameterProvider>
{
public:
    LayerNode()
        : RenderableNodeWithInterfaces("LayerNode", 0)
    {
    }
    void GetProducer(QRT::InterfaceRef<ML::IRenderableNodeProducer>& outProducer,
                     const MF::FrameTime&, const ML::CutlistRenderParams&) const override
    {
        outProducer = mProducer;
    }
    QRT::Result GetIntrinsicParameters(TickTime inLayerTime, const ML::CutlistRenderParams&,
                                       ML::MotionRecord& ioRecord) const override
    {
        mAskedTimes.push_back(inLayerTime);
        if (const auto found = mMotion.find(inLayerTime); found != mMotion.end())
            ioRecord = found->second;
        return QRT::kResult_Success;
    }

    QRT::InterfaceRef<vrtest::TestProducer> mProducer =
        QRT::Allocated<vrtest::TestProducer>::CreateInstance();
    std::map<TickTime, ML::MotionRecord> mMotion;
    mutable std::vector<TickTime> mAskedTimes;

protected:
    ~LayerNode() = default;
};

// A sealed layer whose frames are the request's size and format, filled with inColor.
QRT::InterfaceRef<LayerNode> MakeLayer(const Bgra& inColor,
                                       std::map<TickTime, ML::MotionRecord> inMotion = {})
{
    auto node = QRT::Allocated<LayerNode>::CreateInstance();
    node->mProducer->mFormat = mvxmediatypes::kPixelFormat_Invalid;
    node->mProducer->mWidth = 0;
    node->mProducer->mPaint = [inColor](MF::IVideoFrame& ioFrame)
    { vrtest::Fill(ioFrame, inColor); };
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

QRT::InterfaceRef<ML::IRenderableNodeProducer> ProducerOf(const NodeRef& inNode,
                                                          const ML::CutlistRenderParams& inParams)
{
    QRT::InterfaceRef<ML::IRenderableNodeProducer> producer;
    QRT::QueryRef<ML::IRenderableNodeProducerProvider>(inNode)->GetProducer(
        producer, inParams.GetFrameTime(), inParams);
    return producer;
}

FrameRef Render(const NodeRef& inNode, const ML::CutlistRenderParams& inParams)
{
    FrameRef frame;
    EXPECT_EQ(ProducerOf(inNode, inParams)->ProduceFrame(inParams.GetFrameTime(), inParams, frame),
              QRT::kResult_Success);
    return frame;
}

QRT::Guid HashOf(const NodeRef& inNode, const ML::CutlistRenderParams& inParams)
{
    QRT::Guid hash;
    ProducerOf(inNode, inParams)->GetFrameHash(hash, inParams.GetFrameTime(), inParams);
    return hash;
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

ML::MotionRecord Moved(float inPositionX, float inScale)
{
    ML::MotionRecord record;
    record.mPositionX = inPositionX;
    record.mScaleX = record.mScaleY = inScale;
    return record;
}

class CompositorTest : public ::testing::Test
{
protected:
    void SetUp() override { VF::SharedVideoFrameCache::Clear(); }
    void TearDown() override { VF::SharedVideoFrameCache::Clear(); }

    ML::CutlistRenderParams mParams = vrtest::MakeParams(8, 4);
};

TEST(MotionRecordTest, FieldOffsetsAndWhichFieldsEachComparisonReads)
{
    using R = ML::MotionRecord;
    // Per field: its offset, and whether SameGeometry and SameMotion still hold
    // when only that field differs from the identity.
    const struct
    {
        std::size_t mOffset, mExpected;
        bool mSameGeometry, mSameMotion;
    } fields[] = {
        {offsetof(R, mAnchorX), 0, false, false},
        {offsetof(R, mAnchorY), 4, false, false},
        {offsetof(R, mPositionX), 8, false, false},
        {offsetof(R, mPositionY), 12, false, false},
        {offsetof(R, mScaleX), 16, false, false},
        {offsetof(R, mScaleY), 20, false, false},
        {offsetof(R, mRotation), 24, false, false},
        {offsetof(R, mReserved1), 32, false, false},
        {offsetof(R, mReserved2), 36, true, true},
        {offsetof(R, mReserved3), 40, false, false},
        {offsetof(R, mMediaPixelAspect), 48, true, true},
        {offsetof(R, mMediaWidth), 52, false, false},
        {offsetof(R, mMediaHeight), 56, false, false},
        {offsetof(R, mReserved4), 60, true, true},
        {offsetof(R, mBlendMode), 64, true, false},
        {offsetof(R, mOpacity), 68, true, false},
    };
    EXPECT_EQ(sizeof(R), 72u);
    EXPECT_EQ(ML::kIdentityMotionRecord.mBlendMode, 18u);
    for (const auto& field : fields)
    {
        SCOPED_TRACE(field.mExpected);
        EXPECT_EQ(field.mOffset, field.mExpected);
        R record;
        reinterpret_cast<unsigned char*>(&record)[field.mOffset + 3] ^= 0x08;
        EXPECT_EQ(ML::SameGeometry(record, ML::kIdentityMotionRecord), field.mSameGeometry);
        EXPECT_EQ(ML::SameMotion(record, ML::kIdentityMotionRecord), field.mSameMotion);
    }
}

TEST_F(CompositorTest, FlagsAreTheInputsAndWithoutInputsTheBlackFrameIsRendered)
{
    const struct
    {
        std::vector<std::uint32_t> mInputFlags;
        std::uint32_t mExpected;
    } cases[] = {{{}, 92}, {{255}, 92}, {{92 | 1, 84}, 84}, {{84 | 8, 1}, 0}};
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
    EXPECT_EQ(empty->GetNodeType().Compare(
                  QRT::ImmutableString::CreateStatic("RenderableNodeCompositorImpl")),
              0);
    EXPECT_EQ(Render(empty, mParams), ML::CutlistRenderer::GetBlackFrame(mParams));
    EXPECT_EQ(HashOf(empty, mParams), ML::CutlistRenderer::GetBlackFrameHash(mParams));
}

TEST_F(CompositorTest, TopLayerIsDrawnThroughItsMotionOntoTheBottomAndHashedInOrder)
{
    mParams.SetFrameTime(MF::FrameTime(Ticks(100)));
    const auto top = MakeLayer(kBlue, {{Ticks(90), Moved(0.5f, 0.5f)}});
    const NodeRef bottom = ML::CreateSolidColorNode(kRedColor);
    const NodeRef compositor = MakeCompositor({{bottom}, {NodeRef(top.Get()), 10, 1}});
    EXPECT_EQ(Letters(Render(compositor, mParams)), "RRRRRRRR|RRBBBBRR|RRBBBBRR|RRRRRRRR");
    // Asked once per field, in the layer's own time.
    EXPECT_EQ(top->mAskedTimes, (std::vector<TickTime>{Ticks(90), Ticks(90)}));

    // The exact runs: each layer's two records and frame hash, then the node
    // hash and the request.
    const auto recordBytes = [](const ML::MotionRecord& inRecord)
    { return std::string(reinterpret_cast<const char*>(&inRecord), sizeof(inRecord)); };
    QRT::Guid bottomHash;
    ProducerOf(bottom, mParams)->GetFrameHash(bottomHash, mParams.GetFrameTime(), mParams);
    const ML::MotionRecord identity;
    const ML::MotionRecord moved = Moved(0.5f, 0.5f);
    EXPECT_EQ(HashOf(compositor, mParams),
              graphtest::HashOfRuns(
                  {"RenderableNodeCompositorProducer", recordBytes(identity), recordBytes(identity),
                   graphtest::BytesOf(bottomHash), recordBytes(moved), recordBytes(moved),
                   graphtest::BytesOf(top->mProducer->mHash),
                   graphtest::BytesOf(compositor->GetNodeHash()),
                   graphtest::BytesOf(mParams.mPixelAspectRatio),
                   graphtest::BytesOf(mParams.mWidth), graphtest::BytesOf(mParams.mHeight),
                   graphtest::BytesOf(mParams.mQuality), graphtest::BytesOf(mParams.mSingleField),
                   graphtest::BytesOf(mParams.mSecondaryQuality),
                   graphtest::BytesOf(mParams.mPixelFormat)}));
    EXPECT_EQ(top->mProducer->LastHashTime(), MF::FrameTime(Ticks(90)));
    const NodeRef swapped = MakeCompositor({{NodeRef(top.Get()), 10, 0}, {bottom, 0, 1}});
    EXPECT_NE(HashOf(swapped, mParams), HashOf(compositor, mParams));
    EXPECT_EQ(Letters(Render(swapped, mParams)), "RRRRRRRR|RRRRRRRR|RRRRRRRR|RRRRRRRR");
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
    } cases[] = {{-1, 'B'}, {0, 'R'}, {1, 'R'}, {2, 'B'}};
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

TEST_F(CompositorTest, ConformingIdentityLayerPassesThroughAndEmptyContentKeepsTheLower)
{
    const auto layer = MakeLayer(kBlue);
    const MF::IVideoFrame* painted = nullptr;
    layer->mProducer->mPaint = [&](MF::IVideoFrame& ioFrame) { painted = &ioFrame; };
    EXPECT_EQ(Render(MakeCompositor({{NodeRef(layer.Get())}}), mParams).Get(), painted);
    // A faded layer alone keeps its opacity (over nothing, its alpha is halved).
    ML::MotionRecord half;
    half.mOpacity = 0.5f;
    const auto alone = MakeLayer(kBlue, {{mParams.GetFirstFieldTime(), half}});
    const FrameRef halved = Render(MakeCompositor({{NodeRef(alone.Get())}}), mParams);
    EXPECT_NEAR(PixelAt(*halved, 3, 2)[3], 128, 1);

    const FrameRef frame = vrtest::MakeFrame(8, 4);
    EXPECT_EQ(ML::ApplyMotion(frame, ML::kIdentityMotionRecord, ML::kIdentityMotionRecord, mParams),
              frame);
    // Opacity and blend mode do not count for a layer alone; geometry and size do.
    ML::MotionRecord faded;
    faded.mOpacity = 0.5f;
    EXPECT_EQ(ML::ApplyMotion(frame, faded, faded, mParams), frame);
    EXPECT_NE(ML::ApplyMotion(frame, Moved(0.4f, 1.0f), Moved(0.4f, 1.0f), mParams), frame);
    const FrameRef small = ML::ApplyMotion(vrtest::MakeFrame(4, 4), ML::kIdentityMotionRecord,
                                           ML::kIdentityMotionRecord, mParams);
    EXPECT_EQ(small->GetBounds(), QRT::ParamRect(0, 0, 8, 4));

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

TEST_F(CompositorTest, EveryBlendModeDrawsInPlaceAsTheBlendKernel)
{
    // Half-transparent gradients, so that every mode gives its own picture.
    const auto gradient = [](std::uint8_t inSeed)
    {
        FrameRef frame = vrtest::MakeFrame(8, 4);
        auto* base = static_cast<std::uint8_t*>(frame->GetWritableBaseAddress());
        for (std::int32_t y = 0; y < 4; ++y)
            for (std::int32_t x = 0; x < 32; ++x)
                base[y * frame->GetRowBytes() + x] =
                    static_cast<std::uint8_t>(inSeed + 29 * x + 53 * y) | ((x % 4 == 3) ? 0x80 : 0);
        return frame;
    };
    const FrameRef upper = gradient(7);
    ML::MotionRecord record = Moved(0.45f, 0.75f);
    record.mOpacity = 0.75f;
    for (const std::uint32_t mode : {1u, 2u, 5u, 6u, 9u, 11u, 15u, 17u, 18u})
    {
        SCOPED_TRACE(mode);
        record.mBlendMode = mode;
        const FrameRef lower = gradient(100);
        const FrameRef expected = gradient(100);
        IR_AffineMatrix matrix;
        IR_BuildMotionMatrix(ML::ToMotionGeometry(record), 8, 4, 8, 4, &matrix);
        ASSERT_EQ(IR_MotionWithBlendMode(
                      upper->GetBaseAddress(), upper->GetRowBytes(), kIR_PixelFormat_BGRA_8u, 8, 4,
                      expected->GetWritableBaseAddress(), expected->GetRowBytes(),
                      kIR_PixelFormat_BGRA_8u, 8, 4, &matrix, 0.75f, 0, kIR_Field_All, true, mode),
                  kIR_NoError);
        const FrameRef result = ML::CompositeLayer(upper, record, record, lower, mParams);
        ASSERT_EQ(result, lower);
        for (std::int32_t y = 0; y < 4; ++y)
            EXPECT_TRUE(std::equal(PixelAt(*result, 0, y), PixelAt(*result, 8, y),
                                   PixelAt(*expected, 0, y)))
                << "row " << y;
    }
}

TEST_F(CompositorTest, DifferentFieldMotionIsDrawnInTwoFieldPassesAndOneFieldIsKept)
{
    // Field 1 at tick 0 moves the half-size layer left, field 2 at tick 10 right.
    mParams.SetFrameTime(MF::FrameTime(Ticks(0), Ticks(10)));
    mParams.mFieldType = mvxmediatypes::kFieldType_UpperFirst;
    const auto top =
        MakeLayer(kBlue, {{Ticks(0), Moved(0.25f, 0.5f)}, {Ticks(10), Moved(0.75f, 0.5f)}});
    const NodeRef compositor =
        MakeCompositor({{ML::CreateSolidColorNode(kRedColor)}, {NodeRef(top.Get())}});
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
}

TEST_F(CompositorTest, QualityFiveCompositesInLinearFloatWithinOneCodeOfQualityFour)
{
    const auto top = MakeLayer(kBlue, {{Ticks(0), Moved(0.5f, 0.5f)}});
    const NodeRef compositor =
        MakeCompositor({{ML::CreateSolidColorNode(0xFF406080u)}, {NodeRef(top.Get())}});
    mParams.mQuality = 4;
    const FrameRef four = Render(compositor, mParams);
    mParams.mQuality = 5;
    const FrameRef five = Render(compositor, mParams);
    ASSERT_TRUE(four && five);
    EXPECT_EQ(five->GetPixelFormat(), mvxmediatypes::kPixelFormat_BGRP_4444_32f_Linear);
    const FrameRef delivered = ML::CutlistRenderer::ConformFrameToOutput(
        five, mParams, mvxmediatypes::kPixelFormat_BGRA_4444_8u,
        {mvxmediatypes::kPixelFormat_BGRA_4444_8u});
    int largest = 0;
    for (std::int32_t y = 0; y < 4; ++y)
        for (std::int32_t x = 0; x < 32; ++x)
            largest =
                std::max(largest, std::abs(PixelAt(*delivered, 0, y)[x] - PixelAt(*four, 0, y)[x]));
    EXPECT_LE(largest, 1);
    EXPECT_EQ(Letters(four).substr(9, 8), "??BBBB??");
}

TEST_F(CompositorTest, FailingLayerAbortsWithItsStatus)
{
    const auto failing = MakeLayer(kBlue);
    failing->mProducer->mFailure = vrtest::ProducerFailure::kStatus;
    const auto above = MakeLayer(kRed);
    const NodeRef compositor = MakeCompositor(
        {{ML::CreateSolidColorNode(kRedColor)}, {NodeRef(failing.Get())}, {NodeRef(above.Get())}});
    FrameRef frame;
    EXPECT_EQ(ProducerOf(compositor, mParams)->ProduceFrame(mParams.GetFrameTime(), mParams, frame),
              failing->mProducer->mFailureStatus);
    EXPECT_FALSE(frame);
    EXPECT_EQ(above->mProducer->mProduceCount.load(), 0);
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
    EXPECT_INPUT_CONTRACT(ML::CompositeFrameAtOffset(source, {}, 0, 0),
                          "inDestinationFrame != NULL");
}

} // namespace
