// KeyframeCurve: evaluation of a track item's animated parameters (BE/Keyframes.h).

#include "BE/Keyframes.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>

namespace BE
{
namespace
{

namespace mt = mvxmediatypes;

double Bezier(double inV0, double inC1, double inC2, double inV1, double inU)
{
    const double w = 1.0 - inU;
    return w * w * w * inV0 + 3.0 * w * w * inU * inC1 + 3.0 * w * inU * inU * inC2 +
           inU * inU * inU * inV1;
}

} // namespace

KeyframeCurve::KeyframeCurve(int inDimension, MF::KeyframePoint inDefault,
                             std::vector<CurveKey> inKeys)
    : mDimension(inDimension)
    , mDefault(inDefault)
    , mKeys(std::move(inKeys))
{
    MVX_INPUT_CONTRACT(inDimension == 1 || inDimension == 2);
    for (std::size_t i = 1; i < mKeys.size(); ++i)
        MVX_INPUT_CONTRACT(mKeys[i - 1].mTime < mKeys[i].mTime);
    if (mDimension == 1)
    {
        mDefault.mY = 0.0;
        for (CurveKey& key : mKeys)
            key.mValue.mY = key.mInSlope.mY = key.mOutSlope.mY = 0.0;
    }
}

KeyframeCurve KeyframeCurve::Scalar(double inDefault, std::vector<CurveKey> inKeys)
{
    return KeyframeCurve(1, MF::KeyframePoint{inDefault, 0.0}, std::move(inKeys));
}

KeyframeCurve KeyframeCurve::Point(MF::KeyframePoint inDefault, std::vector<CurveKey> inKeys)
{
    return KeyframeCurve(2, inDefault, std::move(inKeys));
}

MF::KeyframePoint KeyframeCurve::ValueAt(mt::TickTime inTime) const
{
    if (mKeys.empty())
        return mDefault;
    if (inTime <= mKeys.front().mTime)
        return mKeys.front().mValue;
    if (inTime >= mKeys.back().mTime)
        return mKeys.back().mValue;
    // The last key at or before inTime governs the span.
    const auto next =
        std::upper_bound(mKeys.begin(), mKeys.end(), inTime,
                         [](mt::TickTime inT, const CurveKey& inKey) { return inT < inKey.mTime; });
    const CurveKey& right = *next;
    const CurveKey& left = *(next - 1);
    const double span = static_cast<double>(right.mTime.GetTicks() - left.mTime.GetTicks());
    const double u = static_cast<double>(inTime.GetTicks() - left.mTime.GetTicks()) / span;
    switch (left.mInterpolation)
    {
    case KeyframeInterpolation::kHold:
        return left.mValue;
    case KeyframeInterpolation::kLinear:
        return {left.mValue.mX + (right.mValue.mX - left.mValue.mX) * u,
                left.mValue.mY + (right.mValue.mY - left.mValue.mY) * u};
    case KeyframeInterpolation::kBezier:
        break;
    }
    const double third = span / static_cast<double>(mt::kTicksPerSecond) / 3.0;
    auto axis = [&](double inV0, double inOut, double inIn, double inV1)
    { return Bezier(inV0, inV0 + inOut * third, inV1 - inIn * third, inV1, u); };
    return {axis(left.mValue.mX, left.mOutSlope.mX, right.mInSlope.mX, right.mValue.mX),
            axis(left.mValue.mY, left.mOutSlope.mY, right.mInSlope.mY, right.mValue.mY)};
}

MF::Keyframe KeyframeCurve::MakeKeyframe(mt::TickTime inTime, MF::KeyframePoint inValue,
                                         KeyframeInterpolation inInterpolation) const
{
    const auto interpolation = static_cast<std::int32_t>(inInterpolation);
    if (mDimension == 1)
        return MF::Keyframe(inTime, MF::KeyframeValue(inValue.mX), interpolation);
    return MF::Keyframe(inTime, MF::KeyframeValue(inValue), interpolation);
}

MF::Keyframe KeyframeCurve::KeyframeAt(mt::TickTime inTime) const
{
    KeyframeInterpolation interpolation = KeyframeInterpolation::kLinear;
    if (!mKeys.empty() && inTime >= mKeys.front().mTime && inTime < mKeys.back().mTime)
    {
        const auto next = std::upper_bound(mKeys.begin(), mKeys.end(), inTime,
                                           [](mt::TickTime inT, const CurveKey& inKey)
                                           { return inT < inKey.mTime; });
        interpolation = (next - 1)->mInterpolation;
    }
    return MakeKeyframe(inTime, ValueAt(inTime), interpolation);
}

std::vector<MF::Keyframe> KeyframeCurve::GetKeyframes() const
{
    std::vector<MF::Keyframe> keyframes;
    keyframes.reserve(mKeys.size());
    for (const CurveKey& key : mKeys)
        keyframes.push_back(MakeKeyframe(key.mTime, key.mValue, key.mInterpolation));
    return keyframes;
}

} // namespace BE
