// Keyframe curves: values at keys, between keys and outside the keyed range
// for each interpolation, against values worked out here independently.

#include "BE/Keyframes.h"
#include "ContractExpect.h"

#include <gtest/gtest.h>

namespace
{

using BE::CurveKey;
using BE::KeyframeCurve;
using BE::KeyframeInterpolation;
using mvxmediatypes::TickTime;

TickTime Seconds(double inSeconds)
{
    return TickTime::FromSeconds(inSeconds);
}

// Three keys: 10 at 0 s, 30 at 2 s, 20 at 4 s, with slopes 5 and -15 per
// second (the second key has different slopes in and out).
std::vector<CurveKey> Keys(KeyframeInterpolation inInterpolation)
{
    return {{Seconds(0), {10, -1}, inInterpolation, {0, 0}, {5, 2}},
            {Seconds(2), {30, 4}, inInterpolation, {-15, 1}, {6, 0}},
            {Seconds(4), {20, 8}, inInterpolation, {0, 3}, {0, 0}}};
}

// The reference: de Casteljau's construction over the four control values.
double DeCasteljau(double inP0, double inP1, double inP2, double inP3, double inU)
{
    auto lerp = [inU](double inA, double inB) { return inA + (inB - inA) * inU; };
    const double a = lerp(inP0, inP1), b = lerp(inP1, inP2), c = lerp(inP2, inP3);
    return lerp(lerp(a, b), lerp(b, c));
}

// Value of the span [k0, k1] at fraction inU, for one axis.
double Expected(KeyframeInterpolation inKind, const CurveKey& inK0, const CurveKey& inK1,
                double inU, bool inY)
{
    const double v0 = inY ? inK0.mValue.mY : inK0.mValue.mX;
    const double v1 = inY ? inK1.mValue.mY : inK1.mValue.mX;
    if (inKind == KeyframeInterpolation::kHold || inU == 0.0)
        return v0;
    if (inKind == KeyframeInterpolation::kLinear)
        return v0 * (1 - inU) + v1 * inU;
    const double span = (inK1.mTime - inK0.mTime).ToSeconds();
    const double out = inY ? inK0.mOutSlope.mY : inK0.mOutSlope.mX;
    const double in = inY ? inK1.mInSlope.mY : inK1.mInSlope.mX;
    return DeCasteljau(v0, v0 + out * span / 3, v1 - in * span / 3, v1, inU);
}

class KeyframeCurveTest : public ::testing::TestWithParam<KeyframeInterpolation>
{
};

TEST_P(KeyframeCurveTest, ValuesAtBetweenAndOutsideKeysMatchTheReference)
{
    const KeyframeInterpolation kind = GetParam();
    const std::vector<CurveKey> keys = Keys(kind);
    const KeyframeCurve scalar = KeyframeCurve::Scalar(0.0, keys);
    const KeyframeCurve point = KeyframeCurve::Point({0, 0}, keys);
    struct Case
    {
        double mSeconds;
        std::size_t mSpan; // the key that starts the span
        double mU;         // fraction of the span
    };
    const Case cases[] = {
        {-3.0, 0, 0.0}, {0.0, 0, 0.0},  {0.5, 0, 0.25}, {1.3, 0, 0.65}, {2.0, 1, 0.0},
        {2.5, 1, 0.25}, {3.9, 1, 0.95}, {4.0, 1, 1.0},  {60.0, 1, 1.0},
    };
    for (const Case& c : cases)
    {
        SCOPED_TRACE(c.mSeconds);
        const CurveKey& k0 = keys[c.mSpan];
        const CurveKey& k1 = keys[c.mSpan + 1];
        // Past the last key every kind stays at the last value.
        const bool after = c.mU == 1.0;
        const double x = after ? k1.mValue.mX : Expected(kind, k0, k1, c.mU, false);
        const double y = after ? k1.mValue.mY : Expected(kind, k0, k1, c.mU, true);
        EXPECT_NEAR(scalar.ValueAt(Seconds(c.mSeconds)).mX, x, 1e-9);
        EXPECT_EQ(scalar.ValueAt(Seconds(c.mSeconds)).mY, 0.0);
        EXPECT_NEAR(point.ValueAt(Seconds(c.mSeconds)).mX, x, 1e-9);
        EXPECT_NEAR(point.ValueAt(Seconds(c.mSeconds)).mY, y, 1e-9);

        const MF::Keyframe keyframe = scalar.KeyframeAt(Seconds(c.mSeconds));
        EXPECT_EQ(keyframe.GetValueKind(), MF::kKeyframeValueKind_Float64);
        EXPECT_NEAR(std::get<double>(keyframe.GetValue()), x, 1e-9);
        const bool inside = c.mSeconds >= 0.0 && c.mSeconds < 4.0;
        EXPECT_EQ(keyframe.GetInterpolation(),
                  static_cast<std::int32_t>(inside ? kind : KeyframeInterpolation::kLinear));
        const MF::Keyframe pointKey = point.KeyframeAt(Seconds(c.mSeconds));
        ASSERT_EQ(pointKey.GetValueKind(), MF::kKeyframeValueKind_Point);
        EXPECT_NEAR(std::get<MF::KeyframePoint>(pointKey.GetValue()).mY, y, 1e-9);
    }
}

INSTANTIATE_TEST_SUITE_P(Kinds, KeyframeCurveTest,
                         ::testing::Values(KeyframeInterpolation::kLinear,
                                           KeyframeInterpolation::kHold,
                                           KeyframeInterpolation::kBezier));

TEST(KeyframeCurve, WithoutKeysGivesTheDefaultAndListsNoKeyframes)
{
    const KeyframeCurve curve = KeyframeCurve::Scalar(100.0);
    EXPECT_EQ(curve.ValueAt(Seconds(-5)).mX, 100.0);
    EXPECT_EQ(curve.ValueAt(Seconds(5)).mX, 100.0);
    EXPECT_FALSE(curve.IsAnimated());
    EXPECT_TRUE(curve.GetKeyframes().empty());
}

TEST(KeyframeCurve, KeyframesListTheKeysWithTheirKinds)
{
    std::vector<CurveKey> keys = Keys(KeyframeInterpolation::kBezier);
    keys[1].mInterpolation = KeyframeInterpolation::kHold;
    const std::vector<MF::Keyframe> listed = KeyframeCurve::Scalar(0.0, keys).GetKeyframes();
    ASSERT_EQ(listed.size(), 3u);
    for (std::size_t i = 0; i < keys.size(); ++i)
    {
        EXPECT_EQ(listed[i].GetTime(), keys[i].mTime);
        EXPECT_EQ(std::get<double>(listed[i].GetValue()), keys[i].mValue.mX);
        EXPECT_EQ(listed[i].GetInterpolation(), static_cast<int>(keys[i].mInterpolation));
    }
}

TEST(KeyframeCurve, RefusesKeysOutOfOrderAndOtherDimensions)
{
    std::vector<CurveKey> keys = Keys(KeyframeInterpolation::kLinear);
    keys[2].mTime = keys[1].mTime;
    vrtest::ExpectInputContract([&] { KeyframeCurve::Scalar(0.0, keys); },
                                "mKeys[i - 1].mTime < mKeys[i].mTime");
    vrtest::ExpectInputContract([] { KeyframeCurve(3, {}); },
                                "inDimension == 1 || inDimension == 2");
}

} // namespace
