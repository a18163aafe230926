// The multicam node: its keys and flags, the picture of the selected angle
// or of the outlined grid of every angle, the non-multicam picture, and the
// exact frame hash, which follows the selected track.

#include "ML/RenderableNodes.h"
#include "TestFrames.h"
#include "TestNodeKinds.h"
#include "VF/MulticamRender.h"
#include "graph/RenderableNodeMulticamImpl.h"

#include <gtest/gtest.h>

namespace graphtest
{
namespace
{

using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;
using ProducerRef = QRT::InterfaceRef<ML::IRenderableNodeProducer>;

constexpr std::uint32_t kColors[] = {0xFF102030u, 0xFF405060u, 0xFF708090u, 0xFFA0B0C0u};

NodeRef Multicam(std::size_t inAngles, std::uint64_t inSelected, bool inShowProgram = false,
                 bool inRecording = false, bool inIsNonMultiCam = false)
{
    ML::MulticamNodeSetup setup;
    for (std::size_t i = 0; i < inAngles; ++i)
        setup.mAngles.push_back(ML::CreateSolidColorNode(kColors[i]));
    setup.mSelectedTrack = inSelected;
    setup.mShowProgram = inShowProgram;
    setup.mRecording = inRecording;
    setup.mIsNonMultiCam = inIsNonMultiCam;
    return ML::CreateMulticamNode(setup);
}

const ML::CutlistRenderParams kParams = vrtest::MakeParams(36, 36);

ProducerRef ProducerOf(const NodeRef& inNode)
{
    ProducerRef producer;
    QRT::InterfaceRef<ML::IRenderableNodeProducerProvider>(inNode)->GetProducer(
        producer, kParams.GetFrameTime(), kParams);
    return producer;
}

QRT::Guid FrameHashOf(const NodeRef& inNode)
{
    QRT::Guid hash;
    ProducerOf(inNode)->GetFrameHash(hash, kParams.GetFrameTime(), kParams);
    return hash;
}

std::string Property(const NodeRef& inNode, const char* inKey)
{
    MF::RenderablePropertyValue value;
    inNode->GetProperty(QRT::ImmutableString::CreateStatic(inKey), value);
    return value;
}

std::uint32_t PixelAt(const FrameRef& inFrame, int inX, int inY)
{
    const auto* p = static_cast<const std::uint8_t*>(inFrame->GetBaseAddress()) +
                    inY * inFrame->GetRowBytes() + 4 * inX;
    return std::uint32_t(p[3]) << 24 | std::uint32_t(p[2]) << 16 | std::uint32_t(p[1]) << 8 | p[0];
}

TEST(MulticamNodeTest, KeysAndFlagsFollowTheKindOfNode)
{
    const NodeRef multicam = Multicam(2, 1, true, true);
    EXPECT_EQ(multicam->GetNodeType().ToStringView(), "RenderableNodeMulticamImpl");
    EXPECT_EQ(multicam->GetRenderFlags(), 0u);
    EXPECT_EQ(multicam->GetInputCount(), 2u);
    EXPECT_EQ(Property(multicam, "MulticamNode::SelectedTrack"), "1");
    EXPECT_EQ(Property(multicam, "MulticamNode::ShowProgram"), "1");
    EXPECT_EQ(Property(multicam, "MulticamNode::Recording"), "1");
    EXPECT_EQ(Property(multicam, "MulticamNode::IsNonMultiCam"), "0");
    const NodeRef plain = Multicam(2, 1, false, true, true);
    EXPECT_EQ(Property(plain, "MulticamNode::IsNonMultiCam"), "1");
    EXPECT_EQ(Property(plain, "MulticamNode::ShowProgram"), "0");
    EXPECT_EQ(Property(plain, "MulticamNode::SelectedTrack"), "");
    EXPECT_EQ(Property(plain, "MulticamNode::Recording"), "");
}

TEST(MulticamNodeTest, ThePictureIsTheSelectedAngleOrTheGridOfEveryAngle)
{
    struct Probe
    {
        int mX, mY;
        std::uint32_t mColor;
    };
    struct Case
    {
        const char* mName;
        NodeRef mNode;
        std::vector<Probe> mProbes;
    };
    // Grid cells are 18x18; the selected bottom-right one is outlined.
    const Case cases[] = {
        {"angle 0", Multicam(3, 0), {{0, 0, kColors[0]}, {35, 35, kColors[0]}}},
        {"angle 2", Multicam(3, 2), {{0, 0, kColors[2]}, {35, 35, kColors[2]}}},
        {"grid",
         Multicam(4, 3, true),
         {{9, 9, kColors[0]},
          {27, 9, kColors[1]},
          {9, 27, kColors[2]},
          {27, 27, kColors[3]},
          {18, 18, VF::kMulticamOutlineColor}}},
        {"not a multicam", Multicam(3, 2, false, false, true), {{20, 20, kColors[0]}}},
    };
    for (const Case& c : cases)
    {
        SCOPED_TRACE(c.mName);
        FrameRef frame;
        ASSERT_EQ(ProducerOf(c.mNode)->ProduceFrame(kParams.GetFrameTime(), kParams, frame),
                  QRT::kResult_Success);
        ASSERT_TRUE(frame);
        ASSERT_EQ(frame->GetBounds().Width(), 36);
        for (const Probe& probe : c.mProbes)
            EXPECT_EQ(PixelAt(frame, probe.mX, probe.mY), probe.mColor)
                << probe.mX << "," << probe.mY;
    }
}

TEST(MulticamNodeTest, FrameHashMixesTheAnglesTheSelectedTrackAndTheFlags)
{
    ByteRuns runs = {"RenderableNodeMulticamImpl"};
    for (std::uint32_t color : {kColors[0], kColors[1]})
        runs.push_back(BytesOf(FrameHashOf(ML::CreateSolidColorNode(color))));
    runs.push_back(BytesOf(std::uint64_t{1}));
    const std::string flags[] = {std::string("\x01\x00\x00", 3), std::string("\x01\x00\x01", 3)};
    for (bool nonMulticam : {false, true})
    {
        ByteRuns all = runs;
        all.push_back(flags[nonMulticam]);
        EXPECT_EQ(FrameHashOf(Multicam(2, 1, true, false, nonMulticam)), HashOfRuns(all));
    }
    EXPECT_NE(FrameHashOf(Multicam(2, 0)), FrameHashOf(Multicam(2, 1)));
    EXPECT_NE(FrameHashOf(Multicam(2, 1)), FrameHashOf(Multicam(2, 1, false, true)));
}

} // namespace
} // namespace graphtest
