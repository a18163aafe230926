#include "MF/PixelAspectRatioAdjust.h"

#include "ContractExpect.h"

#include <cmath>
#include <cstdint>
#include <limits>

#include <gtest/gtest.h>

namespace
{

using mvxmediatypes::PixelAspectRatio;

// Exact terms, not just an equal value.
void ExpectTerms(const PixelAspectRatio& inRatio, std::uint32_t inNumerator,
                 std::uint32_t inDenominator)
{
    EXPECT_EQ(inRatio.GetNumerator(), inNumerator);
    EXPECT_EQ(inRatio.GetDenominator(), inDenominator);
}

class PixelAspectRatioAdjustTest : public ::testing::Test
{
};

TEST_F(PixelAspectRatioAdjustTest, HalfTheColumnsDoublesTheRatio)
{
    ExpectTerms(MF::AdjustPixelAspectRatioForNonUniformDownsample(
                    mvxmediatypes::kPixelAspectRatio_D1NTSC, 720, 480, 360, 480),
                20, 11);
}

TEST_F(PixelAspectRatioAdjustTest, HalfTheRowsHalvesTheRatio)
{
    ExpectTerms(MF::AdjustPixelAspectRatioForNonUniformDownsample(
                    mvxmediatypes::kPixelAspectRatio_D1NTSC, 720, 480, 720, 240),
                5, 11);
}

TEST_F(PixelAspectRatioAdjustTest, UniformReductionKeepsTheRatioInLowestTerms)
{
    ExpectTerms(MF::AdjustPixelAspectRatioForNonUniformDownsample(
                    mvxmediatypes::kPixelAspectRatio_D1NTSC, 720, 480, 360, 240),
                10, 11);
    ExpectTerms(MF::AdjustPixelAspectRatioForNonUniformDownsample(PixelAspectRatio(20, 22), 1920,
                                                                  1080, 1920, 1080),
                10, 11);
}

TEST_F(PixelAspectRatioAdjustTest, UnevenFactorsReduceExactly)
{
    // 1440x1080 anamorphic HD (4:3 pixels) delivered at 1920x1080: square.
    ExpectTerms(MF::AdjustPixelAspectRatioForNonUniformDownsample(
                    mvxmediatypes::kPixelAspectRatio_HD1440, 1440, 1080, 1920, 1080),
                1, 1);
    // 59:54 asked at 720x576, delivered at 704x573:
    // 59 * 720 * 573 / (54 * 704 * 576) = 24,341,040 / 21,897,216 = 56,345 / 50,688.
    const PixelAspectRatio ratio = MF::AdjustPixelAspectRatioForNonUniformDownsample(
        mvxmediatypes::kPixelAspectRatio_D1PAL, 720, 576, 704, 573);
    ExpectTerms(ratio, 56345, 50688);
}

TEST_F(PixelAspectRatioAdjustTest, AnyStaysAny)
{
    EXPECT_TRUE(MF::AdjustPixelAspectRatioForNonUniformDownsample(
                    mvxmediatypes::kPixelAspectRatio_Any, 720, 480, 360, 480)
                    .IsAny());
}

TEST_F(PixelAspectRatioAdjustTest, TermsBeyondThirtyTwoBitsGiveTheNearestFittingFraction)
{
    // Odd, and big - 2 is a prime that is not a multiple of 3.
    const std::uint32_t big = std::numeric_limits<std::uint32_t>::max() - 2;
    const std::int32_t maxSize = std::numeric_limits<std::int32_t>::max();
    // big * maxSize / (1 * 1) does not fit; the nearest fitting fraction is
    // the largest ratio there is.
    ExpectTerms(MF::AdjustPixelAspectRatioForNonUniformDownsample(PixelAspectRatio(big, 1), maxSize,
                                                                  1, 1, 1),
                std::numeric_limits<std::uint32_t>::max(), 1);
    // (big / (big - 2)) * (3 / 2): lowest terms 3 * big / (2 * (big - 2))
    // overflow; the answer is within 1 / denominator^2 of the exact value.
    const PixelAspectRatio ratio = MF::AdjustPixelAspectRatioForNonUniformDownsample(
        PixelAspectRatio(big, big - 2), 3, 2, 1, 1);
    const long double exact = 3.0L * big / (2.0L * (big - 2));
    const long double got = static_cast<long double>(ratio.GetNumerator()) / ratio.GetDenominator();
    EXPECT_LT(std::fabs(got - exact),
              1.0L / (static_cast<long double>(ratio.GetDenominator()) * ratio.GetDenominator()));
}

TEST_F(PixelAspectRatioAdjustTest, BadSizesAndRatiosBreakContracts)
{
    EXPECT_INPUT_CONTRACT(MF::AdjustPixelAspectRatioForNonUniformDownsample(
                              mvxmediatypes::kPixelAspectRatio_Square, 0, 480, 720, 480),
                          "inRequestedWidth > 0 && inRequestedHeight > 0");
    EXPECT_INPUT_CONTRACT(MF::AdjustPixelAspectRatioForNonUniformDownsample(
                              mvxmediatypes::kPixelAspectRatio_Square, 720, 480, 720, -1),
                          "inFrameWidth > 0 && inFrameHeight > 0");
    EXPECT_INPUT_CONTRACT(MF::AdjustPixelAspectRatioForNonUniformDownsample(PixelAspectRatio(1, 0),
                                                                            720, 480, 720, 480),
                          "inPixelAspectRatio.IsValid() || inPixelAspectRatio.IsAny()");
}

} // namespace
