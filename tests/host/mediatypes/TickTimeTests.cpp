#include "ContractExpect.h"
#include "mvxmediatypes/TickTime.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <functional>
#include <limits>
#include <tuple>

#include <gtest/gtest.h>

namespace mvxmediatypes
{
namespace
{

constexpr std::int64_t kInt64Max = std::numeric_limits<std::int64_t>::max();
constexpr std::int64_t kInt64Min = std::numeric_limits<std::int64_t>::min();
constexpr std::int64_t k25 = 28'224'000;   // ticks per frame at 25 fps
constexpr std::int64_t k2997 = 23'543'520; // ticks per frame at 29.97 fps
constexpr auto Ticks = &TickTime::TicksToTime;

using TickTimeTest = ::testing::Test;

TEST_F(TickTimeTest, ConstantsHaveTheirDocumentedTickCounts)
{
    EXPECT_EQ(kTicksPerSecond, 705'600'000);
    EXPECT_EQ(std::tuple(kTime_Zero.GetTicks(), TickTime().GetTicks(), kTime_Max.GetTicks()),
              std::tuple(0, 0, kInt64Max));
    EXPECT_EQ(std::tuple(kTime_Min.GetTicks(), kTime_Invalid.GetTicks()),
              std::tuple(-kInt64Max, kInt64Min));
    EXPECT_TRUE(kTime_Min.IsValid() && kTime_Invalid < kTime_Min && !kTime_Invalid.IsValid());
    EXPECT_EQ(sizeof(TickTime), 8u);
}

TEST_F(TickTimeTest, FrameOperationsFloorCeilAndSaturate)
{
    // Times belong to the frame that starts at or before them, also below zero.
    const std::int64_t lastStart = kInt64Max - kInt64Max % k25;
    ASSERT_NE(kInt64Max % k25, 0);
    const std::tuple<FrameRate, std::int64_t, std::int64_t, std::int64_t, std::int64_t> cases[] = {
        {kFrameRate_Video25, -1, -1, -k25, 0},
        {kFrameRate_Video25, -k25, -1, -k25, -k25},
        {kFrameRate_Video25, -k25 - 1, -2, -2 * k25, -k25},
        {kFrameRate_Video25, k25 - 1, 0, 0, k25},
        {kFrameRate_Video2997, 0, 0, 0, 0},
        {kFrameRate_Video2997, 1, 0, 0, k2997},
        {kFrameRate_Video2997, k2997, 1, k2997, k2997},
        {kFrameRate_Video2997, k2997 + 1, 1, k2997, 2 * k2997},
        // The frame starts beyond the ends are not representable: they saturate.
        {kFrameRate_Video25, kInt64Max, kInt64Max / k25, lastStart, kInt64Max},
        {kFrameRate_Video25, -kInt64Max, -(kInt64Max / k25) - 1, -kInt64Max, -lastStart}};
    for (const auto& [rate, ticks, frame, floor, ceil] : cases)
    {
        SCOPED_TRACE(::testing::Message() << ticks << " at " << rate.GetTicksPerFrame());
        EXPECT_EQ(Ticks(ticks).ToFrame64(rate), frame);
        EXPECT_EQ(Ticks(ticks).ToFrame32(rate),
                  std::clamp<std::int64_t>(frame, std::numeric_limits<std::int32_t>::min(),
                                           std::numeric_limits<std::int32_t>::max()));
        EXPECT_EQ(Ticks(ticks).AlignToFrame(rate).GetTicks(), floor);
        EXPECT_EQ(Ticks(ticks).AlignToFrameCeil(rate).GetTicks(), ceil);
    }
}

TEST_F(TickTimeTest, NtscFrameNumbersRoundTripExactlyOverLongSpans)
{
    const std::tuple<FrameRate, std::int64_t, std::int64_t> rates[] = {
        {kFrameRate_Video2997, 30000, 1001},
        {kFrameRate_Video2398, 24000, 1001},
        {kFrameRate_Video5994, 60000, 1001}};
    for (const auto& [rate, numerator, denominator] : rates)
        for (const std::int64_t frame : {1'000'000LL, -1'000'000LL, 123'456'789LL})
        {
            SCOPED_TRACE(::testing::Message() << numerator << " frame " << frame);
            ASSERT_EQ(705'600'000LL * denominator % numerator, 0);
            const std::int64_t ticks = frame * (705'600'000LL * denominator / numerator);
            const TickTime time = TickTime::FromFrame(frame, rate);
            EXPECT_EQ(time.GetTicks(), ticks);
            EXPECT_EQ(rate.FrameToTime(frame), time);
            EXPECT_EQ(time.ToFrame64(rate), frame);
            EXPECT_EQ(Ticks(ticks - 1).ToFrame64(rate), frame - 1);
            EXPECT_EQ(Ticks(ticks + 1).AlignToFrame(rate), time);
        }
    // Ten hours of 29.97 material: 36000 s x 30000 / 1001 = 1078921.08 frames.
    const TickTime tenHours = TickTime::FromSeconds(36000.0);
    EXPECT_EQ(tenHours.GetTicks(), 36000LL * 705'600'000LL);
    EXPECT_EQ(tenHours.ToFrame64(kFrameRate_Video2997), 36000LL * 30000 / 1001);
}

TEST_F(TickTimeTest, ArithmeticSaturatesAndKeepsInvalid)
{
    TickTime accumulated = Ticks(10);
    accumulated += Ticks(5);
    accumulated -= Ticks(3);
    accumulated *= 2;
    accumulated /= 4;
    EXPECT_EQ(accumulated, Ticks(6));
    EXPECT_EQ(std::tuple(Ticks(5) + Ticks(7), Ticks(5) - Ticks(7), -Ticks(5), Ticks(-7) / 2),
              std::tuple(Ticks(12), Ticks(-2), Ticks(-5), Ticks(-3)));
    EXPECT_EQ(std::tuple(Ticks(5) * 3, 3 * Ticks(-5)), std::tuple(Ticks(15), Ticks(-15)));
    const FrameRate ntsc = kFrameRate_Video2997;
    for (const TickTime max :
         {kTime_Max + Ticks(1), kTime_Max - kTime_Min, -kTime_Min, kTime_Max * 2, kTime_Min / -1,
          kTime_Max.AddFrames(1, ntsc), kTime_Zero.AddFrames(kInt64Max, ntsc)})
        EXPECT_EQ(max.GetTicks(), kInt64Max);
    // Never the invalid value -kTime_Max - 1.
    for (const TickTime min :
         {kTime_Min - Ticks(1), kTime_Min + Ticks(-1), -kTime_Max, kTime_Max * -2,
          kTime_Min.AddFrames(-1, ntsc), kTime_Zero.AddFrames(kInt64Min, ntsc)})
        EXPECT_EQ(min.GetTicks(), -kInt64Max);
    EXPECT_EQ(kTime_Max - Ticks(1), Ticks(kInt64Max - 1));
    EXPECT_EQ(kTime_Zero.AddFrames(3, ntsc), Ticks(3 * k2997));
    EXPECT_EQ(Ticks(5).AddFrames(-2, ntsc), Ticks(5 - 2 * k2997));
    const TickTime invalid = kTime_Invalid;
    for (const TickTime result : {invalid + Ticks(1), Ticks(1) - invalid, -invalid, invalid * 2,
                                  invalid / 2, invalid.AddFrames(1, ntsc)})
        EXPECT_EQ(result.GetTicks(), kInt64Min);
}

TEST_F(TickTimeTest, SecondsConvertToTheNearestTick)
{
    const std::pair<double, TickTime> cases[] = {
        {1.0, Ticks(705'600'000)},
        {-0.5, Ticks(-352'800'000)},
        {1001.0 / 30000.0, Ticks(k2997)},
        {1.0 / 48000.0, Ticks(14'700)},
        {1e300, kTime_Max},
        {-1e300, kTime_Min},
        {std::nan(""), kTime_Invalid},
    };
    for (const auto& [seconds, time] : cases)
        EXPECT_EQ(TickTime::FromSeconds(seconds), time) << seconds;
    EXPECT_DOUBLE_EQ(Ticks(352'800'000).ToSeconds(), 0.5);
    EXPECT_DOUBLE_EQ(Ticks(-705'600'000 * 3LL).ToSeconds(), -3.0);
    EXPECT_TRUE(std::isnan(kTime_Invalid.ToSeconds()));
    EXPECT_NEAR(kTime_Max.ToSeconds(), 9223372036854775807.0 / 705600000.0, 1e-3);
}

TEST_F(TickTimeTest, FrameOperationsRejectZeroRatesAndInvalidTimes)
{
    const FrameRate zero = kFrameRate_Zero;
    const std::function<void()> zeroRateCalls[] = {
        [&] { (void)Ticks(1).ToFrame64(zero); },        [&] { (void)Ticks(1).ToFrame32(zero); },
        [&] { (void)Ticks(1).AlignToFrame(zero); },     [&] { (void)Ticks(1).AddFrames(1, zero); },
        [&] { (void)Ticks(1).AlignToFrameCeil(zero); }, [&] { (void)TickTime::FromFrame(1, zero); },
    };
    for (const auto& call : zeroRateCalls)
        vrtest::ExpectInputContract(call, "inRate.GetTicksPerFrame() > 0");
    EXPECT_INPUT_CONTRACT((void)kTime_Invalid.ToFrame64(kFrameRate_Video25), "IsValid()");
    EXPECT_INPUT_CONTRACT((void)kTime_Invalid.AlignToFrame(kFrameRate_Video25), "IsValid()");
    EXPECT_INPUT_CONTRACT((void)(Ticks(1) / 0), "inDivisor != 0");
}

} // namespace
} // namespace mvxmediatypes
