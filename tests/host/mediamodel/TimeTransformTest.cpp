#include "MF/TimeTransform.h"

#include "ContractExpect.h"
#include "QRT/Hash.h"

#include <cmath>
#include <limits>

#include <gtest/gtest.h>

namespace
{

using mvxmediatypes::kTime_Invalid;
using mvxmediatypes::kTime_Max;
using mvxmediatypes::kTime_Min;
using mvxmediatypes::TickTime;

TickTime Ticks(std::int64_t inTicks)
{
    return TickTime::TicksToTime(inTicks);
}

// 29.97 frames per second.
constexpr std::int64_t kFrame = 23'543'520;

QRT::HashValue HashOf(const QRT::InterfaceRef<MF::ITimeTransform>& inTransform)
{
    QRT::HashValue hash;
    inTransform->MixIntoHash(hash);
    return hash;
}

class TimeTransformTest : public ::testing::Test
{
};

TEST_F(TimeTransformTest, SpeedOneIsIdentityAndShiftsByOffset)
{
    const auto identity = MF::CreateTimeTransform(1.0);
    ASSERT_TRUE(identity);
    EXPECT_EQ(identity->Transform(Ticks(123'456'789)), Ticks(123'456'789));
    EXPECT_EQ(identity->InverseTransform(Ticks(-5)), Ticks(-5));
    EXPECT_EQ(identity->GetSpeed(), 1.0);

    // A clip placed at 10 frames that starts playing its media at 100 frames.
    const auto shifted = MF::CreateTimeTransform(1.0, Ticks(10 * kFrame), Ticks(100 * kFrame));
    EXPECT_EQ(shifted->Transform(Ticks(10 * kFrame)), Ticks(100 * kFrame));
    EXPECT_EQ(shifted->Transform(Ticks(13 * kFrame + 7)), Ticks(103 * kFrame + 7));
    EXPECT_EQ(shifted->InverseTransform(Ticks(103 * kFrame + 7)), Ticks(13 * kFrame + 7));
}

TEST_F(TimeTransformTest, HalfSpeedIsExactOnEvenTicksAndRoundsHalvesUp)
{
    const auto half = MF::CreateTimeTransform(0.5, Ticks(1000), Ticks(0));
    EXPECT_EQ(half->Transform(Ticks(1000 + 2 * kFrame)), Ticks(kFrame));
    EXPECT_EQ(half->Transform(Ticks(1000 + 3)), Ticks(2));  // 1.5 rounds up
    EXPECT_EQ(half->Transform(Ticks(1000 - 3)), Ticks(-1)); // -1.5 rounds up too
    EXPECT_EQ(half->InverseTransform(Ticks(kFrame)), Ticks(1000 + 2 * kFrame));
    EXPECT_EQ(half->GetSpeed(), 0.5);
}

TEST_F(TimeTransformTest, TwoAndAHalfSpeedIsExactAndRoundTrips)
{
    const auto fast = MF::CreateTimeTransform(2.5, Ticks(0), Ticks(50));
    EXPECT_EQ(fast->Transform(Ticks(2 * kFrame)), Ticks(50 + 5 * kFrame));
    EXPECT_EQ(fast->Transform(Ticks(1)), Ticks(53)); // 2.5 rounds to 3
    // Faster than real time every outer tick has its own media tick, so the
    // round trip returns every time exactly.
    for (std::int64_t ticks : {std::int64_t{-7}, std::int64_t{0}, std::int64_t{1}, std::int64_t{3},
                               kFrame, 987'654'321'123})
        EXPECT_EQ(fast->InverseTransform(fast->Transform(Ticks(ticks))), Ticks(ticks)) << ticks;
}

TEST_F(TimeTransformTest, HalfSpeedRoundTripIsWithinOneTick)
{
    const auto half = MF::CreateTimeTransform(0.5);
    for (std::int64_t ticks = -5; ticks <= 5; ++ticks)
    {
        const std::int64_t back = half->InverseTransform(half->Transform(Ticks(ticks))).GetTicks();
        EXPECT_LE(std::abs(back - ticks), 1) << ticks;
        if (ticks % 2 == 0)
        {
            EXPECT_EQ(back, ticks);
        }
    }
    // Media to clip and back is exact, because the inverse doubles.
    for (std::int64_t ticks = -5; ticks <= 5; ++ticks)
        EXPECT_EQ(half->Transform(half->InverseTransform(Ticks(ticks))), Ticks(ticks));
}

TEST_F(TimeTransformTest, ReverseSpeedPlaysBackwardsFromStart)
{
    // Reverse playback of 100 frames of media, starting at its last frame.
    const auto reverse = MF::CreateTimeTransform(-1.0, Ticks(0), Ticks(99 * kFrame));
    EXPECT_EQ(reverse->Transform(Ticks(0)), Ticks(99 * kFrame));
    EXPECT_EQ(reverse->Transform(Ticks(kFrame)), Ticks(98 * kFrame));
    EXPECT_EQ(reverse->Transform(Ticks(99 * kFrame)), Ticks(0));
    EXPECT_EQ(reverse->InverseTransform(Ticks(98 * kFrame)), Ticks(kFrame));
    EXPECT_EQ(reverse->GetSpeed(), -1.0);
    for (std::int64_t ticks : {std::int64_t{-3}, std::int64_t{0}, std::int64_t{11}, kFrame})
        EXPECT_EQ(reverse->InverseTransform(reverse->Transform(Ticks(ticks))), Ticks(ticks));
}

TEST_F(TimeTransformTest, ReverseFractionalSpeedRoundTripsThroughInverse)
{
    const auto reverse = MF::CreateTimeTransform(-2.5, Ticks(100), Ticks(0));
    EXPECT_EQ(reverse->Transform(Ticks(102)), Ticks(-5));
    EXPECT_EQ(reverse->InverseTransform(Ticks(-5)), Ticks(102));
    for (std::int64_t ticks = 90; ticks <= 110; ++ticks)
        EXPECT_EQ(reverse->InverseTransform(reverse->Transform(Ticks(ticks))), Ticks(ticks));
}

TEST_F(TimeTransformTest, SpecialTimesKeepTheirMeaning)
{
    const auto forward = MF::CreateTimeTransform(2.0, Ticks(5), Ticks(7));
    EXPECT_EQ(forward->Transform(kTime_Invalid), kTime_Invalid);
    EXPECT_EQ(forward->Transform(kTime_Max), kTime_Max);
    EXPECT_EQ(forward->Transform(kTime_Min), kTime_Min);
    // Large ordinary times saturate instead of wrapping.
    EXPECT_EQ(forward->Transform(Ticks(kTime_Max.GetTicks() - 10)), kTime_Max);
    EXPECT_EQ(forward->Transform(Ticks(kTime_Min.GetTicks() + 10)), kTime_Min);

    const auto reverse = MF::CreateTimeTransform(-1.0);
    EXPECT_EQ(reverse->Transform(kTime_Max), kTime_Min);
    EXPECT_EQ(reverse->Transform(kTime_Min), kTime_Max);
    EXPECT_EQ(reverse->InverseTransform(kTime_Max), kTime_Min);
    EXPECT_EQ(reverse->InverseTransform(kTime_Invalid), kTime_Invalid);
}

TEST_F(TimeTransformTest, SpeedToRatioFindsTheIntendedFraction)
{
    EXPECT_EQ(MF::SpeedToRatio(1.0), (MF::SpeedRatio{1, 1}));
    EXPECT_EQ(MF::SpeedToRatio(0.5), (MF::SpeedRatio{1, 2}));
    EXPECT_EQ(MF::SpeedToRatio(2.5), (MF::SpeedRatio{5, 2}));
    EXPECT_EQ(MF::SpeedToRatio(-2.5), (MF::SpeedRatio{-5, 2}));
    EXPECT_EQ(MF::SpeedToRatio(0.1), (MF::SpeedRatio{1, 10}));
    EXPECT_EQ(MF::SpeedToRatio(1.0 / 3.0), (MF::SpeedRatio{1, 3}));
    EXPECT_EQ(MF::SpeedToRatio(1001.0 / 1000.0), (MF::SpeedRatio{1001, 1000}));
    EXPECT_EQ(MF::SpeedToRatio(0.0), (MF::SpeedRatio{0, 1}));
    EXPECT_EQ(MF::SpeedToRatio(std::ldexp(1.0, 53)), (MF::SpeedRatio{MF::kMaxSpeedRatioTerm, 1}));
    EXPECT_EQ(MF::SpeedToRatio(std::ldexp(1.0, -40)), (MF::SpeedRatio{1, std::int64_t{1} << 40}));
    // A speed of many digits gets a fraction whose quotient is that speed.
    const double odd = 0.123456789012345;
    const MF::SpeedRatio ratio = MF::SpeedToRatio(odd);
    EXPECT_EQ(static_cast<double>(ratio.mNumerator) / static_cast<double>(ratio.mDenominator), odd);
    EXPECT_LE(ratio.mDenominator, MF::kMaxSpeedRatioTerm);
}

TEST_F(TimeTransformTest, OneThirdSpeedIsExactOnMultiplesOfThree)
{
    const auto third = MF::CreateTimeTransform(1.0 / 3.0);
    EXPECT_EQ(third->Transform(Ticks(3 * kFrame)), Ticks(kFrame));
    EXPECT_EQ(third->InverseTransform(Ticks(kFrame)), Ticks(3 * kFrame));
    const auto rational = MF::CreateRationalTimeTransform(-2, -6);
    EXPECT_EQ(rational->Transform(Ticks(3 * kFrame)), Ticks(kFrame));
    EXPECT_EQ(HashOf(third), HashOf(rational));
}

TEST_F(TimeTransformTest, HashCoversEveryParameter)
{
    const QRT::HashValue base = HashOf(MF::CreateTimeTransform(2.5, Ticks(1), Ticks(2)));
    EXPECT_EQ(HashOf(MF::CreateTimeTransform(2.5, Ticks(1), Ticks(2))), base);
    EXPECT_EQ(HashOf(MF::CreateRationalTimeTransform(5, 2, Ticks(1), Ticks(2))), base);
    EXPECT_NE(HashOf(MF::CreateTimeTransform(-2.5, Ticks(1), Ticks(2))), base);
    EXPECT_NE(HashOf(MF::CreateTimeTransform(2.5, Ticks(3), Ticks(2))), base);
    EXPECT_NE(HashOf(MF::CreateTimeTransform(2.5, Ticks(1), Ticks(3))), base);
    EXPECT_NE(HashOf(MF::CreateTimeTransform(2.0, Ticks(1), Ticks(2))), base);
    // Tag, two speed terms, origin and start: 23 + 4 * 8 bytes.
    EXPECT_EQ(base.GetRunningLength(), 23u + 32u);
}

TEST_F(TimeTransformTest, BadSpeedsAndTimesBreakContracts)
{
    const double nan = std::numeric_limits<double>::quiet_NaN();
    const double infinity = std::numeric_limits<double>::infinity();
    EXPECT_INPUT_CONTRACT(MF::CreateTimeTransform(nan), "std::isfinite(inSpeed)");
    EXPECT_INPUT_CONTRACT(MF::CreateTimeTransform(infinity), "std::isfinite(inSpeed)");
    EXPECT_INPUT_CONTRACT(MF::CreateTimeTransform(0.0), "inSpeed != 0.0");
    EXPECT_INPUT_CONTRACT(MF::CreateTimeTransform(1.0, kTime_Invalid), "inOrigin.IsValid()");
    EXPECT_INPUT_CONTRACT(MF::CreateTimeTransform(1.0, Ticks(0), kTime_Invalid),
                          "inStart.IsValid()");
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
