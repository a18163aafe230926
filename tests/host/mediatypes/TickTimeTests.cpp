#include "ContractExpect.h"
#include "mvxmediatypes/TickTime.h"

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

TEST_F(TickTimeTest, FrameOperationsFloorCeilAndSaturate)
{
    // Times belong to the frame that starts at or before them, also below zero.
    const std::int64_t lastStart = kInt64Max - kInt64Max % k25;
    const std::int64_t lastFrame = kInt64Max / k25;
    const std::tuple<FrameRate, std::int64_t, std::int64_t, std::int64_t, std::int64_t, int>
        cases[] = {
            {kFrameRate_Video25, -k25 - 1, -2, -2 * k25, -k25, -2},
            {kFrameRate_Video2997, k2997, 1, k2997, k2997, 1},
            {kFrameRate_Video2997, k2997 + 1, 1, k2997, 2 * k2997, 1},
            // The frame starts beyond the ends are not representable: they
            // saturate.
            {kFrameRate_Video25, kInt64Max, lastFrame, lastStart, kInt64Max, INT32_MAX},
            {kFrameRate_Video25, -kInt64Max, -lastFrame - 1, -kInt64Max, -lastStart, INT32_MIN}};
    for (const auto& [rate, ticks, frame, floor, ceil, frame32] : cases)
    {
        SCOPED_TRACE(::testing::Message() << ticks << " at " << rate.GetTicksPerFrame());
        EXPECT_EQ(Ticks(ticks).ToFrame64(rate), frame);
        EXPECT_EQ(Ticks(ticks).ToFrame32(rate), frame32);
        EXPECT_EQ(Ticks(ticks).AlignToFrame(rate).GetTicks(), floor);
        EXPECT_EQ(Ticks(ticks).AlignToFrameCeil(rate).GetTicks(), ceil);
    }
}

TEST_F(TickTimeTest, ArithmeticSaturatesAndKeepsInvalid)
{
    TickTime accumulated = Ticks(10);
    accumulated += Ticks(5);
    accumulated -= Ticks(3);
    accumulated *= 2;
    accumulated /= 4;
    EXPECT_EQ(accumulated, Ticks(6));
    EXPECT_EQ(std::tuple(Ticks(5) - Ticks(7), -Ticks(5), Ticks(-7) / 2, 3 * Ticks(-5)),
              std::tuple(Ticks(-2), Ticks(-5), Ticks(-3), Ticks(-15)));
    const FrameRate ntsc = kFrameRate_Video2997;
    for (const TickTime max :
         {kTime_Max + Ticks(1), kTime_Max - kTime_Min, kTime_Max * 2, kTime_Min / -1,
          kTime_Max.AddFrames(1, ntsc), kTime_Zero.AddFrames(kInt64Max, ntsc)})
        EXPECT_EQ(max.GetTicks(), kInt64Max);
    // Never the invalid value -kTime_Max - 1.
    for (const TickTime min : {kTime_Min - Ticks(1), kTime_Min + Ticks(-1), kTime_Max * -2,
                               kTime_Zero.AddFrames(kInt64Min, ntsc)})
        EXPECT_EQ(min.GetTicks(), -kInt64Max);
    EXPECT_EQ(Ticks(5).AddFrames(-2, ntsc), Ticks(5 - 2 * k2997));
    const TickTime invalid = kTime_Invalid;
    for (const TickTime result : {invalid + Ticks(1), Ticks(1) - invalid, -invalid, invalid * 2,
                                  invalid / 2, invalid.AddFrames(1, ntsc)})
        EXPECT_EQ(result.GetTicks(), kInt64Min);
}

TEST_F(TickTimeTest, SecondsConvertToTheNearestTick)
{
    const std::pair<double, TickTime> cases[] = {{-0.5, Ticks(-352'800'000)},
                                                 {1e300, kTime_Max},
                                                 {-1e300, kTime_Min},
                                                 {std::nan(""), kTime_Invalid}};
    for (const auto& [seconds, time] : cases)
        EXPECT_EQ(TickTime::FromSeconds(seconds), time) << seconds;
    EXPECT_DOUBLE_EQ(Ticks(-705'600'000 * 3LL - 352'800'000).ToSeconds(), -3.5);
    EXPECT_TRUE(std::isnan(kTime_Invalid.ToSeconds()));
}

TEST_F(TickTimeTest, FrameOperationsRejectZeroRatesAndInvalidTimes)
{
    const FrameRate zero = kFrameRate_Zero;
    const FrameRate pal = kFrameRate_Video25;
    const std::pair<std::function<void()>, const char*> cases[] = {
        {[&] { (void)Ticks(1).ToFrame64(zero); }, "inRate.GetTicksPerFrame() > 0"},
        {[&] { (void)Ticks(1).AlignToFrame(zero); }, "inRate.GetTicksPerFrame() > 0"},
        {[&] { (void)Ticks(1).AlignToFrameCeil(zero); }, "inRate.GetTicksPerFrame() > 0"},
        {[&] { (void)Ticks(1).AddFrames(1, zero); }, "inRate.GetTicksPerFrame() > 0"},
        {[&] { (void)TickTime::FromFrame(1, zero); }, "inRate.GetTicksPerFrame() > 0"},
        {[&] { (void)kTime_Invalid.ToFrame64(pal); }, "IsValid()"},
        {[&] { (void)kTime_Invalid.AlignToFrame(pal); }, "IsValid()"},
        {[&] { (void)kTime_Invalid.AlignToFrameCeil(pal); }, "IsValid()"},
        {[&] { (void)(Ticks(1) / 0); }, "inDivisor != 0"}};
    for (const auto& [call, expression] : cases)
        vrtest::ExpectInputContract(call, expression);
}

} // namespace
} // namespace mvxmediatypes
