#pragma once

// Where a track's transitions go: the track's items cut into the pieces the
// segment sweep sees. A transition lies on one of its items and covers
// [start, end) of sequence time around that item's start or end:
//   - around a cut where the item meets the one before or after it, it is the
//     change between the two (the outgoing item plays past its end and the
//     incoming one before its start, from their media's handles);
//   - at a start or end that meets no other item, it is the change from or
//     to nothing.
// Over a transition the track's piece is the transition; the items' own
// pieces are what is left of them. Pieces keep time order and never overlap.
//
// Pure: any thread may call it.

#include "BE/SequenceTypes.h"
#include "factory/SegmentSweep.h"

#include <cstddef>
#include <limits>
#include <string>
#include <vector>

namespace ML
{

inline constexpr std::size_t kNoItem = std::numeric_limits<std::size_t>::max();

struct TrackPiece
{
    // The piece's time in the sequence.
    SweepItem mRange;
    // The sequence time of the piece's node time 0: the item's start for an
    // item, the transition's start for a transition.
    mvxmediatypes::TickTime mAnchor;
    // An item's piece: the item. A transition's: kNoItem.
    std::size_t mItem = kNoItem;
    // A transition's piece: the item it lies on, its index there, and the
    // outgoing and incoming items (kNoItem for nothing).
    std::size_t mCarrier = kNoItem;
    std::size_t mTransition = 0;
    std::size_t mOutgoing = kNoItem;
    std::size_t mIncoming = kNoItem;

    bool IsTransition() const { return mItem == kNoItem; }
};

struct TrackPlacement
{
    std::vector<TrackPiece> mPieces;
    // Why the track's transitions cannot be placed, naming the item and the
    // transition; empty when they can.
    std::string mError;
};

// The pieces of one track's items (in time order, not overlapping).
// inTrackIndex names the track in the error.
TrackPlacement PlaceTransitions(const std::vector<const BE::TrackItemSettings*>& inItems,
                                std::uint32_t inTrackIndex);

} // namespace ML
