// The segment sweep and the cutlist merge: where segments are cut, which
// items are active in each, and which segments survive a merge.

#include "factory/SegmentSweep.h"

#include "ML/IMutableCutlist.h"
#include "ML/RenderableNodes.h"
#include "factory/CutlistMerge.h"

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

TickTime T(std::int64_t inTicks)
{
    return TickTime::TicksToTime(inTicks);
}

// "start-end:track.item,track.item" per segment, so a table can state the
// whole expected sweep in one string.
std::string Describe(const std::vector<SweptSegment>& inSegments)
{
    std::string text;
    for (const SweptSegment& segment : inSegments)
    {
        if (!text.empty())
            text += ' ';
        const auto ticks = [](TickTime inTime)
        { return inTime == kTime_Max ? std::string("max") : std::to_string(inTime.GetTicks()); };
        text += ticks(segment.mStart) + "-" + ticks(segment.mEnd) + ":";
        for (std::size_t i = 0; i < segment.mActive.size(); ++i)
            text += (i ? "," : "") + std::to_string(segment.mActive[i].mTrack) + "." +
                    std::to_string(segment.mActive[i].mItem);
    }
    return text;
}

struct SweepCase
{
    const char* mName;
    std::vector<SweepTrack> mTracks;
    TickTime mStart;
    TickTime mEnd;
    const char* mExpected;
};

TEST(SegmentSweep, CutsOnlyWhereTheActiveSetChanges)
{
    const std::vector<SweepCase> cases = {
        {"one long item",
         {{{T(0), T(1'000'000'000'000)}}},
         kTime_Min,
         kTime_Max,
         "0-1000000000000:0.0"},
        {"an item without an end", {{{T(0), kTime_Max}}}, kTime_Min, kTime_Max, "0-max:0.0"},
        {"a gap", {{{T(0), T(10)}, {T(20), T(30)}}}, kTime_Min, kTime_Max, "0-10:0.0 20-30:0.1"},
        {"adjacent items",
         {{{T(0), T(10)}, {T(10), T(20)}}},
         kTime_Min,
         kTime_Max,
         "0-10:0.0 10-20:0.1"},
        {"two overlapping tracks",
         {{{T(0), T(20)}}, {{T(10), T(30)}}},
         kTime_Min,
         kTime_Max,
         "0-10:0.0 10-20:0.0,1.0 20-30:1.0"},
        {"one item inside another",
         {{{T(0), T(30)}}, {{T(10), T(20)}}},
         kTime_Min,
         kTime_Max,
         "0-10:0.0 10-20:0.0,1.0 20-30:0.0"},
        {"a range starting inside an item",
         {{{T(0), T(20)}, {T(30), T(40)}}},
         T(5),
         kTime_Max,
         "5-20:0.0 30-40:0.1"},
        {"a range ending inside an item",
         {{{T(0), T(20)}}, {{T(10), T(30)}}},
         kTime_Min,
         T(15),
         "0-10:0.0 10-15:0.0,1.0"},
        {"a range in a gap", {{{T(0), T(10)}, {T(20), T(30)}}}, T(12), T(18), ""},
        {"empty items take no part",
         {{{T(5), T(5)}, {T(8), T(12)}}},
         kTime_Min,
         kTime_Max,
         "8-12:0.1"},
        {"an empty range", {{{T(0), T(10)}}}, T(5), T(5), ""},
        {"no tracks", {}, kTime_Min, kTime_Max, ""},
        {"an empty track beside a full one",
         {{}, {{T(0), T(10)}}},
         kTime_Min,
         kTime_Max,
         "0-10:1.0"},
    };
    for (const SweepCase& test : cases)
    {
        SCOPED_TRACE(test.mName);
        EXPECT_EQ(Describe(SweepSegments(test.mTracks, test.mStart, test.mEnd)), test.mExpected);
    }
}

// A sealed cutlist of solid-colour segments: {start, end, offset, colour}.
struct SegmentSpec
{
    std::int64_t mStart;
    std::int64_t mEnd;
    std::int64_t mOffset;
    std::uint32_t mColor;
};

QRT::InterfaceRef<MF::IRenderableCutlist> MakeCutlist(const std::vector<SegmentSpec>& inSegments)
{
    const auto cutlist = CreateMutableCutlist(QRT::ImmutableString::CreateStatic("test"));
    for (const SegmentSpec& segment : inSegments)
        cutlist->AddSegment(T(segment.mStart), T(segment.mEnd), T(segment.mOffset),
                            CreateSolidColorNode(segment.mColor));
    cutlist->MakeImmutable();
    return cutlist;
}

std::vector<std::vector<std::int64_t>> ReadBack(const MF::IRenderableCutlist& inCutlist)
{
    std::vector<std::vector<std::int64_t>> segments;
    for (std::size_t i = 0; i < inCutlist.GetSegmentCount(); ++i)
    {
        TickTime start, end, offset;
        QRT::Guid hash;
        EXPECT_EQ(inCutlist.GetSegment(i, start, end, offset, hash), QRT::kResult_Success);
        QRT::InterfaceRef<MF::IRenderableNode> node;
        EXPECT_EQ(inCutlist.GetNodeByHash(hash, node), QRT::kResult_Success);
        const std::int64_t color = node->GetNodeHash() == CreateSolidColorNode(1)->GetNodeHash();
        segments.push_back({start.GetTicks(), end.GetTicks(), offset.GetTicks(), color});
    }
    return segments;
}

TEST(CutlistMerge, TheWinnerKeepsItsSegmentsAndTheFillerFillsTheGaps)
{
    // Colour 1 wins, colour 2 fills; the last column says whether a segment
    // shows the winner's node.
    const auto winner = MakeCutlist({{10, 20, 100, 1}, {40, 50, 0, 1}});
    const auto filler = MakeCutlist({{0, 30, 0, 2}, {45, 60, 7, 2}});
    const auto merged = MergeCutlists(*winner, *filler, QRT::ImmutableString::CreateStatic("m"));
    const std::vector<std::vector<std::int64_t>> expected = {
        {0, 10, 0, 0}, {10, 20, 100, 1}, {20, 30, 20, 0}, {40, 50, 0, 1}, {50, 60, 12, 0}};
    EXPECT_EQ(ReadBack(*merged), expected);
    EXPECT_EQ(merged->GetName().Compare(QRT::ImmutableString::CreateStatic("m")), 0);

    // A filler wholly under the winner adds nothing; an empty winner gives
    // the filler's segments unchanged.
    EXPECT_EQ(ReadBack(*MergeCutlists(*filler, *winner, {})).size(), 3u);
    EXPECT_EQ(ReadBack(*MergeCutlists(*MakeCutlist({}), *filler, {})), ReadBack(*filler));
}

} // namespace
} // namespace ML
