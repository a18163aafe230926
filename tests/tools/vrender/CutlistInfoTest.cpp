#include "CutlistInfo.h"

#include "ML/IMutableCutlist.h"
#include "ML/RenderableNodes.h"

#include <string>

#include <gtest/gtest.h>

namespace
{

namespace mt = mvxmediatypes;

class CutlistInfoTest : public ::testing::Test
{
protected:
    static mt::TickTime Seconds(std::int64_t inSeconds)
    {
        return mt::TickTime::TicksToTime(inSeconds * mt::kTicksPerSecond);
    }
};

TEST_F(CutlistInfoTest, TimesAndFlags)
{
    EXPECT_EQ(vrender::FormatTime(mt::kTime_Zero), "0.000 s");
    EXPECT_EQ(vrender::FormatTime(mt::TickTime::TicksToTime(mt::kTicksPerSecond * 3 / 2)),
              "1.500 s");
    EXPECT_EQ(vrender::FormatTime(mt::kTime_Max), "end");
    EXPECT_EQ(vrender::FormatTime(mt::kTime_Min), "start");
    EXPECT_EQ(vrender::FormatRenderFlags(0), "0x00000000");
    EXPECT_EQ(vrender::FormatRenderFlags(0x59),
              "0x00000059 (Opaque, TimeInvariant, 16, NoLayerInputs)");
    EXPECT_EQ(vrender::FormatRenderFlags(0x84), "0x00000084 (4, 128)");
}

TEST_F(CutlistInfoTest, ExampleCutlistIsPrintedSegmentsThenTrees)
{
    const auto cutlist = vrender::CreateExampleCutlist();
    ASSERT_EQ(cutlist->GetSegmentCount(), 3u);
    QRT::Guid hashes[3];
    for (std::size_t i = 0; i < 3; ++i)
    {
        mt::TickTime start;
        mt::TickTime end;
        mt::TickTime offset;
        ASSERT_EQ(cutlist->GetSegment(i, start, end, offset, hashes[i]), QRT::kResult_Success);
    }
    QRT::InterfaceRef<MF::IRenderableNode> disabled;
    ASSERT_EQ(cutlist->GetNodeByHash(hashes[1], disabled), QRT::kResult_Success);
    mt::TickTime inputOffset;
    QRT::InterfaceRef<MF::IRenderableNode> green;
    ASSERT_EQ(disabled->GetInput(0, inputOffset, green), QRT::kResult_Success);

    const std::string expected =
        "Cutlist \"Example\" " + cutlist->GetCutlistHash().ToString() + "\n" +
        "3 segments:\n"
        "  [0] 0.000 s to 2.000 s, offset 0.000 s, node " +
        hashes[0].ToString() + "\n" + "  [1] 2.000 s to 4.000 s, offset 0.000 s, node " +
        hashes[1].ToString() + "\n" + "  [2] 4.000 s to 6.000 s, offset 1.000 s, node " +
        hashes[2].ToString() + "\n" +
        "Node trees:\n"
        "  RenderableNodeSolidColorImpl " +
        hashes[0].ToString() + "\n" +
        "    flags 0x00000000\n"
        "    properties:\n"
        "      SolidColorNode::Color = \"4294901760\"\n"
        "    inputs: none\n"
        "    operators: none\n"
        "  RenderableNodeDisabledImpl " +
        hashes[1].ToString() + "\n" +
        "    flags 0x00000000\n"
        "    properties: none\n"
        "    input 0 at 1.000 s:\n"
        "      RenderableNodeSolidColorImpl " +
        green->GetNodeHash().ToString() + "\n" +
        "        flags 0x00000000\n"
        "        properties:\n"
        "          SolidColorNode::Color = \"4278255360\"\n"
        "        inputs: none\n"
        "        operators: none\n"
        "    operators: none\n"
        "  RenderableNodeSolidColorImpl " +
        hashes[2].ToString() + "\n" +
        "    flags 0x00000000\n"
        "    properties:\n"
        "      SolidColorNode::Color = \"4278190335\"\n"
        "    inputs: none\n"
        "    operators: none\n";
    EXPECT_EQ(vrender::DescribeCutlist(*cutlist), expected);
}

TEST_F(CutlistInfoTest, ATreeUsedByTwoSegmentsIsPrintedOnce)
{
    const auto red = ML::CreateSolidColorNode(0xFFFF0000u);
    auto cutlist = ML::CreateMutableCutlist(QRT::ImmutableString::CreateStatic("Twice"));
    cutlist->AddSegment(mt::kTime_Zero, Seconds(1), mt::kTime_Zero, red);
    cutlist->AddSegment(Seconds(5), Seconds(6), Seconds(3), red);
    cutlist->MakeImmutable();
    const std::string text = vrender::DescribeCutlist(*cutlist);
    EXPECT_NE(text.find("2 segments:\n"), std::string::npos) << text;
    const std::string header = "  RenderableNodeSolidColorImpl " + red->GetNodeHash().ToString();
    const std::size_t first = text.find(header);
    ASSERT_NE(first, std::string::npos) << text;
    EXPECT_EQ(text.find(header, first + 1), std::string::npos) << text;
}

TEST_F(CutlistInfoTest, EmptyCutlist)
{
    auto cutlist = ML::CreateMutableCutlist(QRT::ImmutableString::CreateStatic("Empty"));
    cutlist->MakeImmutable();
    EXPECT_EQ(vrender::DescribeCutlist(*cutlist), "Cutlist \"Empty\" " +
                                                      cutlist->GetCutlistHash().ToString() +
                                                      "\n0 segments:\nNode trees:\n");
}

} // namespace
