#include "QRT/Param.h"

#include <cstring>

#include <gtest/gtest.h>

namespace
{

class ParamTest : public ::testing::Test
{
};

TEST_F(ParamTest, RectWidthAndHeightAreEdgeDifferences)
{
    const QRT::ParamRect rect(10, 20, 1930, 1100);
    EXPECT_EQ(rect.Width(), 1920);
    EXPECT_EQ(rect.Height(), 1080);
    EXPECT_FALSE(rect.IsEmpty());
    EXPECT_EQ(QRT::ParamRect(5, 5, 2, 9).Width(), -3);
    EXPECT_TRUE(QRT::ParamRect(5, 5, 2, 9).IsEmpty());
    EXPECT_TRUE(QRT::ParamRect().IsEmpty());
}

TEST_F(ParamTest, RectExtremeEdgesWrapInsteadOfOverflowing)
{
    const QRT::ParamRect rect(INT32_MIN, 0, INT32_MAX, 1);
    EXPECT_EQ(rect.Width(), -1);
}

TEST_F(ParamTest, RectEqualityComparesAllEdges)
{
    EXPECT_EQ(QRT::ParamRect(0, 0, 4, 3), QRT::ParamRect(0, 0, 4, 3));
    EXPECT_NE(QRT::ParamRect(0, 0, 4, 3), QRT::ParamRect(0, 1, 4, 3));
    EXPECT_NE(QRT::ParamRect(0, 0, 4, 3), QRT::ParamRect(0, 0, 4, 4));
}

TEST_F(ParamTest, ColorPacksRedInTheLowestByte)
{
    const QRT::ParamColor color = QRT::ParamColor::FromRGBA(0x11, 0x22, 0x33, 0x44);
    EXPECT_EQ(color.GetValue(), 0x44332211u);
    EXPECT_EQ(color.Red(), 0x11);
    EXPECT_EQ(color.Green(), 0x22);
    EXPECT_EQ(color.Blue(), 0x33);
    EXPECT_EQ(color.Alpha(), 0x44);
    EXPECT_EQ(QRT::ParamColor::FromRGBA(1, 2, 3).Alpha(), 0xFF);
}

TEST_F(ParamTest, FirstThreeMemoryBytesReadMostSignificantFirstGiveRGB)
{
    const QRT::ParamColor color = QRT::ParamColor::FromRGBA(0xAB, 0xCD, 0xEF, 0x00);
    uint8_t bytes[4];
    std::memcpy(bytes, &color.mValue, 4);
    const uint32_t read = (uint32_t{bytes[0]} << 16) | (uint32_t{bytes[1]} << 8) | bytes[2];
    EXPECT_EQ(read, 0xABCDEFu);
    EXPECT_EQ(color.GetRGB24(), 0xABCDEFu);
    EXPECT_EQ(color, QRT::ParamColor(0x00EFCDABu));
    EXPECT_NE(color, QRT::ParamColor::FromRGBA(0xAB, 0xCD, 0xEF, 0x01));
}

} // namespace
