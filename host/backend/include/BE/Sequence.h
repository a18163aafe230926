#pragma once

// Building and editing the back end's sequences (interfaces in
// BE/SequenceInterfaces.h).
//
// Media, track items and sequences are built here and immutable from then
// on, so a sequence may be handed to the renderer and read from any thread.
// An edit never changes an object: it answers a new sequence in which the
// edited item, its track, the track group and the sequence are new objects
// and everything else (the other tracks and items, every media) is the very
// same object as before.
//
// Every function may be called from any thread; a builder belongs to one
// thread at a time.

#include "BE/SequenceInterfaces.h"
#include "BE/VideoSources.h"

#include <string>
#include <vector>

namespace BE
{

using SequenceRef = QRT::InterfaceRef<ISequence>;
using MediaRef = QRT::InterfaceRef<ISequenceMedia>;
using TrackItemRef = QRT::InterfaceRef<ITrackItem>;

struct MediaResult
{
    // Empty when the media could not be made.
    MediaRef mMedia;
    // The reason when mMedia is empty (an unreadable file, a bad pattern);
    // for a missing file it is a success naming the file.
    OpenStatus mStatus;
    // The file does not exist: the media is offline (IsOffline).
    bool mMissing = false;
};

// Makes a media and opens its material now: a file or still through
// OpenVideoSource (unless the settings mark it offline), a pattern from its
// text, a solid colour as a solid pattern of the stream's size, a nested
// sequence from inNested (input contract: given exactly for kSequence). A
// file that does not exist is not a failure: the media is offline.
MediaResult CreateMedia(const MediaSettings& inSettings, const SequenceRef& inNested = {});

// Makes a multicam media (kMulticam settings) over inAngles, which answers
// IMulticamMedia. Its stream is the settings' stream, else the first
// angle's; its length the longest angle's unless the settings give one; it
// is a still when every angle is. Input contracts: inSettings.mKind is
// kMulticam, at least one angle, none empty, mMulticam.mSelected below the
// number of angles.
MediaRef CreateMulticamMedia(const MediaSettings& inSettings, std::vector<MediaRef> inAngles);

// An item playing inMedia. Input contracts: inMedia is not empty,
// mEnd > mStart, a speed that is finite, non-zero and at most kMaxClipSpeed
// in magnitude.
TrackItemRef CreateTrackItem(const TrackItemSettings& inSettings, const MediaRef& inMedia);

class SequenceBuilder
{
public:
    SequenceBuilder(std::string inName, const SequenceSettings& inSettings);

    // Adds a track above the others; answers its index.
    std::size_t AddTrack(const TrackSettings& inSettings = {});
    // Input contract: inTrack < the number of tracks added.
    SequenceBuilder& AddItem(std::size_t inTrack, const TrackItemRef& inItem);
    SequenceBuilder& AddItem(std::size_t inTrack, const TrackItemSettings& inSettings,
                             const MediaRef& inMedia);

    // The sequence; items are put in time order. Input contract: no two
    // items of one track overlap. The builder is empty afterwards.
    SequenceRef Build();

private:
    struct Track
    {
        TrackSettings mSettings;
        std::vector<TrackItemRef> mItems;
    };

    std::string mName;
    SequenceSettings mSettings;
    std::vector<Track> mTracks;
};

// inSequence with item inItem of track inTrack (of the video group) replaced
// by inReplacement. Input contracts: the indices exist; the replacement
// overlaps no other item of the track.
SequenceRef ReplaceTrackItem(const SequenceRef& inSequence, std::size_t inTrack, std::size_t inItem,
                             const TrackItemRef& inReplacement);

// inSequence with track inTrack's muted and locked flags replaced.
SequenceRef ReplaceTrackSettings(const SequenceRef& inSequence, std::size_t inTrack,
                                 const TrackSettings& inSettings);

// True when the two sequences describe the same thing: names, settings,
// tracks, items and media (nested sequences compared the same way), whether
// or not they share objects.
bool SameSequence(const ISequence& inLeft, const ISequence& inRight);

} // namespace BE
