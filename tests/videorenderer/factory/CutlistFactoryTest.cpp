// The cutlist factory over real sequences read from timeline texts: where
// segments fall, what their trees are, which edits change which hashes, the
// other operations, and the factory's publication by the module.

#include "factory/CutlistFactory.h"

#include "BE/Sequence.h"
#include "BE/TimelineFile.h"
#include "MF/RenderableCutlistFactory.h"
#include "ML/RenderFlags.h"
#include "ML/VideoRenderer.h"
#include "QRT/Allocated.h"
#include "QRT/Exception.h"

#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace ML
{
namespace
{

using mvxmediatypes::kTime_Max;
using mvxmediatypes::kTime_Min;
using mvxmediatypes::TickTime;
using CutlistRef = QRT::InterfaceRef<MF::IRenderableCutlist>;

const mvxmediatypes::FrameRate kRate = mvxmediatypes::kFrameRate_Video25;

TickTime Frames(std::int64_t inFrames)
{
    return TickTime::FromFrame(inFrames, kRate);
}

// A 64x36 sequence at 25 frames per second of the given tracks (JSON).
BE::SequenceRef Sequence(const std::string& inTracks)
{
    const std::string text =
        R"({"sequences": [{"name": "S", "size": [64, 36], "tracks": [)" + inTracks + "]}]}";
    const BE::TimelineLoadResult loaded = BE::ParseTimeline(text, "test.json", ".");
    EXPECT_EQ(loaded.mError, "");
    return loaded.mMain;
}

std::string Item(int inStart, int inEnd, const std::string& inMore = {})
{
    return R"({"start": ")" + std::to_string(inStart) + R"(f", "end": ")" + std::to_string(inEnd) +
           R"(f", "media": {"pattern": "pattern:moving?size=64x36"})" + inMore + "}";
}

struct Segment
{
    std::int64_t mStart;
    std::int64_t mEnd;
    QRT::Guid mHash;
    std::uint32_t mLayers;
};

std::vector<Segment> Segments(const CutlistRef& inCutlist)
{
    std::vector<Segment> segments;
    for (std::size_t i = 0; i < inCutlist->GetSegmentCount(); ++i)
    {
        TickTime start, end, offset;
        Segment segment{};
        EXPECT_EQ(inCutlist->GetSegment(i, start, end, offset, segment.mHash),
                  QRT::kResult_Success);
        QRT::InterfaceRef<MF::IRenderableNode> node;
        EXPECT_EQ(inCutlist->GetNodeByHash(segment.mHash, node), QRT::kResult_Success);
        segment.mLayers = node->GetInputCount();
        const auto frames = [](TickTime inTime)
        { return inTime == kTime_Max ? -1 : inTime.ToFrame64(kRate); };
        segment.mStart = frames(start);
        segment.mEnd = frames(end);
        segments.push_back(segment);
    }
    return segments;
}

// "start-end/layers" per segment, in frames (-1 for the end of time).
std::string Describe(const std::vector<Segment>& inSegments)
{
    std::string text;
    for (const Segment& segment : inSegments)
        text += (text.empty() ? "" : " ") + std::to_string(segment.mStart) + "-" +
                std::to_string(segment.mEnd) + "/" + std::to_string(segment.mLayers);
    return text;
}

class CutlistFactoryTest : public ::testing::Test
{
protected:
    CutlistRef SequenceCutlist(const BE::SequenceRef& inSequence,
                               const MF::TickTimeRangeList& inRanges = {{kTime_Min, kTime_Max}})
    {
        CutlistRef cutlist;
        EXPECT_EQ(mFactory->CreateSequenceCutlistForRanges(
                      inSequence, inRanges, QRT::ImmutableString::CreateStatic("S"), cutlist),
                  QRT::kResult_Success);
        return cutlist;
    }

    QRT::InterfaceRef<MF::IRenderableCutlistFactory> mFactory = CreateCutlistFactory();
};

TEST_F(CutlistFactoryTest, SegmentsFallWhereTheSetOfActiveItemsChanges)
{
    struct Case
    {
        const char* mName;
        std::string mTracks;
        MF::TickTimeRangeList mRanges;
        const char* mExpected;
    };
    const MF::TickTimeRangeList all = {{kTime_Min, kTime_Max}};
    const std::vector<Case> cases = {
        {"a long clip", R"({"items": [)" + Item(0, 90000) + "]}", all, "0-90000/1"},
        {"a gap", R"({"items": [)" + Item(0, 10) + "," + Item(20, 30) + "]}", all,
         "0-10/1 20-30/1"},
        {"two overlapping clips",
         R"({"items": [)" + Item(0, 20) + R"(]}, {"items": [)" + Item(10, 30) + "]}", all,
         "0-10/1 10-20/2 20-30/1"},
        {"a range starting inside a clip",
         R"({"items": [)" + Item(0, 20) + "]}",
         {{Frames(5), kTime_Max}},
         "5-20/1"},
        {"two ranges",
         R"({"items": [)" + Item(0, 40) + "]}",
         {{Frames(5), Frames(10)}, {Frames(30), Frames(35)}},
         "5-10/1 30-35/1"},
        {"a still without an end",
         R"({"items": [{"start": 0, "end": "100f", "media": {"pattern": "pattern:bars"}}]})", all,
         "0-100/1"},
        {"no tracks", "", all, ""},
    };
    for (const Case& test : cases)
    {
        SCOPED_TRACE(test.mName);
        EXPECT_EQ(Describe(Segments(SequenceCutlist(Sequence(test.mTracks), test.mRanges))),
                  test.mExpected);
    }
}

// One track's segments as "start-end" and, for a transition, its inputs'
// offsets in frames ("-" for nothing): "0-6 6-14:T(-6,4) 14-20".
std::string DescribeTransitions(const CutlistRef& inCutlist)
{
    std::string text;
    for (const Segment& segment : Segments(inCutlist))
    {
        text += (text.empty() ? "" : " ") + std::to_string(segment.mStart) + "-" +
                std::to_string(segment.mEnd);
        QRT::InterfaceRef<MF::IRenderableNode> root, layer;
        TickTime offset;
        inCutlist->GetNodeByHash(segment.mHash, root);
        root->GetInput(0, offset, layer);
        if (layer->GetNodeType().Compare(
                QRT::ImmutableString::CreateStatic("RenderableNodeTransitionImpl")) != 0)
            continue;
        text += ":T(";
        for (std::uint32_t i = 0; i < 2; ++i)
        {
            QRT::InterfaceRef<MF::IRenderableNode> input;
            layer->GetInput(i, offset, input);
            text += (i ? "," : "") + (input ? std::to_string(offset.ToFrame64(kRate)) : "-");
        }
        text += ")";
    }
    return text;
}

std::string Transition(int inStart, int inEnd, const std::string& inMatch = "TX.CrossDissolve")
{
    return R"(, "transitions": [{"match": ")" + inMatch + R"(", "start": ")" +
           std::to_string(inStart) + R"(f", "end": ")" + std::to_string(inEnd) + R"(f"}])";
}

TEST_F(CutlistFactoryTest, TransitionsTakeTheirTrackOverTheirTime)
{
    struct Case
    {
        const char* mName;
        std::string mItems;
        const char* mExpected; // or the start of the error
    };
    const std::vector<Case> cases = {
        {"on the outgoing item", Item(0, 10, Transition(6, 14)) + "," + Item(10, 20),
         "0-6 6-14:T(-6,4) 14-20"},
        {"on the incoming item", Item(0, 10) + "," + Item(10, 20, Transition(8, 12)),
         "0-8 8-12:T(-8,2) 12-20"},
        {"at the start of a lone clip", Item(5, 15, Transition(5, 9)), "5-9:T(-,0) 9-15"},
        {"at the end, into the gap", Item(0, 10, Transition(7, 12)) + "," + Item(20, 30),
         "0-7 7-12:T(-7,-) 20-30"},
        {"over both ends of an item",
         Item(0, 10, Transition(8, 12)) + "," + Item(10, 20, Transition(16, 24)) + "," +
             Item(20, 30),
         "0-8 8-12:T(-8,2) 12-16 16-24:T(-6,4) 24-30"},
        {"unknown match", Item(0, 10, Transition(6, 10, "TX.Nope")),
         "unknown transition match name \"TX.Nope\" on item 0 of track 0"},
        {"inside the item", Item(0, 10, Transition(2, 6)),
         "transition \"TX.CrossDissolve\" on item 0 of track 0 covers neither"},
        {"beyond the incoming item", Item(0, 10, Transition(6, 25)) + "," + Item(10, 20),
         "transition \"TX.CrossDissolve\" on item 0 of track 0 reaches beyond"},
        {"two over one cut", Item(0, 10, Transition(8, 12)) + "," + Item(10, 20, Transition(9, 11)),
         "transition \"TX.CrossDissolve\" on item 1 of track 0 overlaps"},
    };
    for (const Case& test : cases)
    {
        SCOPED_TRACE(test.mName);
        const BE::SequenceRef sequence = Sequence(R"({"items": [)" + test.mItems + "]}");
        try
        {
            EXPECT_EQ(DescribeTransitions(SequenceCutlist(sequence)), test.mExpected);
        }
        catch (const QRT::Exception& inError)
        {
            EXPECT_EQ(std::string(inError.what()).rfind(test.mExpected, 0), 0u) << inError.what();
        }
    }
}

TEST_F(CutlistFactoryTest, AMulticamItemPlaysItsAnglesThroughAMulticamNode)
{
    const auto cutlistOf = [&](int inSelected)
    {
        return SequenceCutlist(
            Sequence(R"({"items": [{"end": "10f", "media": {"multicam": {"angles": [{"pattern": )"
                     R"("pattern:moving?size=64x36"}, {"color": "#FF204060"}], "selected": )" +
                     std::to_string(inSelected) + "}}}]}"));
    };
    const auto child = [](const QRT::InterfaceRef<MF::IRenderableNode>& inNode, std::uint32_t inAt)
    {
        TickTime offset;
        QRT::InterfaceRef<MF::IRenderableNode> node;
        EXPECT_EQ(inNode->GetInput(inAt, offset, node), QRT::kResult_Success);
        return node;
    };
    const CutlistRef cutlist = cutlistOf(1);
    const std::vector<Segment> segments = Segments(cutlist);
    ASSERT_EQ(Describe(segments), "0-10/1");
    QRT::InterfaceRef<MF::IRenderableNode> segment;
    ASSERT_EQ(cutlist->GetNodeByHash(segments[0].mHash, segment), QRT::kResult_Success);
    const auto multicam = child(child(segment, 0), 0);
    EXPECT_EQ(multicam->GetNodeType().ToStringView(), "RenderableNodeMulticamImpl");
    ASSERT_EQ(multicam->GetInputCount(), 2u);
    for (std::uint32_t i = 0; i < 2; ++i)
    {
        const auto angle = child(multicam, i);
        EXPECT_EQ(angle->GetNodeType().ToStringView(), "RenderableNodeMediaImpl");
        MF::RenderablePropertyValue selected;
        angle->GetProperty(QRT::ImmutableString::CreateStatic("MediaNode::SelectedMulticamTrack"),
                           selected);
        EXPECT_EQ(selected, "1");
    }
    EXPECT_NE(Segments(cutlistOf(0))[0].mHash, segments[0].mHash);
}

TEST_F(CutlistFactoryTest, EditsChangeTheHashesOfTheSegmentsTheyTouchOnly)
{
    // Track 0: A [0, 20) and B [40, 60); track 1: C [10, 30).
    const std::string base =
        R"({"items": [)" + Item(0, 20) + "," + Item(40, 60) + R"(]}, {"items": [)";
    const auto hashes = [&](const std::string& inTrack1)
    {
        std::vector<QRT::Guid> result;
        for (const Segment& segment : Segments(SequenceCutlist(Sequence(base + inTrack1 + "]}"))))
            result.push_back(segment.mHash);
        return result;
    };
    const std::vector<QRT::Guid> before = hashes(Item(10, 30));
    ASSERT_EQ(before.size(), 4u); // A, A+C, C, B

    // C at another speed: the two segments C is in change, A alone and B do not.
    const std::vector<QRT::Guid> faster = hashes(Item(10, 30, R"(, "clip": {"speed": 2})"));
    ASSERT_EQ(faster.size(), 4u);
    EXPECT_EQ(faster[0], before[0]);
    EXPECT_NE(faster[1], before[1]);
    EXPECT_NE(faster[2], before[2]);
    EXPECT_EQ(faster[3], before[3]);

    // B alone, moved later: its segment's tree is the same.
    const auto moved =
        Segments(SequenceCutlist(Sequence(R"({"items": [)" + Item(0, 20) + "," + Item(45, 65) +
                                          R"(]}, {"items": [)" + Item(10, 30) + "]}")));
    ASSERT_EQ(moved.size(), 4u);
    EXPECT_EQ(moved[3].mStart, 45);
    EXPECT_EQ(moved[3].mHash, before[3]);
    // C starting later overlaps A for less time: the overlap's tree differs.
    EXPECT_NE(hashes(Item(12, 32))[1], before[1]);
}

TEST_F(CutlistFactoryTest, OneItemOneMediaAndMergedCutlists)
{
    const BE::SequenceRef sequence = Sequence(R"({"items": [)" + Item(10, 20) + "]}");
    const auto item = sequence->GetTrackGroup(0)->GetTrack(0)->GetItem(0);
    CutlistRef cutlist;
    ASSERT_EQ(mFactory->CreateTrackItemCutlist(item, cutlist), QRT::kResult_Success);
    EXPECT_EQ(Describe(Segments(cutlist)), "10-20/1");

    // A still media has one segment without an end, flagged time-invariant.
    BE::MediaSettings bars;
    bars.mKind = BE::MediaKind::kPattern;
    bars.mLocation = "pattern:bars";
    const BE::MediaResult still = BE::CreateMedia(bars);
    ASSERT_EQ(mFactory->CreateMediaCutlist(still.mMedia, cutlist), QRT::kResult_Success);
    EXPECT_EQ(Describe(Segments(cutlist)), "0--1/1");
    QRT::InterfaceRef<MF::IRenderableNode> node;
    ASSERT_EQ(cutlist->GetNodeByHash(Segments(cutlist)[0].mHash, node), QRT::kResult_Success);
    EXPECT_NE(node->GetRenderFlags() & kRenderFlag_TimeInvariant, 0u);

    // Merging: the first cutlist wins where both have segments.
    const CutlistRef wide = SequenceCutlist(Sequence(R"({"items": [)" + Item(0, 40) + "]}"));
    const CutlistRef narrow = SequenceCutlist(sequence);
    CutlistRef merged;
    ASSERT_EQ(mFactory->CreateMergedCutlist({narrow, {}, wide}, {}, merged), QRT::kResult_Success);
    EXPECT_EQ(Describe(Segments(merged)), "0-10/1 10-20/1 20-40/1");
    EXPECT_EQ(Segments(merged)[1].mHash, Segments(narrow)[0].mHash);

    // Objects that are not what an operation reads are refused.
    cutlist = narrow;
    EXPECT_EQ(mFactory->CreateSequenceCutlist(still.mMedia, {}, cutlist), QRT::kResult_NotFound);
    EXPECT_FALSE(cutlist);
    EXPECT_EQ(mFactory->CreateMergedCutlist({}, {}, cutlist), QRT::kResult_NotFound);
}

TEST(CutlistFactoryPublication, TheModulePublishesItsFactoryWhileItIsUp)
{
    ASSERT_FALSE(MF::GetCutlistFactory());
    VideoRenderer::Initialize();
    EXPECT_TRUE(MF::GetCutlistFactory());
    VideoRenderer::Shutdown();
    EXPECT_FALSE(MF::GetCutlistFactory());
}

} // namespace
} // namespace ML
