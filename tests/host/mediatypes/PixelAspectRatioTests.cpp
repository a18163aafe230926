#include "mvxmediatypes/PixelAspectRatio.h"

#include <tuple>

#include <gtest/gtest.h>

namespace mvxmediatypes
{
namespace
{

using PixelAspectRatioTest = ::testing::Test;
using Par = PixelAspectRatio;

std::pair<std::uint32_t, std::uint32_t> Terms(const Par& inRatio)
{
    return {inRatio.GetNumerator(), inRatio.GetDenominator()};
}

TEST_F(PixelAspectRatioTest, ConstantsHoldTheStandardRatiosReduceAndCompareByValue)
{
    // (ratio, terms, reduced terms)
    using T = std::pair<std::uint32_t, std::uint32_t>;
    const std::tuple<Par, T, T> cases[] = {{kPixelAspectRatio_Any, {0, 0}, {0, 0}},
                                           {kPixelAspectRatio_D1PALWide, {118, 81}, {118, 81}},
                                           {kPixelAspectRatio_HD1440, {4, 3}, {4, 3}},
                                           {Par(), {1, 1}, {1, 1}},
                                           {Par(20, 22), {20, 22}, {10, 11}},
                                           {Par(0, 6), {0, 6}, {0, 6}}};
    for (const auto& [ratio, terms, reduced] : cases)
    {
        SCOPED_TRACE(::testing::Message() << terms.first << ":" << terms.second);
        EXPECT_EQ(Terms(ratio), terms);
        EXPECT_EQ(Terms(ratio.Reduced()), reduced);
        EXPECT_DOUBLE_EQ(ratio.ToDouble(), terms.second ? double(terms.first) / terms.second : 0);
    }
    EXPECT_EQ(Terms(kPixelAspectRatio_D1NTSC), T(10, 11));
    EXPECT_TRUE(kPixelAspectRatio_Any.IsAny() && !Par(0, 6).IsAny());
    // Cross products of large terms need 64 bits; Any equals only Any, and other
    // ratios with a zero term only their own spelling.
    const std::tuple<Par, Par, bool> pairs[] = {
        {Par(20, 22), kPixelAspectRatio_D1NTSC, true},
        {kPixelAspectRatio_D1PAL, kPixelAspectRatio_D1NTSC, false},
        {Par(4294967295u, 4294967294u), Par(4294967294u, 4294967293u), false},
        {kPixelAspectRatio_Any, Par(0, 0), true},
        {kPixelAspectRatio_Any, kPixelAspectRatio_Square, false},
        {Par(0, 1), Par(0, 2), false},
        {Par(3, 0), Par(3, 0), true}};
    for (const auto& [left, right, equal] : pairs)
        EXPECT_EQ(std::pair(left == right, left != right), std::pair(equal, !equal))
            << left.GetNumerator() << ":" << left.GetDenominator();
}

} // namespace
} // namespace mvxmediatypes
