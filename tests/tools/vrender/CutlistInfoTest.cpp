// `vrender info`: times, flags and the printed form of a cutlist.

#include "CutlistInfo.h"

#include "ML/IMutableCutlist.h"
#include "ML/RenderableNodes.h"

#include <string>

#include <gtest/gtest.h>

namespace
{

namespace mt = mvxmediatypes;

// The printed tree of a solid-colour node, inIndent spaces in.
std::string SolidTree(std::size_t inIndent, const QRT::Guid& inHash, const std::string& inColor)
{
    const std::string pad(inIndent, ' ');
    return pad + "RenderableNodeSolidColorImpl " + inHash.ToString() + "\n" + pad +
           "  flags 0x00000000\n" + pad + "  properties:\n" + pad +
           "    SolidColorNode::Color = " + inColor + "\n" + pad + "  inputs: none\n" + pad +
           "  operators: none\n";
}

using CutlistInfoTest = ::testing::Test;

TEST_F(CutlistInfoTest, TimesAndFlags)
{
    EXPECT_EQ(vrender::FormatTime(mt::kTime_Max), "end");
    EXPECT_EQ(vrender::FormatTime(mt::kTime_Min), "start");
    EXPECT_EQ(vrender::FormatRenderFlags(0), "0x00000000");
    EXPECT_EQ(vrender::FormatRenderFlags(0x59),
              "0x00000059 (Opaque, TimeInvariant, 16, NoLayerInputs)");
    EXPECT_EQ(vrender::FormatRenderFlags(0x84), "0x00000084 (4, 128)");
    EXPECT_EQ(vrender::FormatColor(0x80336699u), "0x80336699");
    EXPECT_EQ(vrender::FormatColor(0x0000000Au), "0x0000000A");
}

TEST_F(CutlistInfoTest, ExampleCutlistIsPrintedSegmentsThenTrees)
{
    const auto cutlist = vrender::CreateExampleCutlist();
    ASSERT_EQ(cutlist->GetSegmentCount(), 3u);
    QRT::Guid hashes[3];
    for (std::size_t i = 0; i < 3; ++i)
    {
        mt::TickTime start, end, offset;
        ASSERT_EQ(cutlist->GetSegment(i, start, end, offset, hashes[i]), QRT::kResult_Success);
    }
    QRT::InterfaceRef<MF::IRenderableNode> disabled;
    ASSERT_EQ(cutlist->GetNodeByHash(hashes[1], disabled), QRT::kResult_Success);
    mt::TickTime inputOffset;
    QRT::InterfaceRef<MF::IRenderableNode> green;
    ASSERT_EQ(disabled->GetInput(0, inputOffset, green), QRT::kResult_Success);

    EXPECT_EQ(vrender::DescribeCutlist(*cutlist),
              "Cutlist \"Example\" " + cutlist->GetCutlistHash().ToString() +
                  "\n3 segments:\n  [0] 0.000 s to 2.000 s, offset 0.000 s, node " +
                  hashes[0].ToString() + "\n  [1] 2.000 s to 4.000 s, offset 0.000 s, node " +
                  hashes[1].ToString() + "\n  [2] 4.000 s to 6.000 s, offset 1.000 s, node " +
                  hashes[2].ToString() + "\nNode trees:\n" + SolidTree(2, hashes[0], "0xFFFF0000") +
                  "  RenderableNodeDisabledImpl " + hashes[1].ToString() +
                  "\n    flags 0x00000000\n    properties: none\n    input 0 at 1.000 s:\n" +
                  SolidTree(6, green->GetNodeHash(), "0xFF00FF00") + "    operators: none\n" +
                  SolidTree(2, hashes[2], "0xFF0000FF"));
}

TEST_F(CutlistInfoTest, ATreeUsedByTwoSegmentsIsPrintedOnceAndAnEmptyCutlistHasNone)
{
    const auto red = ML::CreateSolidColorNode(0xFFFF0000u);
    auto cutlist = ML::CreateMutableCutlist(QRT::ImmutableString::CreateStatic("Twice"));
    const auto seconds = [](int inSeconds)
    { return mt::TickTime::TicksToTime(inSeconds * mt::kTicksPerSecond); };
    cutlist->AddSegment(seconds(0), seconds(1), seconds(0), red);
    cutlist->AddSegment(seconds(5), seconds(6), seconds(3), red);
    cutlist->MakeImmutable();
    const std::string text = vrender::DescribeCutlist(*cutlist);
    EXPECT_NE(text.find("2 segments:\n"), std::string::npos) << text;
    const std::string tree = SolidTree(2, red->GetNodeHash(), "0xFFFF0000");
    const std::size_t first = text.find(tree);
    ASSERT_NE(first, std::string::npos) << text;
    EXPECT_EQ(text.find(tree, first + 1), std::string::npos) << text;
}

} // namespace
