// Cutlist merge: the winner's segments whole, the filler's in the gaps.

#include "factory/CutlistMerge.h"

#include "ML/IMutableCutlist.h"

#include <algorithm>
#include <vector>

namespace ML
{
namespace
{

using mvxmediatypes::TickTime;

struct Piece
{
    TickTime mStart;
    TickTime mEnd;
    TickTime mOffset;
    QRT::InterfaceRef<MF::IRenderableNode> mNode;
};

std::vector<Piece> ReadSegments(const MF::IRenderableCutlist& inCutlist)
{
    std::vector<Piece> pieces;
    for (std::size_t index = 0; index < inCutlist.GetSegmentCount(); ++index)
    {
        Piece piece;
        QRT::Guid hash;
        if (inCutlist.GetSegment(index, piece.mStart, piece.mEnd, piece.mOffset, hash) !=
                QRT::kResult_Success ||
            inCutlist.GetNodeByHash(hash, piece.mNode) != QRT::kResult_Success)
            continue;
        pieces.push_back(std::move(piece));
    }
    std::sort(pieces.begin(), pieces.end(),
              [](const Piece& inA, const Piece& inB) { return inA.mStart < inB.mStart; });
    return pieces;
}

} // namespace

QRT::InterfaceRef<MF::IRenderableCutlist> MergeCutlists(const MF::IRenderableCutlist& inWinner,
                                                        const MF::IRenderableCutlist& inFiller,
                                                        const QRT::ImmutableString& inName)
{
    const std::vector<Piece> winners = ReadSegments(inWinner);
    const QRT::InterfaceRef<IMutableCutlist> merged = CreateMutableCutlist(inName);
    for (const Piece& piece : winners)
        merged->AddSegment(piece.mStart, piece.mEnd, piece.mOffset, piece.mNode);

    // Both lists are sorted, so one cursor over the winners serves every
    // filler segment: what is left of a filler segment starts at `start`,
    // and the winners before it no longer matter.
    std::size_t first = 0;
    for (const Piece& filler : ReadSegments(inFiller))
    {
        while (first < winners.size() && winners[first].mEnd <= filler.mStart)
            ++first;
        TickTime start = filler.mStart;
        for (std::size_t w = first; w < winners.size() && start < filler.mEnd; ++w)
        {
            const Piece& winner = winners[w];
            if (winner.mStart >= filler.mEnd)
                break;
            if (start < winner.mStart)
                merged->AddSegment(start, winner.mStart, filler.mOffset + (start - filler.mStart),
                                   filler.mNode);
            start = std::max(start, winner.mEnd);
        }
        if (start < filler.mEnd)
            merged->AddSegment(start, filler.mEnd, filler.mOffset + (start - filler.mStart),
                               filler.mNode);
    }
    merged->MakeImmutable();
    return QRT::InterfaceRef<MF::IRenderableCutlist>(merged);
}

} // namespace ML
