#pragma once

// The segment sweep of the cutlist factory: the tracks' items turned into the
// maximal intervals over which the set of active items does not change.
//
// Pure and stateless: any thread may call it.

#include "mvxmediatypes/TickTime.h"

#include <cstddef>
#include <vector>

namespace ML
{

// One item of a track as the sweep sees it: [mStart, mEnd) in sequence time.
struct SweepItem
{
    mvxmediatypes::TickTime mStart;
    mvxmediatypes::TickTime mEnd;
};

// A track's items in time order, not overlapping.
using SweepTrack = std::vector<SweepItem>;

// The item of one track active over a segment.
struct ActiveItem
{
    std::size_t mTrack = 0;
    std::size_t mItem = 0;

    friend bool operator==(const ActiveItem&, const ActiveItem&) = default;
};

struct SweptSegment
{
    mvxmediatypes::TickTime mStart;
    mvxmediatypes::TickTime mEnd;
    // At most one item per track, in track order (bottom track first); never
    // empty: intervals with no active item are left out.
    std::vector<ActiveItem> mActive;
};

// The segments of inTracks within [inRangeStart, inRangeEnd), in time order.
// Segments are cut only where an item starts or ends, so a long item alone
// on its track gives one segment however long it is. Items that end at or
// before their start take no part.
std::vector<SweptSegment> SweepSegments(const std::vector<SweepTrack>& inTracks,
                                        mvxmediatypes::TickTime inRangeStart,
                                        mvxmediatypes::TickTime inRangeEnd);

} // namespace ML
