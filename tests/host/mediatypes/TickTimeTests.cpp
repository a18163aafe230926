#include "ContractExpect.h"
#include "mvxmediatypes/TickTime.h"

#include <cmath>
#include <cstdint>
#include <limits>

#include <gtest/gtest.h>

namespace mvxmediatypes
{
namespace
{

using vrtest::ExpectInputContract;

constexpr std::int64_t kInt64Max = std::numeric_limits<std::int64_t>::max();
constexpr std::int64_t kInt64Min = std::numeric_limits<std::int64_t>::min();

class TickTimeTest : public ::testing::Test
{
protected:
    static TickTime Ticks(std::int64_t inTicks) { return TickTime::TicksToTime(inTicks); }

    // Ticks of frame inFrame at inNumerator / inDenominator fps, computed from the
    // tick rate alone (not through FrameRate).
    static std::int64_t ExactFrameTicks(std::int64_t inFrame, std::int64_t inNumerator,
                                        std::int64_t inDenominator)
    {
        const std::int64_t perFrameTimesNumerator = 705'600'000LL * inDenominator;
        EXPECT_EQ(perFrameTimesNumerator % inNumerator, 0) << "rate not a whole number of ticks";
        return inFrame * (perFrameTimesNumerator / inNumerator);
    }
};

TEST_F(TickTimeTest, ConstantsHaveTheirDocumentedTickCounts)
{
    EXPECT_EQ(kTicksPerSecond, 705'600'000);
    EXPECT_EQ(kTime_Zero.GetTicks(), 0);
    EXPECT_EQ(kTime_Max.GetTicks(), kInt64Max);
    EXPECT_EQ(kTime_Min.GetTicks(), -kInt64Max);
    EXPECT_EQ(kTime_Invalid.GetTicks(), kInt64Min);
    EXPECT_EQ(TickTime().GetTicks(), 0);
    EXPECT_LT(kTime_Invalid, kTime_Min);
    EXPECT_LT(kTime_Min, kTime_Zero);
    EXPECT_LT(kTime_Zero, kTime_Max);
    EXPECT_FALSE(kTime_Invalid.IsValid());
    EXPECT_TRUE(kTime_Min.IsValid());
    EXPECT_EQ(sizeof(TickTime), 8u);
}

TEST_F(TickTimeTest, NtscFrameNumbersRoundTripExactlyOverLongSpans)
{
    struct Case
    {
        FrameRate rate;
        std::int64_t numerator;
        std::int64_t denominator;
    };
    const Case cases[] = {
        {kFrameRate_Video2997, 30000, 1001},
        {kFrameRate_Video2398, 24000, 1001},
        {kFrameRate_Video5994, 60000, 1001},
    };
    for (const Case& c : cases)
    {
        for (const std::int64_t frame :
             {std::int64_t{1'000'000}, std::int64_t{-1'000'000}, std::int64_t{123'456'789}})
        {
            const std::int64_t ticks = ExactFrameTicks(frame, c.numerator, c.denominator);
            const TickTime time = TickTime::FromFrame(frame, c.rate);
            EXPECT_EQ(time.GetTicks(), ticks) << c.numerator << " frame " << frame;
            EXPECT_EQ(c.rate.FrameToTime(frame), time);
            EXPECT_EQ(time.ToFrame64(c.rate), frame);
            EXPECT_EQ(Ticks(ticks - 1).ToFrame64(c.rate), frame - 1);
            EXPECT_EQ(Ticks(ticks + 1).AlignToFrame(c.rate), time);
            EXPECT_EQ(time.AlignToFrame(c.rate), time);
        }
    }
    // Ten hours of 29.97 material: 36000 s x 30000 / 1001 = 1078921.08 frames.
    const TickTime tenHours = TickTime::FromSeconds(36000.0);
    EXPECT_EQ(tenHours.GetTicks(), 36000LL * 705'600'000LL);
    EXPECT_EQ(tenHours.ToFrame64(kFrameRate_Video2997), 36000LL * 30000 / 1001);
}

TEST_F(TickTimeTest, NegativeTimesBelongToTheEarlierFrame)
{
    const FrameRate rate = kFrameRate_Video25;
    const std::int64_t frame = 28'224'000;
    EXPECT_EQ(Ticks(-1).ToFrame64(rate), -1);
    EXPECT_EQ(Ticks(-1).ToFrame32(rate), -1);
    EXPECT_EQ(Ticks(-1).AlignToFrame(rate).GetTicks(), -frame);
    EXPECT_EQ(Ticks(-frame).ToFrame64(rate), -1);
    EXPECT_EQ(Ticks(-frame).AlignToFrame(rate).GetTicks(), -frame);
    EXPECT_EQ(Ticks(-frame - 1).ToFrame64(rate), -2);
    EXPECT_EQ(Ticks(-frame - 1).AlignToFrame(rate).GetTicks(), -2 * frame);
    EXPECT_EQ(Ticks(frame - 1).ToFrame64(rate), 0);
    EXPECT_EQ(Ticks(frame - 1).AlignToFrame(rate), kTime_Zero);
}

TEST_F(TickTimeTest, AlignToFrameCeilRoundsUpToTheNextFrameStart)
{
    const FrameRate rate = kFrameRate_Video2997;
    const std::int64_t frame = 23'543'520;
    EXPECT_EQ(kTime_Zero.AlignToFrameCeil(rate), kTime_Zero);
    EXPECT_EQ(Ticks(1).AlignToFrameCeil(rate).GetTicks(), frame);
    EXPECT_EQ(Ticks(frame).AlignToFrameCeil(rate).GetTicks(), frame);
    EXPECT_EQ(Ticks(frame + 1).AlignToFrameCeil(rate).GetTicks(), 2 * frame);
    EXPECT_EQ(Ticks(-1).AlignToFrameCeil(rate), kTime_Zero);
    EXPECT_EQ(Ticks(-frame - 1).AlignToFrameCeil(rate).GetTicks(), -frame);
}

TEST_F(TickTimeTest, AlignmentSaturatesAtTheEndsOfTheRange)
{
    const FrameRate rate = kFrameRate_Video25;
    ASSERT_NE(kInt64Max % 28'224'000, 0);
    // The frame start below kTime_Min is not representable.
    EXPECT_EQ(kTime_Min.AlignToFrame(rate), kTime_Min);
    EXPECT_EQ(kTime_Max.AlignToFrameCeil(rate), kTime_Max);
    EXPECT_EQ(kTime_Max.AlignToFrame(rate).GetTicks(), kInt64Max - kInt64Max % 28'224'000);
    EXPECT_EQ(kTime_Max.ToFrame32(rate), std::numeric_limits<std::int32_t>::max());
    EXPECT_EQ(kTime_Min.ToFrame32(rate), std::numeric_limits<std::int32_t>::min());
    EXPECT_EQ(kTime_Max.ToFrame64(rate), kInt64Max / 28'224'000);
}

TEST_F(TickTimeTest, AddFramesMovesByWholeFramesAndSaturates)
{
    const FrameRate rate = kFrameRate_Video2997;
    EXPECT_EQ(kTime_Zero.AddFrames(3, rate).GetTicks(), 3 * 23'543'520);
    EXPECT_EQ(Ticks(5).AddFrames(-2, rate).GetTicks(), 5 - 2 * 23'543'520);
    EXPECT_EQ(Ticks(7).AddFrames(0, rate).GetTicks(), 7);
    EXPECT_EQ(kTime_Max.AddFrames(1, rate), kTime_Max);
    EXPECT_EQ(kTime_Min.AddFrames(-1, rate), kTime_Min);
    EXPECT_EQ(kTime_Zero.AddFrames(kInt64Max, rate), kTime_Max);
    EXPECT_EQ(kTime_Zero.AddFrames(kInt64Min, rate), kTime_Min);
    EXPECT_EQ(kTime_Invalid.AddFrames(1, rate), kTime_Invalid);
}

TEST_F(TickTimeTest, ArithmeticSaturatesAndKeepsInvalid)
{
    EXPECT_EQ((Ticks(5) + Ticks(7)).GetTicks(), 12);
    EXPECT_EQ((Ticks(5) - Ticks(7)).GetTicks(), -2);
    EXPECT_EQ((-Ticks(5)).GetTicks(), -5);
    EXPECT_EQ((Ticks(5) * 3).GetTicks(), 15);
    EXPECT_EQ((3 * Ticks(-5)).GetTicks(), -15);
    EXPECT_EQ((Ticks(-7) / 2).GetTicks(), -3);

    EXPECT_EQ(kTime_Max + Ticks(1), kTime_Max);
    EXPECT_EQ(kTime_Min - Ticks(1), kTime_Min);
    EXPECT_EQ(kTime_Min + kTime_Min, kTime_Min);
    EXPECT_EQ(kTime_Max - kTime_Min, kTime_Max);
    EXPECT_EQ(kTime_Max - kTime_Max, kTime_Zero);
    EXPECT_EQ((kTime_Max - Ticks(1)).GetTicks(), kInt64Max - 1);
    EXPECT_EQ(-kTime_Max, kTime_Min);
    EXPECT_EQ(-kTime_Min, kTime_Max);
    EXPECT_EQ(kTime_Max * 2, kTime_Max);
    EXPECT_EQ(kTime_Max * -2, kTime_Min);
    EXPECT_EQ(kTime_Min / -1, kTime_Max);
    // -kTime_Max - 1 would be the invalid value; it must not appear as a sum.
    EXPECT_EQ(kTime_Min + Ticks(-1), kTime_Min);
    EXPECT_TRUE((kTime_Min - Ticks(1)).IsValid());

    EXPECT_EQ(kTime_Invalid + Ticks(1), kTime_Invalid);
    EXPECT_EQ(Ticks(1) - kTime_Invalid, kTime_Invalid);
    EXPECT_EQ(-kTime_Invalid, kTime_Invalid);
    EXPECT_EQ(kTime_Invalid * 2, kTime_Invalid);
    EXPECT_EQ(kTime_Invalid / 2, kTime_Invalid);

    TickTime accumulated = Ticks(10);
    accumulated += Ticks(5);
    accumulated -= Ticks(3);
    accumulated *= 2;
    accumulated /= 4;
    EXPECT_EQ(accumulated.GetTicks(), 6);
}

TEST_F(TickTimeTest, SecondsConvertToTheNearestTick)
{
    EXPECT_EQ(TickTime::FromSeconds(1.0).GetTicks(), 705'600'000);
    EXPECT_EQ(TickTime::FromSeconds(-0.5).GetTicks(), -352'800'000);
    EXPECT_EQ(TickTime::FromSeconds(1001.0 / 30000.0).GetTicks(), 23'543'520);
    EXPECT_EQ(TickTime::FromSeconds(1.0 / 48000.0).GetTicks(), 14'700);
    EXPECT_EQ(TickTime::FromSeconds(1e300), kTime_Max);
    EXPECT_EQ(TickTime::FromSeconds(-1e300), kTime_Min);
    EXPECT_EQ(TickTime::FromSeconds(std::nan("")), kTime_Invalid);
    EXPECT_DOUBLE_EQ(Ticks(352'800'000).ToSeconds(), 0.5);
    EXPECT_DOUBLE_EQ(Ticks(-705'600'000 * 3LL).ToSeconds(), -3.0);
    EXPECT_TRUE(std::isnan(kTime_Invalid.ToSeconds()));
    EXPECT_NEAR(kTime_Max.ToSeconds(), 9223372036854775807.0 / 705600000.0, 1e-3);
}

TEST_F(TickTimeTest, FrameOperationsRejectZeroRatesAndInvalidTimes)
{
    ExpectInputContract([] { (void)Ticks(1).ToFrame64(kFrameRate_Zero); },
                        "inRate.GetTicksPerFrame() > 0");
    ExpectInputContract([] { (void)Ticks(1).ToFrame32(kFrameRate_Zero); },
                        "inRate.GetTicksPerFrame() > 0");
    ExpectInputContract([] { (void)Ticks(1).AlignToFrame(kFrameRate_Zero); },
                        "inRate.GetTicksPerFrame() > 0");
    ExpectInputContract([] { (void)Ticks(1).AlignToFrameCeil(kFrameRate_Zero); },
                        "inRate.GetTicksPerFrame() > 0");
    ExpectInputContract([] { (void)Ticks(1).AddFrames(1, kFrameRate_Zero); },
                        "inRate.GetTicksPerFrame() > 0");
    ExpectInputContract([] { (void)TickTime::FromFrame(1, kFrameRate_Zero); },
                        "inRate.GetTicksPerFrame() > 0");
    ExpectInputContract([] { (void)kTime_Invalid.ToFrame64(kFrameRate_Video25); }, "IsValid()");
    ExpectInputContract([] { (void)kTime_Invalid.AlignToFrame(kFrameRate_Video25); }, "IsValid()");
    ExpectInputContract([] { (void)(Ticks(1) / 0); }, "inDivisor != 0");
}

} // namespace
} // namespace mvxmediatypes
