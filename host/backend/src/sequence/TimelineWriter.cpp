// Writing sequences as timeline files (BE::WriteTimeline). Keys holding
// their default value are left out, so a written file says only what
// differs from a fresh sequence.

#include "BE/TimelineFile.h"
#include "TimelineFormat.h"
#include "mvxcore/debug/Contract.h"

#include <set>

#include <nlohmann/json.hpp>

namespace BE
{
namespace
{

namespace mt = mvxmediatypes;
using namespace timeline;
using Json = nlohmann::ordered_json;

std::string TextOf(const MF::BinaryData& inData)
{
    return {reinterpret_cast<const char*>(inData.GetData()), inData.GetSize()};
}

Json PointJson(MF::KeyframePoint inPoint, int inDimension)
{
    if (inDimension == 1)
        return inPoint.mX;
    return Json::array({inPoint.mX, inPoint.mY});
}

// The curve as a constant when it has no keys, else as its key list.
void PutCurve(Json& ioObject, const char* inKey, const KeyframeCurve& inCurve,
              const KeyframeCurve& inDefault, mt::FrameRate inRate)
{
    if (inCurve == inDefault)
        return;
    const int dimension = inCurve.GetDimension();
    if (inCurve.GetKeys().empty())
    {
        ioObject[inKey] = PointJson(inCurve.GetDefault(), dimension);
        return;
    }
    Json keys = Json::array();
    for (const CurveKey& key : inCurve.GetKeys())
    {
        Json entry;
        entry["time"] = TimeText(key.mTime, inRate);
        entry["value"] = PointJson(key.mValue, dimension);
        if (key.mInterpolation != KeyframeInterpolation::kLinear)
            entry["interp"] = NameOf(kInterpolations, key.mInterpolation);
        if (key.mInSlope != MF::KeyframePoint())
            entry["inSlope"] = PointJson(key.mInSlope, dimension);
        if (key.mOutSlope != MF::KeyframePoint())
            entry["outSlope"] = PointJson(key.mOutSlope, dimension);
        keys.push_back(std::move(entry));
    }
    ioObject[inKey] = std::move(keys);
}

template <class T>
void PutIf(Json& ioObject, const char* inKey, const T& inValue, const T& inDefault)
{
    if (!(inValue == inDefault))
        ioObject[inKey] = inValue;
}

Json StreamJson(const StreamSettings& inStream)
{
    const StreamSettings fresh;
    Json stream = Json::object();
    if (inStream.mFrameRate != fresh.mFrameRate)
        stream["rate"] = RateText(inStream.mFrameRate);
    if (inStream.mWidth != fresh.mWidth || inStream.mHeight != fresh.mHeight)
        stream["size"] = Json::array({inStream.mWidth, inStream.mHeight});
    if (!(inStream.mPixelAspectRatio == fresh.mPixelAspectRatio))
        stream["par"] = Json::array({inStream.mPixelAspectRatio.GetNumerator(),
                                     inStream.mPixelAspectRatio.GetDenominator()});
    if (inStream.mFieldType != fresh.mFieldType)
        stream["field"] = NameOf(kFieldTypes, inStream.mFieldType);
    if (inStream.mAlpha != fresh.mAlpha)
        stream["alpha"] = NameOf(kAlphaChannels, inStream.mAlpha);
    return stream;
}

Json MediaJson(const ISequenceMedia& inMedia, const SequenceSettings& inSequence);

Json MulticamJson(const ISequenceMedia& inMedia, const SequenceSettings& inSequence)
{
    const QRT::InterfaceRef<IMulticamMedia> multicam(
        QRT::InterfaceRef<ISequenceMedia>(const_cast<ISequenceMedia*>(&inMedia)));
    const MulticamSettings& settings = inMedia.GetMediaSettings().mMulticam;
    Json angles = Json::array();
    for (std::size_t i = 0; i < multicam->GetAngleCount(); ++i)
        angles.push_back(MediaJson(*multicam->GetAngle(i), inSequence));
    Json json;
    json["angles"] = std::move(angles);
    json["selected"] = settings.mSelected;
    PutIf(json, "showProgram", settings.mShowProgram, false);
    PutIf(json, "recording", settings.mRecording, false);
    return json;
}

Json MediaJson(const ISequenceMedia& inMedia, const SequenceSettings& inSequence)
{
    const mt::FrameRate rate = inSequence.mFrameRate;
    static constexpr const char* kKinds[] = {"file",  "still",    "pattern",
                                             "color", "sequence", "multicam"};
    const MediaSettings& settings = inMedia.GetMediaSettings();
    Json media;
    const char* kind = kKinds[static_cast<int>(settings.mKind)];
    if (settings.mKind == MediaKind::kMulticam)
        media[kind] = MulticamJson(inMedia, inSequence);
    else if (settings.mKind == MediaKind::kSolid)
        media[kind] = ColorText(settings.mColor);
    else
        media[kind] = settings.mLocation;
    PutIf(media, "offline", settings.mOffline, false);
    PutIf(media, "pending", settings.mPending, false);
    PutIf(media, "draft", settings.mDraft, false);
    if (!settings.mOpaqueData.IsEmpty())
        media["opaque"] = TextOf(settings.mOpaqueData);
    if (!settings.mColorProfile.mName.empty())
        media["colorProfile"] = settings.mColorProfile.mName;
    // A solid that fits its sequence's picture is read back so without a stream.
    const bool fits = settings.mKind == MediaKind::kSolid &&
                      settings.mStream == StreamOfSequence(inSequence, mt::kAlphaChannel_None);
    if (settings.mStream && !fits)
        media["stream"] = StreamJson(*settings.mStream);
    if (settings.mDuration)
        media["duration"] = TimeText(*settings.mDuration, rate);
    return media;
}

Json ClipJson(const ClipSettings& inClip, mt::FrameRate inRate)
{
    const ClipSettings fresh;
    Json clip = Json::object();
    if (inClip.mInPoint != fresh.mInPoint)
        clip["in"] = TimeText(inClip.mInPoint, inRate);
    if (inClip.mOutPoint != fresh.mOutPoint)
        clip["out"] = TimeText(inClip.mOutPoint, inRate);
    PutIf(clip, "speed", inClip.mSpeed, fresh.mSpeed);
    PutIf(clip, "reverse", inClip.mReverse, fresh.mReverse);
    // Only keys remap; a curve without keys is not in use and not written.
    if (inClip.IsTimeRemapped())
        PutCurve(clip, "timeRemap", inClip.mTimeRemapping, fresh.mTimeRemapping, inRate);
    if (inClip.mFrameHold.IsSet())
    {
        Json hold;
        hold["at"] = TimeText(inClip.mFrameHold.mAt, inRate);
        PutIf(hold, "filters", inClip.mFrameHold.mFilters, false);
        PutIf(hold, "deinterlace", inClip.mFrameHold.mDeinterlace, false);
        clip["frameHold"] = std::move(hold);
    }
    if (inClip.mFieldProcessing != fresh.mFieldProcessing)
        clip["fieldProcessing"] = NameOf(kFieldProcessing, inClip.mFieldProcessing);
    PutIf(clip, "reverseFieldDominance", inClip.mReverseFieldDominance, false);
    PutIf(clip, "frameBlend", inClip.mFrameBlend, false);
    PutIf(clip, "scaleToFrame", inClip.mScaleToFrame, false);
    if (!(inClip.mAlpha == fresh.mAlpha))
    {
        Json alpha = Json::object();
        if (inClip.mAlpha.mType != fresh.mAlpha.mType)
            alpha["type"] = NameOf(kAlphaChannels, inClip.mAlpha.mType);
        PutIf(alpha, "ignore", inClip.mAlpha.mIgnore, false);
        PutIf(alpha, "invert", inClip.mAlpha.mInvert, false);
        if (inClip.mAlpha.mMatteColor != fresh.mAlpha.mMatteColor)
            alpha["matte"] = ColorText(inClip.mAlpha.mMatteColor);
        clip["alpha"] = std::move(alpha);
    }
    if (!(inClip.mPulldown == fresh.mPulldown))
    {
        Json pulldown = Json::object();
        PutIf(pulldown, "remove", inClip.mPulldown.mRemove, false);
        if (inClip.mPulldown.mCadence != fresh.mPulldown.mCadence)
            pulldown["cadence"] = NameOf(kCadences, inClip.mPulldown.mCadence);
        clip["pulldown"] = std::move(pulldown);
    }
    return clip;
}

Json ItemJson(const ITrackItem& inItem, const SequenceSettings& inSequence)
{
    const mt::FrameRate rate = inSequence.mFrameRate;
    const TrackItemSettings& settings = inItem.GetSettings();
    const TrackItemSettings fresh;
    Json item;
    item["start"] = TimeText(settings.mStart, rate);
    item["end"] = TimeText(settings.mEnd, rate);
    if (settings.IsAdjustmentLayer())
        item["adjustment"] = true;
    PutIf(item, "flags", settings.mFlags & ~kTrackItemFlag_AdjustmentLayer, 0u);
    item["media"] = MediaJson(*inItem.GetMedia(), inSequence);
    if (settings.mBlendMode != fresh.mBlendMode)
        item["blend"] = NameOf(kBlendModes, settings.mBlendMode);
    PutCurve(item, "opacity", settings.mOpacity, fresh.mOpacity, rate);
    if (!(settings.mMotion == fresh.mMotion))
    {
        Json motion = Json::object();
        PutCurve(motion, "position", settings.mMotion.mPosition, fresh.mMotion.mPosition, rate);
        PutCurve(motion, "scale", settings.mMotion.mScale, fresh.mMotion.mScale, rate);
        PutCurve(motion, "rotation", settings.mMotion.mRotation, fresh.mMotion.mRotation, rate);
        PutCurve(motion, "anchor", settings.mMotion.mAnchor, fresh.mMotion.mAnchor, rate);
        item["motion"] = std::move(motion);
    }
    if (!(settings.mClip == fresh.mClip))
        item["clip"] = ClipJson(settings.mClip, rate);
    for (const EffectSettings& effect : settings.mEffects)
    {
        Json entry;
        entry["match"] = effect.mMatchName;
        Json params = Json::object();
        for (const auto& [key, text] : effect.mParams)
            params[key] = text;
        // A default of the other dimension never equals the curve, so each is written.
        for (const auto& [key, curve] : effect.mKeyframedParams)
            PutCurve(params, key.c_str(), curve,
                     curve.GetDimension() == 1 ? KeyframeCurve::Point({0.0, 0.0})
                                               : KeyframeCurve::Scalar(0.0),
                     rate);
        if (!params.empty())
            entry["params"] = std::move(params);
        if (!effect.mOpaqueData.IsEmpty())
            entry["opaque"] = TextOf(effect.mOpaqueData);
        item["effects"].push_back(std::move(entry));
    }
    for (const TransitionSettings& transition : settings.mTransitions)
    {
        Json entry;
        entry["match"] = transition.mMatchName;
        entry["start"] = TimeText(transition.mStart, rate);
        entry["end"] = TimeText(transition.mEnd, rate);
        PutIf(entry, "reverse", transition.mReverse, false);
        if (!transition.mParams.empty())
            entry["params"] = transition.mParams;
        item["transitions"].push_back(std::move(entry));
    }
    return item;
}

Json SequenceJson(const SequenceRef& inSequence)
{
    const SequenceSettings& settings =
        QRT::InterfaceRef<ISequenceSettings>(inSequence)->GetSequenceSettings();
    const SequenceSettings fresh;
    Json sequence;
    sequence["name"] = inSequence->GetName();
    if (settings.mFrameRate != fresh.mFrameRate)
        sequence["rate"] = RateText(settings.mFrameRate);
    if (settings.mWidth != fresh.mWidth || settings.mHeight != fresh.mHeight)
        sequence["size"] = Json::array({settings.mWidth, settings.mHeight});
    if (!(settings.mPixelAspectRatio == fresh.mPixelAspectRatio))
        sequence["par"] = Json::array({settings.mPixelAspectRatio.GetNumerator(),
                                       settings.mPixelAspectRatio.GetDenominator()});
    if (settings.mFieldType != fresh.mFieldType)
        sequence["field"] = NameOf(kFieldTypes, settings.mFieldType);
    Json tracks = Json::array();
    const QRT::InterfaceRef<ITrackGroup> group = inSequence->GetTrackGroup(0);
    for (std::size_t t = 0; t < group->GetTrackCount(); ++t)
    {
        const QRT::InterfaceRef<IVideoTrack> track = group->GetTrack(t);
        Json entry = Json::object();
        PutIf(entry, "muted", track->GetTrackSettings().mMuted, false);
        PutIf(entry, "locked", track->GetTrackSettings().mLocked, false);
        Json items = Json::array();
        for (std::size_t i = 0; i < track->GetItemCount(); ++i)
            items.push_back(ItemJson(*track->GetItem(i), settings));
        entry["items"] = std::move(items);
        tracks.push_back(std::move(entry));
    }
    sequence["tracks"] = std::move(tracks);
    return sequence;
}

// Nested sequences before the sequences that play them, each once.
void CollectSequences(const SequenceRef& inSequence, std::set<const ISequence*>& ioSeen,
                      std::set<std::string>& ioNames, std::vector<SequenceRef>& ioOrder);

// The sequences a media plays: its nested one, or those of its angles.
void CollectNested(const MediaRef& inMedia, std::set<const ISequence*>& ioSeen,
                   std::set<std::string>& ioNames, std::vector<SequenceRef>& ioOrder)
{
    if (const SequenceRef nested = inMedia->GetNestedSequence())
        CollectSequences(nested, ioSeen, ioNames, ioOrder);
    if (const auto multicam = QRT::QueryRef<IMulticamMedia>(inMedia))
        for (std::size_t i = 0; i < multicam->GetAngleCount(); ++i)
            CollectNested(multicam->GetAngle(i), ioSeen, ioNames, ioOrder);
}

void CollectSequences(const SequenceRef& inSequence, std::set<const ISequence*>& ioSeen,
                      std::set<std::string>& ioNames, std::vector<SequenceRef>& ioOrder)
{
    if (!ioSeen.insert(inSequence.Get()).second)
        return;
    const QRT::InterfaceRef<ITrackGroup> group = inSequence->GetTrackGroup(0);
    for (std::size_t t = 0; t < group->GetTrackCount(); ++t)
    {
        const QRT::InterfaceRef<IVideoTrack> track = group->GetTrack(t);
        for (std::size_t i = 0; i < track->GetItemCount(); ++i)
            CollectNested(track->GetItem(i)->GetMedia(), ioSeen, ioNames, ioOrder);
    }
    MVX_INPUT_CONTRACT(ioNames.insert(inSequence->GetName()).second);
    ioOrder.push_back(inSequence);
}

} // namespace

std::string WriteTimeline(const SequenceRef& inMain)
{
    MVX_INPUT_CONTRACT(inMain != nullptr);
    std::set<const ISequence*> seen;
    std::set<std::string> names;
    std::vector<SequenceRef> order;
    CollectSequences(inMain, seen, names, order);
    Json root;
    root["version"] = 1;
    root["main"] = inMain->GetName();
    Json sequences = Json::array();
    for (const SequenceRef& sequence : order)
        sequences.push_back(SequenceJson(sequence));
    root["sequences"] = std::move(sequences);
    return root.dump(2) + "\n";
}

} // namespace BE
