#include "MF/PixelAspectRatioAdjust.h"

#include "ContractExpect.h"

#include <cmath>
#include <cstdint>
#include <limits>
#include <tuple>

#include <gtest/gtest.h>

namespace
{

using namespace mvxmediatypes;

std::tuple<std::uint32_t, std::uint32_t> Terms(const PixelAspectRatio& inRatio)
{
    return {inRatio.GetNumerator(), inRatio.GetDenominator()};
}

using PixelAspectRatioAdjustTest = ::testing::Test;

TEST_F(PixelAspectRatioAdjustTest, RatioFollowsTheColumnAndRowFactorsAndBadSizesBreakContracts)
{
    const std::uint32_t big = std::numeric_limits<std::uint32_t>::max() - 2;
    const std::int32_t maxSize = std::numeric_limits<std::int32_t>::max();
    // (ratio, requested width and height, delivered width and height, exact terms)
    const std::tuple<PixelAspectRatio, int, int, int, int, std::uint32_t, std::uint32_t> cases[] = {
        // Half the columns doubles the ratio.
        {kPixelAspectRatio_D1NTSC, 720, 480, 360, 480, 20, 11},
        // 1440x1080 anamorphic HD (4:3 pixels) delivered at 1920x1080: square.
        {kPixelAspectRatio_HD1440, 1440, 1080, 1920, 1080, 1, 1},
        // 59 * 720 * 573 / (54 * 704 * 576) = 24,341,040 / 21,897,216 = 56,345 / 50,688.
        {kPixelAspectRatio_D1PAL, 720, 576, 704, 573, 56345, 50688},
        {kPixelAspectRatio_Any, 720, 480, 360, 480, 0, 0},
        // big * maxSize does not fit: the nearest fitting fraction is the largest there is.
        {PixelAspectRatio(big, 1), maxSize, 1, 1, 1, std::numeric_limits<std::uint32_t>::max(), 1}};
    for (const auto& [ratio, requestedWidth, requestedHeight, width, height, numerator,
                      denominator] : cases)
        EXPECT_EQ(Terms(MF::AdjustPixelAspectRatioForNonUniformDownsample(
                      ratio, requestedWidth, requestedHeight, width, height)),
                  std::tuple(numerator, denominator))
            << requestedWidth << "x" << requestedHeight << " to " << width << "x" << height;

    // (big / (big - 2)) * (3 / 2) in lowest terms overflows (big is odd and
    // big - 2 a prime that is no multiple of 3); the answer is within
    // 1 / denominator^2 of the exact value.
    const PixelAspectRatio ratio = MF::AdjustPixelAspectRatioForNonUniformDownsample(
        PixelAspectRatio(big, big - 2), 3, 2, 1, 1);
    const long double exact = 3.0L * big / (2.0L * (big - 2));
    const long double got = static_cast<long double>(ratio.GetNumerator()) / ratio.GetDenominator();
    EXPECT_LT(std::fabs(got - exact),
              1.0L / (static_cast<long double>(ratio.GetDenominator()) * ratio.GetDenominator()));
    // Bad sizes and ratios break contracts.
    EXPECT_INPUT_CONTRACT(MF::AdjustPixelAspectRatioForNonUniformDownsample(
                              kPixelAspectRatio_Square, 0, 480, 720, 480),
                          "inRequestedWidth > 0 && inRequestedHeight > 0");
    EXPECT_INPUT_CONTRACT(MF::AdjustPixelAspectRatioForNonUniformDownsample(PixelAspectRatio(1, 0),
                                                                            720, 480, 720, 480),
                          "inPixelAspectRatio.IsValid() || inPixelAspectRatio.IsAny()");
}

} // namespace
