// The mutable cutlist: sealing (sort, trim, merge), its hash, lookups by
// time, still ranges and smart-render times.

#include "ContractExpect.h"
#include "ML/IMutableCutlist.h"
#include "TestNodeKinds.h"

#include <tuple>

#include <gtest/gtest.h>

namespace graphtest
{
namespace
{

using mvxmediatypes::kTime_Max;
using CutlistRef = QRT::InterfaceRef<ML::IMutableCutlist>;
// Start, end and offset in ticks, and the node named by a letter (A, B or C).
using Seg = std::tuple<std::int64_t, std::int64_t, std::int64_t, char>;
using Segs = std::vector<Seg>;

CutlistRef NewCutlist()
{
    return ML::CreateMutableCutlist(QRT::ImmutableString::CreateStatic("Sequence 1"));
}

MF::TickTimeRangeList StillRangesOf(const CutlistRef& inList)
{
    MF::TickTimeRangeList ranges;
    EXPECT_EQ(QRT::InterfaceRef<MF::IRenderableExtendedStillInfo>(inList)->GetStillRanges(
                  mvxmediatypes::kTime_Min, kTime_Max, ranges),
              QRT::kResult_Success);
    return ranges;
}

class MutableCutlistTest : public ::testing::Test
{
protected:
    const NodeRef mNodes[3] = {MakeLeaf("NodeA"), MakeLeaf("NodeB"), MakeLeaf("NodeC")};

    const NodeRef& Node(char inName) const { return mNodes[inName - 'A']; }

    CutlistRef Sealed(const Segs& inSegments) const
    {
        CutlistRef list = NewCutlist();
        for (const auto& [start, end, offset, node] : inSegments)
            list->AddSegment(Ticks(start), Ticks(end), Ticks(offset), Node(node));
        list->MakeImmutable();
        return list;
    }

    Segs SegmentsOf(const CutlistRef& inList) const
    {
        Segs segments;
        for (std::size_t index = 0; index < inList->GetSegmentCount(); ++index)
        {
            TickTime start, end, offset;
            QRT::Guid hash;
            EXPECT_EQ(inList->GetSegment(index, start, end, offset, hash), QRT::kResult_Success);
            char name = '?';
            for (char candidate : {'A', 'B', 'C'})
                name = Node(candidate)->GetNodeHash() == hash ? candidate : name;
            segments.emplace_back(start.GetTicks(), end.GetTicks(), offset.GetTicks(), name);
        }
        return segments;
    }
};

TEST_F(MutableCutlistTest, SealingOnceSortsTrimsMergesAndHashesTheResultInOrder)
{
    // The segments added, then those sealed.
    const std::pair<Segs, Segs> cases[] = {
        {{}, {}},
        // An empty range is ignored.
        {{{100, 100, 0, 'A'}}, {}},
        // Sorted by start.
        {{{100, 200, 7, 'B'}, {0, 100, 0, 'A'}}, {{0, 100, 0, 'A'}, {100, 200, 7, 'B'}}},
        // Continuous runs of one node merge.
        {{{0, 100, 1000, 'A'}, {100, 250, 1100, 'A'}, {250, 300, 1250, 'A'}},
         {{0, 300, 1000, 'A'}}},
        // An offset jump forwards or back (the same media again), another
        // node and a gap keep segments apart.
        {{{0, 100, 0, 'A'}, {100, 200, 101, 'A'}, {200, 300, 200, 'B'}, {310, 400, 310, 'B'}},
         {{0, 100, 0, 'A'}, {100, 200, 101, 'A'}, {200, 300, 200, 'B'}, {310, 400, 310, 'B'}}},
        {{{0, 100, 0, 'A'}, {100, 200, 0, 'A'}}, {{0, 100, 0, 'A'}, {100, 200, 0, 'A'}}},
        // An overlap is trimmed with its offset moved; a swallowed segment is dropped.
        {{{0, 100, 0, 'A'}, {60, 150, 500, 'B'}, {120, 140, 0, 'A'}},
         {{0, 100, 0, 'A'}, {100, 150, 540, 'B'}}},
        // A trimmed segment that becomes continuous merges.
        {{{0, 100, 0, 'A'}, {50, 180, 50, 'A'}}, {{0, 180, 0, 'A'}}},
        // Equal starts keep the order they were added in.
        {{{0, 50, 0, 'B'}, {0, 100, 0, 'A'}}, {{0, 50, 0, 'B'}, {50, 100, 50, 'A'}}},
    };
    for (const auto& [added, sealed] : cases)
    {
        SCOPED_TRACE(testing::PrintToString(added));
        const CutlistRef list = Sealed(added);
        EXPECT_EQ(SegmentsOf(list), sealed);
        ByteRuns runs{"Hash value for ML::RenderableCutlistImpl"};
        for (const auto& [start, end, offset, node] : sealed)
            runs.insert(runs.end(), {BytesOf(start), BytesOf(end), BytesOf(offset),
                                     BytesOf(Node(node)->GetNodeHash())});
        EXPECT_EQ(list->GetCutlistHash(), HashOfRuns(runs));
        EXPECT_INPUT_CONTRACT(list->AddSegment(Ticks(0), Ticks(1), Ticks(0), Node('A')),
                              "mMutable");
        EXPECT_INPUT_CONTRACT(list->MakeImmutable(), "mMutable");
    }
    EXPECT_INPUT_CONTRACT(NewCutlist()->GetCutlistHash(), "!mMutable");
}

TEST_F(MutableCutlistTest, LookupsByTimeHonourHalfOpenBoundariesAndMapBothFields)
{
    const CutlistRef list =
        Sealed({{100, 200, 1000, 'A'}, {200, 300, 0, 'B'}, {400, 500, -50, 'A'}});
    // Time, node (0: none), local time and segment index.
    const std::tuple<std::int64_t, char, std::int64_t, std::size_t> cases[] = {
        {-5, 0, 0, 0},      {99, 0, 0, 0},     {100, 'A', 1000, 0}, {199, 'A', 1099, 0},
        {200, 'B', 0, 1},   {299, 'B', 99, 1}, {300, 0, 0, 0},      {399, 0, 0, 0},
        {400, 'A', -50, 2}, {499, 'A', 49, 2}, {500, 0, 0, 0}};
    TickTime start, end, offset;
    QRT::Guid hash;
    for (const auto& [time, name, localTicks, wantIndex] : cases)
    {
        SCOPED_TRACE(time);
        NodeRef node = Node('C');
        MF::FrameTime local(Ticks(-12345));
        EXPECT_EQ(list->GetNodeAtTime(MF::FrameTime(Ticks(time)), node, local),
                  QRT::kResult_Success);
        EXPECT_TRUE(node == (name ? Node(name) : NodeRef()));
        EXPECT_EQ(local, MF::FrameTime(Ticks(name ? localTicks : -12345)));

        std::size_t index = 99;
        hash = QRT::Guid();
        EXPECT_EQ(list->GetSegmentAtTime(Ticks(time), index, start, end, offset, hash),
                  name ? QRT::kResult_Success : QRT::kResult_NotFound);
        EXPECT_EQ(index, name ? wantIndex : 99u);
        EXPECT_EQ(hash, name ? Node(name)->GetNodeHash() : QRT::Guid());
    }
    EXPECT_EQ(list->GetSegment(3, start, end, offset, hash), QRT::kResult_NotFound);

    // Interlaced: the earlier field picks the segment; both fields are mapped.
    ML::CutlistRenderParams params;
    params.SetFrameTime(MF::FrameTime(Ticks(210), Ticks(195)));
    NodeRef node;
    MF::FrameTime local;
    EXPECT_EQ(list->GetNodeAtTime(params, node, local), QRT::kResult_Success);
    EXPECT_TRUE(node == Node('A'));
    EXPECT_EQ(local, MF::FrameTime(Ticks(1110), Ticks(1095)));
}

TEST_F(MutableCutlistTest, GapsStillSegmentsAndNodeRangesMakeTheStillList)
{
    auto scripted = MakeMutable<ScriptedProviderNode>("Scripted", 84u);
    scripted->mStillRanges = {Range(1010, 1020), Range(1030, 1100)};
    CutlistRef list = NewCutlist();
    list->AddSegment(Ticks(10), Ticks(20), Ticks(0), MakeLeaf("Still", 4u | 8u));
    list->AddSegment(Ticks(20), Ticks(30), Ticks(0), MakeLeaf("Moving", 8u));
    list->AddSegment(Ticks(50), Ticks(100), Ticks(1000), Seal(scripted));
    list->MakeImmutable();

    EXPECT_EQ(scripted->mStillQuestions, MF::TickTimeRangeList{Range(1000, 1050)});
    // [1030, 1100) lies partly beyond the segment: clipped to its end at 100.
    EXPECT_EQ(StillRangesOf(list),
              (MF::TickTimeRangeList{Range(0, 10), Range(10, 20), Range(30, 50), Range(60, 70),
                                     Range(80, 100), MF::TickTimeRange(Ticks(100), kTime_Max)}));
    const QRT::InterfaceRef<MF::IRenderableExtendedStillInfo> info(list);
    for (const auto& [time, expected] :
         {std::pair{35, Range(30, 50)}, std::pair{25, Range(25, 25)}, std::pair{50, Range(50, 50)},
          std::pair{10, Range(10, 20)}})
    {
        MF::TickTimeRange range;
        EXPECT_EQ(info->GetStillRange(Ticks(time), range), QRT::kResult_Success);
        EXPECT_EQ(range, expected) << "time " << time;
    }
    MF::TickTimeRangeList clipped{Range(-1, -1)};
    EXPECT_EQ(info->GetStillRanges(Ticks(15), Ticks(65), clipped), QRT::kResult_Success);
    EXPECT_EQ(clipped,
              (MF::TickTimeRangeList{Range(-1, -1), Range(15, 20), Range(30, 50), Range(60, 65)}));
    // A segment reaching the end of time leaves no trailing range.
    EXPECT_TRUE(StillRangesOf(Sealed({{0, kTime_Max.GetTicks(), 0, 'A'}})).empty());
}

TEST_F(MutableCutlistTest, SmartRenderTimesAreAskedInNodeTimeAndMappedBack)
{
    auto scripted = MakeMutable<ScriptedProviderNode>("Scripted", 0u);
    scripted->mSmartTimes = {Ticks(1000), Ticks(1040)};
    const NodeRef scriptedNode = Seal(scripted);
    CutlistRef list = NewCutlist();
    list->AddSegment(Ticks(100), Ticks(150), Ticks(1000), scriptedNode);
    list->AddSegment(Ticks(150), Ticks(170), Ticks(0), Node('A')); // no provider: skipped
    list->AddSegment(Ticks(300), Ticks(400), Ticks(990), scriptedNode);
    list->MakeImmutable();

    std::set<TickTime> times{Ticks(1)};
    EXPECT_EQ(QRT::InterfaceRef<MF::ISmartRenderSegmentInfo>(list)->GetSmartRenderTimes(
                  mvxmediatypes::FrameRate(), true, times),
              QRT::kResult_Success);
    EXPECT_EQ(times,
              (std::set<TickTime>{Ticks(1), Ticks(100), Ticks(140), Ticks(310), Ticks(350)}));
    EXPECT_EQ(scripted->mSmartQuestions,
              (MF::TickTimeRangeList{Range(1000, 1050), Range(990, 1090)}));
}

} // namespace
} // namespace graphtest
