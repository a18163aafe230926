#include "MF/TimeTransform.h"

#include "ContractExpect.h"
#include "QRT/Hash.h"

#include <cmath>
#include <limits>
#include <tuple>

#include <gtest/gtest.h>

namespace
{

using namespace mvxmediatypes;

using TransformRef = QRT::InterfaceRef<MF::ITimeTransform>;

constexpr auto Ticks = &TickTime::TicksToTime;
constexpr std::int64_t kFrame = 23'543'520; // 29.97 frames per second

QRT::HashValue HashOf(const TransformRef& inTransform)
{
    QRT::HashValue hash;
    inTransform->MixIntoHash(hash);
    return hash;
}

using TimeTransformTest = ::testing::Test;

TEST_F(TimeTransformTest, TransformMapsClipTimeToMediaTimeAndBack)
{
    // A clip placed at 10 frames that starts playing its media at 100 frames.
    const auto shifted = MF::CreateTimeTransform(1.0, Ticks(10 * kFrame), Ticks(100 * kFrame));
    const auto half = MF::CreateTimeTransform(0.5, Ticks(1000), Ticks(0));
    const auto fast = MF::CreateTimeTransform(2.5, Ticks(0), Ticks(50));
    // Reverse playback of 100 frames of media, starting at its last frame.
    const auto reverse = MF::CreateTimeTransform(-1.0, Ticks(0), Ticks(99 * kFrame));
    const auto third = MF::CreateRationalTimeTransform(-2, -6);
    // (transform, clip ticks, media ticks, the inverse answers the clip ticks)
    const std::tuple<TransformRef, std::int64_t, std::int64_t, bool> cases[] = {
        {shifted, 13 * kFrame + 7, 103 * kFrame + 7, true},
        {half, 1000 + 2 * kFrame, kFrame, true},
        {half, 1000 + 3, 2, false},  // 1.5 rounds up
        {half, 1000 - 3, -1, false}, // -1.5 rounds up too
        {fast, 1, 53, true},         // 2.5 rounds to 3
        {reverse, kFrame, 98 * kFrame, true},
        {MF::CreateTimeTransform(-2.5, Ticks(100), Ticks(0)), 102, -5, true},
        {third, 3 * kFrame, kFrame, true}};
    for (const auto& [transform, clip, media, inverse] : cases)
    {
        SCOPED_TRACE(::testing::Message() << "speed " << transform->GetSpeed() << " at " << clip);
        EXPECT_EQ(transform->Transform(Ticks(clip)), Ticks(media));
        EXPECT_TRUE(!inverse || transform->InverseTransform(Ticks(media)) == Ticks(clip));
    }
    // Special times keep their meaning and large times saturate.
    const std::tuple<TickTime, TickTime> special[] = {
        {fast->Transform(kTime_Invalid), kTime_Invalid},
        {fast->Transform(Ticks(kTime_Max.GetTicks() - 10)), kTime_Max},
        {fast->Transform(Ticks(kTime_Min.GetTicks() + 10)), kTime_Min},
        {reverse->Transform(kTime_Max), kTime_Min},
        {reverse->InverseTransform(kTime_Min), kTime_Max},
        {reverse->InverseTransform(kTime_Max), kTime_Min}};
    for (const auto& [got, expected] : special)
        EXPECT_EQ(got.GetTicks(), expected.GetTicks());
}

TEST_F(TimeTransformTest, SpeedToRatioFindsTheIntendedFractionAndTheHashCoversEveryParameter)
{
    const std::pair<double, MF::SpeedRatio> cases[] = {
        {1.0, {1, 1}},
        {0.5, {1, 2}},
        {2.5, {5, 2}},
        {-2.5, {-5, 2}},
        {0.0, {0, 1}},
        {std::ldexp(1.0, 53), {MF::kMaxSpeedRatioTerm, 1}},
        {std::ldexp(1.0, -40), {1, std::int64_t{1} << 40}}};
    for (const auto& [speed, ratio] : cases)
        EXPECT_EQ(MF::SpeedToRatio(speed), ratio) << speed;
    // A speed of many digits gets a fraction whose quotient is that speed.
    const double odd = 0.123456789012345;
    const MF::SpeedRatio ratio = MF::SpeedToRatio(odd);
    EXPECT_EQ(static_cast<double>(ratio.mNumerator) / static_cast<double>(ratio.mDenominator), odd);
    // The hash covers every parameter.
    const QRT::HashValue base = HashOf(MF::CreateTimeTransform(2.5, Ticks(1), Ticks(2)));
    EXPECT_EQ(HashOf(MF::CreateRationalTimeTransform(5, 2, Ticks(1), Ticks(2))), base);
    EXPECT_NE(HashOf(MF::CreateTimeTransform(-2.5, Ticks(1), Ticks(2))), base);
    EXPECT_NE(HashOf(MF::CreateTimeTransform(2.5, Ticks(3), Ticks(2))), base);
    EXPECT_NE(HashOf(MF::CreateTimeTransform(2.5, Ticks(1), Ticks(3))), base);
    EXPECT_NE(HashOf(MF::CreateTimeTransform(2.0, Ticks(1), Ticks(2))), base);
}

TEST_F(TimeTransformTest, BadSpeedsAndTimesBreakContracts)
{
    EXPECT_INPUT_CONTRACT(MF::CreateTimeTransform(std::numeric_limits<double>::infinity()),
                          "std::isfinite(inSpeed)");
    EXPECT_INPUT_CONTRACT(MF::CreateTimeTransform(0.0), "inSpeed != 0.0");
    EXPECT_INPUT_CONTRACT(MF::CreateTimeTransform(1.0, kTime_Invalid), "inOrigin.IsValid()");
    EXPECT_INPUT_CONTRACT(MF::CreateRationalTimeTransform(1, 0), "inDenominator != 0");
    EXPECT_INPUT_CONTRACT(MF::CreateRationalTimeTransform(0, 1), "inNumerator != 0");
    EXPECT_INPUT_CONTRACT(MF::CreateRationalTimeTransform(std::int64_t{1} << 60, 3),
                          "FitsTerm(numerator) && FitsTerm(denominator)");
    EXPECT_INPUT_CONTRACT(MF::SpeedToRatio(1e300),
                          "magnitude <= static_cast<double>(kMaxSpeedRatioTerm)");
    EXPECT_INPUT_CONTRACT(MF::SpeedToRatio(1e-300), "shift <= 120");
    // 2^-100 is exact but its denominator is beyond the term limit.
    EXPECT_INPUT_CONTRACT(MF::SpeedToRatio(std::ldexp(1.0, -100)), "FitsTerm(exactDenominator)");
}

} // namespace
