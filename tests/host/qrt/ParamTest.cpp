#include "QRT/Param.h"

#include <cstring>

#include <gtest/gtest.h>

namespace
{

TEST(ParamTest, RectSizesWrapInsteadOfOverflowingAndColoursReadAsRGBInMemory)
{
    EXPECT_EQ(QRT::ParamRect(10, 20, 1930, 1100).Height(), 1080);
    EXPECT_FALSE(QRT::ParamRect(10, 20, 1930, 1100).IsEmpty());
    EXPECT_TRUE(QRT::ParamRect(5, 5, 2, 9).IsEmpty());
    EXPECT_TRUE(QRT::ParamRect(0, 5, 2, 5).IsEmpty());
    EXPECT_EQ(QRT::ParamRect(INT32_MIN, 0, INT32_MAX, 1).Width(), -1);
    EXPECT_TRUE(QRT::ParamRect().IsEmpty());
    EXPECT_EQ(QRT::ParamRect(0, 0, 4, 3), QRT::ParamRect(0, 0, 4, 3));
    EXPECT_NE(QRT::ParamRect(0, 0, 4, 3), QRT::ParamRect(0, 1, 4, 3));
    EXPECT_NE(QRT::ParamRect(0, 0, 4, 3), QRT::ParamRect(0, 0, 4, 4));
    // Colours pack red in the lowest byte, so memory reads as RGB.
    const QRT::ParamColor color = QRT::ParamColor::FromRGBA(0xAB, 0xCD, 0xEF, 0x44);
    EXPECT_EQ(color.GetValue(), 0x44EFCDABu);
    EXPECT_EQ(color.Red() << 24 | color.Green() << 16 | color.Blue() << 8 | color.Alpha(),
              0xABCDEF44);
    EXPECT_EQ(QRT::ParamColor::FromRGBA(1, 2, 3).Alpha(), 0xFF);
    uint8_t bytes[4];
    std::memcpy(bytes, &color.mValue, 4);
    EXPECT_EQ((uint32_t{bytes[0]} << 16) | (uint32_t{bytes[1]} << 8) | bytes[2], 0xABCDEFu);
    EXPECT_EQ(color.GetRGB24(), 0xABCDEFu);
}

} // namespace
