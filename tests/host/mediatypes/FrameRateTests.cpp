#include "ContractExpect.h"
#include "mvxmediatypes/FrameRate.h"

#include <cmath>
#include <cstdint>
#include <functional>
#include <limits>
#include <tuple>
#include <utility>

#include <gtest/gtest.h>

namespace mvxmediatypes
{
namespace
{

constexpr std::int64_t kInt64Max = std::numeric_limits<std::int64_t>::max();

using FrameRateTest = ::testing::Test;

TEST_F(FrameRateTest, NamedRatesAreExactRationals)
{
    const std::tuple<FrameRate, std::int64_t, std::int64_t> cases[] = {
        {kFrameRate_Video2398, 24000, 1001},
        {kFrameRate_Video25, 25, 1},
        {kFrameRate_Video5994, 60000, 1001},
        {kFrameRate_Audio48000, 48000, 1}};
    for (const auto& [rate, numerator, denominator] : cases)
    {
        SCOPED_TRACE(::testing::Message() << numerator << "/" << denominator);
        // Ticks per frame x numerator is exactly a whole number of seconds.
        EXPECT_EQ(rate.GetTicksPerFrame() * numerator, 705'600'000LL * denominator);
        EXPECT_EQ(FrameRate::Create(numerator, denominator), rate);
        EXPECT_DOUBLE_EQ(rate.GetValue(), double(numerator) / double(denominator));
        EXPECT_EQ(FrameRate::FromValue(double(numerator) / double(denominator)), rate);
    }
    EXPECT_EQ(kFrameRate_Zero.GetValue(), 0.0);
    EXPECT_EQ(FrameRate::Create(0, 1001), kFrameRate_Zero);
    EXPECT_EQ(FrameRate::FromValue(0.0), kFrameRate_Zero);
    EXPECT_EQ(kFrameRate_Video25.FrameToTime(-3).GetTicks(), -3 * 28'224'000LL);
    EXPECT_EQ(kFrameRate_Video25.FrameToTime(kInt64Max), kTime_Max);
    // Zero first, then ascending frames per second.
    EXPECT_TRUE(kFrameRate_Zero < FrameRate::Create(kInt64Max) &&
                FrameRate::Create(kInt64Max) < kFrameRate_Video2398 &&
                kFrameRate_Video2398 < kFrameRate_Audio48000 &&
                kFrameRate_Audio48000 > kFrameRate_Video2398);
}

TEST_F(FrameRateTest, BadInputViolatesContracts)
{
    const std::pair<std::function<void()>, const char*> cases[] = {
        {[] { (void)FrameRate::Create(-1); }, "inTicksPerFrame >= 0"},
        {[] { (void)FrameRate::Create(30000, 0); }, "inDenominator > 0"},
        {[] { (void)FrameRate::Create(-30000, 1001); }, "inNumerator >= 0"},
        {[] { (void)(kFrameRate_Video25 * 0); }, "inFactor >= 1"},
        {[] { (void)(kFrameRate_Video25 / 0); }, "inDivisor >= 1"},
        {[] { (void)(kFrameRate_Video25 / kInt64Max); }, "!overflow"},
        {[] { (void)FrameRate::FromValue(-1.0); }, "inFramesPerSecond >= 0.0"},
        {[] { (void)FrameRate::FromValue(std::nan("")); }, "!std::isnan(inFramesPerSecond)"},
        // Faster than one frame per tick cannot be represented.
        {[] { (void)FrameRate::FromValue(1e12); }, "ticks >= 1.0"},
        {[] { (void)FrameRate::Create(705'600'001LL * 10, 1); }, "ticks >= 1"}};
    for (const auto& [call, expression] : cases)
        vrtest::ExpectInputContract(call, expression);
}

} // namespace
} // namespace mvxmediatypes
