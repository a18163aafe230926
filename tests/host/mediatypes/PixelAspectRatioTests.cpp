#include "mvxmediatypes/PixelAspectRatio.h"

#include <gtest/gtest.h>

namespace mvxmediatypes
{
namespace
{

class PixelAspectRatioTest : public ::testing::Test
{
protected:
    static void ExpectTerms(const PixelAspectRatio& inRatio, std::uint32_t inNumerator,
                            std::uint32_t inDenominator)
    {
        EXPECT_EQ(inRatio.GetNumerator(), inNumerator);
        EXPECT_EQ(inRatio.GetDenominator(), inDenominator);
    }
};

TEST_F(PixelAspectRatioTest, ConstantsHoldTheStandardRatios)
{
    ExpectTerms(kPixelAspectRatio_Square, 1, 1);
    ExpectTerms(kPixelAspectRatio_Any, 0, 0);
    ExpectTerms(kPixelAspectRatio_D1NTSC, 10, 11);
    ExpectTerms(kPixelAspectRatio_D1NTSCWide, 40, 33);
    ExpectTerms(kPixelAspectRatio_D1PAL, 59, 54);
    ExpectTerms(kPixelAspectRatio_D1PALWide, 118, 81);
    ExpectTerms(kPixelAspectRatio_Anamorphic, 2, 1);
    ExpectTerms(kPixelAspectRatio_HD1440, 4, 3);
    ExpectTerms(kPixelAspectRatio_HD1280, 3, 2);
    ExpectTerms(PixelAspectRatio(), 1, 1);
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
    EXPECT_EQ(PixelAspectRatio(20, 22), kPixelAspectRatio_D1NTSC);
    EXPECT_EQ(PixelAspectRatio(2, 2), kPixelAspectRatio_Square);
    EXPECT_NE(PixelAspectRatio(11, 10), kPixelAspectRatio_D1NTSC);
    EXPECT_NE(kPixelAspectRatio_D1PAL, kPixelAspectRatio_D1NTSC);
    // Cross products of large terms need 64 bits.
    EXPECT_NE(PixelAspectRatio(4294967295u, 4294967294u),
              PixelAspectRatio(4294967294u, 4294967293u));
    EXPECT_EQ(PixelAspectRatio(4294967294u, 4294967294u), kPixelAspectRatio_Square);
    // Any equals only Any; other ratios with a zero term only their own spelling.
    EXPECT_EQ(kPixelAspectRatio_Any, PixelAspectRatio(0, 0));
    EXPECT_NE(kPixelAspectRatio_Any, kPixelAspectRatio_Square);
    EXPECT_NE(PixelAspectRatio(0, 1), PixelAspectRatio(0, 2));
    EXPECT_NE(PixelAspectRatio(0, 1), kPixelAspectRatio_Any);
    EXPECT_EQ(PixelAspectRatio(3, 0), PixelAspectRatio(3, 0));
}

TEST_F(PixelAspectRatioTest, ToDoubleAndReducedHandleZeroTerms)
{
    EXPECT_DOUBLE_EQ(kPixelAspectRatio_D1NTSC.ToDouble(), 10.0 / 11.0);
    EXPECT_DOUBLE_EQ(kPixelAspectRatio_Any.ToDouble(), 0.0);
    EXPECT_DOUBLE_EQ(PixelAspectRatio(5, 0).ToDouble(), 0.0);
    ExpectTerms(PixelAspectRatio(20, 22).Reduced(), 10, 11);
    ExpectTerms(PixelAspectRatio(118, 81).Reduced(), 118, 81);
    ExpectTerms(PixelAspectRatio(7, 7).Reduced(), 1, 1);
    ExpectTerms(kPixelAspectRatio_Any.Reduced(), 0, 0);
    ExpectTerms(PixelAspectRatio(0, 6).Reduced(), 0, 6);
}

} // namespace
} // namespace mvxmediatypes
