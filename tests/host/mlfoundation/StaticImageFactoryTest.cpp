#include "ML/StaticImageFactory.h"

#include <gtest/gtest.h>

namespace
{

namespace mt = mvxmediatypes;
using Frame = QRT::InterfaceRef<MF::IVideoFrame>;
using ML::StaticImageFactory;

// 0xAARRGGBB of an 8-bit BGRA pixel.
uint32_t ColorAt(const Frame& inFrame, int32_t inX, int32_t inY)
{
    const auto* pixel = static_cast<const uint8_t*>(inFrame->GetBaseAddress()) +
                        static_cast<size_t>(inY) * inFrame->GetRowBytes() +
                        4 * static_cast<size_t>(inX);
    return uint32_t{pixel[3]} << 24 | uint32_t{pixel[2]} << 16 | uint32_t{pixel[1]} << 8 | pixel[0];
}

Frame Load(int32_t inNumber, int32_t inWidth, int32_t inHeight,
           mt::PixelFormat inFormat = mt::kPixelFormat_BGRA_4444_8u)
{
    return StaticImageFactory::LoadImageW(inNumber, inWidth, inHeight, inFormat,
                                          mt::kPixelAspectRatio_Square, mt::kRenderQuality_High);
}

bool EveryPixelIs(const Frame& inFrame, uint32_t inColor)
{
    for (int32_t y = 0; y < inFrame->GetBounds().Height(); ++y)
        for (int32_t x = 0; x < inFrame->GetBounds().Width(); ++x)
            if (ColorAt(inFrame, x, y) != inColor)
                return false;
    return true;
}

TEST(StaticImageFactoryTest, ColorBarsAtAnOddSize)
{
    const Frame bars = Load(ML::kStaticImage_ColorBars, 71, 9);
    ASSERT_TRUE(bars);
    EXPECT_EQ(bars->GetBounds(), QRT::ParamRect(0, 0, 71, 9));
    // Bar i covers columns [i * 71 / 7, (i + 1) * 71 / 7), every tenth column.
    const uint32_t expected[7] = {0xFFBFBFBF, 0xFFBFBF00, 0xFF00BFBF, 0xFF00BF00,
                                  0xFFBF00BF, 0xFFBF0000, 0xFF0000BF};
    for (int bar = 0; bar < 7; ++bar)
    {
        EXPECT_EQ(ColorAt(bars, bar * 10, 0), expected[bar]) << bar;
        EXPECT_EQ(ColorAt(bars, bar == 6 ? 70 : bar * 10 + 9, 8), expected[bar]) << bar;
    }
}

TEST(StaticImageFactoryTest, PlainPicturesAndTinySlatesAreOneExactColourInAnyFormat)
{
    EXPECT_TRUE(EveryPixelIs(Load(ML::kStaticImage_Black, 13, 7), 0xFF000000));
    EXPECT_TRUE(EveryPixelIs(Load(ML::kStaticImage_White, 13, 7), 0xFFFFFFFF));
    EXPECT_TRUE(EveryPixelIs(Load(ML::kStaticImage_MidGrey, 1, 1), 0xFF808080));
    // A slate too small for its text shows the background only.
    EXPECT_TRUE(EveryPixelIs(Load(ML::kStaticImage_MediaPending, 9, 5), 0xFF102A6E));
    // Other formats are converted.
    const Frame grey = Load(ML::kStaticImage_MidGrey, 3, 3, mt::kPixelFormat_BGRA_4444_32f);
    ASSERT_TRUE(grey);
    EXPECT_EQ(grey->GetPixelFormat(), mt::kPixelFormat_BGRA_4444_32f);
    EXPECT_NEAR(*static_cast<const float*>(grey->GetBaseAddress()), 128.0f / 255.0f, 1e-6f);
}

TEST(StaticImageFactoryTest, SlatesShowTheirBackgroundAndText)
{
    const Frame offline = Load(ML::kStaticImage_MediaOffline, 320, 180);
    const Frame pending = Load(ML::kStaticImage_MediaPending, 320, 180);
    // 13 characters of 6 columns less the last space: 77 columns at scale
    // min(256 / 77, 60 / 7) = 3, so the text starts at x 44, y 79. M's left
    // column is lit; the seventh character is O against P (O's corner is dark).
    EXPECT_EQ(ColorAt(offline, 43, 85), 0xFF6E1010u);
    EXPECT_EQ(ColorAt(offline, 44, 85), 0xFFFFFFFFu);
    EXPECT_EQ(ColorAt(offline, 44 + 6 * 6 * 3, 79), 0xFF6E1010u);
    EXPECT_EQ(ColorAt(pending, 44 + 6 * 6 * 3, 79), 0xFFFFFFFFu);
    EXPECT_EQ(ColorAt(pending, 319, 179), 0xFF102A6Eu);
}

TEST(StaticImageFactoryTest, BadRequestsAnswerNothing)
{
    EXPECT_FALSE(Load(7, 8, 8));
    EXPECT_FALSE(Load(-1, 8, 8));
    EXPECT_FALSE(Load(ML::kStaticImage_Black, 0, 8));
    EXPECT_FALSE(Load(ML::kStaticImage_Black, 8, -3));
    EXPECT_FALSE(Load(ML::kStaticImage_Black, 40000, 8));
    EXPECT_FALSE(Load(ML::kStaticImage_Black, 8, 8, mt::kPixelFormat_MJPG_422_Compressed));
}

} // namespace
