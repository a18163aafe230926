// The segment sweep: from each time t, the next boundary is the nearest end
// of an item under t or start of an item after t, on any track.

#include "factory/SegmentSweep.h"

#include <algorithm>

namespace ML
{

using mvxmediatypes::kTime_Max;
using mvxmediatypes::TickTime;

std::vector<SweptSegment> SweepSegments(const std::vector<SweepTrack>& inTracks,
                                        TickTime inRangeStart, TickTime inRangeEnd)
{
    std::vector<SweptSegment> segments;
    if (!(inRangeStart < inRangeEnd))
        return segments;
    std::vector<std::size_t> cursors(inTracks.size(), 0);
    TickTime t = inRangeStart;
    while (t < inRangeEnd)
    {
        // Pass the items that end at or before t (and empty ones).
        TickTime boundary = kTime_Max;
        for (std::size_t track = 0; track < inTracks.size(); ++track)
        {
            const SweepTrack& items = inTracks[track];
            std::size_t& cursor = cursors[track];
            while (cursor < items.size() &&
                   (items[cursor].mEnd <= t || items[cursor].mEnd <= items[cursor].mStart))
                ++cursor;
            if (cursor < items.size())
            {
                const SweepItem& item = items[cursor];
                boundary = std::min(boundary, item.mStart <= t ? item.mEnd : item.mStart);
            }
        }
        if (boundary <= t)
            break;
        const TickTime end = std::min(boundary, inRangeEnd);
        SweptSegment segment{t, end, {}};
        for (std::size_t track = 0; track < inTracks.size(); ++track)
        {
            const std::size_t cursor = cursors[track];
            if (cursor < inTracks[track].size() && inTracks[track][cursor].mStart <= t)
                segment.mActive.push_back({track, cursor});
        }
        if (!segment.mActive.empty())
            segments.push_back(std::move(segment));
        t = boundary;
    }
    return segments;
}

} // namespace ML
