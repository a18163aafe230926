#include "MF/Keyframe.h"

#include <iterator>

#include <gtest/gtest.h>

namespace
{

using mvxmediatypes::TickTime;

using KeyframeTest = ::testing::Test;

TEST_F(KeyframeTest, ValueKindsUseThePluginNumbersAndKeyframesKeepTheirParts)
{
    EXPECT_EQ(MF::GetKeyframeValueKind(MF::KeyframeValue{}), MF::kKeyframeValueKind_None);
    // The plug-in numbers run from 2 in this order.
    const MF::KeyframeValue values[] = {std::int8_t(-1),
                                        std::uint8_t(1),
                                        std::int16_t(1),
                                        std::uint16_t(1),
                                        std::int32_t(1),
                                        std::uint32_t(1),
                                        std::int64_t(1),
                                        std::uint64_t(1),
                                        1.0f,
                                        1.0,
                                        std::u16string(u"text"),
                                        true,
                                        QRT::Guid::CreateUnique(),
                                        MF::BinaryData::FromText("x"),
                                        MF::KeyframePoint{1.0, 2.0}};
    for (std::size_t index = 0; index < std::size(values); ++index)
        EXPECT_EQ(MF::GetKeyframeValueKind(values[index]), int(index) + 2);
    // A keyframe keeps its time, interpolation and value.
    const MF::Keyframe keyframe(TickTime::TicksToTime(42), MF::KeyframePoint{0.5, -3.0}, 7);
    EXPECT_EQ(keyframe.GetValueKind(), MF::kKeyframeValueKind_Point);
    EXPECT_EQ(std::get<MF::KeyframePoint>(keyframe.GetValue()), (MF::KeyframePoint{0.5, -3.0}));
    EXPECT_EQ(keyframe, MF::Keyframe(TickTime::TicksToTime(42), MF::KeyframePoint{0.5, -3.0}, 7));
    EXPECT_NE(keyframe, MF::Keyframe(TickTime::TicksToTime(42), MF::KeyframePoint{0.5, -3.0}, 8));
    EXPECT_EQ(MF::Keyframe().GetValueKind(), MF::kKeyframeValueKind_None);
}

} // namespace
