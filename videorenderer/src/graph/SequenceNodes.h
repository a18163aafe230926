#pragma once

// Creation of the node kinds the cutlist factory builds from the back end's
// sequence objects: the media node (one video stream of one media, read
// through the clip settings of the item that plays it) and the clip node
// (one track item placed in sequence time over its media node). Each
// function reads the host objects once, fills the node's keys, builds what
// the node renders through, seals the node and answers it, ready to be an
// input of a compositor. Any thread may call them.
//
// Times. A clip node's time 0 is its track item's start; its only input (the
// media node, or the tree of a nested sequence) sits at offset 0, and the
// clip's time transform maps clip time to that input's time, which for a
// media node is media time.

#include "BE/SequenceInterfaces.h"
#include "MF/RenderableCutlist.h"
#include "MF/RenderableNode.h"
#include "QRT/InterfaceRef.h"
#include "mvxmediatypes/TickTime.h"

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace ML
{

struct MediaNodeSetup
{
    // Required (an empty one throws QRT::NullInterfaceException).
    QRT::InterfaceRef<BE::ISequenceMedia> mMedia;
    std::size_t mStreamIndex = 0;
    std::string mStreamLabel;
    // The item that plays the media, which supplies the clip settings;
    // empty for a media rendered alone (its own cutlist).
    QRT::InterfaceRef<BE::ITrackItem> mTrackItem;
    // The sequence the media plays in. For a media rendered alone, the
    // media's own stream with square pixels and a zero frame rate.
    BE::SequenceSettings mSequence;
    bool mHasSequence = false;
    // The item's identifier within its sequence ("MediaNode::ClipID").
    std::int32_t mClipID = 0;
    // The track's or the item's mute: the media renders as black.
    bool mMuted = false;
    // For a nested-sequence media: the nested sequence's cutlist, built and
    // sealed by the factory. Empty for other media.
    QRT::InterfaceRef<MF::IRenderableCutlist> mNestedCutlist;
    // For an angle of a multicam media: the multicam's selected angle
    // ("MediaNode::SelectedMulticamTrack"). Unset for other media.
    std::optional<std::uint64_t> mSelectedMulticamTrack;
};

// A sealed "RenderableNodeMediaImpl".
QRT::InterfaceRef<MF::IRenderableNode> CreateMediaNode(const MediaNodeSetup& inSetup);

struct ClipNodeSetup
{
    // Required (an empty one throws QRT::NullInterfaceException).
    QRT::InterfaceRef<BE::ITrackItem> mTrackItem;
    // The sealed input: the item's media node. Required.
    QRT::InterfaceRef<MF::IRenderableNode> mInput;
    // Sealed effect nodes applied in order (none until effects exist).
    std::vector<QRT::InterfaceRef<MF::IRenderableNode>> mOperators;
    // The track's index in its group ("ClipNode::TrackID").
    std::uint32_t mTrackID = 0;
    // The item's times as the segment uses them; kTime_Invalid for the
    // item's own start and end.
    mvxmediatypes::TickTime mEffectiveStart = mvxmediatypes::kTime_Invalid;
    mvxmediatypes::TickTime mEffectiveEnd = mvxmediatypes::kTime_Invalid;
};

// A sealed "RenderableNodeClipImpl".
QRT::InterfaceRef<MF::IRenderableNode> CreateClipNode(const ClipNodeSetup& inSetup);

} // namespace ML
