#include "QRT/Param.h"

#include <cstring>

#include <gtest/gtest.h>

namespace
{

TEST(ParamTest, RectSizesAreEdgeDifferencesThatWrapInsteadOfOverflowing)
{
    const QRT::ParamRect rect(10, 20, 1930, 1100);
    EXPECT_EQ(rect.Width(), 1920);
    EXPECT_EQ(rect.Height(), 1080);
    EXPECT_FALSE(rect.IsEmpty());
    EXPECT_EQ(QRT::ParamRect(5, 5, 2, 9).Width(), -3);
    EXPECT_TRUE(QRT::ParamRect(5, 5, 2, 9).IsEmpty());
    EXPECT_TRUE(QRT::ParamRect().IsEmpty());
    EXPECT_EQ(QRT::ParamRect(INT32_MIN, 0, INT32_MAX, 1).Width(), -1);
    EXPECT_EQ(QRT::ParamRect(0, 0, 4, 3), QRT::ParamRect(0, 0, 4, 3));
    EXPECT_NE(QRT::ParamRect(0, 0, 4, 3), QRT::ParamRect(0, 1, 4, 3));
    EXPECT_NE(QRT::ParamRect(0, 0, 4, 3), QRT::ParamRect(0, 0, 4, 4));
}

TEST(ParamTest, ColorPacksRedInTheLowestByteSoMemoryReadsAsRGB)
{
    const QRT::ParamColor color = QRT::ParamColor::FromRGBA(0x11, 0x22, 0x33, 0x44);
    EXPECT_EQ(color.GetValue(), 0x44332211u);
    EXPECT_EQ(color.Red() << 24 | color.Green() << 16 | color.Blue() << 8 | color.Alpha(),
              0x11223344);
    EXPECT_EQ(QRT::ParamColor::FromRGBA(1, 2, 3).Alpha(), 0xFF);

    const QRT::ParamColor rgb = QRT::ParamColor::FromRGBA(0xAB, 0xCD, 0xEF, 0x00);
    uint8_t bytes[4];
    std::memcpy(bytes, &rgb.mValue, 4);
    EXPECT_EQ((uint32_t{bytes[0]} << 16) | (uint32_t{bytes[1]} << 8) | bytes[2], 0xABCDEFu);
    EXPECT_EQ(rgb.GetRGB24(), 0xABCDEFu);
    EXPECT_EQ(rgb, QRT::ParamColor(0x00EFCDABu));
    EXPECT_NE(rgb, QRT::ParamColor::FromRGBA(0xAB, 0xCD, 0xEF, 0x01));
}

} // namespace
