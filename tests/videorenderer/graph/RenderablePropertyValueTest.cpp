// The text form of property values: what a default-formatted stream writes.

#include "ML/RenderablePropertyValue.h"

#include <cstdint>
#include <limits>

#include <gtest/gtest.h>

namespace
{

using mvxmediatypes::TickTime;
using RenderablePropertyValueTest = ::testing::Test;

TEST_F(RenderablePropertyValueTest, IntegersBooleansAndTimesArePlainDecimalAndParseBack)
{
    EXPECT_EQ(ML::FormatPropertyValue(std::int32_t{-42}), "-42");
    EXPECT_EQ(ML::FormatPropertyValue(std::numeric_limits<std::int64_t>::min()),
              "-9223372036854775808");
    EXPECT_EQ(ML::FormatPropertyValue(std::uint32_t{0xFFFFFFFFu}), "4294967295");
    EXPECT_EQ(ML::FormatPropertyValue(std::uint64_t{18446744073709551615u}),
              "18446744073709551615");
    EXPECT_EQ(ML::FormatPropertyValue(true), "1");
    EXPECT_EQ(ML::FormatPropertyValue(false), "0");
    EXPECT_EQ(ML::FormatPropertyValue(TickTime::TicksToTime(23543520)), "23543520");
    EXPECT_EQ(ML::FormatPropertyValue(mvxmediatypes::kTime_Max), "9223372036854775807");
    const std::uint8_t bytes[] = {0x00, 0xAB, 0x1F};
    EXPECT_EQ(ML::FormatPropertyValue(MF::BinaryData(bytes, sizeof(bytes))), "00ab1f");
    // Parsing takes back what formatting writes and refuses any other text.
    std::uint32_t color = 7;
    EXPECT_TRUE(ML::ParsePropertyValue("4278190335", color));
    EXPECT_EQ(color, 4278190335u);
    for (const char* bad : {"", "-1", "+5", " 5", "5 ", "4294967296", "0x10", "1.5", "abc"})
    {
        color = 7;
        EXPECT_FALSE(ML::ParsePropertyValue(bad, color)) << '"' << bad << '"';
        EXPECT_EQ(color, 7u);
    }
    TickTime time;
    EXPECT_TRUE(ML::ParsePropertyValue("-705600000", time));
    EXPECT_EQ(time.GetTicks(), -705600000);
    bool flag = false;
    EXPECT_TRUE(ML::ParsePropertyValue("1", flag));
    EXPECT_TRUE(flag);
    EXPECT_FALSE(ML::ParsePropertyValue("true", flag));
    double number = 0;
    EXPECT_TRUE(ML::ParsePropertyValue(ML::FormatPropertyValue(1234567.0), number));
    EXPECT_EQ(number, 1234570.0);
}

} // namespace
