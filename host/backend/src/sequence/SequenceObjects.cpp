// The back end's sequence objects and their building and editing
// (BE/Sequence.h): sequences, the video track group, tracks, track items,
// media and media streams. Every object is immutable after construction.

#include "BE/Sequence.h"
#include "QRT/Allocated.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <cmath>
#include <filesystem>

namespace BE
{
namespace
{

namespace mt = mvxmediatypes;

using TrackRef = QRT::InterfaceRef<IVideoTrack>;
using GroupRef = QRT::InterfaceRef<ITrackGroup>;

// One video stream; owned by its media.
class MediaStream : public QRT::Implements<IMediaStream>
{
public:
    MediaStream(const StreamSettings& inSettings, VideoSourceRef inSource)
        : mSettings(inSettings)
        , mSource(std::move(inSource))
    {
    }

    const StreamSettings& GetStreamSettings() const noexcept override { return mSettings; }
    VideoSourceRef GetVideoSource() const override { return mSource; }

private:
    const StreamSettings mSettings;
    const VideoSourceRef mSource;
};

// A media with one video stream, shared by every item that plays it.
class Media : public QRT::Implements<ISequenceMedia, IMediaDuration, IStillRanges>
{
public:
    Media(const MediaSettings& inSettings, const StreamSettings& inStream, VideoSourceRef inSource,
          SequenceRef inNested, bool inStill, bool inMissing, mt::TickTime inDuration)
        : mSettings(inSettings)
        , mStream(QRT::Allocated<MediaStream>::Create<IMediaStream>(inStream, std::move(inSource)))
        , mNested(std::move(inNested))
        , mStill(inStill)
        , mMissing(inMissing)
        , mDuration(inDuration)
    {
    }

    const MediaSettings& GetMediaSettings() const noexcept override { return mSettings; }
    std::size_t GetVideoStreamCount() const noexcept override { return 1; }
    QRT::InterfaceRef<IMediaStream> GetVideoStream(std::size_t inIndex) const override
    {
        MVX_INPUT_CONTRACT(inIndex == 0);
        return mStream;
    }
    bool IsOffline() const noexcept override { return mSettings.mOffline || mMissing; }
    bool IsPending() const noexcept override { return mSettings.mPending; }
    bool IsDraft() const noexcept override { return mSettings.mDraft; }
    bool IsStill() const noexcept override { return mStill; }
    const MF::BinaryData& GetOpaqueData() const noexcept override { return mSettings.mOpaqueData; }
    const ColorProfile& GetColorProfile() const noexcept override
    {
        return mSettings.mColorProfile;
    }
    SequenceRef GetNestedSequence() const override { return mNested; }

    mt::TickTime GetDuration() const noexcept override { return mDuration; }

    void GetStillRanges(mt::TickTime inStart, mt::TickTime inEnd,
                        MF::TickTimeRangeList& ioRanges) const override
    {
        if (mStill && inStart <= inEnd)
            ioRanges.emplace_back(std::max(inStart, mt::kTime_Zero), inEnd);
    }

private:
    const MediaSettings mSettings;
    const QRT::InterfaceRef<IMediaStream> mStream;
    const SequenceRef mNested;
    const bool mStill;
    const bool mMissing;
    const mt::TickTime mDuration;
};

class TrackItem : public QRT::Implements<ITrackItem, IClipSettings>
{
public:
    TrackItem(const TrackItemSettings& inSettings, MediaRef inMedia)
        : mSettings(inSettings)
        , mMedia(std::move(inMedia))
    {
    }

    const TrackItemSettings& GetSettings() const noexcept override { return mSettings; }
    MediaRef GetMedia() const override { return mMedia; }
    QRT::InterfaceRef<IClipSettings> GetClip() override
    {
        return QRT::InterfaceRef<IClipSettings>(static_cast<IClipSettings*>(this));
    }
    const ClipSettings& GetClipSettings() const noexcept override { return mSettings.mClip; }

private:
    const TrackItemSettings mSettings;
    const MediaRef mMedia;
};

void CheckNoOverlap(const std::vector<TrackItemRef>& inItems)
{
    for (std::size_t i = 1; i < inItems.size(); ++i)
        MVX_INPUT_CONTRACT(inItems[i - 1]->GetSettings().mEnd <= inItems[i]->GetSettings().mStart);
}

class VideoTrack : public QRT::Implements<IVideoTrack>
{
public:
    VideoTrack(std::uint32_t inIndex, const TrackSettings& inSettings,
               std::vector<TrackItemRef> inItems)
        : mIndex(inIndex)
        , mSettings(inSettings)
        , mItems(std::move(inItems))
    {
        CheckNoOverlap(mItems);
    }

    std::uint32_t GetTrackIndex() const noexcept override { return mIndex; }
    const TrackSettings& GetTrackSettings() const noexcept override { return mSettings; }
    std::size_t GetItemCount() const noexcept override { return mItems.size(); }
    TrackItemRef GetItem(std::size_t inIndex) const override
    {
        MVX_INPUT_CONTRACT(inIndex < mItems.size());
        return mItems[inIndex];
    }
    TrackItemRef FindItemAt(mt::TickTime inTime) const override
    {
        // The first item ending after inTime is the only one that can hold it.
        const auto found = std::upper_bound(mItems.begin(), mItems.end(), inTime,
                                            [](mt::TickTime inT, const TrackItemRef& inItem)
                                            { return inT < inItem->GetSettings().mEnd; });
        if (found == mItems.end() || (*found)->GetSettings().mStart > inTime)
            return {};
        return *found;
    }

    const std::vector<TrackItemRef>& Items() const { return mItems; }

private:
    const std::uint32_t mIndex;
    const TrackSettings mSettings;
    const std::vector<TrackItemRef> mItems;
};

class TrackGroup : public QRT::Implements<ITrackGroup>
{
public:
    explicit TrackGroup(std::vector<TrackRef> inTracks)
        : mTracks(std::move(inTracks))
    {
    }

    std::size_t GetTrackCount() const noexcept override { return mTracks.size(); }
    TrackRef GetTrack(std::size_t inIndex) const override
    {
        MVX_INPUT_CONTRACT(inIndex < mTracks.size());
        return mTracks[inIndex];
    }

    const std::vector<TrackRef>& Tracks() const { return mTracks; }

private:
    const std::vector<TrackRef> mTracks;
};

class Sequence : public QRT::Implements<ISequence, ISequenceSettings>
{
public:
    Sequence(std::string inName, const SequenceSettings& inSettings, GroupRef inVideo)
        : mName(std::move(inName))
        , mSettings(inSettings)
        , mVideo(std::move(inVideo))
        , mEnd(ComputeEnd(*mVideo))
    {
    }

    const std::string& GetName() const noexcept override { return mName; }
    std::size_t GetTrackGroupCount() const noexcept override { return 1; }
    GroupRef GetTrackGroup(std::size_t inIndex) const override
    {
        MVX_INPUT_CONTRACT(inIndex == 0);
        return mVideo;
    }
    mt::TickTime GetEnd() const noexcept override { return mEnd; }
    const SequenceSettings& GetSequenceSettings() const noexcept override { return mSettings; }

private:
    static mt::TickTime ComputeEnd(const ITrackGroup& inGroup)
    {
        mt::TickTime end = mt::kTime_Zero;
        for (std::size_t i = 0; i < inGroup.GetTrackCount(); ++i)
        {
            const TrackRef track = inGroup.GetTrack(i);
            if (track->GetItemCount() > 0)
                end = std::max(end, track->GetItem(track->GetItemCount() - 1)->GetSettings().mEnd);
        }
        return end;
    }

    const std::string mName;
    const SequenceSettings mSettings;
    const GroupRef mVideo;
    const mt::TickTime mEnd;
};

SequenceRef MakeSequence(const std::string& inName, const SequenceSettings& inSettings,
                         std::vector<TrackRef> inTracks)
{
    return QRT::Allocated<Sequence>::Create<ISequence>(
        inName, inSettings, QRT::Allocated<TrackGroup>::Create<ITrackGroup>(std::move(inTracks)));
}

TrackRef MakeTrack(std::uint32_t inIndex, const TrackSettings& inSettings,
                   std::vector<TrackItemRef> inItems)
{
    return QRT::Allocated<VideoTrack>::Create<IVideoTrack>(inIndex, inSettings, std::move(inItems));
}

// The sequence's tracks as they are, for an edit to copy all but one.
std::vector<TrackRef> TracksOf(const ISequence& inSequence)
{
    const GroupRef group = inSequence.GetTrackGroup(0);
    std::vector<TrackRef> tracks;
    for (std::size_t i = 0; i < group->GetTrackCount(); ++i)
        tracks.push_back(group->GetTrack(i));
    return tracks;
}

StreamSettings StreamOfSource(const Deprecated::IVideoSource& inSource)
{
    const QRT::ParamRect bounds = inSource.GetBounds();
    StreamSettings stream;
    stream.mFrameRate = inSource.GetFrameRate();
    stream.mWidth = bounds.Width();
    stream.mHeight = bounds.Height();
    stream.mPixelAspectRatio = inSource.GetPixelAspectRatio();
    stream.mFieldType = inSource.GetFieldType();
    stream.mAlpha = inSource.GetAlphaChannel();
    return stream;
}

mt::TickTime DurationOfSource(const VideoSourceRef& inSource)
{
    const auto info = QRT::QueryRef<Deprecated::IMediaInfo>(inSource);
    return info ? info->GetDuration() : mt::kTime_Max;
}

} // namespace

MediaResult CreateMedia(const MediaSettings& inSettings, const SequenceRef& inNested)
{
    MVX_INPUT_CONTRACT((inSettings.mKind == MediaKind::kSequence) == static_cast<bool>(inNested));
    // Multicam media are made from their angles (CreateMulticamMedia).
    MVX_INPUT_CONTRACT(inSettings.mKind != MediaKind::kMulticam);
    MediaResult result;
    VideoSourceRef source;
    StreamSettings stream = inSettings.mStream.value_or(StreamSettings());
    bool still = inSettings.mKind == MediaKind::kStill || inSettings.mKind == MediaKind::kSolid;
    mt::TickTime duration = mt::kTime_Max;
    switch (inSettings.mKind)
    {
    case MediaKind::kFile:
    case MediaKind::kStill:
    {
        const std::string& path =
            inSettings.mResolvedPath.empty() ? inSettings.mLocation : inSettings.mResolvedPath;
        std::error_code error;
        if (!std::filesystem::exists(path, error))
        {
            result.mMissing = true;
            result.mStatus.mMessage = path + ": file not found; the media is offline";
            break;
        }
        if (inSettings.mOffline)
            break;
        result.mStatus = OpenVideoSource(path, source);
        if (!result.mStatus.Succeeded())
            return result;
        still = still || source->IsStill();
        break;
    }
    case MediaKind::kPattern:
    {
        const PatternParseResult pattern = ParsePatternSettings(inSettings.mLocation);
        if (!pattern.Succeeded())
        {
            result.mStatus = {pattern.mResult, pattern.mMessage};
            return result;
        }
        source = CreatePatternSource(pattern.mSettings);
        still = pattern.mSettings.IsTimeInvariant();
        break;
    }
    case MediaKind::kSolid:
    {
        PatternSettings solid;
        solid.mKind = PatternKind::kSolid;
        solid.mWidth = static_cast<std::uint32_t>(stream.mWidth);
        solid.mHeight = static_cast<std::uint32_t>(stream.mHeight);
        solid.mFrameRate = stream.mFrameRate;
        solid.mColor = inSettings.mColor & 0xFFFFFFu;
        source = CreatePatternSource(solid);
        break;
    }
    case MediaKind::kSequence:
    {
        const SequenceSettings& nested =
            QRT::InterfaceRef<ISequenceSettings>(inNested)->GetSequenceSettings();
        stream = {nested.mFrameRate,        nested.mWidth,     nested.mHeight,
                  nested.mPixelAspectRatio, nested.mFieldType, mt::kAlphaChannel_Straight};
        duration = inNested->GetEnd();
        break;
    }
    case MediaKind::kMulticam:
        break;
    }
    if (source)
    {
        if (!inSettings.mStream && inSettings.mKind != MediaKind::kSolid)
            stream = StreamOfSource(*source);
        duration = still ? mt::kTime_Max : DurationOfSource(source);
    }
    if (inSettings.mStream)
        stream = *inSettings.mStream;
    if (inSettings.mDuration)
        duration = *inSettings.mDuration;
    if (inSettings.mOffline || inSettings.mPending)
        source = {};
    // A solid's picture is made from its stream, so the stream is part of
    // what it is.
    MediaSettings settings = inSettings;
    if (settings.mKind == MediaKind::kSolid)
        settings.mStream = stream;
    result.mMedia = QRT::Allocated<Media>::Create<ISequenceMedia>(
        settings, stream, std::move(source), inNested, still, result.mMissing, duration);
    return result;
}

TrackItemRef CreateTrackItem(const TrackItemSettings& inSettings, const MediaRef& inMedia)
{
    MVX_INPUT_CONTRACT(inMedia != nullptr);
    MVX_INPUT_CONTRACT(inSettings.mEnd > inSettings.mStart);
    const double speed = inSettings.mClip.mSpeed;
    MVX_INPUT_CONTRACT(std::isfinite(speed) && speed != 0.0 && std::fabs(speed) <= kMaxClipSpeed);
    return QRT::Allocated<TrackItem>::Create<ITrackItem>(inSettings, inMedia);
}

SequenceBuilder::SequenceBuilder(std::string inName, const SequenceSettings& inSettings)
    : mName(std::move(inName))
    , mSettings(inSettings)
{
}

std::size_t SequenceBuilder::AddTrack(const TrackSettings& inSettings)
{
    mTracks.push_back({inSettings, {}});
    return mTracks.size() - 1;
}

SequenceBuilder& SequenceBuilder::AddItem(std::size_t inTrack, const TrackItemRef& inItem)
{
    MVX_INPUT_CONTRACT(inTrack < mTracks.size());
    MVX_INPUT_CONTRACT(inItem != nullptr);
    mTracks[inTrack].mItems.push_back(inItem);
    return *this;
}

SequenceBuilder& SequenceBuilder::AddItem(std::size_t inTrack, const TrackItemSettings& inSettings,
                                          const MediaRef& inMedia)
{
    return AddItem(inTrack, CreateTrackItem(inSettings, inMedia));
}

SequenceRef SequenceBuilder::Build()
{
    std::vector<TrackRef> tracks;
    tracks.reserve(mTracks.size());
    for (Track& track : mTracks)
    {
        std::stable_sort(track.mItems.begin(), track.mItems.end(),
                         [](const TrackItemRef& inLeft, const TrackItemRef& inRight)
                         { return inLeft->GetSettings().mStart < inRight->GetSettings().mStart; });
        tracks.push_back(MakeTrack(static_cast<std::uint32_t>(tracks.size()), track.mSettings,
                                   std::move(track.mItems)));
    }
    mTracks.clear();
    return MakeSequence(mName, mSettings, std::move(tracks));
}

SequenceRef ReplaceTrackItem(const SequenceRef& inSequence, std::size_t inTrack, std::size_t inItem,
                             const TrackItemRef& inReplacement)
{
    MVX_INPUT_CONTRACT(inSequence != nullptr && inReplacement != nullptr);
    std::vector<TrackRef> tracks = TracksOf(*inSequence);
    MVX_INPUT_CONTRACT(inTrack < tracks.size());
    const auto& old = static_cast<const VideoTrack&>(*tracks[inTrack]);
    MVX_INPUT_CONTRACT(inItem < old.Items().size());
    std::vector<TrackItemRef> items = old.Items();
    items[inItem] = inReplacement;
    // A replacement that moves keeps the track in time order.
    std::stable_sort(items.begin(), items.end(),
                     [](const TrackItemRef& inLeft, const TrackItemRef& inRight)
                     { return inLeft->GetSettings().mStart < inRight->GetSettings().mStart; });
    tracks[inTrack] = MakeTrack(old.GetTrackIndex(), old.GetTrackSettings(), std::move(items));
    return MakeSequence(inSequence->GetName(),
                        QRT::InterfaceRef<ISequenceSettings>(inSequence)->GetSequenceSettings(),
                        std::move(tracks));
}

SequenceRef ReplaceTrackSettings(const SequenceRef& inSequence, std::size_t inTrack,
                                 const TrackSettings& inSettings)
{
    MVX_INPUT_CONTRACT(inSequence != nullptr);
    std::vector<TrackRef> tracks = TracksOf(*inSequence);
    MVX_INPUT_CONTRACT(inTrack < tracks.size());
    const auto& old = static_cast<const VideoTrack&>(*tracks[inTrack]);
    tracks[inTrack] = MakeTrack(old.GetTrackIndex(), inSettings, old.Items());
    return MakeSequence(inSequence->GetName(),
                        QRT::InterfaceRef<ISequenceSettings>(inSequence)->GetSequenceSettings(),
                        std::move(tracks));
}

} // namespace BE
