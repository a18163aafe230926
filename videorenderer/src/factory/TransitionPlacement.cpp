#include "factory/TransitionPlacement.h"

#include <algorithm>
#include <optional>
#include <sstream>

namespace ML
{
namespace
{

using mvxmediatypes::TickTime;

// A transition about one cut of the track.
struct Placed
{
    TickTime mStart;
    TickTime mEnd;
    std::size_t mCarrier;
    std::size_t mIndex;
    std::size_t mOutgoing;
    std::size_t mIncoming;
};

class Placer
{
public:
    Placer(const std::vector<const BE::TrackItemSettings*>& inItems, std::uint32_t inTrack)
        : mItems(inItems)
        , mTrack(inTrack)
    {
    }

    TrackPlacement Place()
    {
        TrackPlacement placement;
        for (std::size_t item = 0; item < mItems.size() && mError.empty(); ++item)
            for (std::size_t index = 0; index < mItems[item]->mTransitions.size() && mError.empty();
                 ++index)
                Classify(item, index);
        std::sort(mPlaced.begin(), mPlaced.end(),
                  [](const Placed& inA, const Placed& inB) { return inA.mStart < inB.mStart; });
        for (std::size_t i = 1; i < mPlaced.size() && mError.empty(); ++i)
            if (mPlaced[i].mStart < mPlaced[i - 1].mEnd)
                Fail(mPlaced[i].mCarrier, mPlaced[i].mIndex,
                     "overlaps another transition of the track");
        if (!mError.empty())
        {
            placement.mError = mError;
            return placement;
        }
        // Items and transitions in time order: each item's piece is what the
        // transitions about its start and end leave of it.
        std::size_t next = 0;
        for (std::size_t item = 0; item < mItems.size(); ++item)
        {
            TickTime start = mItems[item]->mStart;
            TickTime end = mItems[item]->mEnd;
            for (const Placed& placed : mPlaced)
            {
                if (placed.mIncoming == item)
                    start = std::max(start, placed.mEnd);
                if (placed.mOutgoing == item)
                    end = std::min(end, placed.mStart);
            }
            while (next < mPlaced.size() && mPlaced[next].mStart < std::max(start, end))
                Emit(placement, mPlaced[next++]);
            if (start < end)
            {
                TrackPiece piece;
                piece.mRange = {start, end};
                piece.mAnchor = mItems[item]->mStart;
                piece.mItem = item;
                placement.mPieces.push_back(piece);
            }
        }
        while (next < mPlaced.size())
            Emit(placement, mPlaced[next++]);
        return placement;
    }

private:
    static void Emit(TrackPlacement& ioPlacement, const Placed& inPlaced)
    {
        TrackPiece piece;
        piece.mRange = {inPlaced.mStart, inPlaced.mEnd};
        piece.mAnchor = inPlaced.mStart;
        piece.mCarrier = inPlaced.mCarrier;
        piece.mTransition = inPlaced.mIndex;
        piece.mOutgoing = inPlaced.mOutgoing;
        piece.mIncoming = inPlaced.mIncoming;
        ioPlacement.mPieces.push_back(piece);
    }

    void Fail(std::size_t inItem, std::size_t inIndex, const std::string& inProblem)
    {
        if (!mError.empty())
            return;
        std::ostringstream text;
        text << "transition \"" << mItems[inItem]->mTransitions[inIndex].mMatchName << "\" on item "
             << inItem << " of track " << mTrack << " " << inProblem;
        mError = text.str();
    }

    void Classify(std::size_t inItem, std::size_t inIndex)
    {
        const BE::TrackItemSettings& item = *mItems[inItem];
        const BE::TransitionSettings& transition = item.mTransitions[inIndex];
        const TickTime start = transition.mStart;
        const TickTime end = transition.mEnd;
        const bool aboutStart = start <= item.mStart && item.mStart < end && end <= item.mEnd;
        const bool aboutEnd = item.mStart <= start && start < item.mEnd && item.mEnd <= end;
        if (!(start < end) || (!aboutStart && !aboutEnd))
            return Fail(inItem, inIndex, "covers neither the start nor the end of its item");
        const bool before = inItem > 0 && mItems[inItem - 1]->mEnd == item.mStart;
        const bool after = inItem + 1 < mItems.size() && mItems[inItem + 1]->mStart == item.mEnd;
        Placed placed{start, end, inItem, inIndex, kNoItem, kNoItem};
        // A transition over the whole item goes about its start unless only
        // its end meets another item.
        if (aboutStart && !(aboutEnd && after && !before))
        {
            placed.mIncoming = inItem;
            if (before)
                placed.mOutgoing = inItem - 1;
        }
        else
        {
            placed.mOutgoing = inItem;
            if (after)
                placed.mIncoming = inItem + 1;
        }
        // It stays within the items it changes between, and within the gap
        // beside an item that meets none.
        const TickTime low = placed.mOutgoing != kNoItem ? mItems[placed.mOutgoing]->mStart
                             : inItem > 0                ? mItems[inItem - 1]->mEnd
                                                         : mvxmediatypes::kTime_Min;
        const TickTime high = placed.mIncoming != kNoItem  ? mItems[placed.mIncoming]->mEnd
                              : inItem + 1 < mItems.size() ? mItems[inItem + 1]->mStart
                                                           : mvxmediatypes::kTime_Max;
        if (start < low || high < end)
            return Fail(inItem, inIndex, "reaches beyond the items it changes between");
        mPlaced.push_back(placed);
    }

    const std::vector<const BE::TrackItemSettings*>& mItems;
    const std::uint32_t mTrack;
    std::vector<Placed> mPlaced;
    std::string mError;
};

} // namespace

TrackPlacement PlaceTransitions(const std::vector<const BE::TrackItemSettings*>& inItems,
                                std::uint32_t inTrackIndex)
{
    return Placer(inItems, inTrackIndex).Place();
}

} // namespace ML
