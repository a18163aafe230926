#pragma once

// The renderable cutlist: an ordered list of segments, each a half-open range
// [start, end) of sequence time mapped onto one node tree. A sequence time t
// inside a segment maps to node time t + offset - start.
//
// MF::IRenderableCutlist is the read side that the renderer, the
// accelerated renderers and the plug-in suites use; the still-range and
// smart-render interfaces are further questions a cutlist answers. A cutlist
// is built and sealed on one thread and afterwards read from any number of
// threads without locks.
//
// Statuses: QRT::kResult_Success, or QRT::kResult_NotFound when a lookup
// finds nothing (outputs untouched). Operations marked "sealed only" break
// the input contract "!mMutable" on a cutlist that is still being built.

#include "MF/FrameTime.h"
#include "MF/RenderableNode.h"
#include "QRT/Guid.h"
#include "QRT/ImmutableString.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "QRT/Result.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/TickTime.h"

#include <cstddef>
#include <set>
#include <utility>
#include <vector>

namespace MF
{

// A range of times (start, end).
using TickTimeRange = std::pair<mvxmediatypes::TickTime, mvxmediatypes::TickTime>;
using TickTimeRangeList = std::vector<TickTimeRange>;

class IRenderableCutlist : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{36644276-d282-49eb-b213-cc82f80d62e1}");

    virtual std::size_t GetSegmentCount() const = 0;

    // The cutlist's identity, fixed at sealing. Sealed only.
    virtual QRT::Guid GetCutlistHash() const = 0;

    // Segment inIndex, or kResult_NotFound when inIndex is out of range.
    virtual QRT::Result GetSegment(std::size_t inIndex, mvxmediatypes::TickTime& outStart,
                                   mvxmediatypes::TickTime& outEnd,
                                   mvxmediatypes::TickTime& outOffset,
                                   QRT::Guid& outNodeHash) const = 0;

    // The node tree stored under inNodeHash, or kResult_NotFound.
    virtual QRT::Result GetNodeByHash(const QRT::Guid& inNodeHash,
                                      QRT::InterfaceRef<IRenderableNode>& outNode) const = 0;

    // The node tree under the earlier field time of inRenderTime (render
    // parameters begin with their frame time and may be passed here) and
    // that frame time mapped into the node's own time. A time in no segment
    // answers kResult_Success with outNode emptied. Sealed only.
    virtual QRT::Result GetNodeAtTime(const FrameTime& inRenderTime,
                                      QRT::InterfaceRef<IRenderableNode>& outNode,
                                      FrameTime& outLocalTime) const = 0;

    // The segment holding inTime, or kResult_NotFound. Sealed only.
    virtual QRT::Result GetSegmentAtTime(mvxmediatypes::TickTime inTime, std::size_t& outIndex,
                                         mvxmediatypes::TickTime& outStart,
                                         mvxmediatypes::TickTime& outEnd,
                                         mvxmediatypes::TickTime& outOffset,
                                         QRT::Guid& outNodeHash) const = 0;

    // The name the cutlist was created with.
    virtual QRT::ImmutableString GetName() const = 0;

protected:
    ~IRenderableCutlist() = default;
};

// Ranges of sequence time over which a cutlist's picture does not change.
class IRenderableExtendedStillInfo : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{e8b19d4b-707e-44e1-9489-aadd005f61f7}");

    // The still range that contains inTime, or [inTime, inTime] when none
    // does.
    virtual QRT::Result GetStillRange(mvxmediatypes::TickTime inTime,
                                      TickTimeRange& outRange) const = 0;

    // Appends every still range that overlaps [inStart, inEnd], clipped to it.
    virtual QRT::Result GetStillRanges(mvxmediatypes::TickTime inStart,
                                       mvxmediatypes::TickTime inEnd,
                                       TickTimeRangeList& ioRanges) const = 0;

protected:
    ~IRenderableExtendedStillInfo() = default;
};

// The sequence times at which smart rendering must start a new piece.
class ISmartRenderSegmentInfo : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{4a82d7dc-fcac-4364-a0ff-bfdd81d17b0a}");

    // Adds to ioTimes the smart-render times of every segment, in sequence
    // time, for frames of inFrameRate; inFlag is passed on to the nodes.
    virtual QRT::Result GetSmartRenderTimes(const mvxmediatypes::FrameRate& inFrameRate,
                                            bool inFlag,
                                            std::set<mvxmediatypes::TickTime>& ioTimes) const = 0;

protected:
    ~ISmartRenderSegmentInfo() = default;
};

} // namespace MF
