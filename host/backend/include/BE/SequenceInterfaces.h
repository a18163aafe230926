#pragma once

// The host interfaces of the back end's sequence model: the objects the
// cutlist factory reads when it turns a sequence into a renderable cutlist.
//
//   ISequence          a sequence: its name, track groups and length
//   ISequenceSettings  the sequence's frame rate, frame size, pixel aspect
//                      ratio and field type (answered by the sequence)
//   ITrackGroup        the video tracks of a sequence, bottom track first
//   IVideoTrack        one track: its index, muted and locked flags, items
//   ITrackItem         one item: start and end in sequence time, flags,
//                      media, clip settings, keyframes, effects, transitions
//   IClipSettings      how the item plays its media (answered by the item)
//   ISequenceMedia     the media an item plays and its video streams
//   IMediaStream       one video stream of a media
//   IMediaDuration     the media's length (answered by the media)
//   IStillRanges       where the media's picture does not change (the media)
//   IMulticamMedia     the camera angles of a multicam media (answered by
//                      multicam media alone)
//   ISequenceOverlay   a cutlist laid over a sequence's own
//
// Every object is immutable once built (BE/Sequence.h), so every operation
// may be called from any thread at once. References handed out keep the
// answered objects alive.

#include "BE/IVideoSource.h"
#include "BE/SequenceTypes.h"
#include "MF/RenderableCutlist.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"

#include <cstdint>
#include <string>
#include <vector>

namespace BE
{

class ISequence;
class ISequenceMedia;
class ITrackItem;
class IVideoTrack;

class ISequenceSettings : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{ca40c1b8-db43-4842-94df-e6b80fafaf87}");

    virtual const SequenceSettings& GetSequenceSettings() const noexcept = 0;

protected:
    ~ISequenceSettings() = default;
};

class ITrackGroup : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{f68dcd82-8805-11d5-af2d-9bfa89d4ddd4}");

    virtual std::size_t GetTrackCount() const noexcept = 0;
    // Input contract: inIndex < GetTrackCount().
    virtual QRT::InterfaceRef<IVideoTrack> GetTrack(std::size_t inIndex) const = 0;

protected:
    ~ITrackGroup() = default;
};

class ISequence : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{e602a75b-e7e2-47d8-bca9-a9bf7e72d2fc}");

    virtual const std::string& GetName() const noexcept = 0;
    virtual std::size_t GetTrackGroupCount() const noexcept = 0;
    // Group 0 holds the video tracks. Input contract: inIndex < count.
    virtual QRT::InterfaceRef<ITrackGroup> GetTrackGroup(std::size_t inIndex) const = 0;
    // The end of the last item on any track (kTime_Zero when empty).
    virtual mvxmediatypes::TickTime GetEnd() const noexcept = 0;

protected:
    ~ISequence() = default;
};

class IVideoTrack : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{5d1c0a7e-36b4-4f0b-9e8d-2a6f4c9b7e13}");

    // Position in the group, bottom track 0.
    virtual std::uint32_t GetTrackIndex() const noexcept = 0;
    virtual const TrackSettings& GetTrackSettings() const noexcept = 0;
    virtual std::size_t GetItemCount() const noexcept = 0;
    // Items in time order, never overlapping. Input contract: inIndex < count.
    virtual QRT::InterfaceRef<ITrackItem> GetItem(std::size_t inIndex) const = 0;
    // The item under inTime (start <= inTime < end), or empty.
    virtual QRT::InterfaceRef<ITrackItem> FindItemAt(mvxmediatypes::TickTime inTime) const = 0;

protected:
    ~IVideoTrack() = default;
};

class IClipSettings : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{0b7e91f4-52c3-4d6a-8f27-c4e1d08a6b95}");

    virtual const ClipSettings& GetClipSettings() const noexcept = 0;

protected:
    ~IClipSettings() = default;
};

class ITrackItem : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{064ec681-9ba6-11d5-af2d-9ca32c7d6164}");

    // Start, end, flags, blend mode, clip settings, keyframes, effects and
    // transitions.
    virtual const TrackItemSettings& GetSettings() const noexcept = 0;
    virtual QRT::InterfaceRef<ISequenceMedia> GetMedia() const = 0;
    virtual QRT::InterfaceRef<IClipSettings> GetClip() = 0;

protected:
    ~ITrackItem() = default;
};

class IMediaStream : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{9a42d6c3-7f18-4e5b-b0a1-63d8e2f4c507}");

    virtual const StreamSettings& GetStreamSettings() const noexcept = 0;
    // The source of the stream's frames; empty for offline and pending media
    // and for nested sequences (rendered from their own cutlists).
    virtual QRT::InterfaceRef<Deprecated::IVideoSource> GetVideoSource() const = 0;

protected:
    ~IMediaStream() = default;
};

class ISequenceMedia : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{e81b5f27-c90d-4a36-9d4e-7b2c1a85f60e}");

    virtual const MediaSettings& GetMediaSettings() const noexcept = 0;
    virtual std::size_t GetVideoStreamCount() const noexcept = 0;
    // Input contract: inIndex < GetVideoStreamCount().
    virtual QRT::InterfaceRef<IMediaStream> GetVideoStream(std::size_t inIndex) const = 0;
    // Offline: the material is missing or marked so; it renders as a placeholder.
    virtual bool IsOffline() const noexcept = 0;
    virtual bool IsPending() const noexcept = 0;
    virtual bool IsDraft() const noexcept = 0;
    // A single picture at every time (still images, solids, unmoving patterns).
    virtual bool IsStill() const noexcept = 0;
    virtual const MF::BinaryData& GetOpaqueData() const noexcept = 0;
    virtual const ColorProfile& GetColorProfile() const noexcept = 0;
    // The sequence a nested-sequence media plays; empty for other media.
    virtual QRT::InterfaceRef<ISequence> GetNestedSequence() const = 0;

protected:
    ~ISequenceMedia() = default;
};

class IMediaDuration : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{fc43a200-2ba6-4e99-a642-3a9b538cd72d}");

    // kTime_Max for media without an end (stills, solids, patterns).
    virtual mvxmediatypes::TickTime GetDuration() const noexcept = 0;

protected:
    ~IMediaDuration() = default;
};

class IStillRanges : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{3f6e2b90-d4a7-4c18-85e3-19b0c7d2a64f}");

    // Appends the media-time ranges within [inStart, inEnd] over which the
    // picture does not change, clipped to [inStart, inEnd], in time order.
    virtual void GetStillRanges(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                                MF::TickTimeRangeList& ioRanges) const = 0;

protected:
    ~IStillRanges() = default;
};

// The angles of a multicam media, in the order the selected index counts
// them; which one is shown is the media's MediaSettings::mMulticam.
class IMulticamMedia : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{8b0d5e3a-61c4-4f2e-9a57-c2e41d7b0f93}");

    virtual std::size_t GetAngleCount() const noexcept = 0;
    // Input contract: inIndex < GetAngleCount().
    virtual QRT::InterfaceRef<ISequenceMedia> GetAngle(std::size_t inIndex) const = 0;

protected:
    ~IMulticamMedia() = default;
};

// A cutlist that is rendered in place of a sequence's own wherever it has
// segments (a part of the sequence rendered ahead, say); the sequence fills
// the rest. Handed to the cutlist factory beside the sequence.
class ISequenceOverlay : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{2917b008-6311-47be-b3dd-21df65b53e78}");

    // Sealed; empty when nothing is laid over the sequence.
    virtual QRT::InterfaceRef<MF::IRenderableCutlist> GetOverlayCutlist() const = 0;

protected:
    ~ISequenceOverlay() = default;
};

} // namespace BE
