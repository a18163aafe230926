#include "MF/FrameTime.h"

#include "ContractExpect.h"

#include <gtest/gtest.h>

namespace
{

using mvxmediatypes::kFieldType_LowerFirst;
using mvxmediatypes::kFieldType_Progressive;
using mvxmediatypes::kFieldType_UpperFirst;
using mvxmediatypes::TickTime;

TickTime Ticks(std::int64_t inTicks)
{
    return TickTime::TicksToTime(inTicks);
}

class FrameTimeTest : public ::testing::Test
{
};

TEST_F(FrameTimeTest, FirstEarlierIsUpperFirstAndEarlierIsFrameTime)
{
    const MF::FrameTime time(Ticks(1000), Ticks(1500));
    EXPECT_EQ(time.GetFieldOrder(), kFieldType_UpperFirst);
    EXPECT_EQ(time.GetTime(), Ticks(1000));
    EXPECT_EQ(time.GetLaterTime(), Ticks(1500));
    EXPECT_EQ(time.GetFirstFieldTime(), Ticks(1000));
    EXPECT_EQ(time.GetSecondFieldTime(), Ticks(1500));
    EXPECT_FALSE(time.IsProgressive());
    EXPECT_TRUE(time.IsInterlaced());
}

TEST_F(FrameTimeTest, FirstLaterIsLowerFirstAndSecondIsFrameTime)
{
    const MF::FrameTime time(Ticks(1500), Ticks(1000));
    EXPECT_EQ(time.GetFieldOrder(), kFieldType_LowerFirst);
    EXPECT_EQ(time.GetTime(), Ticks(1000));
    EXPECT_EQ(time.GetLaterTime(), Ticks(1500));
    EXPECT_EQ(time.GetFieldTime(1), Ticks(1500));
    EXPECT_EQ(time.GetFieldTime(2), Ticks(1000));
}

TEST_F(FrameTimeTest, EqualTimesAreProgressive)
{
    const MF::FrameTime single(Ticks(-700));
    const MF::FrameTime pair(Ticks(-700), Ticks(-700));
    EXPECT_EQ(single, pair);
    EXPECT_EQ(single.GetFieldOrder(), kFieldType_Progressive);
    EXPECT_TRUE(single.IsProgressive());
    EXPECT_EQ(single.GetTime(), Ticks(-700));
    EXPECT_EQ(MF::FrameTime().GetTime(), mvxmediatypes::kTime_Zero);
}

TEST_F(FrameTimeTest, NegativeTimesKeepTheOrderRule)
{
    const MF::FrameTime time(Ticks(-10), Ticks(-20));
    EXPECT_EQ(time.GetFieldOrder(), kFieldType_LowerFirst);
    EXPECT_EQ(time.GetTime(), Ticks(-20));
}

TEST_F(FrameTimeTest, SwappedExchangesOrderButNotFrameTime)
{
    const MF::FrameTime time(Ticks(100), Ticks(150));
    const MF::FrameTime swapped = time.Swapped();
    EXPECT_EQ(swapped.GetFieldOrder(), kFieldType_LowerFirst);
    EXPECT_EQ(swapped.GetTime(), time.GetTime());
    EXPECT_NE(swapped, time);
    EXPECT_EQ(swapped.Swapped(), time);
}

TEST_F(FrameTimeTest, MakeBuildsEachOrder)
{
    const TickTime field = Ticks(11'771'760);
    EXPECT_EQ(MF::FrameTime::Make(Ticks(0), kFieldType_UpperFirst, field),
              MF::FrameTime(Ticks(0), field));
    EXPECT_EQ(MF::FrameTime::Make(Ticks(0), kFieldType_LowerFirst, field),
              MF::FrameTime(field, Ticks(0)));
    EXPECT_EQ(MF::FrameTime::Make(Ticks(5), kFieldType_Progressive, field),
              MF::FrameTime(Ticks(5)));
}

TEST_F(FrameTimeTest, SettersChangeOrder)
{
    MF::FrameTime time(Ticks(10));
    time.SetSecondFieldTime(Ticks(20));
    EXPECT_EQ(time.GetFieldOrder(), kFieldType_UpperFirst);
    time.SetFirstFieldTime(Ticks(30));
    EXPECT_EQ(time.GetFieldOrder(), kFieldType_LowerFirst);
    EXPECT_EQ(time.GetTime(), Ticks(20));
    time.SetTime(Ticks(40));
    EXPECT_TRUE(time.IsProgressive());
    EXPECT_EQ(time.GetTime(), Ticks(40));
}

TEST_F(FrameTimeTest, BadArgumentsBreakContracts)
{
    const MF::FrameTime time(Ticks(1), Ticks(2));
    EXPECT_INPUT_CONTRACT(time.GetFieldTime(0), "inField == 1 || inField == 2");
    EXPECT_INPUT_CONTRACT(time.GetFieldTime(3), "inField == 1 || inField == 2");
    EXPECT_INPUT_CONTRACT(
        MF::FrameTime::Make(Ticks(0), mvxmediatypes::kFieldType_AsSource, Ticks(1)),
        "inOrder == mvxmediatypes::kFieldType_Progressive || mvxmediatypes::IsInterlaced(inOrder)");
    EXPECT_INPUT_CONTRACT(MF::FrameTime::Make(Ticks(0), kFieldType_UpperFirst, Ticks(0)),
                          "inFieldDuration > mvxmediatypes::kTime_Zero");
    EXPECT_FALSE(MF::FrameTime(mvxmediatypes::kTime_Invalid, Ticks(0)).IsValid());
}

} // namespace
