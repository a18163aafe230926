// Deep comparison of two sequences (BE::SameSequence) and the text form of a
// clip's time remapping.

#include "BE/Sequence.h"

#include <cstdio>

namespace BE
{
namespace
{

bool SameMedia(const MediaRef& inLeft, const MediaRef& inRight)
{
    if (inLeft.Get() == inRight.Get())
        return true;
    if (!(inLeft->GetMediaSettings() == inRight->GetMediaSettings()) ||
        inLeft->IsOffline() != inRight->IsOffline() || inLeft->IsStill() != inRight->IsStill() ||
        !(inLeft->GetVideoStream(0)->GetStreamSettings() ==
          inRight->GetVideoStream(0)->GetStreamSettings()) ||
        QRT::InterfaceRef<IMediaDuration>(inLeft)->GetDuration() !=
            QRT::InterfaceRef<IMediaDuration>(inRight)->GetDuration())
        return false;
    const auto leftCam = QRT::QueryRef<IMulticamMedia>(inLeft);
    const auto rightCam = QRT::QueryRef<IMulticamMedia>(inRight);
    if (leftCam || rightCam)
    {
        if (!leftCam || !rightCam || leftCam->GetAngleCount() != rightCam->GetAngleCount())
            return false;
        for (std::size_t i = 0; i < leftCam->GetAngleCount(); ++i)
            if (!SameMedia(leftCam->GetAngle(i), rightCam->GetAngle(i)))
                return false;
    }
    const SequenceRef left = inLeft->GetNestedSequence();
    const SequenceRef right = inRight->GetNestedSequence();
    if (!left || !right)
        return !left && !right;
    return SameSequence(*left, *right);
}

bool SameTrack(const IVideoTrack& inLeft, const IVideoTrack& inRight)
{
    if (inLeft.GetTrackIndex() != inRight.GetTrackIndex() ||
        !(inLeft.GetTrackSettings() == inRight.GetTrackSettings()) ||
        inLeft.GetItemCount() != inRight.GetItemCount())
        return false;
    for (std::size_t i = 0; i < inLeft.GetItemCount(); ++i)
    {
        const TrackItemRef left = inLeft.GetItem(i);
        const TrackItemRef right = inRight.GetItem(i);
        if (!(left->GetSettings() == right->GetSettings()) ||
            !SameMedia(left->GetMedia(), right->GetMedia()))
            return false;
    }
    return true;
}

} // namespace

bool SameSequence(const ISequence& inLeft, const ISequence& inRight)
{
    if (&inLeft == &inRight)
        return true;
    const SequenceRef left(const_cast<ISequence*>(&inLeft));
    const SequenceRef right(const_cast<ISequence*>(&inRight));
    if (inLeft.GetName() != inRight.GetName() ||
        !(QRT::InterfaceRef<ISequenceSettings>(left)->GetSequenceSettings() ==
          QRT::InterfaceRef<ISequenceSettings>(right)->GetSequenceSettings()) ||
        inLeft.GetTrackGroupCount() != inRight.GetTrackGroupCount())
        return false;
    for (std::size_t g = 0; g < inLeft.GetTrackGroupCount(); ++g)
    {
        const QRT::InterfaceRef<ITrackGroup> leftGroup = inLeft.GetTrackGroup(g);
        const QRT::InterfaceRef<ITrackGroup> rightGroup = inRight.GetTrackGroup(g);
        if (leftGroup->GetTrackCount() != rightGroup->GetTrackCount())
            return false;
        for (std::size_t t = 0; t < leftGroup->GetTrackCount(); ++t)
            if (!SameTrack(*leftGroup->GetTrack(t), *rightGroup->GetTrack(t)))
                return false;
    }
    return true;
}

std::string ClipSettings::GetTimeRemappingText() const
{
    static constexpr const char* kNames[] = {"linear", "hold", "bezier"};
    std::string text;
    for (const CurveKey& key : mTimeRemapping.GetKeys())
    {
        char entry[160];
        std::snprintf(entry, sizeof(entry), "%s%lld=%.17g:%s", text.empty() ? "" : ";",
                      static_cast<long long>(key.mTime.GetTicks()), key.mValue.mX,
                      kNames[static_cast<int>(key.mInterpolation)]);
        text += entry;
        if (key.mInterpolation != KeyframeInterpolation::kBezier)
            continue;
        std::snprintf(entry, sizeof(entry), "(%.17g,%.17g)", key.mInSlope.mX, key.mOutSlope.mX);
        text += entry;
    }
    return text;
}

} // namespace BE
