#pragma once

// BE::KeyframeCurve: the keyframes of one animated parameter of a track item
// (its opacity, a motion parameter, a time remapping) and the value they give
// at any time.
//
// A curve holds a scalar (dimension 1, the value's mX) or a point (dimension
// 2). Each key governs the span up to the next key by its interpolation:
//   linear  straight line from this key's value to the next key's;
//   hold    this key's value until the next key;
//   bezier  a cubic Bezier in value over linear time: with the span's length
//           D in seconds, the control values are v0 + outSlope0 * D / 3 and
//           v1 - inSlope1 * D / 3 (slopes in value units per second).
// Before the first key the curve has the first key's value, after the last
// key the last key's; a curve without keys has its default value everywhere.
//
// A value type: immutable once built, safe to read from any thread.

#include "MF/Keyframe.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>
#include <vector>

namespace BE
{

// Numbers as MF::Keyframe::GetInterpolation reports them.
enum class KeyframeInterpolation : std::int32_t
{
    kLinear = 0,
    kHold = 1,
    kBezier = 2,
};

struct CurveKey
{
    mvxmediatypes::TickTime mTime;
    MF::KeyframePoint mValue;
    KeyframeInterpolation mInterpolation = KeyframeInterpolation::kLinear;
    // Used by bezier spans only: the slope arriving at this key and leaving it.
    MF::KeyframePoint mInSlope;
    MF::KeyframePoint mOutSlope;

    friend bool operator==(const CurveKey&, const CurveKey&) = default;
};

class KeyframeCurve
{
public:
    KeyframeCurve() = default;
    // Input contracts: inDimension is 1 or 2; key times strictly increase.
    KeyframeCurve(int inDimension, MF::KeyframePoint inDefault, std::vector<CurveKey> inKeys = {});

    static KeyframeCurve Scalar(double inDefault, std::vector<CurveKey> inKeys = {});
    static KeyframeCurve Point(MF::KeyframePoint inDefault, std::vector<CurveKey> inKeys = {});

    int GetDimension() const { return mDimension; }
    MF::KeyframePoint GetDefault() const { return mDefault; }
    const std::vector<CurveKey>& GetKeys() const { return mKeys; }
    bool IsAnimated() const { return mKeys.size() > 1; }

    // The value at inTime (mY is 0 for scalar curves).
    MF::KeyframePoint ValueAt(mvxmediatypes::TickTime inTime) const;
    // The value at inTime as a keyframe: a double for scalar curves, an
    // MF::KeyframePoint for point curves, with the interpolation of the key
    // that governs inTime (linear outside the keyed range).
    MF::Keyframe KeyframeAt(mvxmediatypes::TickTime inTime) const;
    // The keys as MF::Keyframe values, in time order.
    std::vector<MF::Keyframe> GetKeyframes() const;

    friend bool operator==(const KeyframeCurve&, const KeyframeCurve&) = default;

private:
    MF::Keyframe MakeKeyframe(mvxmediatypes::TickTime inTime, MF::KeyframePoint inValue,
                              KeyframeInterpolation inInterpolation) const;

    int mDimension = 1;
    MF::KeyframePoint mDefault;
    std::vector<CurveKey> mKeys;
};

} // namespace BE
