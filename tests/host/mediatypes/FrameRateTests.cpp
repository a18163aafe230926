#include "ContractExpect.h"
#include "mvxmediatypes/FrameRate.h"

#include <cmath>
#include <cstdint>
#include <limits>

#include <gtest/gtest.h>

namespace mvxmediatypes
{
namespace
{

using vrtest::ExpectInputContract;

class FrameRateTest : public ::testing::Test
{
};

TEST_F(FrameRateTest, NamedRatesAreExactRationals)
{
    struct Case
    {
        FrameRate rate;
        std::int64_t numerator;
        std::int64_t denominator;
    };
    const Case cases[] = {
        {kFrameRate_Video2398, 24000, 1001}, {kFrameRate_Video24, 24, 1},
        {kFrameRate_Video25, 25, 1},         {kFrameRate_Video2997, 30000, 1001},
        {kFrameRate_Video30, 30, 1},         {kFrameRate_Video50, 50, 1},
        {kFrameRate_Video5994, 60000, 1001}, {kFrameRate_Video60, 60, 1},
        {kFrameRate_Audio48000, 48000, 1},   {kFrameRate_Video1000, 1000, 1},
    };
    for (const Case& c : cases)
    {
        // Exactness: ticks per frame x numerator is exactly a whole number of seconds.
        EXPECT_EQ(c.rate.GetTicksPerFrame() * c.numerator, 705'600'000LL * c.denominator)
            << c.numerator << "/" << c.denominator;
        EXPECT_EQ(FrameRate::Create(c.numerator, c.denominator), c.rate);
        EXPECT_DOUBLE_EQ(c.rate.GetValue(), double(c.numerator) / double(c.denominator));
        EXPECT_EQ(FrameRate::FromValue(double(c.numerator) / double(c.denominator)), c.rate);
        EXPECT_EQ(c.rate.GetFrameDuration().GetTicks(), c.rate.GetTicksPerFrame());
    }
    EXPECT_EQ(kFrameRate_Zero.GetTicksPerFrame(), 0);
    EXPECT_EQ(kFrameRate_Zero.GetValue(), 0.0);
    EXPECT_TRUE(kFrameRate_Zero.IsZero());
    EXPECT_EQ(FrameRate(), kFrameRate_Zero);
    EXPECT_EQ(FrameRate::Create(0, 1001), kFrameRate_Zero);
    EXPECT_EQ(FrameRate::FromValue(0.0), kFrameRate_Zero);
    EXPECT_EQ(FrameRate::FromValue(1.0).GetTicksPerFrame(), 705'600'000);
    EXPECT_EQ(FrameRate::Create(23'543'520), kFrameRate_Video2997);
}

TEST_F(FrameRateTest, OperatorsScaleTheRateNotTheDuration)
{
    // Field rate = frame rate x 2: half the duration.
    EXPECT_EQ(kFrameRate_Video2997 * 2, kFrameRate_Video5994);
    EXPECT_EQ(kFrameRate_Video25 * 2, kFrameRate_Video50);
    EXPECT_EQ(kFrameRate_Video5994 / 2, kFrameRate_Video2997);
    EXPECT_EQ(kFrameRate_Video60 / 2, kFrameRate_Video30);
    // Pulldown removal: four fifths of 29.97 is 23.976, exactly.
    EXPECT_EQ(kFrameRate_Video2997 * 4 / 5, kFrameRate_Video2398);
    EXPECT_EQ(kFrameRate_Video30 * 4 / 5, kFrameRate_Video24);
    EXPECT_EQ(kFrameRate_Zero * 2, kFrameRate_Zero);
    // Durations that do not divide evenly round to the nearest tick, halves up.
    EXPECT_EQ((FrameRate::Create(5) * 2).GetTicksPerFrame(), 3);
    EXPECT_EQ((FrameRate::Create(7) * 4).GetTicksPerFrame(), 2);
    EXPECT_EQ((FrameRate::Create(9) * 4).GetTicksPerFrame(), 2);
    EXPECT_EQ((FrameRate::Create(10) * 4).GetTicksPerFrame(), 3);
}

TEST_F(FrameRateTest, ComparisonsOrderByFramesPerSecond)
{
    EXPECT_LT(kFrameRate_Video2398, kFrameRate_Video24);
    EXPECT_LT(kFrameRate_Video2997, kFrameRate_Video30);
    EXPECT_GT(kFrameRate_Video5994, kFrameRate_Video2997);
    EXPECT_LT(kFrameRate_Video60, kFrameRate_Video1000);
    EXPECT_LT(kFrameRate_Zero, kFrameRate_Video2398);
    EXPECT_LT(kFrameRate_Zero, FrameRate::Create(std::numeric_limits<std::int64_t>::max()));
    EXPECT_GE(kFrameRate_Zero, kFrameRate_Zero);
    EXPECT_GE(kFrameRate_Video25, kFrameRate_Zero);
    EXPECT_LE(kFrameRate_Video25, kFrameRate_Video25);
    EXPECT_NE(kFrameRate_Video25, kFrameRate_Video24);
    // A still's rate is at least kFrameRate_Video1000; video rates are below it.
    EXPECT_FALSE(kFrameRate_Video60 >= kFrameRate_Video1000);
    EXPECT_TRUE(kFrameRate_Audio48000 >= kFrameRate_Video1000);
}

TEST_F(FrameRateTest, FrameToTimeCountsFromZero)
{
    EXPECT_EQ(kFrameRate_Video25.FrameToTime(0), kTime_Zero);
    EXPECT_EQ(kFrameRate_Video25.FrameToTime(-3).GetTicks(), -3 * 28'224'000LL);
    EXPECT_EQ(kFrameRate_Video25.FrameToTime(std::numeric_limits<std::int64_t>::max()), kTime_Max);
}

TEST_F(FrameRateTest, BadInputViolatesContracts)
{
    ExpectInputContract([] { (void)FrameRate::Create(-1); }, "inTicksPerFrame >= 0");
    ExpectInputContract([] { (void)FrameRate::Create(30000, 0); }, "inDenominator > 0");
    ExpectInputContract([] { (void)FrameRate::Create(-30000, 1001); }, "inNumerator >= 0");
    ExpectInputContract([] { (void)(kFrameRate_Video25 * 0); }, "inFactor >= 1");
    ExpectInputContract([] { (void)(kFrameRate_Video25 * -2); }, "inFactor >= 1");
    ExpectInputContract([] { (void)(kFrameRate_Video25 / 0); }, "inDivisor >= 1");
    ExpectInputContract(
        [] { (void)(kFrameRate_Video25 / std::numeric_limits<std::int64_t>::max()); }, "!overflow");
    ExpectInputContract([] { (void)FrameRate::FromValue(-1.0); }, "inFramesPerSecond >= 0.0");
    ExpectInputContract([] { (void)FrameRate::FromValue(std::nan("")); },
                        "!std::isnan(inFramesPerSecond)");
    // Faster than one frame per tick cannot be represented.
    ExpectInputContract([] { (void)FrameRate::FromValue(1e12); }, "ticks >= 1.0");
    ExpectInputContract([] { (void)FrameRate::Create(705'600'001LL * 10, 1); }, "ticks >= 1");
    ExpectInputContract([] { (void)kFrameRate_Zero.FrameToTime(1); },
                        "inRate.GetTicksPerFrame() > 0");
}

} // namespace
} // namespace mvxmediatypes
