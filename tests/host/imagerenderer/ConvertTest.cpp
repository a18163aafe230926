// Conversions, scaling, deinterlacing, fills and mattes: exact pixel values of small frames.

#include "ContractExpect.h"
#include "ImageTestSupport.h"

#include <gtest/gtest.h>

namespace
{

using namespace irtest;

using ConvertTest = ::testing::Test;

TEST_F(ConvertTest, EightBitToFloatAndBackIsExact)
{
    std::mt19937 random(1);
    Image src(kBGRA8, 17, 3, 1), f(kBGRA32f, 17, 3, 4), back(kBGRA8, 17, 3, 2);
    src.Randomise(random);
    ASSERT_EQ(Convert(src, f), kIR_NoError);
    EXPECT_FLOAT_EQ(f.GetF(5, 1)[2], src.Get(5, 1)[2] / 255.0f);
    ASSERT_EQ(Convert(f, back), kIR_NoError);
    EXPECT_EQ(MaxDifference(src, back), 0);
    // Through float linear premultiplied light and back at quality 5, opaque pixels survive.
    Image opaque(kBGRA8, 256, 1), again(kBGRA8, 256, 1);
    Image linear(kIR_PixelFormat_BGRP_32f_Linear, 256, 1);
    for (int x = 0; x < 256; ++x)
        opaque.Set(x, 0, {std::uint8_t(x), std::uint8_t(255 - x), 7, 255});
    ASSERT_EQ(Convert(opaque, linear, 5), kIR_NoError);
    EXPECT_NEAR(linear.GetF(128, 0)[0], 0.2158605f, 1e-5f);
    ASSERT_EQ(Convert(linear, again, 5), kIR_NoError);
    EXPECT_EQ(MaxDifference(opaque, again), 0);
}

TEST_F(ConvertTest, YUVInterleavedRoundTripsAndPicksMatrixByHeight)
{
    for (IR_PixelFormat yuvFormat : {kIR_PixelFormat_VUYA_4444_8u, kIR_PixelFormat_YUYV_422_8u})
    {
        // Greys survive 4:2:2 chroma averaging.
        Image src(kBGRA8, 9, 2, 1), yuv(yuvFormat, 9, 2, 3), back(kBGRA8, 9, 2);
        for (std::uint8_t i = 0; i < 18; ++i)
            src.Set(i % 9, i / 9,
                    {std::uint8_t(i * 15), std::uint8_t(i * 15), std::uint8_t(i * 15), 255});
        ASSERT_EQ(Convert(src, yuv), kIR_NoError);
        ASSERT_EQ(Convert(yuv, back), kIR_NoError);
        EXPECT_LE(MaxDifference(src, back), 1) << yuvFormat;
    }
    // Pure red: luma differs between BT.601 (below 720 rows) and BT.709.
    Image red(kBGRA8, 1, 720), out(kIR_PixelFormat_VUYA_4444_8u, 1, 720);
    red.Fill({0, 0, 255, 255});
    for (const auto& [rows, luma] : {std::pair{719, 81}, std::pair{720, 63}})
    {
        ASSERT_EQ(IR_Convert(red.Data(), red.RowBytes(), kBGRA8, out.Data(), out.RowBytes(),
                             out.Format(), 1, rows, 4),
                  kIR_NoError);
        EXPECT_EQ(out.Get(0, 0)[2], luma) << rows;
    }
}

TEST_F(ConvertTest, BottomLeftFlipsRowsAndPlanarOutputIsUnsupported)
{
    Image src(kBGRA8, 1, 3), dst(kBGRA8 | kIR_FormatBit_BottomLeft, 1, 3);
    for (std::int32_t y = 0; y < 3; ++y)
        src.Set(0, y, {std::uint8_t(y), 0, 0, 255});
    ASSERT_EQ(Convert(src, dst), kIR_NoError);
    for (std::int32_t y = 0; y < 3; ++y)
        EXPECT_EQ(dst.Get(0, 2 - y), (Pixel{std::uint8_t(y), 0, 0, 255}));
    Image planar(kIR_PixelFormat_YUV_420_Planar_8u, 2, 2);
    EXPECT_EQ(
        IR_Convert(src.Data(), src.RowBytes(), kBGRA8, planar.Data(), 4, planar.Format(), 1, 2, 4),
        kIR_UnsupportedFormat);
}

TEST_F(ConvertTest, ScaleConvertHalvesByAreaNearestAndBilinear)
{
    Image src(kBGRA8, 4, 4), area(kBGRA8, 2, 2), nearest(kBGRA8, 2, 2), linear(kBGRA32f, 2, 2);
    for (std::int32_t i = 0; i < 16; ++i)
        src.Set(i % 4, i / 4, {std::uint8_t(40 * (i % 4) + 10 * (i / 4)), 0, 0, 255});
    for (auto& [dst, quality] :
         {std::pair{&area, 5}, std::pair{&nearest, 0}, std::pair{&linear, 3}})
        ASSERT_EQ(IR_ScaleConvert(src.Data(), src.RowBytes(), kBGRA8, 4, 4, dst->Data(),
                                  dst->RowBytes(), dst->Format(), 2, 2, quality),
                  kIR_NoError);
    // Block (0,0): 0, 40, 10, 50 -> 25; block (1,1): 100, 140, 110, 150 -> 125.
    // Nearest takes the pixel under each output centre: source (1, 1) and (3, 3).
    EXPECT_EQ((std::array{area.Get(0, 0), area.Get(1, 1), nearest.Get(0, 0), nearest.Get(1, 1)}),
              (std::array{Pixel{25, 0, 0, 255}, Pixel{125, 0, 0, 255}, Pixel{50, 0, 0, 255},
                          Pixel{150, 0, 0, 255}}));
    // Bilinear at half size averages the same 2x2 blocks: (80 + 120 + 90 + 130) / 4 = 105.
    EXPECT_NEAR(linear.GetF(1, 0)[0], 105.0f / 255.0f, 1e-5f);
}

// Three columns; row y has blue 10 * y and green x.
Image Rows(std::int32_t inHeight)
{
    Image image(kBGRA8, 3, inHeight, 1);
    for (std::int32_t i = 0; i < 3 * inHeight; ++i)
        image.Set(i % 3, i / 3, {std::uint8_t(10 * (i / 3)), std::uint8_t(i % 3), 0, 255});
    return image;
}

std::vector<int> Blues(const Image& inImage, std::int32_t inX)
{
    std::vector<int> values;
    for (std::int32_t y = 0; y < inImage.Height(); ++y)
        values.push_back(inImage.Get(inX, y)[0]);
    return values;
}

using FieldTest = ::testing::Test;

TEST_F(FieldTest, DeinterlaceKeepsTheChosenFieldAndRebuildsTheOtherByQuality)
{
    // From quality 3 the rebuilt rows 1 and 3 average their neighbours; below it the kept
    // row above is repeated (row 0 has none and takes row 1).
    Image first = Rows(5), second = Rows(5);
    ASSERT_EQ(IR_Deinterlace(first.Data(), first.RowBytes(), kBGRA8, 3, 5, false, 3), kIR_NoError);
    for (std::int32_t y = 0; y < 5; ++y)
        EXPECT_EQ(first.Get(2, y), (Pixel{std::uint8_t(10 * y), 2, 0, 255})) << y;
    ASSERT_EQ(IR_Deinterlace(second.Data(), second.RowBytes(), kBGRA8, 3, 5, true, 0), kIR_NoError);
    EXPECT_EQ(Blues(second, 0), (std::vector<int>{10, 10, 10, 30, 30}));
}

TEST_F(FieldTest, DeinterlaceCopyTakesTheFieldAtHalfAndQuarterHeight)
{
    const Image src = Rows(8);
    auto copy = [&](Image& outDst, bool inKeepSecond)
    {
        return IR_DeinterlaceCopy(src.Data(), src.RowBytes(), 8, outDst.Data(), outDst.RowBytes(),
                                  outDst.Height(), kBGRA8, 3, inKeepSecond, 4);
    };
    Image half(kBGRA8, 3, 4, 2), quarter(kBGRA8, 3, 2, 3), third(kBGRA8, 3, 3);
    ASSERT_EQ(copy(half, true), kIR_NoError);
    EXPECT_EQ(Blues(half, 1), (std::vector<int>{10, 30, 50, 70}));
    // Field rows 0 and 2 (picture rows 0 and 2 -> average 10), then rows 4 and 6 -> 50.
    ASSERT_EQ(copy(quarter, false), kIR_NoError);
    EXPECT_EQ(Blues(quarter, 0), (std::vector<int>{10, 50}));
    EXPECT_INPUT_CONTRACT(copy(third, false),
                          "inSrcHeight == 2 * inDstHeight || inSrcHeight == 4 * inDstHeight");
}

using FillAndMatteTest = ::testing::Test;

TEST_F(FillAndMatteTest, FillWritesTheColourInEachFormat)
{
    auto fill = [](IR_PixelFormat inFormat, std::uint32_t inColor)
    {
        Image image(inFormat, 1, 1);
        EXPECT_EQ(IR_FillWithColor(image.Data(), image.RowBytes(), inFormat, 1, 1, inColor, 4),
                  kIR_NoError);
        return image;
    };
    EXPECT_EQ(fill(kBGRA8, 0x80FF0000u).Get(0, 0), (Pixel{0, 0, 255, 128}));
    EXPECT_EQ(fill(kBGRP8, 0x80FF0000u).Get(0, 0), (Pixel{0, 0, 128, 128}));
    EXPECT_EQ(fill(kBGRA32f, 0x80FF0000u).GetF(0, 0), (PixelF{0, 0, 1, 128.0f / 255.0f}));
    EXPECT_EQ(fill(kIR_PixelFormat_VUYA_4444_8u, 0xFFFFFFFFu).Get(0, 0),
              (Pixel{128, 128, 235, 255}));
}

TEST_F(FillAndMatteTest, UnPremultiplyAgainstBlackAndColouredMattes)
{
    // Against black the result equals the plain premultiplied -> straight conversion, in place.
    Image frame(kBGRA8, 2, 1);
    frame.Set(0, 0, {64, 32, 0, 128});
    frame.Set(1, 0, {50, 50, 50, 0});
    ASSERT_EQ(IR_UnPremultiplyAgainstMatteColor(frame.Data(), 8, frame.Data(), 8, kBGRA8, 2, 1, 0u,
                                                kIR_FormatBit_StraightAlpha, 4),
              kIR_NoError);
    EXPECT_EQ(frame.Get(0, 0), (Pixel{128, 64, 0, 128}));
    EXPECT_EQ(frame.Get(1, 0), (Pixel{0, 0, 0, 0}));
    // Colour 51 (0.2) at alpha 128 over a white matte was stored as 153.
    const Image white = One(kBGRA8, {153, 255, 128, 128});
    Image out(kBGRA8, 1, 1);
    auto unPremultiply = [&](std::uint32_t inOutputAlpha)
    {
        EXPECT_EQ(IR_UnPremultiplyAgainstMatteColor(white.Data(), 4, out.Data(), 4, kBGRA8, 1, 1,
                                                    0xFFFFFFFFu, inOutputAlpha, 4),
                  kIR_NoError);
        return out.Get(0, 0);
    };
    const Pixel p = unPremultiply(kIR_FormatBit_StraightAlpha);
    EXPECT_NEAR(p[0], 51, 1);
    // (128 - 127) / 128 of full scale is 1.99.
    EXPECT_EQ(p, (Pixel{p[0], 255, 2, 128}));
    EXPECT_NEAR(unPremultiply(kIR_FormatBit_PremultipliedAlpha)[0], 26, 1);
    EXPECT_INPUT_CONTRACT(unPremultiply(1u), "inOutputAlpha == kIR_FormatBit_StraightAlpha || "
                                             "inOutputAlpha == kIR_FormatBit_PremultipliedAlpha");
}

} // namespace
