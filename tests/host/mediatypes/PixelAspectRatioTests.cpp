#include "mvxmediatypes/PixelAspectRatio.h"

#include <iterator>

#include <gtest/gtest.h>

namespace mvxmediatypes
{
namespace
{

// Exact terms, not just an equal value.
void ExpectTerms(const PixelAspectRatio& inRatio, std::uint32_t inNumerator,
                 std::uint32_t inDenominator)
{
    EXPECT_EQ(inRatio.GetNumerator(), inNumerator);
    EXPECT_EQ(inRatio.GetDenominator(), inDenominator);
}

using PixelAspectRatioTest = ::testing::Test;

TEST_F(PixelAspectRatioTest, ConstantsHoldTheStandardRatiosAndReduceToLowestTerms)
{
    struct Case
    {
        PixelAspectRatio ratio;
        std::uint32_t numerator, denominator, reducedNumerator, reducedDenominator;
    };
    const Case cases[] = {
        {kPixelAspectRatio_Square, 1, 1, 1, 1},     {kPixelAspectRatio_Any, 0, 0, 0, 0},
        {kPixelAspectRatio_D1NTSC, 10, 11, 10, 11}, {kPixelAspectRatio_D1NTSCWide, 40, 33, 40, 33},
        {kPixelAspectRatio_D1PAL, 59, 54, 59, 54},  {kPixelAspectRatio_D1PALWide, 118, 81, 118, 81},
        {kPixelAspectRatio_Anamorphic, 2, 1, 2, 1}, {kPixelAspectRatio_HD1440, 4, 3, 4, 3},
        {kPixelAspectRatio_HD1280, 3, 2, 3, 2},     {PixelAspectRatio(), 1, 1, 1, 1},
        {PixelAspectRatio(20, 22), 20, 22, 10, 11}, {PixelAspectRatio(7, 7), 7, 7, 1, 1},
        {PixelAspectRatio(0, 6), 0, 6, 0, 6}};
    for (const Case& c : cases)
    {
        SCOPED_TRACE(::testing::Message() << c.numerator << ":" << c.denominator);
        ExpectTerms(c.ratio, c.numerator, c.denominator);
        ExpectTerms(c.ratio.Reduced(), c.reducedNumerator, c.reducedDenominator);
        EXPECT_DOUBLE_EQ(c.ratio.ToDouble(),
                         c.denominator ? double(c.numerator) / c.denominator : 0);
    }
    EXPECT_DOUBLE_EQ(PixelAspectRatio(5, 0).ToDouble(), 0.0);
    // 1440 pixels at 4:3 fill a 1920-wide picture; 1280 at 3:2 too.
    EXPECT_DOUBLE_EQ(1440 * kPixelAspectRatio_HD1440.ToDouble(), 1920.0);
    EXPECT_DOUBLE_EQ(1280 * kPixelAspectRatio_HD1280.ToDouble(), 1920.0);
    EXPECT_TRUE(kPixelAspectRatio_Any.IsAny());
    EXPECT_FALSE(kPixelAspectRatio_Any.IsValid());
    EXPECT_TRUE(kPixelAspectRatio_D1PAL.IsValid());
    EXPECT_EQ(sizeof(PixelAspectRatio), 8u);
}

TEST_F(PixelAspectRatioTest, EqualityComparesValuesNotSpellings)
{
    struct Case
    {
        PixelAspectRatio left, right;
        bool equal;
    };
    const Case cases[] = {
        {PixelAspectRatio(20, 22), kPixelAspectRatio_D1NTSC, true},
        {PixelAspectRatio(2, 2), kPixelAspectRatio_Square, true},
        {PixelAspectRatio(11, 10), kPixelAspectRatio_D1NTSC, false},
        {kPixelAspectRatio_D1PAL, kPixelAspectRatio_D1NTSC, false},
        // Cross products of large terms need 64 bits.
        {PixelAspectRatio(4294967295u, 4294967294u), PixelAspectRatio(4294967294u, 4294967293u),
         false},
        {PixelAspectRatio(4294967294u, 4294967294u), kPixelAspectRatio_Square, true},
        // Any equals only Any; other ratios with a zero term only their own spelling.
        {kPixelAspectRatio_Any, PixelAspectRatio(0, 0), true},
        {kPixelAspectRatio_Any, kPixelAspectRatio_Square, false},
        {PixelAspectRatio(0, 1), PixelAspectRatio(0, 2), false},
        {PixelAspectRatio(0, 1), kPixelAspectRatio_Any, false},
        {PixelAspectRatio(3, 0), PixelAspectRatio(3, 0), true}};
    for (std::size_t index = 0; index < std::size(cases); ++index)
    {
        EXPECT_EQ(cases[index].left == cases[index].right, cases[index].equal) << "case " << index;
        EXPECT_EQ(cases[index].left != cases[index].right, !cases[index].equal) << "case " << index;
    }
}

} // namespace
} // namespace mvxmediatypes
