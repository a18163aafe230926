// The transition node: its keys and flags, its producer's inputs, frame hash
// (re-computed here from its byte runs) and pixels.

#include "TX/TransitionCatalogue.h"
#include "TestFrames.h"
#include "TestNode.h"
#include "TestNodeKinds.h"
#include "TestProducer.h"
#include "graph/RenderableNodeTransitionImpl.h"

#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace graphtest
{
namespace
{

namespace mt = mvxmediatypes;
using ProducerRef = QRT::InterfaceRef<ML::IRenderableNodeProducer>;

const TickTime kDuration = Ticks(1000);

QRT::InterfaceRef<TX::ITransition>
Transition(const std::string& inMatch = "TX.CrossDissolve",
           const std::map<std::string, std::string>& inParams = {})
{
    BE::TransitionSettings settings;
    settings.mMatchName = inMatch;
    settings.mStart = Ticks(0);
    settings.mEnd = kDuration;
    settings.mParams = inParams;
    return TX::CreateTransition(settings).mTransition;
}

NodeRef Node(const NodeRef& inA, std::int64_t inOffsetA, const NodeRef& inB, std::int64_t inOffsetB,
             const QRT::InterfaceRef<TX::ITransition>& inTransition)
{
    ML::TransitionNodeSetup setup;
    setup.mTransition = inTransition;
    setup.mOutgoing = inA;
    setup.mOutgoingOffset = Ticks(inOffsetA);
    setup.mIncoming = inB;
    setup.mIncomingOffset = Ticks(inOffsetB);
    return ML::CreateTransitionNode(setup);
}

ML::CutlistRenderParams At(std::int64_t inTicks)
{
    return vrtest::MakeParams(8, 4, MF::FrameTime(Ticks(inTicks), Ticks(inTicks)));
}

ProducerRef ProducerOf(const NodeRef& inNode, const ML::CutlistRenderParams& inParams)
{
    ProducerRef producer;
    QRT::InterfaceRef<ML::IRenderableNodeProducerProvider>(inNode)->GetProducer(
        producer, inParams.GetFrameTime(), inParams);
    return producer;
}

QRT::Guid HashAt(const NodeRef& inNode, std::int64_t inTicks)
{
    QRT::Guid hash;
    const ML::CutlistRenderParams params = At(inTicks);
    ProducerOf(inNode, params)->GetFrameHash(hash, params.GetFrameTime(), params);
    return hash;
}

std::string Property(const NodeRef& inNode, const char* inKey)
{
    MF::RenderablePropertyValue value;
    inNode->GetProperty(QRT::ImmutableString::CreateStatic(inKey), value);
    return value;
}

TEST(TransitionNodeTest, FlagsAreTheNonEmptyInputsAndWith68)
{
    struct Case
    {
        std::vector<int> mFlags; // -1: an empty input
        std::uint32_t mExpected;
    };
    const Case cases[] = {
        {{-1, -1}, 68}, {{20, -1}, 4}, {{-1, 64}, 64}, {{68, 64}, 64}, {{1 + 8 + 16, 68}, 0}};
    for (const Case& c : cases)
    {
        SCOPED_TRACE(std::to_string(c.mExpected));
        NodeRef inputs[2];
        for (int i = 0; i < 2; ++i)
            if (c.mFlags[i] >= 0)
                inputs[i] = MakeLeaf("Leaf", std::uint32_t(c.mFlags[i]));
        const NodeRef node = Node(inputs[0], 0, inputs[1], 0, Transition());
        EXPECT_EQ(node->GetRenderFlags(), c.mExpected);
        EXPECT_EQ(node->GetInputCount(), 2u);
    }
}

TEST(TransitionNodeTest, KeysCarryTheSettingsAndTheInstanceLeavesTheHashAlone)
{
    const std::map<std::string, std::string> params = {{"direction", "bottom"},
                                                       {"border", "2.5"},
                                                       {"borderColor", "#FF102030"},
                                                       {"start", "10"},
                                                       {"centre", "0.25,1"}};
    const auto wipe = Transition("TX.Wipe", params);
    const NodeRef node = Node(MakeLeaf("A"), -500, MakeLeaf("B"), 200, wipe);
    EXPECT_EQ(Property(node, "TransitionNode::TransitionMatchName"), "TX.Wipe");
    EXPECT_EQ(Property(node, "TransitionNode::TransitionDirection"), "3");
    EXPECT_EQ(Property(node, "TransitionNode::TransitionBorderWidth"), "2.5");
    EXPECT_EQ(Property(node, "TransitionNode::TransitionBorderColor"), "4279246896");
    EXPECT_EQ(Property(node, "TransitionNode::TransitionStartPercent"), "10");
    EXPECT_EQ(Property(node, "TransitionNode::TransitionCenterPosition"), "0.25,1");
    EXPECT_EQ(Property(node, "TransitionNode::TransitionDuration"), "1000");
    EXPECT_EQ(Property(node, "TransitionNode::TransitionReverse"), "0");
    EXPECT_EQ(Property(node, "TransitionNode::TransitionOpaqueData"),
              "736f66746e6573733d30"); // "softness=0"
    EXPECT_EQ(Property(node, "TransitionNode::RuntimeInstanceID"),
              std::to_string(wipe->GetParameters().mInstanceNumber));

    // Another object of the same settings: another instance, the same hash.
    const auto again = Transition("TX.Wipe", params);
    EXPECT_NE(again->GetParameters().mInstanceNumber, wipe->GetParameters().mInstanceNumber);
    EXPECT_EQ(Node(MakeLeaf("A"), -500, MakeLeaf("B"), 200, again)->GetNodeHash(),
              node->GetNodeHash());
    EXPECT_NE(Node(MakeLeaf("A"), -400, MakeLeaf("B"), 200, again)->GetNodeHash(),
              node->GetNodeHash());
}

// Each input is asked at the node's time minus its offset, and the frame
// hash is exactly the documented runs; an input that renders nothing (empty,
// or a node without a producer) mixes the nil hash.
TEST(TransitionNodeTest, FrameHashMixesEachInputAtItsTimeAndTheRequest)
{
    auto a = QRT::Allocated<vrtest::TestProducer>::CreateInstance();
    auto b = QRT::Allocated<vrtest::TestProducer>::CreateInstance();
    b->mHash = QRT::Guid("{99999999-8888-7777-6666-555555555555}");
    const NodeRef nothing = Seal(MakeMutable<ScriptedProviderNode>("Nothing", 0u));
    struct Case
    {
        NodeRef mIncoming;
        bool mIncomingRenders;
    };
    const Case cases[] = {
        {vrtest::NewNode(ProducerRef(b.Get())), true}, {NodeRef(), false}, {nothing, false}};
    for (const Case& c : cases)
    {
        const NodeRef node =
            Node(vrtest::NewNode(ProducerRef(a.Get())), -300, c.mIncoming, 100, Transition());
        const ML::CutlistRenderParams params = At(400);
        const QRT::Guid hash = HashAt(node, 400);
        EXPECT_EQ(a->LastHashTime().GetFirstFieldTime(), Ticks(700));
        const std::string identity(reinterpret_cast<const char*>(&ML::kIdentityMotionRecord), 64);
        ByteRuns runs{"TransitionNodeProducer", BytesOf(a->mHash), identity, identity};
        if (c.mIncomingRenders)
        {
            EXPECT_EQ(b->LastHashTime().GetFirstFieldTime(), Ticks(300));
            runs.insert(runs.end(), {BytesOf(b->mHash), identity, identity});
        }
        else
            runs.push_back(BytesOf(QRT::Guid()));
        const std::uint32_t aspect[2] = {1, 1};
        const std::int64_t time[2] = {400, 400};
        runs.insert(runs.end(),
                    {BytesOf(aspect), BytesOf(params.mWidth), BytesOf(params.mHeight),
                     BytesOf(node->GetNodeHash()), BytesOf(time), BytesOf(params.mQuality),
                     BytesOf(params.mSecondaryQuality), BytesOf(params.mPixelFormat.GetValue())});
        EXPECT_EQ(hash, HashOfRuns(runs));
    }
}

TEST(TransitionNodeTest, FrameHashChangesWithTimeOverStillInputs)
{
    auto still = QRT::Allocated<vrtest::TestProducer>::CreateInstance();
    const NodeRef node = Node(vrtest::NewNode(ProducerRef(still.Get())), 0,
                              vrtest::NewNode(ProducerRef(still.Get())), 0, Transition());
    EXPECT_NE(HashAt(node, 100), HashAt(node, 200));
    EXPECT_EQ(HashAt(node, 100), HashAt(node, 100));
}

// A transition at the end of a lone clip: half way, the clip's colour at half
// coverage; an input's failure is answered before the transition renders.
TEST(TransitionNodeTest, RendersOverAnAbsentInputAndPassesFailuresOn)
{
    auto a = QRT::Allocated<vrtest::TestProducer>::CreateInstance();
    a->mWidth = 0; // the request's size
    a->mPaint = [](MF::IVideoFrame& ioFrame) { vrtest::Fill(ioFrame, {40, 80, 120, 255}); };
    const NodeRef node = Node(vrtest::NewNode(ProducerRef(a.Get())), -300, {}, 0, Transition());
    const ML::CutlistRenderParams params = At(500);
    QRT::InterfaceRef<MF::IVideoFrame> frame;
    ASSERT_EQ(ProducerOf(node, params)->ProduceFrame(params.GetFrameTime(), params, frame),
              QRT::kResult_Success);
    EXPECT_TRUE(vrtest::IsFilledWith(frame, {40, 80, 120, 128}));

    a->mFailure = vrtest::ProducerFailure::kStatus;
    EXPECT_EQ(ProducerOf(node, params)->ProduceFrame(params.GetFrameTime(), params, frame),
              a->mFailureStatus);
}

// Fixed mode: the caller's two frames are dissolved (the producers are never
// asked) and each frame hash is new, even for the same request.
TEST(TransitionNodeTest, FixedModeRendersTheSuppliedFramesUnderAFreshHash)
{
    auto unused = QRT::Allocated<vrtest::TestProducer>::CreateInstance();
    unused->mFailure = vrtest::ProducerFailure::kStatus;
    ML::TransitionProducerSetup setup;
    setup.mTransition = Transition();
    setup.mParameters = setup.mTransition->GetParameters();
    setup.mFixed = true;
    const std::uint8_t colours[2] = {40, 200};
    for (std::size_t i = 0; i < 2; ++i)
    {
        setup.mSides[i].mProducer = ProducerRef(unused.Get());
        setup.mSides[i].mFixedFrame = vrtest::MakeFrame(8, 4);
        vrtest::Fill(*setup.mSides[i].mFixedFrame, {colours[i], colours[i], colours[i], 255});
    }
    const ProducerRef producer = ML::CreateTransitionNodeProducer(setup);
    const ML::CutlistRenderParams params = At(250);
    QRT::InterfaceRef<MF::IVideoFrame> frame;
    ASSERT_EQ(producer->ProduceFrame(params.GetFrameTime(), params, frame), QRT::kResult_Success);
    EXPECT_TRUE(vrtest::IsFilledWith(frame, {80, 80, 80, 255}));
    QRT::Guid first, second;
    producer->GetFrameHash(first, params.GetFrameTime(), params);
    producer->GetFrameHash(second, params.GetFrameTime(), params);
    EXPECT_NE(first, second);
    EXPECT_EQ(unused->LastHashTime(), MF::FrameTime());
}

} // namespace
} // namespace graphtest
