// Motion: geometry, sampling by quality, field passes and exact pixels of small frames.

#include "ContractExpect.h"
#include "ImageTestSupport.h"

#include <limits>

#include <gtest/gtest.h>

namespace
{

using namespace irtest;

using MotionTest = ::testing::Test;

TEST_F(MotionTest, IdentityAtBestQualityEqualsACopy)
{
    std::mt19937 random(3);
    for (IR_PixelFormat format : {kBGRP8, kBGRA8})
    {
        Image src(format, 13, 7, 1), dst(format, 13, 7, 2);
        src.Randomise(random);
        ASSERT_EQ(Draw(src, dst, Matrix(IR_MotionGeometry{}, src, dst), 5), kIR_NoError);
        // Straight pixels of alpha 0 come back as 0 (they carry no colour).
        Image expected = Copy(src, 0);
        for (std::int32_t i = 0; i < 13 * 7; ++i)
            if (src.Get(i % 13, i / 13)[3] == 0)
                expected.Set(i % 13, i / 13, {0, 0, 0, 0});
        EXPECT_LE(MaxDifference(dst, expected), format == kBGRA8 ? 1 : 0) << format;
    }
}

TEST_F(MotionTest, TwiceTheSizeIsNearestBelowQualityThreeAndBilinearAtThreeAndFour)
{
    Image src(kBGRP8, 2, 2), dst(kBGRP8, 4, 4);
    src.Set(0, 0, {255, 0, 0, 255});
    src.Set(1, 0, {0, 255, 0, 255});
    src.Set(0, 1, {0, 0, 255, 255});
    src.Set(1, 1, {40, 40, 40, 255});
    const IR_AffineMatrix matrix = Matrix({.scaleX = 2.0f, .scaleY = 2.0f}, src, dst);
    for (std::int32_t quality : {0, 2})
    {
        ASSERT_EQ(Draw(src, dst, matrix, quality), kIR_NoError);
        for (std::int32_t y = 0; y < 4; ++y)
            for (std::int32_t x = 0; x < 4; ++x)
                EXPECT_EQ(dst.Get(x, y), src.Get(x / 2, y / 2)) << x << "," << y << " q" << quality;
    }
    for (std::int32_t quality : {3, 4})
    {
        // Pixel (1, 1) sits a quarter of the way from source (0, 0) towards (1, 1).
        // B: 255 * 9/16 + 40 * 1/16 = 145.9; G: 255 * 3/16 + 2.5 = 50.3; R: 255 * 3/16 + 2.5.
        ASSERT_EQ(Draw(src, dst, matrix, quality), kIR_NoError);
        const Pixel want{146, 50, 50, 255};
        for (int c = 0; c < 4; ++c)
            EXPECT_NEAR(dst.Get(1, 1)[c], want[c], c < 3 ? 1 : 0) << quality;
    }
}

TEST_F(MotionTest, FieldPassTouchesOnlyItsRowsAndClearsThemWithoutALowerFrame)
{
    // A 4 x 4 opaque source onto a 6 x 6 destination through the bilinear, nearest and
    // whole-pixel paths, and through a singular matrix (which draws nothing). Rows outside
    // the field keep the sentinel; inside it, pixels the source does not cover are cleared
    // to transparent unless there is a lower frame.
    Image src(kBGRP8, 4, 4);
    src.Fill({80, 80, 80, 255});
    const Pixel sentinel{1, 2, 3, 4};
    const IR_AffineMatrix shift{.tx = 1.0, .ty = 1.0}, flat{.a = 0.0};
    // (matrix, quality, opacity)
    const std::tuple<IR_AffineMatrix, std::int32_t, float> cases[] = {{IR_AffineMatrix{}, 3, 1.0f},
                                                                      {shift, 0, 1.0f},
                                                                      {shift, 0, 0.5f},
                                                                      {shift, 3, 1.0f},
                                                                      {shift, 4, 1.0f},
                                                                      {flat, 3, 1.0f}};
    for (const auto& [matrix, quality, opacity] : cases)
        for (std::int32_t field : {kIR_Field_All, kIR_Field_First, kIR_Field_Second})
            for (bool lower : {false, true})
            {
                if (lower && opacity < 1.0f)
                    continue;
                Image dst(kBGRP8, 6, 6);
                dst.Fill(sentinel);
                ASSERT_EQ(Draw(src, dst, matrix, quality, field, lower, opacity), kIR_NoError);
                for (std::int32_t y = 0; y < 6; ++y)
                    for (std::int32_t x = 0; x < 6; ++x)
                    {
                        const bool covered = matrix.a != 0.0 && x >= matrix.tx &&
                                             x < matrix.tx + 4 && y >= matrix.ty &&
                                             y < matrix.ty + 4;
                        const auto v = std::uint8_t(80 * opacity);
                        Pixel want = covered ? Pixel{v, v, v, std::uint8_t(255 * opacity + 0.5f)}
                                             : (lower ? sentinel : Pixel{0, 0, 0, 0});
                        if (field != kIR_Field_All && y % 2 != (field == kIR_Field_First ? 0 : 1))
                            want = sentinel;
                        EXPECT_EQ(dst.Get(x, y), want)
                            << x << "," << y << " f" << field << " l" << lower << " q" << quality
                            << " a" << matrix.a;
                    }
            }
}

TEST_F(MotionTest, BadInputIsRefused)
{
    Image src(kBGRA8, 2, 2), dst(kBGRA8, 2, 2);
    const IR_AffineMatrix identity;
    EXPECT_INPUT_CONTRACT(Draw(src, dst, identity, 3, 3),
                          "inCall.field >= kIR_Field_All && inCall.field <= kIR_Field_Second");
    EXPECT_INPUT_CONTRACT(Draw(src, dst, identity, -1), "inQuality >= 0");
    const IR_AffineMatrix broken{.tx = std::numeric_limits<double>::infinity()};
    EXPECT_INPUT_CONTRACT(Draw(src, dst, broken, 3),
                          "std::isfinite(m.a) && std::isfinite(m.b) && std::isfinite(m.c) && "
                          "std::isfinite(m.d) && std::isfinite(m.tx) && std::isfinite(m.ty)");
    Image other(kBGRP8, 2, 2);
    EXPECT_EQ(Draw(src, other, identity, 3), kIR_UnsupportedFormat);
}

} // namespace
