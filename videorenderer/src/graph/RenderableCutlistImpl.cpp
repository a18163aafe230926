// MutableCutlist: the module's renderable cutlist (identified in hashes as
// "ML::RenderableCutlistImpl").

#include "ML/IMutableCutlist.h"
#include "ML/IRenderableNodeProducerProvider.h"
#include "ML/RenderFlags.h"
#include "QRT/Allocated.h"
#include "QRT/Exception.h"
#include "QRT/Hash.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <map>
#include <string_view>
#include <vector>

namespace ML
{
namespace
{

using mvxmediatypes::TickTime;

constexpr std::string_view kCutlistHashText = "Hash value for ML::RenderableCutlistImpl";

// A cutlist built by the cutlist factory on one thread and read by any number
// of threads once sealed. Segments are half-open ranges [start, end) of
// sequence time; sequence time t inside a segment is node time
// t - start + offset. The cutlist owns one reference per distinct node tree.
// Lookups by time are binary searches over the sorted, non-overlapping
// segments that sealing leaves.
class MutableCutlist : public QRT::Implements<MF::IRenderableExtendedStillInfo,
                                              MF::ISmartRenderSegmentInfo, IMutableCutlist>
{
public:
    explicit MutableCutlist(const QRT::ImmutableString& inName)
    {
        MVX_INPUT_CONTRACT(mMutable);
        mName = inName;
    }

    // --- MF::IRenderableCutlist -----------------------------------------------------------
    std::size_t GetSegmentCount() const override { return mSegments.size(); }

    QRT::Guid GetCutlistHash() const override
    {
        MVX_INPUT_CONTRACT(!mMutable);
        return mCutlistHash;
    }

    QRT::Result GetSegment(std::size_t inIndex, TickTime& outStart, TickTime& outEnd,
                           TickTime& outOffset, QRT::Guid& outNodeHash) const override
    {
        if (inIndex >= mSegments.size())
            return QRT::kResult_NotFound;
        const Segment& segment = mSegments[inIndex];
        outStart = segment.mStart;
        outEnd = segment.mEnd;
        outOffset = segment.mOffset;
        outNodeHash = segment.mNodeHash;
        return QRT::kResult_Success;
    }

    QRT::Result GetNodeByHash(const QRT::Guid& inNodeHash,
                              QRT::InterfaceRef<MF::IRenderableNode>& outNode) const override
    {
        const auto found = mNodes.find(inNodeHash);
        if (found == mNodes.end())
            return QRT::kResult_NotFound;
        outNode = found->second;
        return QRT::kResult_Success;
    }

    QRT::Result GetNodeAtTime(const MF::FrameTime& inRenderTime,
                              QRT::InterfaceRef<MF::IRenderableNode>& outNode,
                              MF::FrameTime& outLocalTime) const override
    {
        MVX_INPUT_CONTRACT(!mMutable);
        outNode.Reset();
        const Segment* segment = FindSegment(inRenderTime.GetTime());
        if (segment == nullptr)
            return QRT::kResult_Success;
        outLocalTime = MF::FrameTime(ToNodeTime(*segment, inRenderTime.GetFirstFieldTime()),
                                     ToNodeTime(*segment, inRenderTime.GetSecondFieldTime()));
        return GetNodeByHash(segment->mNodeHash, outNode);
    }

    QRT::Result GetSegmentAtTime(TickTime inTime, std::size_t& outIndex, TickTime& outStart,
                                 TickTime& outEnd, TickTime& outOffset,
                                 QRT::Guid& outNodeHash) const override
    {
        MVX_INPUT_CONTRACT(!mMutable);
        const Segment* segment = FindSegment(inTime);
        if (segment == nullptr)
            return QRT::kResult_NotFound;
        outIndex = static_cast<std::size_t>(segment - mSegments.data());
        outStart = segment->mStart;
        outEnd = segment->mEnd;
        outOffset = segment->mOffset;
        outNodeHash = segment->mNodeHash;
        return QRT::kResult_Success;
    }

    QRT::ImmutableString GetName() const override { return mName; }

    // --- ML::IMutableCutlist ------------------------------------------------------------------
    void AddSegment(TickTime inStart, TickTime inEnd, TickTime inOffset,
                    const QRT::InterfaceRef<MF::IRenderableNode>& inNode) override
    {
        MVX_INPUT_CONTRACT(mMutable);
        if (!(inEnd > inStart))
            return;
        // The node's hash is read (and an empty node refused) before anything is stored.
        const QRT::Guid nodeHash = inNode->GetNodeHash();
        mNodes.insert_or_assign(nodeHash, inNode);
        mSegments.push_back(Segment{inStart, inEnd, inOffset, nodeHash});
    }

    void MakeImmutable() override
    {
        MVX_INPUT_CONTRACT(mMutable);
        mMutable = false;
        // Stable, so that segments with equal starts keep the order they were added in.
        std::stable_sort(mSegments.begin(), mSegments.end(),
                         [](const Segment& inLeft, const Segment& inRight)
                         { return inLeft.mStart < inRight.mStart; });
        TrimAndMerge();
        ComputeCutlistHash();
        ComputeStillRanges();
    }

    // --- MF::IRenderableExtendedStillInfo -------------------------------------------------------
    QRT::Result GetStillRange(TickTime inTime, MF::TickTimeRange& outRange) const override
    {
        outRange = MF::TickTimeRange(inTime, inTime);
        // The last still range starting at or before inTime is the only candidate:
        // the ranges are sorted and do not overlap.
        auto after = std::upper_bound(mStillRanges.begin(), mStillRanges.end(), inTime,
                                      [](TickTime inValue, const MF::TickTimeRange& inRange)
                                      { return inValue < inRange.first; });
        if (after != mStillRanges.begin())
        {
            const MF::TickTimeRange& candidate = *(after - 1);
            if (inTime < candidate.second)
                outRange = candidate;
        }
        return QRT::kResult_Success;
    }

    QRT::Result GetStillRanges(TickTime inStart, TickTime inEnd,
                               MF::TickTimeRangeList& ioRanges) const override
    {
        for (const MF::TickTimeRange& range : mStillRanges)
        {
            const TickTime start = std::max(range.first, inStart);
            const TickTime end = std::min(range.second, inEnd);
            if (start < end)
                ioRanges.emplace_back(start, end);
        }
        return QRT::kResult_Success;
    }

    // --- MF::ISmartRenderSegmentInfo ------------------------------------------------------------
    QRT::Result GetSmartRenderTimes(const mvxmediatypes::FrameRate& inFrameRate, bool inFlag,
                                    std::set<TickTime>& ioTimes) const override
    {
        for (const Segment& segment : mSegments)
        {
            const QRT::InterfaceRef<IRenderableNodeProducerProvider> provider = ProviderOf(segment);
            if (!provider)
                continue;
            std::set<TickTime> nodeTimes;
            provider->GetSmartRenderTimes(segment.mOffset,
                                          segment.mOffset + (segment.mEnd - segment.mStart),
                                          inFrameRate, inFlag, nodeTimes);
            for (TickTime time : nodeTimes)
                ioTimes.insert(time + (segment.mStart - segment.mOffset));
        }
        return QRT::kResult_Success;
    }

protected:
    ~MutableCutlist() = default;

private:
    struct Segment
    {
        TickTime mStart;
        TickTime mEnd;
        // The node time at mStart.
        TickTime mOffset;
        QRT::Guid mNodeHash;
    };

    static TickTime ToNodeTime(const Segment& inSegment, TickTime inTime)
    {
        // Subtracting first keeps the intermediate inside the time range for
        // any time inside the segment.
        return (inTime - inSegment.mStart) + inSegment.mOffset;
    }

    // The segment that holds inTime, or null.
    const Segment* FindSegment(TickTime inTime) const
    {
        auto after = std::upper_bound(mSegments.begin(), mSegments.end(), inTime,
                                      [](TickTime inValue, const Segment& inSegment)
                                      { return inValue < inSegment.mStart; });
        if (after == mSegments.begin())
            return nullptr;
        const Segment& segment = *(after - 1);
        if (!(inTime < segment.mEnd))
            return nullptr;
        return &segment;
    }

    QRT::InterfaceRef<IRenderableNodeProducerProvider> ProviderOf(const Segment& inSegment) const
    {
        QRT::InterfaceRef<MF::IRenderableNode> node;
        if (GetNodeByHash(inSegment.mNodeHash, node) != QRT::kResult_Success)
            return {};
        return QRT::QueryRef<IRenderableNodeProducerProvider>(node);
    }

    void TrimAndMerge()
    {
        std::vector<Segment> rebuilt;
        rebuilt.reserve(mSegments.size());
        for (Segment segment : mSegments)
        {
            if (rebuilt.empty())
            {
                rebuilt.push_back(segment);
                continue;
            }
            Segment& previous = rebuilt.back();
            if (segment.mStart < previous.mEnd)
            {
                segment.mOffset += previous.mEnd - segment.mStart;
                segment.mStart = previous.mEnd;
            }
            if (!(segment.mStart < segment.mEnd))
                continue;
            const bool continuous =
                segment.mNodeHash == previous.mNodeHash && segment.mStart == previous.mEnd &&
                segment.mOffset == previous.mOffset + (previous.mEnd - previous.mStart);
            if (continuous)
                previous.mEnd = segment.mEnd;
            else
                rebuilt.push_back(segment);
        }
        mSegments.swap(rebuilt);
    }

    void ComputeCutlistHash()
    {
        QRT::HashValue hash;
        QRT::MixHash::MixInString(hash, kCutlistHashText);
        for (const Segment& segment : mSegments)
        {
            QRT::MixHash::MixInValue(hash, segment.mStart.GetTicks());
            QRT::MixHash::MixInValue(hash, segment.mEnd.GetTicks());
            QRT::MixHash::MixInValue(hash, segment.mOffset.GetTicks());
            QRT::MixHash::MixInGuid(hash, segment.mNodeHash);
        }
        mCutlistHash = QRT::HashValueToGuid(hash);
    }

    void ComputeStillRanges()
    {
        constexpr std::uint32_t kStillFlags = kRenderFlag_4 | kRenderFlag_TimeInvariant;
        TickTime previousEnd = mvxmediatypes::kTime_Zero;
        for (const Segment& segment : mSegments)
        {
            if (previousEnd < segment.mStart)
                mStillRanges.emplace_back(previousEnd, segment.mStart);
            previousEnd = segment.mEnd;

            QRT::InterfaceRef<MF::IRenderableNode> node;
            if (GetNodeByHash(segment.mNodeHash, node) != QRT::kResult_Success)
                continue;
            if ((node->GetRenderFlags() & kStillFlags) == kStillFlags)
            {
                mStillRanges.emplace_back(segment.mStart, segment.mEnd);
                continue;
            }
            const QRT::InterfaceRef<IRenderableNodeProducerProvider> provider =
                QRT::QueryRef<IRenderableNodeProducerProvider>(node);
            if (!provider)
                continue;
            MF::TickTimeRangeList nodeRanges;
            provider->GetStillRanges(segment.mOffset,
                                     segment.mOffset + (segment.mEnd - segment.mStart), nodeRanges);
            const TickTime shift = segment.mStart - segment.mOffset;
            for (const MF::TickTimeRange& range : nodeRanges)
            {
                // A node's answer is clipped to its segment, so that a node that
                // reports beyond the range it was asked about cannot break the
                // order of the list.
                const TickTime start = std::max(range.first + shift, segment.mStart);
                const TickTime end = std::min(range.second + shift, segment.mEnd);
                if (start < end)
                    mStillRanges.emplace_back(start, end);
            }
        }
        if (previousEnd < mvxmediatypes::kTime_Max)
            mStillRanges.emplace_back(previousEnd, mvxmediatypes::kTime_Max);
    }

    // True until MakeImmutable.
    bool mMutable = true;
    // Sorted by start and non-overlapping once sealed.
    std::vector<Segment> mSegments;
    // One node tree per distinct node hash.
    std::map<QRT::Guid, QRT::InterfaceRef<MF::IRenderableNode>> mNodes;
    QRT::Guid mCutlistHash;
    QRT::ImmutableString mName;
    // Sorted (start, end) ranges of unchanging picture, computed at sealing.
    MF::TickTimeRangeList mStillRanges;
};

} // namespace

QRT::InterfaceRef<IMutableCutlist> CreateMutableCutlist(const QRT::ImmutableString& inName)
{
    return QRT::Allocated<MutableCutlist>::Create<IMutableCutlist>(inName);
}

} // namespace ML
