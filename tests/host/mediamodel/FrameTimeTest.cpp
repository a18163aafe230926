#include "MF/FrameTime.h"

#include "ContractExpect.h"

#include <tuple>

#include <gtest/gtest.h>

namespace
{

using namespace mvxmediatypes;

constexpr auto Ticks = &TickTime::TicksToTime;

using FrameTimeTest = ::testing::Test;

TEST_F(FrameTimeTest, FieldOrderFollowsTheEarlierFieldAndBadArgumentsBreakContracts)
{
    // The earlier field gives the order and the frame's time.
    const MF::FrameTime lower(Ticks(-10), Ticks(-20));
    EXPECT_EQ(std::tuple(lower.GetFieldOrder(), lower.GetTime(), lower.GetLaterTime(),
                         lower.GetFieldTime(1), lower.IsInterlaced()),
              std::tuple(kFieldType_LowerFirst, Ticks(-20), Ticks(-10), Ticks(-10), true));
    const MF::FrameTime time(Ticks(100), Ticks(150));
    EXPECT_EQ(time.Swapped(), MF::FrameTime(Ticks(150), Ticks(100)));
    const TickTime field = Ticks(11'771'760);
    EXPECT_EQ(MF::FrameTime::Make(Ticks(0), kFieldType_UpperFirst, field),
              MF::FrameTime(Ticks(0), field));
    EXPECT_EQ(MF::FrameTime::Make(Ticks(0), kFieldType_LowerFirst, field),
              MF::FrameTime(field, Ticks(0)));
    EXPECT_EQ(MF::FrameTime::Make(Ticks(5), kFieldType_Progressive, field),
              MF::FrameTime(Ticks(5)));
    MF::FrameTime changed(Ticks(10));
    changed.SetSecondFieldTime(Ticks(20));
    changed.SetFirstFieldTime(Ticks(30));
    EXPECT_EQ(changed, MF::FrameTime(Ticks(30), Ticks(20)));
    changed.SetTime(Ticks(40));
    EXPECT_EQ(changed, MF::FrameTime(Ticks(40)));
    // Bad arguments break contracts.
    EXPECT_INPUT_CONTRACT(time.GetFieldTime(3), "inField == 1 || inField == 2");
    EXPECT_INPUT_CONTRACT(
        MF::FrameTime::Make(Ticks(0), kFieldType_AsSource, Ticks(1)),
        "inOrder == mvxmediatypes::kFieldType_Progressive || mvxmediatypes::IsInterlaced(inOrder)");
    EXPECT_INPUT_CONTRACT(MF::FrameTime::Make(Ticks(0), kFieldType_UpperFirst, Ticks(0)),
                          "inFieldDuration > mvxmediatypes::kTime_Zero");
    EXPECT_FALSE(MF::FrameTime(kTime_Invalid, Ticks(0)).IsValid());
    EXPECT_FALSE(MF::FrameTime(Ticks(0), kTime_Invalid).IsValid());
}

} // namespace
