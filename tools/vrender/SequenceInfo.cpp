// `vrender info TIMELINE`: a back end sequence printed as text
// (vrender::DescribeSequence, declared in CutlistInfo.h).

#include "CutlistInfo.h"

#include <cinttypes>
#include <cstdio>
#include <map>
#include <numeric>
#include <vector>

namespace vrender
{
namespace
{

namespace mt = mvxmediatypes;
using SequenceRef = QRT::InterfaceRef<BE::ISequence>;
using MediaRef = QRT::InterfaceRef<BE::ISequenceMedia>;

std::string RateText(mt::FrameRate inRate)
{
    std::int64_t numerator = mt::kTicksPerSecond;
    std::int64_t denominator = inRate.GetTicksPerFrame();
    if (denominator <= 0)
        return "no rate";
    const std::int64_t divisor = std::gcd(numerator, denominator);
    numerator /= divisor;
    denominator /= divisor;
    char text[64];
    if (denominator == 1)
        std::snprintf(text, sizeof(text), "%" PRId64 " fps", numerator);
    else
        std::snprintf(text, sizeof(text), "%.3f fps (%" PRId64 "/%" PRId64 ")",
                      static_cast<double>(numerator) / static_cast<double>(denominator), numerator,
                      denominator);
    return text;
}

const char* FieldText(mt::FieldType inField)
{
    switch (inField)
    {
    case mt::kFieldType_UpperFirst:
        return "upper field first";
    case mt::kFieldType_LowerFirst:
        return "lower field first";
    default:
        return "progressive";
    }
}

std::string PictureText(std::int32_t inWidth, std::int32_t inHeight, mt::FrameRate inRate,
                        mt::PixelAspectRatio inPar, mt::FieldType inField)
{
    return std::to_string(inWidth) + "x" + std::to_string(inHeight) + ", " + RateText(inRate) +
           ", pixel aspect " + std::to_string(inPar.GetNumerator()) + ":" +
           std::to_string(inPar.GetDenominator()) + ", " + FieldText(inField);
}

std::string MediaName(const BE::ISequenceMedia& inMedia)
{
    const BE::MediaSettings& settings = inMedia.GetMediaSettings();
    switch (settings.mKind)
    {
    case BE::MediaKind::kFile:
        return "file \"" + settings.mResolvedPath + "\"";
    case BE::MediaKind::kStill:
        return "still \"" + settings.mResolvedPath + "\"";
    case BE::MediaKind::kPattern:
        return settings.mLocation;
    case BE::MediaKind::kSolid:
        return "solid " + FormatColor(settings.mColor);
    case BE::MediaKind::kSequence:
        return "sequence \"" + settings.mLocation + "\"";
    case BE::MediaKind::kMulticam:
    {
        const auto angles = QRT::QueryRef<BE::IMulticamMedia>(
            QRT::InterfaceRef<BE::ISequenceMedia>(const_cast<BE::ISequenceMedia*>(&inMedia)));
        return "multicam of " + std::to_string(angles ? angles->GetAngleCount() : 0) +
               " angles, angle " + std::to_string(settings.mMulticam.mSelected) +
               (settings.mMulticam.mShowProgram ? " outlined in a grid" : " shown");
    }
    }
    return {};
}

const char* BlendText(IR_BlendMode inMode)
{
    switch (inMode)
    {
    case kIR_BlendMode_Darken:
        return "darken";
    case kIR_BlendMode_Multiply:
        return "multiply";
    case kIR_BlendMode_Lighten:
        return "lighten";
    case kIR_BlendMode_Screen:
        return "screen";
    case kIR_BlendMode_Add:
        return "add";
    case kIR_BlendMode_Overlay:
        return "overlay";
    case kIR_BlendMode_Difference:
        return "difference";
    case kIR_BlendMode_Subtract:
        return "subtract";
    case kIR_BlendMode_Normal:
        break;
    }
    return "normal";
}

// What an item does beyond playing its media at normal speed.
std::string ItemDetails(const BE::TrackItemSettings& inItem)
{
    std::vector<std::string> parts;
    const BE::ClipSettings& clip = inItem.mClip;
    char number[64];
    if (clip.mSpeed != 1.0)
    {
        std::snprintf(number, sizeof(number), "speed %g", clip.mSpeed);
        parts.push_back(number);
    }
    if (clip.mReverse)
        parts.push_back("reverse");
    if (clip.mInPoint != mt::kTime_Zero || clip.mOutPoint != mt::kTime_Max)
        parts.push_back("media " + FormatTime(clip.mInPoint) + " to " + FormatTime(clip.mOutPoint));
    if (clip.IsTimeRemapped())
        parts.push_back("time remapped");
    if (clip.mFrameHold.IsSet())
        parts.push_back("frame hold at " + FormatTime(clip.mFrameHold.mAt));
    if (inItem.IsAdjustmentLayer())
        parts.push_back("adjustment layer");
    if (inItem.mBlendMode != kIR_BlendMode_Normal)
        parts.push_back(std::string("blend ") + BlendText(inItem.mBlendMode));
    if (inItem.mOpacity.IsAnimated() || inItem.mOpacity.ValueAt(inItem.mStart).mX != 100.0)
        parts.push_back(inItem.mOpacity.IsAnimated() ? "opacity keyframed" : "opacity set");
    if (!(inItem.mMotion == BE::MotionKeyframes()))
        parts.push_back("motion");
    if (!inItem.mEffects.empty())
        parts.push_back(std::to_string(inItem.mEffects.size()) + " effect(s)");
    if (!inItem.mTransitions.empty())
        parts.push_back(std::to_string(inItem.mTransitions.size()) + " transition(s)");
    std::string text;
    for (const std::string& part : parts)
        text += ", " + part;
    return text;
}

std::string MediaStates(const BE::ISequenceMedia& inMedia)
{
    std::string states;
    if (inMedia.IsOffline())
        states += " offline";
    if (inMedia.IsPending())
        states += " pending";
    if (inMedia.IsDraft())
        states += " draft";
    if (inMedia.IsStill())
        states += " still";
    return states.empty() ? states : " [" + states.substr(1) + "]";
}

void DescribeOne(const SequenceRef& inSequence, std::vector<SequenceRef>& ioNested,
                 std::string& ioText)
{
    const BE::SequenceSettings& settings =
        QRT::InterfaceRef<BE::ISequenceSettings>(inSequence)->GetSequenceSettings();
    ioText += "Sequence \"" + inSequence->GetName() + "\": " +
              PictureText(settings.mWidth, settings.mHeight, settings.mFrameRate,
                          settings.mPixelAspectRatio, settings.mFieldType) +
              ", ends at " + FormatTime(inSequence->GetEnd()) + "\n";
    // Media in order of first use, numbered for the item lines.
    std::vector<MediaRef> media;
    std::map<const BE::ISequenceMedia*, std::size_t> numbers;
    const auto group = inSequence->GetTrackGroup(0);
    for (std::size_t t = 0; t < group->GetTrackCount(); ++t)
    {
        const auto track = group->GetTrack(t);
        const BE::TrackSettings& flags = track->GetTrackSettings();
        ioText += "  Track " + std::to_string(track->GetTrackIndex()) +
                  (flags.mMuted ? " muted" : "") + (flags.mLocked ? " locked" : "") + ": " +
                  std::to_string(track->GetItemCount()) +
                  (track->GetItemCount() == 1 ? " item\n" : " items\n");
        for (std::size_t i = 0; i < track->GetItemCount(); ++i)
        {
            const auto item = track->GetItem(i);
            const MediaRef itemMedia = item->GetMedia();
            const auto [entry, added] = numbers.emplace(itemMedia.Get(), media.size() + 1);
            if (added)
                media.push_back(itemMedia);
            const BE::TrackItemSettings& s = item->GetSettings();
            ioText += "    " + FormatTime(s.mStart) + " to " + FormatTime(s.mEnd) + ": media " +
                      std::to_string(entry->second) + ItemDetails(s) + "\n";
        }
    }
    ioText += "  Media:\n";
    for (std::size_t m = 0; m < media.size(); ++m)
    {
        const BE::ISequenceMedia& one = *media[m];
        const auto duration = QRT::InterfaceRef<BE::IMediaDuration>(media[m])->GetDuration();
        ioText += "    " + std::to_string(m + 1) + " " + MediaName(one) + MediaStates(one) +
                  ", duration " + (duration == mt::kTime_Max ? "endless" : FormatTime(duration)) +
                  "\n";
        for (std::size_t s = 0; s < one.GetVideoStreamCount(); ++s)
        {
            const BE::StreamSettings& stream = one.GetVideoStream(s)->GetStreamSettings();
            ioText += "      video stream " + std::to_string(s) + ": " +
                      PictureText(stream.mWidth, stream.mHeight, stream.mFrameRate,
                                  stream.mPixelAspectRatio, stream.mFieldType) +
                      (one.GetVideoStream(s)->GetVideoSource() ? "" : ", no source") + "\n";
        }
        if (const SequenceRef nested = one.GetNestedSequence())
            ioNested.push_back(nested);
    }
}

} // namespace

std::string DescribeSequence(const SequenceRef& inSequence)
{
    std::string text;
    std::vector<SequenceRef> pending{inSequence};
    std::vector<const BE::ISequence*> done;
    while (!pending.empty())
    {
        const SequenceRef next = pending.front();
        pending.erase(pending.begin());
        if (std::find(done.begin(), done.end(), next.Get()) != done.end())
            continue;
        done.push_back(next.Get());
        DescribeOne(next, pending, text);
    }
    return text;
}

} // namespace vrender
