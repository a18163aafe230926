// CutlistFactory: the operations of MF::IRenderableCutlistFactory over the
// back end's sequence objects.

#include "factory/CutlistFactory.h"

#include "BE/SequenceInterfaces.h"
#include "FX/EffectCatalogue.h"
#include "ML/IMutableCutlist.h"
#include "ML/RenderFlags.h"
#include "ML/RenderableNodeCompositorImpl.h"
#include "QRT/Allocated.h"
#include "QRT/Exception.h"
#include "TX/TransitionCatalogue.h"
#include "factory/CutlistMerge.h"
#include "factory/SegmentSweep.h"
#include "factory/TransitionPlacement.h"
#include "graph/RenderableNodeAdjustmentImpl.h"
#include "graph/RenderableNodeEffectImpl.h"
#include "graph/RenderableNodeMulticamImpl.h"
#include "graph/RenderableNodePreviewImpl.h"
#include "graph/RenderableNodeTransitionImpl.h"
#include "graph/SequenceNodes.h"

#include <algorithm>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

namespace ML
{
namespace
{

using mvxmediatypes::kTime_Max;
using mvxmediatypes::kTime_Min;
using mvxmediatypes::kTime_Zero;
using mvxmediatypes::TickTime;
using NodeRef = QRT::InterfaceRef<MF::IRenderableNode>;
using CutlistRef = QRT::InterfaceRef<MF::IRenderableCutlist>;

template <class T>
T& Require(const QRT::InterfaceRef<T>& inRef)
{
    if (!inRef)
        throw QRT::NullInterfaceException();
    return *inRef.Get();
}

// The picture a sequence's nodes are built for: the sequence's settings when
// it answers them, else the defaults at a frame rate of 1.
struct BuildContext
{
    BE::SequenceSettings mSettings;
    bool mHasSettings = false;
};

BuildContext ContextOf(const QRT::InterfaceRef<QRT::QRTUnknown>& inSequence)
{
    BuildContext context;
    if (const auto settings = QRT::QueryRef<BE::ISequenceSettings>(inSequence))
    {
        context.mSettings = settings->GetSequenceSettings();
        context.mHasSettings = true;
    }
    else
    {
        context.mSettings.mFrameRate = mvxmediatypes::FrameRate::Create(1, 1);
    }
    return context;
}

// One track of a sweep: its index, mute and items.
struct TrackItems
{
    std::uint32_t mTrackIndex = 0;
    bool mMuted = false;
    std::vector<QRT::InterfaceRef<BE::ITrackItem>> mItems;
    // The items' identifiers within their sequence ("MediaNode::ClipID").
    std::vector<std::int32_t> mClipIDs;
    // What the sweep sees of the track: its items and transitions, in time
    // order (one sweep item per piece).
    std::vector<TrackPiece> mPieces;
};

// The track indices that an item's layer effects read (a track matte's
// matte track, a difference matte's layer), in effect and parameter order.
std::vector<std::uint32_t> LayerTracksOf(const BE::TrackItemSettings& inItem)
{
    std::vector<std::uint32_t> layers;
    for (const BE::EffectSettings& effect : inItem.mEffects)
    {
        if (effect.mMatchName == FX::kMatch_Opacity || effect.mMatchName == FX::kMatch_Motion)
            continue;
        const FX::EffectMade made = FX::CreateEffect(effect);
        if (!made.mEffect)
            continue;
        for (std::uint32_t i = 0; i < made.mEffect->GetParamCount(); ++i)
        {
            const FX::EffectParam& param = made.mEffect->GetParam(i);
            const double track = param.ValueAt(kTime_Zero);
            if (param.mType == FX::ParamType::kLayer && track >= 0.0 && track < FX::kNoLayer)
                layers.push_back(static_cast<std::uint32_t>(track));
        }
    }
    return layers;
}

// A piece of a track active in a segment.
struct PieceRef
{
    const TrackItems* mTrack = nullptr;
    std::size_t mPiece = 0;

    friend auto operator<=>(const PieceRef&, const PieceRef&) = default;
};

// The pieces of one segment by track index, where layer effects find their
// layers. Empty for the subtrees of layers themselves: a layer's own layer
// effects read nothing, so that layers never read each other in a cycle.
using SegmentLayers = std::map<std::uint32_t, PieceRef>;

// What a subtree's layer effects read: the piece of each layer track (a null
// track where the segment has none), in the order LayerTracksOf gives.
using LayerKey = std::vector<PieceRef>;

// The work of one factory operation: the trees of one sequence and of the
// sequences it nests, every item's clip subtree and every nested cutlist
// built once.
class TreeBuilder
{
public:
    CutlistRef BuildTrackGroup(const BE::ITrackGroup& inGroup, const BuildContext& inContext,
                               const MF::TickTimeRangeList& inRanges,
                               const QRT::ImmutableString& inName)
    {
        std::vector<TrackItems> tracks;
        std::vector<SweepTrack> sweep;
        std::int32_t clipID = 0;
        for (std::size_t index = 0; index < inGroup.GetTrackCount(); ++index)
        {
            BE::IVideoTrack& track = Require(inGroup.GetTrack(index));
            TrackItems& items = tracks.emplace_back();
            items.mTrackIndex = track.GetTrackIndex();
            items.mMuted = track.GetTrackSettings().mMuted;
            std::vector<const BE::TrackItemSettings*> settings;
            for (std::size_t item = 0; item < track.GetItemCount(); ++item)
            {
                auto ref = track.GetItem(item);
                settings.push_back(&Require(ref).GetSettings());
                items.mItems.push_back(std::move(ref));
                items.mClipIDs.push_back(clipID++);
            }
            TrackPlacement placement = PlaceTransitions(settings, items.mTrackIndex);
            if (!placement.mError.empty())
                throw QRT::Exception(placement.mError, QRT::kResult_NotFound);
            items.mPieces = std::move(placement.mPieces);
            SweepTrack& swept = sweep.emplace_back();
            for (const TrackPiece& piece : items.mPieces)
                swept.push_back(piece.mRange);
        }

        const QRT::InterfaceRef<IMutableCutlist> cutlist = CreateMutableCutlist(inName);
        // Ranges are swept one by one into one cutlist; sealing orders the
        // segments and lets an earlier range's segment win where two overlap.
        for (const MF::TickTimeRange& range : inRanges)
        {
            for (const SweptSegment& segment : SweepSegments(sweep, range.first, range.second))
            {
                TickTime origin = kTime_Max;
                for (const ActiveItem& active : segment.mActive)
                    origin = std::min(origin, tracks[active.mTrack].mPieces[active.mItem].mAnchor);
                const QRT::InterfaceRef<RenderableNodeCompositorImpl> compositor =
                    SegmentTree(tracks, segment.mActive, origin, inContext);
                cutlist->AddSegment(segment.mStart, segment.mEnd, segment.mStart - origin,
                                    compositor->GetSelfReference());
            }
        }
        cutlist->MakeImmutable();
        return cutlist;
    }

    // The tree of one segment: the active pieces bottom first in one
    // compositor, except that an adjustment item closes the compositor built
    // so far into an adjustment node, which becomes the first input of a new
    // compositor for the tracks above; and a track that a layer effect of
    // another active item reads is that effect's layer only, not drawn.
    QRT::InterfaceRef<RenderableNodeCompositorImpl>
    SegmentTree(const std::vector<TrackItems>& inTracks, const std::vector<ActiveItem>& inActive,
                TickTime inOrigin, const BuildContext& inContext)
    {
        SegmentLayers layers;
        for (const ActiveItem& active : inActive)
            layers[inTracks[active.mTrack].mTrackIndex] = {&inTracks[active.mTrack], active.mItem};
        std::set<std::uint32_t> readAsLayers;
        for (const ActiveItem& active : inActive)
        {
            const TrackItems& track = inTracks[active.mTrack];
            for (const std::size_t item : PieceItems(track.mPieces[active.mItem]))
                for (const std::uint32_t layer : LayerTracksOf(track.mItems[item]->GetSettings()))
                    if (layer != track.mTrackIndex && layers.contains(layer))
                        readAsLayers.insert(layer);
        }

        QRT::InterfaceRef<RenderableNodeCompositorImpl> compositor =
            RenderableNodeCompositorImpl::Create();
        std::optional<std::uint32_t> lowest;
        for (const ActiveItem& active : inActive)
        {
            const TrackItems& track = inTracks[active.mTrack];
            const TrackPiece& piece = track.mPieces[active.mItem];
            if (readAsLayers.contains(track.mTrackIndex))
                continue;
            if (!piece.IsTransition() &&
                track.mItems[piece.mItem]->GetSettings().IsAdjustmentLayer())
            {
                compositor->MakeImmutable();
                AdjustmentNodeSetup adjustment;
                adjustment.mBelow = compositor->GetSelfReference();
                adjustment.mBelowTrackIndex = lowest.value_or(track.mTrackIndex);
                adjustment.mClip = ClipSetup(track, piece.mItem, inContext, layers);
                adjustment.mClipOffset = piece.mAnchor - inOrigin;
                compositor = RenderableNodeCompositorImpl::Create();
                compositor->AddTrackInput(CreateAdjustmentNode(adjustment), kTime_Zero,
                                          adjustment.mBelowTrackIndex);
                lowest = adjustment.mBelowTrackIndex;
                continue;
            }
            compositor->AddTrackInput(PieceSubtree(track, active.mItem, inContext, layers),
                                      piece.mAnchor - inOrigin, track.mTrackIndex);
            lowest = std::min(lowest.value_or(track.mTrackIndex), track.mTrackIndex);
        }
        compositor->MakeImmutable();
        return compositor;
    }

    // The items whose clips a piece draws.
    static std::vector<std::size_t> PieceItems(const TrackPiece& inPiece)
    {
        if (!inPiece.IsTransition())
            return {inPiece.mItem};
        std::vector<std::size_t> items;
        for (const std::size_t item : {inPiece.mOutgoing, inPiece.mIncoming})
            if (item != kNoItem)
                items.push_back(item);
        return items;
    }

    // The layers an item's layer effects read in the segment.
    static LayerKey LayerKeyOf(const BE::TrackItemSettings& inItem, const SegmentLayers& inLayers)
    {
        LayerKey key;
        for (const std::uint32_t track : LayerTracksOf(inItem))
        {
            const auto found = inLayers.find(track);
            key.push_back(found != inLayers.end() ? found->second : PieceRef{});
        }
        return key;
    }

    CutlistRef BuildSequence(const QRT::InterfaceRef<BE::ISequence>& inSequence,
                             const MF::TickTimeRangeList& inRanges,
                             const QRT::ImmutableString& inName)
    {
        BE::ISequence& sequence = Require(inSequence);
        const BuildContext context = ContextOf(inSequence);
        if (sequence.GetTrackGroupCount() == 0)
        {
            const QRT::InterfaceRef<IMutableCutlist> empty = CreateMutableCutlist(inName);
            empty->MakeImmutable();
            return empty;
        }
        return BuildTrackGroup(Require(sequence.GetTrackGroup(0)), context, inRanges, inName);
    }

    // The subtree of one piece of a track: the item's clip, or the
    // transition over the clips it changes between.
    NodeRef PieceSubtree(const TrackItems& inTrack, std::size_t inPiece,
                         const BuildContext& inContext, const SegmentLayers& inLayers = {})
    {
        const TrackPiece& piece = inTrack.mPieces[inPiece];
        if (!piece.IsTransition())
            return ClipSubtree(inTrack, piece.mItem, inContext, inLayers);
        LayerKey key;
        for (const std::size_t item : PieceItems(piece))
            for (const PieceRef& layer : LayerKeyOf(inTrack.mItems[item]->GetSettings(), inLayers))
                key.push_back(layer);
        const auto found = mTransitions.find({&inTrack, inPiece, key});
        if (found != mTransitions.end())
            return found->second;
        const BE::TrackItemSettings& carrier = inTrack.mItems[piece.mCarrier]->GetSettings();
        const TX::TransitionCreation creation =
            TX::CreateTransition(carrier.mTransitions[piece.mTransition]);
        if (!creation.mTransition)
            throw QRT::Exception(creation.mError + " on item " + std::to_string(piece.mCarrier) +
                                     " of track " + std::to_string(inTrack.mTrackIndex),
                                 QRT::kResult_NotFound);
        TransitionNodeSetup setup;
        setup.mTransition = creation.mTransition;
        if (piece.mOutgoing != kNoItem)
        {
            setup.mOutgoing = ClipSubtree(inTrack, piece.mOutgoing, inContext, inLayers);
            setup.mOutgoingOffset =
                inTrack.mItems[piece.mOutgoing]->GetSettings().mStart - piece.mAnchor;
        }
        if (piece.mIncoming != kNoItem)
        {
            setup.mIncoming = ClipSubtree(inTrack, piece.mIncoming, inContext, inLayers);
            setup.mIncomingOffset =
                inTrack.mItems[piece.mIncoming]->GetSettings().mStart - piece.mAnchor;
        }
        NodeRef node = CreateTransitionNode(setup);
        mTransitions.emplace(std::tuple{&inTrack, inPiece, std::move(key)}, node);
        return node;
    }

    // The clip node of one item over its media node, its layer effects
    // reading their layers from inLayers.
    NodeRef ClipSubtree(const TrackItems& inTrack, std::size_t inItem,
                        const BuildContext& inContext, const SegmentLayers& inLayers = {})
    {
        const QRT::InterfaceRef<BE::ITrackItem>& item = inTrack.mItems[inItem];
        std::pair key{item.Get(), LayerKeyOf(Require(item).GetSettings(), inLayers)};
        const auto found = mClips.find(key);
        if (found != mClips.end())
            return found->second;
        NodeRef node = CreateClipNode(ClipSetup(inTrack, inItem, inContext, inLayers));
        mClips.emplace(std::move(key), node);
        return node;
    }

    // What the clip node of one item is made of.
    ClipNodeSetup ClipSetup(const TrackItems& inTrack, std::size_t inItem,
                            const BuildContext& inContext, const SegmentLayers& inLayers)
    {
        const QRT::InterfaceRef<BE::ITrackItem>& item = inTrack.mItems[inItem];
        MediaNodeSetup media;
        media.mMedia = Require(item).GetMedia();
        media.mTrackItem = item;
        media.mSequence = inContext.mSettings;
        media.mHasSequence = inContext.mHasSettings;
        media.mClipID = inTrack.mClipIDs[inItem];
        media.mMuted = inTrack.mMuted;
        media.mNestedCutlist = NestedCutlist(Require(media.mMedia));

        ClipNodeSetup clip;
        clip.mTrackItem = item;
        clip.mInput = MediaInput(media);
        clip.mOperators = EffectNodes(Require(item).GetSettings(), inContext, media.mStreamLabel,
                                      inLayers, inTrack.mTrackIndex);
        clip.mTrackID = inTrack.mTrackIndex;
        return clip;
    }

    // The node of a media in a clip's subtree: its media node, or for a
    // multicam media a multicam node over the subtrees of its angles, each
    // played through the same item.
    NodeRef MediaInput(const MediaNodeSetup& inSetup)
    {
        const auto multicam = QRT::QueryRef<BE::IMulticamMedia>(inSetup.mMedia);
        if (!multicam)
            return CreateMediaNode(inSetup);
        const BE::MulticamSettings& settings = inSetup.mMedia->GetMediaSettings().mMulticam;
        MulticamNodeSetup node;
        node.mSource = multicam;
        node.mSelectedTrack = settings.mSelected;
        node.mShowProgram = settings.mShowProgram;
        node.mRecording = settings.mRecording;
        for (std::size_t i = 0; i < multicam->GetAngleCount(); ++i)
        {
            MediaNodeSetup angle = inSetup;
            angle.mMedia = multicam->GetAngle(i);
            angle.mNestedCutlist = NestedCutlist(Require(angle.mMedia));
            angle.mSelectedMulticamTrack = settings.mSelected;
            node.mAngles.push_back(MediaInput(angle));
        }
        return CreateMulticamNode(node);
    }

    // The sealed effect nodes of an item's effects, in order; its opacity
    // and motion are the clip's own keyframes, not operators. An effect the
    // catalogue refuses throws QRT::Exception naming the effect.
    // A layer effect reads the segment's piece on the track its layer
    // parameter names (not the item's own track; nothing where the segment
    // has no piece there), built without layers of its own.
    std::vector<NodeRef> EffectNodes(const BE::TrackItemSettings& inItem,
                                     const BuildContext& inContext,
                                     const std::string& inStreamLabel,
                                     const SegmentLayers& inLayers, std::uint32_t inOwnTrack)
    {
        std::vector<NodeRef> nodes;
        for (const BE::EffectSettings& effect : inItem.mEffects)
        {
            if (effect.mMatchName == FX::kMatch_Opacity || effect.mMatchName == FX::kMatch_Motion)
                continue;
            FX::EffectMade made = FX::CreateEffect(effect, inItem.mEnd - inItem.mStart);
            if (!made.mEffect)
                throw QRT::Exception("the track item's effect cannot be made: " + made.mError,
                                     QRT::kResult_NotFound);
            EffectNodeSetup setup;
            setup.mEffect = std::move(made.mEffect);
            setup.mFrameRate = inContext.mSettings.mFrameRate;
            setup.mStreamLabel = inStreamLabel;
            for (std::uint32_t i = 0; i < setup.mEffect->GetParamCount(); ++i)
            {
                const FX::EffectParam& param = setup.mEffect->GetParam(i);
                if (param.mType != FX::ParamType::kLayer)
                    continue;
                const double track = param.ValueAt(kTime_Zero);
                const auto found = track >= 0.0 && track < FX::kNoLayer
                                       ? inLayers.find(static_cast<std::uint32_t>(track))
                                       : inLayers.end();
                if (found == inLayers.end() || found->first == inOwnTrack)
                    continue;
                const PieceRef layer = found->second;
                setup.mLayerInputs.push_back(
                    {PieceSubtree(*layer.mTrack, layer.mPiece, inContext),
                     layer.mTrack->mPieces[layer.mPiece].mAnchor - inItem.mStart});
            }
            nodes.push_back(CreateEffectNode(setup));
        }
        return nodes;
    }

    // The whole cutlist of a nested-sequence media (empty for other media).
    // Sequences are immutable and built bottom-up, so nesting has no cycles.
    CutlistRef NestedCutlist(const BE::ISequenceMedia& inMedia)
    {
        const QRT::InterfaceRef<BE::ISequence> nested = inMedia.GetNestedSequence();
        if (!nested)
            return {};
        const auto found = mNested.find(nested.Get());
        if (found != mNested.end())
            return found->second;
        CutlistRef cutlist = BuildSequence(nested, {{kTime_Min, kTime_Max}},
                                           QRT::ImmutableString::CreateDynamic(nested->GetName()));
        mNested.emplace(nested.Get(), cutlist);
        return cutlist;
    }

private:
    std::map<std::pair<const BE::ITrackItem*, LayerKey>, NodeRef> mClips;
    std::map<std::tuple<const TrackItems*, std::size_t, LayerKey>, NodeRef> mTransitions;
    std::map<const BE::ISequence*, CutlistRef> mNested;
};

const MF::TickTimeRangeList kWholeTime{{kTime_Min, kTime_Max}};

CutlistRef SealOneSegment(TickTime inStart, TickTime inEnd, const NodeRef& inInput)
{
    const QRT::InterfaceRef<RenderableNodeCompositorImpl> compositor =
        RenderableNodeCompositorImpl::Create();
    compositor->AddTrackInput(inInput, kTime_Zero, 0);
    compositor->MakeImmutable();
    const QRT::InterfaceRef<IMutableCutlist> cutlist = CreateMutableCutlist(QRT::ImmutableString());
    cutlist->AddSegment(inStart, inEnd, kTime_Zero, compositor->GetSelfReference());
    cutlist->MakeImmutable();
    return cutlist;
}

class CutlistFactory : public QRT::Implements<MF::IRenderableCutlistFactory>
{
public:
    QRT::Result CreateSequenceCutlist(const MF::HostObjectRef& inSequence,
                                      const QRT::ImmutableString& inName,
                                      CutlistRef& outCutlist) override
    {
        return CreateSequenceCutlistForRanges(inSequence, kWholeTime, inName, outCutlist);
    }

    QRT::Result CreateSequenceCutlistForRanges(const MF::HostObjectRef& inSequence,
                                               const MF::TickTimeRangeList& inRanges,
                                               const QRT::ImmutableString& inName,
                                               CutlistRef& outCutlist) override
    {
        outCutlist.Reset();
        const auto sequence = QRT::QueryRef<BE::ISequence>(inSequence);
        if (!sequence)
            return QRT::kResult_NotFound;
        outCutlist = TreeBuilder().BuildSequence(sequence, inRanges, inName);
        return QRT::kResult_Success;
    }

    QRT::Result CreateTrackGroupCutlist(const MF::HostObjectRef& inTrackGroup,
                                        const QRT::ImmutableString& inName,
                                        CutlistRef& outCutlist) override
    {
        return CreateTrackGroupCutlistForRanges(inTrackGroup, kWholeTime, inName, outCutlist);
    }

    QRT::Result CreateTrackGroupCutlistForRanges(const MF::HostObjectRef& inTrackGroup,
                                                 const MF::TickTimeRangeList& inRanges,
                                                 const QRT::ImmutableString& inName,
                                                 CutlistRef& outCutlist) override
    {
        outCutlist.Reset();
        const auto group = QRT::QueryRef<BE::ITrackGroup>(inTrackGroup);
        if (!group)
            return QRT::kResult_NotFound;
        // A group alone does not know its sequence: its nodes are built for
        // the default picture, which the render parameters then conform.
        outCutlist =
            TreeBuilder().BuildTrackGroup(*group, ContextOf(inTrackGroup), inRanges, inName);
        return QRT::kResult_Success;
    }

    QRT::Result CreateTrackItemCutlist(const MF::HostObjectRef& inTrackItem,
                                       CutlistRef& outCutlist) override
    {
        outCutlist.Reset();
        const auto item = QRT::QueryRef<BE::ITrackItem>(inTrackItem);
        if (!item)
            return QRT::kResult_NotFound;
        TrackItems track;
        track.mItems.push_back(item);
        track.mClipIDs.push_back(0);
        const BE::TrackItemSettings& settings = item->GetSettings();
        const NodeRef clip = TreeBuilder().ClipSubtree(track, 0, ContextOf(inTrackItem));
        outCutlist = SealOneSegment(settings.mStart, settings.mEnd, clip);
        return QRT::kResult_Success;
    }

    QRT::Result CreateMediaCutlist(const MF::HostObjectRef& inMedia,
                                   CutlistRef& outCutlist) override
    {
        outCutlist.Reset();
        const auto media = QRT::QueryRef<BE::ISequenceMedia>(inMedia);
        if (!media)
            return QRT::kResult_NotFound;
        MediaNodeSetup setup;
        setup.mMedia = media;
        setup.mSequence.mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
        setup.mSequence.mFrameRate = mvxmediatypes::kFrameRate_Zero;
        TreeBuilder builder;
        setup.mNestedCutlist = builder.NestedCutlist(*media);
        const NodeRef node = builder.MediaInput(setup);
        TickTime duration = kTime_Max;
        if ((node->GetRenderFlags() & kRenderFlag_TimeInvariant) == 0)
            duration = Require(QRT::QueryRef<BE::IMediaDuration>(inMedia)).GetDuration();
        outCutlist = SealOneSegment(kTime_Zero, duration, node);
        return QRT::kResult_Success;
    }

    // A preview of a sequence range lies over that range of the sequence;
    // the segment's node time 0 at its start is the file's first frame.
    QRT::Result CreatePreviewCutlist(const MF::HostObjectRef& inPreview,
                                     CutlistRef& outCutlist) override
    {
        outCutlist.Reset();
        const auto range = QRT::QueryRef<BE::IPreviewRange>(inPreview);
        if (!range)
            return QRT::kResult_NotFound;
        const QRT::InterfaceRef<BE::IPreviewNode> preview = range->GetPreview();
        const BE::PreviewSettings& settings = Require(preview).GetPreviewSettings();
        outCutlist = SealOneSegment(settings.mStart, settings.mEnd, CreatePreviewNode(preview));
        return QRT::kResult_Success;
    }

    // A preview file played on its own starts at time zero.
    QRT::Result CreatePreviewSourceCutlist(const MF::HostObjectRef& inPreviewSource,
                                           CutlistRef& outCutlist) override
    {
        outCutlist.Reset();
        const auto file = QRT::QueryRef<BE::IPreviewFileSource>(inPreviewSource);
        if (!file)
            return QRT::kResult_NotFound;
        const QRT::InterfaceRef<BE::IPreviewNode> preview = file->GetPreview();
        const BE::PreviewSettings& settings = Require(preview).GetPreviewSettings();
        outCutlist =
            SealOneSegment(kTime_Zero, settings.mEnd - settings.mStart, CreatePreviewNode(preview));
        return QRT::kResult_Success;
    }

    QRT::Result CreateMergedCutlist(const std::vector<CutlistRef>& inCutlists,
                                    const QRT::ImmutableString& inName,
                                    CutlistRef& outCutlist) override
    {
        outCutlist.Reset();
        if (std::none_of(inCutlists.begin(), inCutlists.end(),
                         [](const CutlistRef& inCutlist) { return bool(inCutlist); }))
            return QRT::kResult_NotFound;
        // Folded from the first: what is merged so far wins over the next.
        const QRT::InterfaceRef<IMutableCutlist> empty = CreateMutableCutlist(inName);
        empty->MakeImmutable();
        CutlistRef merged = empty;
        for (const CutlistRef& next : inCutlists)
            if (next)
                merged = MergeCutlists(*merged, *next, inName);
        outCutlist = merged;
        return QRT::kResult_Success;
    }

    QRT::Result CreateSequenceCutlistWithObject(const MF::HostObjectRef& inExtra,
                                                const MF::HostObjectRef& inSequence,
                                                const QRT::ImmutableString& inName,
                                                CutlistRef& outCutlist) override
    {
        outCutlist.Reset();
        const auto overlay = QRT::QueryRef<BE::ISequenceOverlay>(inExtra);
        const auto sequence = QRT::QueryRef<BE::ISequence>(inSequence);
        if (!overlay || !sequence)
            return QRT::kResult_NotFound;
        const CutlistRef own = TreeBuilder().BuildSequence(sequence, kWholeTime, inName);
        const CutlistRef laid = overlay->GetOverlayCutlist();
        outCutlist = laid ? MergeCutlists(*laid, *own, inName) : own;
        return QRT::kResult_Success;
    }

    QRT::InterfaceRef<MF::IRenderableCutlistFactory> GetSelfReference()
    {
        return QRT::InterfaceRef<MF::IRenderableCutlistFactory>(this);
    }

protected:
    ~CutlistFactory() = default;
};

} // namespace

QRT::InterfaceRef<MF::IRenderableCutlistFactory> CreateCutlistFactory()
{
    return QRT::Allocated<CutlistFactory>::Create<MF::IRenderableCutlistFactory>();
}

} // namespace ML
