// The mutable cutlist: sealing (sort, trim, merge), its hash, lookups by
// time, still ranges and smart-render times.

#include "ContractExpect.h"
#include "ExpectedHash.h"
#include "ML/IMutableCutlist.h"
#include "QRT/Exception.h"
#include "TestNodeKinds.h"

#include <gtest/gtest.h>

namespace graphtest
{
namespace
{

using mvxmediatypes::kTime_Max;
using mvxmediatypes::kTime_Zero;

struct SegmentRecord
{
    std::int64_t mStart;
    std::int64_t mEnd;
    std::int64_t mOffset;
    QRT::Guid mNodeHash;

    friend bool operator==(const SegmentRecord&, const SegmentRecord&) = default;
};

std::ostream& operator<<(std::ostream& ioStream, const SegmentRecord& inRecord)
{
    return ioStream << "[" << inRecord.mStart << ", " << inRecord.mEnd << ") offset "
                    << inRecord.mOffset << " node " << inRecord.mNodeHash.ToString();
}

class MutableCutlistTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        mNodeA = MakeLeaf("NodeA");
        mNodeB = MakeLeaf("NodeB");
    }

    static QRT::InterfaceRef<ML::IMutableCutlist> NewCutlist()
    {
        return ML::CreateMutableCutlist(QRT::ImmutableString::CreateStatic("Sequence 1"));
    }

    static std::vector<SegmentRecord>
    SegmentsOf(const QRT::InterfaceRef<ML::IMutableCutlist>& inList)
    {
        std::vector<SegmentRecord> records;
        for (std::size_t index = 0; index < inList->GetSegmentCount(); ++index)
        {
            TickTime start, end, offset;
            QRT::Guid hash;
            EXPECT_EQ(inList->GetSegment(index, start, end, offset, hash), QRT::kResult_Success);
            records.push_back({start.GetTicks(), end.GetTicks(), offset.GetTicks(), hash});
        }
        return records;
    }

    static ByteRuns HashRunsOf(const std::vector<SegmentRecord>& inRecords)
    {
        ByteRuns runs{"Hash value for ML::RenderableCutlistImpl"};
        for (const SegmentRecord& record : inRecords)
        {
            runs.push_back(BytesOf(record.mStart));
            runs.push_back(BytesOf(record.mEnd));
            runs.push_back(BytesOf(record.mOffset));
            runs.push_back(BytesOf(record.mNodeHash));
        }
        return runs;
    }

    static MF::TickTimeRangeList StillRangesOf(const QRT::InterfaceRef<ML::IMutableCutlist>& inList)
    {
        const QRT::InterfaceRef<MF::IRenderableExtendedStillInfo> info(inList);
        MF::TickTimeRangeList ranges;
        EXPECT_EQ(info->GetStillRanges(mvxmediatypes::kTime_Min, kTime_Max, ranges),
                  QRT::kResult_Success);
        return ranges;
    }

    static MF::TickTimeRange Range(std::int64_t inStart, std::int64_t inEnd)
    {
        return {Ticks(inStart), Ticks(inEnd)};
    }

    QRT::InterfaceRef<MF::IRenderableNode> mNodeA;
    QRT::InterfaceRef<MF::IRenderableNode> mNodeB;
};

TEST_F(MutableCutlistTest, EmptyCutlistHasTheTextHashAndOneStillRange)
{
    auto list = NewCutlist();
    list->MakeImmutable();
    EXPECT_EQ(list->GetSegmentCount(), 0u);
    EXPECT_EQ(list->GetCutlistHash(), HashOfRuns({"Hash value for ML::RenderableCutlistImpl"}));
    EXPECT_EQ(StillRangesOf(list), MF::TickTimeRangeList{MF::TickTimeRange(kTime_Zero, kTime_Max)});
    EXPECT_EQ(list->GetName(), std::string_view("Sequence 1"));
}

TEST_F(MutableCutlistTest, SegmentsAreSortedAndHashedInOrder)
{
    auto list = NewCutlist();
    list->AddSegment(Ticks(100), Ticks(200), Ticks(7), mNodeB);
    list->AddSegment(Ticks(0), Ticks(100), Ticks(0), mNodeA);
    list->MakeImmutable();
    const std::vector<SegmentRecord> expected{{0, 100, 0, mNodeA->GetNodeHash()},
                                              {100, 200, 7, mNodeB->GetNodeHash()}};
    EXPECT_EQ(SegmentsOf(list), expected);
    EXPECT_EQ(list->GetCutlistHash(), HashOfRuns(HashRunsOf(expected)));
}

TEST_F(MutableCutlistTest, ContinuousSegmentsOfOneNodeMerge)
{
    auto list = NewCutlist();
    list->AddSegment(Ticks(0), Ticks(100), Ticks(1000), mNodeA);
    list->AddSegment(Ticks(100), Ticks(250), Ticks(1100), mNodeA);
    list->AddSegment(Ticks(250), Ticks(300), Ticks(1250), mNodeA);
    list->MakeImmutable();
    EXPECT_EQ(SegmentsOf(list),
              (std::vector<SegmentRecord>{{0, 300, 1000, mNodeA->GetNodeHash()}}));
}

TEST_F(MutableCutlistTest, JumpInOffsetOrOtherNodeOrGapKeepsSegmentsApart)
{
    auto list = NewCutlist();
    list->AddSegment(Ticks(0), Ticks(100), Ticks(0), mNodeA);
    list->AddSegment(Ticks(100), Ticks(200), Ticks(101), mNodeA); // offset jumps by one
    list->AddSegment(Ticks(200), Ticks(300), Ticks(200), mNodeB); // another node
    list->AddSegment(Ticks(310), Ticks(400), Ticks(310), mNodeB); // a gap of 10
    list->MakeImmutable();
    EXPECT_EQ(list->GetSegmentCount(), 4u);
}

TEST_F(MutableCutlistTest, OverlappingSegmentIsTrimmedAndItsOffsetMoved)
{
    auto list = NewCutlist();
    list->AddSegment(Ticks(0), Ticks(100), Ticks(0), mNodeA);
    list->AddSegment(Ticks(60), Ticks(150), Ticks(500), mNodeB);
    // Entirely inside its predecessor after trimming: dropped.
    list->AddSegment(Ticks(120), Ticks(140), Ticks(0), mNodeA);
    list->MakeImmutable();
    const std::vector<SegmentRecord> expected{{0, 100, 0, mNodeA->GetNodeHash()},
                                              {100, 150, 540, mNodeB->GetNodeHash()}};
    EXPECT_EQ(SegmentsOf(list), expected);
    EXPECT_EQ(list->GetCutlistHash(), HashOfRuns(HashRunsOf(expected)));
}

TEST_F(MutableCutlistTest, TrimmedSegmentThatBecomesContinuousMerges)
{
    auto list = NewCutlist();
    list->AddSegment(Ticks(0), Ticks(100), Ticks(0), mNodeA);
    // Starts at 50 with offset 50: trimmed to start 100 with offset 100, continuous.
    list->AddSegment(Ticks(50), Ticks(180), Ticks(50), mNodeA);
    list->MakeImmutable();
    EXPECT_EQ(SegmentsOf(list), (std::vector<SegmentRecord>{{0, 180, 0, mNodeA->GetNodeHash()}}));
}

TEST_F(MutableCutlistTest, EmptyRangesAreIgnoredAndEmptyNodesRefused)
{
    auto list = NewCutlist();
    list->AddSegment(Ticks(100), Ticks(100), Ticks(0), mNodeA);
    list->AddSegment(Ticks(100), Ticks(50), Ticks(0), nullptr);
    EXPECT_THROW(list->AddSegment(Ticks(0), Ticks(10), Ticks(0), nullptr),
                 QRT::NullInterfaceException);
    list->MakeImmutable();
    EXPECT_EQ(list->GetSegmentCount(), 0u);
    QRT::InterfaceRef<MF::IRenderableNode> node;
    EXPECT_EQ(list->GetNodeByHash(mNodeA->GetNodeHash(), node), QRT::kResult_NotFound);
}

TEST_F(MutableCutlistTest, HashChangesWithEverySegmentField)
{
    auto hashOf = [&](std::int64_t inStart, std::int64_t inEnd, std::int64_t inOffset,
                      const QRT::InterfaceRef<MF::IRenderableNode>& inNode)
    {
        auto list = NewCutlist();
        list->AddSegment(Ticks(0), Ticks(10), Ticks(0), mNodeB);
        list->AddSegment(Ticks(inStart), Ticks(inEnd), Ticks(inOffset), inNode);
        list->MakeImmutable();
        return list->GetCutlistHash();
    };
    const QRT::Guid base = hashOf(20, 30, 5, mNodeA);
    EXPECT_EQ(hashOf(20, 30, 5, mNodeA), base);
    EXPECT_NE(hashOf(21, 30, 5, mNodeA), base);
    EXPECT_NE(hashOf(20, 31, 5, mNodeA), base);
    EXPECT_NE(hashOf(20, 30, 6, mNodeA), base);
    EXPECT_NE(hashOf(20, 30, 5, MakeLeaf("NodeC")), base);
}

TEST_F(MutableCutlistTest, NodeAtTimeHonoursHalfOpenBoundariesAndMapsBothFields)
{
    auto list = NewCutlist();
    list->AddSegment(Ticks(100), Ticks(200), Ticks(1000), mNodeA);
    list->AddSegment(Ticks(200), Ticks(300), Ticks(0), mNodeB);
    list->AddSegment(Ticks(400), Ticks(500), Ticks(-50), mNodeA);
    list->MakeImmutable();

    struct Case
    {
        std::int64_t mTime;
        QRT::InterfaceRef<MF::IRenderableNode> mNode;
        std::int64_t mLocal;
    };
    const Case cases[] = {{99, nullptr, 0},  {100, mNodeA, 1000}, {199, mNodeA, 1099},
                          {200, mNodeB, 0},  {299, mNodeB, 99},   {300, nullptr, 0},
                          {399, nullptr, 0}, {400, mNodeA, -50},  {499, mNodeA, 49},
                          {500, nullptr, 0}, {-5, nullptr, 0}};
    for (const Case& test : cases)
    {
        QRT::InterfaceRef<MF::IRenderableNode> node = mNodeB;
        MF::FrameTime local(Ticks(-12345));
        EXPECT_EQ(list->GetNodeAtTime(MF::FrameTime(Ticks(test.mTime)), node, local),
                  QRT::kResult_Success);
        EXPECT_TRUE(node == test.mNode) << "time " << test.mTime;
        if (test.mNode)
        {
            EXPECT_EQ(local, MF::FrameTime(Ticks(test.mLocal))) << "time " << test.mTime;
        }
    }

    // Interlaced: the earlier field picks the segment; both fields are mapped.
    ML::CutlistRenderParams params;
    params.SetFrameTime(MF::FrameTime(Ticks(210), Ticks(195)));
    QRT::InterfaceRef<MF::IRenderableNode> node;
    MF::FrameTime local;
    EXPECT_EQ(list->GetNodeAtTime(params, node, local), QRT::kResult_Success);
    EXPECT_TRUE(node == mNodeA);
    EXPECT_EQ(local, MF::FrameTime(Ticks(1110), Ticks(1095)));
}

TEST_F(MutableCutlistTest, SegmentAtTimeAnswersIndexOrNotFound)
{
    auto list = NewCutlist();
    list->AddSegment(Ticks(0), Ticks(10), Ticks(0), mNodeA);
    list->AddSegment(Ticks(10), Ticks(20), Ticks(3), mNodeB);
    list->MakeImmutable();
    std::size_t index = 99;
    TickTime start, end, offset;
    QRT::Guid hash;
    EXPECT_EQ(list->GetSegmentAtTime(Ticks(10), index, start, end, offset, hash),
              QRT::kResult_Success);
    EXPECT_EQ(index, 1u);
    EXPECT_EQ(start, Ticks(10));
    EXPECT_EQ(end, Ticks(20));
    EXPECT_EQ(offset, Ticks(3));
    EXPECT_EQ(hash, mNodeB->GetNodeHash());

    index = 99;
    EXPECT_EQ(list->GetSegmentAtTime(Ticks(20), index, start, end, offset, hash),
              QRT::kResult_NotFound);
    EXPECT_EQ(index, 99u);
    EXPECT_EQ(list->GetSegment(2, start, end, offset, hash), QRT::kResult_NotFound);
}

TEST_F(MutableCutlistTest, ContractsGuardSealing)
{
    auto list = NewCutlist();
    QRT::InterfaceRef<MF::IRenderableNode> node;
    MF::FrameTime local;
    std::size_t index = 0;
    TickTime start, end, offset;
    QRT::Guid hash;
    EXPECT_INPUT_CONTRACT(list->GetCutlistHash(), "!mMutable");
    EXPECT_INPUT_CONTRACT(list->GetNodeAtTime(MF::FrameTime(), node, local), "!mMutable");
    EXPECT_INPUT_CONTRACT(list->GetSegmentAtTime(kTime_Zero, index, start, end, offset, hash),
                          "!mMutable");
    list->MakeImmutable();
    EXPECT_INPUT_CONTRACT(list->AddSegment(Ticks(0), Ticks(1), Ticks(0), mNodeA), "mMutable");
    EXPECT_INPUT_CONTRACT(list->MakeImmutable(), "mMutable");
}

TEST_F(MutableCutlistTest, NodeTreesAreStoredOncePerHash)
{
    auto list = NewCutlist();
    // Two distinct objects with one hash: the later one is kept.
    const QRT::InterfaceRef<MF::IRenderableNode> twin = MakeLeaf("NodeA");
    list->AddSegment(Ticks(0), Ticks(10), Ticks(0), mNodeA);
    list->AddSegment(Ticks(20), Ticks(30), Ticks(0), twin);
    list->MakeImmutable();
    QRT::InterfaceRef<MF::IRenderableNode> node;
    EXPECT_EQ(list->GetNodeByHash(mNodeA->GetNodeHash(), node), QRT::kResult_Success);
    EXPECT_TRUE(node == twin);
    EXPECT_EQ(list->GetNodeByHash(mNodeB->GetNodeHash(), node), QRT::kResult_NotFound);
    EXPECT_TRUE(node == twin);
}

TEST_F(MutableCutlistTest, GapsStillSegmentsAndNodeRangesMakeTheStillList)
{
    const auto still = MakeLeaf("Still", 4u | 8u);
    const auto onlyEight = MakeLeaf("Moving", 8u);
    auto scripted = MakeMutable<ScriptedProviderNode>(
        84u, MF::TickTimeRangeList{Range(1010, 1020), Range(1030, 1100)}, std::set<TickTime>{});
    const auto scriptedNode = Seal(scripted);

    auto list = NewCutlist();
    list->AddSegment(Ticks(10), Ticks(20), Ticks(0), still);
    list->AddSegment(Ticks(20), Ticks(30), Ticks(0), onlyEight);
    list->AddSegment(Ticks(50), Ticks(100), Ticks(1000), scriptedNode);
    list->MakeImmutable();

    ASSERT_EQ(scripted->mStillQuestions.size(), 1u);
    EXPECT_EQ(scripted->mStillQuestions[0], Range(1000, 1050));
    // [1030, 1100) lies partly beyond the segment: clipped to its end at 100.
    const MF::TickTimeRangeList expected{Range(0, 10),   Range(10, 20),
                                         Range(30, 50),  Range(60, 70),
                                         Range(80, 100), MF::TickTimeRange(Ticks(100), kTime_Max)};
    EXPECT_EQ(StillRangesOf(list), expected);

    const QRT::InterfaceRef<MF::IRenderableExtendedStillInfo> info(list);
    MF::TickTimeRange range;
    EXPECT_EQ(info->GetStillRange(Ticks(35), range), QRT::kResult_Success);
    EXPECT_EQ(range, Range(30, 50));
    EXPECT_EQ(info->GetStillRange(Ticks(25), range), QRT::kResult_Success);
    EXPECT_EQ(range, Range(25, 25));
    EXPECT_EQ(info->GetStillRange(Ticks(50), range), QRT::kResult_Success);
    EXPECT_EQ(range, Range(50, 50));
    EXPECT_EQ(info->GetStillRange(Ticks(10), range), QRT::kResult_Success);
    EXPECT_EQ(range, Range(10, 20));

    MF::TickTimeRangeList clipped{Range(-1, -1)};
    EXPECT_EQ(info->GetStillRanges(Ticks(15), Ticks(65), clipped), QRT::kResult_Success);
    EXPECT_EQ(clipped,
              (MF::TickTimeRangeList{Range(-1, -1), Range(15, 20), Range(30, 50), Range(60, 65)}));
}

TEST_F(MutableCutlistTest, SegmentReachingTheEndOfTimeLeavesNoTrailingRange)
{
    auto list = NewCutlist();
    list->AddSegment(kTime_Zero, kTime_Max, Ticks(0), mNodeA);
    list->MakeImmutable();
    EXPECT_TRUE(StillRangesOf(list).empty());
}

TEST_F(MutableCutlistTest, SmartRenderTimesAreAskedInNodeTimeAndMappedBack)
{
    auto scripted = MakeMutable<ScriptedProviderNode>(0u, MF::TickTimeRangeList{},
                                                      std::set<TickTime>{Ticks(1000), Ticks(1040)});
    const auto scriptedNode = Seal(scripted);

    auto list = NewCutlist();
    list->AddSegment(Ticks(100), Ticks(150), Ticks(1000), scriptedNode);
    list->AddSegment(Ticks(150), Ticks(170), Ticks(0), mNodeA); // no provider: skipped
    list->AddSegment(Ticks(300), Ticks(400), Ticks(990), scriptedNode);
    list->MakeImmutable();

    const QRT::InterfaceRef<MF::ISmartRenderSegmentInfo> info(list);
    std::set<TickTime> times{Ticks(1)};
    EXPECT_EQ(info->GetSmartRenderTimes(mvxmediatypes::FrameRate(), true, times),
              QRT::kResult_Success);
    EXPECT_EQ(times,
              (std::set<TickTime>{Ticks(1), Ticks(100), Ticks(140), Ticks(310), Ticks(350)}));
    EXPECT_EQ(scripted->mSmartQuestions,
              (MF::TickTimeRangeList{Range(1000, 1050), Range(990, 1090)}));
    EXPECT_EQ(scripted->mSmartFlags, (std::vector<bool>{true, true}));
}

TEST_F(MutableCutlistTest, QueriesAnswerAllFourInterfaces)
{
    auto list = NewCutlist();
    EXPECT_TRUE(QRT::QueryRef<MF::IRenderableCutlist>(list));
    EXPECT_TRUE(QRT::QueryRef<MF::IRenderableExtendedStillInfo>(list));
    EXPECT_TRUE(QRT::QueryRef<MF::ISmartRenderSegmentInfo>(list));
    EXPECT_FALSE(QRT::QueryRef<MF::IRenderableNode>(list));
}

} // namespace
} // namespace graphtest
