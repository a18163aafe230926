// Typed reading of timeline JSON values (TimelineValues.h).

#include "TimelineValues.h"

#include <algorithm>
#include <sstream>

namespace BE::timeline
{

namespace mt = mvxmediatypes;

[[noreturn]] void Fail(const std::string& inPath, std::string inProblem)
{
    throw Failure{inPath, std::move(inProblem)};
}

std::string Quoted(std::string_view inText)
{
    return "\"" + std::string(inText) + "\"";
}

const char* TypeName(const Json& inValue)
{
    switch (inValue.type())
    {
    case Json::value_t::null:
        return "null";
    case Json::value_t::boolean:
        return "a boolean";
    case Json::value_t::string:
        return "a string";
    case Json::value_t::object:
        return "an object";
    case Json::value_t::array:
        return "an array";
    default:
        return "a number";
    }
}

[[noreturn]] void WrongType(const Json& inValue, const std::string& inPath, const char* inWanted)
{
    Fail(inPath, std::string("expected ") + inWanted + ", got " + TypeName(inValue));
}

void CheckKeys(const Json& inValue, const std::string& inPath,
               std::initializer_list<std::string_view> inKnown)
{
    if (!inValue.is_object())
        WrongType(inValue, inPath, "an object");
    for (const auto& [key, value] : inValue.items())
    {
        if (std::find(inKnown.begin(), inKnown.end(), key) != inKnown.end())
            continue;
        const std::string_view nearest = NearestName(key, {inKnown.begin(), inKnown.size()});
        std::string problem = "unknown key " + Quoted(key);
        if (!nearest.empty())
            problem += " (did you mean " + Quoted(nearest) + "?)";
        else
        {
            std::string known;
            for (std::string_view name : inKnown)
                known += (known.empty() ? "" : ", ") + std::string(name);
            problem += " (known keys: " + known + ")";
        }
        Fail(ChildPath(inPath, key), problem);
    }
}

namespace
{

MF::KeyframePoint ReadPoint(const Node& inNode, int inDimension)
{
    if (inDimension == 1)
        return {inNode.AsNumber(), 0.0};
    const Json& value = inNode.Value();
    if (!value.is_array() || value.size() != 2)
        WrongType(value, inNode.Path(), "a point [x, y]");
    return {Node(value[0], ChildPath(inNode.Path(), 0)).AsNumber(),
            Node(value[1], ChildPath(inNode.Path(), 1)).AsNumber()};
}

} // namespace

mt::FrameRate ReadRate(const Node& inNode)
{
    double fps = 0.0;
    std::int64_t numerator = 0;
    std::int64_t denominator = 1;
    bool ratio = false;
    if (inNode.Value().is_string())
    {
        const std::string text = inNode.Value().get<std::string>();
        const std::optional<double> value = ParseRateText(text, numerator, denominator);
        if (!value)
            Fail(inNode.Path(),
                 "expected a frame rate (\"25\" or \"30000/1001\"), got " + Quoted(text));
        fps = *value;
        ratio = true;
    }
    else
        fps = inNode.AsNumber();
    if (!(fps >= kMinFramesPerSecond && fps <= kMaxFramesPerSecond))
    {
        std::ostringstream text;
        text << "frame rate " << fps << " is outside " << kMinFramesPerSecond << ".."
             << kMaxFramesPerSecond << " frames per second";
        Fail(inNode.Path(), text.str());
    }
    return ratio ? mt::FrameRate::Create(numerator, denominator) : mt::FrameRate::FromValue(fps);
}

KeyframeCurve ReadCurve(const Node& inNode, const KeyframeCurve& inDefault, mt::FrameRate inRate,
                        double inLow, double inHigh)
{
    const int dimension = inDefault.GetDimension();
    const Json& value = inNode.Value();
    auto checkRange = [&](MF::KeyframePoint inPoint, const std::string& inPath)
    {
        if (!(inPoint.mX >= inLow && inPoint.mX <= inHigh && inPoint.mY >= inLow &&
              inPoint.mY <= inHigh))
        {
            std::ostringstream text;
            text << "the value is outside " << inLow << ".." << inHigh;
            Fail(inPath, text.str());
        }
        return inPoint;
    };
    const bool keyList = value.is_array() && (value.empty() || value[0].is_object());
    if (!keyList)
        return KeyframeCurve(dimension, checkRange(ReadPoint(inNode, dimension), inNode.Path()));
    if (value.empty())
        Fail(inNode.Path(), "a keyframe list needs at least one key");
    std::vector<CurveKey> keys;
    for (std::size_t i = 0; i < value.size(); ++i)
    {
        const Node key(value[i], ChildPath(inNode.Path(), i));
        CheckKeys(key.Value(), key.Path(), {"time", "value", "interp", "inSlope", "outSlope"});
        CurveKey curveKey;
        curveKey.mTime = key.Child("time").AsTime(inRate);
        if (!keys.empty() && curveKey.mTime <= keys.back().mTime)
            Fail(key.PathOf("time"), "keyframe times must increase (" +
                                         SecondsText(curveKey.mTime) + " is not after " +
                                         SecondsText(keys.back().mTime) + ")");
        curveKey.mValue = checkRange(ReadPoint(key.Child("value"), dimension), key.PathOf("value"));
        curveKey.mInterpolation =
            key.Name("interp", kInterpolations, KeyframeInterpolation::kLinear);
        if (key.Has("inSlope"))
            curveKey.mInSlope = ReadPoint(key.Child("inSlope"), dimension);
        if (key.Has("outSlope"))
            curveKey.mOutSlope = ReadPoint(key.Child("outSlope"), dimension);
        keys.push_back(curveKey);
    }
    return KeyframeCurve(dimension, inDefault.GetDefault(), std::move(keys));
}

StreamSettings ReadStream(const Node& inNode)
{
    CheckKeys(inNode.Value(), inNode.Path(), {"rate", "size", "par", "field", "alpha"});
    StreamSettings stream;
    ReadPictureKeys(inNode, stream);
    stream.mAlpha = inNode.Name("alpha", kAlphaChannels, stream.mAlpha);
    return stream;
}

ClipSettings ReadClip(const Node& inNode, mt::FrameRate inRate)
{
    CheckKeys(inNode.Value(), inNode.Path(),
              {"in", "out", "speed", "reverse", "timeRemap", "frameHold", "fieldProcessing",
               "reverseFieldDominance", "frameBlend", "scaleToFrame", "alpha", "pulldown"});
    ClipSettings clip;
    clip.mInPoint = inNode.Time("in", inRate, clip.mInPoint);
    if (clip.mInPoint < mt::kTime_Zero)
        Fail(inNode.PathOf("in"), "the in point is negative (" + SecondsText(clip.mInPoint) + ")");
    clip.mOutPoint = inNode.Time("out", inRate, clip.mOutPoint);
    if (clip.mOutPoint <= clip.mInPoint)
        Fail(inNode.PathOf("out"), "the out point " + SecondsText(clip.mOutPoint) +
                                       " is not after the in point " + SecondsText(clip.mInPoint));
    clip.mSpeed = inNode.Number("speed", clip.mSpeed);
    if (!(clip.mSpeed != 0.0 && std::fabs(clip.mSpeed) <= kMaxClipSpeed))
    {
        std::ostringstream text;
        text << "speed " << clip.mSpeed << " is zero or beyond " << kMaxClipSpeed << " either way";
        Fail(inNode.PathOf("speed"), text.str());
    }
    clip.mReverse = inNode.Bool("reverse", false);
    if (inNode.Has("timeRemap"))
    {
        // A constant would read as "not remapped": only keys say what to play.
        const Node remap = inNode.Child("timeRemap");
        if (!remap.Value().is_array())
            WrongType(remap.Value(), remap.Path(), "a list of keys");
        clip.mTimeRemapping = ReadCurve(remap, KeyframeCurve::Scalar(0.0), inRate, 0.0, 1.0e9);
    }
    if (inNode.Has("frameHold"))
    {
        const Node hold = inNode.Child("frameHold");
        CheckKeys(hold.Value(), hold.Path(), {"at", "filters", "deinterlace"});
        clip.mFrameHold.mAt = hold.Child("at").AsTime(inRate);
        if (clip.mFrameHold.mAt < mt::kTime_Zero || clip.mFrameHold.mAt == mt::kTime_Max)
            Fail(hold.PathOf("at"), "the held time is outside the media");
        clip.mFrameHold.mFilters = hold.Bool("filters", false);
        clip.mFrameHold.mDeinterlace = hold.Bool("deinterlace", false);
    }
    clip.mFieldProcessing = inNode.Name("fieldProcessing", kFieldProcessing, clip.mFieldProcessing);
    clip.mReverseFieldDominance = inNode.Bool("reverseFieldDominance", false);
    clip.mFrameBlend = inNode.Bool("frameBlend", false);
    clip.mScaleToFrame = inNode.Bool("scaleToFrame", false);
    if (inNode.Has("alpha"))
    {
        const Node alpha = inNode.Child("alpha");
        CheckKeys(alpha.Value(), alpha.Path(), {"type", "ignore", "invert", "matte"});
        clip.mAlpha.mType = alpha.Name("type", kAlphaChannels, clip.mAlpha.mType);
        clip.mAlpha.mIgnore = alpha.Bool("ignore", false);
        clip.mAlpha.mInvert = alpha.Bool("invert", false);
        clip.mAlpha.mMatteColor = alpha.Color("matte", clip.mAlpha.mMatteColor);
    }
    if (inNode.Has("pulldown"))
    {
        const Node pulldown = inNode.Child("pulldown");
        CheckKeys(pulldown.Value(), pulldown.Path(), {"remove", "cadence"});
        clip.mPulldown.mRemove = pulldown.Bool("remove", false);
        clip.mPulldown.mCadence = pulldown.Name("cadence", kCadences, clip.mPulldown.mCadence);
    }
    return clip;
}

void ReadMotion(const Node& inNode, mt::FrameRate inRate, MotionKeyframes& ioMotion)
{
    CheckKeys(inNode.Value(), inNode.Path(), {"position", "scale", "rotation", "anchor"});
    constexpr double kFar = 1.0e6;
    if (inNode.Has("position"))
        ioMotion.mPosition =
            ReadCurve(inNode.Child("position"), ioMotion.mPosition, inRate, -kFar, kFar);
    if (inNode.Has("scale"))
        ioMotion.mScale = ReadCurve(inNode.Child("scale"), ioMotion.mScale, inRate, 0.0, 1.0e5);
    if (inNode.Has("rotation"))
        ioMotion.mRotation =
            ReadCurve(inNode.Child("rotation"), ioMotion.mRotation, inRate, -kFar, kFar);
    if (inNode.Has("anchor"))
        ioMotion.mAnchor = ReadCurve(inNode.Child("anchor"), ioMotion.mAnchor, inRate, -kFar, kFar);
}

} // namespace BE::timeline
