#include "mvxmediatypes/PixelAspectRatio.h"

#include <iterator>

#include <gtest/gtest.h>

namespace mvxmediatypes
{
namespace
{

using PixelAspectRatioTest = ::testing::Test;

TEST_F(PixelAspectRatioTest, ConstantsHoldTheStandardRatiosAndReduceToLowestTerms)
{
    struct Case
    {
        PixelAspectRatio ratio;
        std::uint32_t num, den, reducedNum, reducedDen;
    };
    const Case cases[] = {{kPixelAspectRatio_Any, 0, 0, 0, 0},
                          {kPixelAspectRatio_D1NTSC, 10, 11, 10, 11},
                          {kPixelAspectRatio_D1PALWide, 118, 81, 118, 81},
                          {kPixelAspectRatio_HD1440, 4, 3, 4, 3},
                          {PixelAspectRatio(), 1, 1, 1, 1},
                          {PixelAspectRatio(20, 22), 20, 22, 10, 11},
                          {PixelAspectRatio(0, 6), 0, 6, 0, 6}};
    for (const Case& c : cases)
    {
        SCOPED_TRACE(::testing::Message() << c.num << ":" << c.den);
        EXPECT_EQ(std::pair(c.ratio.GetNumerator(), c.ratio.GetDenominator()),
                  std::pair(c.num, c.den));
        const PixelAspectRatio reduced = c.ratio.Reduced();
        EXPECT_EQ(std::pair(reduced.GetNumerator(), reduced.GetDenominator()),
                  std::pair(c.reducedNum, c.reducedDen));
        EXPECT_DOUBLE_EQ(c.ratio.ToDouble(), c.den ? double(c.num) / c.den : 0);
    }
    // 1440 pixels at 4:3 fill a 1920-wide picture.
    EXPECT_DOUBLE_EQ(1440 * kPixelAspectRatio_HD1440.ToDouble(), 1920.0);
    EXPECT_TRUE(kPixelAspectRatio_Any.IsAny() && !PixelAspectRatio(0, 6).IsAny());
}

TEST_F(PixelAspectRatioTest, EqualityComparesValuesNotSpellings)
{
    struct Case
    {
        PixelAspectRatio left, right;
        bool equal;
    };
    const Case cases[] = {{PixelAspectRatio(20, 22), kPixelAspectRatio_D1NTSC, true},
                          {kPixelAspectRatio_D1PAL, kPixelAspectRatio_D1NTSC, false},
                          // Cross products of large terms need 64 bits.
                          {PixelAspectRatio(4294967295u, 4294967294u),
                           PixelAspectRatio(4294967294u, 4294967293u), false},
                          // Any equals only Any; other ratios with a zero term only their own
                          // spelling.
                          {kPixelAspectRatio_Any, PixelAspectRatio(0, 0), true},
                          {kPixelAspectRatio_Any, kPixelAspectRatio_Square, false},
                          {PixelAspectRatio(0, 1), PixelAspectRatio(0, 2), false},
                          {PixelAspectRatio(3, 0), PixelAspectRatio(3, 0), true}};
    for (std::size_t index = 0; index < std::size(cases); ++index)
    {
        EXPECT_EQ(cases[index].left == cases[index].right, cases[index].equal) << "case " << index;
        EXPECT_EQ(cases[index].left != cases[index].right, !cases[index].equal) << "case " << index;
    }
}

} // namespace
} // namespace mvxmediatypes
