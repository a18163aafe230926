#include "MF/Keyframe.h"

#include <gtest/gtest.h>

namespace
{

using mvxmediatypes::TickTime;

class KeyframeTest : public ::testing::Test
{
};

TEST_F(KeyframeTest, ValueKindsUseThePluginNumbers)
{
    EXPECT_EQ(MF::GetKeyframeValueKind(MF::KeyframeValue{}), MF::kKeyframeValueKind_None);
    EXPECT_EQ(MF::GetKeyframeValueKind(std::int8_t{-1}), 2);
    EXPECT_EQ(MF::GetKeyframeValueKind(std::uint8_t{1}), 3);
    EXPECT_EQ(MF::GetKeyframeValueKind(std::int16_t{1}), 4);
    EXPECT_EQ(MF::GetKeyframeValueKind(std::uint16_t{1}), 5);
    EXPECT_EQ(MF::GetKeyframeValueKind(std::int32_t{1}), 6);
    EXPECT_EQ(MF::GetKeyframeValueKind(std::uint32_t{1}), 7);
    EXPECT_EQ(MF::GetKeyframeValueKind(std::int64_t{1}), 8);
    EXPECT_EQ(MF::GetKeyframeValueKind(std::uint64_t{1}), 9);
    EXPECT_EQ(MF::GetKeyframeValueKind(1.0f), 10);
    EXPECT_EQ(MF::GetKeyframeValueKind(1.0), 11);
    EXPECT_EQ(MF::GetKeyframeValueKind(std::u16string(u"text")), 12);
    EXPECT_EQ(MF::GetKeyframeValueKind(true), 13);
    EXPECT_EQ(MF::GetKeyframeValueKind(QRT::Guid::CreateUnique()), 14);
    EXPECT_EQ(MF::GetKeyframeValueKind(MF::BinaryData::FromText("x")), 15);
    EXPECT_EQ(MF::GetKeyframeValueKind(MF::KeyframePoint{1.0, 2.0}), 16);
}

TEST_F(KeyframeTest, KeyframeKeepsTimeInterpolationAndValue)
{
    const MF::Keyframe keyframe(TickTime::TicksToTime(42), MF::KeyframePoint{0.5, -3.0}, 7);
    EXPECT_EQ(keyframe.GetTime(), TickTime::TicksToTime(42));
    EXPECT_EQ(keyframe.GetInterpolation(), 7);
    EXPECT_EQ(keyframe.GetValueKind(), MF::kKeyframeValueKind_Point);
    EXPECT_EQ(std::get<MF::KeyframePoint>(keyframe.GetValue()), (MF::KeyframePoint{0.5, -3.0}));
    EXPECT_EQ(keyframe, MF::Keyframe(TickTime::TicksToTime(42), MF::KeyframePoint{0.5, -3.0}, 7));
    EXPECT_NE(keyframe, MF::Keyframe(TickTime::TicksToTime(42), MF::KeyframePoint{0.5, -3.0}, 8));
    EXPECT_EQ(MF::Keyframe().GetValueKind(), MF::kKeyframeValueKind_None);
}

} // namespace
